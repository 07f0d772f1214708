// Building worlds: the demo world as the command will see it, and what
// `show` reports of it.
#include "world_fixture.h"

#include "sim/kxlsim/dbmcfg_image.h"
#include "sim/kxlsim/show.h"
#include "sim/kxlsim/world_reader.h"
#include "sim/posix/world.h"

#include <sys/stat.h>

#include <filesystem>
#include <sstream>

namespace kxlsim::test {
namespace {

class DemoWorld : public ::testing::Test {
protected:
  void SetUp() override { world_ = sharedDemoWorld(); }
  std::string world_;
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
  std::string v8 = lineStarting(text, "KXLV8 ");
  EXPECT_NE(v8.find("8.2"), std::string::npos) << text;
  EXPECT_NE(v8.find("C:\\Program Files\\ZAV\\KXL8"), std::string::npos);
  EXPECT_NE(lineStarting(text, "KXL95 ").find("9.5"), std::string::npos) << text;
  EXPECT_NE(lineStarting(text, "KXL101 ").find("10.1"), std::string::npos) << text;

  std::string inst2 = lineStarting(text, "INST2 ");
  EXPECT_NE(inst2.find("copy KXL95"), std::string::npos) << text;
  EXPECT_NE(inst2.find("node type 4"), std::string::npos) << text;
  EXPECT_NE(inst2.find("C:\\Program Files\\ZAV\\KXL95\\INST2"), std::string::npos);
  EXPECT_NE(lineStarting(text, "INST1 ").find("node type 1"), std::string::npos) << text;
  EXPECT_NE(lineStarting(text, "V8INST ").find("copy KXLV8"), std::string::npos) << text;

  EXPECT_NE(lineStarting(text, "INST2-0 ").find("start 2 state 1"), std::string::npos) << text;
  EXPECT_NE(lineStarting(text, "WINSRV2\\INST2-1 ").find("KXL95\\bin\\kxlsyscs.exe"), std::string::npos)
      << text;
  EXPECT_NE(lineStarting(text, "WINSRV2\\INST2-2 "), "") << text;
  EXPECT_EQ(lineStarting(text, "WINSRV2\\INST1"), "") << "INST1 runs only on the local machine";

