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

std::string localComputerName() {
  // The machine identity first, as the product library does: on Windows the
  // system's name is not the name the world gives the machine.
  std::string identity;
  if (reg::readString(HKEY_LOCAL_MACHINE, "SOFTWARE\\ZAV\\KXLSIM\\Identity", "ComputerName", identity) &&
      !identity.empty())
    return identity;
  char name[256];
  DWORD size = sizeof name;
  return GetComputerNameA(name, &size) ? std::string(name, size) : std::string();
}

std::string clusterKeyOfMachine(const std::string &computer) {
  return "SOFTWARE\\ZAV\\KXLSIM\\Machines\\" + computer + "\\" + kClusterKey;
}

// The state of the cluster service on the node whose cluster key is `key`.
DWORD nodeStateAt(const std::string &key) {
  DWORD state = ClusterStateNotInstalled;
  if (!reg::keyExists(HKEY_LOCAL_MACHINE, key))
    return ClusterStateNotInstalled;
  return reg::readDword(HKEY_LOCAL_MACHINE, key, "NodeState", state) ? state : DWORD{ClusterStateNotRunning};
}

std::vector<std::string> nodeNames() {
  std::vector<std::string> nodes = reg::subkeys(HKEY_LOCAL_MACHINE, kNodesKey);
  if (nodes.empty())
    nodes.push_back(localComputerName());
  return nodes;
}

std::string resourceField(const std::string &resource, const char *field) {
  std::string value;
  reg::readString(HKEY_LOCAL_MACHINE, resourceKey(resource), field, value);
  return value;
}

std::string groupKey(const std::string &group) {
  return std::string(kGroupsKey) + "\\" + group;
}

std::string groupOwner(const std::string &group) {
  std::string owner;
  if (!reg::readString(HKEY_LOCAL_MACHINE, groupKey(group), "OwnerNode", owner) || owner.empty())
    owner = localComputerName();
  return owner;
}

// The key of the service that a resource of the same name runs as on the
// node owning its group; false when that node has no such service.
bool resourceServiceKey(const std::string &resource, std::string &key) {
  std::string owner = groupOwner(resourceField(resource, "Group"));
  std::string services = equalsIgnoringCase(owner, localComputerName())
                             ? std::string(kServicesKey)
                             : "SOFTWARE\\ZAV\\KXLSIM\\Machines\\" + owner + "\\" + kServicesKey;
  std::string stored;
  if (!findObject(services.c_str(), resource, stored))
    return false;
  key = services + "\\" + stored;
  return true;
}

// A resource backed by a service is online exactly while that service runs
// on the owning node; any other resource keeps the state it was last given.
DWORD resourceState(const std::string &resource) {
  std::string service;
  DWORD state = ClusterResourceOffline;
  if (resourceServiceKey(resource, service)) {
    DWORD serviceState = kServiceStopped;
    reg::readDword(HKEY_LOCAL_MACHINE, service, "State", serviceState);
    return serviceState == kServiceRunning ? DWORD{ClusterResourceOnline} : DWORD{ClusterResourceOffline};
  }
  reg::readDword(HKEY_LOCAL_MACHINE, resourceKey(resource), "State", state);
  return state;
}

DWORD nodeStateOf(const std::string &computer) {
  return equalsIgnoringCase(computer, localComputerName()) ? nodeStateAt(kClusterKey)
                                                           : nodeStateAt(clusterKeyOfMachine(computer));
}

} // namespace kxlsim::posix::cluster
