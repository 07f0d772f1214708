#include "cluster/clusterstep.h"

#include "platform/kxlsys.h"

#include <cstdio>

int32_t upgradeClusterInstance(UpgradeContext &, int32_t, UpgradeOptions &options) {
  pdtEntry(KXL_FN_UPGRADE_CLUSTER_INSTANCE);
  std::fprintf(stderr, "%.*s: clustered instances cannot be upgraded by this build\n",
               int(sizeof options.instanceName), options.instanceName);
  pdtExit(KXL_FN_UPGRADE_CLUSTER_INSTANCE, CLUSTER_RC_NOT_SUPPORTED, 0);
  return CLUSTER_RC_NOT_SUPPORTED;
}
