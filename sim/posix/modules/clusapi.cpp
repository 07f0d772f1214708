// "clusapi.dll": the cluster API over the world's cluster registry.
#include "platform/clusapi.h"
#include "sim/common/simfail.h"
#include "sim/posix/modules.h"
#include "sim/posix/modules/cluster.h"
#include "sim/posix/reghelp.h"
#include "sim/posix/win32util.h"

#include <algorithm>
#include <cstring>
#include <set>
#include <string>
#include <utility>
#include <vector>

using namespace kxlsim::posix;
using namespace kxlsim::posix::cluster;

namespace {

enum class EnumKind { Cluster, Group, Resource, ResourceType };

struct EnumObject : ClusterHandle {
  EnumKind kind = EnumKind::Cluster;
  std::vector<std::pair<DWORD, std::string>> items;
};

template <typename Handle> HANDLE asHandle(Handle handle) {
  return static_cast<HANDLE>(handle);
}

template <typename Handle, typename Object> Handle handleFor(std::unique_ptr<Object> object) {
  return static_cast<Handle>(registerHandle(std::move(object)));
}

std::vector<std::string> dependenciesOf(const std::string &resource) {
  std::vector<std::string> names;
  reg::readMultiString(HKEY_LOCAL_MACHINE, resourceKey(resource), "DependsOn", names);
  return names;
}

bool listsName(const std::vector<std::string> &names, const std::string &name) {
  return std::any_of(names.begin(), names.end(),
                     [&](const std::string &n) { return equalsIgnoringCase(n, name); });
}

// Resources for which `keep` holds, in the registry's order.
template <typename Predicate> std::vector<std::string> resourcesWhere(Predicate keep) {
  std::vector<std::string> chosen;
  for (const std::string &name : reg::subkeys(HKEY_LOCAL_MACHINE, kResourcesKey))
    if (keep(name))
      chosen.push_back(name);
  return chosen;
}

std::vector<std::string> resourcesOfField(const char *field, const std::string &value) {
  return resourcesWhere(
      [&](const std::string &name) { return equalsIgnoringCase(resourceField(name, field), value); });
}

std::vector<std::string> dependentsOf(const std::string &resource) {
  return resourcesWhere([&](const std::string &name) { return listsName(dependenciesOf(name), resource); });
}

// True when `from` depends on `target`, directly or through others.
bool dependsOnTransitively(const std::string &from, const std::string &target, std::set<std::string> &seen) {
  if (equalsIgnoringCase(from, target))
    return true;
  std::string key = from;
  std::transform(key.begin(), key.end(), key.begin(), [](unsigned char c) { return std::tolower(c); });
  if (!seen.insert(key).second)
    return false;
  for (const std::string &next : dependenciesOf(from))
    if (dependsOnTransitively(next, target, seen))
      return true;
  return false;
}

// Copies a name out by the cluster API's rule: counts exclude the terminator;
// a buffer too small gives ERROR_MORE_DATA with the length needed.
DWORD copyName(const std::string &name, LPWSTR out, LPDWORD cch) {
  if (cch == nullptr)
    return out == nullptr ? ERROR_SUCCESS : ERROR_INVALID_PARAMETER;
  std::u16string wide = wideName(name);
  if (out == nullptr || *cch <= wide.size()) {
    *cch = static_cast<DWORD>(wide.size());
    return out == nullptr ? ERROR_SUCCESS : ERROR_MORE_DATA;
  }
  std::copy(wide.begin(), wide.end(), out);
  out[wide.size()] = 0;
  *cch = static_cast<DWORD>(wide.size());
  return ERROR_SUCCESS;
}

DWORD enumerate(HANDLE handle, EnumKind kind, DWORD index, LPDWORD type, LPWSTR name, LPDWORD cch) {
  auto *enumeration = lookupHandleAs<EnumObject>(handle);
  if (enumeration == nullptr || enumeration->kind != kind)
    return ERROR_INVALID_HANDLE;
  if (index >= enumeration->items.size())
    return ERROR_NO_MORE_ITEMS;
  if (cch == nullptr || name == nullptr)
    return ERROR_INVALID_PARAMETER;
  if (type != nullptr)
    *type = enumeration->items[index].first;
  return copyName(enumeration->items[index].second, name, cch);
}

HANDLE openEnumeration(EnumKind kind, std::vector<std::pair<DWORD, std::string>> items) {
  auto enumeration = std::make_unique<EnumObject>();
  enumeration->kind = kind;
  enumeration->items = std::move(items);
  return registerHandle(std::move(enumeration));
}

DWORD closeEnumeration(HANDLE handle, EnumKind kind) {
  auto *enumeration = lookupHandleAs<EnumObject>(handle);
  if (enumeration == nullptr || enumeration->kind != kind)
    return ERROR_INVALID_HANDLE;
  releaseHandle(handle);
  return ERROR_SUCCESS;
}

void appendAll(std::vector<std::pair<DWORD, std::string>> &items, DWORD type,
               const std::vector<std::string> &names) {
  for (const std::string &name : names)
    items.emplace_back(type, name);
}

template <typename Object> BOOL closeObject(HANDLE handle) {
  if (lookupHandleAs<Object>(handle) == nullptr)
    return failWith(ERROR_INVALID_HANDLE, FALSE);
  releaseHandle(handle);
  return TRUE;
}

// Opens the object `wide` among the subkeys of `parent` as a handle of `Object`.
template <typename Handle, typename Object>
Handle openNamed(HCLUSTER cluster, LPCWSTR wide, const char *parent, DWORD notFound) {
  std::string name, stored;
  if (lookupHandleAs<ClusterObject>(asHandle(cluster)) == nullptr)
    return failWith(ERROR_INVALID_HANDLE, Handle{nullptr});
  if (!narrowName(wide, name) || !findObject(parent, name, stored))
    return failWith(notFound, Handle{nullptr});
  auto object = std::make_unique<Object>();
  object->name = stored;
  return handleFor<Handle>(std::move(object));
}

GroupObject *liveGroup(HGROUP handle) {
  auto *group = lookupHandleAs<GroupObject>(asHandle(handle));
  std::string stored;
  if (group == nullptr)
    return failWith(ERROR_INVALID_HANDLE, static_cast<GroupObject *>(nullptr));
  if (!findObject(kGroupsKey, group->name, stored))
    return failWith(ERROR_GROUP_NOT_FOUND, static_cast<GroupObject *>(nullptr));
  return group;
}

// Offline and failed are the states in which the cluster lets a resource go.
bool isOffline(DWORD state) {
  return state == ClusterResourceOffline || state == ClusterResourceFailed;
}

// Records a resource's new state; a service-backed resource starts or stops
// its service on the owning node.
void storeResourceState(const std::string &resource, DWORD state) {
  reg::writeDword(HKEY_LOCAL_MACHINE, resourceKey(resource), "State", state);
  std::string service;
  if (resourceServiceKey(resource, service))
    reg::writeDword(HKEY_LOCAL_MACHINE, service, "State",
                    state == ClusterResourceOnline ? kServiceRunning : kServiceStopped);
}

// Sets the state of a group and of every resource in it.
void setGroupState(const std::string &group, DWORD groupState, DWORD resourceState) {
  reg::writeDword(HKEY_LOCAL_MACHINE, groupKey(group), "State", groupState);
  for (const std::string &resource : resourcesOfField("Group", group))
    storeResourceState(resource, resourceState);
}

// Brings a resource online after what it depends on, or offline after what
// depends on it, as the cluster service orders it.
void setResourceState(const std::string &resource, DWORD state, std::set<std::string> &done) {
  if (!done.insert(resource).second)
    return;
  const std::vector<std::string> related =
      state == ClusterResourceOnline ? dependenciesOf(resource) : dependentsOf(resource);
  for (const std::string &other : related)
    if (reg::keyExists(HKEY_LOCAL_MACHINE, resourceKey(other)))
      setResourceState(other, state, done);
  storeResourceState(resource, state);
}

DWORD changeResourceState(HRESOURCE handle, DWORD state) {
  ResourceObject *resource = liveResource(handle);
  if (resource == nullptr)
    return GetLastError();
  std::set<std::string> done;
  setResourceState(resource->name, state, done);
  return ERROR_SUCCESS;
}

DWORD copyOutBytes(const void *data, DWORD size, LPVOID out, DWORD capacity, LPDWORD returned) {
  if (returned != nullptr)
    *returned = size;
  if (out == nullptr || capacity < size)
    return ERROR_MORE_DATA;
  std::memcpy(out, data, size);
  return ERROR_SUCCESS;
}

DWORD controlText(const std::string &text, LPVOID out, DWORD capacity, LPDWORD returned) {
  std::u16string wide = wideName(text);
  return copyOutBytes(wide.c_str(), static_cast<DWORD>((wide.size() + 1) * sizeof(char16_t)), out, capacity,
                      returned);
}

void appendDword(std::string &list, DWORD value) {
  for (int i = 0; i < 4; ++i)
    list.push_back(static_cast<char>((value >> (8 * i)) & 0xFF));
}

// The common properties of a resource as a property list: the count, then
// each property's name and value, each entry padded to whole DWORDs and the
// property closed by an end mark. Only "SeparateMonitor" is kept.
DWORD commonProperties(const std::string &resource, LPVOID out, DWORD capacity, LPDWORD returned) {
  DWORD separate = 0;
  reg::readDword(HKEY_LOCAL_MACHINE, resourceKey(resource), "SeparateMonitor", separate);
  std::u16string name = u"SeparateMonitor";
  std::string list;
  appendDword(list, 1);
  appendDword(list, CLUSPROP_SYNTAX_NAME);
  DWORD nameBytes = static_cast<DWORD>((name.size() + 1) * sizeof(char16_t));
  appendDword(list, nameBytes);
  list.append(reinterpret_cast<const char *>(name.c_str()), nameBytes);
  list.append((4 - nameBytes % 4) % 4, '\0');
  appendDword(list, CLUSPROP_SYNTAX_LIST_VALUE_DWORD);
  appendDword(list, sizeof(DWORD));
  appendDword(list, separate);
  appendDword(list, CLUSPROP_SYNTAX_ENDMARK);
  return copyOutBytes(list.data(), static_cast<DWORD>(list.size()), out, capacity, returned);
}

} // namespace

