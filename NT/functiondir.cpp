#include "NT/functiondir.h"

#include "NT/pathjoin.h"
#include "platform/kxlsys.h"
#include "upgrade/records.h"

namespace {

constexpr uint32_t kNodeTypeWithoutServer = 2;

bool directoryMissing(const char *path) {
  OSSPathParam param = {OSS_PATH_PARAM_VERSION, path, 1, 0};
  return ossPathTest(&param) == OSS_RC_PATH_NOT_FOUND;
}

int32_t copyIfNeeded(const UpgradeContext &context, const char *newProfilePath, const char *oldProfilePath) {
  char oldFunctions[KXL_JOINED_PATH_SZ];
  char newFunctions[KXL_JOINED_PATH_SZ];
  joinPath(oldFunctions, oldProfilePath, "\\function");
  joinPath(newFunctions, newProfilePath, "\\function");
  if (!directoryMissing(newFunctions))
    return 0;
  if (context.nodeType == kNodeTypeWithoutServer)
    return 0;
  return sqlocopydir(newFunctions, oldFunctions, 0);
}

} // namespace

int32_t copyFunctionDirectory(UpgradeContext &context, const char *newProfilePath,
                              const char *oldProfilePath) {
  pdtEntry(KXL_FN_COPY_FUNCTION_DIRECTORY);
  int32_t rc = copyIfNeeded(context, newProfilePath, oldProfilePath);
  pdtExit(KXL_FN_COPY_FUNCTION_DIRECTORY, rc, 0);
  return rc;
}
