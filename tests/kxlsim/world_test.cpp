// Building worlds: the demo world as the command will see it, what `show`
// reports of it, and what `create` refuses.
#include "sim/kxlsim/dbmcfg_image.h"
#include "sim/kxlsim/scenarios.h"
#include "sim/kxlsim/show.h"
#include "sim/kxlsim/world_reader.h"
#include "sim/kxlsim/world_writer.h"
#include "sim/posix/world.h"
#include "tests/support/scenario_world.h"
#include "tests/support/temp_world.h"

#include <gtest/gtest.h>

#include <sys/stat.h>

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
      {"KXLV8 ", "8.2"},
      {"KXLV8 ", "C:\\Program Files\\ZAV\\KXL8"},
      {"KXL95 ", "9.5"},
      {"KXL101 ", "10.1"},
      {"INST2 ", "copy KXL95"},
      {"INST2 ", "node type 4"},
      {"INST2 ", "C:\\Program Files\\ZAV\\KXL95\\INST2"},
      {"INST1 ", "node type 1"},
      {"V8INST ", "copy KXLV8"},
      {"INST2-0 ", "start 2 state 1"},
      {"WINSRV2\\INST2-1 ", "KXL95\\bin\\kxlsyscs.exe"},
      {"WINSRV2\\INST2-2 ", ""},
      {"WINSRV1 ", "(local)"},
      {"WINSRV2 ", "winsrv2.zav.test"},
  };
  for (const auto &[prefix, part] : rows)
    EXPECT_NE(lineStarting(text, prefix).find(part), std::string::npos) << prefix << part << "\n" << text;
  EXPECT_EQ(lineStarting(text, "WINSRV2\\INST1"), "") << "INST1 runs only on the local machine";
}

TEST_F(DemoWorld, CopiesCarryValidTemplatesOfTheirReleaseAndStartablePrograms) {
  const std::pair<const char *, int> copies[] = {{"KXL8", 0x0A00}, {"KXL95", 0x0C00}, {"KXL101", 0x0D00}};
  for (const auto &[copy, release] : copies) {
    std::string base = std::string("C:\\Program Files\\ZAV\\") + copy;
    SCOPED_TRACE(base);
    for (int nodeType = 1; nodeType <= 5; ++nodeType) {
      std::vector<uint8_t> image;
      ASSERT_TRUE(readFileHead(base + "\\CFG\\" + dbmCfgTemplateName(nodeType), kDbmCfgSize + 1, image));
      EXPECT_EQ(image.size(), kDbmCfgSize);
      EXPECT_EQ(readU16(image, kDbmCfgOffsetNodeType), nodeType);
      EXPECT_EQ(readU16(image, kDbmCfgOffsetRelease) & 0x0F00, release);
      EXPECT_TRUE(dbmCfgChecksumValid(image));
    }
    std::vector<uint8_t> bytes;
    for (const char *file :
         {"\\msg\\en_US\\kxlinst.mo", "\\msg\\en_US\\KXLDBMIG.TXT", "\\misc\\kxlckupgrade.exe"})
      EXPECT_TRUE(readFileHead(base + file, 16, bytes)) << file;
    std::string host;
    ASSERT_TRUE(posix::hostPath(base + "\\bin\\kxlset.exe", host));
    struct stat st {};
    ASSERT_EQ(stat(host.c_str(), &st), 0);
    EXPECT_TRUE(st.st_mode & S_IXUSR) << "programs must be startable";
  }
  std::vector<uint8_t> bytes;
  EXPECT_TRUE(readFileHead("C:\\windows\\system32\\odbc32.dll", 16, bytes));
  EXPECT_FALSE(readFileHead("C:\\windows\\system32\\clusapi.dll", 16, bytes))
      << "the demo machine has no cluster";
}

TEST_F(DemoWorld, InstanceFilesFollowTheirReleases) {
  std::vector<uint8_t> image;
  ASSERT_TRUE(readFileHead("C:\\Program Files\\ZAV\\KXL8\\V8INST\\kxlsystm", kDbmCfgSize, image));
  EXPECT_EQ(image.size(), kDbmCfgSmallSize) << "the version-8 instance keeps the small layout";
  EXPECT_EQ(readU16(image, kDbmCfgOffsetRelease) & 0x0F00, 0x0A00);
  EXPECT_TRUE(dbmCfgChecksumValid(image));
  ASSERT_TRUE(readFileHead("C:\\Program Files\\ZAV\\KXL95\\INST2\\kxlsystm", kDbmCfgSize, image));
  EXPECT_EQ(readU16(image, kDbmCfgOffsetNodeType), 4);
  std::vector<uint8_t> nodes;
  ASSERT_TRUE(readFileHead("C:\\Program Files\\ZAV\\KXL95\\INST2\\kxlnodes.cfg", 4096, nodes));
  std::string text(nodes.begin(), nodes.end());
  EXPECT_NE(text.find("0 winsrv1.zav.test WINSRV1 0 \r\n"), std::string::npos) << text;
  EXPECT_NE(text.find("2 winsrv2.zav.test WINSRV2 1 \r\n"), std::string::npos) << text;
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

} // namespace
} // namespace kxlsim::test