KXL_MODULE_ENTRY_POINTS(clusapi)

DWORD WINAPI MoveClusterGroup(HGROUP hGroup, HNODE hDestinationNode) {
  kxlsim::ServiceCall call("MoveClusterGroup");
  if (call.failing())
    return ERROR_CLUSTER_NODE_NOT_FOUND;
  GroupObject *group = liveGroup(hGroup);
  if (group == nullptr)
    return GetLastError();
  auto *node = lookupHandleAs<NodeObject>(asHandle(hDestinationNode));
  if (hDestinationNode != nullptr && node == nullptr)
    return ERROR_INVALID_HANDLE;
  if (node != nullptr)
    reg::writeString(HKEY_LOCAL_MACHINE, groupKey(group->name), "OwnerNode", node->name);
  return ERROR_SUCCESS;
}

HCLUSTER WINAPI OpenCluster(LPCWSTR lpszClusterName) {
  kxlsim::ServiceCall call("OpenCluster");
  if (call.failing())
    return failWith(RPC_S_SERVER_UNAVAILABLE, HCLUSTER{nullptr});
  std::string name, clusterName;
  if (lpszClusterName != nullptr) {
    reg::readString(HKEY_LOCAL_MACHINE, kClusterKey, "ClusterName", clusterName);
    if (!narrowName(lpszClusterName, name) ||
        !(equalsIgnoringCase(name, localComputerName()) || equalsIgnoringCase(name, clusterName)))
      return failWith(RPC_S_SERVER_UNAVAILABLE, HCLUSTER{nullptr});
  }
  if (nodeStateAt(kClusterKey) != ClusterStateRunning)
    return failWith(RPC_S_SERVER_UNAVAILABLE, HCLUSTER{nullptr});
  return handleFor<HCLUSTER>(std::make_unique<ClusterObject>());
}

