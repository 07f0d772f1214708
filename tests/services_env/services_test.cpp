// The services step: the instance re-created under the current copy, its
// services pointed at the current copy's programs with their former start
// type, and failures that leave the instance of the older copy in place.
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

  // The instance as the older copy left it: registration, files and service.
  void expectOldInstance(const std::vector<unsigned char> &config) {
    EXPECT_EQ(kOldCopy, getString(instanceKey(kInstance), "Copy"));
    EXPECT_EQ(config, newConfig());
    EXPECT_EQ("C:\\KXL95\\bin\\kxlsyscs.exe", getString(serviceKey(kInstance), "ImagePath"));
    EXPECT_EQ(3u, getDword(serviceKey(kInstance), "Start"));
  }

  UpgradeContext context;
  std::unique_ptr<UpgradeOptions> options = makeOptions();

private:
  std::unique_ptr<IKXLINSTANCE> instance_;
};

TEST_F(ServicesTest, SingleServiceRunsTheCurrentCopyWithItsFormerStartType) {
  addTemplate(1);
  addOldInstance(1, 3);
  bind(1);
  ASSERT_EQ(0, run());
  EXPECT_EQ(3, context.serviceStartType);
  EXPECT_EQ(1, options->partitionRecord.serviceStepFlag);
  EXPECT_EQ(kCurrentCopy, getString(instanceKey(kInstance), "Copy"));
  EXPECT_EQ("C:\\KXL10\\bin\\kxlsyscs.exe", getString(serviceKey(kInstance), "ImagePath"));
  EXPECT_EQ("KXL - KXL10 - INST1", getString(serviceKey(kInstance), "DisplayName"));
  EXPECT_EQ(3u, getDword(serviceKey(kInstance), "Start"));
  EXPECT_EQ("OLDACCT", getString(serviceKey(kInstance), "ObjectName"));
  std::vector<unsigned char> image = newConfig();
  EXPECT_EQ(1u, sqloLe16(image.data(), 40));
  EXPECT_EQ(0u, sqloLe16(image.data(), 46));
  EXPECT_TRUE(checksumValid(image));
}

TEST_F(ServicesTest, ProfileValuesReachTheProductLibraries) {
  addTemplate(1);
  addOldInstance(1);
  bind(1);
  setString(copyKey(kCurrentCopy) + "\\GLOBAL_PROFILE", "KXLWORKSTATION", "YES");
  std::snprintf(context.var159Head, sizeof context.var159Head, "50000");
  std::snprintf(context.var159Tail, sizeof context.var159Tail, "50004");
  ASSERT_EQ(0, run());
  EXPECT_EQ(1u, sqloLe16(newConfig().data(), 46));
  char *value = nullptr;
  ASSERT_EQ(0, sqloGetEnvInternal(KXL_VAR_KXLPORTRANGE, &value));
  ASSERT_NE(nullptr, value);
  EXPECT_STREQ("50000:50004", value);
  ASSERT_EQ(0, sqloGetEnvInternal(KXL_VAR_KXLINSTPROF, &value));
  ASSERT_NE(nullptr, value);
  EXPECT_STREQ(kProfilePath, value);
}

TEST_F(ServicesTest, FailedReCreationLeavesTheOlderInstance) {
  addTemplate(1);
  addOldInstance(1, 3);
  bind(1);
  std::vector<unsigned char> before = newConfig();
  for (const char *fault :
       {"sqlo_instance_create_extended:1", "sqlocpum:1", "caProIfInit:1,sqloGetCommBandwidth:1,sqlocpum:1"}) {
    SCOPED_TRACE(fault);
    startTrace();
    failCalls(fault);
    int32_t rc = run();
    EXPECT_NE(0, rc);
    EXPECT_NE(std::string::npos, traceText().find("error 0x18780500 probe=40 rc=" + std::to_string(rc)));
    expectOldInstance(before);
  }
}

TEST_F(ServicesTest, ClientInstanceReadsAndChangesNoService) {
  addTemplate(2);
  addOldInstance(2, 3, false);
  bind(2);
  failCalls("sqloQueryNTServiceConfig:1,sqloChangeNTServiceConfig:1");
  ASSERT_EQ(0, run());
  EXPECT_EQ(UPGRADE_NO_SERVICE_STATE, context.serviceStartType);
  EXPECT_FALSE(keyExists(serviceKey(kInstance)));
  EXPECT_EQ(kCurrentCopy, getString(instanceKey(kInstance), "Copy"));
  EXPECT_EQ(2u, sqloLe16(newConfig().data(), 40));
}

