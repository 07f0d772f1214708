// What the driver decides besides plain failures: the edition check and its
// message tokens, what it accepts as success, the version-8 installation and
// quoted profile paths.
#include "driver_fixture.h"

#include <algorithm>

namespace drivertest {
namespace {

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
};

// 1231 at `probe`, the message naming the instance's type and the type the
// copy's last-ranked product hosts; nothing copied, the profile where it was.
TEST_F(DriverOutcomeTest, EditionThatCannotHostTheInstanceIsRefused) {
  // clang-format off
  const struct {
    std::vector<std::string> keep;
    const char *code, *productCode;
    std::vector<std::string> args;
    long long probe;
    const char *instanceType, *hostedType;
  } cases[] = {
      // The client packages host no instance (-1): the second type has no word.
      {{"cli", "zqc"}, "", "", {"INST1"}, 17, "STANDALONE", ""},
      {{}, "", "", {"INST1"}, 17, "STANDALONE", ""},
      // The Talven edition hosts node type 3.
      {{}, "tlv", "{6E1C2A45-9F3B-4D21-8A10-5B2C7D0E9A01}", {"-install", "-u", "KXLADMIN,secret", "INST2"}, 12, "PARTITIONED", "SERVER"},
      {{}, "sol", "{6E1C2A46-9F3B-4D21-8A10-5B2C7D0E9A01}", {"INST1"}, 17, "STANDALONE", "SERVER"},
  };
  // clang-format on
  for (const auto &c : cases) {
    SCOPED_TRACE(std::string(c.code) + " " + c.args.back());
    resetWorld();
    world.writeText(std::string(kOldInstanceDir) + "\\security\\kxlaudit.cfg",
                    "active = yes\nadmin = failure\ninstance = failure\n");
    setProducts(c.keep, c.code, c.productCode);
    Outcome outcome = run(c.args);
    expectFailure(outcome, c.probe, 1231);
    // A refusal is a run that did not upgrade: audited as a failure with its
    // code, in the instance's own audit settings (only failures are recorded).
    std::vector<std::string> audits = kxltest::eventsOf(outcome, "audit");
    EXPECT_EQ(audits.size(), c.args.back() == "INST1" ? 2u : 0u) << outcome.out;
    for (const std::string &audit : audits)
      EXPECT_NE(audit.find("\"sqlcode\":\"1231\""), std::string::npos) << audit;
    EXPECT_EQ(outcome.exitCode, c.args.front() == "-install" ? 1 : (1231 & 0xFF));
    EXPECT_NE(outcome.out.find(std::string("type ") + c.instanceType + " cannot"), std::string::npos)
        << outcome.out;
    EXPECT_NE(outcome.out.find(std::string("type ") + c.hostedType + " only"), std::string::npos)
        << outcome.out;
    EXPECT_FALSE(exists(kNewInstanceDir));
    EXPECT_TRUE(keyExists(profileKey("KXL95", c.args.back())));
  }
  // The Solent edition hosts server instances.
  Outcome server = run({"V8INST"});
  ASSERT_TRUE(server.driverRan) << server.out << server.err;
  for (const DriverFailure &failure : server.failures)
    EXPECT_NE(failure.probe, 15);
}

// A driver manager that answers something unexpected to every call, or none
// at all (no answers given), with a data source of the product's driver.
template <const char *function, DWORD answer> void odbcAnswers(DriverTest &t) {
  kxlsim::addOdbcDataSource(t.world, kxlsim::localMachine(), "Sales", "ZAV KXL ODBC DRIVER - KXL95");
  if (answer != 0)
    t.world.setDword(kxlsim::localMachine(), "SOFTWARE\\ZAV\\KXLSIM\\Odbc", function, answer);
  else
    t.removeTree("C:\\windows\\system32\\odbc32.dll");
}
constexpr char kDataSources[] = "SQLDataSources", kAllocEnv[] = "SQLAllocEnv";
constexpr const char *kUnlisted = "ODBC data sources could not be listed";

// A completed upgrade stays completed: optional files that are missing, a
// clean-up tool that fails or cannot start, an audit that fails, an ODBC
// scan that cannot list the data sources. Its
// leftovers (the backup, the audit settings' copy, the run's record) go; a
// removal that fails once is retried, a lasting failure is named in the log,
// never undone. A rerun finds the instance on the current copy.
TEST_F(DriverOutcomeTest, CompletedUpgradeStaysCompleted) {
  const std::string auditCopy = std::string(kNewInstanceDir) + "\\security\\kxlauditcopy.cfg";
  const std::string record = std::string(kCurrentCopy) + "\\CFG\\kxliupgrade-INST1.run";
  using Setup = void (*)(DriverTest &);
  const Setup audited = [](DriverTest &t) {
    t.world.writeText(std::string(kOldInstanceDir) + "\\security\\kxlaudit.cfg",
                      "active = yes\ninstance = both\n");
  };
  // clang-format off
  const struct {
    std::vector<std::string> args;
    const char *fault;
    bool backupKept;
    std::string fileKept; // "" none
    Setup setup;
    const char *shown, *logged; // in the output and the diagnostic log
  } cases[] = {
      // Without the four carried files, and without their cfg and bin folders,
      // the copies report a missing file or folder, which both count as done.
      {{"INST1"}, "", false, "", [](DriverTest &t) {
         for (const char *carried : {"\\cfg", "\\bin", "\\kxlmd_config.xml"})
           t.removeTree(std::string(kOldInstanceDir) + carried);
         kxlsim::setToolExitCode(t.world, "kxlset", 9); }, "", ""},
      // Installer mode: the audit, SSL and clean-up tools are the run's programs.
      {{"-install", "INST1"}, "sqloexec2:3", false, "", nullptr, "", ""},
      {{"INST1"}, "FindNextFileA:93", false, "", nullptr, "", ""}, // the last listing of the backup's removal
      {{"INST1"}, "sqlodeletedir:1", false, "", nullptr, "", ""},
      {{"INST1"}, "sqlodeletedir:1,sqlodeletedir:2", true, "", nullptr, "", "could not be removed"},
      {{"INST1"}, "sqlodelete:1", false, "", nullptr, "", ""},
      {{"INST1"}, "sqlodelete:1,sqlodelete:2", false, auditCopy, nullptr, "", "could not be removed"},
      {{"INST1"}, "DeleteFileA:8", false, "", nullptr, "", ""},
      {{"INST1"}, "DeleteFileA:8,DeleteFileA:9", false, record, nullptr, "", "could not be removed"},
      // The audit comes after the instance has moved: its failure is shown and logged.
      {{"INST1"}, "logEvent:1", false, "", audited, "1042", "audit record was not written"},
      {{"INST1"}, "sqlexAuditGetInstanceSettings:1", false, "", audited, "1042", "audit record was not written"},
      {{"INST1"}, "", false, "", odbcAnswers<kDataSources, 5>, "", kUnlisted},
      {{"INST1"}, "", false, "", odbcAnswers<kDataSources, 2>, "", kUnlisted},
      {{"INST1"}, "", false, "", odbcAnswers<kAllocEnv, 5>, "", kUnlisted},
      {{"INST1"}, "", false, "", odbcAnswers<kAllocEnv, 0xFFFFFFFE>, "", kUnlisted},
      {{"INST1"}, "", false, "", odbcAnswers<kAllocEnv, 0>, "", kUnlisted},
  };
  // clang-format on
  for (const auto &c : cases) {
    SCOPED_TRACE(c.fault);
    resetWorld();
    if (c.setup != nullptr)
      c.setup(*this);
    Outcome outcome = run(c.args, c.fault);
    EXPECT_EQ(outcome.exitCode, 0) << outcome.out << outcome.err;
    EXPECT_EQ(outcome.driverResult, 0);
    EXPECT_TRUE(outcome.failures.empty()) << outcome.trace;
    EXPECT_TRUE(keyExists(profileKey("KXL101", "INST1")));
    EXPECT_EQ(stringValue("SOFTWARE\\ZAV\\KXLSIM\\Instances\\INST1", "Copy"), "KXL101");
    EXPECT_EQ(hasBackup(), c.backupKept);
    for (const std::string &file : {auditCopy, record})
      EXPECT_EQ(exists(file), file == c.fileKept) << file;
    EXPECT_NE(outcome.out.find("KXL1000I"), std::string::npos) << outcome.out;
    EXPECT_EQ(outcome.out.find("KXL1917W"), std::string::npos) << outcome.out;
    EXPECT_NE(outcome.out.find(c.shown), std::string::npos) << outcome.out;
    EXPECT_NE(outcome.diagnostics.find(c.logged), std::string::npos) << outcome.diagnostics;
    bool named = std::string(c.logged) == "could not be removed";
    EXPECT_EQ(outcome.diagnostics.find("could not be removed") != std::string::npos, named)
        << outcome.diagnostics;
    EXPECT_NE(outcome.diagnostics.find(c.fileKept.substr(c.fileKept.rfind('\\') + 1)), std::string::npos);
    EXPECT_EQ(run({"-q", "INST1"}).exitCode, -1949 & 0xFF) << "a rerun finds it on the current copy";
    EXPECT_FALSE(exists(record));
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
  EXPECT_EQ(image.substr(16, 2), std::string("\0\x0D", 2));
  EXPECT_EQ(image.substr(20, 4), std::string("\x74\x27\0\0", 4)); // 10100
  EXPECT_FALSE(exists("C:\\Quoted Profiles\\INST1\\security\\kxlauditcopy.cfg"));
  EXPECT_TRUE(exists("C:\\Quoted Profiles\\INST1\\security\\kxlaudit.cfg"));
  EXPECT_FALSE(exists(kNewInstanceDir));
}

} // namespace
} // namespace drivertest
