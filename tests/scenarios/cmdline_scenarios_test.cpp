// Command-line errors through the installed command: the message of each
// code, with and without catalogs, and a world left exactly as it was.
#include "expected_texts.h"
#include "scenario_fixture.h"

namespace {

using kxltest::RunResult;
using kxltest::RunSetup;

class CommandLineScenario : public kxltest::ScenarioTest {
protected:
  // A refused command line prints `text`, ends with `code` and changes nothing.
  void expectRefused(const std::vector<std::string> &args, int code, const std::string &text) {
    RunResult r = run(args);
    EXPECT_EQ(r.result, code);
    EXPECT_EQ(r.exitCode, code & 0xFF);
    EXPECT_EQ(r.out, text);
    EXPECT_EQ(changes(r), "");
    EXPECT_TRUE(r.events.empty());
  }
};

TEST_F(CommandLineScenario, EveryCodeIsPrintedFromTheCatalog) {
  expectRefused({}, -1946, kxltest::kUsageText);
  expectRefused({"INST1", "-?"}, -1946, kxltest::kUsageText);
  expectRefused({"/x", "INST1"}, -1946, kxltest::kUsageText);
  expectRefused({"INST1", "-a"}, -1946, kxltest::kUsageText);
  expectRefused({"INST1", "INST2"}, -1946, kxltest::kUsageText);
  expectRefused({"NINECHARS"}, -1916,
                "KXL1916E  The instance name is not valid. An instance name has 1 to 8 characters.\n");
  expectRefused({"-p", "C:\\nowhere", "INST1"}, -1920,
                "KXL1920E  The instance profile path given with -p is not an existing directory.\n");
  expectRefused(
      {"-u", std::string(31, 'u'), "INST1"}, -1921,
      "KXL1921E  The account name given with -u is not valid, or the password could not be read.\n");
  expectRefused({"-j", "FULL_TEXT", "INST1"}, -1934,
                "KXL1934E  The value of -j is not valid. Give TEXT_SEARCH, optionally followed by a service "
                "name or a port number, or by a service name and a port number.\n");
  expectRefused({"-j", "TEXT_SEARCH,1023", "INST1"}, -1701,
                "KXL1701E  The text search port must lie between 1024 and 65535, and the text search service "
                "name may have at most 14 characters.\n");
  expectRefused({"kxldas00"}, -1954, kxltest::kAdminServerText);
}

TEST_F(CommandLineScenario, WithoutCatalogsTheFallbackLinesArePrinted) {
  removeCatalogs();
  expectRefused({}, -1946, "KXLIMIGR:syntax error, RC = -1946\n");
  expectRefused({"NINECHARS"}, -1916, "KXLIMIGR:processing complete, RC = -1916\n");
  expectRefused({"-j", "TEXT_SEARCH,99999", "INST1"}, -1701, "KXLIMIGR:processing complete, RC = -1701\n");
  expectRefused({"KXLDAS00"}, -1954, "KXLIMIGR:processing complete, RC = -1954\n");
}

TEST_F(CommandLineScenario, QuietModeAndInstallerModeShapeTheEnd) {
  RunResult quiet = run({"-q", "NOSUCH"});
  EXPECT_EQ(quiet.out, "");
  EXPECT_EQ(quiet.result, 1951);
  EXPECT_EQ(quiet.exitCode, 1951 & 0xFF);

  RunResult installer = run({"-install", "NOSUCH"});
  EXPECT_EQ(installer.out, kxltest::unknownInstanceText("NOSUCH"));
  EXPECT_EQ(installer.result, 1);
  EXPECT_EQ(installer.exitCode, 1);

  RunResult usage = run({"-install", "-x", "NOSUCH"});
  EXPECT_EQ(usage.result, 2) << "a negative result is 2 in installer mode";
}

TEST_F(CommandLineScenario, LegacyNameEndsWithItsWarningButNotAfterUsageErrors) {
  installCommandAs("kxlimigr.exe");
  RunSetup legacy;
  legacy.program = "kxlimigr.exe";
  RunResult r = run({"nosuch"}, legacy);
  EXPECT_EQ(r.out, kxltest::unknownInstanceText("NOSUCH") + "\n\n" + kxltest::kLegacyText);
  EXPECT_EQ(r.result, 1951);

  RunResult quiet = run({"-q", "nosuch"}, legacy);
  EXPECT_EQ(quiet.out, "\n\n" + kxltest::kLegacyText) << "the warning is printed in quiet mode too";

  RunResult usage = run({"-?"}, legacy);
  EXPECT_EQ(usage.out, kxltest::kUsageText) << "the name is not known yet when the command line fails";

  removeCatalogs();
  RunResult plain = run({"nosuch"}, legacy);
  EXPECT_EQ(plain.out, "KXLIMIGR:processing complete, RC = 1951\n\n\nKXLIMIGR:syntax warning, RC = 1392\n");
}

} // namespace
