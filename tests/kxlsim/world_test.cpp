// Configuration images in both layouts, and building worlds: the demo world
// as the command will see it, what `show` reports of it, what `create`
// refuses, and the tools program's names. The tools program's runs inside a
// world are checked by the scenarios and the end-to-end upgrade, which start
// it as the command does.
#include "sim/kxlsim/dbmcfg_image.h"
#include "sim/kxlsim/scenarios.h"
#include "sim/kxlsim/show.h"
#include "sim/kxlsim/world_reader.h"
#include "sim/kxlsim/world_writer.h"
#include "sim/posix/world.h"
#include "sim/tools/tool_names.h"
#include "tests/support/scenario_world.h"
#include "tests/support/temp_world.h"

#include <gtest/gtest.h>

#include <cstring>
#include <filesystem>
#include <sstream>

namespace kxlsim::test {
namespace {

// The cases only read the demo world, so they share the one built for the program.
class DemoWorld : public ::testing::Test {
protected:
  void SetUp() override {
    std::string error;
    ASSERT_TRUE(selectWorld(kxltestsupport::scenarioWorld("demo"), error)) << error;
  }
};

std::string showText() {
  std::ostringstream out;
  showWorld(out);
  return out.str();
}

// The line of `text` that starts with `prefix` after its indentation.
std::string lineStarting(const std::string &text, const std::string &prefix) {
  std::istringstream in(text);
  std::string line;
  while (std::getline(in, line)) {
    size_t start = line.find_first_not_of(' ');
    if (start != std::string::npos && line.compare(start, prefix.size(), prefix) == 0)
      return line;
  }
  return "";
}

TEST_F(DemoWorld, ShowListsCopiesInstancesServicesAndMachines) {
  std::string text = showText();
  const std::pair<const char *, const char *> rows[] = {
      {"KXLV8 ", "C:\\Program Files\\ZAV\\KXL8"},
      {"INST2 ", "C:\\Program Files\\ZAV\\KXL95\\INST2"},
      {"INST2 ", "node type 4"},
      {"V8INST ", "copy KXLV8"},
      {"INST2-0 ", "start 2 state 1"},
      {"WINSRV2\\INST2-1 ", "KXL95\\bin\\kxlsyscs.exe"},
      {"WINSRV2 ", "winsrv2.zav.test"},
  };
  for (const auto &[prefix, part] : rows)
    EXPECT_NE(lineStarting(text, prefix).find(part), std::string::npos) << prefix << part << "\n" << text;
  EXPECT_EQ(lineStarting(text, "WINSRV2\\INST1"), "") << "INST1 runs only on the local machine";
}

// The copies' templates, catalogs and programs and the instances of the 9.5
// copy are what the scenarios and end-to-end upgrades run on; the version-8
// instance is upgraded only by tests/driver, which does not see its layout.
TEST_F(DemoWorld, TheVersionEightInstanceKeepsTheSmallLayoutAndTheMachineHasNoCluster) {
  std::vector<uint8_t> image;
  ASSERT_TRUE(readFileHead("C:\\Program Files\\ZAV\\KXL8\\V8INST\\kxlsystm", kDbmCfgSize, image));
  EXPECT_EQ(image, makeDbmCfgImage(3, kDbmReleaseV8, true));
  EXPECT_TRUE(readFileHead("C:\\windows\\system32\\odbc32.dll", 16, image));
  EXPECT_FALSE(readFileHead("C:\\windows\\system32\\clusapi.dll", 16, image));
}

TEST(CreateWorld, AnEmptyWorldHasAMachineAndCreateRefusesExistingWorldsAndUnknownScenarios) {
  const std::string &empty = kxltestsupport::scenarioWorld("empty");
  std::string error;
  ASSERT_TRUE(selectWorld(empty, error)) << error;
  std::string text = showText();
  EXPECT_NE(text.find("Copies:\nInstances:\nServices:\nMachines:\n"), std::string::npos) << text;
  EXPECT_NE(text.find("WINSRV1"), std::string::npos);

  std::vector<std::string> errors;
  EXPECT_FALSE(createWorld(empty, "empty", kxltestsupport::buildSources(), errors));
  ASSERT_FALSE(errors.empty());
  EXPECT_NE(errors[0].find("holds a world already"), std::string::npos);
  std::string fresh = kxltestsupport::newTempDir("kxlsim-create") + "/x";
  errors.clear();
  EXPECT_FALSE(createWorld(fresh, "no-such-scenario", kxltestsupport::buildSources(), errors));
  EXPECT_FALSE(std::filesystem::exists(fresh));
  std::filesystem::remove_all(std::filesystem::path(fresh).parent_path());
}

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

// The stored checksum equals the sum of every byte after it.
void expectSealed(const std::vector<uint8_t> &image) {
  uint32_t sum = 0;
  for (size_t i = 4; i < image.size(); ++i)
    sum += image[i];
  EXPECT_EQ(uint32_t(image[0] | image[1] << 8 | image[2] << 16 | uint32_t(image[3]) << 24), sum);
}

TEST(DbmCfgImage, EveryNodeTypeAndReleaseHasItsWordsAndItsChecksum) {
  for (DbmRelease release : {kDbmReleaseV8, kDbmReleaseV91, kDbmReleaseV95, kDbmReleaseV101}) {
    for (int nodeType = 1; nodeType <= 5; ++nodeType) {
      for (bool small : {false, true}) {
        std::vector<uint8_t> image = makeDbmCfgImage(nodeType, release, small);
        SCOPED_TRACE("node type " + std::to_string(nodeType) + (small ? " small" : ""));
        ASSERT_EQ(image.size(), small ? kDbmCfgSmallSize : kDbmCfgSize);
        EXPECT_EQ(readU16(image, 40), nodeType);
        EXPECT_EQ(readU16(image, 16) & 0x0F00, release.releaseWord);
        EXPECT_EQ(readU16(image, 20), release.level);
        expectSealed(image);
      }
    }
  }
  std::vector<uint8_t> image = makeDbmCfgImage(4, kDbmReleaseV101);
  image[15000] ^= 0x5A;
  dbmCfgSealChecksum(image);
  expectSealed(image);
}

TEST(DbmCfgImage, SmallLayoutKeepsItsFlagAreaAtTheEnd) {
  std::vector<uint8_t> small = makeDbmCfgImage(1, kDbmReleaseV8, true);
  std::vector<uint8_t> large = makeDbmCfgImage(1, kDbmReleaseV8, false);
  // Parameter values of the small layout are those of the large one up to 3584.
  EXPECT_EQ(0, std::memcmp(small.data() + 4, large.data() + 4, 3584 - 4));
  for (size_t i = 3584; i < 4096; ++i)
    ASSERT_EQ(small[i], 0) << i;
}

} // namespace
} // namespace kxlsim::test
