// The cluster step of the upgrade: replaces a clustered instance's server
// resources by resources of the current copy's resource type.
#pragma once

#include "engn/sqo/options.h"

#include <cstdint>

class UpgradeContext;

inline constexpr uint32_t KXL_FN_UPGRADE_CLUSTER_INSTANCE = 0x18780560u;

// Result of this build's cluster step: clustered instances are not upgraded.
inline constexpr int32_t CLUSTER_RC_NOT_SUPPORTED = -1;

// Moves the context's instance's cluster resources to the resource type of
// server type `toServerType` (1: the current copy's). 0 on success.
// This build refuses: it writes one line on standard error and returns
// CLUSTER_RC_NOT_SUPPORTED. Only clustered instances reach the step.
int32_t upgradeClusterInstance(UpgradeContext &context, int32_t toServerType, UpgradeOptions &options);
