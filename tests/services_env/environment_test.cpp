// Re-creation of an instance under the current copy: the configuration file
// tuned to the machine, partition 0 of a partitioned instance, and that a
// failure leaves nothing of the new instance behind.
#include "NT/environment.h"
#include "services_world.h"

#include <gtest/gtest.h>

namespace kxltest {
namespace {

class EnvironmentTest : public ServicesWorld {
protected:
  int32_t create(uint32_t newNodeType, PartitionRecord *record = nullptr, uint32_t workstationFlag = 0) {
    sqloinca(&ca);
    return upgradeInstanceEnvironment(kInstance, kProfilePath, kCurrentPath, nullptr, nullptr, 1, newNodeType,
                                      record, &ca, 1, workstationFlag);
  }

  void expectNothingLeft() {
    EXPECT_FALSE(keyExists(instanceKey(kInstance)));
    EXPECT_FALSE(keyExists(copyKey(kCurrentCopy) + "\\PROFILES\\" + kInstance));
    EXPECT_FALSE(pathExists(kInstanceDir));
    EXPECT_FALSE(keyExists(serviceKey(kInstance)));
    EXPECT_FALSE(keyExists(serviceKey("INST1-0")));
  }

  static std::string environmentValue(const char *name) {
    char value[300] = {};
    DWORD length = GetEnvironmentVariableA(name, value, sizeof value);
    return length > 0 && length < sizeof value ? std::string(value) : "<unset>";
  }

