// The upgrade engine's driver: moves one instance to the current copy.
#pragma once

#include "engn/sqo/options.h"

#include <cstdint>

class UpgradeContext;

inline constexpr uint32_t KXL_FN_UPGRADE_INSTANCE = 0x18780502u;

// Results of the driver besides those its callees pass up unchanged.
inline constexpr int32_t UPGRADE_RC_INSTANCE_ACTIVE = -1953;
inline constexpr int32_t UPGRADE_RC_DBM_CONFIG_FAILED = -1947;
// The installed copies cannot be re-read after the move, the current copy
// is missing, or the instance is not found under it.
inline constexpr int32_t UPGRADE_RC_COPY_NOT_FOUND = -1918;
// A partitioned instance whose node list is missing, empty or unreadable.
inline constexpr int32_t UPGRADE_RC_NO_NODE_LIST = -1960;

// Upgrades the context's bound instance. 0 on success, a positive notice
// code, a negative message code, or -1 with the reason in options.status.
// On failure the instance's re-creation is dropped, the registry profile is
// moved back, for a negative result the instance directory is restored from
// the backup made at the start, and what the call made under a new profile
// path is removed; options.undoOutcome says whether all of it succeeded (the
// backup is kept, in options.keptBackupDir, when not). Leaves KXLINSTANCE set
// to the instance.
int upgradeInstance(UpgradeContext &context, UpgradeOptions &options);
