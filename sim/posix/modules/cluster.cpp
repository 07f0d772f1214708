#include "sim/posix/modules/cluster.h"

#include "sim/posix/reghelp.h"
#include "sim/posix/win32util.h"

namespace kxlsim::posix::cluster {

bool narrowName(LPCWSTR wide, std::string &narrow) {
  narrow.clear();
  if (wide == nullptr)
    return false;
  for (; *wide != 0; ++wide) {
    if (*wide > 0xFF || *wide == u'\\')
      return false;
    narrow.push_back(static_cast<char>(*wide));
  }
  return !narrow.empty();
}

std::u16string wideName(const std::string &narrow) {
  std::u16string wide;
  for (char c : narrow)
    wide.push_back(static_cast<char16_t>(static_cast<unsigned char>(c)));
  return wide;
}

bool findObject(const char *parent, const std::string &name, std::string &stored) {
  for (const std::string &candidate : reg::subkeys(HKEY_LOCAL_MACHINE, parent)) {
    if (equalsIgnoringCase(candidate, name)) {
      stored = candidate;
      return true;
    }
  }
  return false;
}

std::string resourceKey(const std::string &name) {
  return std::string(kResourcesKey) + "\\" + name;
}

ResourceObject *liveResource(HRESOURCE handle) {
  auto *resource = lookupHandleAs<ResourceObject>(handle);
  if (resource == nullptr)
    return failWith(ERROR_INVALID_HANDLE, static_cast<ResourceObject *>(nullptr));
  if (!reg::keyExists(HKEY_LOCAL_MACHINE, resourceKey(resource->name)))
    return failWith(ERROR_RESOURCE_NOT_FOUND, static_cast<ResourceObject *>(nullptr));
  return resource;
}

} // namespace kxlsim::posix::cluster
