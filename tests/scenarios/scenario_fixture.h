// The demo world afresh for every case (tests/support/command_world.h), and a
// way to run the command there as a case sets it up and see what it did:
// besides the outcome, the full result (from the trace of the run's exit) and
// the world as it was before the run, for the differences the run made.
#pragma once

#include "tests/support/command_world.h"

namespace kxltest {

struct RunResult : CommandOutcome {
  long long result = 0; // the run's full result
  std::string before;   // snapshot of the world before the run
};

struct RunSetup {
  std::string cwd = "C:\\";                // Windows directory to run in (created)
  const char *kxlinstance = nullptr;       // KXLINSTANCE at start; null: unset
  std::string program = "kxliupgrade.exe"; // name in the current copy's bin
  std::string driver;                      // KXLTEST_DRIVER for the stand-in driver
  std::string faults;                      // KXLSIM_FAIL for the command ("" none)
};

class ScenarioTest : public CommandWorld {
public:
  static constexpr const char *kIdentity = "SOFTWARE\\ZAV\\KXLSIM\\Identity";

  // Installs the command (the one with the stand-in driver for
  // "kxliupgrade.exe") under `program` in the current copy's bin.
  void installCommandAs(const std::string &program);
  // Removes the message catalogs of every copy.
  void removeCatalogs();
  // A row's world: `setup` run (when given), the catalogs removed unless `catalogs`.
  void prepare(void (*setup)(ScenarioTest &), bool catalogs) {
    if (setup != nullptr)
      setup(*this);
    if (!catalogs)
      removeCatalogs();
  }
  // Registers an instance of `copy` (at version.release) in `directory`.
  void addInstance(const std::string &name, const std::string &copy, const std::string &directory,
                   int version, int release) {
    kxlsim::InstanceRecord entry;
    entry.name = name, entry.copy = copy, entry.directory = directory, entry.version = version,
    entry.release = release;
    kxlsim::addInstance(world, entry);
    ASSERT_TRUE(world.ok());
  }

  RunResult run(const std::vector<std::string> &args, const RunSetup &setup = RunSetup());
  // What the run changed in the world, as kxlsim diff shows it ("" for nothing).
  std::string changes(const RunResult &result) const { return changesSince(result.before); }
};

} // namespace kxltest
