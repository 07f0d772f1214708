// Every way the upgrade driver can fail, driven through the installed command:
// the result and trace point, the machine as it was before the run (registry
// of every machine and files, apart from the logs), what the final message
// says about it, and a plain rerun that then upgrades the instance.
#include "driver_fixture.h"

namespace drivertest {
namespace {

// Codes of the product library that the driver passes on unchanged.
constexpr long long kAccessDenied = int32_t(0x870F0003u), kExecFailed = int32_t(0x870F0140u),
                    kPathNotFound = int32_t(0x870F0011u), kIoError = int32_t(0x870F0004u),
                    kPathTestFailed = int32_t(0x90000002u);

constexpr const char *kRestoredNotice = "KXL1971I";
constexpr const char *kNotRestored = "KXL1972E";
constexpr const char *kProfiles = "C:\\Profiles";
const std::string kNodesFile = std::string(DriverTest::kOldCopy) + "\\INST2\\kxlnodes.cfg";
const std::string kSystm = std::string(kOldInstanceDir) + "\\kxlsystm";
const std::string kCarried = std::string(kOldInstanceDir) + "\\bin\\rsm.cfg";
const std::string kDrive = "SOFTWARE\\ZAV\\KXLSIM\\Drives\\C";
const std::string kService = "SOFTWARE\\ZAV\\KXLSIM\\Services\\INST1";
const std::string kRemoteProfile =
    "SOFTWARE\\ZAV\\KXLSIM\\Machines\\WINSRV2\\" + profileKey("KXL95", "INST2");

using Args = std::vector<std::string>;
Args with(std::initializer_list<const char *> first, const Args &rest) {
  Args args(first.begin(), first.end());
  args.insert(args.end(), rest.begin(), rest.end());
  return args;
}
// The partitions' services run under this account already.
const Args kPartitioned = {"-u", ".\\kxlsvc,secret", "INST2"};
// Another account: a failure after the services were given it gives them
// their own back on every machine.
const Args kNewAccount = {"-u", "KXLADMIN,secret", "INST2"};
const Args kInPlace = {"-p", DriverTest::kOldCopy, "INST1"};
const Args kNewPath = {"-p", kProfiles, "INST1"};
const Args kSingle = {"INST1"}, kInstall = {"-install", "INST1"};

// kNone: failed before anything needed restoring; kRestored: the message says so.
enum class Notice { kNone, kRestored };

using Step = void (*)(DriverTest &);
void flipFirstByte(DriverTest &t) {
  // A damaged checksum: the saved configuration is unconvertible.
  std::string image = t.fileContent(kSystm);
  image[0] = static_cast<char>(image[0] ^ 0xFF);
  t.world.writeText(kSystm, image);
}
void nodesFile(DriverTest &t, const char *content) {
  t.removeTree(kNodesFile);
  if (content != nullptr)
    t.world.writeText(kNodesFile, content);
}
void goodNodesFile(DriverTest &t) {
  nodesFile(t, "0 winsrv1.zav.test WINSRV1 0\r\n1 winsrv2.zav.test WINSRV2 0\r\n");
}

struct FailureRow {
  Args args;
  const char *fault;
  long long probe, rc; // rc 0: any negative result
  Notice notice;
  Step breakIt = nullptr, repair = nullptr; // the world broken one way before the run, repaired after it
  const char *says = "";                    // in the final message
  Step afterRerun = nullptr;
  const char *scenario = "demo";
};

// clang-format off
const FailureRow kFailureRows[] = {
    // Installer mode skips the database check, which would refuse an active instance first.
    {kInstall, "", 10, -1953, Notice::kNone,
     [](DriverTest &t) { t.world.setDword(kxlsim::localMachine(), kService, "State", 4); },
     [](DriverTest &t) { t.world.setDword(kxlsim::localMachine(), kService, "State", 1); }},
    // The backup fails: nothing was changed, no directory is left.
    {kSingle, "GetTempPathA:1", 20, -1969, Notice::kNone},
    {kSingle, "_tempnam:1", 30, -1969, Notice::kNone},
    {kSingle, "CreateDirectoryA:1", 40, -1969, Notice::kNone},
    {kSingle, "sqlocopydir:1", 50, -1969, Notice::kNone},
    {kSingle, "FindNextFileA:1", 50, -1969, Notice::kNone},
    {kSingle, "FindNextFileA:6", 50, -1969, Notice::kNone},
    {kSingle, "GetDiskFreeSpaceExA:1", 50, -1969, Notice::kNone},
    {kSingle, "MoveFileExA:1", 330, -1969, Notice::kNone}, // the run's record cannot be written
    {kSingle, "", 50, -1969, Notice::kNone,                 // no room for the backup
     [](DriverTest &t) { t.world.setString(kxlsim::localMachine(), kDrive, "FreeBytes", "8192"); },
     [](DriverTest &t) { t.world.setString(kxlsim::localMachine(), kDrive, "FreeBytes", "1099511627776"); }},
    // An in-place upgrade re-creates the instance in its own directory: an
    // incomplete backup would lose the original files, so it stops the run first.
    {kInPlace, "FindNextFileA:6", 50, -1969, Notice::kNone, nullptr, nullptr, "",
     [](DriverTest &t) { EXPECT_EQ(t.fileContent(kSystm).substr(16, 2), std::string("\0\x0D", 2)); }},
    {kNewPath, "", 70, -1959, Notice::kNone, // the instance is in the profile path already
     [](DriverTest &t) { t.world.writeText("C:\\Profiles\\INST1\\keep.txt", "someone else's\n"); },
     [](DriverTest &t) { t.removeTree("C:\\Profiles\\INST1"); }},
    // The driver's second read of the node list: refused rather than leaving
    // the other machine's partitions on the old copy behind a success.
    {kPartitioned, "sqloReadKxlnodes:2", 11, -1960, Notice::kNone},
    // A node list that cannot be had is refused before anything is touched.
    {kPartitioned, "", 11, -1960, Notice::kNone, [](DriverTest &t) { nodesFile(t, nullptr); }, goodNodesFile,
     "KXL1960E  The partitioned instance \"INST2\" cannot be upgraded"},
    {kPartitioned, "", 11, -1960, Notice::kNone, [](DriverTest &t) { nodesFile(t, ""); }, goodNodesFile},
    {kPartitioned, "", 11, -1960, Notice::kNone, // a node listed twice
     [](DriverTest &t) { nodesFile(t, "0 winsrv1.zav.test WINSRV1 0\r\n0 winsrv1.zav.test WINSRV1 0\r\n"); },
     goodNodesFile},
    // A folder where a carried file should be cannot be copied as a file.
    {kSingle, "", 170, kAccessDenied, Notice::kRestored,
     [](DriverTest &t) { t.removeTree(kCarried); t.world.makeDirectory(kCarried); },
     [](DriverTest &t) { t.removeTree(kCarried); }},
    {kSingle, "", 190, kPathNotFound, Notice::kRestored,
     [](DriverTest &t) { t.removeTree(std::string(DriverTest::kOldCopy) + "\\function"); },
     [](DriverTest &t) { t.world.writeText(std::string(DriverTest::kOldCopy) + "\\function\\kxludf.dll", "MZ\r\n"); }},
    // A start type that cannot be read is never taken for an absent one (which
    // would make an automatic service start on demand after the upgrade).
    {kSingle, "", 90, -1925, Notice::kRestored,
     [](DriverTest &t) { t.world.setString(kxlsim::localMachine(), kService, "Start", "2"); },
     [](DriverTest &t) { t.world.setDword(kxlsim::localMachine(), kService, "Start", 2); }, "",
     [](DriverTest &t) { EXPECT_EQ(t.dwordValue(kService, "Start"), 2u); }},
    {kSingle, "", 130, -1947, Notice::kRestored, flipFirstByte, flipFirstByte,
     "KXL1947E  The database manager configuration of the instance could not be upgraded.\n"
     "KXL1971I  The instance was restored as it was before the command ran.\n"},
    // Faults from the backup on, single and partitioned, in place or under a
    // new profile path: each is undone and the message says so.
    {kSingle, "sqlocopydir:2", 60, -1969, Notice::kRestored},
    {kSingle, "sqloQueryNTServiceConfig:1", 90, -1925, Notice::kRestored},
    {kSingle, "sqloGetCurrentInstallationName:8", 90, -1918, Notice::kRestored}, // in the services step
    {kSingle, "sqlo_instance_create_extended:1", 90, 0, Notice::kRestored},
    {kInstall, "sqloexec2:1", 95, kExecFailed, Notice::kRestored},
    {kInstall, "sqloexec2:2", 97, kExecFailed, Notice::kRestored},
    {kSingle, "sqleInitApplicationEnvironment:1", 120, 0, Notice::kRestored},
    {with({"-a", "SERVER"}, kSingle), "sqlfusys:1", 140, -1, Notice::kRestored},
    {kSingle, "sqlocopydir:3", 190, 0, Notice::kRestored},
    {kInPlace, "sqleInitApplicationEnvironment:1", 120, 0, Notice::kRestored},
    {kNewPath, "sqleInitApplicationEnvironment:1", 120, 0, Notice::kRestored},
    {kNewPath, "sqlocopydir:2", 60, -1969, Notice::kRestored},
    // A new profile path that existed stays, with what is in it.
    {kNewPath, "sqleInitApplicationEnvironment:1", 120, 0, Notice::kRestored,
     [](DriverTest &t) { t.world.writeText("C:\\Profiles\\other\\keep.txt", "someone else's\n"); }},
    {kPartitioned, "sqleInitApplicationEnvironment:1", 120, 0, Notice::kRestored},
    {with({"-forcecn"}, kPartitioned), "sqleInitApplicationEnvironment:1", 120, 0, Notice::kRestored},
    {with({"-forcecn"}, kPartitioned), "sqlo_instance_addnode:1", 90, 0, Notice::kRestored},
    // The forced machine's profile values stay; only a success drops its old key.
    {with({"-forcecn"}, kPartitioned), "sqlocopydir:3", 190, 0, Notice::kRestored, nullptr, nullptr, "",
     [](DriverTest &t) { EXPECT_FALSE(t.keyExists(kRemoteProfile)); }},
    {kNewAccount, "sqlowrite:4", 130, -1947, Notice::kRestored},
    {with({"-forcecn"}, kNewAccount), "sqleInitApplicationEnvironment:1", 120, 0, Notice::kRestored},
    {kNewAccount, "sqloQueryNTServiceConfig:2", 90, -1925, Notice::kRestored}, // an account that cannot be read
    {kNewAccount, "sqloChangeNTServiceConfig:2", 90, 0, Notice::kRestored},    // a partition not re-pointed
    // The forced machine's old profile key cannot be deleted or reached.
    {with({"-forcecn"}, kNewAccount), "SHDeleteKeyA:2", 210, -1918, Notice::kRestored},
    {with({"-forcecn"}, kNewAccount), "sqloPRegMachineOpen:4", 210, -1913, Notice::kRestored},
    // A profile key move that fails leaves the old key whole and the keys
    // above the new one that were there before (an empty PROFILES key).
    {kSingle, "SHCopyKeyA:1", 80, 0, Notice::kRestored},
    {kSingle, "SHDeleteKeyA:1", 80, 0, Notice::kRestored},
    // A template that cannot be looked for is not a missing one (which would
    // make the instance partitioned).
    {kSingle, "sqloopenp:6", 90, kIoError, Notice::kRestored},
    // Audit settings kept aside in the instance's own directory: never lost,
    // and their copy never left behind.
    {kInPlace, "GetFileAttributesA:23", 85, kAccessDenied, Notice::kRestored},
    {kInPlace, "sqlocopy:4", 93, kIoError, Notice::kRestored},
    {with({"-install"}, kInPlace), "sqloexec2:1", 95, kExecFailed, Notice::kRestored},
    // A function directory that cannot be tested is neither there nor missing.
    {kSingle, "ossPathTest:5", 190, kPathTestFailed, Notice::kRestored},
    // A move that fails on the second machine: the first one gets its key back.
    {kPartitioned, "sqloPRegMachineOpen:2", 80, -1913, Notice::kRestored},
    // Clustered instances: every machine's services come back with the profile keys.
    {{"-a", "SERVER", "CINST1"}, "sqleInitApplicationEnvironment:1", 120, 0, Notice::kRestored, nullptr, nullptr, "", nullptr, "cluster"},
    {{"-a", "SERVER", "CINST1"}, "sqlfusys:1", 140, 0, Notice::kRestored, nullptr, nullptr, "", nullptr, "cluster"},
    {{"-a", "SERVER", "-u", ".\\kxlsvc,secret", "CINST2"}, "sqleInitApplicationEnvironment:1", 120, 0, Notice::kRestored, nullptr, nullptr, "", nullptr, "cluster"},
    {{"-a", "SERVER", "-u", ".\\kxlsvc,secret", "CINST2"}, "sqlfusys:1", 140, 0, Notice::kRestored, nullptr, nullptr, "", nullptr, "cluster"},
};
// clang-format on

class DriverFailureTest : public DriverTest {
protected:
  // The world as kept before the run, and no backup directory.
  void expectUndone() {
    EXPECT_EQ(worldChanges(), "");
    EXPECT_FALSE(hasBackup());
  }

