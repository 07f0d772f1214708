// Whether the current copy's installed products include an edition that can
// host an instance of a given node type.
#pragma once

#include "upgrade/records.h"

#include <cstdint>

class InstallCopy;

// True when `editionName` (compared ignoring case) is one of the editions
// allowed for `nodeType`. Node types other than 1, 3 and 4 are not checked,
// so every edition passes for them.
bool editionHostsNodeType(const char *editionName, uint32_t nodeType);

// True when the edition check applies to `nodeType` at all.
bool nodeTypeIsChecked(uint32_t nodeType);

// Trace point reported when the check fails for `nodeType`.
uint32_t editionCheckProbe(uint32_t nodeType);

// 0 when a product of `copy` qualifies for `nodeType` (or the type is not
// checked). Otherwise 1231, with the two message tokens stored in `options`:
// the node type, and the supported node type of the product with the greatest
// rank number (0 when the copy lists no product).
int32_t checkEdition(InstallCopy *copy, uint32_t nodeType, UpgradeOptions &options);
