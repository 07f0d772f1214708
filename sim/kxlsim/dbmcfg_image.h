// The binary database manager configuration file "kxlsystm": layout helpers
// and the default images a copy ships as its per-node-type templates.
//
// Layout (little-endian): u32 checksum at 0 (sum of the bytes from 4 to the
// end), u16 release word at 16 (release code in bits 8-11), u16 level word at
// 20, u16 node type at 40, parameter values up to the 512-byte flag area at
// the end. The current layout is 16384 bytes; the legacy small layout is 4096
// bytes with its flag area at 3584.
#pragma once

#include "platform/dbmcfgfile.h"

#include <cstddef>
#include <cstdint>
#include <vector>

namespace kxlsim {

inline constexpr size_t kDbmCfgSize = DBMCFG_IMAGE_SZ;
inline constexpr size_t kDbmCfgSmallSize = DBMCFG_SMALL_SZ;
inline constexpr size_t kDbmCfgFlagAreaSize = DBMCFG_FLAG_AREA_SZ;
inline constexpr size_t kDbmCfgOffsetChecksum = 0;
inline constexpr size_t kDbmCfgOffsetRelease = DBMCFG_RELEASE_OFFSET;
inline constexpr size_t kDbmCfgOffsetLevel = DBMCFG_LEVEL_OFFSET;
inline constexpr size_t kDbmCfgOffsetNodeType = DBMCFG_NODE_TYPE_OFFSET;

// Release codes (bits 8-11 of the release word) of the releases that write
// the file, and their level words.
struct DbmRelease {
  uint16_t releaseWord;
  uint16_t level;
};
inline constexpr DbmRelease kDbmReleaseV8{0x0A00, 8102};
inline constexpr DbmRelease kDbmReleaseV91{0x0B00, 9100};
inline constexpr DbmRelease kDbmReleaseV95{0x0C00, 9500};
inline constexpr DbmRelease kDbmReleaseV101{0x0D00, 10100};

// The release whose files a copy of that version writes (8 -> v8, 9.1, 9.5,
// 9.7 and later -> the newest code).
DbmRelease dbmReleaseForVersion(int version, int release);

uint16_t readU16(const std::vector<uint8_t> &image, size_t offset);
void writeU16(std::vector<uint8_t> &image, size_t offset, uint16_t value);
void writeU32(std::vector<uint8_t> &image, size_t offset, uint32_t value);

// Stores the image's checksum.
void dbmCfgSealChecksum(std::vector<uint8_t> &image);

// A complete, sealed image for a node type 1..5 with in-range defaults
// (server values cleared for node type 2). `small` gives the 4096-byte layout.
std::vector<uint8_t> makeDbmCfgImage(int nodeType, DbmRelease release, bool small = false);

} // namespace kxlsim
