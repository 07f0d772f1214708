#include "NT/instfiles.h"

#include "NT/pathjoin.h"
#include "platform/dbmcfgfile.h"
#include "platform/kxlsys.h"
#include "upgrade/records.h"

#include <cstdio>

namespace {

constexpr uint32_t kTemplateOpenFlags = 0x314;
constexpr uint32_t kServiceNameSize = 30; // "%s-%d": 29 characters

bool isActiveState(int32_t code) {
  return code == SQLO_RC_SVC_RUNNING || code == SQLO_RC_SVC_START_PENDING || code == SQLO_RC_SVC_PAUSED;
}

bool serviceActive(const char *serviceName, const char *machine) {
  SQLO_SVC_OUT out{};
  return isActiveState(sqloQueryKXLService(serviceName, &out, machine));
}

// Loads the nodes file into the context; false when there is no entry to ask about.
bool loadNodeList(UpgradeContext &context, const UpgradeOptions &options) {
  char directory[SQLO_PATH_SZ] = {};
  if (context.instance == nullptr || context.instance->GetInstanceDir(directory, sizeof directory) != 0)
    return false;
  char nodesFile[KXL_JOINED_PATH_SZ];
  joinPath(nodesFile, directory, "\\kxlnodes.cfg");
  uint32_t entries = 0, maxNode = 0;
  int32_t rc =
      sqloReadKxlnodes(nodesFile, 4, &context.nodeList, 5, &entries, &maxNode, 1, options.instanceName, 1, 0);
  if (rc != 0) {
    pdtError(KXL_FN_IS_INSTANCE_ACTIVE, 1, rc);
    return false;
  }
  return sqloNodeListFirst(context.nodeList) != nullptr;
}

bool anyPartitionActive(UpgradeContext &context, const UpgradeOptions &options) {
  if (!loadNodeList(context, options))
    return false;
  const unsigned char *entry = sqloNodeListFirst(context.nodeList);
  for (int32_t i = 0; i < sqloNodeListCount(context.nodeList); ++i, entry = sqloNodeNext(entry)) {
    char service[kServiceNameSize];
    ossSnprintf(service, sizeof service, "%s-%d", options.instanceName, sqloNodeNumber(entry));
    if (serviceActive(service, sqloNodeMachine(entry)))
      return true;
  }
  return false;
}

} // namespace

bool isInstanceActive(UpgradeContext &context, UpgradeOptions &options) {
  pdtEntry(KXL_FN_IS_INSTANCE_ACTIVE);
  bool active = !isPartitioned(options) ? serviceActive(options.instanceName, nullptr)
                                        : anyPartitionActive(context, options);
  pdtExit(KXL_FN_IS_INSTANCE_ACTIVE, active ? 1 : 0, 0);
  return active;
}

bool hasNodeTypeTemplate(UpgradeContext &, UpgradeOptions &options, uint32_t nodeType) {
  pdtEntry(KXL_FN_HAS_NODE_TYPE_TEMPLATE);
  bool found = false;
  lookForNodeTypeTemplate(options, nodeType, found);
  pdtExit(KXL_FN_HAS_NODE_TYPE_TEMPLATE, found ? 1 : 0, 0);
  return found;
}

int32_t lookForNodeTypeTemplate(const UpgradeOptions &options, uint32_t nodeType, bool &found) {
  found = false;
  const char *name = dbmCfgTemplateName(nodeType);
  if (name == nullptr)
    return 0;
  char folder[KXL_JOINED_PATH_SZ], path[KXL_JOINED_PATH_SZ];
  joinPath(folder, options.currentInstallPath, "CFG");
  joinPath(path, folder, name);
  SQLO_FHANDLE handle = nullptr;
  int32_t rc = sqloopenp(path, kTemplateOpenFlags, SQLO_MODE_PROGRAM, &handle, 0);
  if (rc == SQLO_RC_FILE_NOT_FOUND || rc == SQLO_RC_PATH_NOT_FOUND)
    return 0;
  if (rc != 0)
    return rc;
  sqloclose(handle);
  found = true;
  return 0;
}
