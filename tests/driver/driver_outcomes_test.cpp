// What the driver decides besides plain failures: the edition check and its
// message tokens, what it accepts as success, the version-8 installation and
// quoted profile paths.
#include "driver_fixture.h"

#include <algorithm>

namespace drivertest {
namespace {

uint32_t littleEndian(const std::string &bytes, std::size_t at, std::size_t count) {
  uint32_t value = 0;
  for (std::size_t i = count; i-- > 0;)
    value = value << 8 | static_cast<unsigned char>(bytes[at + i]);
  return value;
}

class DriverOutcomeTest : public DriverTest {
protected:
  // Leaves the current copy with `keep` (product codes) of its products, and
  // adds the product `code` registered with Windows Installer at the copy.
  void setProducts(const std::vector<std::string> &keep, const std::string &code = "",
                   const std::string &productCode = "") {
    for (const char *installed : {"hpe", "cli", "zqc"})
      if (std::find(keep.begin(), keep.end(), installed) == keep.end())
        removeTree(std::string(kCurrentCopy) + "\\CFG\\kxl" + installed + ".lvl");
    if (code.empty())
      return;
    world.writeText(std::string(kCurrentCopy) + "\\CFG\\kxl" + code + ".lvl", "level\n");
    kxlsim::registerInstalledProduct(world, {code, productCode, "product"}, std::string(kCurrentCopy) + "\\",
                                     "10.1.0.0");
  }

