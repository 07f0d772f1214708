// Environment values, profile variables of both registry layouts, and other
// machines' registries. Listing the profiles is checked through the
// workstation names it gives (tests/services_env).
#include "tests/support/product_world.h"

#include <string>
#include <vector>

namespace {

class ProfileTest : public kxltest::ProductWorld {
protected:
  void SetUp() override {
    ProductWorld::SetUp();
    if (HasFatalFailure())
      return;
    registerOwnCopy("V101");
    registerCopy("V95", "C:\\KXL\\V95");
    registerV8("C:\\KXL8");
  }

  static std::string read(uint32_t variable, const char *profile, uint32_t size = 0) {
    char value[SQLO_PREG_VALUE_SZ];
    std::memset(value, 'x', sizeof value);
    int32_t rc = sqloPRegValuePE(SQLO_PREG_GET, &variable, 0, value, profile, -1, size);
    return rc == 0 ? std::string(value) : "<rc " + std::to_string(rc) + ">";
  }

  static constexpr const char *kV95 = "SOFTWARE\\ZAV\\KXL\\InstalledCopies\\V95";
  static constexpr const char *kGlobal = "SOFTWARE\\ZAV\\KXL\\InstalledCopies\\V101\\GLOBAL_PROFILE";
  static std::string profile(const char *instance) {
    return std::string("SOFTWARE\\ZAV\\KXL\\InstalledCopies\\V101\\PROFILES\\") + instance;
  }
};

// The instance's value reaches the process environment; others fall back to the profile registry.
TEST_F(ProfileTest, EnvironmentValuesAndTheirFallbackToTheProfileRegistry) {
  auto env = [](uint32_t variable) {
    char *value = nullptr;
    EXPECT_EQ(0, sqloGetEnvInternal(variable, &value));
    return value == nullptr ? std::string("<unset>") : std::string(value);
  };
  EXPECT_EQ(env(KXL_VAR_KXLINSTANCE), "<unset>");
  ASSERT_EQ(0, sqloPutEnv(KXL_VAR_KXLINSTANCE, "INST1"));
  ASSERT_EQ(0, sqlo_force_refresh_env());
  char seen[32] = {};
  EXPECT_EQ(GetEnvironmentVariableA("KXLINSTANCE", seen, sizeof seen), 5u);
  EXPECT_STREQ(seen, "INST1");
  EXPECT_EQ(env(KXL_VAR_KXLINSTANCE), "INST1");
  ASSERT_EQ(0, sqloPutEnv(KXL_VAR_KXLINSTANCE, ""));
  EXPECT_EQ(env(KXL_VAR_KXLINSTANCE), "<unset>");
  EXPECT_EQ(SQLO_RC_PREG_BAD_VARIABLE, sqloPutEnv(54, "x"));
  setString(kGlobal, "KXLEXTRAAGENTS", "3");
  EXPECT_EQ(env(KXL_VAR_KXLEXTRAAGENTS), "3");
  ASSERT_EQ(0, sqloPutEnv(KXL_VAR_KXLEXTRAAGENTS, "5"));
  EXPECT_EQ(env(KXL_VAR_KXLEXTRAAGENTS), "5");
  ASSERT_EQ(0, sqloPutEnv(KXL_VAR_KXLEXTRAAGENTS, nullptr));
}

TEST_F(ProfileTest, InstanceLevelWinsOverGlobalLevelAndValuesAreCutToTheCapacity) {
  setString(kGlobal, "KXLPORTRANGE", "60000:60003");
  setString(kGlobal, "KXLRESERVEDINST", "INST1");
  setString(profile("INST1"), "KXLPORTRANGE", "50000:50004");
  sqloPutEnv(KXL_VAR_KXLINSTANCE, "INST1");
  EXPECT_EQ(read(KXL_VAR_KXLPORTRANGE, nullptr), "50000:50004");
  EXPECT_EQ(read(KXL_VAR_KXLPORTRANGE, "KXLGLOBALPF"), "60000:60003");
  EXPECT_EQ(read(KXL_VAR_KXLRESERVEDINST, nullptr), "INST1") << "the instance level falls back to global";
  EXPECT_EQ(read(KXL_VAR_KXLRESERVEDINST, "INST1"), "<rc " + std::to_string(SQLO_RC_PREG_NOT_SET) + ">");
  sqloPutEnv(KXL_VAR_KXLINSTANCE, "INST2");
  EXPECT_EQ(read(KXL_VAR_KXLPORTRANGE, nullptr), "60000:60003");
  EXPECT_EQ(read(KXL_VAR_KXLPORTRANGE, "KXLGLOBALPF", 6), "60000");
  setString(kGlobal, "KXLRESERVEDINST", "LONGNAME12345");
  EXPECT_EQ(read(KXL_VAR_KXLRESERVEDINST, "KXLGLOBALPF"), "LONGNAME") << "an instance name has 8 characters";
}

TEST_F(ProfileTest, SwitchedInstallationReadsItsOwnProfilesInBothLayouts) {
  setString(std::string(kV95) + "\\GLOBAL_PROFILE", "KXLRESERVEDINST", "OLD95");
  setString(std::string(kV95) + "\\PROFILES\\INST1", "KXLWORKSTATION", "YES");
  setString("SOFTWARE\\ZAV\\KXL\\GLOBAL_PROFILE", "KXLRESERVEDINST", "OLD8");
  setString("SOFTWARE\\ZAV\\KXL\\PROFILES\\KXL", "KXLWORKSTATION", "NO");
  EXPECT_EQ(read(KXL_VAR_KXLRESERVEDINST, "KXLGLOBALPF"),
            "<rc " + std::to_string(SQLO_RC_PREG_NOT_SET) + ">");

  ASSERT_EQ(0, sqloSwitchToInstallationName("V95"));
  ASSERT_EQ(0, sqloPRegProfilePE(SQLO_PREG_REFRESH, nullptr, -1));
  EXPECT_EQ(read(KXL_VAR_KXLRESERVEDINST, "KXLGLOBALPF"), "OLD95");
  EXPECT_EQ(read(KXL_VAR_KXLWORKSTATION, "INST1"), "YES");

  ASSERT_EQ(0, sqloSwitchToInstallationName("KXLV8"));
  EXPECT_EQ(read(KXL_VAR_KXLRESERVEDINST, "KXLGLOBALPF"), "OLD8");
  EXPECT_EQ(read(KXL_VAR_KXLWORKSTATION, "KXL"), "NO");
  ASSERT_EQ(0, sqloSwitchToInstallationName("V101"));
}

TEST_F(ProfileTest, SettingWritesTheInstanceOrGlobalLevel) {
  uint32_t var = KXL_VAR_KXLNODECOMPUTER;
  char value[] = "NODE1";
  EXPECT_EQ(SQLO_RC_PREG_NO_PROFILE, sqloPRegValuePE(SQLO_PREG_SET, &var, 0, value, "INST9", -1, 0));
  setString(profile("INST9"), "KXLPORTRANGE", "1:2");
  ASSERT_EQ(0, sqloPRegValuePE(SQLO_PREG_SET, &var, 0, value, "INST9", -1, 0));
  EXPECT_EQ(getString(profile("INST9"), "KXLNODECOMPUTER"), "NODE1");
  ASSERT_EQ(0, sqloPRegValue(SQLO_PREG_SET, &var, 0, value, "KXLGLOBALPF"));
  EXPECT_EQ(getString(kGlobal, "KXLNODECOMPUTER"), "NODE1");
  ASSERT_EQ(0, sqloPRegValue(SQLO_PREG_UNSET, &var, 0, nullptr, "INST9"));
  EXPECT_EQ(getString(profile("INST9"), "KXLNODECOMPUTER"), "<missing>");
  uint32_t unknown = 1234;
  EXPECT_EQ(SQLO_RC_PREG_BAD_VARIABLE, sqloPRegValue(SQLO_PREG_GET, &unknown, 0, value, nullptr));
}

TEST_F(ProfileTest, FlagTextsReadAsTrueOrFalse) {
  for (const char *text : {"yes", "ON", "1"})
    EXPECT_EQ(1, sqloStr2Flag(text)) << text;
  for (const char *text : {"NO", "YESS", static_cast<const char *>(nullptr)})
    EXPECT_EQ(0, sqloStr2Flag(text)) << (text != nullptr ? text : "null");
}

TEST_F(ProfileTest, OtherMachinesAreReachedThroughTheirSubtree) {
  SQLO_PREG_MACHINE *machine = nullptr;
  EXPECT_EQ(SQLO_RC_MACHINE_UNREACHABLE, sqloPRegMachineOpen("NODE2", &machine));
  EXPECT_EQ(machine, nullptr);

  setString("SOFTWARE\\ZAV\\KXLSIM\\Machines\\NODE2\\SOFTWARE\\ZAV\\KXL\\GLOBAL_PROFILE", "KXLPATH",
            "D:\\KXL");
  ASSERT_EQ(0, sqloPRegMachineOpen("node2", &machine));
  ASSERT_NE(machine, nullptr); // its use is driven by the services step (tests/services_env)
  HKEY key = nullptr;
  EXPECT_EQ(ERROR_SUCCESS,
            RegOpenKeyExA(machine->hklm, "SOFTWARE\\ZAV\\KXL\\GLOBAL_PROFILE", 0, KEY_READ, &key));
  RegCloseKey(key);

  // Opening the local machine through the same handle releases NODE2 first.
  char local[64] = {};
  DWORD localSize = sizeof local;
  ASSERT_TRUE(GetComputerNameA(local, &localSize));
  ASSERT_EQ(0, sqloPRegMachineOpen(local, &machine));
  EXPECT_EQ(machine->hklm, HKEY_LOCAL_MACHINE);
  EXPECT_EQ(0, sqloPRegMachineClose(&machine));
  EXPECT_EQ(machine, nullptr);
  EXPECT_EQ(0, sqloPRegMachineClose(&machine));
}

// Faults of the profile and machine calls are rows of the upgrade's failure
// tables (tests/driver, tests/services_env).
TEST_F(ProfileTest, AFailedPutLeavesTheValueUnset) {
  failCalls("sqloPutEnv:1");
  EXPECT_NE(0, sqloPutEnv(KXL_VAR_KXLINSTANCE, "INST1"));
  char *value = nullptr;
  ASSERT_EQ(0, sqloGetEnvInternal(KXL_VAR_KXLINSTANCE, &value));
  EXPECT_EQ(value, nullptr);
}

} // namespace
