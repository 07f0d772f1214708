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

// The type of a resource opened through the cluster API.
#ifdef _WIN32
// In the Windows build the handle belongs to clusapi.dll, a module of its own:
// the type is asked of it, as the system's resource utility library does.
bool resourceType(HRESOURCE resource, std::string &type) {
  WCHAR wide[256] = {};
  DWORD bytes = 0;
  if (resource == nullptr ||
      ClusterResourceControl(resource, nullptr, CLUSCTL_RESOURCE_GET_RESOURCE_TYPE, nullptr, 0, wide,
                             sizeof wide - sizeof wide[0], &bytes) != ERROR_SUCCESS)
    return false;
  return narrowName(wide, type);
}
#else
bool resourceType(HRESOURCE handle, std::string &type) {
  ResourceObject *resource = liveResource(handle);
  return resource != nullptr &&
         reg::readString(HKEY_LOCAL_MACHINE, resourceKey(resource->name), "Type", type);
}
#endif

} // namespace

KXL_MODULE_ENTRY_POINTS(resutils)

// Services of the world have no service-manager handles: the handle out, when
// asked for, is null and needs no closing.
DWORD WINAPI ResUtilStartResourceService(LPCWSTR pszServiceName, LPSC_HANDLE phServiceHandle) {
  if (phServiceHandle != nullptr)
    *phServiceHandle = nullptr;
  kxlsim::ServiceCall call("ResUtilStartResourceService");
  if (call.failing())
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
  kxlsim::ServiceCall call("ResUtilStopResourceService");
  if (call.failing())
    return ERROR_ACCESS_DENIED;
  std::string key;
  if (!serviceKey(pszServiceName, key))
    return ERROR_SERVICE_DOES_NOT_EXIST;
  return static_cast<DWORD>(reg::writeDword(HKEY_LOCAL_MACHINE, key, "State", kServiceStopped));
}

// Type names compare ignoring case, as the cluster service treats them.
BOOL WINAPI ResUtilResourceTypesEqual(LPCWSTR lpszResourceTypeName, HRESOURCE hResource) {
  kxlsim::ServiceCall call("ResUtilResourceTypesEqual");
  if (call.failing())
    return FALSE;
  std::string wanted, actual;
  if (!narrowName(lpszResourceTypeName, wanted) || !resourceType(hResource, actual))
    return FALSE;
  return equalsIgnoringCase(wanted, actual) ? TRUE : FALSE;
}

KXL_MODULE_ENTRY_POINTS_END

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
