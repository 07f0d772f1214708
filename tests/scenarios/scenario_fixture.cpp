#include "scenario_fixture.h"

#include "sim/kxlsim/diff.h"
#include "sim/kxlsim/scenarios.h"
#include "sim/kxlsim/snapshot.h"

#include <fcntl.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <sstream>

namespace kxltest {

namespace fs = std::filesystem;

namespace {

std::string readHostFile(const std::string &path) {
  std::ifstream in(path, std::ios::binary);
  std::stringstream text;
  text << in.rdbuf();
  return text.str();
}

// The result the run's exit trace line reports ("exit <id> rc=<n>"), the last one.
long long tracedResult(const std::string &trace, const char *runId) {
  std::string marker = std::string("exit ") + runId + " rc=";
  size_t at = trace.rfind(marker);
  return at == std::string::npos ? -999999 : std::atoll(trace.c_str() + at + marker.size());
}

void setOrUnset(const char *name, const char *value) {
  if (value != nullptr)
    setenv(name, value, 1);
  else
    unsetenv(name);
}

[[noreturn]] void startCommand(const std::string &program, const std::vector<std::string> &args,
                               const std::string &cwd, const std::string &outFile,
                               const std::string &errFile) {
  std::vector<char *> argv;
  argv.push_back(const_cast<char *>(program.c_str()));
  for (const std::string &arg : args)
    argv.push_back(const_cast<char *>(arg.c_str()));
  argv.push_back(nullptr);
  int out = open(outFile.c_str(), O_WRONLY | O_CREAT | O_TRUNC, 0644);
  int err = open(errFile.c_str(), O_WRONLY | O_CREAT | O_TRUNC, 0644);
  if (out < 0 || err < 0 || chdir(cwd.c_str()) != 0)
    _exit(126);
  dup2(out, 1);
  dup2(err, 2);
  execv(program.c_str(), argv.data());
  _exit(127);
}

} // namespace

std::string readFile(const std::string &hostPath) {
  return readHostFile(hostPath);
}

std::string field(const std::string &name, const std::string &value) {
  return "\"" + name + "\":\"" + value + "\"";
}

std::vector<std::string> eventsOf(const RunResult &result, const std::string &kind) {
  std::vector<std::string> found;
  for (const std::string &line : result.events)
    if (line.find(field("event", kind)) != std::string::npos)
      found.push_back(line);
  return found;
}

std::string ScenarioTest::templateDir_;

namespace {

std::string newTempDir(const char *prefix) {
  std::string pattern = (fs::temp_directory_path() / prefix).string() + ".XXXXXX";
  return mkdtemp(pattern.data()) != nullptr ? pattern : std::string();
}

} // namespace

void ScenarioTest::SetUpTestSuite() {
  templateDir_ = newTempDir("kxlscen-demo");
  kxlsim::InstallSources sources{KXL_TOOLS, KXL_COMMAND, KXL_MESSAGES};
  std::vector<std::string> errors;
  if (templateDir_.empty() || !kxlsim::createWorld(templateDir_ + "/world", "demo", sources, errors))
    templateDir_.clear();
}

void ScenarioTest::TearDownTestSuite() {
  std::error_code ignored;
  if (!templateDir_.empty())
    fs::remove_all(templateDir_, ignored);
}

void ScenarioTest::SetUp() {
  ASSERT_FALSE(templateDir_.empty()) << "the demo world could not be built";
  temp_ = newTempDir("kxlscen");
  ASSERT_FALSE(temp_.empty());
  root_ = temp_ + "/world";
  std::error_code ec;
  fs::copy(templateDir_ + "/world", root_, fs::copy_options::recursive, ec);
  ASSERT_FALSE(ec) << ec.message();
  std::string error;
  ASSERT_TRUE(kxlsim::selectWorld(root_, error)) << error;
}

void ScenarioTest::TearDown() {
  std::error_code ignored;
  if (!HasFailure())
    fs::remove_all(temp_, ignored);
  else
    std::cerr << "world kept in " << temp_ << '\n';
}

void ScenarioTest::useStandInDriver() {
  installCommandAs("kxliupgrade.exe");
}

void ScenarioTest::installCommandAs(const std::string &program) {
  bool standIn = program == "kxliupgrade.exe";
  world.installHostFile(standIn ? KXL_FAKE_COMMAND : KXL_COMMAND,
                        std::string(kCurrentCopy) + "\\bin\\" + program, true);
  ASSERT_TRUE(world.ok());
}

void ScenarioTest::removeCatalogs() {
  for (const char *copy : {kCurrentCopy, kOldCopy, "C:\\Program Files\\ZAV\\KXL8"})
    fs::remove_all(hostPath(std::string(copy) + "\\msg"));
}

void ScenarioTest::addInstance(const std::string &name, const std::string &copy, const std::string &directory,
                               int version, int release) {
  kxlsim::InstanceSpec inst;
  inst.name = name;
  inst.copy = copy;
  inst.directory = directory;
  inst.version = version;
  inst.release = release;
  kxlsim::addInstance(world, inst);
  ASSERT_TRUE(world.ok());
}

void ScenarioTest::addShare(const std::string &server, const std::string &share) {
  std::error_code ec;
  fs::create_directories(root_ + "/unc/" + server + "/" + share, ec);
  ASSERT_FALSE(ec) << ec.message();
}

std::string ScenarioTest::hostPath(const std::string &windowsPath) const {
  std::string path = root_ + "/drive_c" + windowsPath.substr(2);
  for (char &c : path)
    if (c == '\\')
      c = '/';
  while (path.size() > 1 && path.back() == '/')
    path.pop_back();
  return path;
}

RunResult ScenarioTest::run(const std::vector<std::string> &args, const RunSetup &setup) {
  RunResult result;
  std::string tag = temp_ + "/run" + std::to_string(++runs_);
  std::string before = tag + ".before", trace = tag + ".trace", out = tag + ".out", err = tag + ".err";
  world.makeDirectory(setup.cwd);
  std::string error;
  EXPECT_TRUE(kxlsim::snapshotWorld(root_, before, error)) << error;
  std::string events = readHostFile(root_ + "/events.jsonl");
  std::string program = hostPath(std::string(kCurrentCopy) + "\\bin\\" + setup.program);

  pid_t child = fork();
  if (child == 0) {
    setenv("KXLSIM_ROOT", root_.c_str(), 1);
    setenv("KXLTRACE", trace.c_str(), 1);
    unsetenv("KXLSIM_FAIL");
    setOrUnset("KXLINSTANCE", setup.kxlinstance);
    setOrUnset("KXLTEST_DRIVER", setup.driver.empty() ? nullptr : setup.driver.c_str());
    startCommand(program, args, hostPath(setup.cwd), out, err);
  }
  int status = 0;
  waitpid(child, &status, 0);
  result.exitCode = WIFEXITED(status) ? WEXITSTATUS(status) : -1;
  result.out = readHostFile(out);
  result.err = readHostFile(err);
  result.result = tracedResult(readHostFile(trace), kRun);
  std::istringstream added(readHostFile(root_ + "/events.jsonl").substr(events.size()));
  for (std::string line; std::getline(added, line);)
    result.events.push_back(line);
  result.before = before;
  return result;
}

std::string ScenarioTest::changes(const RunResult &result) const {
  std::ostringstream out;
  kxlsim::diffWorlds(result.before, root_, out);
  return out.str();
}

} // namespace kxltest
