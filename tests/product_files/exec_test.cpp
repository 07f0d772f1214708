// Running programs: the command line a program receives, its exit code, and
// the failure codes when it cannot be started. Programs run by name and with
// an argument block, and injected failures, are driven by the command
// (the end-to-end upgrade's program events, tests/driver).
#include "sim/product/cmdline.h"
#include "tests/support/product_world.h"

#include <gtest/gtest.h>

#include <filesystem>

namespace {

std::string lineFor(std::initializer_list<const char *> arguments) {
  std::string line;
  for (const char *argument : arguments)
    kxlprod::appendArgument(line, argument);
  return line;
}

TEST(CommandLine, ArgumentsAreQuotedForTheRunTimeParser) {
  EXPECT_EQ("prog -h plain", lineFor({"prog", "-h", "plain"}));
  EXPECT_EQ("\"C:\\Program Files\\x.exe\" \"\"", lineFor({"C:\\Program Files\\x.exe", ""}));
  EXPECT_EQ("\"say \\\"hi\\\"\"", lineFor({"say \"hi\""}));
  // Backslashes are doubled only before a quote, including the closing one.
  EXPECT_EQ("\"a b\\\\\" c\\d", lineFor({"a b\\", "c\\d"}));
  EXPECT_EQ("\"x\\\\\\\"y z\"", lineFor({"x\\\"y z"}));
  // An argument already wrapped in quotes keeps being one argument.
  EXPECT_EQ("\"C:\\my dir\\upgrade.log\"", lineFor({"\"C:\\my dir\\upgrade.log\""}));
  EXPECT_EQ("\"C:\\dir\\\\\"", lineFor({"\"C:\\dir\\\""}));
  EXPECT_EQ("\"C:\"", lineFor({"\"C:\""}));
}

class Programs : public kxltest::ProductWorld {
protected:
  void SetUp() override {
    ProductWorld::SetUp();
    useCopy("KXL101", "C:\\KXL101");
    makeDirectories("C:\\KXL101\\bin");
    std::filesystem::copy_file(KXL_ARGDUMP, host("drive_c/KXL101/bin/argdump.exe"));
    dumpPath_ = host("args.txt");
    kxltest::setProcessVariable("KXLTEST_ARGDUMP", dumpPath_.c_str());
  }
  void TearDown() override {
    kxltest::setProcessVariable("KXLTEST_ARGDUMP", nullptr);
    ProductWorld::TearDown();
  }
  std::string dumpPath_;
};

TEST_F(Programs, ArgumentsArriveUnchangedAndTheExitCodeIsReported) {
  const char block[] = "C:\\KXL101\\bin\\argdump.exe\0-l\0\"C:\\my dir\\upgrade.log\"\0two words\0"
                       "say \"hi\"\0back\\slash\\\0\0";
  uint32_t pid = 0;
  SQLO_EXEC_RESULT result{};
  ASSERT_EQ(0, sqloexec2("C:\\KXL101\\bin\\argdump.exe", block, 0, 0x40, &pid, &result, 0, 0));
  EXPECT_EQ(1u, result.state);
  EXPECT_EQ(7u, result.exitCode);
  EXPECT_NE(0u, pid);
  EXPECT_EQ("-l\nC:\\my dir\\upgrade.log\ntwo words\nsay \"hi\"\nback\\slash\\\n",
            kxltestsupport::readHostFile(dumpPath_));
}

TEST_F(Programs, AProgramThatCannotStartIsAnError) {
  SQLO_EXEC_RESULT result{};
  EXPECT_EQ(SQLO_RC_EXEC_FAILED,
            sqloexec2("C:\\KXL101\\bin\\none.exe", nullptr, 0, 0x40, nullptr, &result, 0, 0));
  EXPECT_EQ(SQLO_RC_EXEC_FAILED, sqloexec2("nothere.exe", nullptr, 0, 0xC0, nullptr, &result, 0, 0));
  EXPECT_EQ(0u, result.state);
}

// The call returns only once the program has ended, so it never changes files its caller undoes.
TEST_F(Programs, AFailedWaitIsTriedAgain) {
  SQLO_EXEC_RESULT result{};
  failCalls("WaitForSingleObject:1");
  EXPECT_EQ(0, sqloexec2("argdump.exe -x", nullptr, 0, 0xC0, nullptr, &result, 0, 0));
  EXPECT_EQ(7u, result.exitCode);
  EXPECT_EQ("-x\n", kxltestsupport::readHostFile(dumpPath_));
  failCalls("WaitForSingleObject:1,WaitForSingleObject:2");
  EXPECT_NE(0, sqloexec2("argdump.exe", nullptr, 0, 0xC0, nullptr, &result, 0, 0));
  failCalls(nullptr);
}

} // namespace
