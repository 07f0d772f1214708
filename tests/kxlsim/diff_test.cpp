// Comparing worlds: equal worlds, added keys and their values both ways, and
// key paths, a new text file's lines. Changed values, files added, changed
// and removed, and other machines' keys are shown exactly by the end-to-end
// upgrades and the product library's demo-world cases.
#include "sim/kxlsim/diff.h"
#include "sim/kxlsim/snapshot.h"
#include "sim/kxlsim/world_reader.h"
#include "sim/kxlsim/world_writer.h"
#include "tests/support/scenario_world.h"
#include "tests/support/temp_world.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <sstream>

namespace kxlsim::test {
namespace {

// The demo world as built, and a copy of it for the case to change.
class WorldPair : public ::testing::Test {
protected:
  void SetUp() override {
    ASSERT_FALSE(copy_.root().empty());
    copy_.enter();
  }
  int diff(std::string &text, bool reversed = false) {
    std::ostringstream out;
    int rc = reversed ? diffWorlds(after_, before_, out) : diffWorlds(before_, after_, out);
    text = out.str();
    return rc;
  }
  const std::string before_ = kxltestsupport::scenarioWorld("demo");
  kxltestsupport::TempWorld copy_{"kxlsim-diff", kxltestsupport::CopyOf{before_}};
  const std::string after_ = copy_.root();
  WorldWriter w_;
};

TEST_F(WorldPair, ASnapshotEqualsItsWorldAndRefusesAnExistingTargetOrANonWorld) {
  std::string text, error;
  ASSERT_TRUE(snapshotWorld(after_, copy_.scratch("snapshot"), error)) << error;
  std::ostringstream out;
  EXPECT_EQ(diffWorlds(after_, copy_.scratch("snapshot"), out), 0);
  EXPECT_EQ(out.str(), "");
  EXPECT_EQ(diff(text), 0) << text;
  EXPECT_FALSE(snapshotWorld(after_, after_, error));
  EXPECT_FALSE(snapshotWorld(copy_.scratch("none"), copy_.scratch("copy"), error));
  EXPECT_EQ(diffWorlds(after_, copy_.scratch("none"), out), 2);
}

TEST_F(WorldPair, AddedKeysAndValuesShowInBothDirections) {
  w_.setString(localMachine(), "SOFTWARE\\ZAV\\KXL\\InstalledCopies\\KXL101\\PROFILES\\INST1", "KXLCOMM",
               "tcp");
  w_.setMultiString(currentUser(), "Software\\Test", "List", {"a", "b"});
  ASSERT_TRUE(w_.ok());
  std::string added, removed;
  EXPECT_EQ(diff(added), 1);
  EXPECT_EQ(added, R"(registry + HKLM\SOFTWARE\ZAV\KXL\InstalledCopies\KXL101\PROFILES\INST1
           + "KXLCOMM" = "tcp"
registry + HKCU\Software
registry + HKCU\Software\Test
           + "List" = multi:["a", "b"]
)");
  EXPECT_EQ(diff(removed, true), 1);
  std::replace(added.begin(), added.end(), '+', '-');
  EXPECT_EQ(removed, added);
}

// The end-to-end upgrades pin a new file by its size and hash only.
TEST_F(WorldPair, ANewSmallTextFileShowsItsLines) {
  w_.writeText("C:\\notes.log", "new\r\n");
  std::string text;
  EXPECT_EQ(diff(text), 1);
  EXPECT_EQ(text.rfind("file + C:\\notes.log (5 bytes, fnv ", 0), 0u) << text;
  EXPECT_EQ(text.substr(text.find(')')), ")\n       + new\n");
}

TEST(DisplayKeyPath, MachinesAreNamedAndRootsShortened) {
  const std::pair<const char *, const char *> rows[] = {
      {"HKEY_LOCAL_MACHINE\\SOFTWARE\\ZAV", "HKLM\\SOFTWARE\\ZAV"},
      {"HKEY_CURRENT_USER\\Software", "HKCU\\Software"},
      {"HKEY_LOCAL_MACHINE\\SOFTWARE\\ZAV\\KXLSIM\\Machines\\WINSRV2\\SOFTWARE\\ZAV\\KXL",
       "[WINSRV2] HKLM\\SOFTWARE\\ZAV\\KXL"},
      {"HKEY_LOCAL_MACHINE\\software\\zav\\kxlsim\\machines\\node3", "[node3] HKLM"},
      {"HKEY_LOCAL_MACHINE\\SOFTWARE\\ZAV\\KXLSIM\\Machines", "HKLM\\SOFTWARE\\ZAV\\KXLSIM\\Machines"}};
  for (const auto &[path, shown] : rows)
    EXPECT_EQ(displayKeyPath(path), shown);
}

} // namespace
} // namespace kxlsim::test
