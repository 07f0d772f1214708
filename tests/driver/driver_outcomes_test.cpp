// What the driver decides besides plain failures: the edition check and its
// message tokens, what it accepts as success, the version-8 installation and
// quoted profile paths.
#include "driver_fixture.h"

namespace drivertest {
namespace {

constexpr const char *kUninstall = "SOFTWARE\\Microsoft\\Windows\\CurrentVersion\\Uninstall\\";

class DriverOutcomeTest : public DriverTest {
protected:
  // Replaces the current copy's server edition by the product `code`,
  // registered with Windows Installer at the copy under `productCode`.
  void replaceServerEdition(const std::string &code, const std::string &productCode) {
    removeTree(std::string(kCurrentCopy) + "\\CFG\\kxlhpe.lvl");
    if (code.empty())
      return;
    world.writeText(std::string(kCurrentCopy) + "\\CFG\\kxl" + code + ".lvl", "level\n");
    world.setString(kxlsim::localMachine(), kUninstall + productCode, "InstallLocation",
                    std::string(kCurrentCopy) + "\\");
  }

  void expectEditionMismatch(const Outcome &outcome, long long probe, const std::string &oldWord,
                             const std::string &newWord) {
    ASSERT_TRUE(outcome.driverRan) << outcome.out << outcome.err;
    ASSERT_EQ(outcome.failures.size(), 1u) << outcome.trace;
    EXPECT_EQ(outcome.failures[0].probe, probe);
    EXPECT_EQ(outcome.driverResult, 1231);
    EXPECT_NE(outcome.out.find("\"" + oldWord + "\""), std::string::npos) << outcome.out;
    if (!newWord.empty()) {
      EXPECT_NE(outcome.out.find("\"" + newWord + "\""), std::string::npos) << outcome.out;
    }
    EXPECT_FALSE(exists(kNewInstanceDir));
  }
};

TEST_F(DriverOutcomeTest, CopyWithoutServerEditionCannotHostAStandaloneInstance) {
  replaceServerEdition("", "");
  Outcome outcome = run({"INST1"});
  expectEditionMismatch(outcome, 17, "STANDALONE", "");
  EXPECT_EQ(outcome.exitCode, 1231 & 0xFF);
  EXPECT_TRUE(keyExists(profileKey("KXL95", "INST1")));
}

TEST_F(DriverOutcomeTest, PartitionedInstanceNeedsAPartitionedEdition) {
  replaceServerEdition("tlv", "{6E1C2A45-9F3B-4D21-8A10-5B2C7D0E9A01}");
  Outcome outcome = run({"-install", "-u", "KXLADMIN,secret", "INST2"});
  // The Talven edition hosts node type 3, the second token.
  expectEditionMismatch(outcome, 12, "PARTITIONED", "SERVER");
}

TEST_F(DriverOutcomeTest, SolentEditionHostsServerButNotStandaloneInstances) {
  replaceServerEdition("sol", "{6E1C2A46-9F3B-4D21-8A10-5B2C7D0E9A01}");
  Outcome standalone = run({"INST1"});
  expectEditionMismatch(standalone, 17, "STANDALONE", "SERVER");
  Outcome server = run({"V8INST"});
  ASSERT_TRUE(server.driverRan) << server.out << server.err;
  for (const DriverFailure &failure : server.failures)
    EXPECT_NE(failure.probe, 15);
}

TEST_F(DriverOutcomeTest, MissingOptionalFilesAndCleanupFailureDoNotFailTheUpgrade) {
  // INST1 has none of the four carried files and no cfg or bin folder: the
  // copies report a missing file or a missing folder, which both count as done.
  kxlsim::setToolExitCode(world, "kxlset", 9);
  Outcome outcome = run({"INST1"});
  EXPECT_TRUE(outcome.failures.empty()) << outcome.trace;
  EXPECT_EQ(outcome.driverResult, 0) << outcome.out << outcome.err;
  EXPECT_EQ(outcome.exitCode, 0);
  EXPECT_FALSE(exists(std::string(kNewInstanceDir) + "\\cfg\\kxldj.ini"));
}

TEST_F(DriverOutcomeTest, CleanupRunThatCannotStartDoesNotChangeTheResult) {
  // Installer mode: the audit, SSL and clean-up tools are the run's programs.
  Outcome outcome = run({"-install", "INST1"}, "sqloexec2:3");
  EXPECT_TRUE(outcome.failures.empty()) << outcome.trace;
  EXPECT_EQ(outcome.driverResult, 0) << outcome.out << outcome.err;
}

TEST_F(DriverOutcomeTest, VersionEightProfileKeyMovesAndIsDeleted) {
  std::string oldKey = profileKey("", "V8INST");
  ASSERT_TRUE(keyExists(oldKey));
  Outcome outcome = run({"V8INST"});
  EXPECT_EQ(outcome.driverResult, 0) << outcome.out << outcome.err << outcome.trace;
  EXPECT_FALSE(keyExists(oldKey));
  EXPECT_TRUE(keyExists(profileKey("KXL101", "V8INST")));
  EXPECT_EQ(stringValue("SOFTWARE\\ZAV\\KXLSIM\\Instances\\V8INST", "Copy"), "KXL101");
}

TEST_F(DriverOutcomeTest, QuotedProfilePathKeepsItsQuotes) {
  world.makeDirectory("C:\\Quoted Profiles");
  Outcome outcome = run({"-p", "\"C:\\Quoted Profiles\"", "INST1"});
  EXPECT_EQ(outcome.driverResult, 0) << outcome.out << outcome.err << outcome.trace;
  EXPECT_TRUE(exists("C:\\Quoted Profiles\\INST1\\kxlsystm"));
  EXPECT_TRUE(exists("C:\\Quoted Profiles\\function"));
}

} // namespace
} // namespace drivertest
