#include "sim/common/installer.h"

#include <cctype>

namespace kxlsim {

namespace {

constexpr std::size_t kBracedGuidLength = 38;
constexpr const char *kProductsKey = "SOFTWARE\\Classes\\Installer\\Products\\";
constexpr const char *kUserDataProductsKey =
    "SOFTWARE\\Microsoft\\Windows\\CurrentVersion\\Installer\\UserData\\S-1-5-18\\Products\\";

bool isBracedGuid(const std::string &code) {
  if (code.size() != kBracedGuidLength || code.front() != '{' || code.back() != '}')
    return false;
  for (std::size_t i = 1; i + 1 < code.size(); ++i) {
    bool dash = i == 9 || i == 14 || i == 19 || i == 24;
    if (dash ? code[i] != '-' : !std::isxdigit(static_cast<unsigned char>(code[i])))
      return false;
  }
  return true;
}

} // namespace

std::string packedProductCode(const std::string &productCode) {
  if (!isBracedGuid(productCode))
    return std::string();
  std::string digits;
  for (char c : productCode)
    if (std::isxdigit(static_cast<unsigned char>(c)))
      digits += static_cast<char>(std::toupper(static_cast<unsigned char>(c)));
  std::string packed;
  // The three leading groups (8, 4 and 4 digits) are reversed whole.
  for (auto [start, length] : {std::pair<std::size_t, std::size_t>{0, 8}, {8, 4}, {12, 4}})
    packed.append(digits.rbegin() + static_cast<long>(digits.size() - start - length),
                  digits.rbegin() + static_cast<long>(digits.size() - start));
  // The remaining eight bytes keep their order with their two digits swapped.
  for (std::size_t i = 16; i + 1 < digits.size(); i += 2) {
    packed += digits[i + 1];
    packed += digits[i];
  }
  return packed;
}

std::string installerProductKey(const std::string &productCode) {
  std::string packed = packedProductCode(productCode);
  return packed.empty() ? packed : kProductsKey + packed;
}

std::string installerPropertiesKey(const std::string &productCode) {
  std::string packed = packedProductCode(productCode);
  return packed.empty() ? packed : kUserDataProductsKey + packed + "\\InstallProperties";
}

} // namespace kxlsim
