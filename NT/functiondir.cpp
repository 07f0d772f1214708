#include "NT/functiondir.h"

#include "NT/pathjoin.h"
#include "platform/kxlsys.h"
#include "upgrade/records.h"

namespace {

// 0 when the directory is there, OSS_RC_PATH_NOT_FOUND when it is missing; a
// test that fails is never taken for a directory that is there.
uint32_t testDirectory(const char *path) {
  OSSPathParam param = {OSS_PATH_PARAM_VERSION, path, 1, 0};
  return ossPathTest(&param);
}

int32_t copyIfNeeded(const UpgradeContext &context, const char *newProfilePath, const char *oldProfilePath) {
  char oldFunctions[KXL_JOINED_PATH_SZ];
  char newFunctions[KXL_JOINED_PATH_SZ];
  joinPath(oldFunctions, oldProfilePath, "\\function");
  joinPath(newFunctions, newProfilePath, "\\function");
  uint32_t tested = testDirectory(newFunctions);
  if (tested != OSS_RC_PATH_NOT_FOUND)
    return static_cast<int32_t>(tested);
  if (context.nodeType == KXL_NODE_TYPE_CLIENT)
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
