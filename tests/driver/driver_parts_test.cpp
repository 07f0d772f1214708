// The driver's pure parts: which editions host which node types, and the SSL
// tool's argument block, which must never grow past its 781 bytes.
#include "NT/editioncheck.h"
#include "NT/tools_run.h"

#include <gtest/gtest.h>

#include <cstring>
#include <string>
#include <vector>

namespace {

// Which of the checked node types 4, 3 and 1 each edition hosts; only whole
// names count, in any case. Other node types are not checked.
TEST(EditionCheck, EditionsAllowedPerNodeType) {
  // "EDITION=the digits of the node types it hosts"
  for (std::string row :
       {"HALDOR_EDITION=431", "haldor_prime_edition=431", "VESTRA_SERVER=31", "MERIDA_EDITION=31",
        "TALVEN_EDITION=31", "Solent_Edition=3", "HALDOR=", "HALDOR_EDITION_X=", "=", "CLIENT="}) {
    std::string edition = row.substr(0, row.find('=')), hosts = row.substr(row.find('=') + 1);
    for (uint32_t type : {4u, 3u, 1u})
      EXPECT_EQ(hosts.find(char('0' + type)) != std::string::npos,
                editionHostsNodeType(edition.c_str(), type))
          << row << " " << type;
  }
  for (uint32_t type : {0u, 2u, 5u}) {
    EXPECT_FALSE(nodeTypeIsChecked(type));
    EXPECT_TRUE(editionHostsNodeType("CLIENT", type));
  }
}

// The strings of an argument block, up to its empty string, and what follows it.
std::vector<std::string> blockStrings(const char *block, std::size_t size, std::string *rest = nullptr) {
  std::vector<std::string> strings;
  std::size_t at = 0;
  for (; at < size && block[at] != '\0'; at += strings.back().size() + 1)
    strings.emplace_back(block + at);
  if (rest != nullptr)
    *rest = std::string(block + at, size - at);
  return strings;
}

TEST(SslArguments, BlockHoldsToolFlagsAndQuotedFiles) {
  std::vector<char> block(kSslArgBlockSize, 'x');
  ASSERT_TRUE(buildSslArguments(block.data(), "C:\\K\\bin\\kxlimsslcfg.exe", "C:\\K\\INST1"));
  std::vector<std::string> expected = {"C:\\K\\bin\\kxlimsslcfg.exe", "-c",
                                       "\"C:\\K\\INST1\\SSLClientconfig.ini\"", "-s",
                                       "\"C:\\K\\INST1\\SSLconfig.ini\""};
  std::string rest;
  EXPECT_EQ(blockStrings(block.data(), block.size(), &rest), expected);
  EXPECT_EQ(rest, std::string(rest.size(), '\0')) << "zero filled behind the last string";
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
