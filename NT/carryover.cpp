#include "NT/carryover.h"

#include "NT/pathjoin.h"
#include "platform/kxlsys.h"

namespace {

struct CarriedFile {
  const char *name;
  uint32_t probe;
};

constexpr CarriedFile kCarriedFiles[] = {
    {"cfg\\kxldj.ini", kProbeCarryFederation},
    {"cfg\\djxclassic2.cfg", kProbeCarryClassicCfg},
    {"bin\\rsm.cfg", kProbeCarryRsm},
    {"kxlmd_config.xml", kProbeCarryMetadata},
};

} // namespace

void keepAuditSettings(DriverState &state) {
  char instanceDir[KXL_JOINED_PATH_SZ];
  joinPath(instanceDir, state.options.profilePath, state.instanceName);
  joinPath(state.auditFile, instanceDir, "security\\kxlaudit.cfg");
  joinPath(state.auditCopyFile, instanceDir, "security\\kxlauditcopy.cfg");
  sqlocopy(state.auditFile, state.auditCopyFile, 0);
}

void putBackAuditSettings(const DriverState &state) {
  sqlocopy(state.auditCopyFile, state.auditFile, 0);
}

void dropAuditCopy(const DriverState &state) {
  sqlodelete(state.auditCopyFile, 0);
}

// A missing file comes as an error or as a warning, a missing folder as its own code.
bool carriedOrAbsent(int32_t rc) {
  return rc == 0 || rc == SQLO_RC_FILE_NOT_FOUND || rc == SQLO_RC_FILE_NOT_FOUND_W ||
         rc == SQLO_RC_PATH_NOT_FOUND;
}

StepResult carryOverFiles(const DriverState &state) {
  for (const CarriedFile &file : kCarriedFiles) {
    char source[KXL_JOINED_PATH_SZ];
    char target[KXL_JOINED_PATH_SZ];
    joinPath(source, state.backupDir, file.name);
    joinPath(target, state.newInstanceDir, file.name);
    int32_t rc = sqlocopy(source, target, 0);
    if (!carriedOrAbsent(rc))
      return stepFailed(file.probe, rc);
  }
  return stepDone();
}
