// Checks of caller, instance and copies that stop the run before the driver.
#include "expected_texts.h"
#include "scenario_fixture.h"

#include "sim/kxlsim/world_reader.h"
#include "tests/support/command_run.h"

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

// A copy's version that cannot be read is never taken for version 0, which
// would let an instance of a newer copy through or refuse the current copy.
TEST_F(CheckScenario, CopyVersionThatCannotBeReadEndsTheRunUnchanged) {
  struct Case {
    const char *copy;
    const char *release;
  } cases[] = {{"KXL95", "5"}, {"KXL101", "1"}};
  for (const Case &c : cases) {
    SCOPED_TRACE(c.copy);
    std::string key = std::string("SOFTWARE\\ZAV\\KXL\\InstalledCopies\\") + c.copy + "\\CurrentVersion";
    world.setString(localMachine(), key, "Release", std::string(300, '7'));
    RunResult r = run({"INST1"});
    EXPECT_EQ(r.result, -1918);
    EXPECT_EQ(changes(r), "");
    world.setString(localMachine(), key, "Release", c.release);
  }
  EXPECT_EQ(run({"INST1"}).result, 0);
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

TEST_F(CheckScenario, MessageFileFallsBackToEnglish) {
  setToolExit(7);
  world.setString(localMachine(), kIdentity, "Language", "fr_FR");
  RunSetup inDir;
  inDir.cwd = "C:\\work";
  run({"INST1"}, inDir);
  std::string copied = hostPath("C:\\work\\KXLDBMIG.TXT");
  EXPECT_EQ(kxltestsupport::readHostFile(copied),
            kxltestsupport::readHostFile(std::string(KXL_MESSAGE_SOURCES) + "/en_US/KXLDBMIG.TXT"));

  world.setString(localMachine(), kIdentity, "Language", "de_DE");
  run({"INST1"}, inDir);
  EXPECT_EQ(kxltestsupport::readHostFile(copied),
            kxltestsupport::readHostFile(std::string(KXL_MESSAGE_SOURCES) + "/de_DE/KXLDBMIG.TXT"));
}

// A failed read of which installation is current, or a switch between the
// installations that fails either way, ends the run before anything changes:
// profile reads in the wrong installation would otherwise take the old copy
// for the current one.
TEST_F(CheckScenario, InstallationThatCannotBeNamedOrSwitchedEndsTheRunUnchanged) {
  struct Case {
    const char *faults;
    bool checkToolRan; // the switch back after the database check failed
  } cases[] = {
      {"sqloGetCurrentInstallationName:2", false}, // global profile check
      {"sqloGetCurrentInstallationName:4", false}, // binding the instance
      {"sqloGetCurrentInstallationName:5", false}, // database check
      {"sqloSwitchToInstallationName:1", false},
      {"sqloSwitchToInstallationName:2", false},
      {"sqloSwitchToInstallationName:3", false},
      {"sqloSwitchToInstallationName:4", false},
      {"sqloPRegProfilePE:5", false},
      {"sqloSwitchToInstallationName:6", true},
  };
  for (const Case &c : cases) {
    SCOPED_TRACE(c.faults);
    RunSetup setup;
    setup.faults = c.faults;
    RunResult r = run({"INST1"}, setup);
    EXPECT_EQ(r.result, -1918);
    EXPECT_EQ(r.out, "KXL1918E  The installed copies of the product, or the copy this command belongs to, "
                     "cannot be found.\n");
    std::string changed = changes(r);
    if (c.checkToolRan)
      EXPECT_EQ(changed.find("registry"), std::string::npos) << changed;
    else
      EXPECT_EQ(changed, "");
    EXPECT_TRUE(kxltest::eventsOf(r, "audit").empty()) << "nothing was upgraded";
  }
  EXPECT_EQ(run({"INST1"}).result, 0);
}

// The node type decides which services the instance gets; an instance whose
// kxlsystm gives none is refused before anything changes, naming the file.
TEST_F(CheckScenario, InstanceWithoutAReadableNodeTypeIsRefusedNamingTheFile) {
  const std::string file = std::string(kOldCopy) + "\\INST1\\kxlsystm";
  std::vector<uint8_t> image;
  ASSERT_TRUE(kxlsim::readFileHead(file, 1 << 20, image));
  auto withNodeType = [&](uint8_t type) {
    std::vector<uint8_t> changed = image;
    changed[40] = type;
    changed[41] = 0;
    return changed;
  };
  struct Case {
    const char *what;
    std::vector<uint8_t> content;
    const char *faults;
  } cases[] = {
      {"empty file", {}, ""},
      {"cut before the node type", std::vector<uint8_t>(image.begin(), image.begin() + 41), ""},
      {"node type 0", withNodeType(0), ""},
      {"node type 6", withNodeType(6), ""},
      {"failed open", image, "sqloopenp:4"},
      {"failed read", image, "sqloread:5"},
  };
  for (const Case &c : cases) {
    SCOPED_TRACE(c.what);
    world.writeFile(file, c.content);
    RunSetup setup;
    setup.faults = c.faults;
    RunResult r = run({"INST1"}, setup);
    EXPECT_EQ(r.result, -1926);
    EXPECT_EQ(r.out, "KXL1926E  The node type of the instance cannot be read from its database manager "
                     "configuration file \"" +
                         file + "\". The instance was not changed.\n");
    EXPECT_EQ(changes(r), "");
  }
  EXPECT_EQ(run({"INST1"}).result, 0) << "the file as it was upgrades";
}

// The check tool works in the current directory: its log-file argument and
// the copy of its explanation must be whole paths there, or the run stops
// before the tool starts.
TEST_F(CheckScenario, CurrentDirectoryTooLongForTheCheckIsRefused) {
  setToolExit(7);
  auto directoryOf = [](std::size_t length) {
    std::string path = "C:";
    while (path.size() < length) {
      std::size_t part = std::min<std::size_t>(length - path.size() - 1, 100);
      path += "\\" + std::string(part, 'd');
    }
    return path;
  };
  struct Case {
    std::size_t length;
    bool refused;
  } cases[] = {{246, false}, {247, true}, {250, true}, {254, true}, {300, true}};
  for (const Case &c : cases) {
    SCOPED_TRACE(c.length);
    RunSetup setup;
    setup.cwd = directoryOf(c.length);
    ASSERT_EQ(setup.cwd.size(), c.length);
    RunResult r = run({"INST1"}, setup);
    if (!c.refused) {
      EXPECT_EQ(r.result, -1069);
      ASSERT_EQ(kxltest::eventsOf(r, "program").size(), 1u);
      EXPECT_NE(kxltest::eventsOf(r, "program")[0].find("\\\\upgrade.log -t "), std::string::npos);
      continue;
    }
    EXPECT_EQ(r.result, -1927);
    EXPECT_EQ(r.out, "KXL1927E  The current directory is too long to hold the files of the database check. "
                     "Run the command from a directory with a shorter path. The instance was not "
                     "changed.\n");
    EXPECT_EQ(changes(r), "");
  }
  setToolExit(0);
  EXPECT_EQ(run({"INST1"}).result, 0);
}

} // namespace
