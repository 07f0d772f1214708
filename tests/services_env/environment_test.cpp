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

  static void addClientComponentAndJava() {
    setString(copyKey(kCurrentCopy) + "\\COMPONENTS", "KXL Zelquor Client", "1");
    makeDirectories(std::string(kCurrentPath) + "\\java\\jdk");
  }

  static std::string environmentValue(const char *name) {
    char value[300] = {};
    DWORD length = GetEnvironmentVariableA(name, value, sizeof value);
    return length > 0 && length < sizeof value ? std::string(value) : "<unset>";
  }

  sqlca ca{};
};

TEST_F(EnvironmentTest, ServerImageGetsMeasuresNameAndCopyFields) {
  addTemplate(1);
  addClientComponentAndJava();
  ASSERT_EQ(0, create(1, nullptr, 1));

  EXPECT_EQ(kInstanceDir, getString(instanceKey(kInstance), "Directory"));
  EXPECT_EQ(kCurrentCopy, getString(instanceKey(kInstance), "Copy"));
  std::vector<unsigned char> image = newConfig();
  ASSERT_EQ(16384u, image.size());
  EXPECT_EQ(1u, sqloLe16(image.data(), 40));
  EXPECT_EQ(0x22, image[100]); // the template's content is kept
  EXPECT_EQ(2048u, u32At(image, 3124));
  EXPECT_EQ("C:\\KXL10\\java\\jdk", textAt(image, 3128, 256));
  EXPECT_FLOAT_EQ(0.5f, f32At(image, 808));
  EXPECT_EQ(0u, u32At(image, 3120)); // bandwidth only for partitioned instances
  EXPECT_EQ("SERVER7", textAt(image, 1968, 9));
  EXPECT_EQ(1u, sqloLe16(image.data(), 46));
  EXPECT_TRUE(checksumValid(image));
  EXPECT_EQ(kInstance, environmentValue("KXLINSTANCE"));
  EXPECT_EQ(kProfilePath, environmentValue("KXLINSTPROF"));
}

TEST_F(EnvironmentTest, ClientImageGetsOnlyTheCopyFields) {
  addTemplate(2);
  addClientComponentAndJava();
  ASSERT_EQ(0, create(2, nullptr, 1));
  std::vector<unsigned char> image = newConfig();
  ASSERT_EQ(16384u, image.size());
  EXPECT_EQ(2048u, u32At(image, 3124));
  EXPECT_EQ("C:\\KXL10\\java\\jdk", textAt(image, 3128, 256));
  EXPECT_EQ(0u, u32At(image, 808));
  EXPECT_EQ("", textAt(image, 1968, 9));
  EXPECT_EQ(0u, sqloLe16(image.data(), 46));
  EXPECT_TRUE(checksumValid(image));
}

TEST_F(EnvironmentTest, ImageWithNothingToWriteStaysAsTheTemplate) {
  addTemplate(2);
  ASSERT_EQ(0, create(2));
  EXPECT_EQ(validImage(2, 0x22), newConfig());
}

TEST_F(EnvironmentTest, PartitionedImageGetsTheBandwidth) {
  addTemplate(4);
  ASSERT_EQ(0, create(4));
  std::vector<unsigned char> image = newConfig();
  EXPECT_FLOAT_EQ(12.5f, f32At(image, 3120));
  EXPECT_FLOAT_EQ(0.5f, f32At(image, 808));
  EXPECT_TRUE(checksumValid(image));
  // Without a partition record no partition is set up.
  EXPECT_FALSE(pathExists(std::string(kInstanceDir) + "\\kxlnodes.cfg"));
}

TEST_F(EnvironmentTest, WorkstationNameSkippedWhenTheAssistantCannotTell) {
  addTemplate(1);
  for (const char *fault : {"caProIfInit:1", "caProIfQuery:1"}) {
    SCOPED_TRACE(fault);
    failCalls(fault);
    ASSERT_EQ(0, create(1));
    std::vector<unsigned char> image = newConfig();
    EXPECT_EQ("", textAt(image, 1968, 9));
    EXPECT_FLOAT_EQ(0.5f, f32At(image, 808));
    EXPECT_TRUE(checksumValid(image));
    failCalls("");
    ASSERT_EQ(0, sqlo_instance_drop(kInstance, kInstanceDir));
  }
}

TEST_F(EnvironmentTest, CreationFailurePassesItsCodeUpAndLeavesNothing) {
  addTemplate(1);
  failCalls("sqlo_instance_create_extended:1");
  EXPECT_EQ(SQLO_RC_SYSTEM_ERROR, create(1));
  expectNothingLeft();
  failCalls("");
  // No template for the node type: the creation's own code.
  EXPECT_EQ(SQLO_RC_FILE_NOT_FOUND, create(3));
  expectNothingLeft();
}

TEST_F(EnvironmentTest, MeasureFailuresDropTheNewInstance) {
  addTemplate(4);
  for (const char *fault : {"sqlocpum:1", "sqloGetCommBandwidth:1"}) {
    SCOPED_TRACE(fault);
    failCalls(fault);
    EXPECT_EQ(SQLO_RC_SYSTEM_ERROR, create(4));
    expectNothingLeft();
  }
}

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

