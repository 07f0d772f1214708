// Installed copies, the current installation and the instance registry;
// service states on this and other machines, and nodes files. Which states
// count as active, per partition and machine, is checked through the
// command's instance checks (tests/run).
#include "tests/support/product_world.h"

#include <cstdlib>
#include <filesystem>
#include <string>
#include <vector>

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

class ServicesTest : public kxltest::ProductWorld {
protected:
  void SetUp() override {
    ProductWorld::SetUp();
    setString(kIdentity, "ComputerName", "WINSRV1");
  }
  // Reads C:\I\kxlnodes.cfg holding `text`: "number host machine port" per entry, or "<rc N>".
  static std::string nodes(const char *text) {
    writeFile("C:\\I\\kxlnodes.cfg", text);
    SQLO_NODELIST *list = nullptr;
    uint32_t count = 0, maxNode = 0;
    int32_t rc = sqloReadKxlnodes("C:\\I\\kxlnodes.cfg", 4, &list, 5, &count, &maxNode, 1, "I", 1, 0);
    if (rc != 0)
      return list == nullptr ? "<rc " + std::to_string(rc) + ">" : "a failure left a list";
    std::string shown = "count " + std::to_string(count) + " max " + std::to_string(maxNode);
    const unsigned char *entry = sqloNodeListFirst(list);
    for (int i = 0; i < sqloNodeListCount(list); ++i, entry = sqloNodeNext(entry)) {
      shown += "; " + std::to_string(sqloNodeNumber(entry)) + " " + sqloNodeHost(entry) + " " +
               sqloNodeMachine(entry) + " " + std::to_string(sqloNodePort(entry));
      EXPECT_LE(size_t(entry + sqloNodeLength(entry) - reinterpret_cast<const unsigned char *>(list)),
                sqloNodeListSize(list));
    }
    std::free(list);
    return shown;
  }
};

TEST_F(ServicesTest, StatesMapToTheirCodesOnThisAndOtherMachines) {
  SQLO_SVC_OUT out{};
  setServiceState("", "INST1", 99);
  EXPECT_EQ(SQLO_RC_SYSTEM_ERROR, sqloQueryKXLService("INST1", &out, nullptr)) << "an unknown state";
  setServiceState("", "INST1", 4);
  EXPECT_EQ(SQLO_RC_SVC_RUNNING, sqloQueryKXLService("inst1", &out, "winsrv1"))
      << "the local computer by name, any case";
  EXPECT_EQ(out.serviceState, 4u);
  EXPECT_EQ(SQLO_RC_MACHINE_UNREACHABLE, sqloQueryKXLService("INST1", &out, "WINSRV2"));
  EXPECT_EQ(SQLO_RC_MACHINE_UNREACHABLE, sqloQueryKXLService("INST1", &out, "AVERYLONGCOMPUTERNAME"));
  setServiceState("WINSRV2", "INST2-1", 4);
  EXPECT_EQ(SQLO_RC_SVC_NOT_FOUND, sqloQueryKXLService("INST2-9", &out, "WINSRV2"));
  failCalls("sqloQueryKXLService:1");
  EXPECT_NE(SQLO_RC_SVC_RUNNING, sqloQueryKXLService("INST1", &out, nullptr));
}

TEST_F(ServicesTest, NodesFilesBecomeNodeListsOrAreRefused) {
  EXPECT_EQ(nodes("0 winsrv1.zav.test WINSRV1 0 \r\n\r\n1 winsrv2.zav.test WINSRV2 0 net2\r\n"
                  "3 winsrv2.zav.test WINSRV2 1\r\n"),
            "count 3 max 3; 0 winsrv1.zav.test WINSRV1 0; 1 winsrv2.zav.test WINSRV2 0; "
            "3 winsrv2.zav.test WINSRV2 1");
  EXPECT_EQ(nodes(""), "count 0 max 0");
  for (const char *text : {"0 host\r\n", "x host M 0\r\n", "1000 host M 0\r\n", "0 h M 0\r\n0 h M 1\r\n",
                           "0 h M 0 net extra\r\n", "0 h AVERYLONGCOMPUTERNAME 0\r\n"})
    EXPECT_EQ(nodes(text).rfind("<rc ", 0), 0u) << text;
  // Reading again releases the earlier list; a failure leaves none.
  SQLO_NODELIST *list = nullptr;
  uint32_t count = 0, maxNode = 0;
  writeFile("C:\\I\\kxlnodes.cfg", "0 h M 0\r\n");
  ASSERT_EQ(0, sqloReadKxlnodes("C:\\I\\kxlnodes.cfg", 4, &list, 5, &count, &maxNode, 1, "I", 1, 0));
  EXPECT_NE(0, sqloReadKxlnodes("C:\\I\\missing.cfg", 4, &list, 5, &count, &maxNode, 1, "I", 1, 0));
  EXPECT_EQ(list, nullptr);
}

} // namespace
