// Facts of the instance configuration file ("kxlsystm") that the product
// library and the worlds kxlsim builds both rely on, kept in one place.
#pragma once

#include <cstddef>
#include <cstdint>
#include <vector>

namespace kxlsim {

// The stored checksum: the sum of the bytes after it (from 4 to the end).
inline uint32_t dbmCfgChecksum(const std::vector<uint8_t> &image) {
  uint32_t sum = 0;
  for (std::size_t i = 4; i < image.size(); ++i)
    sum += image[i];
  return sum;
}

// The template in a copy's "CFG" folder that an instance of node type 1 to 5
// is created from; nullptr for any other node type.
inline const char *dbmCfgTemplateName(long long nodeType) {
  static const char *const names[] = {"kxlsyssv", "kxlsysrq", "kxlsyssr", "kxlsysmp", "kxlsysst"};
  return nodeType >= 1 && nodeType <= 5 ? names[nodeType - 1] : nullptr;
}

} // namespace kxlsim
