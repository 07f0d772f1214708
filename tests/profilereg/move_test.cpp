// Moving INST1's profile key to the current copy and its undo: single machine,
// partitions, the force-copy-name mode and cluster machines, with the failures
// of each; and services pointed at the owning copy's program again. The undo
// of whole runs, on every machine, is checked end to end by the driver's
// failure table.
#include "../install/install_world.h"
#include "NT/profilereg.h"
#include "install/installcopy.h"
#include "install/kxlinstance.h"
#include "upgrade/records.h"

#include <cstdio>
#include <cstring>
#include <memory>
#include <sstream>
#include <string>

namespace {

using namespace kxltest;

constexpr char kRoot[] = "SOFTWARE\\ZAV\\KXL";
constexpr char kLocal[] = ""; // the local machine
constexpr char kV8[] = "";    // the single-copy layout
constexpr char kCurrent[] = "KXL101";
constexpr char kOld[] = "KXL95";

// A world with three copies (version 8, 9.1 and the current 10.1), INST1
// owned by one of them, and other machines of the world for partitions and
// cluster nodes.
class ProfileTest : public InstallWorld {
protected:
  void SetUp() override {
    InstallWorld::SetUp();
    if (IsSkipped() || HasFatalFailure())
      return;
    for (const char *copy : {kCurrent, kOld}) {
      registerCopy(copy, std::string("C:\\") + copy);
      setVersion(std::string(kCopies) + copy, copy == kOld ? "9" : "10", "1", "0", "0", "s");
    }
    registerCopy("KXLNOVER", "C:\\KXLNOVER");
    registerV8("C:\\KXL8");
    setVersion(kRoot, "8", "2", "0", "", "s8");
    setString(kIdentity, "ComputerName", "HOSTA");
    setString(kIdentity, "FullHostName", "hosta.zav.test");
    ASSERT_EQ(0, sqloSwitchToInstallationName(kCurrent));
    std::snprintf(options_.instanceName, sizeof options_.instanceName, "INST1");
  }

  // The instance belongs to `copy` ("KXLV8" for the version-8 installation).
  void ownBy(const char *copy) {
    owner_ = std::make_unique<InstallCopy>(copy, false, false);
    ASSERT_EQ(0u, owner_->GetStatus()) << copy;
    instance_ = std::make_unique<IKXLINSTANCE>("INST1", owner_->name, "C:\\prof\\INST1");
    context_.copy = owner_.get();
    owner_->GetPath(context_.copyPath, sizeof context_.copyPath);
    context_.instance = instance_.get();
  }

  // INST1's profile key under `copy` ("" the single-copy layout).
  static std::string profile(const std::string &copy) {
    return copy.empty() ? std::string(kRoot) + "\\PROFILES\\INST1"
                        : std::string(kRoot) + "\\InstalledCopies\\" + copy + "\\PROFILES\\INST1";
  }

  static std::string forceProfile() {
    return std::string(kRoot) + "\\FORCE_COPY_NAME\\InstalledCopies\\" + kCurrent + "\\PROFILES\\INST1";
  }

  // A profile key with a value naming the machine and a subkey with a value;
  // a machine other than the local one comes into being with it.
  static void seedProfile(const std::string &machine, const std::string &copy) {
    setString(at(machine, profile(copy)), "KXLMARK", "mark-" + machine);
    setString(at(machine, profile(copy) + "\\Node0"), "Port", "60000");
  }

  // The seeded profile sits under `copy` of `machine`, values and subkeys,
  // and (unless it is the same) not under `other`.
  static void expectProfileAt(const std::string &machine, const std::string &copy, const std::string &other) {
    EXPECT_EQ("mark-" + machine, getString(at(machine, profile(copy)), "KXLMARK")) << machine << " " << copy;
    EXPECT_EQ("60000", getString(at(machine, profile(copy) + "\\Node0"), "Port")) << machine << " " << copy;
    EXPECT_TRUE(copy == other || !keyExists(at(machine, profile(other)))) << machine << " " << other;
  }

  // Nodes file lines "<node> <host> <machine> <port>"; the instance becomes partitioned.
  void loadNodes(const std::string &lines) {
    const std::string file = "C:\\prof\\INST1\\kxlnodes.cfg";
    writeFile(file, lines);
    uint32_t entries = 0, maxNode = 0;
    ASSERT_EQ(0,
              sqloReadKxlnodes(file.c_str(), 4, &context_.nodeList, 5, &entries, &maxNode, 1, "INST1", 1, 0));
    options_.partitionedInstance = 1;
  }

  // The instance is clustered on CLUS1, with the cluster profile's machine list.
  static void clusterOn(const std::string &machines) {
    setString(profile(kOld), "KXLCLUSTER", "CLUS1");
    setString("Cluster\\ZAV\\KXL\\PROFILES\\INST1", "KXLCLUSTERLIST", machines);
  }

