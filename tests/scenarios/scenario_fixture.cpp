#include "scenario_fixture.h"

#include "sim/kxlsim/diff.h"
#include "sim/kxlsim/scenarios.h"
#include "sim/kxlsim/snapshot.h"
#include "tests/support/command_run.h"
#include "tests/support/temp_world.h"

#include <cstdlib>
#include <filesystem>
#include <sstream>

namespace kxltest {

namespace fs = std::filesystem;

using kxltestsupport::newTempDir;
using kxltestsupport::readHostFile;

namespace {

// The result the run's exit trace line reports ("exit <id> rc=<n>"), the last one.
long long tracedResult(const std::string &trace, const char *runId) {
  std::string marker = std::string("exit ") + runId + " rc=";
  size_t at = trace.rfind(marker);
  return at == std::string::npos ? -999999 : std::atoll(trace.c_str() + at + marker.size());
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
  return kxltestsupport::drivePath(root_, windowsPath);
}

RunResult ScenarioTest::run(const std::vector<std::string> &args, const RunSetup &setup) {
  RunResult result;
  std::string tag = temp_ + "/run" + std::to_string(++runs_);
  std::string before = tag + ".before", trace = tag + ".trace", out = tag + ".out", err = tag + ".err";
  world.makeDirectory(setup.cwd);
  std::string error;
  EXPECT_TRUE(kxlsim::snapshotWorld(root_, before, error)) << error;
  std::string events = readHostFile(root_ + "/events.jsonl");
  kxltestsupport::CommandRun command;
  command.program = hostPath(std::string(kCurrentCopy) + "\\bin\\" + setup.program);
  command.args = args;
  command.settings = {"KXLSIM_ROOT=" + root_, "KXLTRACE=" + trace};
  if (setup.kxlinstance != nullptr)
    command.settings.push_back(std::string("KXLINSTANCE=") + setup.kxlinstance);
  if (!setup.driver.empty())
    command.settings.push_back("KXLTEST_DRIVER=" + setup.driver);
  if (!setup.faults.empty())
    command.settings.push_back("KXLSIM_FAIL=" + setup.faults);
  command.cwd = hostPath(setup.cwd);
  command.outFile = out;
  command.errFile = err;
  result.exitCode = kxltestsupport::runCommand(command);
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
