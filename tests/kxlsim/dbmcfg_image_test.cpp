// Configuration images: layout words, checksums, and defaults that the
// configuration upgrade's range check leaves as they are.
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

TEST(DbmCfgImage, ReleaseOfEachCopyVersion) {
  EXPECT_EQ(dbmReleaseForVersion(8, 2).releaseWord, 0x0A00);
  EXPECT_EQ(dbmReleaseForVersion(9, 1).releaseWord, 0x0B00);
  EXPECT_EQ(dbmReleaseForVersion(9, 5).releaseWord, 0x0C00);
  EXPECT_EQ(dbmReleaseForVersion(9, 7).releaseWord, 0x0D00);
  EXPECT_EQ(dbmReleaseForVersion(10, 1).releaseWord, 0x0D00);
}

// A range rule of the configuration upgrade: a value in [lo, hi] or equal to
// `replacement` (or to `alsoKept`) is left alone.
struct RangeRule {
  uint16_t offset;
  int width; // 2 or 4
  bool isSigned;
  int64_t lo, hi, replacement, alsoKept;
};

int64_t fieldValue(const std::vector<uint8_t> &image, const RangeRule &rule) {
  if (rule.width == 2)
    return rule.isSigned ? int64_t(int16_t(readU16(image, rule.offset)))
                         : int64_t(readU16(image, rule.offset));
  return rule.isSigned ? int64_t(int32_t(readU32(image, rule.offset))) : int64_t(readU32(image, rule.offset));
}

float floatField(const std::vector<uint8_t> &image, size_t offset) {
  uint32_t bits = readU32(image, offset);
  float value;
  std::memcpy(&value, &bits, sizeof value);
  return value;
}

constexpr int64_t kNone = INT64_MIN;

const RangeRule kServerRules[] = {
    {36, 2, false, 4096, 65535, 32767, kNone},
    {44, 2, false, 1, 256, 8, kNone},
    {62, 2, false, 1, 6, 2, kNone},
    {64, 4, false, 250, 0x7FFFFFFF, 0, kNone},
    {68, 4, false, 8, 16384, 1024, kNone},
    {72, 4, false, 8, 16384, 1024, kNone},
    {1074, 2, false, 1, 60000, 66, kNone},
    {1106, 2, false, 1, 60000, 180, kNone},
    {1936, 4, true, 10, 256, 20, kNone},
    {1932, 4, true, 4, 1000, 256, kNone},
    {88, 4, false, 1, 524288, 15, kNone},
    {1948, 4, false, 1, 524288, kNone, kNone},
    {96, 2, false, 0, 1, 1, kNone},
    {98, 2, true, 0, 6, -1, kNone},
    {812, 4, true, 2, 524288, 1000, kNone},
    {796, 2, false, 16, 60000, 128, kNone},
    {798, 2, false, 0, 127, 64, kNone},
    {794, 2, false, 0, 1, 1, kNone},
    {1034, 2, false, 0, 4, 3, kNone},
    {800, 4, false, 32, 112000, 32, kNone},
    {804, 4, true, 32, 112000, 20000, -1},
    {1038, 2, false, 8, 1000, 16, kNone},
    {816, 2, false, 100, 32768, 16000, kNone},
    {1930, 2, false, 0, 12, 0, kNone},
    {1940, 2, false, 1, 1, 1, kNone},
    {24, 4, true, 1, 32767, -1, kNone},
    {38, 2, true, 0, 1, 0, kNone},
    {76, 4, false, 0, 0, 0, kNone},
    {80, 4, false, 0, 0, 0, kNone},
    {3088, 4, true, 0, 64000, 100, kNone},
    {3080, 4, false, 0, 64000, 0, kNone},
    {3084, 4, true, 0, 64000, 200, kNone},
    {92, 4, true, 0, 64000, -1, kNone},
    {3456, 4, true, 1, 8, 1, kNone},
    {10908, 4, true, 1, 8, 1, kNone},
    {3092, 4, false, 895, 524288, 1024, kNone},
    {3460, 4, false, 128, 524288, 256, kNone},
    {3096, 4, false, 128, 524288, 256, kNone},
    {3100, 4, true, 128, 524288, -1, kNone},
    {3104, 4, true, 128, 524288, -1, kNone},
    {3118, 2, false, 1, 1440, 10, kNone},
    {3124, 4, true, 0, 524288, 2048, kNone},
    {32, 4, true, 0, 65000, 0, kNone},
    {46, 2, false, 0, 1, 1, kNone},
    {1944, 4, true, 0, 64000, 0, kNone},
    {50, 2, true, 0, 1, 0, kNone},
    {1126, 2, true, 0, 1, 0, kNone},
    {86, 2, true, 0, 1, 0, kNone},
};

void expectKept(const std::vector<uint8_t> &image, const RangeRule &rule) {
  int64_t v = fieldValue(image, rule);
  EXPECT_TRUE((v >= rule.lo && v <= rule.hi) || v == rule.replacement || v == rule.alsoKept)
      << "offset " << rule.offset << " value " << v;
}

TEST(DbmCfgImage, ServerTemplatesPassTheRangeCheckUnchanged) {
  for (int nodeType : {1, 3, 4, 5}) {
    SCOPED_TRACE("node type " + std::to_string(nodeType));
    std::vector<uint8_t> image = makeDbmCfgImage(nodeType, kDbmReleaseV101);
    for (const RangeRule &rule : kServerRules)
      expectKept(image, rule);
    float cpu = floatField(image, 808);
    EXPECT_TRUE(cpu >= 1e-10f && cpu <= 1.0f);
    if (nodeType == 4) {
      EXPECT_LE(readU16(image, 3112), 100);
      EXPECT_LE(readU16(image, 3114), 100);
      EXPECT_GE(readU16(image, 3116), 1);
      EXPECT_LE(readU16(image, 3116), 1440);
      EXPECT_GE(floatField(image, 3120), 0.1f);
      EXPECT_LE(floatField(image, 3120), 100000.0f);
    } else {
      for (size_t offset : {3112, 3114, 3116})
        EXPECT_EQ(readU16(image, offset), 0) << offset;
      EXPECT_EQ(readU32(image, 3120), 0u);
      EXPECT_EQ(readU32(image, 3464), 0u);
    }
  }
}

TEST(DbmCfgImage, ClientTemplateHasServerValuesCleared) {
  std::vector<uint8_t> image = makeDbmCfgImage(2, kDbmReleaseV101);
  for (size_t offset : {44, 62, 1074, 1106, 96, 98, 1038, 816, 1940, 38, 3112, 3114, 3116, 3118, 50, 1126})
    EXPECT_EQ(readU16(image, offset), 0) << offset;
  for (size_t offset : {64,   68, 72,   1936,  1932, 88,   812,  808,  800,  804,  24, 3088, 3080,
                        3084, 92, 3456, 10908, 3092, 3460, 3096, 3100, 3104, 3120, 32, 1944, 3464})
    EXPECT_EQ(readU32(image, offset), 0u) << offset;
  EXPECT_EQ(readU16(image, 798), 64);
  EXPECT_GE(readU16(image, 36), 4096);
}

} // namespace
} // namespace kxlsim
