#include "driver_fixture.h"

#include "sim/kxlsim/scenarios.h"
#include "sim/kxlsim/world_reader.h"

#include <fcntl.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <regex>
#include <sstream>

namespace drivertest {

namespace fs = std::filesystem;

namespace {

constexpr const char *kDriverId = "0x18780502";

std::string readHostFile(const std::string &path) {
  std::ifstream in(path, std::ios::binary);
  std::stringstream text;
  text << in.rdbuf();
  return text.str();
}

std::string newTempDir(const char *prefix) {
  std::string pattern = (fs::temp_directory_path() / prefix).string() + ".XXXXXX";
  return mkdtemp(pattern.data()) != nullptr ? pattern : std::string();
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

[[noreturn]] void startCommand(const std::string &program, const std::vector<std::string> &args,
                               const std::string &outFile, const std::string &errFile) {
  std::vector<char *> argv;
  argv.push_back(const_cast<char *>(program.c_str()));
  for (const std::string &arg : args)
    argv.push_back(const_cast<char *>(arg.c_str()));
  argv.push_back(nullptr);
  int out = open(outFile.c_str(), O_WRONLY | O_CREAT | O_TRUNC, 0644);
  int err = open(errFile.c_str(), O_WRONLY | O_CREAT | O_TRUNC, 0644);
  if (out < 0 || err < 0)
    _exit(126);
  dup2(out, 1);
  dup2(err, 2);
  execv(program.c_str(), argv.data());
  _exit(127);
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

std::string DriverTest::templateDir_;

void DriverTest::SetUpTestSuite() {
  templateDir_ = newTempDir("kxldrv-demo");
  kxlsim::InstallSources sources{KXL_TOOLS, KXL_COMMAND, KXL_MESSAGES};
  std::vector<std::string> errors;
  if (templateDir_.empty() || !kxlsim::createWorld(templateDir_ + "/world", "demo", sources, errors))
    templateDir_.clear();
}

void DriverTest::TearDownTestSuite() {
  std::error_code ignored;
  if (!templateDir_.empty())
    fs::remove_all(templateDir_, ignored);
}

void DriverTest::SetUp() {
  ASSERT_FALSE(templateDir_.empty()) << "the demo world could not be built";
  temp_ = newTempDir("kxldrv");
  ASSERT_FALSE(temp_.empty());
  root_ = temp_ + "/world";
  std::error_code ec;
  fs::copy(templateDir_ + "/world", root_, fs::copy_options::recursive, ec);
  ASSERT_FALSE(ec) << ec.message();
  std::string error;
  ASSERT_TRUE(kxlsim::selectWorld(root_, error)) << error;
}

void DriverTest::TearDown() {
  std::error_code ignored;
  if (!HasFailure())
    fs::remove_all(temp_, ignored);
  else
    std::cerr << "world kept in " << temp_ << '\n';
}

Outcome DriverTest::run(const std::vector<std::string> &args, const std::string &faults) {
  Outcome outcome;
  std::string tag = temp_ + "/run" + std::to_string(++runs_);
  std::string trace = tag + ".trace", out = tag + ".out", err = tag + ".err";
  std::string events = readHostFile(root_ + "/events.jsonl");
  std::string program = hostPath(std::string(kCurrentCopy) + "\\bin\\kxliupgrade.exe");
  pid_t child = fork();
  if (child == 0) {
    setenv("KXLSIM_ROOT", root_.c_str(), 1);
    setenv("KXLTRACE", trace.c_str(), 1);
    if (faults.empty())
      unsetenv("KXLSIM_FAIL");
    else
      setenv("KXLSIM_FAIL", faults.c_str(), 1);
    unsetenv("KXLINSTANCE");
    unsetenv("TMP");
    unsetenv("TEMP");
    startCommand(program, args, out, err);
  }
  int status = 0;
  waitpid(child, &status, 0);
  outcome.exitCode = WIFEXITED(status) ? WEXITSTATUS(status) : -1;
  outcome.out = readHostFile(out);
  outcome.err = readHostFile(err);
  outcome.trace = readHostFile(trace);
  readDriverTrace(outcome.trace, outcome);
  std::istringstream added(readHostFile(root_ + "/events.jsonl").substr(events.size()));
  for (std::string line; std::getline(added, line);)
    outcome.events.push_back(line);
  return outcome;
}

std::string DriverTest::hostPath(const std::string &windowsPath) const {
  std::string path = root_ + "/drive_c" + windowsPath.substr(2);
  for (char &c : path)
    if (c == '\\')
      c = '/';
  while (path.size() > 1 && path.back() == '/')
    path.pop_back();
  return path;
}

Tree DriverTest::tree(const std::string &windowsPath) const {
  Tree files;
  std::string base = hostPath(windowsPath);
  std::error_code ec;
  for (auto it = fs::recursive_directory_iterator(base, ec); !ec && it != fs::recursive_directory_iterator();
       it.increment(ec)) {
    std::string relative = fs::relative(it->path(), base).string();
    files[relative] = it->is_directory() ? std::string("<dir>") : readHostFile(it->path().string());
  }
  return files;
}

bool DriverTest::exists(const std::string &windowsPath) const {
  return fs::exists(hostPath(windowsPath));
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
