// Final messages: placeholder replacement, token splicing, catalog texts and
// the fallback lines, read back from standard output.
#include "engn/sqo/messages.h"
#include "tests/support/product_world.h"

#include <gtest/gtest.h>

#include <cstring>
#include <string>

#ifndef _WIN32
#include <filesystem>
#endif

namespace {

TEST(ReplaceMessageToken, ReplacesTheQuotedPlaceholderQuotesIncluded) {
  char message[128] = "Reason code: \"<reason-code>\".";
  replaceMessageToken(message, sizeof message, "\"<REASON-CODE>\"", "-42");
  EXPECT_STREQ("Reason code: -42.", message);
}

TEST(ReplaceMessageToken, PlaceholdersAreFilledInTextOrder) {
  char message[128] = "\"<a>\" then \"<b>\"";
  replaceMessageToken(message, sizeof message, "\"<a>\"", "one");
  replaceMessageToken(message, sizeof message, "\"<b>\"", "two");
  EXPECT_STREQ("one then two", message);
}

TEST(ReplaceMessageToken, LeavesTextWithoutTheNamedPlaceholderUnchanged) {
  char message[128] = "Instance \"<instance-name>\" is busy.";
  replaceMessageToken(message, sizeof message, "\"<reason-code>\"", "7");
  EXPECT_STREQ("Instance \"<instance-name>\" is busy.", message);

  char plain[64] = "No placeholder here.";
  replaceMessageToken(plain, sizeof plain, "\"<reason-code>\"", "7");
  EXPECT_STREQ("No placeholder here.", plain);

  char unclosed[64] = "Broken \"<reason-code";
  replaceMessageToken(unclosed, sizeof unclosed, "<reason-code", "7");
  EXPECT_STREQ("Broken \"<reason-code", unclosed);

  replaceMessageToken(nullptr, 16, "\"<x>\"", "7");
}

TEST(ReplaceMessageToken, TooLongTextIsLeftOrCutToTheBuffer) {
  char message[24] = "ab \"<reason-code>\" cd";
  replaceMessageToken(message, sizeof message, "\"<reason-code>\"", "1");
  EXPECT_STREQ("ab \"<reason-code>\" cd", message) << "text and placeholder exceed the size";

  char roomy[40] = "x \"<v>\" y";
  replaceMessageToken(roomy, 16, "\"<v>\"", "0123456789ABCDEFGHIJ");
  EXPECT_EQ(15u, std::strlen(roomy));
  EXPECT_STREQ("x 0123456789ABC", roomy);
  EXPECT_EQ('\0', roomy[15]);
}

TEST(ReplaceMessageToken, StrayClosingMarkBeforeThePlaceholderIsNotCopiedTwice) {
  char message[64] = "a>\" b \"<v>\" c";
  replaceMessageToken(message, sizeof message, "\"<v>\"", "V");
  EXPECT_STREQ("a>\" b V c", message);
}

// A world whose current copy may hold the built message catalogs.
class MessageWorld : public kxltest::ProductWorld {
protected:
  void installCatalogs() {
#ifdef _WIN32
    GTEST_SKIP() << "catalogs are installed into POSIX test worlds only";
#else
    registerCopy("KXL101", "C:\\KXL\\10.1");
    makeDirectories("C:\\KXL\\10.1\\msg\\en_US");
    std::filesystem::path target = std::filesystem::path(worldRoot()) / "drive_c/KXL/10.1/msg/en_US";
    for (const char *catalog : {"kxlinst.mo", "kxlclp.mo", "kxlsql.mo"}) {
      std::filesystem::path source = std::filesystem::path(KXL_TEST_MESSAGE_DIR) / "en_US" / catalog;
      ASSERT_TRUE(std::filesystem::exists(source)) << source;
      std::filesystem::copy_file(source, target / catalog);
    }
    setString("SOFTWARE\\ZAV\\KXLSIM\\Identity", "Language", "en_US");
    ASSERT_EQ(0, sqloSwitchToInstallationName("KXL101"));
#endif
  }

  template <typename Print> static std::string captured(Print print) {
    testing::internal::CaptureStdout();
    print();
    return testing::internal::GetCapturedStdout();
  }

