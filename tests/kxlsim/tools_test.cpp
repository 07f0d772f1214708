// The tools program's names. Its runs inside a world (event, configured exit
// code, the check tool's log) are checked by the scenarios and the end-to-end
// upgrade, which start it as the command does.
#include "sim/tools/tool_names.h"

#include <gtest/gtest.h>

namespace kxlsim::test {
namespace {

TEST(ToolNames, BaseNameWithoutExtensionInLowerCase) {
  EXPECT_EQ(toolProgramName("C:\\KXL\\BIN\\KXLSET.EXE"), "kxlset");
  EXPECT_EQ(toolProgramName("/w/drive_c/bin/kxlckupgrade.exe"), "kxlckupgrade");
  EXPECT_EQ(toolProgramName("kxlimaudcfg"), "kxlimaudcfg");
  EXPECT_EQ(toolProgramName("kxlsyscs.exe.bak"), "kxlsyscs.exe.bak");
  EXPECT_TRUE(isToolProgram("kxlimsslcfg"));
  EXPECT_FALSE(isToolProgram("kxltools"));
  EXPECT_FALSE(isToolProgram(""));
  char a0[] = "kxlset", a1[] = "-cleanup", a2[] = "\"C:\\A B\"";
  char *argv[] = {a0, a1, a2};
  EXPECT_EQ(joinArguments(3, argv), "-cleanup \"C:\\A B\"");
}

} // namespace
} // namespace kxlsim::test
