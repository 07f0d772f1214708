// What one call of the upgrade driver works with: the run's context and
// options, the paths it forms, the copy list it re-reads, and the two facts
// its undo sequence depends on. Each step of the driver takes this record
// and reports either success or the result and trace point of its failure.
#pragma once

#include "NT/pathjoin.h"
#include "cluster/clusterstep.h"
#include "platform/kxlsys.h"
#include "upgrade/records.h"

#include <cstdint>

class UpgradeContext;
class InstallCopy;
class InstallCopyList;
class IKXLINSTANCE;

struct DriverState {
  DriverState(UpgradeContext &runContext, UpgradeOptions &runOptions)
      : context(runContext), options(runOptions) {}

  UpgradeContext &context;
  UpgradeOptions &options;

  char instanceName[SQLO_INSTANCE_NAME_SZ] = {};
  char currentCopyName[SQLO_COPY_NAME_SZ] = {};
  InstallCopy *currentCopy = nullptr; // borrowed from the context's copy list
  uint32_t nodeType = 0;              // as read from the instance's kxlsystm at start

  char instanceDir[KXL_JOINED_PATH_SZ] = {};
  char savedInstanceDir[KXL_JOINED_PATH_SZ] = {}; // where a restore goes
  char backupDir[KXL_JOINED_PATH_SZ] = {};
  char newInstanceDir[KXL_JOINED_PATH_SZ] = {};
  char auditFile[KXL_JOINED_PATH_SZ] = {};
  char auditCopyFile[KXL_JOINED_PATH_SZ] = {};
  char newConfigFile[KXL_JOINED_PATH_SZ] = {};
  char backupConfigFile[KXL_JOINED_PATH_SZ] = {};

  InstallCopyList *rereadCopies = nullptr; // owned by the driver
  IKXLINSTANCE *newInstance = nullptr;     // borrowed from rereadCopies

  char oldCopyName[SQLO_COPY_NAME_SZ] = {}; // the copy that owned the instance
  char recordPath[KXL_JOINED_PATH_SZ] = {}; // the run's record, kept up to date before every change
  uint32_t step = 0;                        // index of the step running
  bool clustered = false;                   // as the instance was bound before the run
  bool resumed = false;                     // finishing the upgrade of a killed run

  // The registry profile move was started: some or all machines may hold the
  // key under the current copy.
  bool profileMoved = false;
  bool backupChosen = false;   // backupDir was created by this call
  bool backupComplete = false; // backupDir holds the whole instance directory

  // What this call made under a new instance profile path, removed again on failure.
  char profileCopyDir[KXL_JOINED_PATH_SZ] = {}; // the instance directory's copy
  char newFunctionDir[KXL_JOINED_PATH_SZ] = {}; // the function directory's copy
  bool profilePathCreated = false;              // options.profilePath itself
  bool auditCopyMade = false;                   // auditCopyFile, made by this call

  // What the cluster step changed, noted before each change.
  ClusterJournal clusterJournal;
};

// Outcome of one step: rc 0 for success, else the result and its trace point.
struct StepResult {
  int32_t rc = 0;
  uint32_t probe = 0;
};

inline StepResult stepDone() {
  return {};
}
inline StepResult stepFailed(uint32_t probe, int32_t rc) {
  return {rc, probe};
}
inline bool failed(const StepResult &result) {
  return result.rc != 0;
}
