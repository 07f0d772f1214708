#include "driver_fixture.h"

#include "tests/support/command_run.h"

#include <filesystem>
#include <regex>
#include <sstream>

namespace drivertest {

namespace fs = std::filesystem;

Outcome DriverTest::run(const std::vector<std::string> &args, const std::string &faults,
                        const std::string &kill) {
  std::vector<std::string> settings;
  if (!faults.empty())
    settings.push_back("KXLSIM_FAIL=" + faults);
  if (!kill.empty())
    settings.push_back("KXLSIM_KILL=" + kill);
  Outcome outcome;
  static_cast<kxltest::CommandOutcome &>(outcome) = runInWorld(args, settings);
  static const std::regex error("error 0x18780502 probe=(-?[0-9]+) rc=(-?[0-9]+)");
  static const std::regex exit("exit 0x18780502 rc=(-?[0-9]+)");
  std::istringstream lines(outcome.trace);
  for (std::string line; std::getline(lines, line);) {
    std::smatch match;
    if (std::regex_search(line, match, error))
      outcome.failures.push_back({std::stoll(match[1]), std::stoll(match[2])});
    else if (std::regex_search(line, match, exit)) {
      outcome.driverRan = true;
      outcome.driverResult = std::stoll(match[1]);
    }
  }
  return outcome;
}

void DriverTest::expectFailure(const Outcome &outcome, long long probe, long long rc) {
  ASSERT_TRUE(outcome.driverRan) << outcome.out << outcome.err;
  ASSERT_EQ(outcome.failures.size(), 1u) << outcome.trace;
  EXPECT_EQ(outcome.failures[0].probe, probe);
  EXPECT_EQ(outcome.driverResult, rc);
}

std::string DriverTest::worldChanges() const {
  static const char *const kIgnored[] = {"events.jsonl", "kxldiag.log", "C:\\KXLDBMIG.TXT",
                                         "C:\\upgrade.log"};
  std::istringstream lines(changesSince(kept_));
  std::string changes;
  bool skipping = false;
  for (std::string line; std::getline(lines, line);) {
    if (line.rfind("  ", 0) != 0) {
      skipping = false;
      for (const char *ignored : kIgnored)
        skipping = skipping || line.find(std::string(" ") + ignored + " ") != std::string::npos;
    }
    if (!skipping)
      changes += line + "\n";
  }
  return changes;
}

std::map<std::string, std::string> DriverTest::tree(const std::string &windowsPath) const {
  std::map<std::string, std::string> files;
  fs::path base = hostPath(windowsPath);
  std::error_code ec;
  for (auto it = fs::recursive_directory_iterator(base, ec); !ec && it != fs::recursive_directory_iterator();
       it.increment(ec))
    files[fs::relative(it->path(), base).string()] =
        it->is_directory() ? "<dir>" : kxltestsupport::readHostFile(it->path().string());
  return files;
}

bool DriverTest::hasBackup() const {
  std::error_code ec;
  for (auto it = fs::directory_iterator(hostPath("C:\\windows\\temp"), ec);
       !ec && it != fs::directory_iterator(); it.increment(ec))
    if (it->path().filename().string().rfind("KXL", 0) == 0)
      return true;
  return false;
}

} // namespace drivertest