  sqlca ca{};
};

struct ImageCase {
  uint16_t nodeType;
  bool clientAndJava;       // the copy has the client component and a Java kit
  uint32_t workstationFlag; // 1: the workstation setting is asked for
  const char *wanted;       // the new file's fields; null: the file is the template
  const char *fault = nullptr;
};

class ImageTest : public EnvironmentTest, public ::testing::WithParamInterface<ImageCase> {};

// The template's content is kept (100); the Java kit goes to 3124 and 3128,
// the processor measure to 808 and the machine name to 1968 for servers only,
// the bandwidth to 3120 for partitioned instances only. The machine name is
// left out when the assistant cannot tell it.
TEST_P(ImageTest, TemplateTunedToTheMachine) {
  const ImageCase &c = GetParam();
  addTemplate(c.nodeType);
  if (c.clientAndJava) {
    setString(copyKey(kCurrentCopy) + "\\COMPONENTS", "KXL Zelquor Client", "1");
    makeDirectories(std::string(kCurrentPath) + "\\java\\jdk");
  }
  failCalls(c.fault);
  ASSERT_EQ(0, create(c.nodeType, nullptr, c.workstationFlag));
  EXPECT_EQ(kInstanceDir, getString(instanceKey(kInstance), "Directory"));
  EXPECT_EQ(kCurrentCopy, getString(instanceKey(kInstance), "Copy"));
  EXPECT_EQ(kInstance, environmentValue("KXLINSTANCE"));
  EXPECT_EQ(kProfilePath, environmentValue("KXLINSTPROF"));
  if (c.wanted == nullptr)
    EXPECT_EQ(validImage(c.nodeType, 0x22), newConfig());
  else
    expectConfig(c.wanted);
  // Without a partition record no partition is set up.
  EXPECT_FALSE(pathExists(std::string(kInstanceDir) + "\\kxlnodes.cfg"));
}

INSTANTIATE_TEST_SUITE_P(
    Images, ImageTest,
    ::testing::Values(
        ImageCase{1, true, 1,
                  "h40=1 h100=34 w3124=2048 t3128=C:\\KXL10\\java\\jdk f808=0.5 w3120=0 t1968=SERVER7 h46=1"},
        ImageCase{2, true, 1, "h40=2 w3124=2048 t3128=C:\\KXL10\\java\\jdk w808=0 t1968= h46=0"},
        ImageCase{2, false, 0, nullptr}, ImageCase{4, false, 0, "f3120=12.5 f808=0.5"},
        ImageCase{1, false, 0, "t1968= f808=0.5", "caProIfInit:1"},
        ImageCase{1, false, 0, "t1968= f808=0.5", "caProIfQuery:1"}));

// The library's file calls and the Win32 calls beneath them, which the
// creation itself uses too, are each failed call by call until the
// configuration file's own call is hit: every failing run must leave nothing
// behind, and the file's failure must come out as -5005.
TEST_F(EnvironmentTest, ConfigurationFileFailuresGive5005AndDropTheNewInstance) {
  addTemplate(1);
  for (const char *function :
       {"sqloopenp", "sqloread", "sqlowrite", "CreateFileA", "ReadFile", "WriteFile"}) {
    SCOPED_TRACE(function);
    bool hit = false;
    for (int call = 1; call <= 200 && !hit; ++call) {
      failCalls((std::string(function) + ":" + std::to_string(call)).c_str());
      int32_t rc = create(1);
      failCalls("");
      if (rc == 0) {
        ASSERT_EQ(0, sqlo_instance_drop(kInstance, kInstanceDir));
        continue;
      }
      hit = rc == UPGRADE_RC_CONFIG_FILE;
      expectNothingLeft();
    }
    EXPECT_TRUE(hit);
  }
}

struct NameCase {
  const char *assistantName;
  int otherProfiles;          // instance profiles besides the new instance's own
  const char *globalInstance; // KXLINSTANCE of the global profile, null: unset
  const char *expected;
};

class WorkstationNameTest : public EnvironmentTest, public ::testing::WithParamInterface<NameCase> {};

TEST_P(WorkstationNameTest, FormedFromMachineNameAndProfileCount) {
  const NameCase &c = GetParam();
  addTemplate(1);
  setString(kIdentity, "AssistantName", c.assistantName);
  for (int i = 0; i < c.otherProfiles; ++i)
    addProfile(kCurrentCopy, "OTHER" + std::to_string(i));
  if (c.globalInstance != nullptr)
    setString(copyKey(kCurrentCopy) + "\\GLOBAL_PROFILE", "KXLINSTANCE", c.globalInstance);
  ASSERT_EQ(0, create(1));
  expectConfig(std::string("t1968=") + c.expected);
  EXPECT_EQ(0, newConfig()[1968 + 8]);
}

INSTANTIATE_TEST_SUITE_P(Names, WorkstationNameTest,
                         ::testing::Values(NameCase{"server7.zav.example", 0, nullptr, "SERVER7"},
                                           NameCase{"server7.zav.example", 2, nullptr, "SERVER72"},
                                           NameCase{"server7.zav.example", 2, "OTHER0", "SERVER71"},
                                           NameCase{"server7.zav.example", 1, "OTHER0", "SERVER7"},
                                           NameCase{"abcdefghij", 2, nullptr, "ABCDEFG2"},
                                           NameCase{"7server", 0, nullptr, "dSERVER"},
                                           NameCase{"ser-ver.x", 0, nullptr, "SER_VER"},
                                           NameCase{"longmachine", 11, nullptr, "LONGMA11"}));

// A failed creation, of the instance or of its partition 0, passes its code up
// and leaves nothing of either; with the fault gone a plain rerun succeeds.
struct FailureCase {
  uint16_t nodeType;
  bool partition;   // a partition record is handed in
  const char *host; // the record's host name, null: none given
  const char *fault;
  int32_t result;
  int32_t sqlcode; // 0: not looked at
};

class FailureTest : public EnvironmentTest, public ::testing::WithParamInterface<FailureCase> {};

TEST_P(FailureTest, LeavesNothingAndARerunSucceeds) {
  const FailureCase &c = GetParam();
  addTemplate(1);
  addTemplate(4);
  PartitionRecord record{};
  if (c.host != nullptr)
    std::snprintf(record.hostName, sizeof record.hostName, "%s", c.host);
  failCalls(c.fault);
  EXPECT_EQ(c.result, create(c.nodeType, c.partition ? &record : nullptr));
  EXPECT_TRUE(c.sqlcode == 0 || c.sqlcode == sqlcaCode(ca)) << sqlcaCode(ca);
  expectNothingLeft();
  failCalls(nullptr);
  std::memset(&record, 0, sizeof record);
  EXPECT_TRUE(c.nodeType == 3 ||
              create(c.nodeType, c.partition ? &record : nullptr) == 0); // no template for 3
}

// kxlsystm takes the first two opens and the first write.
INSTANTIATE_TEST_SUITE_P(
    Failures, FailureTest,
    ::testing::Values(FailureCase{1, false, nullptr, "sqlo_instance_create_extended:1", SQLO_RC_SYSTEM_ERROR,
                                  0},
                      FailureCase{3, false, nullptr, nullptr, SQLO_RC_FILE_NOT_FOUND, 0},
                      FailureCase{4, false, nullptr, "sqlocpum:1", SQLO_RC_SYSTEM_ERROR, 0},
                      FailureCase{4, false, nullptr, "sqloGetCommBandwidth:1", SQLO_RC_SYSTEM_ERROR, 0},
                      FailureCase{4, true, "nohost", nullptr, UPGRADE_RC_HOST_UNKNOWN, 0},
                      FailureCase{4, true, nullptr, "sqloPdbCommFncInit:1", UPGRADE_RC_SQLCA, -1042},
                      FailureCase{4, true, nullptr, "sqloPdbTcpIpGetFullHostName:1", UPGRADE_RC_SQLCA, -1042},
                      FailureCase{4, true, nullptr, "sqloGetComputerNameA:1", UPGRADE_RC_SQLCA, -1042},
                      FailureCase{4, true, nullptr, "sqloUpdateServiceFile:1", UPGRADE_RC_SERVICES_FILE, 0},
                      FailureCase{4, true, nullptr, "sqloPRegValuePE:1", UPGRADE_RC_NO_COPY, 0},
                      FailureCase{4, true, nullptr, "sqloPRegValuePE:2", UPGRADE_RC_NO_COPY, 0},
                      FailureCase{4, true, nullptr, "sqlo_instance_addnode:1", SQLO_RC_SYSTEM_ERROR, 0},
                      FailureCase{4, true, nullptr, "sqloopenp:3", UPGRADE_RC_SQLCA, -1042},
                      FailureCase{4, true, nullptr, "sqloopenp:4", UPGRADE_RC_SQLCA, -1042},
                      FailureCase{4, true, nullptr, "sqlowrite:3", UPGRADE_RC_SQLCA, -1042}));

TEST_F(EnvironmentTest, PartitionZeroFilledFromThisMachine) {
  addTemplate(4);
  PartitionRecord record{};
  ASSERT_EQ(0, create(4, &record));
  EXPECT_STREQ("server7", record.hostName);
  EXPECT_STREQ("SERVER7", record.computerName);
  ASSERT_NE('\0', record.portStart[0]);
  ASSERT_NE('\0', record.portEnd[0]);
  EXPECT_EQ("0 server7 SERVER7 0 \r\n", readText(std::string(kInstanceDir) + "\\kxlnodes.cfg"));
  EXPECT_EQ("@echo off\r\nSET KXLINSTANCE=INST1\r\n",
            readText(std::string(kInstanceDir) + "\\kxlprofile.bat"));
  EXPECT_EQ(std::string(record.portStart) + ":" + record.portEnd,
            getString(copyKey(kCurrentCopy) + "\\PROFILES\\INST1", "KXLPORTRANGE"));
  EXPECT_EQ("SERVER7", getString(copyKey(kCurrentCopy) + "\\PROFILES\\INST1", "KXLNODECOMPUTER"));
  EXPECT_TRUE(keyExists(serviceKey("INST1-0")));
  EXPECT_NE(std::string::npos,
            readText("C:\\windows\\system32\\drivers\\etc\\services").find(record.portStart));
}

TEST_F(EnvironmentTest, PartitionZeroGivenValuesAreKeptAndNoPortsReserved) {
  addTemplate(4);
  PartitionRecord record{};
  setString("SOFTWARE\\ZAV\\KXLSIM\\Hosts\\host2", "FullName", "host2.zav.example");
  std::snprintf(record.hostName, sizeof record.hostName, "host2");
  std::snprintf(record.computerName, sizeof record.computerName, "MACH2");
  std::snprintf(record.portStart, sizeof record.portStart, "60000");
  std::snprintf(record.portEnd, sizeof record.portEnd, "60003");
  std::snprintf(record.netName, sizeof record.netName, "net2");
  failCalls("sqloUpdateServiceFile:1");
  ASSERT_EQ(0, create(4, &record));
  EXPECT_EQ("0 host2 MACH2 0 net2\r\n", readText(std::string(kInstanceDir) + "\\kxlnodes.cfg"));
  EXPECT_EQ("60000:60003", getString(copyKey(kCurrentCopy) + "\\PROFILES\\INST1", "KXLPORTRANGE"));
  EXPECT_EQ("MACH2", getString(copyKey(kCurrentCopy) + "\\PROFILES\\INST1", "KXLNODECOMPUTER"));
}

} // namespace
} // namespace kxltest
