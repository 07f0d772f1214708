// The application environment of the current instance: its partition table in
// the process control block. A partitioned instance's table comes from the
// "kxlnodes.cfg" of its directory; any other instance has partition 0 on this
// machine. The table has the node list layout (platform/kxlsys.h).
#include "platform/kxlsys.h"
#include "sim/common/names.h"
#include "sim/common/simfail.h"
#include "sim/product/instances.h"
#include "sim/product/nodes.h"
#include "sim/product/simstore.h"
#include "sim/product/winpath.h"

#include <cstdlib>
#include <map>
#include <string>
#include <vector>

namespace {

constexpr int32_t kSystemErrorSqlcode = -1042;

SQLO_NODELIST *partitionTable = nullptr;

void releaseTable() {
  sqlz_krcbp->partitionTable = nullptr;
  sqlz_krcbp->currentPartition = 0;
  sqlz_krcbp->partitionFlag = 0;
  std::free(partitionTable);
  partitionTable = nullptr;
}

std::vector<kxlprod::NodeLine> localPartition() {
  kxlprod::NodeLine node;
  node.machine = kxlprod::localComputerName();
  if (!kxlprod::identityString("FullHostName", node.host) || node.host.empty())
    node.host = node.machine;
  return {node};
}

bool isLocal(const kxlprod::NodeLine &node, const std::string &computer, const std::string &fullHost) {
  return kxlsim::equalsIgnoringCase(node.machine, computer) ||
         kxlsim::equalsIgnoringCase(node.host, fullHost);
}

// The partition this process works for: the lowest-numbered one of this
// machine, else the lowest-numbered one of the instance.
int16_t currentPartition(const std::vector<kxlprod::NodeLine> &nodes) {
  std::string computer = kxlprod::localComputerName(), fullHost;
  kxlprod::identityString("FullHostName", fullHost);
  int32_t lowest = SQLO_MAX_NODE_NUMBER + 1, lowestLocal = SQLO_MAX_NODE_NUMBER + 1;
  for (const kxlprod::NodeLine &node : nodes) {
    lowest = node.number < lowest ? node.number : lowest;
    if (isLocal(node, computer, fullHost) && node.number < lowestLocal)
      lowestLocal = node.number;
  }
  return static_cast<int16_t>(lowestLocal <= SQLO_MAX_NODE_NUMBER ? lowestLocal : lowest);
}

// Nonzero when several partitions share a host.
uint32_t sharedHostFlag(const std::vector<kxlprod::NodeLine> &nodes) {
  std::map<std::string, int> perHost;
  for (const kxlprod::NodeLine &node : nodes)
    if (++perHost[node.host] > 1)
      return 1;
  return 0;
}

int32_t partitionsOf(const std::string &instance, bool partitioned, std::vector<kxlprod::NodeLine> &nodes) {
  std::string directory, copy;
  if (!kxlprod::readInstanceEntry(instance, directory, copy))
    return SQLO_RC_NOT_FOUND;
  if (!partitioned) {
    nodes = localPartition();
    return 0;
  }
  int32_t rc = kxlprod::readNodesFile(kxlprod::joinPath(directory, "kxlnodes.cfg"), nodes);
  if (rc == 0 && nodes.empty())
    rc = SQLO_RC_INVALID_ARGUMENT;
  return rc;
}

int32_t initEnvironment(uint32_t partitioned) {
  std::string instance = kxlprod::processInstance();
  if (instance.empty())
    return SQLO_RC_INVALID_ARGUMENT;
  std::vector<kxlprod::NodeLine> nodes;
  int32_t rc = partitionsOf(instance, partitioned != 0, nodes);
  if (rc != 0)
    return rc;
  uint32_t maxNode = 0;
  SQLO_NODELIST *table = kxlprod::buildNodeList(nodes, maxNode);
  if (table == nullptr)
    return SQLO_RC_NO_MEMORY;
  partitionTable = table;
  sqlz_krcbp->partitionTable = table;
  sqlz_krcbp->currentPartition = currentPartition(nodes);
  sqlz_krcbp->partitionFlag = sharedHostFlag(nodes);
  return 0;
}

} // namespace

namespace kxlprod {

void resetApplicationEnvironment() {
  releaseTable();
}

} // namespace kxlprod

extern "C" {

int32_t sqleInitApplicationEnvironment(uint32_t reserved1, uint32_t reserved2, uint32_t partitioned,
                                       sqlca *ca) {
  (void)reserved1, (void)reserved2;
  // A failed set-up leaves no table of an earlier instance behind.
  releaseTable();
  int32_t rc = kxlsim::shouldFail("sqleInitApplicationEnvironment") ? SQLO_RC_SYSTEM_ERROR
                                                                    : initEnvironment(partitioned);
  if (ca != nullptr)
    sqlcaSetCode(*ca, rc == 0 ? 0 : kSystemErrorSqlcode);
  return rc;
}

} // extern "C"
