// Configuration parameters of the database manager configuration file
// "kxlsystm": where a parameter lives, and updates of the current instance's
// file. The file is 16384 bytes: checksum at 0 (unsigned 32-bit sum of the
// bytes from 4 to the end), parameter values, and the 512-byte flag area at
// 15872 with one byte per parameter index.
#include "platform/dbmcfgfile.h"
#include "platform/kxlsys.h"
#include "sim/common/simfail.h"
#include "sim/product/simstore.h"
#include "sim/product/winpath.h"

#include <cstring>
#include <string>
#include <vector>

namespace {

constexpr uint32_t kLargestAuthentication = 8;
// SQLCODEs of a failed update.
constexpr int32_t kConfigFileSqlcode = -5005;   // the file cannot be read, is damaged or cannot be written
constexpr int32_t kBadParameterSqlcode = -5130; // a token or value that cannot be updated
constexpr int32_t kSystemErrorSqlcode = -1042;

enum ParamType : uint32_t { kU16 = 1, kI16 = 2, kU32 = 3, kI32 = 4, kText = 5 };

struct Parameter {
  uint32_t token;
  uint32_t index; // byte of the flag area
  ParamType type;
  uint32_t offset;
  uint32_t length;
  bool updatable;
};

// The parameters this library knows. The authentication type sits in two
// bytes of the parameter area that no conversion rule gives another meaning.
constexpr Parameter kParameters[] = {
    {SQLF_KTN_AUTHENTICATION, 40, kU16, 28, 2, true},
    {79, 41, kU32, 76, 4, false},
    {803, 203, kU32, 80, 4, false},
};

const Parameter *findParameter(uint32_t token) {
  for (const Parameter &parameter : kParameters)
    if (parameter.token == token)
      return &parameter;
  return nullptr;
}

uint32_t storedChecksum(const std::vector<uint8_t> &image) {
  return uint32_t(image[0]) | uint32_t(image[1]) << 8 | uint32_t(image[2]) << 16 | uint32_t(image[3]) << 24;
}

void put(std::vector<uint8_t> &image, uint32_t offset, uint32_t value, uint32_t width) {
  for (uint32_t i = 0; i < width; ++i)
    image[offset + i] = static_cast<uint8_t>(value >> (8 * i));
}

// Checks every item before anything is written; the SQLCODE of the first bad one.
int32_t checkItems(uint16_t count, const sqlfupd *items) {
  if (count == 0 || items == nullptr)
    return kBadParameterSqlcode;
  for (uint16_t i = 0; i < count; ++i) {
    const Parameter *parameter = findParameter(items[i].token);
    if (parameter == nullptr || !parameter->updatable || items[i].ptrvalue == nullptr)
      return kBadParameterSqlcode;
    uint16_t value = 0;
    std::memcpy(&value, items[i].ptrvalue, sizeof value);
    if (value > kLargestAuthentication)
      return kBadParameterSqlcode;
  }
  return 0;
}

std::string currentConfigPath() {
  std::string directory, copy;
  if (!kxlprod::readInstanceEntry(kxlprod::processInstance(), directory, copy))
    return std::string();
  return kxlprod::joinPath(directory, "kxlsystm");
}

// A damaged file is refused rather than sealed with a fresh checksum.
int32_t updateFile(uint16_t count, const sqlfupd *items) {
  std::string path = currentConfigPath();
  if (path.empty())
    return kSystemErrorSqlcode;
  std::vector<uint8_t> image;
  if (kxlprod::readWholeFile(path, DBMCFG_IMAGE_SZ, image) != ERROR_SUCCESS ||
      image.size() != DBMCFG_IMAGE_SZ || storedChecksum(image) != dbmCfgChecksum(image.data(), image.size()))
    return kConfigFileSqlcode;
  for (uint16_t i = 0; i < count; ++i) {
    const Parameter *parameter = findParameter(items[i].token);
    uint16_t value = 0;
    std::memcpy(&value, items[i].ptrvalue, sizeof value);
    put(image, parameter->offset, value, parameter->length);
  }
  put(image, 0, dbmCfgChecksum(image.data(), image.size()), 4);
  return kxlprod::writeWholeFile(path, image) == ERROR_SUCCESS ? 0 : kConfigFileSqlcode;
}

} // namespace

extern "C" {

int32_t sqlf_get_param_info(uint32_t token, uint32_t reserved, SQLF_PARAM_INFO *info, int32_t *index) {
  (void)reserved;
  if (kxlsim::shouldFail("sqlf_get_param_info"))
    return SQLO_RC_SYSTEM_ERROR;
  const Parameter *parameter = findParameter(token);
  if (parameter == nullptr)
    return SQLO_RC_NOT_FOUND;
  if (info != nullptr)
    *info = SQLF_PARAM_INFO{parameter->token, parameter->type, parameter->offset, parameter->length};
  if (index != nullptr)
    *index = static_cast<int32_t>(parameter->index);
  return 0;
}

int32_t sqlfusys(uint16_t count, sqlfupd *items, sqlca *ca) {
  int32_t sqlcode = kxlsim::shouldFail("sqlfusys") ? kSystemErrorSqlcode : checkItems(count, items);
  if (sqlcode == 0)
    sqlcode = updateFile(count, items);
  if (ca != nullptr)
    sqlcaSetCode(*ca, sqlcode);
  return sqlcode == 0 ? 0 : -1;
}

} // extern "C"
