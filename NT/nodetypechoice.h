// The node type the upgraded instance is created with: the first one the
// current copy has a configuration template for.
#pragma once

#include "upgrade/records.h"

#include <cstdint>

class UpgradeContext;

inline constexpr uint32_t KXL_FN_CHOOSE_NODE_TYPE = 0x18780522u;

// Tries `requested`, then 4, 1, 3, 5 and 2; returns the first with a template,
// or `requested` when the copy has none of them. A template that could not be
// looked for is never taken for a missing one: the open's failure (negative)
// is returned instead of a node type.
int32_t chooseNodeType(UpgradeContext &context, UpgradeOptions &options, uint32_t requested);
