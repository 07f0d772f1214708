// The services step: the instance re-created under the current copy with the
// node type the copy's templates allow, its services pointed at the current
// copy's programs with their former start type, and failures that leave the
// instance of the older copy in place.
#include "NT/nodetypechoice.h"
#include "NT/services.h"
#include "services_world.h"

#include <gtest/gtest.h>

namespace kxltest {
namespace {

class ServicesTest : public ServicesWorld {
protected:
  void bind(uint32_t nodeType) {
    instance_ = std::make_unique<IKXLINSTANCE>(kInstance, nullptr, kInstanceDir);
    context.instance = instance_.get();
    context.nodeType = nodeType;
  }

  int32_t run() { return upgradeInstanceServices(context, *options); }

  void expectService(const std::string &key, const std::string &program, DWORD start) {
    EXPECT_EQ(program, getString(key, "ImagePath")) << key;
    EXPECT_EQ(start, getDword(key, "Start")) << key;
  }

  UpgradeContext context;
  std::unique_ptr<UpgradeOptions> options = makeOptions();

private:
  std::unique_ptr<IKXLINSTANCE> instance_;
};

// The requested type when its template is there, else the first of the fixed
// order 1, 3, 5, 2 that is; with no template at all the requested type.
TEST_F(ServicesTest, NodeTypeFollowsTheTemplatesTheCopyShips) {
  startTrace();
  EXPECT_EQ(4, chooseNodeType(context, *options, 4));
  EXPECT_TRUE(traced("error 0x18780522 probe=10"));
  makeDirectories(std::string(kCurrentPath) + "\\CFG");
  EXPECT_EQ(2, chooseNodeType(context, *options, 2));
  const struct {
    uint16_t added;
    uint32_t requested, chosen;
  } steps[] = {{2, 4, 2}, {5, 4, 5}, {3, 4, 3}, {1, 4, 1}, {1, 7, 1}, {4, 4, 4}, {4, 3, 3}};
  for (const auto &step : steps) {
    addTemplate(step.added);
    EXPECT_EQ(int32_t(step.chosen), chooseNodeType(context, *options, step.requested)) << step.requested;
  }
}

TEST_F(ServicesTest, SingleServiceRunsTheCurrentCopyWithItsFormerStartType) {
  addTemplate(1);
  addOldInstance(1, 3);
  bind(1);
  ASSERT_EQ(0, run());
  EXPECT_EQ(3, context.serviceStartType);
  EXPECT_EQ(1, options->partitionRecord.serviceStepFlag);
  EXPECT_EQ(kCurrentCopy, getString(instanceKey(kInstance), "Copy"));
  expectService(serviceKey(kInstance), kNewProgram, 3);
  EXPECT_EQ("KXL - KXL10 - INST1", getString(serviceKey(kInstance), "DisplayName"));
  EXPECT_EQ("OLDACCT", getString(serviceKey(kInstance), "ObjectName"));
  expectConfig("h40=1 h46=0");
}

TEST_F(ServicesTest, ProfileValuesReachTheProductLibraries) {
  addTemplate(1);
  addOldInstance(1);
  bind(1);
  setString(copyKey(kCurrentCopy) + "\\GLOBAL_PROFILE", "KXLWORKSTATION", "YES");
  std::snprintf(context.var159Head, sizeof context.var159Head, "50000");
  std::snprintf(context.var159Tail, sizeof context.var159Tail, "50004");
  ASSERT_EQ(0, run());
  expectConfig("h46=1");
  char *value = nullptr;
  ASSERT_EQ(0, sqloGetEnvInternal(KXL_VAR_KXLPORTRANGE, &value));
  ASSERT_NE(nullptr, value);
  EXPECT_STREQ("50000:50004", value);
  ASSERT_EQ(0, sqloGetEnvInternal(KXL_VAR_KXLINSTPROF, &value));
  ASSERT_NE(nullptr, value);
  EXPECT_STREQ(kProfilePath, value);
}

// A client instance reads and changes no service; a type without template is
// created as the first available one.
TEST_F(ServicesTest, ClientInstanceAndTypeWithoutTemplate) {
  addTemplate(2);
  addOldInstance(2, 3, false);
  bind(2);
  failCalls("sqloQueryNTServiceConfig:1,sqloChangeNTServiceConfig:1");
  ASSERT_EQ(0, run());
  EXPECT_EQ(UPGRADE_NO_SERVICE_STATE, context.serviceStartType);
  EXPECT_FALSE(keyExists(serviceKey(kInstance)));
  EXPECT_EQ(kCurrentCopy, getString(instanceKey(kInstance), "Copy"));
  expectConfig("h40=2");

  failCalls(nullptr);
  addTemplate(1);
  ASSERT_EQ(0, sqlo_instance_drop(kInstance, kInstanceDir));
  addOldInstance(3, 4);
  bind(3);
  ASSERT_EQ(0, run());
  expectConfig("h40=1");
  expectService(serviceKey(kInstance), kNewProgram, 4);
}

TEST_F(ServicesTest, FailedReCreationLeavesTheOlderInstance) {
  addTemplate(1);
  addOldInstance(1, 3);
  bind(1);
  Bytes before = newConfig();
  for (const char *fault :
       {"sqlo_instance_create_extended:1", "sqlocpum:1", "caProIfInit:1,sqloGetCommBandwidth:1,sqlocpum:1"}) {
    SCOPED_TRACE(fault);
    startTrace();
    failCalls(fault);
    int32_t rc = run();
    EXPECT_NE(0, rc);
    EXPECT_TRUE(traced("error 0x18780500 probe=40 rc=" + std::to_string(rc)));
    EXPECT_EQ(kOldCopy, getString(instanceKey(kInstance), "Copy"));
    EXPECT_EQ(before, newConfig());
    expectService(serviceKey(kInstance), kOldProgram, 3);
  }
  failCalls(nullptr);
  EXPECT_EQ(0, run());
}

class PartitionedServicesTest : public ServicesTest {
protected:
  static constexpr const char *kNodes = "0 server7.zav.example SERVER7 0\r\n"
                                        "1 server7.zav.example SERVER7 1\r\n"
                                        "2 host2.zav.example MACH2 0\r\n";

