#include "NT/carryover.h"

#include "NT/kxliutil.h"
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

StepResult keepAuditSettings(DriverState &state) {
  char instanceDir[KXL_JOINED_PATH_SZ];
  joinPath(instanceDir, state.options.profilePath, state.instanceName);
  joinPath(state.auditFile, instanceDir, "security\\kxlaudit.cfg");
  joinPath(state.auditCopyFile, instanceDir, "security\\kxlauditcopy.cfg");
  int32_t rc = sqlocopy(state.auditFile, state.auditCopyFile, 0);
  // Also a copy that stopped half way is this run's to remove.
  state.auditCopyMade = !carriedOrAbsent(rc) || rc == 0;
  return carriedOrAbsent(rc) ? stepDone() : stepFailed(kProbeKeepAudit, rc);
}

StepResult putBackAuditSettings(const DriverState &state) {
  int32_t rc = sqlocopy(state.auditCopyFile, state.auditFile, 0);
  return carriedOrAbsent(rc) ? stepDone() : stepFailed(kProbePutBackAudit, rc);
}

bool dropAuditCopy(const DriverState &state) {
  int32_t rc = 0;
  for (int attempt = 0; attempt < 2; ++attempt) {
    rc = sqlodelete(state.auditCopyFile, 0);
    if (carriedOrAbsent(rc))
      return true;
  }
  pdLog(PD_LEVEL_WARNING, KXL_FN_UPGRADE_INSTANCE, kProbeAuditCopyKept, rc,
        "the copy %s of the audit settings could not be removed", state.auditCopyFile);
  return false;
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