BOOL WINAPI CloseCluster(HCLUSTER hCluster) {
  kxlsim::ServiceCall call("CloseCluster");
  if (call.failing())
    return failWith(ERROR_INVALID_HANDLE, FALSE);
  return closeObject<ClusterObject>(asHandle(hCluster));
}

HGROUP WINAPI OpenClusterGroup(HCLUSTER hCluster, LPCWSTR lpszGroupName) {
  kxlsim::ServiceCall call("OpenClusterGroup");
  if (call.failing())
    return failWith(ERROR_GROUP_NOT_FOUND, HGROUP{nullptr});
  return openNamed<HGROUP, GroupObject>(hCluster, lpszGroupName, kGroupsKey, ERROR_GROUP_NOT_FOUND);
}

BOOL WINAPI CloseClusterGroup(HGROUP hGroup) {
  kxlsim::ServiceCall call("CloseClusterGroup");
  if (call.failing())
    return failWith(ERROR_INVALID_HANDLE, FALSE);
  return closeObject<GroupObject>(asHandle(hGroup));
}

HNODE WINAPI OpenClusterNode(HCLUSTER hCluster, LPCWSTR lpszNodeName) {
  kxlsim::ServiceCall call("OpenClusterNode");
  if (call.failing())
    return failWith(ERROR_CLUSTER_NODE_NOT_FOUND, HNODE{nullptr});
  std::string name;
  if (lookupHandleAs<ClusterObject>(asHandle(hCluster)) == nullptr)
    return failWith(ERROR_INVALID_HANDLE, HNODE{nullptr});
  std::vector<std::string> nodes = nodeNames();
  auto found = std::find_if(nodes.begin(), nodes.end(), [&](const std::string &node) {
    return narrowName(lpszNodeName, name) && equalsIgnoringCase(node, name);
  });
  if (found == nodes.end())
    return failWith(ERROR_CLUSTER_NODE_NOT_FOUND, HNODE{nullptr});
  auto node = std::make_unique<NodeObject>();
  node->name = *found;
  return handleFor<HNODE>(std::move(node));
}

BOOL WINAPI CloseClusterNode(HNODE hNode) {
  kxlsim::ServiceCall call("CloseClusterNode");
  if (call.failing())
    return failWith(ERROR_INVALID_HANDLE, FALSE);
  return closeObject<NodeObject>(asHandle(hNode));
}

