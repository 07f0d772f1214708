// Service configuration: reading, changing and registering the Windows
// services of this and other machines. A service is the key
// SOFTWARE\ZAV\KXLSIM\Services\<name> of its machine ("ImagePath",
// "DisplayName", "ObjectName", "Start", "State"). Passwords are checked for
// presence only and never stored.
#include "platform/kxlsys.h"
#include "sim/common/simfail.h"
#include "sim/posix/reghelp.h"
#include "sim/product/simstate.h"
#include "sim/product/simstore.h"
#include "sim/product/text.h"

#include <cstring>
#include <string>

namespace reg = kxlsim::posix::reg;

namespace {

constexpr DWORD kOwnProcessService = 0x10;
constexpr DWORD kErrorControlNormal = 1;
constexpr DWORD kStoppedState = 1;
constexpr DWORD kLargestStartType = 4;
constexpr char kDefaultAccount[] = "LocalSystem";

void report(SQLO_SVC_OUT *out, int32_t systemError) {
  if (out == nullptr)
    return;
  std::memset(out, 0, sizeof *out);
  out->systemError = systemError;
}

bool given(const char *text) {
  return text != nullptr && text[0] != '\0';
}

int32_t codeForRegistry(LONG rc, SQLO_SVC_OUT *out) {
  if (rc == ERROR_SUCCESS)
    return 0;
  report(out, static_cast<int32_t>(rc));
  return SQLO_RC_SYSTEM_ERROR;
}

// The key of an existing service; the code to return when there is none.
int32_t existingServiceKey(const char *serviceName, const char *machine, std::string &key,
                           SQLO_SVC_OUT *out) {
  if (!given(serviceName))
    return SQLO_RC_INVALID_ARGUMENT;
  std::string prefix;
  if (!kxlprod::machineKeyPrefix(machine, prefix)) {
    report(out, ERROR_BAD_CONFIGURATION);
    return SQLO_RC_MACHINE_UNREACHABLE;
  }
  key = kxlprod::serviceKeyPath(prefix, serviceName);
  // A key that cannot be read is never taken for a service that is not there.
  LONG rc = reg::keyOpens(HKEY_LOCAL_MACHINE, key);
  if (rc == ERROR_FILE_NOT_FOUND) {
    report(out, ERROR_SERVICE_DOES_NOT_EXIST);
    return SQLO_RC_SVC_NOT_FOUND;
  }
  return codeForRegistry(rc, out);
}

// A value that is absent keeps its default; any other failed read is the
// query's failure, never an absent value.
bool readable(LONG rc) {
  return rc == ERROR_SUCCESS || rc == ERROR_FILE_NOT_FOUND;
}

LONG readText(const std::string &key, const char *name, char *buffer, size_t size) {
  std::string value;
  LONG rc = reg::queryString(HKEY_LOCAL_MACHINE, key, name, value);
  kxlprod::copyBounded(value, buffer, size);
  return rc;
}

LONG readConfig(const std::string &key, SQLO_SVC_CONFIG &config) {
  DWORD start = SQLO_SVC_DEMAND_START;
  LONG rc = kxlprod::readRegDword(HKEY_LOCAL_MACHINE, key, "Start", start);
  config.startType = static_cast<int32_t>(start);
  struct TextField {
    const char *name;
    char *buffer;
    size_t size;
  } texts[] = {{"ImagePath", config.programPath, sizeof config.programPath},
               {"ObjectName", config.account, sizeof config.account},
               {"DisplayName", config.displayName, sizeof config.displayName}};
  for (const TextField &text : texts)
    if (readable(rc))
      rc = readText(key, text.name, text.buffer, text.size);
  return readable(rc) ? ERROR_SUCCESS : rc;
}

// Writes the settings that are given; 0 or the first registry failure.
LONG applySettings(const std::string &key, uint32_t startType, const char *programPath, const char *account,
                   const char *displayName) {
  LONG rc = ERROR_SUCCESS;
  if (startType != SQLO_SVC_NO_CHANGE)
    rc = reg::writeDword(HKEY_LOCAL_MACHINE, key, "Start", startType);
  const std::pair<const char *, const char *> texts[] = {
      {"ImagePath", programPath}, {"ObjectName", account}, {"DisplayName", displayName}};
  for (const auto &[name, value] : texts)
    if (rc == ERROR_SUCCESS && given(value))
      rc = reg::writeString(HKEY_LOCAL_MACHINE, key, name, value);
  return rc;
}

} // namespace

