// Files the upgrade carries from the old instance to the new one: the audit
// settings kept aside while the services step re-creates the instance, and
// the optional configuration files taken from the backup.
#pragma once

#include "NT/driverstate.h"

// Trace points of the carried files, in the order they are copied.
inline constexpr uint32_t kProbeCarryFederation = 150;
inline constexpr uint32_t kProbeCarryClassicCfg = 160;
inline constexpr uint32_t kProbeCarryRsm = 170;
inline constexpr uint32_t kProbeCarryMetadata = 180;

// Trace points of the audit settings kept aside around the services step.
inline constexpr uint32_t kProbeKeepAudit = 85;
inline constexpr uint32_t kProbePutBackAudit = 93;
inline constexpr uint32_t kProbeAuditCopyKept = 350; // diagnostic log only

// Forms the two audit file paths under "<options' profile path>\<instance>\security"
// and copies kxlaudit.cfg to kxlauditcopy.cfg. A missing file (auditing off)
// needs no copy; a copy that cannot be made fails the step before the
// services step could overwrite the settings.
StepResult keepAuditSettings(DriverState &state);

// Copies kxlauditcopy.cfg back over kxlaudit.cfg. No copy (none was kept)
// leaves kxlaudit.cfg as it is; any other failure fails the step, so the
// settings are never lost with the copy.
StepResult putBackAuditSettings(const DriverState &state);

// Deletes kxlauditcopy.cfg, a second time when the first try fails; a copy
// that stays is named in the diagnostic log (point 350) and the upgrade
// stands. False when it could not be removed.
bool dropAuditCopy(const DriverState &state);

// True for the copy results that mean the optional file was copied or absent.
bool carriedOrAbsent(int32_t rc);

// Copies "cfg\kxldj.ini", "cfg\djxclassic2.cfg", "bin\rsm.cfg" and
// "kxlmd_config.xml" from the backup to the new instance directory.
StepResult carryOverFiles(const DriverState &state);
