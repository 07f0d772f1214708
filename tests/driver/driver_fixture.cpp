#include "driver_fixture.h"

#include "sim/kxlsim/scenarios.h"
#include "sim/kxlsim/world_reader.h"

#include <fcntl.h>
#include <spawn.h>
#include <sys/wait.h>

#include <algorithm>
#include <cstdlib>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <regex>
#include <sstream>

extern char **environ;

namespace drivertest {

namespace fs = std::filesystem;

namespace {

constexpr const char *kDriverId = "0x18780502";

// Variables of the test's own environment that the command must not inherit.
constexpr const char *kScrubbed[] = {"KXLSIM_ROOT", "KXLTRACE", "KXLSIM_FAIL", "KXLINSTANCE", "TMP", "TEMP"};

std::string contentOf(const fs::path &path) {
  std::ifstream in(path, std::ios::binary);
  return std::string(std::istreambuf_iterator<char>(in), std::istreambuf_iterator<char>());
}

fs::path uniqueDirectory(const std::string &stem) {
  std::string pattern = (fs::temp_directory_path() / (stem + ".XXXXXX")).string();
  if (mkdtemp(pattern.data()) == nullptr)
    return {};
  return pattern;
}

// The demo world with the command installed, built once for the program and
// copied for every case.
class DemoWorld : public ::testing::Environment {
public:
  void SetUp() override {
    fs::path dir = uniqueDirectory("kxldrv-demo");
    kxlsim::InstallSources sources{KXL_TOOLS, KXL_COMMAND, KXL_MESSAGES};
    std::vector<std::string> errors;
    if (!dir.empty() && kxlsim::createWorld((dir / "world").string(), "demo", sources, errors))
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

bool scrubbed(const char *entry) {
  return std::any_of(std::begin(kScrubbed), std::end(kScrubbed), [entry](const char *name) {
    std::size_t length = std::strlen(name);
    return std::strncmp(entry, name, length) == 0 && entry[length] == '=';
  });
}

// The command's environment: the test's own, scrubbed, plus `settings`.
std::vector<std::string> commandEnvironment(const std::vector<std::string> &settings) {
  std::vector<std::string> entries;
  for (char **entry = environ; *entry != nullptr; ++entry)
    if (!scrubbed(*entry))
      entries.emplace_back(*entry);
  entries.insert(entries.end(), settings.begin(), settings.end());
  return entries;
}

std::vector<char *> pointersTo(std::vector<std::string> &texts) {
  std::vector<char *> pointers;
  for (std::string &text : texts)
    pointers.push_back(text.data());
  pointers.push_back(nullptr);
  return pointers;
}

// Runs `argv` with standard output and error into the two files; exit code.
int spawnAndWait(std::vector<std::string> argv, std::vector<std::string> environment, const std::string &out,
                 const std::string &err) {
  posix_spawn_file_actions_t actions;
  posix_spawn_file_actions_init(&actions);
  posix_spawn_file_actions_addopen(&actions, 1, out.c_str(), O_WRONLY | O_CREAT | O_TRUNC, 0644);
  posix_spawn_file_actions_addopen(&actions, 2, err.c_str(), O_WRONLY | O_CREAT | O_TRUNC, 0644);
  std::vector<char *> args = pointersTo(argv);
  std::vector<char *> env = pointersTo(environment);
  pid_t child = 0;
  int started = posix_spawn(&child, args[0], &actions, nullptr, args.data(), env.data());
  posix_spawn_file_actions_destroy(&actions);
  if (started != 0)
    return -1;
  int status = 0;
  waitpid(child, &status, 0);
  return WIFEXITED(status) ? WEXITSTATUS(status) : -1;
}

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
  fs::path dir = uniqueDirectory("kxldrv");
  ASSERT_FALSE(dir.empty());
  temp_ = dir.string();
  root_ = (dir / "world").string();
  std::error_code failure;
  fs::copy(DemoWorld::built / "world", root_, fs::copy_options::recursive, failure);
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

Outcome DriverTest::run(const std::vector<std::string> &args, const std::string &faults) {
  Outcome outcome;
  std::string tag = temp_ + "/run" + std::to_string(++runs_);
  std::string eventLog = root_ + "/events.jsonl";
  std::size_t eventsBefore = contentOf(eventLog).size();
  std::vector<std::string> argv = {hostPath(std::string(kCurrentCopy) + "\\bin\\kxliupgrade.exe")};
  argv.insert(argv.end(), args.begin(), args.end());
  std::vector<std::string> settings = {"KXLSIM_ROOT=" + root_, "KXLTRACE=" + tag + ".trace"};
  if (!faults.empty())
    settings.push_back("KXLSIM_FAIL=" + faults);
  outcome.exitCode = spawnAndWait(argv, commandEnvironment(settings), tag + ".out", tag + ".err");
  outcome.out = contentOf(tag + ".out");
  outcome.err = contentOf(tag + ".err");
  outcome.trace = contentOf(tag + ".trace");
  readDriverTrace(outcome.trace, outcome);
  std::istringstream added(contentOf(eventLog).substr(eventsBefore));
  for (std::string line; std::getline(added, line);)
    outcome.events.push_back(line);
  return outcome;
}

std::string DriverTest::hostPath(const std::string &windowsPath) const {
  // "C:\a\b" -> "<world>/drive_c/a/b"
  std::string relative = windowsPath.substr(std::min<std::size_t>(3, windowsPath.size()));
  std::replace(relative.begin(), relative.end(), '\\', '/');
  fs::path path = fs::path(root_) / "drive_c" / relative;
  std::string text = path.string();
  while (!text.empty() && text.back() == '/')
    text.pop_back();
  return text;
}

Tree DriverTest::tree(const std::string &windowsPath) const {
  Tree files;
  fs::path base = hostPath(windowsPath);
  std::error_code ec;
  for (auto it = fs::recursive_directory_iterator(base, ec); !ec && it != fs::recursive_directory_iterator();
       it.increment(ec))
    files[fs::relative(it->path(), base).string()] = it->is_directory() ? "<dir>" : contentOf(it->path());
  return files;
}

bool DriverTest::exists(const std::string &windowsPath) const {
  return fs::exists(hostPath(windowsPath));
}

std::string DriverTest::fileContent(const std::string &windowsPath) const {
  return contentOf(hostPath(windowsPath));
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
