// The work of the audit and SSL configuration programs and of the profile
// clean-up, and the programs run by name inside a world.
#include "demo_world.h"

#include "sim/posix/world.h"
#include "sim/product/tool_actions.h"

#include <sys/wait.h>

namespace kxltest {
namespace {

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
