// The nodes file of a partitioned instance, parsed into one node list block
// (layout in platform/kxlsys.h). Each non-blank line is
//   <node number> <host name> <machine name> <logical port> [<network name>]
// separated by blanks or tabs; the network name becomes the entry's second
// name, the third name stays empty.
#include "sim/product/nodes.h"
#include "platform/kxlsys.h"
#include "sim/common/simfail.h"
#include "sim/product/simstate.h"

#include <cctype>
#include <cstdlib>
#include <cstring>
#include <sstream>
#include <string>
#include <vector>

namespace {

constexpr size_t kMaxNodesFileBytes = 1 << 20;
constexpr size_t kMaxNameBytes = 255; // a name length must fit its byte
constexpr uint32_t kLargestPort = 999;

using kxlprod::NodeLine;

bool parseNumber(const std::string &text, uint32_t largest, uint32_t &value) {
  if (text.empty() || text.size() > 9)
    return false;
  for (char c : text)
    if (!std::isdigit(static_cast<unsigned char>(c)))
      return false;
  value = static_cast<uint32_t>(std::strtoul(text.c_str(), nullptr, 10));
  return value <= largest;
}

bool parseLine(const std::string &line, NodeLine &node) {
  std::istringstream words(line);
  std::string number, port, extra;
  if (!(words >> number >> node.host >> node.machine >> port))
    return false;
  words >> node.netName;
  if (words >> extra)
    return false;
  uint32_t value = 0;
  if (!parseNumber(number, SQLO_MAX_NODE_NUMBER, value) || !parseNumber(port, kLargestPort, node.port))
    return false;
  node.number = static_cast<int32_t>(value);
  return node.host.size() <= kMaxNameBytes && node.netName.size() <= kMaxNameBytes &&
         node.machine.size() < SQLO_COMPUTERNAME_SZ;
}

bool parseNodes(const std::string &text, std::vector<NodeLine> &nodes) {
  std::vector<bool> seen(SQLO_MAX_NODE_NUMBER + 1, false);
  std::istringstream lines(text);
  std::string line;
  while (std::getline(lines, line)) {
    if (line.find_first_not_of(" \t\r") == std::string::npos)
      continue;
    NodeLine node;
    if (!parseLine(line, node) || seen[static_cast<size_t>(node.number)])
      return false;
    seen[static_cast<size_t>(node.number)] = true;
    nodes.push_back(node);
  }
  return true;
}

size_t entrySize(const NodeLine &node) {
  size_t size = SQLO_NODE_NAMES + node.host.size() + node.netName.size() + node.machine.size() + 4;
  return (size + 3) & ~size_t(3);
}

void put16(unsigned char *at, uint16_t value) {
  at[0] = static_cast<unsigned char>(value);
  at[1] = static_cast<unsigned char>(value >> 8);
}

void put32(unsigned char *at, uint32_t value) {
  for (int i = 0; i < 4; ++i)
    at[i] = static_cast<unsigned char>(value >> (8 * i));
}

void writeEntry(unsigned char *entry, const NodeLine &node) {
  put16(entry + SQLO_NODE_LENGTH, static_cast<uint16_t>(entrySize(node)));
  put16(entry + SQLO_NODE_NUMBER, static_cast<uint16_t>(node.number));
  put32(entry + SQLO_NODE_PORT, node.port);
  entry[SQLO_NODE_HOSTLEN] = static_cast<unsigned char>(node.host.size());
  entry[SQLO_NODE_NAME2LEN] = static_cast<unsigned char>(node.netName.size());
  entry[SQLO_NODE_NAME3LEN] = 0;
  entry[SQLO_NODE_MACHLEN] = static_cast<unsigned char>(node.machine.size());
  unsigned char *names = entry + SQLO_NODE_NAMES;
  for (const std::string *name : {&node.host, &node.netName}) {
    std::memcpy(names, name->data(), name->size());
    names += name->size() + 1;
  }
  names += 1; // empty third name
  std::memcpy(names, node.machine.data(), node.machine.size());
}

} // namespace

// Builds the block (std::malloc'ed, zero-filled); null when out of memory.
SQLO_NODELIST *kxlprod::buildNodeList(const std::vector<NodeLine> &nodes, uint32_t &maxNode) {
  maxNode = 0;
  for (const NodeLine &node : nodes)
    maxNode = node.number > static_cast<int32_t>(maxNode) ? static_cast<uint32_t>(node.number) : maxNode;
  uint32_t slots = maxNode + 1;
  size_t first = SQLO_NODELIST_HDR_INDEX + 4 * size_t(slots);
  size_t total = first;
  for (const NodeLine &node : nodes)
    total += entrySize(node);
  auto *block = static_cast<unsigned char *>(std::calloc(1, total));
  if (block == nullptr)
    return nullptr;
  std::memcpy(block, "SQLONODE", 8);
  put32(block + 8, static_cast<uint32_t>(total));
  put32(block + 12, slots);
  put32(block + SQLO_NODELIST_HDR_COUNT, static_cast<uint32_t>(nodes.size()));
  put32(block + SQLO_NODELIST_HDR_FIRST, static_cast<uint32_t>(first));
  size_t at = first;
  for (const NodeLine &node : nodes) {
    put32(block + SQLO_NODELIST_HDR_INDEX + 4 * size_t(node.number), static_cast<uint32_t>(at));
    writeEntry(block + at, node);
    at += entrySize(node);
  }
  return reinterpret_cast<SQLO_NODELIST *>(block);
}

int32_t kxlprod::readNodesFile(const std::string &path, std::vector<NodeLine> &nodes) {
  std::string text;
  LONG rc = kxlprod::readSmallTextFile(path, kMaxNodesFileBytes, text);
  if (rc == ERROR_FILE_NOT_FOUND || rc == ERROR_PATH_NOT_FOUND)
    return SQLO_RC_FILE_NOT_FOUND_W;
  if (rc != ERROR_SUCCESS)
    return SQLO_RC_IO_ERROR;
  return parseNodes(text, nodes) ? 0 : SQLO_RC_INVALID_ARGUMENT;
}

extern "C" {

int32_t sqloReadKxlnodes(const char *path, uint32_t, SQLO_NODELIST **list, uint32_t, uint32_t *entryCount,
                         uint32_t *maxNode, uint32_t, const char *, uint32_t, uint32_t) {
  if (list == nullptr)
    return SQLO_RC_INVALID_ARGUMENT;
  std::free(*list);
  *list = nullptr;
  if (kxlsim::shouldFail("sqloReadKxlnodes"))
    return SQLO_RC_IO_ERROR;
  if (path == nullptr || path[0] == '\0')
    return SQLO_RC_INVALID_ARGUMENT;
  std::vector<NodeLine> nodes;
  int32_t rc = kxlprod::readNodesFile(path, nodes);
  if (rc != 0)
    return rc;
  uint32_t highest = 0;
  *list = kxlprod::buildNodeList(nodes, highest);
  if (*list == nullptr)
    return SQLO_RC_NO_MEMORY;
  if (entryCount != nullptr)
    *entryCount = static_cast<uint32_t>(nodes.size());
  if (maxNode != nullptr)
    *maxNode = highest;
  return 0;
}

} // extern "C"
