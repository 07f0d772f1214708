#include "NT/nodetypechoice.h"

#include "NT/instfiles.h"
#include "platform/kxlsys.h"

#include <algorithm>
#include <iterator>

namespace {

// After the requested type: the partitioned server first, then the other
// server types, the client last.
constexpr uint32_t kFallbackOrder[] = {4, 1, 3, 5, 2};

} // namespace

int32_t chooseNodeType(UpgradeContext &, UpgradeOptions &options, uint32_t requested) {
  pdtEntry(KXL_FN_CHOOSE_NODE_TYPE);
  uint32_t order[1 + std::size(kFallbackOrder)] = {requested};
  std::copy(std::begin(kFallbackOrder), std::end(kFallbackOrder), order + 1);
  for (uint32_t nodeType : order) {
    bool found = false;
    int32_t rc = lookForNodeTypeTemplate(options, nodeType, found);
    if (rc != 0) {
      pdtError(KXL_FN_CHOOSE_NODE_TYPE, 20, rc);
      pdtExit(KXL_FN_CHOOSE_NODE_TYPE, rc, 20);
      return rc;
    }
    if (found) {
      pdtExit(KXL_FN_CHOOSE_NODE_TYPE, nodeType, 0);
      return static_cast<int32_t>(nodeType);
    }
  }
  pdtError(KXL_FN_CHOOSE_NODE_TYPE, 10, static_cast<int32_t>(requested));
  pdtExit(KXL_FN_CHOOSE_NODE_TYPE, requested, 10);
  return static_cast<int32_t>(requested);
}
