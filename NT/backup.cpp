#include "NT/backup.h"

#include "NT/kxliutil.h"
#include "NT/runrecord.h"
#include "platform/kxlsys.h"
#include "platform/win32.h"

#include <cstdlib>
#include <cstring>
#include <initializer_list>

namespace {

constexpr char kBackupPrefix[] = "KXL";
constexpr uint32_t kProbeRestoreFailed = 300;
constexpr uint32_t kProbeBackupKept = 340;
// A removal stopped by a passing fault (a listing that failed half way) is
// tried again on what is left; only a lasting failure keeps the backup.
constexpr int kBackupRemovalAttempts = 2;

// Reports the system's last error at `probe` together with the failure.
StepResult failedWithSystemError(uint32_t probe, int32_t rc) {
  uint32_t lastError = GetLastError();
  pdtData1(KXL_FN_UPGRADE_INSTANCE, probe, PD_TYPE_UINT32, sizeof lastError, &lastError);
  return stepFailed(probe, rc);
}

// Copies `text` into a path buffer; false when it does not fit.
bool copyPath(char *buffer, const char *text) {
  std::size_t length = std::strlen(text);
  if (length >= KXL_JOINED_PATH_SZ)
    return false;
  std::memcpy(buffer, text, length + 1);
  return true;
}

// A unique name under the temporary directory, into state.backupDir.
StepResult chooseBackupName(DriverState &state) {
  char tempDir[KXL_JOINED_PATH_SZ] = {};
  DWORD length = GetTempPathA(sizeof tempDir, tempDir);
  if (length == 0 || length >= sizeof tempDir)
    return failedWithSystemError(kProbeTempPath, UPGRADE_RC_BACKUP_FAILED);
  char *name = _tempnam(tempDir, kBackupPrefix);
  if (name == nullptr)
    return failedWithSystemError(kProbeTempName, UPGRADE_RC_BACKUP_FAILED);
  bool fits = copyPath(state.backupDir, name);
  std::free(name);
  if (!fits)
    return failedWithSystemError(kProbeTempName, UPGRADE_RC_BACKUP_FAILED);
  return stepDone();
}

// The instance directory's copies show their progress unless the run is quiet.
uint32_t copyFlags(const DriverState &state) {
  return state.options.quiet ? 0 : SQLO_COPYDIR_SHOW_PROGRESS;
}

bool pathExists(const char *path) {
  OSSPathParam param = {OSS_PATH_PARAM_VERSION, path, 1, 0};
  return ossPathTest(&param) != OSS_RC_PATH_NOT_FOUND;
}

bool createDirectory(const char *path) {
  OSSPathParam param = {OSS_PATH_PARAM_VERSION, path, 0, 2};
  return ossDirectoryCreate(&param) == 0;
}

} // namespace

StepResult makeBackup(DriverState &state) {
  std::memcpy(state.savedInstanceDir, state.instanceDir, sizeof state.savedInstanceDir);
  StepResult named = chooseBackupName(state);
  if (failed(named))
    return named;
  // Where the backup is, before anything is made: in the diagnostic log and in the run's record.
  pdLog(PD_LEVEL_INFO, KXL_FN_UPGRADE_INSTANCE, kProbeBackupPlace, 0,
        "instance directory %s is backed up in %s", state.instanceDir, state.backupDir);
  if (!writeRunRecord(state))
    return failedWithSystemError(kProbeRunRecord, UPGRADE_RC_BACKUP_FAILED);
  // Only a directory this call made is ever removed again.
  if (!CreateDirectoryA(state.backupDir, nullptr))
    return failedWithSystemError(kProbeBackupCreate, UPGRADE_RC_BACKUP_FAILED);
  state.backupChosen = true;
  if (sqlocopydir(state.backupDir, state.instanceDir, copyFlags(state)) != 0)
    return failedWithSystemError(kProbeBackupCopy, UPGRADE_RC_BACKUP_FAILED);
  state.backupComplete = true;
  return stepDone();
}

