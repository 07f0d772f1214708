#include "tests/dbmcfg/cfgimage.h"

#include "NT/dbmcfg.h"

#include <bit>
#include <cstring>

namespace dbmtest {

Cfg::Cfg(uint16_t nodeType, uint16_t release, uint16_t level, size_t size) : bytes_(size) {
  u16(16, release).u16(20, level).u16(40, nodeType);
}

Cfg &Cfg::u16(uint32_t offset, uint16_t value) {
  bytes_[offset] = uint8_t(value);
  bytes_[offset + 1] = uint8_t(value >> 8);
  return *this;
}

Cfg &Cfg::u32(uint32_t offset, uint32_t value) {
  return u16(offset, uint16_t(value)).u16(offset + 2, uint16_t(value >> 16));
}

Cfg &Cfg::u64(uint32_t offset, uint64_t value) {
  return u32(offset, uint32_t(value)).u32(offset + 4, uint32_t(value >> 32));
}

Cfg &Cfg::f32(uint32_t offset, float value) {
  return u32(offset, std::bit_cast<uint32_t>(value));
}

Cfg &Cfg::text(uint32_t offset, const std::string &value) {
  std::memcpy(bytes_.data() + offset, value.c_str(), value.size() + 1);
  return *this;
}

Cfg &Cfg::byte(uint32_t offset, uint8_t value) {
  bytes_[offset] = value;
  return *this;
}

Bytes Cfg::sealed() const {
  Bytes out = bytes_;
  uint32_t sum = byteSum(out);
  for (int i = 0; i < 4; ++i)
    out[i] = uint8_t(sum >> (8 * i));
  return out;
}

uint32_t byteSum(const Bytes &bytes) {
  uint32_t sum = 0;
  for (size_t i = 4; i < bytes.size(); ++i)
    sum += bytes[i];
  return sum;
}

uint16_t r16(const Bytes &image, uint32_t offset) {
  return uint16_t(image.at(offset) | image.at(offset + 1) << 8);
}
uint32_t r32(const Bytes &image, uint32_t offset) {
  return r16(image, offset) | uint32_t(r16(image, offset + 2)) << 16;
}
uint64_t r64(const Bytes &image, uint32_t offset) {
  return r32(image, offset) | uint64_t(r32(image, offset + 4)) << 32;
}
float rf32(const Bytes &image, uint32_t offset) {
  return std::bit_cast<float>(r32(image, offset));
}
std::string rtext(const Bytes &image, uint32_t offset) {
  return std::string(reinterpret_cast<const char *>(image.data() + offset));
}

int32_t flagIndexOf(uint32_t token) {
  SQLF_PARAM_INFO info{};
  int32_t index = -1;
  EXPECT_EQ(0, sqlf_get_param_info(token, 0, &info, &index));
  return index;
}

void DbmWorld::TearDown() {
  sqlz_krcbp->partitionTable = nullptr;
  sqlz_krcbp->currentPartition = 0;
  sqlz_krcbp->partitionFlag = 0;
  sqloPutEnv(KXL_VAR_KXLEXTRAAGENTS, nullptr);
  ProductWorld::TearDown();
}

void DbmWorld::put(const char *path, const Bytes &bytes) {
  writeFile(path, bytes);
}

Bytes DbmWorld::get(const char *path) {
  Bytes bytes;
  readWholeFile(path, bytes);
  return bytes;
}

int32_t DbmWorld::convert(const Bytes &target, const Bytes &source, Bytes *result) {
  put(kTarget, target);
  put(kSource, source);
  int32_t rc = upgradeDbmConfig(kTarget, kSource);
  if (result != nullptr)
    *result = get(kTarget);
  EXPECT_EQ(source, get(kSource)) << "the source is only read";
  return rc;
}

} // namespace dbmtest
