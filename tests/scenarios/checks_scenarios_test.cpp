// Checks of caller, instance and copies that stop the run before the driver.
#include "expected_texts.h"
#include "scenario_fixture.h"

namespace {

using kxlsim::localMachine;
using kxltest::RunResult;
using kxltest::RunSetup;

class CheckScenario : public kxltest::ScenarioTest {
protected:
  void setCopyLevel(const std::string &copy, int version, int release) {
    std::string key = "SOFTWARE\\ZAV\\KXL\\InstalledCopies\\" + copy + "\\CurrentVersion";
    world.setString(localMachine(), key, "Version", std::to_string(version));
    world.setString(localMachine(), key, "Release", std::to_string(release));
  }
  void setToolExit(DWORD code) { kxlsim::setToolExitCode(world, "kxlckupgrade", code); }
};

TEST_F(CheckScenario, UnknownInstanceNamesItself) {
  RunResult r = run({"nosuch"});
  EXPECT_EQ(r.out, kxltest::unknownInstanceText("NOSUCH"));
  EXPECT_EQ(r.result, 1951);
  EXPECT_EQ(changes(r), "");
}

// The level check of the instance's copy comes first, so an instance of the
// current copy is reported as such only by a current copy below 9.7.
TEST_F(CheckScenario, InstanceOfTheCurrentCopyIsLeftAlone) {
  setCopyLevel("KXL101", 9, 6);
  addInstance("NEWINST", "KXL101", std::string(kCurrentCopy) + "\\NEWINST", 10, 1);
  RunResult r = run({"NEWINST"});
  EXPECT_EQ(r.out, kxltest::alreadyUpgradedText("NEWINST"));
  EXPECT_EQ(r.result, 1950);
  EXPECT_EQ(changes(r), "");
}

TEST_F(CheckScenario, CopyVersionsOutsideTheUpgradeRangeAreRefused) {
  setCopyLevel("KXL95", 9, 7);
  RunResult r97 = run({"INST1"});
  EXPECT_EQ(r97.out, kxltest::badVersionText("INST1"));
  EXPECT_EQ(r97.result, -1949);
  EXPECT_EQ(changes(r97), "");

  setCopyLevel("KXL95", 10, 1);
  EXPECT_EQ(run({"INST1"}).result, -1949);

  setCopyLevel("KXL95", 9, 5);
  setCopyLevel("KXL101", 8, 2);
  RunResult current = run({"INST1"});
  EXPECT_EQ(current.out, kxltest::badVersionText("INST1"));
  EXPECT_EQ(current.result, -1949);
  RunResult installer = run({"-install", "INST1"});
  EXPECT_EQ(installer.out, kxltest::badVersionText("INST1"))
      << "a current copy below 9 is refused to installers too";
  EXPECT_EQ(installer.result, 2);
}

TEST_F(CheckScenario, InstanceReservedByTheGlobalProfileIsRefused) {
  world.setString(localMachine(), "SOFTWARE\\ZAV\\KXL\\InstalledCopies\\KXL95\\GLOBAL_PROFILE",
                  "KXLRESERVEDINST", "inst1");
  RunResult r = run({"INST1"});
  EXPECT_EQ(r.out, kxltest::kReservedText);
  EXPECT_EQ(r.result, -1139);
  EXPECT_EQ(changes(r), "");
  setToolExit(7);
  EXPECT_EQ(run({"INST2", "-u", "a,b"}).result, -1069) << "only the reserved name is refused";
}

TEST_F(CheckScenario, NonAdministratorIsNamedAndNothingChanges) {
  world.setDword(localMachine(), kIdentity, "LocalAdmin", 0x01);
  world.setString(localMachine(), kIdentity, "AuthId", "JDOE");
  RunResult r = run({"INST1"});
  EXPECT_EQ(r.out, kxltest::notAdminText("JDOE"));
  EXPECT_EQ(r.result, -1);
  EXPECT_EQ(changes(r), "");
  EXPECT_TRUE(r.events.empty()) << "the database check never ran";

  removeCatalogs();
  EXPECT_EQ(run({"INST1"}).out, "KXLIMIGR:processing complete, SQLCODE=-1092\n");
}

TEST_F(CheckScenario, PartitionedInstanceNeedsAccountNameAndPassword) {
  EXPECT_EQ(run({"INST2"}).out, kxltest::kUsageText);
  RunResult nameOnly = run({"-u", "kxlsvc", "INST2"});
  EXPECT_EQ(nameOnly.out, kxltest::kUsageText);
  EXPECT_EQ(nameOnly.result, -1946);
  EXPECT_EQ(changes(nameOnly), "");
}

TEST_F(CheckScenario, ActiveInstanceIsRefusedBeforeTheCheckTool) {
  world.setDword(localMachine(), "SOFTWARE\\ZAV\\KXLSIM\\Services\\INST1", "State", 4);
  RunResult single = run({"INST1"});
  EXPECT_EQ(single.out, kxltest::kActiveText);
  EXPECT_EQ(single.result, -1953);
  EXPECT_EQ(changes(single), "");

  // Only the second partition runs, on the other machine.
  world.setDword(kxlsim::remoteMachine("WINSRV2"), "SOFTWARE\\ZAV\\KXLSIM\\Services\\INST2-1", "State", 4);
  RunResult partitioned = run({"-u", "kxlsvc,secret", "INST2"});
  EXPECT_EQ(partitioned.result, -1953);
  EXPECT_EQ(changes(partitioned), "");
}

TEST_F(CheckScenario, CheckToolProblemsNameTheLogFile) {
  setToolExit(3);
  RunSetup inDir;
  inDir.cwd = "C:\\work\\check";
  RunResult r = run({"INST1"}, inDir);
  EXPECT_EQ(r.result, -1205);
  EXPECT_EQ(r.out,
            "KXL1205E  The database check found objects that must be corrected before the instance can "
            "be upgraded. The details are in the log file \"\"C:\\work\\check\\upgrade.log\"\".\n");
  ASSERT_EQ(kxltest::eventsOf(r, "program").size(), 1u);
  std::string tool = kxltest::eventsOf(r, "program")[0];
  EXPECT_NE(tool.find(kxltest::field("KXLINSTANCE", "INST1")), std::string::npos) << tool;
  EXPECT_NE(tool.find("-h -m -not1 -l C:\\\\work\\\\check\\\\upgrade.log -t C:\\\\work\\\\check\""),
            std::string::npos)
      << tool;
  EXPECT_TRUE(kxltest::eventsOf(r, "audit").empty()) << "the run stopped before the upgrade";
}

TEST_F(CheckScenario, CheckToolFailureNamesToolAndExitCode) {
  setToolExit(7);
  RunResult r = run({"INST1"});
  EXPECT_EQ(r.result, -1069);
  EXPECT_EQ(r.out, "KXL1069E  The database check program \"kxlckupgrade\" ended with exit code \"7\". The "
                   "instance was not upgraded.\n");
  removeCatalogs();
  EXPECT_EQ(run({"INST1"}).out, "KXLIMIGR:processing complete, RC = -1069\n");
}

TEST_F(CheckScenario, RunFromADriveRootPassesTheBareDriveToTheTool) {
  setToolExit(7);
  RunResult r = run({"INST1"});
  ASSERT_EQ(kxltest::eventsOf(r, "program").size(), 1u);
  std::string tool = kxltest::eventsOf(r, "program")[0];
  EXPECT_NE(tool.find("-l C:\\\\upgrade.log -t C:\""), std::string::npos) << tool;
  EXPECT_NE(changes(r).find("file + C:\\KXLDBMIG.TXT"), std::string::npos) << changes(r);
}

TEST_F(CheckScenario, MessageFileFallsBackToEnglish) {
  setToolExit(7);
  world.setString(localMachine(), kIdentity, "Language", "fr_FR");
  RunSetup inDir;
  inDir.cwd = "C:\\work";
  run({"INST1"}, inDir);
  std::string copied = hostPath("C:\\work\\KXLDBMIG.TXT");
  EXPECT_EQ(kxltest::readFile(copied),
            kxltest::readFile(std::string(KXL_MESSAGE_SOURCES) + "/en_US/KXLDBMIG.TXT"));

  world.setString(localMachine(), kIdentity, "Language", "de_DE");
  run({"INST1"}, inDir);
  EXPECT_EQ(kxltest::readFile(copied),
            kxltest::readFile(std::string(KXL_MESSAGE_SOURCES) + "/de_DE/KXLDBMIG.TXT"));
}

} // namespace