HCLUSENUM WINAPI ClusterOpenEnum(HCLUSTER hCluster, DWORD dwType) {
  kxlsim::ServiceCall call("ClusterOpenEnum");
  if (call.failing())
    return failWith(ERROR_NOT_ENOUGH_MEMORY, HCLUSENUM{nullptr});
  if (lookupHandleAs<ClusterObject>(asHandle(hCluster)) == nullptr)
    return failWith(ERROR_INVALID_HANDLE, HCLUSENUM{nullptr});
  std::vector<std::pair<DWORD, std::string>> items;
  if (dwType & CLUSTER_ENUM_NODE)
    appendAll(items, CLUSTER_ENUM_NODE, nodeNames());
  if (dwType & CLUSTER_ENUM_RESTYPE)
    appendAll(items, CLUSTER_ENUM_RESTYPE, reg::subkeys(HKEY_LOCAL_MACHINE, kTypesKey));
  if (dwType & CLUSTER_ENUM_RESOURCE)
    appendAll(items, CLUSTER_ENUM_RESOURCE, reg::subkeys(HKEY_LOCAL_MACHINE, kResourcesKey));
  if (dwType & CLUSTER_ENUM_GROUP)
    appendAll(items, CLUSTER_ENUM_GROUP, reg::subkeys(HKEY_LOCAL_MACHINE, kGroupsKey));
  return static_cast<HCLUSENUM>(openEnumeration(EnumKind::Cluster, std::move(items)));
}

DWORD WINAPI ClusterEnum(HCLUSENUM hEnum, DWORD dwIndex, LPDWORD lpdwType, LPWSTR lpszName,
                         LPDWORD lpcchName) {
  kxlsim::ServiceCall call("ClusterEnum");
  if (call.failing())
    return ERROR_NOT_ENOUGH_MEMORY;
  return enumerate(asHandle(hEnum), EnumKind::Cluster, dwIndex, lpdwType, lpszName, lpcchName);
}

DWORD WINAPI ClusterCloseEnum(HCLUSENUM hEnum) {
  kxlsim::ServiceCall call("ClusterCloseEnum");
  if (call.failing())
    return ERROR_INVALID_HANDLE;
  return closeEnumeration(asHandle(hEnum), EnumKind::Cluster);
}

CLUSTER_GROUP_STATE WINAPI GetClusterGroupState(HGROUP hGroup, LPWSTR lpszNodeName, LPDWORD lpcchNodeName) {
  kxlsim::ServiceCall call("GetClusterGroupState");
  if (call.failing())
    return failWith(ERROR_INVALID_HANDLE, ClusterGroupStateUnknown);
  GroupObject *group = liveGroup(hGroup);
  if (group == nullptr)
    return ClusterGroupStateUnknown;
  DWORD rc = copyName(groupOwner(group->name), lpszNodeName, lpcchNodeName);
  if (rc != ERROR_SUCCESS)
    return failWith(rc, ClusterGroupStateUnknown);
  DWORD state = ClusterGroupOnline;
  reg::readDword(HKEY_LOCAL_MACHINE, groupKey(group->name), "State", state);
  return static_cast<CLUSTER_GROUP_STATE>(state);
}

HGROUPENUM WINAPI ClusterGroupOpenEnum(HGROUP hGroup, DWORD dwType) {
  kxlsim::ServiceCall call("ClusterGroupOpenEnum");
  if (call.failing())
    return failWith(ERROR_NOT_ENOUGH_MEMORY, HGROUPENUM{nullptr});
  GroupObject *group = liveGroup(hGroup);
  if (group == nullptr)
    return HGROUPENUM{nullptr};
  std::vector<std::pair<DWORD, std::string>> items;
  if (dwType & CLUSTER_GROUP_ENUM_CONTAINS)
    appendAll(items, CLUSTER_GROUP_ENUM_CONTAINS, resourcesOfField("Group", group->name));
  if (dwType & CLUSTER_GROUP_ENUM_NODES)
    appendAll(items, CLUSTER_GROUP_ENUM_NODES, nodeNames());
  return static_cast<HGROUPENUM>(openEnumeration(EnumKind::Group, std::move(items)));
}

DWORD WINAPI ClusterGroupEnum(HGROUPENUM hGroupEnum, DWORD dwIndex, LPDWORD lpdwType, LPWSTR lpszResourceName,
                              LPDWORD lpcchName) {
  kxlsim::ServiceCall call("ClusterGroupEnum");
  if (call.failing())
    return ERROR_NOT_ENOUGH_MEMORY;
  return enumerate(asHandle(hGroupEnum), EnumKind::Group, dwIndex, lpdwType, lpszResourceName, lpcchName);
}

DWORD WINAPI ClusterGroupCloseEnum(HGROUPENUM hGroupEnum) {
  kxlsim::ServiceCall call("ClusterGroupCloseEnum");
  if (call.failing())
    return ERROR_INVALID_HANDLE;
  return closeEnumeration(asHandle(hGroupEnum), EnumKind::Group);
}

