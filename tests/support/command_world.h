// A world built once per test program by kxlsim with the command installed
// (the demo world, or another scenario's), copied afresh for every case, and
// the installed command run in it: its exit code, output, trace, and the
// events and diagnostic lines it added. Compiled into each program that uses
// it, with the program's KXL_TOOLS, KXL_COMMAND and KXL_MESSAGES.
#pragma once

#include "sim/kxlsim/scenario_parts.h"

#include <gtest/gtest.h>

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
protected:
  static constexpr const char *kCurrentCopy = "C:\\Program Files\\ZAV\\KXL101";
  static constexpr const char *kOldCopy = "C:\\Program Files\\ZAV\\KXL95";

  void SetUp() override;    // a fresh demo world
  void TearDown() override; // kept for a look when the case failed

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
  const std::string &root() const { return root_; }

  kxlsim::WorldWriter world;

private:
  std::string temp_, root_;
  int runs_ = 0, snapshots_ = 0;
};

// The "key":"value" pair as it stands in an event line.
std::string field(const std::string &name, const std::string &value);
// The run's events of `kind`.
std::vector<std::string> eventsOf(const CommandOutcome &run, const std::string &kind);

} // namespace kxltest