TEST_F(EnvironmentTest, FailedReCreationPutsTheEarlierInstanceBack) {
  addTemplate(1);
  addOldInstance(1);
  std::vector<unsigned char> before = newConfig();
  failCalls("sqlocpum:1");
  EXPECT_EQ(SQLO_RC_SYSTEM_ERROR, create(1));
  EXPECT_EQ(before, newConfig());
  EXPECT_EQ(kOldCopy, getString(instanceKey(kInstance), "Copy"));
  EXPECT_EQ("C:\\KXL95\\bin\\kxlsyscs.exe", getString(serviceKey(kInstance), "ImagePath"));
}

// ---- the workstation name -----------------------------------------------------

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
  std::vector<unsigned char> image = newConfig();
  EXPECT_EQ(c.expected, textAt(image, 1968, 9));
  EXPECT_EQ(0, image[1968 + 8]);
  EXPECT_TRUE(checksumValid(image));
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

// ---- partition 0 -----------------------------------------------------------------

class PartitionZeroTest : public EnvironmentTest {
protected:
  void SetUp() override {
    EnvironmentTest::SetUp();
    if (IsSkipped())
      return;
    addTemplate(4);
    std::memset(&record, 0, sizeof record);
  }

  std::string nodesFile() const { return readText(std::string(kInstanceDir) + "\\kxlnodes.cfg"); }
  std::string profileValue(const char *name) const {
    return getString(copyKey(kCurrentCopy) + "\\PROFILES\\" + kInstance, name);
  }

  PartitionRecord record{};
};

TEST_F(PartitionZeroTest, FilledFromThisMachine) {
  ASSERT_EQ(0, create(4, &record));
  EXPECT_STREQ("server7", record.hostName);
  EXPECT_STREQ("SERVER7", record.computerName);
  ASSERT_NE('\0', record.portStart[0]);
  ASSERT_NE('\0', record.portEnd[0]);
  EXPECT_EQ("0 server7 SERVER7 0 \r\n", nodesFile());
  EXPECT_EQ("@echo off\r\nSET KXLINSTANCE=INST1\r\n",
            readText(std::string(kInstanceDir) + "\\kxlprofile.bat"));
  EXPECT_EQ(std::string(record.portStart) + ":" + record.portEnd, profileValue("KXLPORTRANGE"));
  EXPECT_EQ("SERVER7", profileValue("KXLNODECOMPUTER"));
  EXPECT_TRUE(keyExists(serviceKey("INST1-0")));
  EXPECT_NE(std::string::npos,
            readText("C:\\windows\\system32\\drivers\\etc\\services").find(record.portStart));
}

TEST_F(PartitionZeroTest, GivenValuesAreKeptAndNoPortsReserved) {
  setString(std::string(kSimRoot) + "Hosts\\host2", "FullName", "host2.zav.example");
  std::snprintf(record.hostName, sizeof record.hostName, "host2");
  std::snprintf(record.computerName, sizeof record.computerName, "MACH2");
  std::snprintf(record.portStart, sizeof record.portStart, "60000");
  std::snprintf(record.portEnd, sizeof record.portEnd, "60003");
  std::snprintf(record.netName, sizeof record.netName, "net2");
  failCalls("sqloUpdateServiceFile:1");
  ASSERT_EQ(0, create(4, &record));
  EXPECT_EQ("0 host2 MACH2 0 net2\r\n", nodesFile());
  EXPECT_EQ("60000:60003", profileValue("KXLPORTRANGE"));
  EXPECT_EQ("MACH2", profileValue("KXLNODECOMPUTER"));
}

TEST_F(PartitionZeroTest, UnresolvableHostGives1922) {
  std::snprintf(record.hostName, sizeof record.hostName, "nohost");
  EXPECT_EQ(UPGRADE_RC_HOST_UNKNOWN, create(4, &record));
  expectNothingLeft();
}

TEST_F(PartitionZeroTest, EveryFailureRemovesPartitionAndInstance) {
  struct Case {
    const char *fault;
    int32_t result;
    int32_t sqlcode; // 0: not looked at
  } cases[] = {
      {"sqloPdbCommFncInit:1", UPGRADE_RC_SQLCA, -1042},
      {"sqloPdbTcpIpGetFullHostName:1", UPGRADE_RC_SQLCA, -1042},
      {"sqloGetComputerNameA:1", UPGRADE_RC_SQLCA, -1042},
      {"sqloUpdateServiceFile:1", UPGRADE_RC_SERVICES_FILE, 0},
      {"sqloPRegValuePE:1", UPGRADE_RC_NO_COPY, 0},
      {"sqloPRegValuePE:2", UPGRADE_RC_NO_COPY, 0},
      {"sqlo_instance_addnode:1", SQLO_RC_SYSTEM_ERROR, 0},
      // kxlsystm takes the first two opens and the first write.
      {"sqloopenp:3", UPGRADE_RC_SQLCA, -1042},
      {"sqloopenp:4", UPGRADE_RC_SQLCA, -1042},
      {"sqlowrite:3", UPGRADE_RC_SQLCA, -1042},
  };
  for (const Case &c : cases) {
    SCOPED_TRACE(c.fault);
    std::memset(&record, 0, sizeof record);
    failCalls(c.fault);
    EXPECT_EQ(c.result, create(4, &record));
    if (c.sqlcode != 0) {
      EXPECT_EQ(c.sqlcode, sqlcaCode(ca));
    }
    expectNothingLeft();
  }
}

} // namespace
} // namespace kxltest