DWORD WINAPI ClusterResourceControl(HRESOURCE hResource, HNODE, DWORD dwControlCode, LPVOID, DWORD,
                                    LPVOID lpOutBuffer, DWORD cbOutBufferSize, LPDWORD lpBytesReturned) {
  kxlsim::ServiceCall call("ClusterResourceControl");
  if (call.failing())
    return ERROR_RESOURCE_NOT_FOUND;
  if (lpBytesReturned != nullptr)
    *lpBytesReturned = 0;
  ResourceObject *resource = liveResource(hResource);
  if (resource == nullptr)
    return GetLastError();
  switch (dwControlCode) {
  case CLUSCTL_RESOURCE_GET_RESOURCE_TYPE:
    return controlText(resourceField(resource->name, "Type"), lpOutBuffer, cbOutBufferSize, lpBytesReturned);
  case CLUSCTL_RESOURCE_GET_NAME:
    return controlText(resource->name, lpOutBuffer, cbOutBufferSize, lpBytesReturned);
  case CLUSCTL_RESOURCE_GET_COMMON_PROPERTIES:
    return commonProperties(resource->name, lpOutBuffer, cbOutBufferSize, lpBytesReturned);
  default:
    return ERROR_INVALID_FUNCTION;
  }
}

DWORD WINAPI OnlineClusterGroup(HGROUP hGroup, HNODE) {
  kxlsim::ServiceCall call("OnlineClusterGroup");
  if (call.failing())
    return ERROR_INVALID_HANDLE;
  GroupObject *group = liveGroup(hGroup);
  if (group == nullptr)
    return GetLastError();
  setGroupState(group->name, ClusterGroupOnline, ClusterResourceOnline);
  return ERROR_SUCCESS;
}

DWORD WINAPI OfflineClusterGroup(HGROUP hGroup) {
  kxlsim::ServiceCall call("OfflineClusterGroup");
  if (call.failing())
    return ERROR_INVALID_HANDLE;
  GroupObject *group = liveGroup(hGroup);
  if (group == nullptr)
    return GetLastError();
  setGroupState(group->name, ClusterGroupOffline, ClusterResourceOffline);
  return ERROR_SUCCESS;
}

DWORD WINAPI DeleteClusterGroup(HGROUP hGroup) {
  kxlsim::ServiceCall call("DeleteClusterGroup");
  if (call.failing())
    return ERROR_INVALID_HANDLE;
  GroupObject *group = liveGroup(hGroup);
  if (group == nullptr)
    return GetLastError();
  if (!resourcesOfField("Group", group->name).empty())
    return ERROR_DIR_NOT_EMPTY;
  LONG rc = reg::deleteTree(HKEY_LOCAL_MACHINE, groupKey(group->name));
  return rc == ERROR_SUCCESS ? ERROR_SUCCESS : static_cast<DWORD>(rc);
}

HRESENUM WINAPI ClusterResourceOpenEnum(HRESOURCE hResource, DWORD dwType) {
  kxlsim::ServiceCall call("ClusterResourceOpenEnum");
  if (call.failing())
    return failWith(ERROR_NOT_ENOUGH_MEMORY, HRESENUM{nullptr});
  ResourceObject *resource = liveResource(hResource);
  if (resource == nullptr)
    return HRESENUM{nullptr};
  std::vector<std::pair<DWORD, std::string>> items;
  if (dwType & CLUSTER_RESOURCE_ENUM_DEPENDS)
    appendAll(items, CLUSTER_RESOURCE_ENUM_DEPENDS, dependenciesOf(resource->name));
  if (dwType & CLUSTER_RESOURCE_ENUM_PROVIDES)
    appendAll(items, CLUSTER_RESOURCE_ENUM_PROVIDES, dependentsOf(resource->name));
  if (dwType & CLUSTER_RESOURCE_ENUM_NODES)
    appendAll(items, CLUSTER_RESOURCE_ENUM_NODES, nodeNames());
  return static_cast<HRESENUM>(openEnumeration(EnumKind::Resource, std::move(items)));
}

DWORD WINAPI ClusterResourceEnum(HRESENUM hResEnum, DWORD dwIndex, LPDWORD lpdwType, LPWSTR lpszName,
                                 LPDWORD lpcchName) {
  kxlsim::ServiceCall call("ClusterResourceEnum");
  if (call.failing())
    return ERROR_NOT_ENOUGH_MEMORY;
  return enumerate(asHandle(hResEnum), EnumKind::Resource, dwIndex, lpdwType, lpszName, lpcchName);
}

DWORD WINAPI AddClusterResourceDependency(HRESOURCE hResource, HRESOURCE hDependsOn) {
  kxlsim::ServiceCall call("AddClusterResourceDependency");
  if (call.failing())
    return ERROR_RESOURCE_NOT_FOUND;
  ResourceObject *resource = liveResource(hResource);
  ResourceObject *provider = resource == nullptr ? nullptr : liveResource(hDependsOn);
  if (provider == nullptr)
    return GetLastError();
  // Only resources of one group can depend on each other.
  if (!equalsIgnoringCase(resourceField(resource->name, "Group"), resourceField(provider->name, "Group")))
    return ERROR_INVALID_PARAMETER;
  std::vector<std::string> dependencies = dependenciesOf(resource->name);
  if (listsName(dependencies, provider->name))
    return ERROR_DEPENDENCY_ALREADY_EXISTS;
  std::set<std::string> seen;
  if (dependsOnTransitively(provider->name, resource->name, seen))
    return ERROR_CIRCULAR_DEPENDENCY;
  dependencies.push_back(provider->name);
  LONG rc = reg::writeMultiString(HKEY_LOCAL_MACHINE, resourceKey(resource->name), "DependsOn", dependencies);
  return static_cast<DWORD>(rc);
}

