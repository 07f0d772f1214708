// Runs that reach the driver, with the stand-in driver installed as the
// command: what the driver is handed, how its result is reported, the notices
// after a success, KXLINSTANCE and the audit record.
#include "expected_texts.h"
#include "scenario_fixture.h"

#include <cstdio>

namespace {

using kxlsim::localMachine;
using kxltest::eventsOf;
using kxltest::field;
using kxltest::RunResult;
using kxltest::RunSetup;

class OutcomeScenario : public kxltest::ScenarioTest {
protected:
  void SetUp() override {
    ScenarioTest::SetUp();
    useStandInDriver();
  }
  static RunSetup driverSays(const std::string &settings) {
    RunSetup setup;
    setup.driver = settings;
    return setup;
  }
  // The one "fake_driver" event of the run.
  static std::string handedOver(const RunResult &r) {
    std::vector<std::string> found = eventsOf(r, "fake_driver");
    return found.size() == 1 ? found[0] : "<" + std::to_string(found.size()) + " driver calls>";
  }
  static bool has(const std::string &line, const std::string &name, const std::string &value) {
    return line.find(field(name, value)) != std::string::npos;
  }
  // The driver was handed each field with its value.
  static void expectHanded(const RunResult &r, std::vector<std::pair<std::string, std::string>> fields) {
    for (const auto &[name, value] : fields)
      EXPECT_TRUE(has(handedOver(r), name, value)) << handedOver(r);
  }
};

TEST_F(OutcomeScenario, SuccessMovesTheProfileUnderTheCurrentCopy) {
  RunResult r = run({"inst1"});
  EXPECT_EQ(r.out, kxltest::kSuccessText);
  EXPECT_EQ(r.result, 0);
  expectHanded(r, {{"profile", "C:\\\\Program Files\\\\ZAV\\\\KXL101"},
                   {"flags", "0x0005"},
                   {"copy_path", "C:\\\\Program Files\\\\ZAV\\\\KXL95"},
                   {"node_type", "1"},
                   {"kxlinstance", "INST1"}});

  removeCatalogs();
  EXPECT_EQ(run({"INST1"}).out, "KXLIUPGRADE: processing completed successfully.\n");
}

TEST_F(OutcomeScenario, ProfilePathRules) {
  // -p naming the instance's own profile path, with a trailing backslash: no move.
  const std::vector<std::pair<std::string, std::string>> kept = {
      {"flags", "0x0001"}, {"profile", "C:\\\\Program Files\\\\ZAV\\\\KXL95"}};
  expectHanded(run({"-p", std::string(kOldCopy) + "\\", "INST1"}), kept);

  world.makeDirectory("C:\\profiles");
  expectHanded(run({"-p", "C:\\profiles\\", "INST1"}), {{"flags", "0x0005"}, {"profile", "C:\\\\profiles"}});

  // A clustered instance keeps its path.
  world.setString(localMachine(), "SOFTWARE\\ZAV\\KXL\\InstalledCopies\\KXL95\\PROFILES\\INST1", "KXLCLUSTER",
                  "KXLCLUS");
  for (const std::vector<std::string> &args :
       {std::vector<std::string>{"INST1"}, std::vector<std::string>{"-p", "C:\\profiles", "INST1"}})
    expectHanded(run(args), kept);
}

TEST_F(OutcomeScenario, InstanceOnANetworkShareKeepsItsPath) {
  addShare("FILER", "KXLPROF");
  addInstance("SHARED", "KXL95", "\\\\FILER\\KXLPROF\\SHARED", 9, 5);
  RunResult r = run({"SHARED"});
  EXPECT_EQ(r.out, kxltest::kSuccessText);
  expectHanded(r, {{"profile", "\\\\\\\\FILER\\\\KXLPROF"}, {"flags", "0x0001"}});
}

TEST_F(OutcomeScenario, VersionsThatMayBeUpgraded) {
  world.setString(localMachine(), "SOFTWARE\\ZAV\\KXL\\InstalledCopies\\KXL95\\CurrentVersion", "Release",
                  "6");
  EXPECT_EQ(run({"INST1"}).out, kxltest::kSuccessText) << "9.6 passes";
  world.setString(localMachine(), "SOFTWARE\\ZAV\\KXL\\InstalledCopies\\KXL95\\CurrentVersion", "Release",
                  "7");
  RunResult installer = run({"-install", "INST1"});
  EXPECT_EQ(installer.out, kxltest::kSuccessText) << "installers skip the level check of the instance's copy";
  EXPECT_EQ(installer.result, 0);
  EXPECT_TRUE(eventsOf(installer, "program").empty()) << "and the database check";
}

TEST_F(OutcomeScenario, InstallerModeGoesOnWithAnInstanceOfTheCurrentCopy) {
  addInstance("NEWINST", "KXL101", std::string(kCurrentCopy) + "\\NEWINST", 10, 1);
  RunResult r = run({"-install", "NEWINST"});
  EXPECT_EQ(r.out, kxltest::kSuccessText);
  EXPECT_EQ(r.result, 0);
  expectHanded(r, {{"flags", "0x0009"}});
}

TEST_F(OutcomeScenario, PartitionedInstanceWithAccountReachesTheDriver) {
  RunResult r = run({"-u", "kxlsvc,secret", "INST2"});
  EXPECT_EQ(r.out, kxltest::kSuccessText);
  expectHanded(r, {{"partitioned", "1"}, {"node_type", "4"}, {"ports", "60000:60003"}});
  // A port range of one port: the last lies four above it.
  world.setString(localMachine(), "SOFTWARE\\ZAV\\KXL\\InstalledCopies\\KXL95\\PROFILES\\INST1",
                  "KXLPORTRANGE", "50000");
  EXPECT_TRUE(has(handedOver(run({"INST1"})), "ports", "50000:50004"));
}

TEST_F(OutcomeScenario, CheckToolExitCodesThatLetTheUpgradeGoOn) {
  for (DWORD code : {0u, 2u}) {
    kxlsim::setToolExitCode(world, "kxlckupgrade", code);
    RunResult r = run({"INST1"});
    EXPECT_EQ(r.out, kxltest::kSuccessText) << code;
    EXPECT_EQ(eventsOf(r, "program").size(), 1u) << code;
  }
  kxlsim::setToolExitCode(world, "kxlckupgrade", 1);
  EXPECT_EQ(run({"INST1"}).out, kxltest::kCheckWarningText + kxltest::kSuccessText);
  removeCatalogs();
  EXPECT_EQ(run({"INST1"}).out, "KXLIMIGR:kxlckupgrade warning, RC = 1225\n"
                                "KXLIUPGRADE: processing completed successfully.\n");
}

TEST_F(OutcomeScenario, DriverResultsAreReported) {
  RunResult failed = run({"INST1"}, driverSays("rc=-1969"));
  EXPECT_EQ(failed.result, -1969);
  EXPECT_EQ(failed.out, "KXL1969E  The instance directory could not be backed up or copied. The instance was "
                        "not changed.\n");

  RunResult edition = run({"INST1"}, driverSays("rc=1231,old=4,new=1"));
  EXPECT_EQ(edition.result, 1231);
  EXPECT_EQ(edition.out, "KXL1231W  The instance INST1 of type PARTITIONED cannot be upgraded: the editions "
                         "installed in this copy host instances of type STANDALONE only.\n");

  RunResult status = run({"INST1"}, driverSays("rc=-1,sqlcode=-5005"));
  EXPECT_EQ(status.result, -1);
  EXPECT_EQ(status.out, "SQL5005N  A database manager configuration file cannot be read or written.\n");

  RunResult installer = run({"-install", "INST1"}, driverSays("rc=1231"));
  EXPECT_EQ(installer.result, 1);
  EXPECT_EQ(run({"-install", "INST1"}, driverSays("rc=-1969")).result, 2);
}

TEST_F(OutcomeScenario, WarningsAfterASuccessKeepExitCodeZero) {
  RunResult textSearch = run({"INST1"}, driverSays("reason=17"));
  EXPECT_EQ(textSearch.result, 0);
  EXPECT_EQ(textSearch.out, "KXL1273W  The instance was upgraded, but the text search service could not be "
                            "configured. Reason code: 17.\n"
                            "KXLIMIGR:processing completed, RC = 1273\n");

  RunResult extra = run({"INST1"}, driverSays("extra=1225"));
  EXPECT_EQ(extra.out, kxltest::kSuccessText + kxltest::kCheckWarningText);
  EXPECT_EQ(extra.result, 0);
}

TEST_F(OutcomeScenario, OdbcSourcesOfTheProductDriverAskForRecataloguing) {
  EXPECT_EQ(run({"INST1"}).out, kxltest::kSuccessText) << "no data sources";
  kxlsim::addOdbcDataSource(world, localMachine(), "Reports", "Other Vendor Driver");
  EXPECT_EQ(run({"INST1"}).out, kxltest::kSuccessText) << "only other drivers";
  kxlsim::addOdbcDataSource(world, localMachine(), "Sales", "zav kxl odbc driver - KXL95");
  RunResult r = run({"INST1"});
  EXPECT_EQ(r.out, kxltest::kSuccessText + kxltest::kOdbcText);
  EXPECT_EQ(r.result, 0);
}

TEST_F(OutcomeScenario, MachineWithoutOdbcCompletesNormally) {
  kxlsim::addOdbcDataSource(world, localMachine(), "Sales", "ZAV KXL ODBC DRIVER - KXL95");
  std::remove(hostPath("C:\\windows\\system32\\odbc32.dll").c_str());
  RunResult r = run({"INST1"});
  EXPECT_EQ(r.out, kxltest::kSuccessText);
  EXPECT_EQ(r.result, 0);
  EXPECT_NE(changes(r).find("kxldiag.log"), std::string::npos) << "the missing driver manager is logged";
}

TEST_F(OutcomeScenario, KxlinstanceIsRestoredBeforeTheFinalMessage) {
  RunSetup started;
  started.kxlinstance = "INST2";
  RunResult r = run({"INST1"}, started);
  EXPECT_TRUE(has(handedOver(r), "kxlinstance", "INST1")) << "the driver works on the instance";
  ASSERT_EQ(eventsOf(r, "fake_exit").size(), 1u);
  EXPECT_TRUE(has(eventsOf(r, "fake_exit")[0], "kxlinstance", "INST2"));

  RunResult quiet = run({"-q", "INST1"}, started);
  EXPECT_EQ(quiet.out, "");
  EXPECT_EQ(quiet.result, 0);
  EXPECT_TRUE(has(eventsOf(quiet, "fake_exit")[0], "kxlinstance", "INST1")) << "quiet runs do not restore it";
}

// The audit events of a success are in the end-to-end upgrade's exact changes.
TEST_F(OutcomeScenario, AuditRecordsTheOutcome) {
  // Only failures are audited: a failed upgrade counts as one even without a status block.
  world.writeText(std::string(kOldCopy) + "\\INST1\\security\\kxlaudit.cfg",
                  "active = yes\nadmin = failure\n");
  EXPECT_TRUE(eventsOf(run({"INST1"}), "audit").empty());
  std::vector<std::string> failed = eventsOf(run({"INST1"}, driverSays("rc=-1969")), "audit");
  ASSERT_EQ(failed.size(), 1u);
  EXPECT_TRUE(has(failed[0], "sqlcode", "-1969")) << failed[0];

  // Unreadable settings: a completed run stays completed and shows the audit
  // failure after its message; a failed run takes the status block's code.
  world.writeText(std::string(kOldCopy) + "\\INST1\\security\\kxlaudit.cfg", "active = perhaps\n");
  RunResult broken = run({"INST1"});
  EXPECT_EQ(broken.out.substr(0, kxltest::kSuccessText.size()), kxltest::kSuccessText);
  EXPECT_NE(broken.out.find("1042"), std::string::npos) << broken.out;
  EXPECT_EQ(broken.result, 0);
  EXPECT_EQ(run({"INST1"}, driverSays("rc=-1969")).result, -1042);
  EXPECT_TRUE(eventsOf(run({"NOSUCH"}), "audit").empty()) << "runs that stop early audit nothing";
}

} // namespace
