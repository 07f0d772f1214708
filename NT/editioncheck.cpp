#include "NT/editioncheck.h"

#include "install/ilist.h"
#include "install/installcopy.h"
#include "install/installedprod.h"
#include <iterator>

namespace {

constexpr uint32_t kEditionNameSize = 129; // 128 characters

constexpr const char *kPartitionedEditions[] = {"HALDOR_EDITION", "HALDOR_PRIME_EDITION"};
constexpr const char *kServerEditions[] = {"HALDOR_PRIME_EDITION", "HALDOR_EDITION", "VESTRA_SERVER",
                                           "MERIDA_EDITION",       "TALVEN_EDITION", "SOLENT_EDITION"};
// Node type 1 is allowed on the server editions except the last one.
constexpr std::size_t kStandaloneEditionCount = std::size(kServerEditions) - 1;

template <std::size_t N> bool listed(const char *name, const char *const (&names)[N], std::size_t count) {
  for (std::size_t i = 0; i < count && i < N; ++i)
    if (kxliSameName(name, names[i]))
      return true;
  return false;
}

} // namespace

bool nodeTypeIsChecked(uint32_t nodeType) {
  return nodeType == KXL_NODE_TYPE_STANDALONE || nodeType == KXL_NODE_TYPE_SERVER ||
         nodeType == KXL_NODE_TYPE_PARTITIONED;
}

bool editionHostsNodeType(const char *editionName, uint32_t nodeType) {
  if (!nodeTypeIsChecked(nodeType))
    return true;
  if (editionName == nullptr || editionName[0] == '\0')
    return false;
  if (nodeType == KXL_NODE_TYPE_PARTITIONED)
    return listed(editionName, kPartitionedEditions, std::size(kPartitionedEditions));
  if (nodeType == KXL_NODE_TYPE_SERVER)
    return listed(editionName, kServerEditions, std::size(kServerEditions));
  return listed(editionName, kServerEditions, kStandaloneEditionCount);
}

uint32_t editionCheckProbe(uint32_t nodeType) {
  switch (nodeType) {
  case 4:
    return 12;
  case 3:
    return 15;
  default:
    return 17;
  }
}

int32_t checkEdition(InstallCopy *copy, uint32_t nodeType, UpgradeOptions &options) {
  if (!nodeTypeIsChecked(nodeType))
    return 0;
  InstalledProdList *products = nullptr;
  if (copy != nullptr && copy->GetInstalledProdList(&products) != 0)
    products = nullptr;
  uint32_t greatestRank = 0;
  int32_t keptNodeType = 0;
  if (products != nullptr) {
    products->Rewind();
    for (InstalledProd *product = products->Next(); product != nullptr; product = products->Next()) {
      char edition[kEditionNameSize] = {};
      if (product->GetEditionName(edition, sizeof edition) != 0)
        edition[0] = '\0';
      uint32_t rank = product->GetRankNumber();
      if (rank > greatestRank) {
        greatestRank = rank;
        keptNodeType = product->GetSupportedNodeType();
      }
      if (editionHostsNodeType(edition, nodeType))
        return 0;
    }
  }
  options.oldInstanceType = nodeType;
  options.newInstanceType = static_cast<uint32_t>(keptNodeType);
  return UPGRADE_RC_EDITION_MISMATCH;
}
