// Configuration images: layout words and checksums of every node type and
// release, in both layouts.
#include "sim/kxlsim/dbmcfg_image.h"

#include <gtest/gtest.h>

#include <cstring>

namespace kxlsim {
namespace {

const DbmRelease kReleases[] = {kDbmReleaseV8, kDbmReleaseV91, kDbmReleaseV95, kDbmReleaseV101};

TEST(DbmCfgImage, EveryNodeTypeAndReleaseHasItsWordsAndAValidChecksum) {
  for (DbmRelease release : kReleases) {
    for (int nodeType = 1; nodeType <= 5; ++nodeType) {
      for (bool small : {false, true}) {
        std::vector<uint8_t> image = makeDbmCfgImage(nodeType, release, small);
        SCOPED_TRACE("node type " + std::to_string(nodeType) + (small ? " small" : ""));
        ASSERT_EQ(image.size(), small ? kDbmCfgSmallSize : kDbmCfgSize);
        EXPECT_EQ(readU16(image, 40), nodeType);
        EXPECT_EQ(readU16(image, 16) & 0x0F00, release.releaseWord);
        EXPECT_EQ(readU16(image, 20), release.level);
        uint32_t sum = 0;
        for (size_t i = 4; i < image.size(); ++i)
          sum += image[i];
        EXPECT_EQ(readU32(image, 0), sum);
        EXPECT_TRUE(dbmCfgChecksumValid(image));
      }
    }
  }
}

TEST(DbmCfgImage, ChecksumNoticesAChangedByteUntilResealed) {
  std::vector<uint8_t> image = makeDbmCfgImage(4, kDbmReleaseV101);
  image[15000] ^= 0x5A;
  EXPECT_FALSE(dbmCfgChecksumValid(image));
  dbmCfgSealChecksum(image);
  EXPECT_TRUE(dbmCfgChecksumValid(image));
  // The checksum field itself is not summed.
  image[1] ^= 0xFF;
  dbmCfgSealChecksum(image);
  EXPECT_TRUE(dbmCfgChecksumValid(image));
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
