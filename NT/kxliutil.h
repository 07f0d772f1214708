// The upgrade engine's driver: moves one instance to the current copy.
#pragma once

#include "engn/sqo/options.h"

#include <cstdint>

class UpgradeContext;

inline constexpr uint32_t KXL_FN_UPGRADE_INSTANCE = 0x18780502u;

// Upgrades the context's bound instance. 0 on success, a positive notice
// code, a negative message code, or -1 with the reason in options.status.
int upgradeInstance(UpgradeContext &context, UpgradeOptions &options);
