// Facts of the instance configuration file ("kxlsystm") that the command, the
// product library and the worlds kxlsim builds all rely on, kept in one place.
#pragma once

#include <cstddef>
#include <cstdint>

// The layout: the current one and the legacy small one each end with the flag
// area, one byte per parameter index; the words below stand at the same place
// in both (little-endian).
inline constexpr uint32_t DBMCFG_IMAGE_SZ = 16384;
inline constexpr uint32_t DBMCFG_SMALL_SZ = 4096;
inline constexpr uint32_t DBMCFG_FLAG_AREA_SZ = 512;
inline constexpr uint32_t DBMCFG_RELEASE_OFFSET = 16;   // u16; the release code is bits 8-11
inline constexpr uint32_t DBMCFG_LEVEL_OFFSET = 20;     // u16
inline constexpr uint32_t DBMCFG_NODE_TYPE_OFFSET = 40; // u16, 1 to 5

// The stored checksum (the word at offset 0): the unsigned sum of the bytes
// after it, from offset 4 up to `size`.
inline uint32_t dbmCfgChecksum(const unsigned char *image, size_t size) {
  uint32_t sum = 0;
  for (size_t i = 4; i < size; ++i)
    sum += image[i];
  return sum;
}

// The template in a copy's "CFG" folder that an instance of node type 1 to 5
// is created from; nullptr for any other node type.
inline const char *dbmCfgTemplateName(long long nodeType) {
  static const char *const names[] = {"kxlsyssv", "kxlsysrq", "kxlsyssr", "kxlsysmp", "kxlsysst"};
  return nodeType >= 1 && nodeType <= 5 ? names[nodeType - 1] : nullptr;
}