  static void addService(const std::string &machine, const std::string &name) {
    setString(serviceKey(name, machine), "ImagePath", "C:\\KXL101\\bin\\kxlsyscs.exe");
    setString(serviceKey(name, machine), "DisplayName", "before");
    setString(serviceKey(name, machine), "ObjectName", "LocalSystem");
  }

  static std::string service(const std::string &machine, const std::string &name, const char *value) {
    return getString(serviceKey(name, machine), value);
  }

  std::unique_ptr<InstallCopy> owner_;
  std::unique_ptr<IKXLINSTANCE> instance_;
  UpgradeContext context_;
  UpgradeOptions options_{};
};

// One move or undo: the owner, where the profile is seeded and on which
// machines ("." the local one), the partitions and cluster machines, and what
// comes out: the code, the machines whose key moved (the others keep it where
// it was) and a trace line.
struct MoveCase {
  bool revert;       // the undo: from the current copy back to the owner's
  const char *owner; // the owning copy
  const char *from;  // the copy the profile is seeded under
  const char *seeded;
  const char *nodes;   // null: not partitioned
  const char *cluster; // null: not clustered
  const char *fault;
  int32_t result;
  const char *moved;
  const char *traced; // null: not looked at
};

class MoveTable : public ProfileTest, public ::testing::WithParamInterface<MoveCase> {};

std::vector<std::string> machinesOf(const char *list) {
  std::istringstream words(list);
  std::vector<std::string> machines;
  for (std::string word; words >> word;)
    machines.push_back(word == "." ? kLocal : word);
  return machines;
}

TEST_P(MoveTable, MovesWhereItReaches) {
  const MoveCase &c = GetParam();
  const std::string owned = std::strcmp(c.owner, KXLI_V8_COPY_NAME) == 0 ? kV8 : c.owner;
  const std::string to = c.revert ? owned : kCurrent;
  if (c.cluster != nullptr)
    clusterOn(c.cluster);
  ownBy(c.owner);
  for (const std::string &machine : machinesOf(c.seeded))
    seedProfile(machine, c.from);
  if (c.nodes != nullptr)
    loadNodes(c.nodes);
  addService(kLocal, "INST1");
  startTrace();
  failCalls(c.fault);
  auto step = [&] {
    return c.revert ? revertInstanceProfile(context_, options_) : moveInstanceProfile(context_, options_);
  };
  EXPECT_EQ(c.result, step());
  const std::vector<std::string> moved = machinesOf(c.moved);
  for (const std::string &machine : machinesOf(c.seeded)) {
    bool wasMoved = std::find(moved.begin(), moved.end(), machine) != moved.end();
    expectProfileAt(machine, wasMoved ? to : c.from, wasMoved ? c.from : to);
  }
  EXPECT_TRUE(c.traced == nullptr || traced(c.traced)) << c.traced;
  EXPECT_TRUE(c.cluster == nullptr || std::string("CLUS1") == options_.partitionRecord.clusterName);
  EXPECT_TRUE(c.result == 0 || service(kLocal, "INST1", "ImagePath") == "C:\\KXL101\\bin\\kxlsyscs.exe");
  if (c.fault == nullptr)
    return;
  // With the fault gone a plain rerun completes the step.
  failCalls(nullptr);
  EXPECT_EQ(0, step());
  for (const std::string &machine : machinesOf(c.seeded))
    expectProfileAt(machine, to, c.from);
}

// A version-8 owner's single-copy key moves and is deleted; the current copy's
// instance stays; without the owner's version the old key is unknown; the
// partitions' or cluster's machines move once each, and the first machine that
// cannot be reached stops the move (the undo goes on past it).
INSTANTIATE_TEST_SUITE_P(
    Profiles, MoveTable,
    ::testing::Values(
        MoveCase{false, KXLI_V8_COPY_NAME, kV8, ".", nullptr, nullptr, nullptr, 0, ".", nullptr},
        MoveCase{false, kCurrent, kCurrent, ".", nullptr, nullptr, nullptr, 0, ".", nullptr},
        MoveCase{false, kOld, kOld, ".", nullptr, nullptr, "RegCreateKeyExA:1", UPGRADE_RC_NO_COPY, "",
                 "error 0x18780506 probe=100 rc=-1918"},
        MoveCase{false, "KXLNOVER", kV8, ".", nullptr, nullptr, nullptr, UPGRADE_RC_NO_COPY, "", nullptr},
        MoveCase{false, kOld, kOld, ". M2",
                 "0 hosta.zav.test HOSTA 0\n1 hostb.zav.test M2 0\n2 hostb.zav.test M2 1\n", nullptr, nullptr,
                 0, ". M2", nullptr},
        MoveCase{false, kOld, kOld, ". M2",
                 "0 hosta.zav.test HOSTA 0\n1 hostc.zav.test M3 0\n2 hostb.zav.test M2 0\n", nullptr, nullptr,
                 UPGRADE_RC_MACHINE_REGISTRY, ".", "error 0x18780506 probe=10 rc=-1913"},
        MoveCase{false, kOld, kOld, ". M2 M3", nullptr, "M2 hosta M3", nullptr, 0, ". M2 M3", nullptr},
        MoveCase{false, kOld, kOld, ". M2", nullptr, "HOSTA M9 M2", nullptr, UPGRADE_RC_MACHINE_REGISTRY, ".",
                 "error 0x18780506 probe=60 rc=-1913"},
        MoveCase{false, kOld, kOld, ". M2 M3", "0 hosta.zav.test HOSTA 0\n1 hostb.zav.test M2 0\n",
                 "hosta m2 M3 M2", nullptr, 0, ". M2 M3", nullptr},
        MoveCase{true, kOld, kCurrent, ". M3",
                 "0 hosta.zav.test HOSTA 0\n1 hostb.zav.test M9 0\n2 hostc.zav.test M3 0\n", nullptr, nullptr,
                 UPGRADE_RC_MACHINE_REGISTRY, ". M3", "error 0x18780507 probe=10 rc=-1913"},
        MoveCase{true, kOld, kCurrent, ".", nullptr, nullptr, "SHCopyKeyA:1", UPGRADE_RC_NO_COPY, "",
                 "error 0x18780507 probe=110 rc=-1918"}));

TEST_F(ProfileTest, ForceCopyNameNeedsTheLocalHostName) {
  ownBy(kOld);
  seedProfile(kLocal, kOld);
  options_.flags |= UPGRADE_FLAG_FORCE_COPY_NAME;
  loadNodes("0 hosta.zav.test HOSTA 0\n");
  failCalls("sqloPdbTcpIpGetFullHostName:1");
  EXPECT_EQ(UPGRADE_RC_SQLCA, moveInstanceProfile(context_, options_));
  EXPECT_EQ(UPGRADE_SQLCODE_PARTITION_SETUP, options_.status.sqlcode);
  expectProfileAt(kLocal, kOld, kCurrent);
}

// Other hosts get an empty placeholder and keep their old key until the whole
// upgrade has succeeded. Dropping the forced keys fails while every old key is
// still there (the upgrade can be undone whole); once one is gone it goes on
// past a machine it cannot reach.
TEST_F(ProfileTest, ForceCopyNameGivesOtherHostsAPlaceholderDroppedAtTheEnd) {
  ownBy(kOld);
  for (const char *machine : {kLocal, "M2", "M3"})
    seedProfile(machine, kOld);
  options_.flags |= UPGRADE_FLAG_FORCE_COPY_NAME;
  loadNodes("0 HOSTA.ZAV.TEST HOSTA 0\n1 hostb.zav.test M2 0\n2 hostc.zav.test M3 0\n");
  ASSERT_EQ(0, moveInstanceProfile(context_, options_));
  expectProfileAt(kLocal, kCurrent, kOld);
  EXPECT_FALSE(keyExists(forceProfile()));
  expectProfileAt("M2", kOld, kCurrent);
  EXPECT_TRUE(keyExists(at("M2", forceProfile())));
  EXPECT_EQ("<missing>", getString(at("M2", forceProfile()), "KXLMARK"));
  EXPECT_FALSE(keyExists(at("M2", forceProfile() + "\\Node0")));

  failCalls("SHDeleteKeyA:1");
  EXPECT_EQ(UPGRADE_RC_NO_COPY, dropForcedProfileKeys(context_, options_));
  expectProfileAt("M2", kOld, kCurrent);
  expectProfileAt("M3", kOld, kCurrent);
  failCalls("SHDeleteKeyA:2");
  EXPECT_EQ(0, dropForcedProfileKeys(context_, options_));
  EXPECT_FALSE(keyExists(at("M2", profile(kOld))));
  EXPECT_TRUE(keyExists(at("M2", forceProfile())));
  expectProfileAt("M3", kOld, kCurrent);
  failCalls(nullptr);
  EXPECT_EQ(0, dropForcedProfileKeys(context_, options_));
  EXPECT_FALSE(keyExists(at("M3", profile(kOld))));
  expectProfileAt(kLocal, kCurrent, kOld);
}

TEST_F(ProfileTest, UndoGivesAVersion8OwnerItsSingleCopyKeyAndShortDisplayName) {
  ownBy(KXLI_V8_COPY_NAME);
  seedProfile(kLocal, kCurrent);
  addService(kLocal, "INST1");
  context_.serviceStartType = SQLO_SVC_DEMAND_START;
  EXPECT_EQ(0, revertInstanceProfile(context_, options_));
  expectProfileAt(kLocal, kV8, kCurrent);
  EXPECT_EQ("C:\\KXL8\\bin\\kxlsyscs.exe", service(kLocal, "INST1", "ImagePath"));
  EXPECT_EQ("KXL - INST1", service(kLocal, "INST1", "DisplayName"));
  EXPECT_EQ(DWORD(SQLO_SVC_DEMAND_START), getDword(serviceKey("INST1"), "Start"));
}

// A host without a recorded installation runs the owning copy's program; the
// services step gave INST1-1 the account of -u, INST1-2's was not recorded.
TEST_F(ProfileTest, UndoPointsPartitionServicesBackOnEveryMachine) {
  ownBy(kOld);
  for (const char *machine : {kLocal, "M2", "M3"})
    seedProfile(machine, kCurrent);
  setString(at("M2", std::string(kRoot) + "\\GLOBAL_PROFILE"), "KXLPATH", "D:\\KXLOLD");
  loadNodes(
      "0 hosta.zav.test HOSTA 0\n1 hostb.zav.test M2 0\n2 hostb.zav.test M2 1\n3 hostc.zav.test M3 0\n");
  for (const auto &[machine, name] :
       {std::pair{kLocal, "INST1-0"}, {"M2", "INST1-1"}, {"M2", "INST1-2"}, {"M3", "INST1-3"}})
    addService(machine, name);
  std::snprintf(options_.userName, sizeof options_.userName, "svcuser");
  std::snprintf(options_.password, sizeof options_.password, "secret");
  context_.serviceStartType = SQLO_SVC_DEMAND_START;
  context_.recreatedNodeType = 4;
  setString(serviceKey("INST1-1", "M2"), "ObjectName", "svcuser");
  context_.serviceAccounts = {{"M2", "INST1-1", ".\\oldacct"}};

  EXPECT_EQ(0, revertInstanceProfile(context_, options_));
  for (const char *machine : {kLocal, "M2", "M3"})
    expectProfileAt(machine, kOld, kCurrent);
  EXPECT_EQ("C:\\KXL95\\bin\\kxlsyscs.exe", service(kLocal, "INST1-0", "ImagePath"));
  EXPECT_EQ("D:\\KXLOLD\\bin\\kxlsyscs.exe", service("M2", "INST1-1", "ImagePath"));
  EXPECT_EQ("D:\\KXLOLD\\bin\\kxlsyscs.exe", service("M2", "INST1-2", "ImagePath"));
  EXPECT_EQ("C:\\KXL95\\bin\\kxlsyscs.exe", service("M3", "INST1-3", "ImagePath"));
  EXPECT_EQ("KXL - KXL95 - INST1-0", service(kLocal, "INST1-0", "DisplayName"));
  EXPECT_EQ("KXL - KXL95 - INST1-2", service("M2", "INST1-2", "DisplayName"));
  EXPECT_EQ(".\\oldacct", service("M2", "INST1-1", "ObjectName"));
  EXPECT_EQ("LocalSystem", service("M2", "INST1-2", "ObjectName"));
  EXPECT_EQ(DWORD(SQLO_SVC_DEMAND_START), getDword(serviceKey("INST1-0"), "Start"));
}

// The undo handles the machines the move handled: the partitions' machine and
// the cluster's other machines, each once, and not the local machine that
// served no partition (whose profile already is the current copy's).
TEST_F(ProfileTest, UndoOfClusteredPartitionsHandlesTheMachinesTheMoveHandled) {
  clusterOn("HOSTA M2 m3 M3");
  ownBy(kOld);
  SHDeleteKeyA(HKEY_LOCAL_MACHINE, profile(kOld).c_str());
  ASSERT_FALSE(keyExists(profile(kOld)));
  seedProfile("M2", kOld);
  seedProfile("M3", kOld);
  seedProfile(kLocal, kCurrent);
  loadNodes("0 hostb.zav.test M2 0\n1 hostb.zav.test M2 1\n");
  ASSERT_EQ(0, moveInstanceProfile(context_, options_));
  expectProfileAt("M2", kCurrent, kOld);
  expectProfileAt("M3", kCurrent, kOld);
  ASSERT_FALSE(keyExists(profile(kOld)));

  EXPECT_EQ(0, revertInstanceProfile(context_, options_));
  expectProfileAt("M2", kOld, kCurrent);
  expectProfileAt("M3", kOld, kCurrent);
  expectProfileAt(kLocal, kCurrent, kOld);
}

} // namespace