  // The same command without a fault upgrades the instance.
  void expectRerunUpgrades(const Args &args) {
    Outcome again = run(args);
    EXPECT_EQ(again.exitCode, 0) << again.out << again.err << again.trace;
    EXPECT_TRUE(again.failures.empty()) << again.trace;
    EXPECT_EQ(stringValue("SOFTWARE\\ZAV\\KXLSIM\\Instances\\" + args.back(), "Copy"), "KXL101");
    EXPECT_TRUE(keyExists(profileKey("KXL101", args.back())));
  }
};

class FailureRowTest : public DriverFailureTest, public ::testing::WithParamInterface<FailureRow> {};

TEST_P(FailureRowTest, FailsUndoneAndAPlainRerunUpgrades) {
  const FailureRow &row = GetParam();
  SCOPED_TRACE(std::string(row.fault) + " " + row.args.front() + " " + row.args.back());
  resetWorld(row.scenario);
  world.makeDirectory(kProfiles);
  if (row.breakIt != nullptr)
    row.breakIt(*this);
  keepWorld();
  Outcome outcome = run(row.args, row.fault);
  ASSERT_TRUE(outcome.driverRan) << outcome.out << outcome.err;
  ASSERT_EQ(outcome.failures.size(), 1u) << outcome.trace;
  EXPECT_EQ(outcome.failures[0].probe, row.probe);
  EXPECT_TRUE(row.rc == 0 ? outcome.driverResult < 0 : outcome.driverResult == row.rc)
      << outcome.driverResult;
  expectUndone();
  bool restored = outcome.out.find(kRestoredNotice) != std::string::npos;
  EXPECT_EQ(restored, row.notice == Notice::kRestored) << outcome.out;
  EXPECT_EQ(outcome.out.find(kNotRestored), std::string::npos) << outcome.out;
  EXPECT_NE(outcome.out.find(row.says), std::string::npos) << outcome.out;
  if (row.repair != nullptr)
    row.repair(*this);
  expectRerunUpgrades(row.args);
  if (row.afterRerun != nullptr)
    row.afterRerun(*this);
}

INSTANTIATE_TEST_SUITE_P(Rows, FailureRowTest, ::testing::ValuesIn(kFailureRows));

// The message never claims a restore that failed (the directory, or a
// service the undo could not point back): it names the backup, which is kept
// with the instance's files.
TEST_F(DriverFailureTest, FailedRestoreKeepsTheBackupAndSaysWhere) {
  for (const auto &[args, faults] :
       {std::pair(kInPlace, "sqleInitApplicationEnvironment:1,sqlocopydir:2"),
        std::pair(kSingle, "sqleInitApplicationEnvironment:1,sqloChangeNTServiceConfig:2")}) {
    SCOPED_TRACE(faults);
    resetWorld();
    std::map<std::string, std::string> before = tree(kOldInstanceDir);
    Outcome outcome = run(args, faults);
    ASSERT_EQ(outcome.failures.size(), 1u) << outcome.trace;
    EXPECT_EQ(outcome.out.find(kRestoredNotice), std::string::npos) << outcome.out;
    std::size_t at =
        outcome.out.find(std::string(kNotRestored) + "  The instance could not be restored completely.");
    std::size_t open = outcome.out.find("\"C:\\windows\\temp\\KXL", at);
    ASSERT_NE(open, std::string::npos) << outcome.out;
    std::string backup = outcome.out.substr(open + 1, outcome.out.find('"', open + 1) - open - 1);
    EXPECT_EQ(tree(backup), before);
    EXPECT_NE(outcome.diagnostics.find("kept in " + backup), std::string::npos) << outcome.diagnostics;
    expectRerunUpgrades(args);
  }
}

// A run killed at some point leaves its record; the next plain run puts the
// instance back or finishes the upgrade, and leaves nothing of the killed run.
// A record that cannot be used is set aside and the run judged as usual.
struct KilledRunCase {
  const char *what;
  const char *kill;
  const char *recordEdit; // replaces "oldCopy=KXL95" in the record (null: none)
};

class KilledRunTest : public DriverTest, public ::testing::WithParamInterface<KilledRunCase> {};

constexpr const char *kRecord = "C:\\Program Files\\ZAV\\KXL101\\CFG\\kxliupgrade-INST1.run";

TEST_P(KilledRunTest, NextRunLeavesTheUpgradedInstance) {
  const KilledRunCase &c = GetParam();
  ASSERT_EQ(run(kSingle, "", c.kill).exitCode, 137);
  ASSERT_TRUE(exists(kRecord));
  if (c.recordEdit != nullptr) {
    std::string record = fileContent(kRecord);
    world.writeText(kRecord, record.replace(record.find("oldCopy=KXL95"), 13, c.recordEdit));
  }
  Outcome rerun = run(kSingle);
  EXPECT_EQ(rerun.exitCode, 0) << rerun.out << rerun.trace;
  EXPECT_EQ(stringValue("SOFTWARE\\ZAV\\KXLSIM\\Instances\\INST1", "Copy"), "KXL101");
  EXPECT_EQ(stringValue(kService, "ImagePath"), std::string(kCurrentCopy) + "\\bin\\kxlsyscs.exe");
  EXPECT_TRUE(keyExists(profileKey("KXL101", "INST1")));
  EXPECT_FALSE(keyExists(profileKey("KXL95", "INST1")));
  EXPECT_TRUE(exists(std::string(kNewInstanceDir) + "\\kxlmd_config.xml"));
  EXPECT_FALSE(exists(kRecord));
  // A record that was not usable is set aside, and the killed run's backup stays.
  EXPECT_EQ(exists(std::string(kRecord) + ".damaged"), c.recordEdit != nullptr);
  EXPECT_EQ(hasBackup(), c.recordEdit != nullptr);
}

// clang-format off
const KilledRunCase kKills[] = {
    {"BackupCopyPutBack", "sqlocopydir:1", nullptr},       {"ProfileMovePutBack", "SHCopyKeyA:1", nullptr},
    {"RecreationFinished", "sqlo_instance_create_extended:1", nullptr},
    {"SslToolFinished", "sqloexec2:3", nullptr},           {"RegistryWriteFinished", "hivewrite:4", nullptr},
    {"DamagedRecordSetAside", "sqlocopydir:1", "oldCopy=KXL95\nbroken line"},
    {"RecordOfAGoneCopySetAside", "sqlocopydir:1", "oldCopy=KXL77"}};
// clang-format on
INSTANTIATE_TEST_SUITE_P(Kills, KilledRunTest, ::testing::ValuesIn(kKills),
                         [](const ::testing::TestParamInfo<KilledRunCase> &info) { return info.param.what; });

} // namespace
} // namespace drivertest
