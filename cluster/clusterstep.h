// The cluster step of the upgrade: replaces a clustered instance's server
// resources by resources of the current copy's resource type.
#pragma once

#include "cluster/mscsutil.h"
#include "upgrade/records.h"

#include <cstdint>
#include <functional>
#include <vector>

class UpgradeContext;

inline constexpr uint32_t KXL_FN_UPGRADE_CLUSTER_INSTANCE = 0x18780509u;
inline constexpr uint32_t KXL_FN_IS_INSTANCE_RESOURCE = 0x1878050Au;

// What the step has changed in the cluster, kept by its caller where it
// survives a kill: whether it registered the new resource type, and each
// resource it set out to convert as it was before (name, group, type,
// monitor, dependencies), noted before the resource is touched.
struct ClusterJournal {
  bool typeRegistered = false;
  std::vector<ClusterResourceFacts> resources;
};

// Puts the journal where it survives a kill; false when it could not.
using ClusterJournalSave = std::function<bool()>;

// Registers the resource type "KXL Server" and re-creates each of the
// instance's resources of the other server type ("KXL" when `toServerType` is
// 1, the other way round when it is 0) under the new type, with its name, its
// group and its dependencies. Before each change the journal is saved; the
// resources it already names are first brought to the new type, whatever a
// killed run left of them. A state that cannot be read ends the step with
// -1252. 0 on success; prints nothing.
int32_t upgradeClusterInstance(UpgradeContext &context, int32_t toServerType, UpgradeOptions &options,
                               ClusterJournal &journal, const ClusterJournalSave &save);
// The same with a journal kept in memory only.
int32_t upgradeClusterInstance(UpgradeContext &context, int32_t toServerType, UpgradeOptions &options);

// Puts back what the journal says the step changed: each resource, last
// first, exactly as it was (type, group, monitor, dependencies), then
// unregisters the new type when the step registered it. 0, or -1 when
// something could not be put back (the rest is still tried).
int32_t undoClusterConversion(const ClusterJournal &journal);
