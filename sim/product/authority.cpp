// Authority: who runs the program and what the machine offers. The answers
// come from the machine identity key, so a world decides whether its user is
// an administrator and which extras are installed.
#include "platform/kxlsys.h"
#include "sim/common/simfail.h"
#include "sim/posix/reghelp.h"
#include "sim/product/simstate.h"
#include "sim/product/text.h"

#include <string>

namespace reg = kxlsim::posix::reg;

namespace {

// The user's logon name, for a machine whose identity names no authorization ID.
std::string logonName() {
  char buffer[SQLE_AUTHID_SZ] = {};
  DWORD length = GetEnvironmentVariableA("USERNAME", buffer, sizeof buffer);
  if (length == 0 || length >= sizeof buffer)
    return std::string();
  return std::string(buffer, length);
}

} // namespace

extern "C" {

int32_t sqloIsLocalAdmin(void) {
  if (kxlsim::shouldFail("sqloIsLocalAdmin"))
    return SQLO_RC_SYSTEM_ERROR;
  DWORD bits = 0;
  LONG rc = kxlprod::readRegDword(HKEY_LOCAL_MACHINE, kxlprod::kIdentityKey, "LocalAdmin", bits);
  if (rc == ERROR_FILE_NOT_FOUND)
    return 0; // nothing recorded: an ordinary user
  if (rc != ERROR_SUCCESS)
    return SQLO_RC_SYSTEM_ERROR;
  return static_cast<int32_t>(bits & 0x7FFFFFFFu);
}

int32_t sqleget_authid(char *buffer) {
  if (kxlsim::shouldFail("sqleget_authid"))
    return SQLO_RC_SYSTEM_ERROR;
  if (buffer == nullptr)
    return SQLO_RC_INVALID_ARGUMENT;
  buffer[0] = '\0';
  std::string id;
  if (reg::queryString(HKEY_LOCAL_MACHINE, kxlprod::kIdentityKey, "AuthId", id) == ERROR_SUCCESS &&
      !id.empty()) {
    kxlprod::copyBounded(id, buffer, SQLE_AUTHID_SZ);
    return 0;
  }
  id = logonName();
  if (id.empty())
    return SQLO_RC_NOT_FOUND;
  kxlprod::copyBounded(id, buffer, SQLE_AUTHID_SZ);
  return 1;
}

int32_t sqloIsContentExtenderInstalled(const char *installPath) {
  if (kxlsim::shouldFail("sqloIsContentExtenderInstalled") || installPath == nullptr ||
      installPath[0] == '\0')
    return 0;
  DWORD installed = 0;
  if (kxlprod::readRegDword(HKEY_LOCAL_MACHINE, kxlprod::kIdentityKey, "ContentExtender", installed) !=
      ERROR_SUCCESS)
    return 0;
  return installed != 0 ? 1 : 0;
}

} // extern "C"
