// The instance's files seen by the checks: whether any of its services runs,
// and whether the current copy ships a node type's configuration template.
#pragma once

#include "upgrade/records.h"

#include <cstdint>

class UpgradeContext;

inline constexpr uint32_t KXL_FN_IS_INSTANCE_ACTIVE = 0x18780520u;
inline constexpr uint32_t KXL_FN_HAS_NODE_TYPE_TEMPLATE = 0x18780521u;

// True when a service of the instance is running, starting or paused. A
// partitioned instance's node list is loaded into the context first; an
// unreadable nodes file or an unknown service state counts as not active.
bool isInstanceActive(UpgradeContext &context, UpgradeOptions &options);

// True when the current copy's template of `nodeType` (1 to 5) can be opened.
bool hasNodeTypeTemplate(UpgradeContext &context, UpgradeOptions &options, uint32_t nodeType);

// Whether the template of `nodeType` is there: 0 and `found`, or the open's
// own failure when it could not be told (anything but a missing file).
int32_t lookForNodeTypeTemplate(const UpgradeOptions &options, uint32_t nodeType, bool &found);
