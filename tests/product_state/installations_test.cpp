// Installed copies, the current installation and the instance registry.
#include "tests/support/product_world.h"

#include <map>
#include <string>

#include <filesystem>

namespace {

class InstallationsTest : public kxltest::ProductWorld {
protected:
  // Reads every instance through the iteration: name -> directory|copy.
  static std::map<std::string, std::string> allInstances(uint32_t &endCode) {
    std::map<std::string, std::string> found;
    OSSInstanceListHandle handle = nullptr;
    endCode = ossOpenInstanceList("KXL", &handle, false, false);
    if (endCode != 0)
      return found;
    OSSInstanceInfo_t info{};
    while ((endCode = ossGetNextInstance(handle, &info, false)) == 0)
      found[info.instanceName] = std::string(info.instanceDir) + "|" + info.copyName;
    ossCloseInstanceList(handle);
    return found;
  }

  // Runs the probe from `folder` (a Windows path in the world); the name it found.
  std::string probeFrom(const std::string &folder, DWORD &exitCode) {
    makeDirectories(folder);
    std::string target = folder + "\\probe.exe";
    std::string host;
    EXPECT_TRUE(kxlsim::posix::hostPath(target, host));
    std::filesystem::create_symlink(KXL_PRODUCT_PROBE, host);
    STARTUPINFOA startup{};
    startup.cb = sizeof startup;
    PROCESS_INFORMATION process{};
    std::string commandLine = "\"" + target + "\"";
    if (!CreateProcessA(target.c_str(), commandLine.data(), nullptr, nullptr, FALSE, 0, nullptr, nullptr,
                        &startup, &process)) {
      ADD_FAILURE() << "probe did not start";
      return std::string();
    }
    WaitForSingleObject(process.hProcess, INFINITE);
    GetExitCodeProcess(process.hProcess, &exitCode);
    CloseHandle(process.hProcess);
    CloseHandle(process.hThread);
    return getString("SOFTWARE\\ZAV\\KXLSIM\\Test", "CurrentCopy");
  }
};

TEST_F(InstallationsTest, IterationListsEveryInstanceOfEveryCopyThenEnds) {
  registerInstance("KXL", "C:\\KXL8\\KXL", "");
  registerInstance("INST1", "C:\\Program Files\\KXL\\V95\\INST1", "V95");
  registerInstance("INST2", "\\\\SRV\\SHARE\\INST2", "V101");
  uint32_t end = 0;
  auto found = allInstances(end);
  EXPECT_EQ(end, OSS_RC_END_OF_LIST);
  ASSERT_EQ(found.size(), 3u);
  EXPECT_EQ(found["KXL"], "C:\\KXL8\\KXL|");
  EXPECT_EQ(found["INST1"], "C:\\Program Files\\KXL\\V95\\INST1|V95");
  EXPECT_EQ(found["INST2"], "\\\\SRV\\SHARE\\INST2|V101");
}

// An unreadable copy is never the version-8 installation's empty one, nor an unreadable
// directory an instance gone since the list was opened: both fail the iteration.
TEST_F(InstallationsTest, EntryThatCannotBeReadFailsTheIteration) {
  const std::string key = "SOFTWARE\\ZAV\\KXLSIM\\Instances\\INST1";
  OSSInstanceInfo_t info{};
  for (const char *unreadable : {"Copy", "Directory"}) {
    SCOPED_TRACE(unreadable);
    registerInstance("INST1", "C:\\P\\INST1", "V95");
    setDword(key, unreadable, 1);
    uint32_t end = 0;
    EXPECT_TRUE(allInstances(end).empty());
    EXPECT_EQ(end, OSS_RC_FAILED);
    EXPECT_EQ(OSS_RC_FAILED, ossGetInstanceInfo("INST1", 0, nullptr, &info, false));
  }
}

TEST_F(InstallationsTest, EmptyRegistryEndsAtOnceAndEndIsRepeated) {
  OSSInstanceListHandle handle = nullptr;
  ASSERT_EQ(0u, ossOpenInstanceList("KXL", &handle, false, false));
  OSSInstanceInfo_t info{};
  info.instanceName[0] = 'X';
  EXPECT_EQ(OSS_RC_END_OF_LIST, ossGetNextInstance(handle, &info, false));
  EXPECT_EQ(info.instanceName[0], '\0');
  EXPECT_EQ(OSS_RC_END_OF_LIST, ossGetNextInstance(handle, &info, false));
  EXPECT_EQ(0u, ossCloseInstanceList(handle));
}

TEST_F(InstallationsTest, AdministrationServerIsFoundByItsPseudoName) {
  OSSInstanceInfo_t info{};
  EXPECT_EQ(OSS_RC_NOT_FOUND, ossGetInstanceInfo("DAS", 0, nullptr, &info, false));
  setString("SOFTWARE\\ZAV\\KXLSIM\\AdminServer", "Name", "KXLDAS00");
  ASSERT_EQ(0u, ossGetInstanceInfo("DAS", 0, nullptr, &info, false));
  EXPECT_STREQ(info.instanceName, "KXLDAS00");
  EXPECT_EQ(info.instanceType, OSS_INSTANCE_TYPE_ADMIN);

  registerInstance("INST1", "C:\\P\\INST1", "V95");
  ASSERT_EQ(0u, ossGetInstanceInfo("inst1", 0, nullptr, &info, false));
  EXPECT_STREQ(info.instanceName, "INST1");
  EXPECT_STREQ(info.instanceDir, "C:\\P\\INST1");
  EXPECT_EQ(OSS_RC_NOT_FOUND, ossGetInstanceInfo("NONE", 0, nullptr, &info, false));
}

TEST_F(InstallationsTest, CurrentInstallationIsTheCopyHoldingTheProgram) {
  registerCopy("V95", "C:\\Program Files\\KXL\\V95\\");
  registerCopy("V101", "c:\\program files\\kxl\\v101");
  DWORD exitCode = 99;
  EXPECT_EQ(probeFrom("C:\\Program Files\\KXL\\V101\\bin", exitCode), "V101");
  EXPECT_EQ(exitCode, 0u);
  EXPECT_EQ(probeFrom("C:\\Program Files\\KXL\\V95\\bin", exitCode), "V95");

  // A folder whose name merely begins like a copy's path is not inside it.
  EXPECT_EQ(probeFrom("C:\\Program Files\\KXL\\V1010\\bin", exitCode), "");
  EXPECT_EQ(exitCode, 1u);
}

TEST_F(InstallationsTest, VersionEightInstallationIsKnownByItsFixedName) {
  registerV8("C:\\KXL8");
  DWORD exitCode = 99;
  EXPECT_EQ(probeFrom("C:\\KXL8\\bin", exitCode), "KXLV8");
}

TEST_F(InstallationsTest, SwitchingChangesTheCurrentInstallationUntilSwitchedBack) {
  registerOwnCopy("V101");
  registerCopy("V95", "C:\\KXL\\V95");
  char name[SQLO_COPY_NAME_SZ];
  ASSERT_EQ(0, sqloGetCurrentInstallationName(name, sizeof name));
  EXPECT_STREQ(name, "V101");
  ASSERT_EQ(0, sqloSwitchToInstallationName("v95"));
  ASSERT_EQ(0, sqloGetCurrentInstallationName(name, sizeof name));
  EXPECT_STREQ(name, "V95");
  EXPECT_EQ(SQLO_RC_NO_INSTALLATION, sqloSwitchToInstallationName("V77"));
  ASSERT_EQ(0, sqloGetCurrentInstallationName(name, sizeof name));
  EXPECT_STREQ(name, "V95") << "a refused switch keeps the current installation";
  ASSERT_EQ(0, sqloSwitchToInstallationName("V101"));
  ASSERT_EQ(0, sqloGetCurrentInstallationName(name, sizeof name));
  EXPECT_STREQ(name, "V101");

  char small[3];
  EXPECT_NE(0, sqloGetCurrentInstallationName(small, sizeof small));
  EXPECT_EQ(small[0], '\0');
}

TEST_F(InstallationsTest, InjectedFaultsFailOpeningAndFetching) {
  registerInstance("INST1", "C:\\P\\INST1", "V95");
  failCalls("ossOpenInstanceList:1");
  OSSInstanceListHandle handle = nullptr;
  EXPECT_NE(0u, ossOpenInstanceList("KXL", &handle, false, false));
  failCalls("ossGetNextInstance:1");
  uint32_t end = 0;
  auto found = allInstances(end);
  EXPECT_NE(end, 0u);
  EXPECT_NE(end, OSS_RC_END_OF_LIST);
  EXPECT_TRUE(found.empty());
}

} // namespace
