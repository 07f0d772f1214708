#include "driver_fixture.h"

#include "sim/kxlsim/diff.h"
#include "sim/kxlsim/scenarios.h"
#include "sim/kxlsim/world_reader.h"
#include "tests/support/command_run.h"
#include "tests/support/temp_world.h"

#include <algorithm>
#include <filesystem>
#include <regex>
#include <sstream>

namespace drivertest {

namespace fs = std::filesystem;

using kxltestsupport::readHostFile;

namespace {

constexpr const char *kDriverId = "0x18780502";

// The demo and the cluster world with the command installed, built once for
// the program and copied for every case.
class DemoWorld : public ::testing::Environment {
public:
  void SetUp() override {
    fs::path dir = kxltestsupport::newTempDir("kxldrv-demo");
    kxlsim::InstallSources sources{KXL_TOOLS, KXL_COMMAND, KXL_MESSAGES};
    std::vector<std::string> errors;
    if (!dir.empty() && kxlsim::createWorld((dir / "world").string(), "demo", sources, errors) &&
        kxlsim::createWorld((dir / "cluster").string(), "cluster", sources, errors))
      built = dir;
  }
  void TearDown() override {
    std::error_code ignored;
    if (!built.empty())
      fs::remove_all(built, ignored);
  }
  static inline fs::path built;
};

[[maybe_unused]] const ::testing::Environment *const kDemoWorld =
    ::testing::AddGlobalTestEnvironment(new DemoWorld);

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

void DriverTest::SetUp() {
  ASSERT_FALSE(DemoWorld::built.empty()) << "the demo world could not be built";
  fs::path dir = kxltestsupport::newTempDir("kxldrv");
  ASSERT_FALSE(dir.empty());
  temp_ = dir.string();
  root_ = (dir / "world").string();
  resetWorld();
}

void DriverTest::resetWorld(const char *scenario) {
  std::error_code failure;
  fs::remove_all(root_, failure);
  fs::copy(DemoWorld::built / (std::string(scenario) == "demo" ? "world" : scenario), root_,
           fs::copy_options::recursive, failure);
  ASSERT_FALSE(failure) << failure.message();
  std::string reason;
  ASSERT_TRUE(kxlsim::selectWorld(root_, reason)) << reason;
}

void DriverTest::TearDown() {
  if (HasFailure()) {
    std::cerr << "the world of this case stays in " << temp_ << '\n';
    return;
  }
  std::error_code ignored;
  fs::remove_all(temp_, ignored);
}

Outcome DriverTest::run(const std::vector<std::string> &args, const std::string &faults,
                        const std::string &kill) {
  Outcome outcome;
  std::string tag = temp_ + "/run" + std::to_string(++runs_);
  std::string eventLog = root_ + "/events.jsonl";
  std::size_t eventsBefore = readHostFile(eventLog).size();
  std::string diagLog = root_ + "/kxldiag.log";
  std::size_t diagBefore = readHostFile(diagLog).size();
  kxltestsupport::CommandRun command;
  command.program = hostPath(std::string(kCurrentCopy) + "\\bin\\kxliupgrade.exe");
  command.args = args;
  command.settings = {"KXLSIM_ROOT=" + root_, "KXLTRACE=" + tag + ".trace"};
  if (!faults.empty())
    command.settings.push_back("KXLSIM_FAIL=" + faults);
  if (!kill.empty())
    command.settings.push_back("KXLSIM_KILL=" + kill);
  command.outFile = tag + ".out";
  command.errFile = tag + ".err";
  outcome.exitCode = kxltestsupport::runCommand(command);
  outcome.out = readHostFile(tag + ".out");
  outcome.err = readHostFile(tag + ".err");
  outcome.trace = readHostFile(tag + ".trace");
  readDriverTrace(outcome.trace, outcome);
  std::istringstream added(readHostFile(eventLog).substr(eventsBefore));
  for (std::string line; std::getline(added, line);)
    outcome.events.push_back(line);
  outcome.diagnostics = readHostFile(diagLog).substr(diagBefore);
  return outcome;
}

void DriverTest::keepWorld() {
  kept_ = temp_ + "/kept" + std::to_string(runs_);
  std::error_code failure;
  fs::remove_all(kept_, failure);
  fs::copy(root_, kept_, fs::copy_options::recursive, failure);
  ASSERT_FALSE(failure) << failure.message();
}

std::string DriverTest::worldChanges() const {
  static const char *const kIgnored[] = {"events.jsonl", "kxldiag.log", "C:\\KXLDBMIG.TXT",
                                         "C:\\upgrade.log"};
  std::ostringstream diff;
  kxlsim::diffWorlds(kept_, root_, diff);
  std::istringstream lines(diff.str());
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

std::string DriverTest::hostPath(const std::string &windowsPath) const {
  return kxltestsupport::drivePath(root_, windowsPath);
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
  return readHostFile(root_ + "/kxldiag.log");
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
