// kxlsystm images built field by field and read back, for every area that
// writes or checks one; and a world holding a target and a saved source file
// for the conversion.
#pragma once

#include "NT/dbmcfg.h"
#include "tests/support/product_world.h"

#include <algorithm>
#include <bit>
#include <cstdint>
#include <cstdio>
#include <cstring>
#include <sstream>
#include <string>
#include <vector>

namespace dbmtest {

using Bytes = std::vector<uint8_t>;

inline constexpr size_t kFull = 16384;
inline constexpr size_t kSmall = 4096;
inline constexpr uint32_t kFlags = 15872;

// The checksum: the byte sum from offset 4.
inline uint32_t byteSum(const Bytes &bytes) {
  uint32_t sum = 0;
  for (size_t i = 4; i < bytes.size(); ++i)
    sum += bytes[i];
  return sum;
}

inline uint16_t r16(const Bytes &image, uint32_t at) {
  return uint16_t(image.at(at) | image.at(at + 1) << 8);
}
inline uint32_t r32(const Bytes &image, uint32_t at) {
  return r16(image, at) | uint32_t(r16(image, at + 2)) << 16;
}
inline uint64_t r64(const Bytes &image, uint32_t at) {
  return r32(image, at) | uint64_t(r32(image, at + 4)) << 32;
}
inline float rf32(const Bytes &image, uint32_t at) {
  return std::bit_cast<float>(r32(image, at));
}
inline std::string rtext(const Bytes &image, uint32_t at, size_t most = kFull) {
  const char *text = reinterpret_cast<const char *>(image.data() + at);
  return std::string(text, strnlen(text, most));
}

// The image's fields as `wanted` names them, in the same form: "h36=5000
// w3124=4096 f808=0.5 t458=NAME" for a 16-bit word, a 32-bit word, a float
// and a string ('_' for a blank) at their offsets; so that one comparison
// shows every field that differs from the expected list.
inline std::string fieldsAt(const Bytes &image, const std::string &wanted) {
  std::istringstream items(wanted);
  std::string item, out;
  while (items >> item) {
    uint32_t at = uint32_t(std::stoul(item.substr(1)));
    char number[32] = {};
    std::snprintf(number, sizeof number, "%g", double(rf32(image, at)));
    std::string value = item[0] == 'h'   ? std::to_string(r16(image, at))
                        : item[0] == 'w' ? std::to_string(r32(image, at))
                        : item[0] == 'f' ? std::string(number)
                                         : rtext(image, at);
    std::replace(value.begin(), value.end(), ' ', '_');
    out += (out.empty() ? "" : " ") + item.substr(0, item.find('=') + 1) + value;
  }
  return out;
}

// An image with its release word, level word and node type set; sealed()
// adds the checksum.
class Cfg {
public:
  Cfg(uint16_t nodeType, uint16_t release, uint16_t level = 8200, size_t size = kFull) : bytes_(size) {
    u16(16, release).u16(20, level).u16(40, nodeType);
  }
  Cfg &u16(uint32_t at, uint16_t value) { return byte(at, uint8_t(value)).byte(at + 1, uint8_t(value >> 8)); }
  Cfg &u32(uint32_t at, uint32_t value) {
    return u16(at, uint16_t(value)).u16(at + 2, uint16_t(value >> 16));
  }
  Cfg &u64(uint32_t at, uint64_t value) {
    return u32(at, uint32_t(value)).u32(at + 4, uint32_t(value >> 32));
  }
  Cfg &f32(uint32_t at, float value) { return u32(at, std::bit_cast<uint32_t>(value)); }
  Cfg &text(uint32_t at, const std::string &value) { // with its NUL
    std::memcpy(bytes_.data() + at, value.c_str(), value.size() + 1);
    return *this;
  }
  Cfg &byte(uint32_t at, uint8_t value) {
    bytes_.at(at) = value;
    return *this;
  }
  Bytes sealed() const {
    Bytes out = bytes_;
    uint32_t sum = byteSum(out);
    std::memcpy(out.data(), &sum, sizeof sum);
    return out;
  }

private:
  Bytes bytes_;
};

class DbmWorld : public kxltest::ProductWorld {
protected:
  static constexpr const char *kTarget = "C:\\dbm\\new\\kxlsystm";
  static constexpr const char *kSource = "C:\\dbm\\saved\\kxlsystm";

  void TearDown() override {
    sqlz_krcbp->partitionTable = nullptr;
    sqlz_krcbp->currentPartition = 0;
    sqlz_krcbp->partitionFlag = 0;
    sqloPutEnv(KXL_VAR_KXLEXTRAAGENTS, nullptr);
    ProductWorld::TearDown();
  }
  static Bytes get(const char *path) {
    Bytes bytes;
    readWholeFile(path, bytes);
    return bytes;
  }
  // Writes both files and converts with `faults` planned; the target's bytes
  // afterwards go to `result`. The source is only read.
  static int32_t convert(const Bytes &target, const Bytes &source, Bytes *result = nullptr,
                         const char *faults = nullptr) {
    writeFile(kTarget, target);
    writeFile(kSource, source);
    failCalls(faults);
    int32_t rc = upgradeDbmConfig(kTarget, kSource);
    failCalls(nullptr);
    if (result != nullptr)
      *result = get(kTarget);
    EXPECT_EQ(source, get(kSource)) << "the source is only read";
    return rc;
  }
};

} // namespace dbmtest
