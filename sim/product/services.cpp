// Service state queries. A service is the key
// SOFTWARE\ZAV\KXLSIM\Services\<name> of the machine that runs it: the local
// HKEY_LOCAL_MACHINE, or for another machine its subtree under
// SOFTWARE\ZAV\KXLSIM\Machines\<NAME> (a machine without one is unreachable).
// Its "State" dword holds the Windows service state.
#include "platform/kxlsys.h"
#include "sim/common/simfail.h"
#include "sim/posix/reghelp.h"
#include "sim/product/simstate.h"
#include "sim/product/simstore.h"

#include <cstring>
#include <string>

namespace reg = kxlsim::posix::reg;

namespace {

constexpr char kServicesKey[] = "SOFTWARE\\ZAV\\KXLSIM\\Services\\";

enum ServiceState : DWORD {
  kStopped = 1,
  kStartPending = 2,
  kStopPending = 3,
  kRunning = 4,
  kContinuePending = 5,
  kPausePending = 6,
  kPaused = 7,
};

int32_t codeForState(DWORD state) {
  switch (state) {
  case kStopped:
    return SQLO_RC_SVC_STOPPED;
  case kStartPending:
  case kContinuePending:
    return SQLO_RC_SVC_START_PENDING;
  case kStopPending:
    return SQLO_RC_SVC_STOP_PENDING;
  case kRunning:
    return SQLO_RC_SVC_RUNNING;
  case kPausePending:
  case kPaused:
    return SQLO_RC_SVC_PAUSED;
  default:
    return SQLO_RC_SYSTEM_ERROR;
  }
}

void report(SQLO_SVC_OUT *out, int32_t systemError, DWORD state) {
  if (out == nullptr)
    return;
  std::memset(out, 0, sizeof *out);
  out->systemError = systemError;
  out->serviceState = state;
}

} // namespace

extern "C" {

int32_t sqloQueryKXLService(const char *serviceName, SQLO_SVC_OUT *out, const char *machine) {
  if (kxlsim::shouldFail("sqloQueryKXLService")) {
    report(out, ERROR_ACCESS_DENIED, 0);
    return SQLO_RC_SYSTEM_ERROR;
  }
  if (serviceName == nullptr || serviceName[0] == '\0')
    return SQLO_RC_INVALID_ARGUMENT;
  std::string prefix;
  if (!kxlprod::machineKeyPrefix(machine, prefix)) {
    report(out, ERROR_BAD_CONFIGURATION, 0);
    return SQLO_RC_MACHINE_UNREACHABLE;
  }
  std::string key = prefix + kServicesKey + serviceName;
  if (!reg::keyExists(HKEY_LOCAL_MACHINE, key)) {
    report(out, ERROR_SERVICE_DOES_NOT_EXIST, 0);
    return SQLO_RC_SVC_NOT_FOUND;
  }
  DWORD state = kStopped;
  LONG rc = kxlprod::readRegDword(HKEY_LOCAL_MACHINE, key, "State", state);
  if (rc != ERROR_SUCCESS && rc != ERROR_FILE_NOT_FOUND) {
    report(out, static_cast<int32_t>(rc), 0);
    return SQLO_RC_SYSTEM_ERROR;
  }
  report(out, 0, state);
  return codeForState(state);
}

} // extern "C"
