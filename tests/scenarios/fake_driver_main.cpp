// The upgrade command with a stand-in driver, for scenarios that reach the
// driver. KXLTEST_DRIVER ("rc=N,reason=N,extra=N,old=N,new=N,sqlcode=N", each
// optional) says what the driver reports; what it was handed is appended to
// the world's event log as a "fake_driver" event, and the value of
// KXLINSTANCE when the run has returned as a "fake_exit" event.
#include "engn/sqo/run.h"
#include "sim/common/events.h"

#include <cstdio>
#include <cstdlib>
#include <string>

namespace {

std::string environment(const char *name, const char *unset) {
  const char *value = std::getenv(name);
  return value != nullptr ? value : unset;
}

long driverSetting(const char *name) {
  std::string settings = "," + environment("KXLTEST_DRIVER", ""), key = std::string(",") + name + "=";
  std::size_t at = settings.find(key);
  return at == std::string::npos ? 0 : std::strtol(settings.c_str() + at + key.size(), nullptr, 10);
}

int fakeDriver(UpgradeContext &context, UpgradeOptions &options) {
  char flags[8];
  std::snprintf(flags, sizeof flags, "0x%04X", options.flags);
  kxlsim::appendEvent("fake_driver", {{"instance", options.instanceName},
                                      {"flags", flags},
                                      {"profile", options.profilePath},
                                      {"node_type", std::to_string(context.nodeType)},
                                      {"partitioned", std::to_string(options.partitionedInstance)},
                                      {"copy_path", context.copyPath},
                                      {"ports", std::string(context.var159Head) + ":" + context.var159Tail},
                                      {"kxlinstance", environment("KXLINSTANCE", "<unset>")}});
  options.partitionRecord.textSearchReasonCode = static_cast<int32_t>(driverSetting("reason"));
  options.partitionRecord.extraMessage = static_cast<int32_t>(driverSetting("extra"));
  options.oldInstanceType = static_cast<uint32_t>(driverSetting("old"));
  options.newInstanceType = static_cast<uint32_t>(driverSetting("new"));
  if (long sqlcode = driverSetting("sqlcode"); sqlcode != 0)
    sqlzRcToSqlca(0, &options.status, "KXLIUPGRADE", static_cast<int32_t>(sqlcode), 0, 0);
  return static_cast<int>(driverSetting("rc"));
}

} // namespace

int main(int argc, char **argv) {
  int rc = runUpgrade(argc, argv, fakeDriver);
  kxlsim::appendEvent("fake_exit", {{"kxlinstance", environment("KXLINSTANCE", "<unset>")}});
  return rc;
}
