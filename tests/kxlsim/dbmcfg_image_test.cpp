// Configuration images: layout words and checksums of every node type and
// release, in both layouts.
#include "sim/kxlsim/dbmcfg_image.h"

#include <gtest/gtest.h>

#include <cstring>

namespace kxlsim {
namespace {

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
} // namespace kxlsim
