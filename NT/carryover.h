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

// Forms the two audit file paths under "<options' profile path>\<instance>\security"
// and copies kxlaudit.cfg to kxlauditcopy.cfg. The file may be missing.
void keepAuditSettings(DriverState &state);

// Copies kxlauditcopy.cfg back over kxlaudit.cfg (it may be missing).
void putBackAuditSettings(const DriverState &state);

// Deletes kxlauditcopy.cfg.
void dropAuditCopy(const DriverState &state);

// True for the copy results that mean the optional file was copied or absent.
bool carriedOrAbsent(int32_t rc);

// Copies "cfg\kxldj.ini", "cfg\djxclassic2.cfg", "bin\rsm.cfg" and
// "kxlmd_config.xml" from the backup to the new instance directory.
StepResult carryOverFiles(const DriverState &state);
