// A copy of a scenario world (the demo world, or another scenario's) for every
// case, with the built command installed in the current copy, and the command
// run in it: its exit code, output, trace, and the events and diagnostic lines
// it added. Compiled into each program that uses it, with the program's
// KXL_COMMAND.
#pragma once

#include "sim/kxlsim/scenario_parts.h"
#include "tests/support/temp_world.h"

#include <gtest/gtest.h>

#include <memory>
#include <string>
#include <vector>

namespace kxltest {

struct CommandOutcome {
  int exitCode = -1;               // low 8 bits, as the host keeps them
  std::string out, err, trace;     // standard output and error, the run's trace
  std::vector<std::string> events; // lines the run appended to events.jsonl
  std::string diagnostics;         // what the run appended to the diagnostic log
};

class CommandWorld : public ::testing::Test {
public:
  static constexpr const char *kCurrentCopy = "C:\\Program Files\\ZAV\\KXL101";
  static constexpr const char *kOldCopy = "C:\\Program Files\\ZAV\\KXL95";

  void SetUp() override { resetWorld(); }
  void TearDown() override { machine_->leave(); }

  // The demo world afresh, or the world of another scenario ("cluster").
  void resetWorld(const std::string &scenario = "demo");
  // Runs `program` of the current copy's bin in the Windows directory `cwd`
  // ("" the test's own), with KXLSIM_ROOT, KXLTRACE and `settings` (NAME=value).
  CommandOutcome runInWorld(const std::vector<std::string> &args, std::vector<std::string> settings,
                            const std::string &program = "kxliupgrade.exe", const std::string &cwd = "");
  // A copy of the world as it is now, and what differs from it now as
  // `kxlsim diff` shows it ("" for nothing).
  std::string snapshot();
  std::string changesSince(const std::string &snapshot) const;
  std::string hostPath(const std::string &windowsPath) const;
  const std::string &root() const { return machine_->root(); }

  kxlsim::WorldWriter world;

private:
  std::unique_ptr<kxltestsupport::TempWorld> machine_;
  int runs_ = 0, snapshots_ = 0;
};

// The "key":"value" pair as it stands in an event line.
std::string field(const std::string &name, const std::string &value);
// The run's events of `kind`.
std::vector<std::string> eventsOf(const CommandOutcome &run, const std::string &kind);

} // namespace kxltest