StepResult copyToNewProfilePath(DriverState &state) {
  if ((state.options.flags & UPGRADE_FLAG_PROFILE_PATH_MOVES) == 0)
    return stepDone();
  const char *profilePath = state.options.profilePath;
  if (!pathExists(profilePath)) {
    // Recorded first: a kill right after the folder is made still removes it.
    state.profilePathCreated = true;
    if (!writeRunRecord(state))
      return failedWithSystemError(kProbeRunRecord, UPGRADE_RC_BACKUP_FAILED);
    if (!createDirectory(profilePath)) {
      state.profilePathCreated = false;
      return stepFailed(kProbeProfilePathCreate, UPGRADE_RC_PROFILE_PATH_FAILED);
    }
  }
  char target[KXL_JOINED_PATH_SZ];
  joinPath(target, profilePath, state.instanceName);
  if (pathExists(target))
    return stepFailed(kProbeInstanceDirExists, UPGRADE_RC_PROFILE_PATH_FAILED);
  // From here on the directory is this run's, even when the copy stops half way.
  std::memcpy(state.profileCopyDir, target, sizeof state.profileCopyDir);
  if (!writeRunRecord(state))
    return failedWithSystemError(kProbeRunRecord, UPGRADE_RC_BACKUP_FAILED);
  if (sqlocopydir(target, state.instanceDir, copyFlags(state)) != 0)
    return stepFailed(kProbeProfileCopy, UPGRADE_RC_BACKUP_FAILED);
  return stepDone();
}

void noteNewFunctionDirectory(DriverState &state, const char *newProfilePath) {
  char functionDir[KXL_JOINED_PATH_SZ];
  joinPath(functionDir, newProfilePath, "\\function");
  if (!pathExists(functionDir))
    std::memcpy(state.newFunctionDir, functionDir, sizeof state.newFunctionDir);
}

bool removeProfileCopies(DriverState &state) {
  bool removed = true;
  for (char *directory : {state.newFunctionDir, state.profileCopyDir}) {
    if (directory[0] != '\0' && pathExists(directory) && sqlodeletedir(directory) != 0)
      removed = false;
    else
      directory[0] = '\0';
  }
  // A profile path this run created holds nothing but what the run put there.
  if (removed && state.profilePathCreated) {
    removed = sqlodeletedir(state.options.profilePath) == 0;
    state.profilePathCreated = !removed;
  }
  return removed;
}

bool restoreBackup(DriverState &state) {
  int32_t rc = sqlocopydir(state.savedInstanceDir, state.backupDir, copyFlags(state));
  if (rc == 0)
    return true;
  pdLog(PD_LEVEL_SEVERE, KXL_FN_UPGRADE_INSTANCE, kProbeRestoreFailed, rc,
        "instance directory %s not restored; its backup is kept in %s", state.savedInstanceDir,
        state.backupDir);
  return false;
}

void removeBackup(DriverState &state) {
  if (!state.backupChosen)
    return;
  state.backupChosen = false;
  int32_t rc = 0;
  for (int attempt = 0; attempt < kBackupRemovalAttempts; ++attempt) {
    rc = sqlodeletedir(state.backupDir);
    if (rc == 0 || !pathExists(state.backupDir))
      return;
  }
  pdLog(PD_LEVEL_WARNING, KXL_FN_UPGRADE_INSTANCE, kProbeBackupKept, rc,
        "backup %s of instance directory %s could not be removed", state.backupDir, state.savedInstanceDir);
}

bool refreshFromBackup(DriverState &state) {
  if (!state.backupComplete || sqlocopydir(state.savedInstanceDir, state.backupDir, copyFlags(state)) != 0)
    return false;
  return state.profileCopyDir[0] == '\0' ||
         sqlocopydir(state.profileCopyDir, state.backupDir, copyFlags(state)) == 0;
}
