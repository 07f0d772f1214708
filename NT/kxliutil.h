// The upgrade engine's driver: moves one instance to the current copy.
#pragma once

#include "upgrade/records.h"

#include <cstdint>

class UpgradeContext;

inline constexpr uint32_t KXL_FN_UPGRADE_INSTANCE = 0x18780502u;

// Upgrades the context's bound instance. 0 on success, a positive notice
// code, a negative message code, or -1 with the reason in options.status.
// On failure the instance's re-creation is dropped, the registry profile is
// moved back, for a negative result the instance directory is restored from
// the backup made at the start, and what the call made under a new profile
// path is removed; options.undoOutcome says whether all of it succeeded (the
// backup is kept, in options.keptBackupDir, when not). Leaves KXLINSTANCE set
// to the instance.
int upgradeInstance(UpgradeContext &context, UpgradeOptions &options);

// The record that a killed run of this command left for the options'
// instance, as the run found it before binding anything.
struct KilledRun {
  char oldCopy[130] = {};     // the copy that owned the instance
  char instanceDir[261] = {}; // the instance's directory before the run
  bool clustered = false;
};

enum class KilledRunFound { none, found, unusable };

// Looks for the record of a killed run of the options' instance under the
// current copy (options.currentInstallPath). A record that cannot be read or
// used is set aside and reported as unusable.
KilledRunFound findKilledRun(UpgradeContext &context, const UpgradeOptions &options, KilledRun &run);

// Takes the killed run up again, with the context bound to the instance as it
// was before that run: when the run had not yet reached the instance's
// re-creation, everything it did is undone (the options are left as given,
// *finished false, result 0); otherwise the upgrade is finished from the step
// the run was killed in (*finished true, the upgrade's result).
int recoverKilledRun(UpgradeContext &context, UpgradeOptions &options, bool *finished);