  UpgradeOptions options{};
};

TEST_F(MessageWorld, FallbackLinesWithoutCatalogs) {
  EXPECT_EQ("KXLIMIGR:syntax error, RC = -1946\n",
            captured([&] { printInstanceMessage("KXLIMIGR", -1946, "syntax error", &options); }));
  EXPECT_EQ("KXLIUPGRADE: processing completed successfully.\n",
            captured([] { printSuccessMessage("KXLIUPGRADE", 1000); }));
  options.partitionRecord.textSearchReasonCode = 5;
  EXPECT_EQ("KXLIMIGR:processing completed, RC = 1273\n",
            captured([&] { printInstanceMessage("KXLIMIGR", 1273, "processing completed", &options); }))
      << "one line only when the catalog text is missing";

  sqlca status;
  sqloinca(&status);
  sqlcaSetCode(status, -1092);
  EXPECT_EQ("KXLIMIGR:processing complete, SQLCODE=-1092\n",
            captured([&] { printSqlcaMessage("KXLIMIGR", &status, "processing complete"); }));
}

TEST_F(MessageWorld, FallbackLineKeepsPercentSignsAsTyped) {
  EXPECT_EQ("KXLIMIGR:%s%n, RC = -1918\n",
            captured([] { printInstanceMessage("KXLIMIGR", -1918, "%s%n", nullptr); }));
}

TEST_F(MessageWorld, CatalogTextsForUsageAndSuccess) {
  installCatalogs();
  std::string usage = captured([&] { printInstanceMessage("KXLIMIGR", -1946, "syntax error", &options); });
  EXPECT_EQ(0u, usage.find("KXL1946E")) << usage;
  EXPECT_EQ('\n', usage.back());
  std::string success = captured([] { printSuccessMessage("KXLIUPGRADE", 1000); });
  EXPECT_EQ(0u, success.find("KXL1000I  KXLIUPGRADE finished")) << success;
}

TEST_F(MessageWorld, TextSearchWarningIsFollowedByTheFallbackLine) {
  installCatalogs();
  options.partitionRecord.textSearchReasonCode = -2079;
  std::string out =
      captured([&] { printInstanceMessage("KXLIMIGR", 1273, "processing completed", &options); });
  EXPECT_NE(std::string::npos, out.find("Reason code: -2079.")) << out;
  EXPECT_EQ(std::string::npos, out.find("<reason-code>")) << out;
  const std::string tail = "\nKXLIMIGR:processing completed, RC = 1273\n";
  ASSERT_GT(out.size(), tail.size());
  EXPECT_EQ(tail, out.substr(out.size() - tail.size())) << out;
}

TEST_F(MessageWorld, RecordTokensAreSplicedInQuotes) {
  installCatalogs();
  std::memcpy(options.instanceName, "INST1", 6);
  options.tokenCount = 1;
  options.tokens[0] = options.instanceName;
  std::string one =
      captured([&] { printInstanceMessage("KXLIMIGR", 1950, "processing complete", &options); });
  EXPECT_EQ("KXL1950W  The instance \"INST1\" already belongs to this copy. Nothing was changed.\n", one);

  options.tokenCount = 2;
  options.tokens[0] = "kxlckupgrade";
  options.tokens[1] = "3";
  std::string two =
      captured([&] { printInstanceMessage("KXLIMIGR", -1069, "processing complete", &options); });
  EXPECT_EQ("KXL1069E  The database check program \"kxlckupgrade\" ended with exit code \"3\". The "
            "instance was not upgraded.\n",
            two);
}

TEST(SpliceRecordTokens, EachTokenStandsWhereItsPlaceholderStands) {
  struct Case {
    const char *text;
    uint8_t count;
    const char *expected;
  } cases[] = {
      {"\"<log-file>\" holds the details.\n", 1, "\"A\" holds the details.\n"},
      {"See \"<log-file>\"", 1, "See \"A\""},
      {"\"<a>\"\"<b>\" and more", 2, "\"A\"\"B\" and more"},
      {"Program \"<p>\" ended with \"<c>\".", 2, "Program \"A\" ended with \"B\"."},
      {"A \"quoted\" word, then \"<v>\".", 1, "A \"quoted\" word, then \"A\"."},
      {"Only \"<v>\" here.", 2, "Only \"A\" here."},
      {"Two \"<v>\" and \"<w>\".", 1, "Two \"A\" and \"<w>\"."},
      {"Nothing to fill.", 200, "Nothing to fill."},
  };
  UpgradeOptions options{};
  options.tokens[0] = "A";
  options.tokens[1] = "B";
  for (const Case &c : cases) {
    SCOPED_TRACE(c.text);
    options.tokenCount = c.count;
    char out[128];
    spliceRecordTokens(c.text, options, out, sizeof out);
    EXPECT_STREQ(c.expected, out);
  }
  char small[8];
  options.tokenCount = 1;
  spliceRecordTokens("\"<v>\" is long", options, small, sizeof small);
  EXPECT_STREQ("\"A\" is ", small);
}

TEST_F(MessageWorld, InstanceTypeMessageNamesBothTypes) {
  installCatalogs();
  std::memcpy(options.instanceName, "PART1", 6);
  options.oldInstanceType = 4;
  options.newInstanceType = 3;
  std::string out =
      captured([&] { printInstanceMessage("KXLIMIGR", 1231, "processing complete", &options); });
  std::string expected = std::string("KXL1231W  The instance PART1 of type ") + instanceTypeWord(4) +
                         " cannot be upgraded: the editions installed in this copy host instances of type " +
                         instanceTypeWord(3) + " only.\n";
  EXPECT_EQ(expected, out);

  options.oldInstanceType = 5;
  out = captured([&] { printInstanceMessage("KXLIMIGR", 1231, "processing complete", &options); });
  EXPECT_NE(std::string::npos, out.find("of type  cannot")) << out;
}

TEST_F(MessageWorld, LegacyNameMessageNamesBothCommands) {
  installCatalogs();
  std::string out = captured([] { printInstanceMessage("KXLIMIGR", 1392, "syntax warning", nullptr); });
  EXPECT_EQ("KXL1392W  The command KXLIMIGR is deprecated. Use KXLIUPGRADE instead.\n", out);
}

TEST_F(MessageWorld, StatusBlockTextCarriesItsToken) {
  installCatalogs();
  sqlca status;
  sqloinca(&status);
  const char *tokens[] = {"JDOE"};
  const uint64_t lengths[] = {4};
  sqlegsca(-1092, 1, lengths, tokens, &status);
  std::string out = captured([&] { printSqlcaMessage("KXLIMIGR", &status, "processing complete"); });
  EXPECT_EQ(0u, out.find("SQL1092N  The user \"JDOE\" is not a local administrator")) << out;
}

} // namespace
