// Every way the upgrade driver can fail, driven through the installed command:
// the result and trace point, the registry profile back under the old copy,
// and the instance directory as it was before the run.
#include "driver_fixture.h"

#include "sim/kxlsim/world_reader.h"

#include <algorithm>

namespace drivertest {
namespace {

// Codes of the product library that the driver passes on unchanged.
constexpr long long kAccessDenied = static_cast<int32_t>(0x870F0003u);
constexpr long long kExecFailed = static_cast<int32_t>(0x870F0140u);
constexpr long long kPathNotFound = static_cast<int32_t>(0x870F0011u);

bool hasBackup(const std::vector<std::string> &entries) {
  return std::any_of(entries.begin(), entries.end(),
                     [](const std::string &name) { return name.rfind("KXL", 0) == 0; });
}

class DriverFailureTest : public DriverTest {
protected:
  void SetUp() override {
    DriverTest::SetUp();
    before = tree(kOldInstanceDir);
    ASSERT_FALSE(before.empty());
  }

  // The driver failed once, at `probe`, with `rc`, and returned it.
  void expectFailure(const Outcome &outcome, long long probe, long long rc) {
    ASSERT_TRUE(outcome.driverRan) << outcome.out << outcome.err;
    ASSERT_EQ(outcome.failures.size(), 1u) << outcome.trace;
    EXPECT_EQ(outcome.failures[0].probe, probe);
    EXPECT_EQ(outcome.failures[0].rc, rc);
    EXPECT_EQ(outcome.driverResult, rc);
  }

  // What every failure leaves: the profile under the old copy only, the old
  // instance directory as before, no backup directory.
  void expectUndone() {
    EXPECT_TRUE(keyExists(profileKey("KXL95", "INST1")));
    EXPECT_FALSE(keyExists(profileKey("KXL101", "INST1")));
    EXPECT_EQ(treeDifferences(before, tree(kOldInstanceDir)), "");
    EXPECT_FALSE(hasBackup(tempEntries()));
  }

