// Every way the upgrade driver can fail, driven through the installed command:
// the result and trace point, the machine as it was before the run (registry
// of every machine and files, apart from the logs), what the final message
// says about it, and a plain rerun that then upgrades the instance.
#include "driver_fixture.h"

#include "sim/kxlsim/world_reader.h"

#include <functional>

namespace drivertest {
namespace {

// Codes of the product library that the driver passes on unchanged.
constexpr long long kAccessDenied = static_cast<int32_t>(0x870F0003u);
constexpr long long kExecFailed = static_cast<int32_t>(0x870F0140u);
constexpr long long kPathNotFound = static_cast<int32_t>(0x870F0011u);
constexpr long long kIoError = static_cast<int32_t>(0x870F0004u);
constexpr long long kPathTestFailed = static_cast<int32_t>(0x90000002u);

// The partitions' services run under this account already.
const std::vector<std::string> kPartitioned = {"-u", ".\\kxlsvc,secret", "INST2"};
// Another account: a failure after the services were given it gives them
// their own back on every machine.
const std::vector<std::string> kNewAccount = {"-u", "KXLADMIN,secret", "INST2"};
constexpr const char *kRestoredNotice = "KXL1971I";
constexpr const char *kNotRestored = "KXL1972E";

std::vector<std::string> withArgs(std::initializer_list<const char *> first,
                                  const std::vector<std::string> &rest) {
  std::vector<std::string> args(first.begin(), first.end());
  args.insert(args.end(), rest.begin(), rest.end());
  return args;
}

class DriverFailureTest : public DriverTest {
protected:
  void SetUp() override {
    DriverTest::SetUp();
    before = tree(kOldInstanceDir);
    ASSERT_FALSE(before.empty());
    keepWorld();
  }

  // Every failure leaves the world as kept before the run, and no backup directory.
  void expectUndone() {
    EXPECT_EQ(worldChanges(), "");
    EXPECT_FALSE(hasBackup(tempEntries()));
  }

  // The same command without a fault upgrades the instance.
  void expectRerunUpgrades(const std::vector<std::string> &args, const std::string &instance = "INST1") {
    Outcome again = run(args);
    EXPECT_EQ(again.exitCode, 0) << again.out << again.err << again.trace;
    EXPECT_TRUE(again.failures.empty()) << again.trace;
    EXPECT_EQ(stringValue("SOFTWARE\\ZAV\\KXLSIM\\Instances\\" + instance, "Copy"), "KXL101");
    EXPECT_TRUE(keyExists(profileKey("KXL101", instance)));
  }

