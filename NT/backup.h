// The instance directory's safety copy: made before anything changes, copied
// back when the upgrade fails, and removed at the end of the driver's call.
// Also the copy of the instance directory to a new instance profile path.
#pragma once

#include "NT/driverstate.h"

inline constexpr int32_t UPGRADE_RC_BACKUP_FAILED = -1969;
inline constexpr int32_t UPGRADE_RC_PROFILE_PATH_FAILED = -1959;

// Trace points of the two steps.
inline constexpr uint32_t kProbeTempPath = 20;
inline constexpr uint32_t kProbeTempName = 30;
inline constexpr uint32_t kProbeBackupCreate = 40;
inline constexpr uint32_t kProbeBackupCopy = 50;
inline constexpr uint32_t kProbeProfilePathCreate = 55;
inline constexpr uint32_t kProbeProfileCopy = 60;
inline constexpr uint32_t kProbeInstanceDirExists = 70;

// Copies state.instanceDir into a new directory under the user's temporary
// directory (prefix "KXL"). Sets backupChosen once the directory exists and
// backupComplete once the whole tree is in it.
StepResult makeBackup(DriverState &state);

// With UPGRADE_FLAG_PROFILE_PATH_MOVES: creates the options' profile path when
// missing and copies the instance directory to "<profile path>\<instance>",
// which must not exist yet. Without the flag nothing happens.
StepResult copyToNewProfilePath(DriverState &state);

// Copies the backup back over the saved instance directory. When that copy
// fails the backup is kept (and its place logged) so that nothing is lost;
// returns false then.
bool restoreBackup(DriverState &state);

// Deletes the backup directory when this call created it.
void removeBackup(DriverState &state);
