// Names, text and diagnostics: comparisons, upper-casing, instance names,
// languages and the password prompt; the lines of the trace file, silence
// without KXLTRACE, and the diagnostic log beside the world's event log.
#include "sim/common/events.h"
#include "sim/product/diag.h"
#include "sim/product/text.h"
#include "tests/support/product_world.h"

#include <gtest/gtest.h>

#include <filesystem>
#include <string>

#include <unistd.h>

namespace {

TEST(Compare, IgnoresCaseOverTheGivenLength) {
  struct Case {
    const char *a, *b;
    uint32_t length;
    bool equal;
  } cases[] = {
      {"q", "q", 1, true},
      {"Quiet", "q", 1, true},
      {"INSTALLx", "install", 7, true},
      {"instal", "install", 7, false},
      {"", "?", 1, false},
      {"p", "q", 1, false},
      {"server", "SERVER", 0, true},
      {"SERVERX", "SERVER", 0, false},
      // A value cut to its 19-character field still names its word.
      {"kerberos_server_enc", "KERBEROS_SERVER_ENCRYPT", 0, true},
      {"DCS_ENCRYPT", "DCS", 0, false},
      {"", "SERVER", 0, false},
      {"", "", 0, true},
  };
  for (const Case &c : cases)
    EXPECT_EQ(c.equal, sqlomcpi(c.a, c.b, c.length) == 0) << c.a << " / " << c.b << " / " << c.length;
  EXPECT_LT(sqlomcpi("a", "B", 1), 0);
  EXPECT_GT(sqlomcpi("c", "B", 1), 0);
}

TEST(Upper, ConvertsInPlaceWithinTheLength) {
  char name[] = "inst1x@", shortText[] = "ab";
  EXPECT_EQ(0, sqlotoup(5, 0, name));
  EXPECT_STREQ("INST1x@", name);
  EXPECT_EQ(0, sqlotoup(0, 0, name));
  EXPECT_STREQ("INST1X@", name);
  EXPECT_EQ(0, sqlotoup(8, 0, shortText));
  EXPECT_STREQ("AB", shortText);
}

TEST(InstanceNames, AcceptOnlyShortNamesOfNameCharacters) {
  for (const char *good : {"KXL", "INST1", "A", "ABCDEFGH", "a_b$c#d@"})
    EXPECT_EQ(0, sqloacss(good, 16)) << good;
  for (const char *bad : {"", "1INST", "_INST", "ABCDEFGHI", "IN ST", "INST-1", "INST.1", "\xC4INST"})
    EXPECT_NE(0, sqloacss(bad, 16)) << bad;
  EXPECT_NE(0, sqloacss(nullptr, 16));
}

TEST(Languages, LocaleTextsBecomeDirectoryNames) {
  const std::pair<const char *, const char *> rows[] = {{"de_DE.UTF-8@euro", "de_DE"},

                                                        {"fr", "fr"},
                                                        {"C.UTF-8", "en_US"},
                                                        {"POSIX", "en_US"},
                                                        {"es_419", "es_419"},
                                                        {"", ""},
                                                        {"english", ""},
                                                        {"de_", ""},
                                                        {"../x", ""},
                                                        {"d3_DE", ""},
                                                        {"de_DE_X", ""}};
  for (const auto &[locale, directory] : rows)
    EXPECT_EQ(directory, kxlprod::normalizeLanguage(locale)) << locale;
}

// The language variables unset after the case, and standard input replaced
// by a pipe holding `input` for it.
class ProcessInput : public kxltest::ProductWorld {
protected:
  void feed(const std::string &input) {
    int fds[2];
    ASSERT_EQ(0, pipe(fds));
    saved_ = dup(0);
    ASSERT_EQ(ssize_t(input.size()), write(fds[1], input.data(), input.size()));
    close(fds[1]);
    dup2(fds[0], 0);
    close(fds[0]);
  }
  void TearDown() override {
    kxltest::setProcessVariable("LC_ALL", nullptr);
    kxltest::setProcessVariable("LANG", nullptr);
    if (saved_ >= 0) {
      dup2(saved_, 0);
      close(saved_);
    }
    ProductWorld::TearDown();
  }
  int saved_ = -1;
};

TEST_F(ProcessInput, IdentityThenEnvironmentThenEnglish) {
  kxltest::setProcessVariable("LC_ALL", nullptr);
  kxltest::setProcessVariable("LANG", nullptr);
  EXPECT_STREQ("en_US", sqloGetNormalizedEnvLang(1));
  kxltest::setProcessVariable("LANG", "fr_FR.UTF-8");
  EXPECT_STREQ("fr_FR", sqloGetNormalizedEnvLang(1));
  kxltest::setProcessVariable("LC_ALL", "it_IT");
  EXPECT_STREQ("it_IT", sqloGetNormalizedEnvLang(1));
  setString("SOFTWARE\\ZAV\\KXLSIM\\Identity", "Language", "ja-jp");
  EXPECT_STREQ("ja_JP", sqloGetNormalizedEnvLang(1));
  kxltest::setProcessVariable("LC_ALL", "nonsense!");
  setString("SOFTWARE\\ZAV\\KXLSIM\\Identity", "Language", "");
  EXPECT_STREQ("fr_FR", sqloGetNormalizedEnvLang(1)) << "unusable values are passed over";
}

// The prompt and a plain password are also driven through the command line (tests/sqo_cmdline).
TEST_F(ProcessInput, PasswordIsReadLineByLineCutToTheBufferUntilTheInputEnds) {
  feed("s3cret pass\r\nabcdefghij");
  char password[256] = "old", small[5];
  ::testing::internal::CaptureStdout();
  EXPECT_EQ(0, sqlo_get_password("joe", password, sizeof password));
  EXPECT_EQ(0, sqlo_get_password("joe", small, sizeof small));
  EXPECT_EQ("Enter password for joe:Enter password for joe:", ::testing::internal::GetCapturedStdout());
  EXPECT_STREQ("s3cret pass", password);
  EXPECT_STREQ("abcd", small);
  ::testing::internal::CaptureStdout();
  EXPECT_NE(0, sqlo_get_password("joe", password, sizeof password)) << "nothing left to read";
  ::testing::internal::GetCapturedStdout();
  EXPECT_STREQ("", password);
}

class Tracing : public kxltest::ProductWorld {
protected:
  void TearDown() override {
    traceTo(nullptr);
    ProductWorld::TearDown();
  }
  void traceTo(const char *path) {
    kxltest::setProcessVariable("KXLTRACE", path);
    kxlprod::resetTrace();
  }
  const std::string tracePath_ = world_.scratch("trace.txt"); // outside the world, gone with it
};

// Each hook writes one line; long data is cut and its line stays whole.
TEST_F(Tracing, EveryHookWritesOneLineAndNothingWithoutTheSetting) {
  traceTo(nullptr);
  pdtEntry(0x1);
  EXPECT_FALSE(std::filesystem::exists(tracePath_));
  traceTo(tracePath_.c_str());
  int32_t value = -5;
  uint32_t unsignedValue = 40;
  int64_t wide = 1LL << 40;
  const unsigned char bytes[] = {0x00, 0xAB, 0x10};
  pdtEntry(0x18780502);
  pdtError(0x18780502, 50, -1969);
  pdtData1(0x18780502, 7, PD_TYPE_STRING, 0, "C:\\inst\nINST1");
  pdtData1(0x1878050A, 8, PD_TYPE_INT32, 4, &value);
  pdtData1(0x1878050A, 8, PD_TYPE_UINT32, 4, &unsignedValue);
  pdtData1(0x1, 9, PD_TYPE_INT64, 8, &wide);
  pdtData1(0x2, 3, PD_TYPE_BYTES, sizeof bytes, bytes);
  pdtData1(0x1, 1, PD_TYPE_STRING, 0, std::string(5000, 'x').c_str());
  pdtExit(0x18780502, -1969, 0);
  EXPECT_EQ("entry 0x18780502\n"
            "error 0x18780502 probe=50 rc=-1969\n"
            "data 0x18780502 probe=7 C:\\inst INST1\n"
            "data 0x1878050A probe=8 -5\n"
            "data 0x1878050A probe=8 40\n"
            "data 0x00000001 probe=9 1099511627776\n"
            "data 0x00000002 probe=3 00AB10\n"
            "data 0x00000001 probe=1 " +
                std::string(256, 'x') +
                "\n"
                "exit 0x18780502 rc=-1969\n",
            kxltestsupport::readHostFile(tracePath_));
}

TEST_F(Tracing, DiagnosticLogLiesBesideTheEventLog) {
  std::string events = kxlsim::eventsPath();
  std::string log = kxlprod::diagnosticLogPath();
  ASSERT_FALSE(log.empty());
  EXPECT_EQ(events.substr(0, events.find_last_of("/\\")), log.substr(0, log.find_last_of("/\\")));
  EXPECT_EQ(0, pdLog(PD_LEVEL_WARNING, 0x18780001, 10, 1168, "ODBC status %d", 1168));
  EXPECT_EQ(0, pdLog(PD_LEVEL_INFO, 0x18780001, 11, 0, "%s", "two\nlines"));
  EXPECT_EQ(0, pdLog(PD_LEVEL_INFO, 0x1, 12, 0, "%s", std::string(5000, 'y').c_str()));
  const std::string head = "level=4 function=0x00000001 probe=12 rc=0 ";
  EXPECT_EQ("level=3 function=0x18780001 probe=10 rc=1168 ODBC status 1168\n"
            "level=4 function=0x18780001 probe=11 rc=0 two lines\n" +
                head + std::string(1022 - head.size(), 'y') + "\n",
            kxltestsupport::readHostFile(log));
  failCalls("pdLog:1");
  EXPECT_NE(0, pdLog(PD_LEVEL_INFO, 1, 1, 0, "dropped"));
}

} // namespace