  void SetUp() override {
    ServicesTest::SetUp();
    if (IsSkipped())
      return;
    addTemplate(4);
    writeFile(std::string(kInstanceDir) + "\\kxlsystm", validImage(4, 0x33));
    writeFile(nodesPath(), std::string(kNodes));
    registerInstance(kInstance, kInstanceDir, kOldCopy);
    addProfile(kCurrentCopy, kInstance);
    setString(at("MACH2", kIdentity), "ComputerName", "MACH2");
    setString(at("MACH2", copyKey(kCurrentCopy) + "\\GLOBAL_PROFILE"), "KXLPATH", "D:\\KXL10");
    setString("SOFTWARE\\ZAV\\KXLSIM\\Hosts\\host2.zav.example", "Computer", "MACH2");
    addOldService(serviceKey("INST1-0"), 3);
    addOldService(serviceKey("INST1-1"), 3);
    addOldService(serviceKey("INST1-2", "MACH2"), 3);
    bind(4);
    options->partitionedInstance = 1;
    uint32_t entries = 0, maxNode = 0;
    ASSERT_EQ(0, sqloReadKxlnodes(nodesPath().c_str(), 4, &context.nodeList, 5, &entries, &maxNode, 1,
                                  kInstance, 1, 0));
  }

  static std::string nodesPath() { return std::string(kInstanceDir) + "\\kxlnodes.cfg"; }
};

TEST_F(PartitionedServicesTest, PartitionsRepointedThroughTheirMachines) {
  ASSERT_EQ(0, run());
  EXPECT_EQ(kNodes, readText(nodesPath()));
  EXPECT_FALSE(pathExists(nodesPath() + ".mig"));
  expectService(serviceKey("INST1-1"), kNewProgram, 3);
  EXPECT_EQ("KXL - KXL10 - INST1-1", getString(serviceKey("INST1-1"), "DisplayName"));
  expectService(serviceKey("INST1-2", "MACH2"), "D:\\KXL10\\bin\\kxlsyscs.exe", 3);
  EXPECT_EQ(3u, getDword(serviceKey("INST1-0"), "Start"));
  EXPECT_FALSE(keyExists(serviceKey("KXLEXT - INST1-1")));
}

TEST_F(PartitionedServicesTest, ForcedCopyNameDisablesOnlyOtherHostsPartitions) {
  options->flags |= UPGRADE_FLAG_FORCE_COPY_NAME;
  // This host is told from the others without the library's compare, whose
  // failure reads as "different".
  failCalls("sqlomcpi:1,sqlomcpi:2,sqlomcpi:3,sqlomcpi:4,sqlomcpi:5,sqlomcpi:6");
  ASSERT_EQ(0, run());
  expectService(serviceKey("INST1-2", "MACH2"), kOldProgram, 4);
  EXPECT_EQ(3, context.serviceStartType);
  expectService(serviceKey("INST1-1"), kNewProgram, 3);
}

TEST_F(PartitionedServicesTest, ExtenderServicesRegisteredOrChanged) {
  options->flags |= UPGRADE_FLAG_CONTENT_EXTENDER;
  setString(serviceKey("KXLEXT - INST1-1"), "ImagePath", "C:\\KXL95\\bin\\ctelock.exe");
  ASSERT_EQ(0, run());
  EXPECT_EQ("C:\\KXL10\\bin\\ctelock.exe", getString(serviceKey("KXLEXT - INST1-1"), "ImagePath"));
  EXPECT_EQ("KXLEXT - KXL10 - INST1-1", getString(serviceKey("KXLEXT - INST1-1"), "DisplayName"));
  EXPECT_EQ("D:\\KXL10\\bin\\ctelock.exe", getString(serviceKey("KXLEXT - INST1-2", "MACH2"), "ImagePath"));
  EXPECT_FALSE(keyExists(serviceKey("KXLEXT - INST1-0")));
}

// With -u, the partitions' accounts are kept for the undo before anything
// changes.
TEST_F(PartitionedServicesTest, AccountsAreKeptBeforeTheyChange) {
  std::snprintf(options->userName, sizeof options->userName, "NEWACCT");
  std::snprintf(options->password, sizeof options->password, "secret");
  ASSERT_EQ(0, run());
  EXPECT_EQ("NEWACCT", getString(serviceKey("INST1-2", "MACH2"), "ObjectName"));
  ASSERT_EQ(3u, context.serviceAccounts.size());
  ASSERT_NE(nullptr, serviceAccountBefore(context, "mach2", "inst1-2"));
  EXPECT_STREQ("OLDACCT", serviceAccountBefore(context, "mach2", "inst1-2"));
  EXPECT_EQ(nullptr, serviceAccountBefore(context, "MACH2", "INST1-1"));
}

// The library reports a missing nodes file as the warning the step tolerates:
// nothing to save, nothing to put back, and the partitions are re-pointed.
TEST_F(PartitionedServicesTest, MissingNodesFileIsNotAFailure) {
  ASSERT_TRUE(DeleteFileA(nodesPath().c_str()));
  ASSERT_EQ(0, run());
  EXPECT_FALSE(pathExists(nodesPath() + ".mig"));
  expectService(serviceKey("INST1-1"), kNewProgram, 3);
}

// A step that fails once the nodes file is saved puts it back and leaves no
// saved copy (the undo's restore of the instance directory removes no file);
// a service that cannot be changed, or another machine's program path that
// cannot be read (here: too long), fails the step instead of leaving a service
// on the old copy's program. Where the step changed nothing a plain rerun
// succeeds; after a later failure the run's undo (checked end to end by the
// driver's failure table) puts the instance back first.
struct StepFailure {
  const char *fault;
  int32_t result;     // 0: any failure
  const char *traced; // null: not looked at
  bool olderInstance; // the step changed nothing: the instance is the older copy's, a rerun succeeds
  bool longPath;      // the other machine's installation path is too long
};

class StepFailureTest : public PartitionedServicesTest, public ::testing::WithParamInterface<StepFailure> {};

TEST_P(StepFailureTest, LeavesTheNodesFileAndARerunSucceeds) {
  const StepFailure &c = GetParam();
  if (c.longPath)
    setString(at("MACH2", copyKey(kCurrentCopy) + "\\GLOBAL_PROFILE"), "KXLPATH", std::string(300, 'D'));
  startTrace();
  failCalls(c.fault);
  int32_t rc = run();
  EXPECT_TRUE(rc != 0 && (c.result == 0 || c.result == rc)) << rc;
  EXPECT_TRUE(c.traced == nullptr || traced(c.traced));
  EXPECT_TRUE(!c.olderInstance || getString(instanceKey(kInstance), "Copy") == kOldCopy);
  EXPECT_EQ(kNodes, readText(nodesPath()));
  EXPECT_FALSE(pathExists(nodesPath() + ".mig"));
  failCalls(nullptr);
  EXPECT_TRUE(!c.olderInstance || run() == 0);
}

// A name that cannot be formed (ossSnprintf) ends the step before anything changes.
INSTANTIATE_TEST_SUITE_P(
    Failures, StepFailureTest,
    ::testing::Values(StepFailure{"sqlocopy:1", SQLO_RC_IO_ERROR, "probe=20", true, false},
                      StepFailure{"sqlocopy:2", 0, nullptr, false, false},
                      StepFailure{"sqloPRegMachineOpen:1", UPGRADE_RC_MACHINE_REGISTRY,
                                  "error 0x18780500 probe=90 rc=-1913", false, false},
                      StepFailure{"sqloQueryNTServiceConfig:1", 0, nullptr, true, false},
                      StepFailure{"sqlo_instance_create_extended:1", 0, nullptr, true, false},
                      StepFailure{"ossSnprintf:1", 0, "error 0x18780500 probe=75", true, false},
                      StepFailure{"sqloChangeNTServiceConfig:2", 0, "error 0x18780500 probe=60", false,
                                  false},
                      StepFailure{nullptr, UPGRADE_RC_MACHINE_REGISTRY, "error 0x18780500 probe=65 rc=-1913",
                                  false, true}));

} // namespace
} // namespace kxltest
