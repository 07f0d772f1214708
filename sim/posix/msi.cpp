// Windows Installer: a product is installed when its code has an uninstall
// key, and its properties are that key's values.
#include "platform/win32.h"
#include "sim/common/simfail.h"
#include "sim/posix/reghelp.h"
#include "sim/posix/win32util.h"
#include "sim/posix/world.h"

#include <cstring>
#include <string>

using namespace kxlsim::posix;

namespace {

constexpr INSTALLSTATE kInstallStateInvalidArg = -2;

std::string uninstallKey(LPCSTR productCode) {
  return std::string("SOFTWARE\\Microsoft\\Windows\\CurrentVersion\\Uninstall\\") + productCode;
}

bool validProductCode(LPCSTR productCode) {
  return productCode != nullptr && *productCode != '\0' && std::strchr(productCode, '\\') == nullptr;
}

} // namespace

extern "C" {

INSTALLSTATE MsiQueryProductStateA(LPCSTR szProduct) {
  if (kxlsim::shouldFail("MsiQueryProductStateA"))
    return INSTALLSTATE_UNKNOWN;
  if (!validProductCode(szProduct))
    return kInstallStateInvalidArg;
  requireWorld();
  return reg::keyExists(HKEY_LOCAL_MACHINE, uninstallKey(szProduct)) ? INSTALLSTATE_DEFAULT
                                                                     : INSTALLSTATE_UNKNOWN;
}

// Sizes count characters without the terminator, as Windows Installer does: a
// value that does not fit is cut, terminated, and ERROR_MORE_DATA returned with
// its full length.
UINT MsiGetProductInfoA(LPCSTR szProduct, LPCSTR szAttribute, LPSTR lpValueBuf, LPDWORD pcchValueBuf) {
  if (kxlsim::shouldFail("MsiGetProductInfoA"))
    return ERROR_UNKNOWN_PRODUCT;
  if (!validProductCode(szProduct) || szAttribute == nullptr ||
      (lpValueBuf != nullptr && pcchValueBuf == nullptr))
    return ERROR_INVALID_PARAMETER;
  requireWorld();
  std::string key = uninstallKey(szProduct);
  if (!reg::keyExists(HKEY_LOCAL_MACHINE, key))
    return ERROR_UNKNOWN_PRODUCT;
  if (std::strcmp(szAttribute, INSTALLPROPERTY_INSTALLLOCATION) != 0)
    return ERROR_UNKNOWN_PROPERTY;
  std::string value;
  if (!reg::readString(HKEY_LOCAL_MACHINE, key, "InstallLocation", value))
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
