// Host names and machine measures, answered from the machine identity
// (SOFTWARE\ZAV\KXLSIM\Identity) and the host names a world knows
// (SOFTWARE\ZAV\KXLSIM\Hosts\<host>: "FullName", "Computer"; a host without a
// key does not resolve).
#include "platform/kxlsys.h"
#include "sim/common/simfail.h"
#include "sim/posix/reghelp.h"
#include "sim/product/installation.h"
#include "sim/product/simstate.h"
#include "sim/product/simstore.h"
#include "sim/product/text.h"

#include <cerrno>
#include <cstdlib>
#include <cstring>
#include <string>

namespace reg = kxlsim::posix::reg;

namespace {

constexpr uint32_t kFullHostName = 5;
// What a machine reports when its identity names no measure.
constexpr float kDefaultCpuMeasure = 4e-5f;
constexpr float kDefaultBandwidth = 100.0f;

int assistantSessions = 0;

// A measure of the identity, as text ("0.00004") or as the bits of a 32-bit
// float in a dword. SQLO_RC_INVALID_ARGUMENT for text that is no number.
int32_t identityMeasure(const char *name, float fallback, float &value) {
  DWORD bits = 0;
  if (kxlprod::readRegDword(HKEY_LOCAL_MACHINE, kxlprod::kIdentityKey, name, bits) == ERROR_SUCCESS) {
    std::memcpy(&value, &bits, sizeof value);
    return 0;
  }
  std::string text;
  if (!kxlprod::identityString(name, text)) {
    value = fallback;
    return 0;
  }
  char *end = nullptr;
  errno = 0;
  double number = std::strtod(text.c_str(), &end);
  if (end == text.c_str() || *end != '\0' || errno != 0 || number < 0)
    return SQLO_RC_INVALID_ARGUMENT;
  value = static_cast<float>(number);
  return 0;
}

} // namespace

extern "C" {

int32_t sqloPdbCommFncInit(void) {
  if (kxlsim::shouldFail("sqloPdbCommFncInit"))
    return SQLO_RC_SYSTEM_ERROR;
  return 0;
}

int32_t sqloPdbTcpIpGetFullHostName(char *hostName, uint32_t kind) {
  if (hostName != nullptr)
    hostName[0] = '\0';
  if (kxlsim::shouldFail("sqloPdbTcpIpGetFullHostName"))
    return SQLO_RC_SYSTEM_ERROR;
  if (hostName == nullptr)
    return SQLO_RC_INVALID_ARGUMENT;
  std::string name;
  if (!kxlprod::identityString("FullHostName", name) || name.empty())
    return SQLO_RC_NOT_FOUND;
  // Any kind but the fully qualified one gives the name without its domain.
  if (kind != kFullHostName)
    name = name.substr(0, name.find('.'));
  if (!kxlprod::copyBounded(name, hostName, SQLO_HOSTNAME_SZ)) {
    hostName[0] = '\0';
    return SQLO_RC_INVALID_ARGUMENT;
  }
  return 0;
}

int32_t sqloPdbTcpIpResolveHostName(const char *hostName, char *resolvedName, uint32_t kind, uint32_t flags) {
  (void)kind, (void)flags;
  if (resolvedName != nullptr)
    resolvedName[0] = '\0';
  if (kxlsim::shouldFail("sqloPdbTcpIpResolveHostName"))
    return SQLO_RC_SYSTEM_ERROR;
  if (hostName == nullptr || hostName[0] == '\0' || std::strlen(hostName) >= SQLO_HOSTNAME_SZ ||
      std::strchr(hostName, '\\') != nullptr)
    return SQLO_RC_INVALID_ARGUMENT;
  std::string key = std::string(kxlprod::kSimRoot) + "\\Hosts\\" + hostName;
  if (!reg::keyExists(HKEY_LOCAL_MACHINE, key))
    return SQLO_RC_NOT_FOUND;
  std::string fullName;
  if (reg::queryString(HKEY_LOCAL_MACHINE, key, "FullName", fullName) != ERROR_SUCCESS || fullName.empty())
    fullName = hostName;
  if (resolvedName != nullptr)
    kxlprod::copyBounded(fullName, resolvedName, SQLO_HOSTNAME_SZ);
  return 0;
}

int32_t sqloGetComputerNameA(char *buffer, uint32_t *size) {
  if (kxlsim::shouldFail("sqloGetComputerNameA")) {
    SetLastError(ERROR_ACCESS_DENIED);
    return 0;
  }
  if (buffer == nullptr || size == nullptr || *size == 0) {
    SetLastError(ERROR_INVALID_PARAMETER);
    return 0;
  }
  std::string name = kxlprod::localComputerName();
  if (name.empty()) {
    SetLastError(ERROR_FILE_NOT_FOUND);
    return 0;
  }
  if (name.size() >= *size) {
    *size = static_cast<uint32_t>(name.size() + 1);
    SetLastError(ERROR_MORE_DATA);
    return 0;
  }
  kxlprod::copyBounded(name, buffer, *size);
  *size = static_cast<uint32_t>(name.size());
  return 1;
}

int32_t sqlocpum(float *value) {
  if (kxlsim::shouldFail("sqlocpum"))
    return SQLO_RC_SYSTEM_ERROR;
  if (value == nullptr)
    return SQLO_RC_INVALID_ARGUMENT;
  return identityMeasure("CpuMeasure", kDefaultCpuMeasure, *value);
}

int32_t sqloGetCommBandwidth(float *value, uint32_t nodeType) {
  (void)nodeType; // the machine's bandwidth does not depend on the instance
  if (kxlsim::shouldFail("sqloGetCommBandwidth"))
    return SQLO_RC_SYSTEM_ERROR;
  if (value == nullptr)
    return SQLO_RC_INVALID_ARGUMENT;
  return identityMeasure("CommBandwidth", kDefaultBandwidth, *value);
}

int32_t caProIfInit(void) {
  if (kxlsim::shouldFail("caProIfInit"))
    return SQLO_RC_SYSTEM_ERROR;
  ++assistantSessions;
  return 0;
}

int32_t caProIfQuery(CAPRO_REQUEST *request, CAPRO_RESULT *result) {
  if (result != nullptr)
    std::memset(result, 0, sizeof *result);
  int32_t rc = 0;
  std::string name;
  if (kxlsim::shouldFail("caProIfQuery"))
    rc = SQLO_RC_SYSTEM_ERROR;
  else if (request == nullptr || request->queryKind != CAPRO_QUERY_MACHINE_NAME || assistantSessions == 0)
    rc = SQLO_RC_INVALID_ARGUMENT;
  else if (!kxlprod::identityString("AssistantName", name) || name.empty())
    rc = SQLO_RC_NOT_FOUND;
  else
    kxlprod::copyBounded(name, request->machineName, sizeof request->machineName);
  if (result != nullptr)
    result->code = rc;
  return rc;
}

int32_t caProIfTerm(void) {
  if (kxlsim::shouldFail("caProIfTerm"))
    return SQLO_RC_SYSTEM_ERROR;
  if (assistantSessions == 0)
    return SQLO_RC_INVALID_ARGUMENT;
  --assistantSessions;
  return 0;
}

} // extern "C"