  // 1231 at `probe`, the message naming the instance's type and the type the
  // copy's last-ranked product hosts; nothing copied.
  void expectEditionMismatch(const Outcome &outcome, long long probe, const std::string &tokens) {
    expectFailure(outcome, probe, 1231);
    EXPECT_NE(outcome.out.find(tokens), std::string::npos) << outcome.out;
    EXPECT_FALSE(exists(kNewInstanceDir));
  }
};

TEST_F(DriverOutcomeTest, CopyWithoutServerEditionCannotHostAStandaloneInstance) {
  // The client packages host no instance (-1): the second type has no word.
  setProducts({"cli", "zqc"});
  Outcome outcome = run({"INST1"});
  expectEditionMismatch(outcome, 17, "type STANDALONE cannot");
  EXPECT_NE(outcome.out.find("type  only"), std::string::npos) << outcome.out;
  EXPECT_EQ(outcome.exitCode, 1231 & 0xFF);
  EXPECT_TRUE(keyExists(profileKey("KXL95", "INST1")));
  setProducts({});
  expectEditionMismatch(run({"INST1"}), 17, "type STANDALONE cannot");
}

// A refusal is a run that did not upgrade: audited as a failure with its code,
// in the instance's own audit settings (only failures are recorded here).
TEST_F(DriverOutcomeTest, RefusedUpgradeIsAuditedAsAFailureWithItsCode) {
  world.writeText(std::string(kOldInstanceDir) + "\\security\\kxlaudit.cfg",
                  "active = yes\nadmin = failure\ninstance = failure\n");
  setProducts({"cli", "zqc"});
  Outcome refused = run({"INST1"});
  ASSERT_EQ(refused.driverResult, 1231) << refused.out;
  std::vector<std::string> audits = kxltest::eventsOf(refused, "audit");
  ASSERT_EQ(audits.size(), 2u) << refused.out;
  for (const std::string &audit : audits)
    EXPECT_NE(audit.find("\"sqlcode\":\"1231\""), std::string::npos) << audit;
}

// A driver manager that answers something unexpected to every call cannot
// keep the run from ending: the upgrade is reported and the answer logged.
TEST_F(DriverOutcomeTest, OdbcScanEndsWhateverTheDriverManagerAnswers) {
  const std::string answers = "SOFTWARE\\ZAV\\KXLSIM\\Odbc";
  struct Case {
    const char *function;
    DWORD answer;
  } cases[] = {{"SQLDataSources", 5}, {"SQLDataSources", 2}, {"SQLAllocEnv", 5}, {"SQLAllocEnv", 0xFFFFFFFE}};
  for (const Case &c : cases) {
    SCOPED_TRACE(std::string(c.function) + " " + std::to_string(c.answer));
    resetWorld();
    kxlsim::addOdbcDataSource(world, kxlsim::localMachine(), "Sales", "ZAV KXL ODBC DRIVER - KXL95");
    world.setDword(kxlsim::localMachine(), answers, c.function, c.answer);
    Outcome outcome = run({"INST1"});
    EXPECT_EQ(outcome.exitCode, 0) << outcome.out << outcome.err;
    EXPECT_EQ(outcome.out, "KXL1000I  KXLIUPGRADE finished: the instance now belongs to this copy.\n");
    EXPECT_NE(outcome.diagnostics.find("ODBC data sources could not be listed"), std::string::npos);
  }
}

TEST_F(DriverOutcomeTest, PartitionedInstanceNeedsAPartitionedEdition) {
  setProducts({}, "tlv", "{6E1C2A45-9F3B-4D21-8A10-5B2C7D0E9A01}");
  Outcome outcome = run({"-install", "-u", "KXLADMIN,secret", "INST2"});
  // The Talven edition hosts node type 3.
  expectEditionMismatch(outcome, 12, "type PARTITIONED cannot");
  EXPECT_NE(outcome.out.find("type SERVER only"), std::string::npos) << outcome.out;
}

TEST_F(DriverOutcomeTest, SolentEditionHostsServerButNotStandaloneInstances) {
  setProducts({}, "sol", "{6E1C2A46-9F3B-4D21-8A10-5B2C7D0E9A01}");
  Outcome standalone = run({"INST1"});
  expectEditionMismatch(standalone, 17, "type STANDALONE cannot");
  EXPECT_NE(standalone.out.find("type SERVER only"), std::string::npos) << standalone.out;
  Outcome server = run({"V8INST"});
  ASSERT_TRUE(server.driverRan) << server.out << server.err;
  for (const DriverFailure &failure : server.failures)
    EXPECT_NE(failure.probe, 15);
}

TEST_F(DriverOutcomeTest, MissingOptionalFilesAndCleanupFailureDoNotFailTheUpgrade) {
  // Without the four carried files, and without their cfg and bin folders, the
  // copies report a missing file or a missing folder, which both count as done.
  for (const char *carried : {"\\cfg", "\\bin", "\\kxlmd_config.xml"})
    removeTree(std::string(kOldInstanceDir) + carried);
  kxlsim::setToolExitCode(world, "kxlset", 9);
  Outcome outcome = run({"INST1"});
  EXPECT_TRUE(outcome.failures.empty()) << outcome.trace;
  EXPECT_EQ(outcome.driverResult, 0) << outcome.out << outcome.err;
  EXPECT_EQ(outcome.exitCode, 0);
  EXPECT_FALSE(exists(std::string(kNewInstanceDir) + "\\cfg\\kxldj.ini"));
}

// The backup, the audit settings' copy and the run's record go; a removal that
// fails once is retried, a lasting failure is named in the log, never undone.
TEST_F(DriverOutcomeTest, LeftoversOfACompletedUpgradeAreRemovedOrNamed) {
  const std::string auditCopy = std::string(kNewInstanceDir) + "\\security\\kxlauditcopy.cfg";
  const std::string record = std::string(kCurrentCopy) + "\\CFG\\kxliupgrade-INST1.run";
  struct Case {
    const char *fault;
    bool backupKept;
    std::string fileKept; // "" none
  } cases[] = {
      {"FindNextFileA:93", false, ""}, // the last listing of the backup's removal
      {"sqlodeletedir:1", false, ""},  {"sqlodeletedir:1,sqlodeletedir:2", true, ""},
      {"sqlodelete:1", false, ""},     {"sqlodelete:1,sqlodelete:2", false, auditCopy},
      {"DeleteFileA:8", false, ""},    {"DeleteFileA:8,DeleteFileA:9", false, record},
  };
  for (const Case &c : cases) {
    SCOPED_TRACE(c.fault);
    resetWorld();
    Outcome outcome = run({"INST1"}, c.fault);
    EXPECT_EQ(outcome.exitCode, 0) << outcome.out << outcome.err;
    EXPECT_TRUE(outcome.failures.empty()) << outcome.trace;
    EXPECT_EQ(stringValue("SOFTWARE\\ZAV\\KXLSIM\\Instances\\INST1", "Copy"), "KXL101");
    EXPECT_EQ(hasBackup(), c.backupKept);
    for (const std::string &file : {auditCopy, record})
      EXPECT_EQ(exists(file), file == c.fileKept) << file;
    bool named = c.backupKept || !c.fileKept.empty();
    EXPECT_EQ(outcome.diagnostics.find("could not be removed") != std::string::npos, named)
        << outcome.diagnostics;
    if (!c.fileKept.empty()) {
      std::string name = c.fileKept.substr(c.fileKept.rfind('\\'));
      EXPECT_NE(outcome.diagnostics.find(name), std::string::npos) << outcome.diagnostics;
    }
    EXPECT_EQ(run({"-q", "INST1"}).exitCode, -1949 & 0xFF) << "a rerun finds it on the current copy";
    EXPECT_FALSE(exists(record));
  }
}

TEST_F(DriverOutcomeTest, CleanupRunThatCannotStartDoesNotChangeTheResult) {
  // Installer mode: the audit, SSL and clean-up tools are the run's programs.
  Outcome outcome = run({"-install", "INST1"}, "sqloexec2:3");
  EXPECT_TRUE(outcome.failures.empty()) << outcome.trace;
  EXPECT_EQ(outcome.driverResult, 0) << outcome.out << outcome.err;
}

// The audit comes after the instance has moved, so its failure is shown and
// logged but cannot make the completed upgrade a failure.
TEST_F(DriverOutcomeTest, CompletedUpgradeStaysCompletedWhenItsAuditFails) {
  for (const char *fault : {"logEvent:1", "sqlexAuditGetInstanceSettings:1"}) {
    SCOPED_TRACE(fault);
    resetWorld();
    world.writeText(std::string(kOldInstanceDir) + "\\security\\kxlaudit.cfg",
                    "active = yes\ninstance = both\n");
    Outcome outcome = run({"INST1"}, fault);
    EXPECT_EQ(outcome.exitCode, 0) << outcome.out << outcome.err;
    EXPECT_EQ(outcome.driverResult, 0);
    EXPECT_TRUE(keyExists(profileKey("KXL101", "INST1")));
    EXPECT_NE(outcome.out.find("KXL1000I"), std::string::npos) << outcome.out;
    EXPECT_NE(outcome.out.find("1042"), std::string::npos) << "the audit failure is shown: " << outcome.out;
    EXPECT_NE(outcome.diagnostics.find("audit record was not written"), std::string::npos)
        << outcome.diagnostics;
    EXPECT_EQ(run({"-q", "INST1"}).exitCode, -1949 & 0xFF) << "a rerun finds it on the current copy";
  }
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
  // Every path formed from the quoted profile path stays inside the quoted folder.
  world.makeDirectory("C:\\Quoted Profiles");
  Outcome outcome = run({"-p", "\"C:\\Quoted Profiles\"", "INST1"});
  ASSERT_TRUE(outcome.driverRan) << outcome.out << outcome.err;
  EXPECT_TRUE(outcome.failures.empty()) << outcome.trace;
  EXPECT_EQ(outcome.driverResult, 0) << outcome.out << outcome.err;

  EXPECT_FALSE(keyExists(profileKey("KXL95", "INST1")));
  EXPECT_TRUE(keyExists(profileKey("KXL101", "INST1")));
  const std::string instanceKey = "SOFTWARE\\ZAV\\KXLSIM\\Instances\\INST1";
  EXPECT_EQ(stringValue(instanceKey, "Copy"), "KXL101");
  EXPECT_EQ(stringValue(instanceKey, "Directory"), "C:\\Quoted Profiles\\INST1");

  // kxlsystm converted to the current layout: release word and level.
  std::string image = fileContent("C:\\Quoted Profiles\\INST1\\kxlsystm");
  ASSERT_EQ(image.size(), 16384u);
  EXPECT_EQ(littleEndian(image, 16, 2), 0x0D00u);
  EXPECT_EQ(littleEndian(image, 20, 4), 10100u);
  EXPECT_FALSE(exists("C:\\Quoted Profiles\\INST1\\security\\kxlauditcopy.cfg"));
  EXPECT_TRUE(exists("C:\\Quoted Profiles\\INST1\\security\\kxlaudit.cfg"));
  EXPECT_FALSE(exists(kNewInstanceDir));
}

} // namespace
} // namespace drivertest
