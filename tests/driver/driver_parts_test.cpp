// The driver's pure parts: which editions host which node types, and the SSL
// tool's argument block, which must never grow past its 781 bytes.
#include "NT/carryover.h"
#include "NT/editioncheck.h"
#include "NT/tools_run.h"

#include <gtest/gtest.h>

#include <cstring>
#include <string>
#include <vector>

namespace {

TEST(EditionCheck, EditionsAllowedPerNodeType) {
  const char *partitioned[] = {"HALDOR_EDITION", "haldor_prime_edition"};
  const char *serverOnly[] = {"VESTRA_SERVER", "MERIDA_EDITION", "TALVEN_EDITION"};
  for (const char *name : partitioned) {
    EXPECT_TRUE(editionHostsNodeType(name, 4)) << name;
    EXPECT_TRUE(editionHostsNodeType(name, 3)) << name;
    EXPECT_TRUE(editionHostsNodeType(name, 1)) << name;
  }
  for (const char *name : serverOnly) {
    EXPECT_FALSE(editionHostsNodeType(name, 4)) << name;
    EXPECT_TRUE(editionHostsNodeType(name, 3)) << name;
    EXPECT_TRUE(editionHostsNodeType(name, 1)) << name;
  }
  EXPECT_TRUE(editionHostsNodeType("Solent_Edition", 3));
  EXPECT_FALSE(editionHostsNodeType("SOLENT_EDITION", 1));
  EXPECT_FALSE(editionHostsNodeType("SOLENT_EDITION", 4));
  // Only whole names count.
  EXPECT_FALSE(editionHostsNodeType("HALDOR", 4));
  EXPECT_FALSE(editionHostsNodeType("HALDOR_EDITION_X", 4));
  EXPECT_FALSE(editionHostsNodeType("", 1));
  EXPECT_FALSE(editionHostsNodeType("CLIENT", 3));
}

TEST(EditionCheck, OtherNodeTypesAreNotChecked) {
  for (uint32_t type : {0u, 2u, 5u}) {
    EXPECT_FALSE(nodeTypeIsChecked(type));
    EXPECT_TRUE(editionHostsNodeType("CLIENT", type));
  }
  EXPECT_EQ(editionCheckProbe(4), 12u);
  EXPECT_EQ(editionCheckProbe(3), 15u);
  EXPECT_EQ(editionCheckProbe(1), 17u);
}

TEST(CarriedFiles, MissingFileOrFolderCountsAsCarried) {
  EXPECT_TRUE(carriedOrAbsent(0));
  EXPECT_TRUE(carriedOrAbsent(static_cast<int32_t>(0x860F000Au)));
  EXPECT_TRUE(carriedOrAbsent(static_cast<int32_t>(0x870F0011u)));
  EXPECT_TRUE(carriedOrAbsent(static_cast<int32_t>(0x870F000Au)));
  EXPECT_FALSE(carriedOrAbsent(static_cast<int32_t>(0x870F0004u)));
}

// The strings of an argument block, up to its empty string.
std::vector<std::string> blockStrings(const char *block, std::size_t size) {
  std::vector<std::string> strings;
  std::size_t at = 0;
  while (at < size && block[at] != '\0') {
    std::string text(block + at);
    strings.push_back(text);
    at += text.size() + 1;
  }
  return strings;
}

TEST(SslArguments, BlockHoldsToolFlagsAndQuotedFiles) {
  std::vector<char> block(kSslArgBlockSize, 'x');
  ASSERT_TRUE(buildSslArguments(block.data(), "C:\\K\\bin\\kxlimsslcfg.exe", "C:\\K\\INST1"));
  std::vector<std::string> expected = {"C:\\K\\bin\\kxlimsslcfg.exe", "-c",
                                       "\"C:\\K\\INST1\\SSLClientconfig.ini\"", "-s",
                                       "\"C:\\K\\INST1\\SSLconfig.ini\""};
  EXPECT_EQ(blockStrings(block.data(), block.size()), expected);
  // Zero filled behind the last string, so the block ends with an empty one.
  std::size_t used = 0;
  for (const std::string &text : expected)
    used += text.size() + 1;
  for (std::size_t i = used; i < block.size(); ++i)
    ASSERT_EQ(block[i], '\0') << i;
}

TEST(SslArguments, LongPathsAreRefusedWithoutWritingPastTheBlock) {
  std::string tool = "C:\\" + std::string(240, 't') + "\\bin\\kxlimsslcfg.exe";
  std::string longest = "C:\\" + std::string(257, 'd');
  std::vector<char> buffer(kSslArgBlockSize + 64, '#');
  EXPECT_FALSE(buildSslArguments(buffer.data(), tool.c_str(), longest.c_str()));
  for (std::size_t i = kSslArgBlockSize; i < buffer.size(); ++i)
    ASSERT_EQ(buffer[i], '#') << i;
  // The largest block that fits is built exactly.
  std::string fits = "C:\\" + std::string(200, 'd');
  EXPECT_TRUE(buildSslArguments(buffer.data(), tool.c_str(), fits.c_str()));
  EXPECT_EQ(blockStrings(buffer.data(), kSslArgBlockSize).size(), 5u);
}

} // namespace
