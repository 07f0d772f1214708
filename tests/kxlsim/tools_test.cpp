// The tools program started under each name inside a world: its event, its
// configured exit code, and the check tool's log.
#include "sim/kxlsim/world_reader.h"
#include "sim/kxlsim/world_writer.h"
#include "tests/support/scenario_world.h"
#include "tests/support/temp_world.h"

#include "sim/posix/world.h"
#include "sim/tools/tool_names.h"
#include <gtest/gtest.h>

#include <nlohmann/json.hpp>
#include <sys/wait.h>

#include <sstream>

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

class ToolsInWorld : public ::testing::Test {
protected:
  void SetUp() override {
    ASSERT_FALSE(world_.root().empty());
    world_.enter();
    for (const char *name : {"kxlset.exe", "KXLCKUPGRADE.EXE", "kxlimaudcfg.exe", "kxltools"})
      w_.installHostFile(kxltestsupport::buildSources().toolsPath, std::string("C:\\tools\\") + name, true);
    w_.makeDirectory("C:\\work");
    ASSERT_TRUE(w_.ok());
  }

  // Runs C:\tools\<name> from C:\work with KXLINSTANCE set; returns its exit code.
  int run(const std::string &name, const std::string &args) {
    std::string program, work;
    EXPECT_TRUE(posix::hostPath("C:\\tools\\" + name, program));
    EXPECT_TRUE(posix::hostPath("C:\\work", work));
    std::string command = "cd '" + work + "' && KXLSIM_ROOT='" + world_.root() + "' KXLINSTANCE=INST1 '" +
                          program + "' " + args + " 2>/dev/null";
    int status = std::system(command.c_str());
    return WIFEXITED(status) ? WEXITSTATUS(status) : -1;
  }

  std::vector<nlohmann::json> events() {
    std::vector<nlohmann::json> list;
    std::istringstream in(kxltestsupport::readHostFile(world_.host("events.jsonl")));
    std::string line;
    while (std::getline(in, line))
      list.push_back(nlohmann::json::parse(line));
    return list;
  }

  kxltestsupport::TempWorld world_{"kxlsim-tools",
                                   kxltestsupport::CopyOf{kxltestsupport::scenarioWorld("empty")}};
  WorldWriter w_;
};

TEST_F(ToolsInWorld, RecordsItsRunAndEndsWithTheConfiguredExitCode) {
  setToolExitCode(w_, "kxlset", 7);
  ASSERT_TRUE(w_.ok());
  EXPECT_EQ(run("kxlset.exe", "-cleanup"), 7);
  EXPECT_EQ(run("kxlimaudcfg.exe", ""), 0) << "no configured exit code means 0";
  std::vector<nlohmann::json> list = events();
  ASSERT_EQ(list.size(), 2u);
  EXPECT_EQ(list[0]["event"], "program");
  EXPECT_EQ(list[0]["program"], "kxlset.exe");
  EXPECT_EQ(list[0]["args"], "-cleanup");
  EXPECT_EQ(list[0]["argc"], "1");
  EXPECT_EQ(list[0]["KXLINSTANCE"], "INST1");
  EXPECT_EQ(list[0]["cwd"], "C:\\work");
  EXPECT_EQ(list[1]["program"], "kxlimaudcfg.exe");
  EXPECT_EQ(list[1]["args"], "");
}

TEST_F(ToolsInWorld, CheckToolWritesItsLogWhereTheQuotedPathPoints) {
  setToolExitCode(w_, "kxlckupgrade", 3);
  ASSERT_TRUE(w_.ok());
  EXPECT_EQ(run("KXLCKUPGRADE.EXE", "-h -m -not1 -l '\"C:\\work\\upgrade.log\"' -t '\"C:\\work\"'"), 3);
  std::vector<uint8_t> log;
  ASSERT_TRUE(readFileHead("C:\\work\\upgrade.log", 4096, log));
  std::string text(log.begin(), log.end());
  EXPECT_NE(text.find("INST1"), std::string::npos) << text;
  EXPECT_NE(text.find("3"), std::string::npos) << text;
  std::vector<nlohmann::json> list = events();
  ASSERT_EQ(list.size(), 1u);
  EXPECT_EQ(list[0]["program"], "kxlckupgrade.exe");
  EXPECT_EQ(list[0]["args"], "-h -m -not1 -l \"C:\\work\\upgrade.log\" -t \"C:\\work\"");
}

TEST_F(ToolsInWorld, UnknownNameIsRefusedWithoutAnEvent) {
  EXPECT_EQ(run("kxltools", "-cleanup"), 2);
  EXPECT_TRUE(events().empty());
}

} // namespace
} // namespace kxlsim::test