  Tree before;
};

TEST_F(DriverFailureTest, ActiveInstanceIsRefusedBeforeAnythingIsCopied) {
  world.setDword(kxlsim::localMachine(), "SOFTWARE\\ZAV\\KXLSIM\\Services\\INST1", "State", 4);
  keepWorld();
  std::vector<std::string> tempBefore = tempEntries();
  // Installer mode skips the database check, which would refuse it first.
  Outcome outcome = run({"-install", "INST1"});
  expectFailure(outcome, 10, -1953);
  EXPECT_EQ(outcome.exitCode, 2);
  EXPECT_EQ(tempEntries(), tempBefore);
  EXPECT_FALSE(exists(kNewInstanceDir));
  expectUndone();
  EXPECT_EQ(outcome.out.find(kRestoredNotice), std::string::npos) << outcome.out;
}

TEST_F(DriverFailureTest, BackupFailuresEndWith1969AndLeaveNoDirectory) {
  struct Case {
    const char *fault;
    long long probe;
  } cases[] = {
      {"GetTempPathA:1", 20},        {"_tempnam:1", 30},      {"CreateDirectoryA:1", 40},
      {"sqlocopydir:1", 50},         {"FindNextFileA:1", 50}, {"FindNextFileA:6", 50},
      {"GetDiskFreeSpaceExA:1", 50}, {"MoveFileExA:1", 330}}; // the last: the run's record cannot be written
  for (const Case &c : cases) {
    SCOPED_TRACE(c.fault);
    Outcome outcome = run({"INST1"}, c.fault);
    expectFailure(outcome, c.probe, -1969);
    expectUndone();
    EXPECT_EQ(outcome.out.find(kRestoredNotice), std::string::npos) << outcome.out;
  }
  expectRerunUpgrades({"INST1"});
}

// A world broken one way (or a fault) fails the run at `probe` with `rc` and
// changes nothing; once `repair` has run, the same command upgrades.
TEST_F(DriverFailureTest, BrokenWorldFailsUnchangedAndARepairedOneUpgrades) {
  const std::string drive = "SOFTWARE\\ZAV\\KXLSIM\\Drives\\C";
  const std::string carried = std::string(kOldInstanceDir) + "\\bin\\rsm.cfg";
  using Change = std::function<void()>;
  const struct {
    const char *what;
    std::vector<std::string> args;
    const char *fault;
    long long probe, rc;
    Change breakIt, repair;
  } cases[] = {
      {"no room for the backup",
       {"INST1"},
       "",
       50,
       -1969,
       [&] { world.setString(kxlsim::localMachine(), drive, "FreeBytes", "8192"); },
       [&] { world.setString(kxlsim::localMachine(), drive, "FreeBytes", "1099511627776"); }},
      {"instance already in the profile path",
       {"-p", "C:\\Profiles", "INST1"},
       "",
       70,
       -1959,
       [&] { world.writeText("C:\\Profiles\\INST1\\keep.txt", "someone else's\n"); },
       [&] { removeTree("C:\\Profiles\\INST1"); }},
      // The driver's second read of the node list: refused rather than leaving
      // the other machine's partitions on the old copy behind a success.
      {"node list unreadable on the second read", kPartitioned, "sqloReadKxlnodes:2", 11, -1960, [] {},
       [] {}},
      // A folder where a carried file should be cannot be copied as a file.
      {"carried file is a folder",
       {"INST1"},
       "",
       170,
       kAccessDenied,
       [&] {
         removeTree(carried);
         world.makeDirectory(carried);
       },
       [&] { removeTree(carried); }},
      {"function directory missing",
       {"INST1"},
       "",
       190,
       kPathNotFound,
       [&] { removeTree(std::string(kOldCopy) + "\\function"); },
       [&] { world.writeText(std::string(kOldCopy) + "\\function\\kxludf.dll", "MZ\r\n"); }},
  };
  for (const auto &c : cases) {
    SCOPED_TRACE(c.what);
    resetWorld();
    c.breakIt();
    keepWorld();
    expectFailure(run(c.args, c.fault), c.probe, c.rc);
    expectUndone();
    c.repair();
    expectRerunUpgrades(c.args, c.args.back());
  }
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

// Faults from the backup on, single and partitioned, in place or under a new
// profile path: each is undone, the message says so, and a rerun works.
TEST_F(DriverFailureTest, FaultsAfterTheBackupAreUndoneAndARerunUpgrades) {
  struct Case {
    std::vector<std::string> args;
    const char *fault;
    long long probe;
    long long rc; // 0: any negative result
  } cases[] = {
      {{"INST1"}, "sqlocopydir:2", 60, -1969},
      {{"INST1"}, "sqloQueryNTServiceConfig:1", 90, -1925},
      {{"INST1"}, "sqloGetCurrentInstallationName:8", 90, -1918}, // in the services step
      {{"INST1"}, "sqlo_instance_create_extended:1", 90, 0},
      {{"-install", "INST1"}, "sqloexec2:1", 95, kExecFailed},
      {{"-install", "INST1"}, "sqloexec2:2", 97, kExecFailed},
      {{"INST1"}, "sqleInitApplicationEnvironment:1", 120, 0},
      {{"-a", "SERVER", "INST1"}, "sqlfusys:1", 140, -1},
      {{"INST1"}, "sqlocopydir:3", 190, 0},
      {{"-p", kOldCopy, "INST1"}, "sqleInitApplicationEnvironment:1", 120, 0},
      {{"-p", "C:\\Profiles", "INST1"}, "sqleInitApplicationEnvironment:1", 120, 0},
      {{"-p", "C:\\Profiles", "INST1"}, "sqlocopydir:2", 60, -1969},
      {kPartitioned, "sqleInitApplicationEnvironment:1", 120, 0},
      {withArgs({"-forcecn"}, kPartitioned), "sqleInitApplicationEnvironment:1", 120, 0},
      {withArgs({"-forcecn"}, kPartitioned), "sqlo_instance_addnode:1", 90, 0},
      {kNewAccount, "sqlowrite:4", 130, -1947},
      {withArgs({"-forcecn"}, kNewAccount), "sqleInitApplicationEnvironment:1", 120, 0},
      {kNewAccount, "sqloQueryNTServiceConfig:2", 90, -1925}, // an account that cannot be read
      {kNewAccount, "sqloChangeNTServiceConfig:2", 90, 0},    // a partition that cannot be re-pointed
      // The forced machine's old profile key cannot be deleted or reached.
      {withArgs({"-forcecn"}, kNewAccount), "SHDeleteKeyA:2", 210, -1918},
      {withArgs({"-forcecn"}, kNewAccount), "sqloPRegMachineOpen:4", 210, -1913},
      // A profile key move that fails leaves the old key whole and the keys
      // above the new one that were there before (an empty PROFILES key).
      {{"INST1"}, "SHCopyKeyA:1", 80, 0},
      {{"INST1"}, "SHDeleteKeyA:1", 80, 0},
      // A template that cannot be looked for is not a missing one (which
      // would make the instance partitioned).
      {{"INST1"}, "sqloopenp:6", 90, kIoError},
      // Audit settings kept aside in the instance's own directory: never lost,
      // and their copy never left behind.
      {{"-p", kOldCopy, "INST1"}, "GetFileAttributesA:23", 85, kAccessDenied},
      {{"-p", kOldCopy, "INST1"}, "sqlocopy:4", 93, kIoError},
      {{"-install", "-p", kOldCopy, "INST1"}, "sqloexec2:1", 95, kExecFailed},
      // A function directory that cannot be tested is neither there nor missing.
      {{"INST1"}, "ossPathTest:5", 190, kPathTestFailed},
      // A move that fails on the second machine: the first one gets its key back.
      {kPartitioned, "sqloPRegMachineOpen:2", 80, -1913},
  };
  for (const Case &c : cases) {
    SCOPED_TRACE(std::string(c.fault) + " " + c.args.front() + " " + c.args.back());
    resetWorld();
    world.makeDirectory("C:\\Profiles");
    keepWorld();
    Outcome outcome = run(c.args, c.fault);
    ASSERT_TRUE(outcome.driverRan) << outcome.out << outcome.err;
    ASSERT_EQ(outcome.failures.size(), 1u) << outcome.trace;
    EXPECT_EQ(outcome.failures[0].probe, c.probe);
    if (c.rc != 0) {
      EXPECT_EQ(outcome.driverResult, c.rc);
    }
    EXPECT_LT(outcome.driverResult, 0);
    expectUndone();
    EXPECT_NE(outcome.out.find(kRestoredNotice), std::string::npos) << outcome.out;
    EXPECT_EQ(outcome.out.find(kNotRestored), std::string::npos) << outcome.out;
    expectRerunUpgrades(c.args, c.args.back());
  }
}

// Clustered instances: the services of every machine of the cluster come
// back to the owning copy with the profile keys.
TEST_F(DriverFailureTest, ClusteredInstancesAreUndoneOnEveryMachine) {
  const std::vector<std::string> clustered[] = {{"CINST1"}, {"-u", ".\\kxlsvc,secret", "CINST2"}};
  for (const std::vector<std::string> &args : clustered) {
    for (const char *fault : {"sqleInitApplicationEnvironment:1", "sqlfusys:1"}) {
      SCOPED_TRACE(args.back() + " " + fault);
      resetWorld("cluster");
      keepWorld();
      std::vector<std::string> withAuth = withArgs({"-a", "SERVER"}, args);
      Outcome outcome = run(withAuth, fault);
      ASSERT_EQ(outcome.failures.size(), 1u) << outcome.trace;
      expectUndone();
      EXPECT_NE(outcome.out.find(kRestoredNotice), std::string::npos) << outcome.out;
      expectRerunUpgrades(withAuth, args.back());
    }
  }
}

TEST_F(DriverFailureTest, NewProfilePathThatExistedStaysAndTheCopyGoes) {
  world.makeDirectory("C:\\Profiles");
  world.writeText("C:\\Profiles\\other\\keep.txt", "someone else's\n");
  keepWorld();
  Outcome outcome = run({"-p", "C:\\Profiles", "INST1"}, "sqleInitApplicationEnvironment:1");
  ASSERT_EQ(outcome.failures.size(), 1u) << outcome.trace;
  EXPECT_EQ(outcome.failures[0].probe, 120);
  expectUndone();
  EXPECT_TRUE(exists("C:\\Profiles\\other\\keep.txt"));
  expectRerunUpgrades({"-p", "C:\\Profiles", "INST1"});
}

TEST_F(DriverFailureTest, ForceCopyNameKeepsTheOtherMachinesProfileValues) {
  const std::string remoteProfile =
      "SOFTWARE\\ZAV\\KXLSIM\\Machines\\WINSRV2\\" + profileKey("KXL95", "INST2");
  ASSERT_EQ(stringValue(remoteProfile, "KXLPORTRANGE"), "60000:60003");
  std::vector<std::string> args = withArgs({"-forcecn"}, kPartitioned);
  Outcome outcome = run(args, "sqlocopydir:3");
  ASSERT_EQ(outcome.failures.size(), 1u) << outcome.trace;
  EXPECT_EQ(outcome.failures[0].probe, 190);
  expectUndone();
  EXPECT_EQ(stringValue(remoteProfile, "KXLPORTRANGE"), "60000:60003");
  expectRerunUpgrades(args, "INST2");
  // Only a successful upgrade drops the old key of the forced machine.
  EXPECT_FALSE(keyExists(remoteProfile));
}

// A node list that cannot be had is refused before anything is touched, and
// once the file is repaired the same command upgrades the instance.
TEST_F(DriverFailureTest, PartitionedInstanceWithoutAReadableNodeListIsRefused) {
  const std::string nodesFile = std::string(kOldCopy) + "\\INST2\\kxlnodes.cfg";
  const std::string good = fileContent(nodesFile);
  ASSERT_FALSE(good.empty());
  std::vector<std::string> args = kPartitioned;
  struct Case {
    const char *what;
    const char *content; // null: no file
  } cases[] = {{"missing", nullptr},
               {"empty", ""},
               {"node listed twice", "0 winsrv1.zav.test WINSRV1 0\r\n"
                                     "0 winsrv1.zav.test WINSRV1 0\r\n"}};
  for (const Case &c : cases) {
    SCOPED_TRACE(c.what);
    resetWorld();
    if (c.content == nullptr)
      removeTree(nodesFile);
    else
      world.writeText(nodesFile, c.content);
    keepWorld();
    Outcome outcome = run(args);
    expectFailure(outcome, 11, -1960);
    EXPECT_NE(outcome.out.find("KXL1960E  The partitioned instance \"INST2\" cannot be upgraded"),
              std::string::npos)
        << outcome.out;
    EXPECT_EQ(outcome.out.find(kRestoredNotice), std::string::npos) << outcome.out;
    expectUndone();
    world.writeText(nodesFile, good);
    expectRerunUpgrades(args, "INST2");
  }
}

// A start type that cannot be read is never taken for an absent one (which
// would make an automatic service start on demand after the upgrade).
TEST_F(DriverFailureTest, UnreadableStartTypeFailsTheServicesStep) {
  const std::string service = "SOFTWARE\\ZAV\\KXLSIM\\Services\\INST1";
  world.setString(kxlsim::localMachine(), service, "Start", "2");
  keepWorld();
  Outcome outcome = run({"INST1"});
  expectFailure(outcome, 90, -1925);
  expectUndone();
  world.setDword(kxlsim::localMachine(), service, "Start", 2);
  expectRerunUpgrades({"INST1"});
  EXPECT_EQ(dwordValue(service, "Start"), 2u);
}

// The message never claims a restore that failed (the directory, or a
// service the undo could not point back): it names the backup, which is kept
// with the instance's files.
TEST_F(DriverFailureTest, FailedRestoreKeepsTheBackupAndSaysWhere) {
  const struct {
    std::vector<std::string> args;
    const char *faults;
  } cases[] = {
      {{"-p", kOldCopy, "INST1"}, "sqleInitApplicationEnvironment:1,sqlocopydir:2"},
      {{"INST1"}, "sqleInitApplicationEnvironment:1,sqloChangeNTServiceConfig:2"},
  };
  for (const auto &c : cases) {
    SCOPED_TRACE(c.faults);
    resetWorld();
    keepWorld();
    Outcome outcome = run(c.args, c.faults);
    ASSERT_EQ(outcome.failures.size(), 1u) << outcome.trace;
    EXPECT_EQ(outcome.out.find(kRestoredNotice), std::string::npos) << outcome.out;
    std::size_t at =
        outcome.out.find(std::string(kNotRestored) + "  The instance could not be restored completely.");
    ASSERT_NE(at, std::string::npos) << outcome.out;
    std::size_t open = outcome.out.find("\"C:\\windows\\temp\\KXL", at);
    ASSERT_NE(open, std::string::npos) << outcome.out;
    std::string backup = outcome.out.substr(open + 1, outcome.out.find('"', open + 1) - open - 1);
    EXPECT_EQ(treeDifferences(before, tree(backup)), "");
    EXPECT_NE(diagnosticLog().find("kept in " + backup), std::string::npos) << diagnosticLog();
    expectRerunUpgrades(c.args);
  }
}

TEST_F(DriverFailureTest, ConfigurationConversionFailureIs1947) {
  // A damaged checksum makes the saved configuration unconvertible.
  std::vector<uint8_t> image;
  ASSERT_TRUE(kxlsim::readFileHead(std::string(kOldInstanceDir) + "\\kxlsystm", 1 << 20, image));
  image[0] ^= 0xFF;
  world.writeFile(std::string(kOldInstanceDir) + "\\kxlsystm", image);
  keepWorld();
  Outcome outcome = run({"INST1"});
  expectFailure(outcome, 130, -1947);
  expectUndone();
  EXPECT_EQ(outcome.out, "KXL1947E  The database manager configuration of the instance could not be "
                         "upgraded.\n"
                         "KXL1971I  The instance was restored as it was before the command ran.\n");
  image[0] ^= 0xFF;
  world.writeFile(std::string(kOldInstanceDir) + "\\kxlsystm", image);
  expectRerunUpgrades({"INST1"});
}

// A run killed at some point leaves its record; the next plain run puts the
// instance back or finishes the upgrade, and leaves nothing of the killed run.
// A record that cannot be used is set aside and the run judged as usual.
struct KilledRunCase {
  const char *what;
  const char *kill;
  const char *recordEdit; // replaces "oldCopy=KXL95" in the record (null: none)
  bool backupLeft;        // the killed run's backup stays (its record was not usable)
};

class KilledRunTest : public DriverTest, public ::testing::WithParamInterface<KilledRunCase> {};

constexpr const char *kRecord = "C:\\Program Files\\ZAV\\KXL101\\CFG\\kxliupgrade-INST1.run";

TEST_P(KilledRunTest, NextRunLeavesTheUpgradedInstance) {
  const KilledRunCase &c = GetParam();
  Outcome killed = run({"INST1"}, "", c.kill);
  ASSERT_EQ(killed.exitCode, 137) << killed.out << killed.err;
  ASSERT_TRUE(exists(kRecord));
  if (c.recordEdit != nullptr) {
    std::string record = fileContent(kRecord);
    record.replace(record.find("oldCopy=KXL95"), 13, c.recordEdit);
    world.writeText(kRecord, record);
  }

  Outcome rerun = run({"INST1"});
  EXPECT_EQ(rerun.exitCode, 0) << rerun.out << rerun.trace;
  EXPECT_EQ(stringValue("SOFTWARE\\ZAV\\KXLSIM\\Instances\\INST1", "Copy"), "KXL101");
  EXPECT_EQ(stringValue("SOFTWARE\\ZAV\\KXLSIM\\Services\\INST1", "ImagePath"),
            std::string(kCurrentCopy) + "\\bin\\kxlsyscs.exe");
  EXPECT_TRUE(keyExists(profileKey("KXL101", "INST1")));
  EXPECT_FALSE(keyExists(profileKey("KXL95", "INST1")));
  EXPECT_TRUE(exists(std::string(kNewInstanceDir) + "\\kxlmd_config.xml"));
  EXPECT_FALSE(exists(kRecord));
  EXPECT_EQ(exists(std::string(kRecord) + ".damaged"), c.recordEdit != nullptr);
  EXPECT_EQ(hasBackup(tempEntries()), c.backupLeft);
}

INSTANTIATE_TEST_SUITE_P(
    Kills, KilledRunTest,
    ::testing::Values(KilledRunCase{"BackupCopyPutBack", "sqlocopydir:1", nullptr, false},
                      KilledRunCase{"ProfileMovePutBack", "SHCopyKeyA:1", nullptr, false},
                      KilledRunCase{"RecreationFinished", "sqlo_instance_create_extended:1", nullptr, false},
                      KilledRunCase{"SslToolFinished", "sqloexec2:3", nullptr, false},
                      KilledRunCase{"RegistryWriteFinished", "hivewrite:4", nullptr, false},
                      KilledRunCase{"DamagedRecordSetAside", "sqlocopydir:1", "oldCopy=KXL95\nbroken line",
                                    true},
                      KilledRunCase{"RecordOfAGoneCopySetAside", "sqlocopydir:1", "oldCopy=KXL77", true}),
    [](const ::testing::TestParamInfo<KilledRunCase> &info) { return std::string(info.param.what); });

} // namespace
} // namespace drivertest
