// The record of an upgrade run that survives the run being killed: which step
// it had reached, where its backup is, what it had created and the facts the
// undo needs. It is written whole, before every step that changes the machine,
// as "<current copy>\cfg\kxliupgrade-<INSTANCE>.run" (a new text beside it,
// then moved over it), and removed when the run ends. The next run of the
// command for the instance reads it before anything else and either puts the
// instance back or finishes the upgrade (see docs/recovery.md).
#pragma once

#include "NT/driverstate.h"

#include <cstdint>

// Trace point of the record (written, read, set aside) and of the backup's place in the diagnostic log.
inline constexpr uint32_t kProbeRunRecord = 330;
inline constexpr uint32_t kProbeBackupPlace = 45;

// The record's path for an instance, in a buffer of KXL_JOINED_PATH_SZ bytes.
void runRecordPath(char *buffer, const char *currentCopyPath, const char *instanceName);

// Writes the record of `state` at its step (an index of the driver's step
// table); false when it could not be written whole (the old record stays).
bool writeRunRecord(DriverState &state);

// The step of a record whose run has ended: the next run removes it and goes
// on as usual.
inline constexpr uint32_t kRunRecordEnded = 0xFFFFFFFFu;

// Marks the record of `state`'s run as ended, then removes it (a second time
// when the first try fails). A record that stays is named in the diagnostic
// log; marked as ended, it makes the next run neither undo nor finish anything.
void closeRunRecord(DriverState &state);

// Removes a record file; true when it is gone.
bool removeRunRecordFile(const char *path);

enum class RecordRead { none, read, damaged };

// Reads the record at `path` into `state`: the run's facts and step, and the
// values the run had bound into its context and options.
RecordRead readRunRecord(const char *path, DriverState &state);

// Moves a record that cannot be used out of the way ("<path>.damaged").
void setRunRecordAside(const char *path);