extern "C" {

int32_t sqloQueryNTServiceConfig(const char *serviceName, const char *machine, SQLO_SVC_CONFIG *config,
                                 SQLO_SVC_OUT *out) {
  if (kxlsim::shouldFail("sqloQueryNTServiceConfig")) {
    report(out, ERROR_ACCESS_DENIED);
    return SQLO_RC_SYSTEM_ERROR;
  }
  if (config == nullptr)
    return SQLO_RC_INVALID_ARGUMENT;
  std::string key;
  int32_t rc = existingServiceKey(serviceName, machine, key, out);
  if (rc != 0)
    return rc;
  std::memset(config, 0, sizeof *config);
  config->serviceType = kOwnProcessService;
  config->errorControl = kErrorControlNormal;
  report(out, 0);
  return codeForRegistry(readConfig(key, *config), out);
}

int32_t sqloChangeNTServiceConfig(const char *serviceName, const char *machine, uint32_t serviceType,
                                  uint32_t startType, uint32_t errorControl, const char *programPath,
                                  const char *loadOrderGroup, uint32_t *tag, const char *dependencies,
                                  const char *account, const char *password, const char *displayName,
                                  SQLO_SVC_OUT *out) {
  // Service type, error control, load order, tag and dependencies are not part
  // of the simulated service; the password is never kept.
  (void)serviceType, (void)errorControl, (void)loadOrderGroup, (void)tag, (void)dependencies, (void)password;
  if (kxlsim::shouldFail("sqloChangeNTServiceConfig")) {
    report(out, ERROR_ACCESS_DENIED);
    return SQLO_RC_SYSTEM_ERROR;
  }
  if (startType != SQLO_SVC_NO_CHANGE && startType > kLargestStartType)
    return SQLO_RC_INVALID_ARGUMENT;
  std::string key;
  int32_t rc = existingServiceKey(serviceName, machine, key, out);
  if (rc != 0)
    return rc;
  report(out, 0);
  return codeForRegistry(applySettings(key, startType, programPath, account, displayName), out);
}

int32_t sqloRegisterNTService(const char *machine, const char *serviceName, const char *displayName,
                              uint32_t serviceKind, const char *programPath, uint32_t startType,
                              const char *account, const char *password, const char *messageLibrary,
                              SQLO_SVC_OUT *out) {
  (void)serviceKind, (void)password, (void)messageLibrary;
  if (kxlsim::shouldFail("sqloRegisterNTService")) {
    report(out, ERROR_ACCESS_DENIED);
    return SQLO_RC_SYSTEM_ERROR;
  }
  if (!given(serviceName) || !given(programPath))
    return SQLO_RC_INVALID_ARGUMENT;
  std::string prefix;
  if (!kxlprod::machineKeyPrefix(machine, prefix)) {
    report(out, ERROR_BAD_CONFIGURATION);
    return SQLO_RC_MACHINE_UNREACHABLE;
  }
  std::string key = kxlprod::serviceKeyPath(prefix, serviceName);
  LONG opens = reg::keyOpens(HKEY_LOCAL_MACHINE, key);
  if (opens == ERROR_SUCCESS) {
    report(out, SQLO_RC_SVC_EXISTS);
    return SQLO_RC_SVC_EXISTS;
  }
  if (opens != ERROR_FILE_NOT_FOUND)
    return codeForRegistry(opens, out);
  // Only the start types of a program service are kept; any other value
  // (0 included) registers the service to be started on demand.
  bool serviceStart = startType >= SQLO_SVC_AUTO_START && startType <= SQLO_SVC_DISABLED;
  uint32_t start = serviceStart ? startType : SQLO_SVC_DEMAND_START;
  LONG rc = applySettings(key, start, programPath, given(account) ? account : kDefaultAccount,
                          given(displayName) ? displayName : serviceName);
  if (rc == ERROR_SUCCESS)
    rc = reg::writeDword(HKEY_LOCAL_MACHINE, key, "State", kStoppedState);
  report(out, 0);
  return codeForRegistry(rc, out);
}

} // extern "C"
