#include "sim/kxlsim/dbmcfg_image.h"

#include <cstring>

namespace kxlsim {

namespace {

enum Applies : uint8_t { kAll, kPartitionedOnly };

// Default parameter values of a fresh file. Each lies inside the range the
// configuration upgrade enforces, so a template passes through it unchanged.
struct DefaultValue {
  uint16_t offset;
  uint8_t width; // 2 or 4 bytes
  uint32_t value;
  Applies applies;
};

constexpr uint32_t kMinusOne = 0xFFFFFFFFu;
constexpr uint32_t kCpuMeasureBits = 0x3827C5ACu; // 4e-5 as f32
constexpr uint32_t kBandwidthBits = 0x3FA00000u;  // 1.25 as f32

constexpr DefaultValue kServerDefaults[] = {
    {44, 2, 8, kAll},
    {62, 2, 2, kAll},
    {68, 4, 1024, kAll},
    {72, 4, 1024, kAll},
    {1074, 2, 66, kAll},
    {1106, 2, 180, kAll},
    {1936, 4, 20, kAll},
    {1932, 4, 256, kAll},
    {88, 4, 4096, kAll},
    {1948, 4, 4096, kAll},
    {96, 2, 1, kAll},
    {98, 2, 0xFFFF, kAll},
    {812, 4, 1000, kAll},

    {808, 4, kCpuMeasureBits, kAll},
    {800, 4, 32, kAll},
    {804, 4, kMinusOne, kAll},
    {1038, 2, 16, kAll},
    {816, 2, 16000, kAll},
    {1940, 2, 1, kAll},
    {24, 4, kMinusOne, kAll},
    {3088, 4, 100, kAll},
    {3084, 4, 200, kAll},
    {92, 4, kMinusOne, kAll},
    {3456, 4, 1, kAll},
    {10908, 4, 1, kAll},
    {3092, 4, 1024, kAll},
    {3460, 4, 256, kAll},
    {3096, 4, 256, kAll},
    {3100, 4, kMinusOne, kAll},
    {3104, 4, kMinusOne, kAll},
    {3118, 2, 10, kAll},
    {3112, 2, 10, kPartitionedOnly},
    {3114, 2, 5, kPartitionedOnly},
    {3116, 2, 60, kPartitionedOnly},
    {3120, 4, kBandwidthBits, kPartitionedOnly},
};

// Values every node type keeps, the client type included.
constexpr DefaultValue kCommonDefaults[] = {
    {36, 2, 8192, kAll}, {796, 2, 128, kAll}, {798, 2, 64, kAll},
    {794, 2, 1, kAll},   {1034, 2, 3, kAll},  {3124, 4, 2048, kAll},
};

void applyDefaults(std::vector<uint8_t> &image, const DefaultValue *first, const DefaultValue *last,
                   bool partitioned) {
  for (const DefaultValue *d = first; d != last; ++d) {
    if (d->applies == kPartitionedOnly && !partitioned)
      continue;
    if (size_t(d->offset) + d->width > image.size() - kDbmCfgFlagAreaSize)
      continue; // not part of the small layout
    if (d->width == 2)
      writeU16(image, d->offset, uint16_t(d->value));
    else
      writeU32(image, d->offset, d->value);
  }
}

} // namespace

DbmRelease dbmReleaseForVersion(int version, int release) {
  if (version < 9)
    return kDbmReleaseV8;
  if (version == 9 && release < 5)
    return kDbmReleaseV91;
  if (version == 9 && release < 7)
    return kDbmReleaseV95;
  return kDbmReleaseV101;
}

uint16_t readU16(const std::vector<uint8_t> &image, size_t offset) {
  if (offset + 2 > image.size())
    return 0;
  return uint16_t(image[offset] | (image[offset + 1] << 8));
}

void writeU16(std::vector<uint8_t> &image, size_t offset, uint16_t value) {
  if (offset + 2 > image.size())
    return;
  image[offset] = uint8_t(value);
  image[offset + 1] = uint8_t(value >> 8);
}

void writeU32(std::vector<uint8_t> &image, size_t offset, uint32_t value) {
  if (offset + 4 > image.size())
    return;
  for (int i = 0; i < 4; ++i)
    image[offset + i] = uint8_t(value >> (8 * i));
}

void dbmCfgSealChecksum(std::vector<uint8_t> &image) {
  writeU32(image, kDbmCfgOffsetChecksum, dbmCfgChecksum(image.data(), image.size()));
}

std::vector<uint8_t> makeDbmCfgImage(int nodeType, DbmRelease release, bool small) {
  std::vector<uint8_t> image(small ? kDbmCfgSmallSize : kDbmCfgSize, 0);
  writeU16(image, kDbmCfgOffsetRelease, release.releaseWord);
  writeU16(image, kDbmCfgOffsetLevel, release.level);
  writeU16(image, kDbmCfgOffsetNodeType, uint16_t(nodeType));
  applyDefaults(image, std::begin(kCommonDefaults), std::end(kCommonDefaults), false);
  if (nodeType != 2)
    applyDefaults(image, std::begin(kServerDefaults), std::end(kServerDefaults), nodeType == 4);
  dbmCfgSealChecksum(image);
  return image;
}

} // namespace kxlsim
