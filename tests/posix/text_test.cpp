// Code-page conversion beyond the conformance suite's sizes and terminators:
// the machine's ANSI code page, surrogate pairs and strict UTF-8, empty input.
#include "platform/win32.h"

#include <gtest/gtest.h>

#include <string>

namespace {

TEST(CodePages, AnsiIsOneByteToOneUnitAndMarksWhatItCannotHold) {
  const char latin[] = "caf\xE9";
  WCHAR wide[8];
  ASSERT_EQ(MultiByteToWideChar(CP_ACP, 0, latin, -1, wide, 8), 5);
  EXPECT_EQ(wide[3], 0x00E9);
  char back[8];
  ASSERT_EQ(WideCharToMultiByte(CP_ACP, 0, wide, -1, back, sizeof back, nullptr, nullptr), 5);
  EXPECT_STREQ(back, latin);

  const WCHAR foreign[] = {u'a', 0x20AC, 0};
  BOOL usedDefault = FALSE;
  ASSERT_EQ(WideCharToMultiByte(CP_ACP, 0, foreign, -1, back, sizeof back, nullptr, &usedDefault), 3);
  EXPECT_STREQ(back, "a?");
  EXPECT_TRUE(usedDefault);
}

TEST(CodePages, Utf8RoundTripsSurrogatePairs) {
  const char utf8[] = "\xE2\x82\xAC \xF0\x9F\x98\x80";
  WCHAR wide[8];
  ASSERT_EQ(MultiByteToWideChar(CP_UTF8, 0, utf8, -1, wide, 8), 5);
  EXPECT_EQ(wide[0], 0x20AC);
  EXPECT_EQ(wide[2], 0xD83D);
  EXPECT_EQ(wide[3], 0xDE00);
  EXPECT_EQ(WideCharToMultiByte(CP_UTF8, 0, wide, -1, nullptr, 0, nullptr, nullptr), 9);
  char back[16];
  ASSERT_EQ(WideCharToMultiByte(CP_UTF8, 0, wide, -1, back, sizeof back, nullptr, nullptr), 9);
  EXPECT_STREQ(back, utf8);
  EXPECT_EQ(WideCharToMultiByte(CP_UTF8, 0, wide, -1, back, 4, nullptr, nullptr), 0);
  EXPECT_EQ(GetLastError(), static_cast<DWORD>(ERROR_INSUFFICIENT_BUFFER));
  EXPECT_EQ(MultiByteToWideChar(CP_UTF8, 8, "\xC3", 1, wide, 8), 0)
      << "strict mode refuses a broken sequence";
  EXPECT_EQ(MultiByteToWideChar(CP_ACP, 0, "", 0, wide, 8), 0);
  EXPECT_EQ(GetLastError(), static_cast<DWORD>(ERROR_INVALID_PARAMETER));
}

} // namespace
