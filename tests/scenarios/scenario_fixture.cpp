#include "scenario_fixture.h"

#include "tests/support/command_run.h"

#include <cstdlib>
#include <filesystem>

namespace kxltest {

namespace fs = std::filesystem;

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
  fs::create_directories(root() + "/unc/" + server + "/" + share, ec);
  ASSERT_FALSE(ec) << ec.message();
}

RunResult ScenarioTest::run(const std::vector<std::string> &args, const RunSetup &setup) {
  world.makeDirectory(setup.cwd);
  RunResult result;
  result.before = snapshot();
  std::vector<std::string> settings;
  if (setup.kxlinstance != nullptr)
    settings.push_back(std::string("KXLINSTANCE=") + setup.kxlinstance);
  if (!setup.driver.empty())
    settings.push_back("KXLTEST_DRIVER=" + setup.driver);
  if (!setup.faults.empty())
    settings.push_back("KXLSIM_FAIL=" + setup.faults);
  static_cast<CommandOutcome &>(result) = runInWorld(args, settings, setup.program, setup.cwd);
  // The last "exit <id> rc=<n>" line of the run's main function.
  const std::string marker = "exit 0x187805B0 rc=";
  std::size_t at = result.trace.rfind(marker);
  result.result = at == std::string::npos ? -999999 : std::atoll(result.trace.c_str() + at + marker.size());
  return result;
}

} // namespace kxltest