HRESOURCE WINAPI OpenClusterResource(HCLUSTER hCluster, LPCWSTR lpszResourceName) {
  kxlsim::ServiceCall call("OpenClusterResource");
  if (call.failing())
    return failWith(ERROR_RESOURCE_NOT_FOUND, HRESOURCE{nullptr});
  return openNamed<HRESOURCE, ResourceObject>(hCluster, lpszResourceName, kResourcesKey,
                                              ERROR_RESOURCE_NOT_FOUND);
}

BOOL WINAPI CloseClusterResource(HRESOURCE hResource) {
  kxlsim::ServiceCall call("CloseClusterResource");
  if (call.failing())
    return failWith(ERROR_INVALID_HANDLE, FALSE);
  return closeObject<ResourceObject>(asHandle(hResource));
}

DWORD WINAPI OnlineClusterResource(HRESOURCE hResource) {
  kxlsim::ServiceCall call("OnlineClusterResource");
  if (call.failing())
    return ERROR_RESOURCE_NOT_FOUND;
  return changeResourceState(hResource, ClusterResourceOnline);
}

DWORD WINAPI OfflineClusterResource(HRESOURCE hResource) {
  kxlsim::ServiceCall call("OfflineClusterResource");
  if (call.failing())
    return ERROR_RESOURCE_NOT_FOUND;
  return changeResourceState(hResource, ClusterResourceOffline);
}

// Only an offline resource that nothing depends on can be deleted.
DWORD WINAPI DeleteClusterResource(HRESOURCE hResource) {
  kxlsim::ServiceCall call("DeleteClusterResource");
  if (call.failing())
    return ERROR_RESOURCE_NOT_FOUND;
  ResourceObject *resource = liveResource(hResource);
  if (resource == nullptr)
    return GetLastError();
  if (!isOffline(resourceState(resource->name)))
    return ERROR_RESOURCE_ONLINE;
  if (!dependentsOf(resource->name).empty())
    return ERROR_DEPENDENT_RESOURCE_EXISTS;
  LONG rc = reg::deleteTree(HKEY_LOCAL_MACHINE, resourceKey(resource->name));
  return static_cast<DWORD>(rc);
}

HRESOURCE WINAPI CreateClusterResource(HGROUP hGroup, LPCWSTR lpszResourceName, LPCWSTR lpszResourceType,
                                       DWORD dwFlags) {
  kxlsim::ServiceCall call("CreateClusterResource");
  if (call.failing())
    return failWith(ERROR_NOT_ENOUGH_MEMORY, HRESOURCE{nullptr});
  GroupObject *group = liveGroup(hGroup);
  if (group == nullptr)
    return HRESOURCE{nullptr};
  std::string name, type, stored;
  if (!narrowName(lpszResourceName, name))
    return failWith(ERROR_INVALID_NAME, HRESOURCE{nullptr});
  if (!narrowName(lpszResourceType, type) || !findObject(kTypesKey, type, stored))
    return failWith(ERROR_RESOURCE_TYPE_NOT_FOUND, HRESOURCE{nullptr});
  if (findObject(kResourcesKey, name, stored))
    return failWith(ERROR_OBJECT_ALREADY_EXISTS, HRESOURCE{nullptr});
  // The cluster database takes a new resource whole.
  LONG rc =
      reg::writeKey(HKEY_LOCAL_MACHINE, resourceKey(name),
                    {reg::stringValue("Type", type), reg::stringValue("Group", group->name),
                     reg::multiStringValue("DependsOn", {}), reg::dwordValue("State", ClusterResourceOffline),
                     reg::dwordValue("SeparateMonitor", dwFlags & CLUSTER_RESOURCE_SEPARATE_MONITOR)});
  if (rc != ERROR_SUCCESS)
    return failWith(static_cast<DWORD>(rc), HRESOURCE{nullptr});
  auto resource = std::make_unique<ResourceObject>();
  resource->name = name;
  return handleFor<HRESOURCE>(std::move(resource));
}

CLUSTER_RESOURCE_STATE WINAPI GetClusterResourceState(HRESOURCE hResource, LPWSTR lpszNodeName,
                                                      LPDWORD lpcchNodeName, LPWSTR lpszGroupName,
                                                      LPDWORD lpcchGroupName) {
  kxlsim::ServiceCall call("GetClusterResourceState");
  if (call.failing())
    return failWith(ERROR_RESOURCE_NOT_FOUND, ClusterResourceStateUnknown);
  ResourceObject *resource = liveResource(hResource);
  if (resource == nullptr)
    return ClusterResourceStateUnknown;
  std::string group = resourceField(resource->name, "Group");
  DWORD rc = copyName(groupOwner(group), lpszNodeName, lpcchNodeName);
  DWORD groupRc = copyName(group, lpszGroupName, lpcchGroupName);
  if (rc != ERROR_SUCCESS || groupRc != ERROR_SUCCESS)
    return failWith(rc != ERROR_SUCCESS ? rc : groupRc, ClusterResourceStateUnknown);
  return static_cast<CLUSTER_RESOURCE_STATE>(resourceState(resource->name));
}