  Tree before;
};

TEST_F(DriverFailureTest, ActiveInstanceIsRefusedBeforeAnythingIsCopied) {
  world.setDword(kxlsim::localMachine(), "SOFTWARE\\ZAV\\KXLSIM\\Services\\INST1", "State", 4);
  std::vector<std::string> tempBefore = tempEntries();
  // Installer mode skips the database check, which would refuse it first.
  Outcome outcome = run({"-install", "INST1"});
  expectFailure(outcome, 10, -1953);
  EXPECT_EQ(outcome.exitCode, 2);
  EXPECT_EQ(tempEntries(), tempBefore);
  EXPECT_FALSE(exists(kNewInstanceDir));
  expectUndone();
}

TEST_F(DriverFailureTest, BackupFailuresEndWith1969AndLeaveNoDirectory) {
  struct Case {
    const char *fault;
    long long probe;
  } cases[] = {{"GetTempPathA:1", 20}, {"_tempnam:1", 30},      {"CreateDirectoryA:1", 40},
               {"sqlocopydir:1", 50},  {"FindNextFileA:1", 50}, {"FindNextFileA:6", 50}};
  for (const Case &c : cases) {
    SCOPED_TRACE(c.fault);
    Outcome outcome = run({"INST1"}, c.fault);
    expectFailure(outcome, c.probe, -1969);
    EXPECT_FALSE(exists(kNewInstanceDir));
    expectUndone();
  }
  EXPECT_EQ(run({"INST1"}).driverResult, 0);
}

// An in-place upgrade re-creates the instance in its own directory: an
// incomplete backup would lose the original files, so it stops the run first.
TEST_F(DriverFailureTest, InPlaceUpgradeWithAFailedListingChangesNothing) {
  Outcome outcome = run({"-p", kOldCopy, "INST1"}, "FindNextFileA:6");
  expectFailure(outcome, 50, -1969);
  expectUndone();
  ASSERT_EQ(run({"-p", kOldCopy, "INST1"}).driverResult, 0);
  EXPECT_NE(fileContent(std::string(kOldInstanceDir) + "\\kxlsystm"), before.at("kxlsystm"));
}

TEST_F(DriverFailureTest, ProfilePathWithTheInstanceAlreadyThereChangesNothing) {
  world.writeText("C:\\Profiles\\INST1\\keep.txt", "someone else's\n");
  Tree profileBefore = tree("C:\\Profiles");
  Outcome outcome = run({"-p", "C:\\Profiles", "INST1"});
  expectFailure(outcome, 70, -1959);
  EXPECT_EQ(treeDifferences(profileBefore, tree("C:\\Profiles")), "");
  EXPECT_FALSE(exists(kNewInstanceDir));
  expectUndone();
}

TEST_F(DriverFailureTest, CopyToTheNewProfilePathFailing) {
  world.makeDirectory("C:\\Profiles");
  Outcome outcome = run({"-p", "C:\\Profiles", "INST1"}, "sqlocopydir:2");
  expectFailure(outcome, 60, -1969);
  expectUndone();
}

TEST_F(DriverFailureTest, ServicesStepFailingMovesTheProfileBackAndRestoresTheDirectory) {
  world.writeText(std::string(kOldInstanceDir) + "\\security\\kxlaudit.cfg", "audit.active=1\n");
  before = tree(kOldInstanceDir);
  Outcome outcome = run({"INST1"}, "sqloQueryNTServiceConfig:1");
  ASSERT_EQ(outcome.failures.size(), 1u) << outcome.trace;
  EXPECT_EQ(outcome.failures[0].probe, 90);
  EXPECT_LT(outcome.driverResult, 0);
  expectUndone();
}

TEST_F(DriverFailureTest, FailedAuditToolLeavesTheAuditCopy) {
  // Installer mode: the database check tool does not run, so the audit tool
  // is the first program the run starts.
  Outcome outcome = run({"-install", "INST1"}, "sqloexec2:1");
  expectFailure(outcome, 95, kExecFailed);
  EXPECT_TRUE(exists(std::string(kNewInstanceDir) + "\\security\\kxlauditcopy.cfg"));
  expectUndone();
}

TEST_F(DriverFailureTest, FailedSslToolRun) {
  Outcome outcome = run({"-install", "INST1"}, "sqloexec2:2");
  expectFailure(outcome, 97, kExecFailed);
  EXPECT_FALSE(exists(std::string(kNewInstanceDir) + "\\security\\kxlauditcopy.cfg"));
  expectUndone();
}

TEST_F(DriverFailureTest, ApplicationEnvironmentFailing) {
  Outcome outcome = run({"INST1"}, "sqleInitApplicationEnvironment:1");
  ASSERT_EQ(outcome.failures.size(), 1u) << outcome.trace;
  EXPECT_EQ(outcome.failures[0].probe, 120);
  EXPECT_EQ(outcome.failures[0].rc, outcome.driverResult);
  EXPECT_NE(outcome.driverResult, 0);
  expectUndone();
}

TEST_F(DriverFailureTest, ConfigurationConversionFailureIs1947) {
  // A damaged checksum makes the saved configuration unconvertible.
  std::vector<uint8_t> image;
  ASSERT_TRUE(kxlsim::readFileHead(std::string(kOldInstanceDir) + "\\kxlsystm", 1 << 20, image));
  image[0] ^= 0xFF;
  world.writeFile(std::string(kOldInstanceDir) + "\\kxlsystm", image);
  before = tree(kOldInstanceDir);
  Outcome outcome = run({"INST1"});
  expectFailure(outcome, 130, -1947);
  expectUndone();
}

TEST_F(DriverFailureTest, AuthenticationTypeNotSetIsMinusOne) {
  Outcome outcome = run({"-a", "SERVER", "INST1"}, "sqlfusys:1");
  expectFailure(outcome, 140, -1);
  expectUndone();
}

TEST_F(DriverFailureTest, CarriedFileThatCannotBeCopiedEndsWithItsCode) {
  // A folder where the file should be cannot be copied as a file.
  removeTree(std::string(kOldInstanceDir) + "\\bin\\rsm.cfg");
  world.makeDirectory(std::string(kOldInstanceDir) + "\\bin\\rsm.cfg");
  before = tree(kOldInstanceDir);
  Outcome outcome = run({"INST1"});
  expectFailure(outcome, 170, kAccessDenied);
  expectUndone();
}

TEST_F(DriverFailureTest, MissingFunctionDirectoryFailsTheCopy) {
  removeTree(std::string(kOldCopy) + "\\function");
  before = tree(kOldInstanceDir);
  Outcome outcome = run({"INST1"});
  expectFailure(outcome, 190, kPathNotFound);
  expectUndone();
}

TEST_F(DriverFailureTest, InstanceRecreatedInPlaceIsRestoredFromTheBackup) {
  // With the profile path unchanged the instance is re-created in its own
  // directory; a later failure puts the old files back.
  Outcome outcome = run({"-p", kOldCopy, "INST1"}, "sqleInitApplicationEnvironment:1");
  ASSERT_EQ(outcome.failures.size(), 1u) << outcome.trace;
  EXPECT_EQ(outcome.failures[0].probe, 120);
  EXPECT_LT(outcome.driverResult, 0);
  expectUndone();
}

// A clustered instance on a machine without the cluster modules: the cluster
// step's failure is the run's, named by its message, and the undo runs.
TEST_F(DriverFailureTest, ClusteredInstanceWithoutTheClusterApi) {
  world.setString(kxlsim::localMachine(), profileKey("KXL95", "INST1"), "KXLCLUSTER", "KXLCL1");
  Outcome outcome = run({"INST1"});
  ASSERT_TRUE(outcome.driverRan) << outcome.out << outcome.err;
  ASSERT_FALSE(outcome.failures.empty()) << outcome.trace;
  EXPECT_EQ(outcome.failures.back().probe, 200);
  EXPECT_EQ(outcome.driverResult, -1251);
  EXPECT_EQ(outcome.out.rfind("KXL1251E", 0), 0u) << outcome.out;
  EXPECT_EQ(treeDifferences(before, tree(kOldInstanceDir)), "");
  EXPECT_TRUE(keyExists(profileKey("KXL95", "INST1")));
}

} // namespace
} // namespace drivertest

