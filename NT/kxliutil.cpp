#include "NT/kxliutil.h"

#include "platform/kxlsys.h"

#include <cstdio>

namespace {

// Until the engine is built the driver refuses every instance without
// touching it; the code has no catalog text, so the plain line is printed.
constexpr int kEngineMissing = -1999;

} // namespace

int upgradeInstance(UpgradeContext &, UpgradeOptions &) {
  pdtEntry(KXL_FN_UPGRADE_INSTANCE);
  std::fputs("upgrade engine not available in this build\n", stderr);
  pdtExit(KXL_FN_UPGRADE_INSTANCE, kEngineMissing, 1);
  return kEngineMissing;
}