DWORD WINAPI DeleteClusterResourceType(HCLUSTER hCluster, LPCWSTR lpszResourceTypeName) {
  kxlsim::ServiceCall call("DeleteClusterResourceType");
  if (call.failing())
    return ERROR_RESOURCE_TYPE_NOT_FOUND;
  if (lookupHandleAs<ClusterObject>(asHandle(hCluster)) == nullptr)
    return ERROR_INVALID_HANDLE;
  std::string type, stored;
  if (!narrowName(lpszResourceTypeName, type) || !findObject(kTypesKey, type, stored))
    return ERROR_RESOURCE_TYPE_NOT_FOUND;
  if (!resourcesOfField("Type", stored).empty())
    return ERROR_DIR_NOT_EMPTY;
  return static_cast<DWORD>(reg::deleteTree(HKEY_LOCAL_MACHINE, std::string(kTypesKey) + "\\" + stored));
}

DWORD WINAPI CreateClusterResourceType(HCLUSTER hCluster, LPCWSTR lpszResourceTypeName,
                                       LPCWSTR lpszDisplayName, LPCWSTR lpszResourceTypeDll,
                                       DWORD dwLooksAlivePollInterval, DWORD dwIsAlivePollInterval) {
  kxlsim::ServiceCall call("CreateClusterResourceType");
  if (call.failing())
    return ERROR_NOT_ENOUGH_MEMORY;
  if (lookupHandleAs<ClusterObject>(asHandle(hCluster)) == nullptr)
    return ERROR_INVALID_HANDLE;
  std::string type, display, dll, stored;
  if (!narrowName(lpszResourceTypeName, type) || !narrowName(lpszDisplayName, display) ||
      !narrowName(lpszResourceTypeDll, dll))
    return ERROR_INVALID_PARAMETER;
  if (findObject(kTypesKey, type, stored))
    return ERROR_ALREADY_EXISTS;
  return static_cast<DWORD>(
      reg::writeKey(HKEY_LOCAL_MACHINE, std::string(kTypesKey) + "\\" + type,
                    {reg::stringValue("DisplayName", display), reg::stringValue("DllName", dll),
                     reg::dwordValue("LooksAlivePollInterval", dwLooksAlivePollInterval),
                     reg::dwordValue("IsAlivePollInterval", dwIsAlivePollInterval)}));
}

HRESTYPEENUM WINAPI ClusterResourceTypeOpenEnum(HCLUSTER hCluster, LPCWSTR lpszResourceTypeName,
                                                DWORD dwType) {
  kxlsim::ServiceCall call("ClusterResourceTypeOpenEnum");
  if (call.failing())
    return failWith(ERROR_NOT_ENOUGH_MEMORY, HRESTYPEENUM{nullptr});
  if (lookupHandleAs<ClusterObject>(asHandle(hCluster)) == nullptr)
    return failWith(ERROR_INVALID_HANDLE, HRESTYPEENUM{nullptr});
  std::string type, stored;
  if (!narrowName(lpszResourceTypeName, type) || !findObject(kTypesKey, type, stored))
    return failWith(ERROR_RESOURCE_TYPE_NOT_FOUND, HRESTYPEENUM{nullptr});
  std::vector<std::pair<DWORD, std::string>> items;
  if (dwType & CLUSTER_RESOURCE_TYPE_ENUM_NODES)
    appendAll(items, CLUSTER_RESOURCE_TYPE_ENUM_NODES, nodeNames());
  if (dwType & CLUSTER_RESOURCE_TYPE_ENUM_RESOURCES)
    appendAll(items, CLUSTER_RESOURCE_TYPE_ENUM_RESOURCES, resourcesOfField("Type", stored));
  return static_cast<HRESTYPEENUM>(openEnumeration(EnumKind::ResourceType, std::move(items)));
}

DWORD WINAPI ClusterResourceTypeEnum(HRESTYPEENUM hResTypeEnum, DWORD dwIndex, LPDWORD lpdwType,
                                     LPWSTR lpszName, LPDWORD lpcchName) {
  kxlsim::ServiceCall call("ClusterResourceTypeEnum");
  if (call.failing())
    return ERROR_NOT_ENOUGH_MEMORY;
  return enumerate(asHandle(hResTypeEnum), EnumKind::ResourceType, dwIndex, lpdwType, lpszName, lpcchName);
}