TEST_F(ServicesTest, NodeTypeWithoutTemplateIsCreatedAsTheFirstAvailable) {
  addTemplate(1);
  addOldInstance(3, 4);
  bind(3);
  ASSERT_EQ(0, run());
  EXPECT_EQ(1u, sqloLe16(newConfig().data(), 40));
  EXPECT_EQ(4u, getDword(serviceKey(kInstance), "Start"));
  EXPECT_EQ("C:\\KXL10\\bin\\kxlsyscs.exe", getString(serviceKey(kInstance), "ImagePath"));
}

// ---- partitioned instance ----------------------------------------------------------

class PartitionedServicesTest : public ServicesTest {
protected:
  static constexpr const char *kMach2 = "SOFTWARE\\ZAV\\KXLSIM\\Machines\\MACH2\\";
  static constexpr const char *kNodes = "0 server7.zav.example SERVER7 0\r\n"
                                        "1 server7.zav.example SERVER7 1\r\n"
                                        "2 host2.zav.example MACH2 0\r\n";

  void SetUp() override {
    ServicesTest::SetUp();
    if (IsSkipped())
      return;
    addTemplate(4);
    writeFile(std::string(kInstanceDir) + "\\kxlsystm", validImage(4, 0x33));
    writeFile(nodesPath(), std::vector<unsigned char>(kNodes, kNodes + std::strlen(kNodes)));
    registerInstance(kInstance, kInstanceDir, kOldCopy);
    addProfile(kCurrentCopy, kInstance);
    setString(std::string(kMach2) + "SOFTWARE\\ZAV\\KXLSIM\\Identity", "ComputerName", "MACH2");
    setString(std::string(kMach2) + "SOFTWARE\\ZAV\\KXL\\InstalledCopies\\KXL10\\GLOBAL_PROFILE", "KXLPATH",
              "D:\\KXL10");
    setString(std::string(kSimRoot) + "Hosts\\host2.zav.example", "Computer", "MACH2");
    addOldService(serviceKey("INST1-0"), 3);
    addOldService(serviceKey("INST1-1"), 3);
    addOldService(kMach2 + serviceKey("INST1-2"), 3);
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
  EXPECT_EQ("C:\\KXL10\\bin\\kxlsyscs.exe", getString(serviceKey("INST1-1"), "ImagePath"));
  EXPECT_EQ("KXL - KXL10 - INST1-1", getString(serviceKey("INST1-1"), "DisplayName"));
  EXPECT_EQ("D:\\KXL10\\bin\\kxlsyscs.exe", getString(kMach2 + serviceKey("INST1-2"), "ImagePath"));
  EXPECT_EQ(3u, getDword(kMach2 + serviceKey("INST1-2"), "Start"));
  EXPECT_EQ(3u, getDword(serviceKey("INST1-0"), "Start"));
  EXPECT_FALSE(keyExists(serviceKey("KXLEXT - INST1-1")));
}

TEST_F(PartitionedServicesTest, ForcedCopyNameDisablesOnlyOtherHostsPartitions) {
  options->flags |= UPGRADE_FLAG_FORCE_COPY_NAME;
  // This host is told from the others without the library's compare, whose
  // failure reads as "different".
  failCalls("sqlomcpi:1,sqlomcpi:2,sqlomcpi:3,sqlomcpi:4,sqlomcpi:5,sqlomcpi:6");
  ASSERT_EQ(0, run());
  EXPECT_EQ(4u, getDword(kMach2 + serviceKey("INST1-2"), "Start"));
  EXPECT_EQ("C:\\KXL95\\bin\\kxlsyscs.exe", getString(kMach2 + serviceKey("INST1-2"), "ImagePath"));
  EXPECT_EQ(3, context.serviceStartType);
  EXPECT_EQ(3u, getDword(serviceKey("INST1-1"), "Start"));
  EXPECT_EQ("C:\\KXL10\\bin\\kxlsyscs.exe", getString(serviceKey("INST1-1"), "ImagePath"));
}

TEST_F(PartitionedServicesTest, ExtenderServicesRegisteredOrChanged) {
  options->flags |= UPGRADE_FLAG_CONTENT_EXTENDER;
  setString(serviceKey("KXLEXT - INST1-1"), "ImagePath", "C:\\KXL95\\bin\\ctelock.exe");
  ASSERT_EQ(0, run());
  EXPECT_EQ("C:\\KXL10\\bin\\ctelock.exe", getString(serviceKey("KXLEXT - INST1-1"), "ImagePath"));
  EXPECT_EQ("KXLEXT - KXL10 - INST1-1", getString(serviceKey("KXLEXT - INST1-1"), "DisplayName"));
  EXPECT_EQ("D:\\KXL10\\bin\\ctelock.exe", getString(kMach2 + serviceKey("KXLEXT - INST1-2"), "ImagePath"));
  EXPECT_FALSE(keyExists(serviceKey("KXLEXT - INST1-0")));
}

TEST_F(PartitionedServicesTest, NodesFileFailuresAndUnreachableMachine) {
  startTrace();
  failCalls("sqlocopy:1");
  EXPECT_EQ(SQLO_RC_IO_ERROR, run()) << "saving the nodes file";
  EXPECT_NE(std::string::npos, traceText().find("probe=20"));
  EXPECT_EQ(kOldCopy, getString(instanceKey(kInstance), "Copy"));

  failCalls("sqloPRegMachineOpen:1");
  EXPECT_EQ(UPGRADE_RC_MACHINE_REGISTRY, run());
  EXPECT_NE(std::string::npos, traceText().find("error 0x18780500 probe=90 rc=-1913"));
}

// A step that fails once the nodes file is saved puts it back and leaves no
// saved copy: the undo's restore of the instance directory removes no file.
TEST_F(PartitionedServicesTest, FailedStepLeavesTheNodesFileAndNoCopy) {
  for (const char *fault : {"sqloQueryNTServiceConfig:1", "sqlo_instance_create_extended:1", "sqlocopy:2",
                            "sqloPRegMachineOpen:1"}) {
    SCOPED_TRACE(fault);
    failCalls(fault);
    EXPECT_NE(0, run());
    EXPECT_EQ(kNodes, readText(nodesPath()));
    EXPECT_FALSE(pathExists(nodesPath() + ".mig"));
  }
}

// With -u, the partitions' accounts are kept for the undo before anything
// changes. A service that cannot be changed, or another machine's program path
// that cannot be read (here: too long), fails the step instead of leaving a
// service on the old copy's program.
TEST_F(PartitionedServicesTest, AccountsAreKeptBeforeTheyChange) {
  std::snprintf(options->userName, sizeof options->userName, "NEWACCT");
  std::snprintf(options->password, sizeof options->password, "secret");
  ASSERT_EQ(0, run());
  EXPECT_EQ("NEWACCT", getString(kMach2 + serviceKey("INST1-2"), "ObjectName"));
  ASSERT_EQ(3u, context.serviceAccounts.size());
  ASSERT_NE(nullptr, serviceAccountBefore(context, "mach2", "inst1-2"));
  EXPECT_STREQ("OLDACCT", serviceAccountBefore(context, "mach2", "inst1-2"));
  EXPECT_EQ(nullptr, serviceAccountBefore(context, "MACH2", "INST1-1"));
}

TEST_F(PartitionedServicesTest, ServiceThatCannotBeChangedFailsTheStep) {
  startTrace();
  // A name that cannot be formed ends the step before anything changes.
  failCalls("ossSnprintf:1");
  EXPECT_NE(0, run());
  EXPECT_NE(std::string::npos, traceText().find("error 0x18780500 probe=75"));
  EXPECT_EQ(kOldCopy, getString(instanceKey(kInstance), "Copy"));
  failCalls("sqloChangeNTServiceConfig:2");
  EXPECT_NE(0, run());
  EXPECT_NE(std::string::npos, traceText().find("error 0x18780500 probe=60"));
}

TEST_F(PartitionedServicesTest, ProgramPathThatCannotBeReadFailsTheStep) {
  startTrace();
  setString(std::string(kMach2) + "SOFTWARE\\ZAV\\KXL\\InstalledCopies\\KXL10\\GLOBAL_PROFILE", "KXLPATH",
            std::string(300, 'D'));
  EXPECT_EQ(UPGRADE_RC_MACHINE_REGISTRY, run());
  EXPECT_NE(std::string::npos, traceText().find("error 0x18780500 probe=65 rc=-1913"));
}

// The library reports a missing nodes file as the warning the step tolerates:
// nothing to save, nothing to put back, and the partitions are re-pointed.
TEST_F(PartitionedServicesTest, MissingNodesFileIsNotAFailure) {
  ASSERT_TRUE(DeleteFileA(nodesPath().c_str()));
  ASSERT_EQ(0, run());
  EXPECT_FALSE(pathExists(nodesPath() + ".mig"));
  EXPECT_EQ("C:\\KXL10\\bin\\kxlsyscs.exe", getString(serviceKey("INST1-1"), "ImagePath"));
}

} // namespace
} // namespace kxltest
