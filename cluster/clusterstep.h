// The cluster step of the upgrade: replaces a clustered instance's server
// resources by resources of the current copy's resource type.
#pragma once

#include "upgrade/records.h"

#include <cstdint>

class UpgradeContext;

inline constexpr uint32_t KXL_FN_UPGRADE_CLUSTER_INSTANCE = 0x18780509u;
inline constexpr uint32_t KXL_FN_IS_INSTANCE_RESOURCE = 0x1878050Au;

// Results of the step (each the negative number of its message).
inline constexpr int32_t CLUSTER_RC_NO_API = -1251;        // a module or entry point is missing
inline constexpr int32_t CLUSTER_RC_NOT_CONVERTED = -1252; // type, name, or a resource put back whole
inline constexpr int32_t CLUSTER_RC_NOT_RECREATED = -1253; // a resource gone or without its dependencies
inline constexpr int32_t CLUSTER_RC_NOT_DELETED = -1254;   // a resource could not be deleted; unchanged

// Registers the resource type "KXL Server" and re-creates each of the
// instance's resources of the other server type ("KXL" when `toServerType` is
// 1, the other way round when it is 0) under the new type, with its name, its
// group and its dependencies. Resources converted before a failure stay
// converted; the resource in hand is put back under its old type. 0 on
// success; prints nothing.
int32_t upgradeClusterInstance(UpgradeContext &context, int32_t toServerType, UpgradeOptions &options);
