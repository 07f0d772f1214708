// Runs that reach the driver, with the stand-in driver installed as the
// command: what the driver is handed, how its result is reported, the notices
// after a success, KXLINSTANCE and the audit record.
#include "scenario_fixture.h"

#include <filesystem>

namespace {

using kxlsim::localMachine;
using kxltest::eventsOf;
using kxltest::field;
using kxltest::RunResult;
using kxltest::RunSetup;
using kxltest::ScenarioTest;

// The en_US catalog texts as the user sees them.
const std::string kSuccessText = "KXL1000I  KXLIUPGRADE finished: the instance now belongs to this copy.\n";
const std::string kCheckWarningText =
    "KXL1225W  The database check reported warnings. The upgrade continues; review the "
    "check log after the upgrade.\n";
using Fields = std::vector<std::pair<std::string, std::string>>;

const std::string kVersionKey = "SOFTWARE\\ZAV\\KXL\\InstalledCopies\\KXL95\\CurrentVersion";
const std::string kProfileKey = "SOFTWARE\\ZAV\\KXL\\InstalledCopies\\KXL95\\PROFILES\\INST1";
const Fields kKeptPath = {{"flags", "0x0001"}, {"profile", "C:\\\\Program Files\\\\ZAV\\\\KXL95"}};

void clustered(ScenarioTest &t) {
  t.world.makeDirectory("C:\\profiles");
  t.world.setString(localMachine(), kProfileKey, "KXLCLUSTER", "KXLCLUS");
}
void checkSays(ScenarioTest &t, DWORD code) {
  kxlsim::setToolExitCode(t.world, "kxlckupgrade", code);
}
void odbcSource(ScenarioTest &t, const char *driver) {
  kxlsim::addOdbcDataSource(t.world, localMachine(), "Sales", driver);
}

// A run that reaches the driver: the driver says `driver` (KXLTEST_DRIVER),
// the run ends with `result` and prints `out`, the driver was handed `handed`.
struct Reached {
  std::vector<std::string> args;
  std::string driver;
  long long result;
  std::string out;
  Fields handed = {};
  void (*setup)(ScenarioTest &) = nullptr;
  bool catalogs = true;
  int checkRuns = -1; // runs of the database check (-1: not counted)
};

// clang-format off
const Reached kReached[] = {
    {{"inst1"}, "", 0, kSuccessText, {{"profile", "C:\\\\Program Files\\\\ZAV\\\\KXL101"}, {"flags", "0x0005"},
     {"copy_path", "C:\\\\Program Files\\\\ZAV\\\\KXL95"}, {"node_type", "1"}, {"kxlinstance", "INST1"}}},
    {{"INST1"}, "", 0, "KXLIUPGRADE: processing completed successfully.\n", {}, nullptr, false},
    // -p naming the instance's own profile path, with a trailing backslash: no move.
    {{"-p", "C:\\Program Files\\ZAV\\KXL95\\", "INST1"}, "", 0, kSuccessText, kKeptPath},
    {{"-p", "C:\\profiles\\", "INST1"}, "", 0, kSuccessText, {{"flags", "0x0005"}, {"profile", "C:\\\\profiles"}},
     [](ScenarioTest &t) { t.world.makeDirectory("C:\\profiles"); }},
    // A clustered instance keeps its path.
    {{"INST1"}, "", 0, kSuccessText, kKeptPath, clustered},
    {{"-p", "C:\\profiles", "INST1"}, "", 0, kSuccessText, kKeptPath, clustered},
    {{"SHARED"}, "", 0, kSuccessText, {{"profile", "\\\\\\\\FILER\\\\KXLPROF"}, {"flags", "0x0001"}}, [](ScenarioTest &t) {
       std::filesystem::create_directories(t.root() + "/unc/FILER/KXLPROF");
       t.addInstance("SHARED", "KXL95", "\\\\FILER\\KXLPROF\\SHARED", 9, 5); }},
    // 9.6 passes; installers skip the level check of the instance's copy, and the database check.
    {{"INST1"}, "", 0, kSuccessText, {}, [](ScenarioTest &t) { t.world.setString(localMachine(), kVersionKey, "Release", "6"); }},
    {{"-install", "INST1"}, "", 0, kSuccessText, {}, [](ScenarioTest &t) { t.world.setString(localMachine(), kVersionKey, "Release", "7"); }, true, 0},
    // Installer mode goes on with an instance of the current copy.
    {{"-install", "NEWINST"}, "", 0, kSuccessText, {{"flags", "0x0009"}},
     [](ScenarioTest &t) { t.addInstance("NEWINST", "KXL101", std::string(ScenarioTest::kCurrentCopy) + "\\NEWINST", 10, 1); }},
    {{"-u", "kxlsvc,secret", "INST2"}, "", 0, kSuccessText, {{"partitioned", "1"}, {"node_type", "4"}, {"ports", "60000:60003"}}},
    // A port range of one port: the last lies four above it.
    {{"INST1"}, "", 0, kSuccessText, {{"ports", "50000:50004"}},
     [](ScenarioTest &t) { t.world.setString(localMachine(), kProfileKey, "KXLPORTRANGE", "50000"); }},
    // Exit codes of the database check that let the upgrade go on.
    {{"INST1"}, "", 0, kSuccessText, {}, [](ScenarioTest &t) { checkSays(t, 0); }, true, 1},
    {{"INST1"}, "", 0, kSuccessText, {}, [](ScenarioTest &t) { checkSays(t, 2); }, true, 1},
    {{"INST1"}, "", 0, kCheckWarningText + kSuccessText, {}, [](ScenarioTest &t) { checkSays(t, 1); }},
    {{"INST1"}, "", 0, "KXLIMIGR:kxlckupgrade warning, RC = 1225\nKXLIUPGRADE: processing completed successfully.\n", {},
     [](ScenarioTest &t) { checkSays(t, 1); }, false},
    // The driver's results as reported.
    {{"INST1"}, "rc=-1969", -1969, "KXL1969E  The instance directory could not be backed up or copied. The instance was not changed.\n"},
    {{"INST1"}, "rc=1231,old=4,new=1", 1231, "KXL1231W  The instance INST1 of type PARTITIONED cannot be upgraded: the editions "
                                             "installed in this copy host instances of type STANDALONE only.\n"},
    {{"INST1"}, "rc=-1,sqlcode=-5005", -1, "SQL5005N  A database manager configuration file cannot be read or written.\n"},
    {{"-install", "INST1"}, "rc=1231", 1, "KXL1231W  The instance INST1 of type  cannot be upgraded: the editions installed in "
                                          "this copy host instances of type  only.\n"},
    {{"-install", "INST1"}, "rc=-1969", 2, "KXL1969E  The instance directory could not be backed up or copied. The instance was not changed.\n"},
    // Warnings after a success keep the result 0.
    {{"INST1"}, "reason=17", 0, "KXL1273W  The instance was upgraded, but the text search service could not be configured. "
                                "Reason code: 17.\nKXLIMIGR:processing completed, RC = 1273\n"},
    {{"INST1"}, "extra=1225", 0, kSuccessText + kCheckWarningText},
    // ODBC data sources of the product's driver ask for recataloguing; others do not.
    {{"INST1"}, "", 0, kSuccessText, {}, [](ScenarioTest &t) { odbcSource(t, "Other Vendor Driver"); }},
    {{"INST1"}, "", 0, kSuccessText + "KXL1917W  ODBC data sources on this machine use the product's ODBC driver. Catalog them again so that they use the driver of this copy.\n", {}, [](ScenarioTest &t) { odbcSource(t, "zav kxl odbc driver - KXL95"); }},
};
// clang-format on

RunSetup driverSays(const std::string &settings) {
  RunSetup setup;
  setup.driver = settings;
  return setup;
}
// The one "fake_driver" event of the run.
std::string handedOver(const RunResult &r) {
  std::vector<std::string> found = eventsOf(r, "fake_driver");
  return found.size() == 1 ? found[0] : "<" + std::to_string(found.size()) + " driver calls>";
}
bool has(const std::string &line, const std::string &name, const std::string &value) {
  return line.find(field(name, value)) != std::string::npos;
}

class OutcomeScenario : public ScenarioTest, public ::testing::WithParamInterface<Reached> {
protected:
  void SetUp() override {
    ScenarioTest::SetUp();
    installCommandAs("kxliupgrade.exe");
  }
};

TEST_P(OutcomeScenario, DriverIsHandedTheRunAndItsResultReported) {
  const Reached &row = GetParam();
  prepare(row.setup, row.catalogs);
  RunResult r = run(row.args, driverSays(row.driver));
  EXPECT_EQ(r.result, row.result);
  EXPECT_EQ(r.out, row.out);
  for (const auto &[name, value] : row.handed)
    EXPECT_TRUE(has(handedOver(r), name, value)) << handedOver(r);
  EXPECT_TRUE(row.checkRuns < 0 || eventsOf(r, "program").size() == static_cast<std::size_t>(row.checkRuns));
}

INSTANTIATE_TEST_SUITE_P(Rows, OutcomeScenario, ::testing::ValuesIn(kReached));

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
  EXPECT_EQ(broken.out.substr(0, kSuccessText.size()), kSuccessText);
  EXPECT_NE(broken.out.find("1042"), std::string::npos) << broken.out;
  EXPECT_EQ(broken.result, 0);
  EXPECT_EQ(run({"INST1"}, driverSays("rc=-1969")).result, -1042);
  EXPECT_TRUE(eventsOf(run({"NOSUCH"}), "audit").empty()) << "runs that stop early audit nothing";
}

} // namespace
