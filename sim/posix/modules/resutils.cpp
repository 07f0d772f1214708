// "resutils.dll": the resource utility entry points over the world's services
// and cluster.
#include "platform/clusapi.h"
#include "sim/common/simfail.h"
#include "sim/posix/modules.h"
#include "sim/posix/modules/cluster.h"
#include "sim/posix/reghelp.h"
#include "sim/posix/win32util.h"

#include <string>

using namespace kxlsim::posix;
using namespace kxlsim::posix::cluster;

namespace {

constexpr DWORD kServiceDisabled = 4;
constexpr DWORD kErrorServiceDisabled = 1058;

// The registry key of the service named `wide`; false when there is none.
bool serviceKey(LPCWSTR wide, std::string &key) {
  std::string name, stored;
  if (!narrowName(wide, name) || !findObject(kServicesKey, name, stored))
    return false;
  key = std::string(kServicesKey) + "\\" + stored;
  return true;
}

} // namespace

namespace kxlsim::posix::resutils {

// Services of the world have no service-manager handles: the handle out, when
// asked for, is null and needs no closing.
DWORD WINAPI ResUtilStartResourceService(LPCWSTR pszServiceName, LPSC_HANDLE phServiceHandle) {
  if (phServiceHandle != nullptr)
    *phServiceHandle = nullptr;
  if (kxlsim::shouldFail("ResUtilStartResourceService"))
    return ERROR_ACCESS_DENIED;
  std::string key;
  if (!serviceKey(pszServiceName, key))
    return ERROR_SERVICE_DOES_NOT_EXIST;
  DWORD start = 0;
  if (reg::readDword(HKEY_LOCAL_MACHINE, key, "Start", start) && start == kServiceDisabled)
    return kErrorServiceDisabled;
  return static_cast<DWORD>(reg::writeDword(HKEY_LOCAL_MACHINE, key, "State", kServiceRunning));
}

DWORD WINAPI ResUtilStopResourceService(LPCWSTR pszServiceName) {
  if (kxlsim::shouldFail("ResUtilStopResourceService"))
    return ERROR_ACCESS_DENIED;
  std::string key;
  if (!serviceKey(pszServiceName, key))
    return ERROR_SERVICE_DOES_NOT_EXIST;
  return static_cast<DWORD>(reg::writeDword(HKEY_LOCAL_MACHINE, key, "State", kServiceStopped));
}

// Type names compare ignoring case, as the cluster service treats them.
BOOL WINAPI ResUtilResourceTypesEqual(LPCWSTR lpszResourceTypeName, HRESOURCE hResource) {
  if (kxlsim::shouldFail("ResUtilResourceTypesEqual"))
    return FALSE;
  std::string wanted, actual;
  ResourceObject *resource = liveResource(hResource);
  if (resource == nullptr || !narrowName(lpszResourceTypeName, wanted) ||
      !reg::readString(HKEY_LOCAL_MACHINE, resourceKey(resource->name), "Type", actual))
    return FALSE;
  return equalsIgnoringCase(wanted, actual) ? TRUE : FALSE;
}

} // namespace kxlsim::posix::resutils

namespace kxlsim::posix {

const ModuleDefinition &resutilsModule() {
  using namespace resutils;
  static const ModuleExport exports[] = {
      {"ResUtilResourceTypesEqual", exportAddress(&ResUtilResourceTypesEqual)},
      {"ResUtilStartResourceService", exportAddress(&ResUtilStartResourceService)},
      {"ResUtilStopResourceService", exportAddress(&ResUtilStopResourceService)},
  };
  static const ModuleDefinition definition{"resutils.dll", exports, sizeof exports / sizeof exports[0]};
  return definition;
}

} // namespace kxlsim::posix
