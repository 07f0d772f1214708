// Paths as the run forms them: long-name expansion and joining.
#include "NT/pathjoin.h"
#include "tests/support/product_world.h"

#include <string>

namespace {

using PathsTest = kxltest::ProductWorld;

std::string expanded(const char *path, std::size_t size = SQLO_PATH_SZ) {
  char out[SQLO_PATH_SZ + 8];
  std::memset(out, 'Z', sizeof out);
  expandLongPath(path, out, size);
  EXPECT_EQ(out[size], 'Z') << "nothing written past the buffer";
  return out;
}

TEST_F(PathsTest, ExistingComponentsTakeTheirStoredSpelling) {
  makeDirectories("C:\\Data\\Profiles\\INST1");
  EXPECT_EQ(expanded("c:\\data\\PROFILES\\inst1"), "c:\\Data\\Profiles\\INST1") << "the drive stays as given";
  EXPECT_EQ(expanded("C:\\DATA\\missing\\PROFILES"), "C:\\Data\\missing\\PROFILES")
      << "from the first missing component on the text stays as given";
  EXPECT_EQ(expanded("C:\\data\\profiles\\"), "C:\\Data\\Profiles\\");
  EXPECT_EQ(expanded("relative\\data"), "relative\\data");
  EXPECT_EQ(expanded("\\\\SERVER\\SHARE\\dir"), "\\\\SERVER\\SHARE\\dir") << "an unreachable share is kept";
  EXPECT_EQ(expanded(""), "");
  EXPECT_EQ(expanded("c:\\data\\profiles", 8), "c:\\Data");
}

TEST_F(PathsTest, JoiningKeepsQuotesAndBounds) {
  char path[KXL_JOINED_PATH_SZ + 8];
  joinPath(path, "C:\\inst", "\\kxlnodes.cfg");
  EXPECT_STREQ(path, "C:\\inst\\kxlnodes.cfg");
  joinPath(path, "C:\\inst", "CFG");
  EXPECT_STREQ(path, "C:\\inst\\CFG");
  joinPath(path, "\"C:\\my inst\"", "\\function");
  EXPECT_STREQ(path, "\"C:\\my inst\\function\"");

  std::memset(path, 'Z', sizeof path);
  std::string longDir = "\"C:\\" + std::string(254, 'd') + "\"";
  joinPath(path, longDir.c_str(), "\\kxlsystm");
  EXPECT_EQ(std::strlen(path), KXL_JOINED_PATH_SZ - 1) << "cut at 260 characters, no room for the quote";
  EXPECT_EQ(path[KXL_JOINED_PATH_SZ], 'Z');
  EXPECT_NE(path[KXL_JOINED_PATH_SZ - 2], '"');
}

} // namespace
