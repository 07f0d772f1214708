// The instance directory's safety copy: made before anything changes, copied
// back when the upgrade fails, and removed at the end of the driver's call.
// Also the copy of the instance directory to a new instance profile path.
#pragma once

#include "NT/driverstate.h"

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
// which must not exist yet. Without the flag nothing happens. Records what it
// created (state.profilePathCreated, state.profileCopyDir) for the undo.
StepResult copyToNewProfilePath(DriverState &state);

// Remembers the new profile path's function directory when it does not exist
// yet, so that a failure removes the copy the upgrade is about to make.
void noteNewFunctionDirectory(DriverState &state, const char *newProfilePath);

// Removes what this call created under the new instance profile path: the
// instance directory's copy, the function directory's copy, and the profile
// path itself when this call created it. Never a directory that existed
// before the call. False when one of them could not be removed.
bool removeProfileCopies(DriverState &state);

// Copies the backup back over the saved instance directory. When that copy
// fails its place is logged and false returned; the undo then keeps it.
bool restoreBackup(DriverState &state);

// Deletes the backup directory when this call created it.
void removeBackup(DriverState &state);

// Copies the backup over the instance directory and over the copy this run
// made under the new profile path, so that a step that was cut short starts
// again from the instance's own files. False when the backup is incomplete or
// a copy fails.
bool refreshFromBackup(DriverState &state);
