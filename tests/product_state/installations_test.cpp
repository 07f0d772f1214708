// Installed copies, the current installation and the instance registry.
#include "tests/support/product_world.h"

#include <string>
#include <vector>

#include <filesystem>

namespace {

class InstallationsTest : public kxltest::ProductWorld {
protected:
  // Reads every instance through the iteration (asking once more at the end): the names.
  static std::vector<std::string> allInstances(uint32_t &endCode) {
    std::vector<std::string> found;
    OSSInstanceListHandle handle = nullptr;
    EXPECT_EQ(0u, ossOpenInstanceList("KXL", &handle, false, false));
    OSSInstanceInfo_t info{};
    while ((endCode = ossGetNextInstance(handle, &info, false)) == 0)
      found.push_back(info.instanceName);
    if (endCode == OSS_RC_END_OF_LIST) {
      EXPECT_EQ(endCode, ossGetNextInstance(handle, &info, false)) << "the end is repeated";
    }
    EXPECT_EQ(0u, ossCloseInstanceList(handle));
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

// Listing and its faults are driven through the copies' instance lists
// (tests/install). An unreadable directory is never an instance gone since the
// list was opened: it fails the iteration.
TEST_F(InstallationsTest, EntryThatCannotBeReadFailsTheIteration) {
  uint32_t end = 0;
  EXPECT_TRUE(allInstances(end).empty());
  EXPECT_EQ(end, OSS_RC_END_OF_LIST);
  registerInstance("INST1", "C:\\P\\INST1", "V95");
  setDword("SOFTWARE\\ZAV\\KXLSIM\\Instances\\INST1", "Directory", 1);
  EXPECT_TRUE(allInstances(end).empty());
  EXPECT_EQ(end, OSS_RC_FAILED);
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
  registerV8("C:\\KXL8");
  EXPECT_EQ(probeFrom("C:\\KXL8\\bin", exitCode), "KXLV8") << "the version-8 installation's fixed name";
}

TEST_F(InstallationsTest, SwitchingChangesTheCurrentInstallationUntilSwitchedBack) {
  registerOwnCopy("V101");
  registerCopy("V95", "C:\\KXL\\V95");
  auto current = [] {
    char name[SQLO_COPY_NAME_SZ] = {};
    EXPECT_EQ(0, sqloGetCurrentInstallationName(name, sizeof name));
    return std::string(name);
  };
  EXPECT_EQ(current(), "V101");
  ASSERT_EQ(0, sqloSwitchToInstallationName("v95"));
  EXPECT_EQ(current(), "V95");
  EXPECT_EQ(SQLO_RC_NO_INSTALLATION, sqloSwitchToInstallationName("V77"));
  EXPECT_EQ(current(), "V95") << "a refused switch keeps the current installation";
  ASSERT_EQ(0, sqloSwitchToInstallationName("V101"));
  EXPECT_EQ(current(), "V101");
  char small[3];
  EXPECT_NE(0, sqloGetCurrentInstallationName(small, sizeof small));
  EXPECT_EQ(small[0], '\0');
}

} // namespace
