// Nodes files and node list blocks, for the families that build partition
// tables. Internal to the product library.
#pragma once

#include "platform/kxlsys.h"

#include <cstdint>
#include <string>
#include <vector>

namespace kxlprod {

struct NodeLine {
  int32_t number = 0;
  uint32_t port = 0;
  std::string host, netName, machine;
};

// Parses the nodes file at a Windows path: 0, SQLO_RC_FILE_NOT_FOUND_W when it
// is missing, SQLO_RC_INVALID_ARGUMENT for a malformed file, SQLO_RC_IO_ERROR.
int32_t readNodesFile(const std::string &path, std::vector<NodeLine> &nodes);

// The node list block of the entries (std::malloc'ed, release with
// std::free); null when out of memory. maxNode: the highest node number.
SQLO_NODELIST *buildNodeList(const std::vector<NodeLine> &nodes, uint32_t &maxNode);

} // namespace kxlprod