  EXPECT_NE(lineStarting(text, "WINSRV1 ").find("(local)"), std::string::npos) << text;
  EXPECT_NE(lineStarting(text, "WINSRV2 ").find("winsrv2.zav.test"), std::string::npos) << text;
}

TEST_F(DemoWorld, RegistryHoldsCopiesProfilesAndInstallerRegistrations) {
  RegTarget lm = localMachine();
  EXPECT_EQ(stringValue(lm, "SOFTWARE\\ZAV\\KXL\\CurrentVersion", "Version"), "8");
  EXPECT_EQ(stringValue(lm, "SOFTWARE\\ZAV\\KXL\\InstalledCopies\\KXL95", "KXL Path Name"),
            "C:\\Program Files\\ZAV\\KXL95");
  EXPECT_EQ(stringValue(lm, "SOFTWARE\\ZAV\\KXL\\InstalledCopies\\KXL95\\CurrentVersion", "Fix Level"), "3");
  EXPECT_TRUE(keyExists(lm, "SOFTWARE\\ZAV\\KXL\\PROFILES\\V8INST"));
  EXPECT_TRUE(keyExists(lm, "SOFTWARE\\ZAV\\KXL\\InstalledCopies\\KXL95\\PROFILES\\INST1"));
  EXPECT_EQ(stringValue(lm, "SOFTWARE\\ZAV\\KXL\\InstalledCopies\\KXL101\\GLOBAL_PROFILE", "KXLPATH"),
            "C:\\Program Files\\ZAV\\KXL101");
  EXPECT_EQ(stringValue(lm, "SOFTWARE\\ZAV\\KXLSIM\\Instances\\V8INST", "Copy"), "");
  // The installer's own keys, under the packed form of the server's product
  // code {6E1C2A40-9F3B-4D21-8A11-5B2C7D0E9A01}.
  EXPECT_TRUE(keyExists(lm, "SOFTWARE\\Classes\\Installer\\Products\\04A2C1E6B3F912D4A811B5C2D7E0A910"));
  const std::string properties =
      "SOFTWARE\\Microsoft\\Windows\\CurrentVersion\\Installer\\UserData\\S-1-5-18\\"
      "Products\\04A2C1E6B3F912D4A811B5C2D7E0A910\\InstallProperties";
  EXPECT_EQ(stringValue(lm, properties, "InstallLocation"), "C:\\Program Files\\ZAV\\KXL101\\");
  EXPECT_EQ(dwordValue(lm, properties, "WindowsInstaller", 0), 1u);

  RegTarget remote = remoteMachine("WINSRV2");
  EXPECT_EQ(
      stringValue(remote, "SOFTWARE\\ZAV\\KXL\\InstalledCopies\\KXL95\\PROFILES\\INST2", "KXLPORTRANGE"),
      "60000:60003");
  EXPECT_EQ(stringValue(remote, "SOFTWARE\\ZAV\\KXL\\InstalledCopies\\KXL101\\GLOBAL_PROFILE", "KXLPATH"),
            "C:\\Program Files\\ZAV\\KXL101");
  EXPECT_EQ(dwordValue(remote, "SOFTWARE\\ZAV\\KXLSIM\\Services\\INST2-1", "State", 0), 1u);
  EXPECT_FALSE(keyExists(lm, "SOFTWARE\\ZAV\\KXLSIM\\Services\\INST2-1"));
  EXPECT_EQ(dwordValue(lm, "SOFTWARE\\ZAV\\KXLSIM\\Identity", "LocalAdmin", 0) & 0x14u, 0x14u);
}

TEST_F(DemoWorld, CopiesCarryTemplatesMarkersCatalogsAndPrograms) {
  for (const char *copy : {"KXL8", "KXL95", "KXL101"}) {
    std::string base = std::string("C:\\Program Files\\ZAV\\") + copy;
    SCOPED_TRACE(base);
    for (int nodeType = 1; nodeType <= 5; ++nodeType) {
      std::vector<uint8_t> image;
      ASSERT_TRUE(readFileHead(base + "\\CFG\\" + dbmCfgTemplateName(nodeType), kDbmCfgSize + 1, image));
      EXPECT_EQ(image.size(), kDbmCfgSize);
      EXPECT_EQ(readU16(image, kDbmCfgOffsetNodeType), nodeType);
      EXPECT_TRUE(dbmCfgChecksumValid(image));
    }
    std::vector<uint8_t> bytes;
    EXPECT_TRUE(readFileHead(base + "\\msg\\en_US\\kxlinst.mo", 16, bytes));
    EXPECT_TRUE(readFileHead(base + "\\msg\\en_US\\KXLDBMIG.TXT", 16, bytes));
    EXPECT_TRUE(readFileHead(base + "\\misc\\kxlckupgrade.exe", 16, bytes));
    std::string host;
    ASSERT_TRUE(posix::hostPath(base + "\\bin\\kxlset.exe", host));
    struct stat st {};
    ASSERT_EQ(stat(host.c_str(), &st), 0);
    EXPECT_TRUE(st.st_mode & S_IXUSR) << "programs must be startable";
  }
  std::vector<uint8_t> bytes;
  EXPECT_TRUE(readFileHead("C:\\Program Files\\ZAV\\KXL101\\cfg\\kxlhpe.lvl", 16, bytes));
  EXPECT_TRUE(readFileHead("C:\\windows\\system32\\odbc32.dll", 16, bytes));
  EXPECT_FALSE(readFileHead("C:\\windows\\system32\\clusapi.dll", 16, bytes));
  // The templates of each copy are of its own release.
  std::vector<uint8_t> image;
  ASSERT_TRUE(readFileHead("C:\\Program Files\\ZAV\\KXL95\\CFG\\kxlsyssv", kDbmCfgSize, image));
  EXPECT_EQ(readU16(image, kDbmCfgOffsetRelease) & 0x0F00, 0x0C00);
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

TEST_F(TempDirTest, EmptyWorldHasAMachineButNoCopies) {
  makeWorld("empty", "empty");
  std::ostringstream out;
  showWorld(out);
  std::string text = out.str();
  EXPECT_NE(text.find("Copies:\nInstances:\nServices:\nMachines:\n"), std::string::npos) << text;
  EXPECT_NE(text.find("WINSRV1"), std::string::npos);
}

TEST_F(TempDirTest, CreateRefusesAnExistingWorldAndUnknownScenarios) {
  makeWorld("w", "empty");
  std::vector<std::string> errors;
  EXPECT_FALSE(createWorld(path("w"), "empty", buildSources(), errors));
  ASSERT_FALSE(errors.empty());
  EXPECT_NE(errors[0].find("holds a world already"), std::string::npos);
  errors.clear();
  EXPECT_FALSE(createWorld(path("x"), "no-such-scenario", buildSources(), errors));
  EXPECT_FALSE(std::filesystem::exists(path("x")));
}

} // namespace
} // namespace kxlsim::test
