// Building kxlsystm images field by field, and a world holding a target and a
// saved source file for the conversion.
#pragma once

#include "tests/support/product_world.h"

#include <cstdint>
#include <string>
#include <vector>

namespace dbmtest {

using Bytes = std::vector<uint8_t>;

inline constexpr size_t kFull = 16384;
inline constexpr size_t kSmall = 4096;
inline constexpr uint32_t kFlags = 15872;

// An image with its release word, level word and node type set; sealed() adds
// the checksum (the byte sum from offset 4).
class Cfg {
public:
  Cfg(uint16_t nodeType, uint16_t release, uint16_t level = 8200, size_t size = kFull);
  Cfg &u16(uint32_t offset, uint16_t value);
  Cfg &u32(uint32_t offset, uint32_t value);
  Cfg &u64(uint32_t offset, uint64_t value);
  Cfg &f32(uint32_t offset, float value);
  Cfg &text(uint32_t offset, const std::string &value); // with its NUL
  Cfg &byte(uint32_t offset, uint8_t value);
  Bytes sealed() const;

private:
  Bytes bytes_;
};

uint32_t byteSum(const Bytes &bytes);
uint16_t r16(const Bytes &image, uint32_t offset);
uint32_t r32(const Bytes &image, uint32_t offset);
uint64_t r64(const Bytes &image, uint32_t offset);
float rf32(const Bytes &image, uint32_t offset);
std::string rtext(const Bytes &image, uint32_t offset);

// Flag area index of a parameter token as the platform gives it.
int32_t flagIndexOf(uint32_t token);

class DbmWorld : public kxltest::ProductWorld {
protected:
  static constexpr const char *kTarget = "C:\\dbm\\new\\kxlsystm";
  static constexpr const char *kSource = "C:\\dbm\\saved\\kxlsystm";

  void TearDown() override;
  static void put(const char *path, const Bytes &bytes);
  static Bytes get(const char *path);
  // Writes both files, converts, and gives the target's bytes afterwards.
  static int32_t convert(const Bytes &target, const Bytes &source, Bytes *result = nullptr);
};

} // namespace dbmtest
