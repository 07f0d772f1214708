#include "scenario_fixture.h"

#include <cstdlib>
#include <filesystem>

namespace kxltest {

void ScenarioTest::installCommandAs(const std::string &program) {
  world.installHostFile(program == "kxliupgrade.exe" ? KXL_FAKE_COMMAND : KXL_COMMAND,
                        std::string(kCurrentCopy) + "\\bin\\" + program, true);
  ASSERT_TRUE(world.ok());
}

void ScenarioTest::removeCatalogs() {
  for (const char *copy : {kCurrentCopy, kOldCopy, "C:\\Program Files\\ZAV\\KXL8"})
    std::filesystem::remove_all(hostPath(std::string(copy) + "\\msg"));
}

RunResult ScenarioTest::run(const std::vector<std::string> &args, const RunSetup &setup) {
  world.makeDirectory(setup.cwd);
  RunResult result;
  result.before = snapshot();
  std::vector<std::string> settings = {"KXLTEST_DRIVER=" + setup.driver, "KXLSIM_FAIL=" + setup.faults};
  if (setup.kxlinstance != nullptr)
    settings.push_back(std::string("KXLINSTANCE=") + setup.kxlinstance);
  static_cast<CommandOutcome &>(result) = runInWorld(args, settings, setup.program, setup.cwd);
  // The last "exit <id> rc=<n>" line of the run's main function.
  const std::string marker = "exit 0x187805B0 rc=";
  std::size_t at = result.trace.rfind(marker);
  result.result = at == std::string::npos ? -999999 : std::atoll(result.trace.c_str() + at + marker.size());
  return result;
}

} // namespace kxltest