DWORD WINAPI ClusterResourceTypeCloseEnum(HRESTYPEENUM hResTypeEnum) {
  kxlsim::ServiceCall call("ClusterResourceTypeCloseEnum");
  if (call.failing())
    return ERROR_INVALID_HANDLE;
  return closeEnumeration(asHandle(hResTypeEnum), EnumKind::ResourceType);
}

DWORD WINAPI ClusterResourceCloseEnum(HRESENUM hResEnum) {
  kxlsim::ServiceCall call("ClusterResourceCloseEnum");
  if (call.failing())
    return ERROR_INVALID_HANDLE;
  return closeEnumeration(asHandle(hResEnum), EnumKind::Resource);
}

// The local node, or another machine of the world by its computer name.
DWORD WINAPI GetNodeClusterState(LPCWSTR lpszNodeName, LPDWORD pdwClusterState) {
  kxlsim::ServiceCall call("GetNodeClusterState");
  if (call.failing())
    return RPC_S_SERVER_UNAVAILABLE;
  if (pdwClusterState == nullptr)
    return ERROR_INVALID_PARAMETER;
  std::string node;
  if (lpszNodeName == nullptr ||
      (narrowName(lpszNodeName, node) && equalsIgnoringCase(node, localComputerName()))) {
    *pdwClusterState = nodeStateAt(kClusterKey);
    return ERROR_SUCCESS;
  }
  if (node.empty() || !reg::keyExists(HKEY_LOCAL_MACHINE, "SOFTWARE\\ZAV\\KXLSIM\\Machines\\" + node))
    return RPC_S_SERVER_UNAVAILABLE;
  *pdwClusterState = nodeStateAt(clusterKeyOfMachine(node));
  return ERROR_SUCCESS;
}

KXL_MODULE_ENTRY_POINTS_END

namespace kxlsim::posix {

const ModuleDefinition &clusapiModule() {
  using namespace clusapi;
  static const ModuleExport exports[] = {
      {"AddClusterResourceDependency", exportAddress(&AddClusterResourceDependency)},
      {"CloseCluster", exportAddress(&CloseCluster)},
      {"CloseClusterGroup", exportAddress(&CloseClusterGroup)},
      {"CloseClusterNode", exportAddress(&CloseClusterNode)},
      {"CloseClusterResource", exportAddress(&CloseClusterResource)},
      {"ClusterCloseEnum", exportAddress(&ClusterCloseEnum)},
      {"ClusterEnum", exportAddress(&ClusterEnum)},
      {"ClusterGroupCloseEnum", exportAddress(&ClusterGroupCloseEnum)},
      {"ClusterGroupEnum", exportAddress(&ClusterGroupEnum)},
      {"ClusterGroupOpenEnum", exportAddress(&ClusterGroupOpenEnum)},
      {"ClusterOpenEnum", exportAddress(&ClusterOpenEnum)},
      {"ClusterResourceCloseEnum", exportAddress(&ClusterResourceCloseEnum)},
      {"ClusterResourceControl", exportAddress(&ClusterResourceControl)},
      {"ClusterResourceEnum", exportAddress(&ClusterResourceEnum)},
      {"ClusterResourceOpenEnum", exportAddress(&ClusterResourceOpenEnum)},
      {"ClusterResourceTypeCloseEnum", exportAddress(&ClusterResourceTypeCloseEnum)},
      {"ClusterResourceTypeEnum", exportAddress(&ClusterResourceTypeEnum)},
      {"ClusterResourceTypeOpenEnum", exportAddress(&ClusterResourceTypeOpenEnum)},
      {"CreateClusterResource", exportAddress(&CreateClusterResource)},
      {"CreateClusterResourceType", exportAddress(&CreateClusterResourceType)},
      {"DeleteClusterGroup", exportAddress(&DeleteClusterGroup)},
      {"DeleteClusterResource", exportAddress(&DeleteClusterResource)},
      {"DeleteClusterResourceType", exportAddress(&DeleteClusterResourceType)},
      {"GetClusterGroupState", exportAddress(&GetClusterGroupState)},
      {"GetClusterResourceState", exportAddress(&GetClusterResourceState)},
      {"GetNodeClusterState", exportAddress(&GetNodeClusterState)},
      {"MoveClusterGroup", exportAddress(&MoveClusterGroup)},
      {"OfflineClusterGroup", exportAddress(&OfflineClusterGroup)},
      {"OfflineClusterResource", exportAddress(&OfflineClusterResource)},
      {"OnlineClusterGroup", exportAddress(&OnlineClusterGroup)},
      {"OnlineClusterResource", exportAddress(&OnlineClusterResource)},
      {"OpenCluster", exportAddress(&OpenCluster)},
      {"OpenClusterGroup", exportAddress(&OpenClusterGroup)},
      {"OpenClusterNode", exportAddress(&OpenClusterNode)},
      {"OpenClusterResource", exportAddress(&OpenClusterResource)},
  };
  static const ModuleDefinition definition{"clusapi.dll", exports, sizeof exports / sizeof exports[0]};
  return definition;
}

} // namespace kxlsim::posix
