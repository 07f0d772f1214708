// A fresh demo world per case, the command installed in the current copy's
// bin, and a way to run it there and see what it did: exit code, full result
// (from the trace of the run's exit), standard output, new events and the
// differences the run made to the world.
#pragma once

#include "sim/kxlsim/scenario_parts.h"

#include <gtest/gtest.h>

#include <string>
#include <vector>

namespace kxltest {

struct RunResult {
  int exitCode = -1;               // low 8 bits, as the host keeps them
  long long result = 0;            // the run's full result
  std::string out, err;            // standard output and error
  std::vector<std::string> events; // lines appended to events.jsonl
  std::string before;              // host folder of the world as it was before the run
};

struct RunSetup {
  std::string cwd = "C:\\";                // Windows directory to run in (created)
  const char *kxlinstance = nullptr;       // KXLINSTANCE at start; null: unset
  std::string program = "kxliupgrade.exe"; // name in the current copy's bin
  std::string driver;                      // KXLTEST_DRIVER for the stand-in driver
  std::string faults;                      // KXLSIM_FAIL for the command ("" none)
};

class ScenarioTest : public ::testing::Test {
protected:
  static constexpr const char *kCurrentCopy = "C:\\Program Files\\ZAV\\KXL101";
  static constexpr const char *kOldCopy = "C:\\Program Files\\ZAV\\KXL95";
  static constexpr const char *kIdentity = "SOFTWARE\\ZAV\\KXLSIM\\Identity";
  static constexpr const char *kTools = "SOFTWARE\\ZAV\\KXLSIM\\Tools\\kxlckupgrade";
  static constexpr const char *kRun = "0x187805B0";

  // The demo world is built once and copied for every case.
  static void SetUpTestSuite();
  static void TearDownTestSuite();
  void SetUp() override;
  void TearDown() override;

  // Installs the command with the stand-in driver in place of the real one.
  void useStandInDriver();
  // Installs the current command under another name in the current copy's bin.
  void installCommandAs(const std::string &program);
  // Removes the message catalogs of every copy.
  void removeCatalogs();
  // Registers an instance of `copy` (at version.release) in `directory`.
  void addInstance(const std::string &name, const std::string &copy, const std::string &directory,
                   int version, int release);
  // Makes \\server\share reachable.
  void addShare(const std::string &server, const std::string &share);
  // Host path of a Windows path on drive C:.
  std::string hostPath(const std::string &windowsPath) const;

  RunResult run(const std::vector<std::string> &args, const RunSetup &setup = RunSetup());
  // What the run changed in the world, as kxlsim diff shows it ("" for nothing).
  std::string changes(const RunResult &result) const;

  kxlsim::WorldWriter world;

private:
  static std::string templateDir_;
  std::string temp_;
  std::string root_;
  int runs_ = 0;
};

// The whole content of a host file ("" when it cannot be read).
std::string readFile(const std::string &hostPath);
// The "key":"value" pair as it stands in an event line.
std::string field(const std::string &name, const std::string &value);
// Events of `kind` among the lines.
std::vector<std::string> eventsOf(const RunResult &result, const std::string &kind);

} // namespace kxltest
