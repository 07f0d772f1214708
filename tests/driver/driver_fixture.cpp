#include "driver_fixture.h"

#include "sim/kxlsim/world_reader.h"
#include "tests/support/command_run.h"

#include <algorithm>
#include <filesystem>
#include <regex>
#include <sstream>

namespace drivertest {

namespace fs = std::filesystem;

using kxltestsupport::readHostFile;

namespace {

constexpr const char *kDriverId = "0x18780502";

void readDriverTrace(const std::string &trace, Outcome &outcome) {
  std::regex error(std::string("error ") + kDriverId + " probe=(-?[0-9]+) rc=(-?[0-9]+)");
  std::regex exit(std::string("exit ") + kDriverId + " rc=(-?[0-9]+)");
  std::istringstream lines(trace);
  for (std::string line; std::getline(lines, line);) {
    std::smatch match;
    if (std::regex_search(line, match, error))
      outcome.failures.push_back({std::stoll(match[1]), std::stoll(match[2])});
    else if (std::regex_search(line, match, exit)) {
      outcome.driverRan = true;
      outcome.driverResult = std::stoll(match[1]);
    }
  }
}

} // namespace

std::string profileKey(const std::string &copyName, const std::string &instance) {
  return kxlsim::copyRegistryKey(copyName) + "\\PROFILES\\" + instance;
}

bool hasBackup(const std::vector<std::string> &entries) {
  return std::any_of(entries.begin(), entries.end(),
                     [](const std::string &name) { return name.rfind("KXL", 0) == 0; });
}

std::string treeDifferences(const Tree &before, const Tree &after) {
  std::string lines;
  for (const auto &[name, content] : before) {
    auto found = after.find(name);
    if (found == after.end())
      lines += "- " + name + "\n";
    else if (found->second != content)
      lines += "~ " + name + "\n";
  }
  for (const auto &entry : after)
    if (before.find(entry.first) == before.end())
      lines += "+ " + entry.first + "\n";
  return lines;
}

Outcome DriverTest::run(const std::vector<std::string> &args, const std::string &faults,
                        const std::string &kill) {
  std::vector<std::string> settings;
  if (!faults.empty())
    settings.push_back("KXLSIM_FAIL=" + faults);
  if (!kill.empty())
    settings.push_back("KXLSIM_KILL=" + kill);
  Outcome outcome;
  static_cast<kxltest::CommandOutcome &>(outcome) = runInWorld(args, settings);
  readDriverTrace(outcome.trace, outcome);
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

Tree DriverTest::tree(const std::string &windowsPath) const {
  Tree files;
  fs::path base = hostPath(windowsPath);
  std::error_code ec;
  for (auto it = fs::recursive_directory_iterator(base, ec); !ec && it != fs::recursive_directory_iterator();
       it.increment(ec))
    files[fs::relative(it->path(), base).string()] =
        it->is_directory() ? "<dir>" : readHostFile(it->path().string());
  return files;
}

bool DriverTest::exists(const std::string &windowsPath) const {
  return fs::exists(hostPath(windowsPath));
}

std::string DriverTest::fileContent(const std::string &windowsPath) const {
  return readHostFile(hostPath(windowsPath));
}

std::string DriverTest::diagnosticLog() const {
  return readHostFile(root() + "/kxldiag.log");
}

void DriverTest::removeTree(const std::string &windowsPath) const {
  std::error_code ignored;
  fs::remove_all(hostPath(windowsPath), ignored);
}

std::vector<std::string> DriverTest::tempEntries() const {
  std::vector<std::string> names;
  std::error_code ec;
  for (auto it = fs::directory_iterator(hostPath(kTempDir), ec); !ec && it != fs::directory_iterator();
       it.increment(ec))
    names.push_back(it->path().filename().string());
  return names;
}

bool DriverTest::keyExists(const std::string &key) const {
  return kxlsim::keyExists(kxlsim::localMachine(), key);
}

std::string DriverTest::stringValue(const std::string &key, const std::string &name) const {
  return kxlsim::stringValue(kxlsim::localMachine(), key, name);
}

DWORD DriverTest::dwordValue(const std::string &key, const std::string &name) const {
  return kxlsim::dwordValue(kxlsim::localMachine(), key, name, 0xFFFFFFFFu);
}

} // namespace drivertest
