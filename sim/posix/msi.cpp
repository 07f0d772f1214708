// Windows Installer: a machine-wide product is known from the keys the real
// installer keeps (its advertisement and its installed properties, both under
// the product code's packed form), so a world answers the same here as when it
// is imported into Windows or Wine.
#include "platform/win32.h"
#include "sim/common/installer.h"
#include "sim/common/simfail.h"
#include "sim/posix/reghelp.h"
#include "sim/posix/win32util.h"
#include "sim/posix/world.h"

#include <cstring>
#include <string>

using namespace kxlsim::posix;

namespace {

constexpr INSTALLSTATE kInstallStateInvalidArg = -2;
constexpr std::size_t kBracedGuidLength = 38;

bool hasGuidLength(LPCSTR productCode) {
  return productCode != nullptr && std::strlen(productCode) == kBracedGuidLength;
}

bool windowsInstallerFlag(const std::string &propertiesKey) {
  DWORD flag = 0;
  return reg::readDword(HKEY_LOCAL_MACHINE, propertiesKey, "WindowsInstaller", flag) && flag != 0;
}

} // namespace

extern "C" {

// Installed (5) needs both keys and the properties' "WindowsInstaller" flag;
// an advertisement alone is advertised (1); without it the product is unknown.
INSTALLSTATE MsiQueryProductStateA(LPCSTR szProduct) {
  if (kxlsim::shouldFail("MsiQueryProductStateA"))
    return INSTALLSTATE_UNKNOWN;
  if (!hasGuidLength(szProduct))
    return kInstallStateInvalidArg;
  std::string productKey = kxlsim::installerProductKey(szProduct);
  if (productKey.empty())
    return INSTALLSTATE_UNKNOWN;
  requireWorld();
  std::string propertiesKey = kxlsim::installerPropertiesKey(szProduct);
  bool advertised = reg::keyExists(HKEY_LOCAL_MACHINE, productKey);
  bool hasProperties = advertised && reg::keyExists(HKEY_LOCAL_MACHINE, propertiesKey);
  if (!advertised)
    return INSTALLSTATE_UNKNOWN;
  if (!hasProperties)
    return INSTALLSTATE_ADVERTISED;
  return windowsInstallerFlag(propertiesKey) ? INSTALLSTATE_DEFAULT : INSTALLSTATE_UNKNOWN;
}

// Sizes count characters without the terminator, as Windows Installer does: a
// value that does not fit is cut, terminated, and ERROR_MORE_DATA returned with
// its full length.
UINT MsiGetProductInfoA(LPCSTR szProduct, LPCSTR szAttribute, LPSTR lpValueBuf, LPDWORD pcchValueBuf) {
  if (kxlsim::shouldFail("MsiGetProductInfoA"))
    return ERROR_UNKNOWN_PRODUCT;
  std::string productKey = szProduct != nullptr ? kxlsim::installerProductKey(szProduct) : std::string();
  if (productKey.empty() || szAttribute == nullptr || (lpValueBuf != nullptr && pcchValueBuf == nullptr))
    return ERROR_INVALID_PARAMETER;
  requireWorld();
  if (!reg::keyExists(HKEY_LOCAL_MACHINE, productKey))
    return ERROR_UNKNOWN_PRODUCT;
  std::string propertiesKey = kxlsim::installerPropertiesKey(szProduct);
  if (std::strcmp(szAttribute, INSTALLPROPERTY_INSTALLLOCATION) != 0 ||
      !reg::keyExists(HKEY_LOCAL_MACHINE, propertiesKey))
    return ERROR_UNKNOWN_PROPERTY;
  std::string value;
  if (!reg::readString(HKEY_LOCAL_MACHINE, propertiesKey, "InstallLocation", value))
    value.clear();
  if (pcchValueBuf == nullptr)
    return ERROR_SUCCESS;
  DWORD capacity = *pcchValueBuf;
  *pcchValueBuf = static_cast<DWORD>(value.size());
  if (lpValueBuf == nullptr)
    return ERROR_SUCCESS;
  if (capacity > value.size()) {
    std::memcpy(lpValueBuf, value.c_str(), value.size() + 1);
    return ERROR_SUCCESS;
  }
  if (capacity > 0) {
    std::memcpy(lpValueBuf, value.data(), capacity - 1);
    lpValueBuf[capacity - 1] = '\0';
  }
  return ERROR_MORE_DATA;
}

} // extern "C"
