// The activity check, the template test and the administrator check.
#include "NT/instfiles.h"
#include "engn/sqo/checks.h"
#include "engn/sqo/run.h"
#include "tests/support/product_world.h"

#include <cstdio>
#include <string>

namespace {

class InstanceChecksTest : public kxltest::ProductWorld {
protected:
  void SetUp() override {
    ProductWorld::SetUp();
    setString(kIdentity, "ComputerName", "WINSRV1");
    std::memset(&options, 0, sizeof options);
    std::snprintf(options.instanceName, sizeof options.instanceName, "%s", "INST2");
    std::snprintf(options.currentInstallPath, sizeof options.currentInstallPath, "%s", "C:\\KXL101");
  }

  // A partitioned instance over three partitions: 0 here, 1 and 2 on WINSRV2.
  void partitionedInstance() {
    writeFile("C:\\P\\INST2\\kxlnodes.cfg",
              "0 winsrv1 WINSRV1 0\r\n1 winsrv2 WINSRV2 0\r\n2 winsrv2 WINSRV2 1\r\n");
    for (const char *name : {"INST2-1", "INST2-2"})
      setServiceState("WINSRV2", name, 1);
    setServiceState("", "INST2-0", 1);
    options.partitionedInstance = 1;
    context.instance = &instance;
  }

  UpgradeOptions options;
  UpgradeContext context;
  IKXLINSTANCE instance{"INST2", nullptr, "C:\\P\\INST2"};
};

// Active while a service runs, starts or pauses (2, 4, 7); stopped (1) or
// stopping (3) is not, nor is a service that is not there (0: none set).
TEST_F(InstanceChecksTest, SinglePartitionInstanceIsActiveOnlyWhileItsServiceRuns) {
  for (DWORD state : {0u, 1u, 2u, 3u, 4u, 7u}) {
    if (state != 0)
      setServiceState("", "INST2", state);
    EXPECT_EQ(isInstanceActive(context, options), state == 2 || state == 4 || state == 7) << state;
  }
}

// Every partition is asked on its own machine.
TEST_F(InstanceChecksTest, PartitionedInstanceAsksEveryPartitionOnItsMachine) {
  partitionedInstance();
  EXPECT_FALSE(isInstanceActive(context, options));
  ASSERT_NE(context.nodeList, nullptr);
  EXPECT_EQ(sqloNodeListCount(context.nodeList), 3);
  setServiceState("", "INST2-1", 4); // a service of that name on the wrong machine
  EXPECT_FALSE(isInstanceActive(context, options));
  setServiceState("WINSRV2", "INST2-1", 4);
  EXPECT_TRUE(isInstanceActive(context, options));
}

TEST_F(InstanceChecksTest, PartitionedInstanceWithoutNodesFileIsNotActive) {
  partitionedInstance();
  setServiceState("WINSRV2", "INST2-1", 4);
  DeleteFileA("C:\\P\\INST2\\kxlnodes.cfg");
  EXPECT_FALSE(isInstanceActive(context, options));
  EXPECT_EQ(context.nodeList, nullptr);
}

TEST_F(InstanceChecksTest, TemplateTestOpensTheCopysTemplateFile) {
  writeFile("C:\\KXL101\\CFG\\kxlsysmp", "template");
  for (uint32_t type : {0u, 1u, 4u, 6u})
    EXPECT_EQ(hasNodeTypeTemplate(context, options, type), type == 4) << type;
  writeFile("C:\\KXL101\\CFG\\kxlsysst", "template");
  EXPECT_TRUE(hasNodeTypeTemplate(context, options, 5));
}

TEST_F(InstanceChecksTest, AdministratorCheckNamesTheRefusedUser) {
  sqlca status;
  sqloinca(&status);
  setString(kIdentity, "AuthId", "AVERYLONGUSERID");
  for (DWORD bits : {0x04u, 0x10u, 0x14u}) {
    setDword(kIdentity, "LocalAdmin", bits);
    EXPECT_EQ(0, checkLocalAdmin(&status)) << bits;
  }
  setDword(kIdentity, "LocalAdmin", 0x01);
  EXPECT_EQ(-1, checkLocalAdmin(&status));
  EXPECT_EQ(status.sqlcode, -1092);
  EXPECT_EQ(std::string(status.sqlerrmc, status.sqlerrml), "AVERYLONG") << "the ID is cut to nine characters";

  sqloinca(&status);
  failCalls("sqleget_authid:1");
  EXPECT_EQ(-1, checkLocalAdmin(&status));
  EXPECT_EQ(status.sqlcode, -1403);

  failCalls("sqloIsLocalAdmin:1");
  EXPECT_LT(checkLocalAdmin(&status), -1) << "the platform's failure passes through";
}

} // namespace
