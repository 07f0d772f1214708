// The node type of an instance, read from its database manager configuration
// file kxlsystm: the unsigned 16-bit word at byte 40.
#pragma once

#include <cstddef>
#include <cstdint>

class IKXLINSTANCE;

// Trace identifier of readNodeType.
inline constexpr uint32_t KXL_FN_READ_NODE_TYPE = 0x1878052Eu;

// Reads "<instance directory>\kxlsystm" (a quoted directory keeps its quotes
// around the file path) and stores the node type word, zero-extended, in
// *nodeType. Returns 0, or the platform's code when the file cannot be opened
// or read, or SQLO_RC_INVALID_ARGUMENT for null arguments, a path that does not
// fit, or a file too short to hold the word; *nodeType then keeps its value.
int32_t readNodeType(const IKXLINSTANCE *instance, uint32_t *nodeType);

// The file readNodeType reads; false (and "") when it cannot be formed.
bool nodeTypeFilePath(const IKXLINSTANCE *instance, char *path, size_t size);

// Node types an instance can have: 1 to 5.
inline bool isKnownNodeType(uint32_t nodeType) {
  return nodeType >= 1 && nodeType <= 5;
}
