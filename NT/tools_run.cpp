#include "NT/tools_run.h"

#include "NT/pathjoin.h"
#include "platform/kxlsys.h"

#include <cstring>

namespace {

constexpr uint32_t kRunByName = SQLO_EXEC_WAIT | SQLO_EXEC_BYNAME;

int32_t runProgram(const char *program, const char *argBlock, uint32_t flags) {
  uint32_t processId = 0;
  SQLO_EXEC_RESULT result = {};
  return sqloexec2(program, argBlock, 0, flags, &processId, &result, 0, 0);
}

// Appends `text` and its terminator at `used`; false when they do not fit
// (the block then keeps what it had).
bool appendString(char *block, std::size_t &used, const char *text) {
  std::size_t length = std::strlen(text) + 1;
  if (length > kSslArgBlockSize - used)
    return false;
  std::memcpy(block + used, text, length);
  used += length;
  return true;
}

} // namespace

int32_t runAuditTool() {
  return runProgram("kxlimaudcfg.exe", nullptr, kRunByName);
}

bool buildSslArguments(char *block, const char *toolPath, const char *instanceDir) {
  std::memset(block, 0, kSslArgBlockSize);
  char clientFile[kSslArgBlockSize];
  char serverFile[kSslArgBlockSize];
  int clientLength = ossSnprintf(clientFile, sizeof clientFile, "\"%s\\SSLClientconfig.ini\"", instanceDir);
  int serverLength = ossSnprintf(serverFile, sizeof serverFile, "\"%s\\SSLconfig.ini\"", instanceDir);
  // A cut file name would name another file: such a block is not built.
  if (clientLength < 0 || serverLength < 0 || clientLength >= int(sizeof clientFile) ||
      serverLength >= int(sizeof serverFile))
    return false;
  std::size_t used = 0;
  // The empty string that ends the block is the zero fill after the last one;
  // it needs its own byte.
  return appendString(block, used, toolPath) && appendString(block, used, "-c") &&
         appendString(block, used, clientFile) && appendString(block, used, "-s") &&
         appendString(block, used, serverFile) && appendString(block, used, "");
}

int32_t runSslTool(const char *copyPath, const char *instanceDir) {
  char toolPath[KXL_JOINED_PATH_SZ];
  joinPath(toolPath, copyPath, "\\bin\\kxlimsslcfg.exe");
  char block[kSslArgBlockSize];
  if (!buildSslArguments(block, toolPath, instanceDir))
    return SQLO_RC_INVALID_ARGUMENT;
  return runProgram(toolPath, block, SQLO_EXEC_WAIT);
}

void runCleanupTool() {
  runProgram("kxlset.exe -cleanup", nullptr, kRunByName);
}
