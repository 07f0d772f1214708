// Final messages: placeholder replacement, token splicing and the fallback
// lines, read back from standard output. The catalog texts are checked end to
// end by the scenarios.
#include "engn/sqo/messages.h"
#include "tests/support/product_world.h"

#include <gtest/gtest.h>

#include <cstdio>
#include <string>

namespace {

// A quoted placeholder is replaced quotes and all, within the buffer's size;
// a text that would not fit, or has no such placeholder, stays as it is.
TEST(ReplaceMessageToken, ReplacesTheQuotedPlaceholderWithinTheBuffer) {
  struct Case {
    const char *text;
    std::size_t size;
    const char *placeholder, *value, *expected;
  } cases[] = {
      {"Reason code: \"<reason-code>\".", 128, "\"<REASON-CODE>\"", "-42", "Reason code: -42."},
      {"Instance \"<instance-name>\" is busy.", 128, "\"<reason-code>\"", "7", nullptr},
      {"No placeholder here.", 64, "\"<reason-code>\"", "7", nullptr},
      {"Broken \"<reason-code", 64, "<reason-code", "7", nullptr},
      {"ab \"<reason-code>\" cd", 24, "\"<reason-code>\"", "1", nullptr},
      {"x \"<v>\" y", 16, "\"<v>\"", "0123456789ABCDEFGHIJ", "x 0123456789ABC"},
      {"a>\" b \"<v>\" c", 64, "\"<v>\"", "V", "a>\" b V c"},
  };
  for (const Case &c : cases) {
    char message[128];
    std::snprintf(message, sizeof message, "%s", c.text);
    replaceMessageToken(message, c.size, c.placeholder, c.value);
    EXPECT_STREQ(c.expected != nullptr ? c.expected : c.text, message);
  }
  char message[128] = "\"<a>\" then \"<b>\"";
  replaceMessageToken(message, sizeof message, "\"<a>\"", "one");
  replaceMessageToken(message, sizeof message, "\"<b>\"", "two");
  EXPECT_STREQ("one then two", message);
  replaceMessageToken(nullptr, 16, "\"<x>\"", "7");
}

using MessageWorld = kxltest::ProductWorld;

template <typename Print> std::string captured(Print print) {
  testing::internal::CaptureStdout();
  print();
  return testing::internal::GetCapturedStdout();
}

// The final messages without catalogs: the fallback lines, one line only when
// the catalog text is missing, percent signs as typed.
TEST_F(MessageWorld, FallbackLinesWithoutCatalogs) {
  UpgradeOptions options{};
  options.partitionRecord.textSearchReasonCode = 5;
  sqlca status;
  sqloinca(&status);
  sqlcaSetCode(status, -1092);
  EXPECT_EQ("KXLIMIGR:syntax error, RC = -1946\n"
            "KXLIUPGRADE: processing completed successfully.\n"
            "KXLIMIGR:processing completed, RC = 1273\n"
            "KXLIMIGR:processing complete, SQLCODE=-1092\n"
            "KXLIMIGR:%s%n, RC = -1918\n",
            captured([&] {
              printInstanceMessage("KXLIMIGR", -1946, "syntax error", &options);
              printSuccessMessage("KXLIUPGRADE", 1000);
              printInstanceMessage("KXLIMIGR", 1273, "processing completed", &options);
              printSqlcaMessage("KXLIMIGR", &status, "processing complete");
              printInstanceMessage("KXLIMIGR", -1918, "%s%n", nullptr);
            }));
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

} // namespace
