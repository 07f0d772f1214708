// Started by the launch tests. Writes what it was given to the file named by
// KXL_CHILD_REPORT (one "key=value" line each) and exits with the code in KXL_CHILD_EXIT.
#include "platform/win32.h"

#include <cstdio>
#include <cstdlib>
#include <unistd.h>

namespace {

const char *envOr(const char *name, const char *fallback) {
  const char *value = std::getenv(name);
  return value != nullptr ? value : fallback;
}

} // namespace

int main(int argc, char **argv) {
  FILE *report = std::fopen(envOr("KXL_CHILD_REPORT", "/dev/null"), "w");
  if (report == nullptr)
    return 99;
  char cwd[4096];
  std::fprintf(report, "cwd=%s\n", getcwd(cwd, sizeof cwd) != nullptr ? cwd : "");
  char module[MAX_PATH];
  DWORD length = GetModuleFileNameA(nullptr, module, sizeof module);
  std::fprintf(report, "module=%s\n", length > 0 ? module : "");
  std::fprintf(report, "value=%s\n", envOr("KXL_CHILD_VALUE", "<unset>"));
  std::fprintf(report, "argc=%d\n", argc);
  for (int i = 1; i < argc; ++i)
    std::fprintf(report, "arg=%s\n", argv[i]);
  std::fclose(report);
  return std::atoi(envOr("KXL_CHILD_EXIT", "0"));
}
