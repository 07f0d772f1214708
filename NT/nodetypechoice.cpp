#include "NT/nodetypechoice.h"

#include "NT/instfiles.h"
#include "platform/kxlsys.h"

namespace {

// After the requested type: the partitioned server first, then the other
// server types, the client last.
constexpr uint32_t kFallbackOrder[] = {4, 1, 3, 5, 2};

} // namespace

int32_t chooseNodeType(UpgradeContext &context, UpgradeOptions &options, uint32_t requested) {
  pdtEntry(KXL_FN_CHOOSE_NODE_TYPE);
  if (hasNodeTypeTemplate(context, options, requested)) {
    pdtExit(KXL_FN_CHOOSE_NODE_TYPE, requested, 0);
    return static_cast<int32_t>(requested);
  }
  for (uint32_t nodeType : kFallbackOrder) {
    if (hasNodeTypeTemplate(context, options, nodeType)) {
      pdtExit(KXL_FN_CHOOSE_NODE_TYPE, nodeType, 0);
      return static_cast<int32_t>(nodeType);
    }
  }
  pdtError(KXL_FN_CHOOSE_NODE_TYPE, 10, static_cast<int32_t>(requested));
  pdtExit(KXL_FN_CHOOSE_NODE_TYPE, requested, 10);
  return static_cast<int32_t>(requested);
}
