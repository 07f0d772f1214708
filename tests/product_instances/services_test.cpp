// Services on this and other machines, the services file, host names,
// measures, and the configuration programs' work: what the services step's
// own cases (tests/services_env) cannot see.
#include "demo_world.h"

#include "sim/posix/world.h"
#include "sim/product/tool_actions.h"

#include <cstring>
#include <sys/wait.h>

namespace kxltest {
namespace {

using Services = DemoWorld;

// Changes the start type (and the program) of a service, nothing else.
int32_t changeStart(const char *name, const char *machine, uint32_t start, const char *program = nullptr) {
  SQLO_SVC_OUT out{};
  return sqloChangeNTServiceConfig(name, machine, SQLO_SVC_NO_CHANGE, start, SQLO_SVC_NO_CHANGE, program,
                                   nullptr, nullptr, nullptr, nullptr, nullptr, nullptr, &out);
}

TEST_F(Services, ChangeTouchesOnlyWhatIsGiven) {
  snapshot();
  ASSERT_EQ(0, changeStart("INST1", nullptr, 3));
  EXPECT_EQ(diff(),
            "registry ~ HKLM\\SOFTWARE\\ZAV\\KXLSIM\\Services\\INST1 \"Start\": dword:2 -> dword:3\n");
  EXPECT_EQ(SQLO_RC_INVALID_ARGUMENT, changeStart("INST1", "WINSRV1", 9));
}

TEST_F(Services, ChangeOnAnotherMachineGoesToItsSubtree) {
  SQLO_SVC_OUT out{};
  const char *program = "C:\\Program Files\\ZAV\\KXL101\\bin\\kxlsyscs.exe";
  ASSERT_EQ(0, sqloChangeNTServiceConfig("INST2-1", "WINSRV2", SQLO_SVC_NO_CHANGE, 4, SQLO_SVC_NO_CHANGE,
                                         program, nullptr, nullptr, nullptr, ".\\newacct", "pw-never-kept",
                                         "KXL - KXL101 - INST2-1", &out));
  std::string key = kRemote + kServices + "INST2-1";
  EXPECT_EQ(regString(key, "ImagePath"), program); // the other values: tests/services_env
  EXPECT_EQ(regString(key, "Password"), "<no value>");
  EXPECT_FALSE(keyExists(kServices + "INST2-1")) << "nothing on this machine";
  EXPECT_EQ(SQLO_RC_MACHINE_UNREACHABLE, changeStart("INST2-1", "WINSRV9", 4, program));
  failCalls("sqloChangeNTServiceConfig:1");
  EXPECT_NE(0, changeStart("INST1", nullptr, 4));
  EXPECT_EQ(getDword(kServices + "INST1", "Start"), 2u);
  // An unreadable service key is a failure, never a missing service (which callers pass over).
  failCalls("RegOpenKeyExA:1");
  EXPECT_EQ(SQLO_RC_SYSTEM_ERROR, changeStart("INST1", nullptr, 4));
  EXPECT_EQ(getDword(kServices + "INST1", "Start"), 2u);
}

TEST_F(Services, RegisterCreatesOnceAndReportsAnExistingService) {
  SQLO_SVC_OUT out{};
  const char *program = "C:\\Program Files\\ZAV\\KXL101\\bin\\ctelock.exe";
  ASSERT_EQ(0, sqloRegisterNTService("WINSRV2", "KXLEXT - INST2-1", "KXLEXT - KXL101 - INST2-1", 0, program,
                                     0, ".\\kxlsvc", "secret", "kxlwint64.dll", &out));
  std::string key = kRemote + kServices + "KXLEXT - INST2-1";
  EXPECT_EQ(regString(key, "ImagePath"), program);
  EXPECT_EQ(getDword(key, "Start"), 3u) << "start type 0 registers a demand-started service";
  EXPECT_EQ(regString(key, "Password"), "<no value>");
  EXPECT_EQ(SQLO_RC_SVC_EXISTS, sqloRegisterNTService("WINSRV2", "KXLEXT - INST2-1", "x", 0, program, 0,
                                                      nullptr, nullptr, "kxlwint64.dll", &out));
}

TEST_F(Services, ServicesFileRangesAreReservedOnce) {
  char first[SQLO_PORT_TEXT_SZ] = {}, last[SQLO_PORT_TEXT_SZ] = {};
  snapshot();
  ASSERT_EQ(0, sqloUpdateServiceFile(3, "INST2", first, last));
  EXPECT_STREQ(first, "60000");
  EXPECT_STREQ(last, "60003");
  EXPECT_EQ(diff(), "") << "an existing range is only reported";
  ASSERT_EQ(0, sqloUpdateServiceFile(3, "NEWP", first, last));
  EXPECT_STREQ(first, "60004") << "the ports between INST2's entries count as used";
  EXPECT_STREQ(last, "60007");
  EXPECT_EQ(diff(), "file ~ C:\\windows\\system32\\drivers\\etc\\services\n"
                    "       + KXL_NEWP           60004/tcp\n"
                    "       + KXL_NEWP_END       60007/tcp\n");
  EXPECT_EQ(SQLO_RC_INVALID_ARGUMENT, sqloUpdateServiceFile(1, "NEWP", first, last));
}

// Resolving, names and their faults are driven by the re-creation of an
// instance (tests/services_env); here what a caller's buffer gets.
TEST_F(Services, HostNamesResolveOnlyWhenKnownAndNamesNeedRoom) {
  char full[SQLO_HOSTNAME_SZ] = "old";
  EXPECT_EQ(SQLO_RC_NOT_FOUND, sqloPdbTcpIpResolveHostName("winsrv3", full, 5, 1));
  EXPECT_STREQ(full, "");
  char computer[16] = {};
  uint32_t size = 4;
  EXPECT_EQ(0, sqloGetComputerNameA(computer, &size));
  EXPECT_EQ(GetLastError(), DWORD(ERROR_MORE_DATA));
  size = sizeof computer;
  ASSERT_NE(0, sqloGetComputerNameA(computer, &size));
  EXPECT_STREQ(computer, "WINSRV1");
  EXPECT_EQ(size, 7u);
}

// The demo machine's measures (text) are in the converted configuration file
// of the end-to-end upgrade; text values and faults in tests/services_env.
TEST_F(Services, MeasuresAcceptDwordsAndRefuseText) {
  float value = 0, bits = 2.5f;
  DWORD word = 0;
  std::memcpy(&word, &bits, sizeof word);
  setDword(kIdentity, "CommBandwidth", word);
  ASSERT_EQ(0, sqloGetCommBandwidth(&value, 4));
  EXPECT_FLOAT_EQ(value, 2.5f);
  setString(kIdentity, "CpuMeasure", "fast");
  EXPECT_NE(0, sqlocpum(&value));
}

class Tools : public DemoWorld {
protected:
  // Runs the copy's program from its bin folder; its exit code.
  int run(const std::string &program, const std::string &args) {
    std::string host;
    EXPECT_TRUE(kxlsim::posix::hostPath(kCopy + "\\bin\\" + program, host));
    std::string command =
        "KXLSIM_ROOT='" + worldRoot() + "' KXLINSTANCE=INST1 '" + host + "' " + args + " 2>/dev/null";
    int status = std::system(command.c_str());
    return WIFEXITED(status) ? WEXITSTATUS(status) : -1;
  }
  static constexpr const char *kAudit = "C:\\Program Files\\ZAV\\KXL95\\INST1\\security\\kxlaudit.cfg";
};

TEST_F(Tools, AuditConfigurationIsMarkedOnceForTheCopy) {
  setInstance("INST1");
  std::string before = readText(kAudit);
  kxlsim::upgradeAuditConfig("KXL95");
  kxlsim::upgradeAuditConfig("KXL101");
  EXPECT_EQ(readText(kAudit), before + "# upgraded for copy KXL101\r\n") << "the earlier mark is replaced";
  setInstance("INST2");
  snapshot();
  kxlsim::upgradeAuditConfig("KXL101");
  EXPECT_EQ(diff(), "") << "no audit settings, nothing created";
}

TEST_F(Tools, SslConfigurationMarksOnlyFilesThatExist) {
  ASSERT_TRUE(CreateDirectoryA("C:\\ssl", nullptr));
  writeFile("C:\\ssl\\SSLconfig.ini", std::string("[s]\r\n"));
  snapshot();
  EXPECT_EQ(0, kxlsim::upgradeSslConfig(
                   "KXL101", {"-c", "\"C:\\ssl\\SSLClientconfig.ini\"", "-s", "\"C:\\ssl\\SSLconfig.ini\""}));
  EXPECT_EQ(diff(), "file ~ C:\\ssl\\SSLconfig.ini\n       + ; upgraded for copy KXL101\n");
  EXPECT_EQ(2, kxlsim::upgradeSslConfig("KXL101", {"-c", "x"}));
}

TEST_F(Tools, CleanupRemovesProfilesOfUnknownInstancesOfItsCopyOnly) {
  setString("SOFTWARE\\ZAV\\KXL\\InstalledCopies\\KXL101\\PROFILES\\GONE", "KXLPORTRANGE", "1:2");
  setString("SOFTWARE\\ZAV\\KXL\\InstalledCopies\\KXL95\\PROFILES\\GONE2", "KXLPORTRANGE", "1:2");
  setString("SOFTWARE\\ZAV\\KXL\\InstalledCopies\\KXL101\\PROFILES\\INST1", "KXLPORTRANGE", "1:2");
  kxlsim::cleanProfiles("KXL101", {"-list"});
  EXPECT_TRUE(keyExists("SOFTWARE\\ZAV\\KXL\\InstalledCopies\\KXL101\\PROFILES\\GONE"));
  kxlsim::cleanProfiles("KXL101", {"-cleanup"});
  EXPECT_FALSE(keyExists("SOFTWARE\\ZAV\\KXL\\InstalledCopies\\KXL101\\PROFILES\\GONE"));
  EXPECT_TRUE(keyExists("SOFTWARE\\ZAV\\KXL\\InstalledCopies\\KXL101\\PROFILES\\INST1"));
  EXPECT_TRUE(keyExists("SOFTWARE\\ZAV\\KXL\\InstalledCopies\\KXL95\\PROFILES\\GONE2"));
}

// A configured failure ends the program before its work. Runs that work, and
// their events, are in the end-to-end upgrade's exact changes.
TEST_F(Tools, ProgramConfiguredToFailChangesNothing) {
  setDword("SOFTWARE\\ZAV\\KXLSIM\\Tools\\kxlimaudcfg", "ExitCode", 3);
  snapshot();
  EXPECT_EQ(3, run("kxlimaudcfg.exe", ""));
  EXPECT_EQ(diff().find("kxlaudit.cfg"), std::string::npos);
}

} // namespace
} // namespace kxltest
