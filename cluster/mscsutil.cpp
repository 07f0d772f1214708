#include "cluster/mscsutil.h"

#include <string>

namespace {

// The node state in which the cluster service answers.
constexpr DWORD kNodeRunning = 0x13;
// A resource type that is registered already.
constexpr DWORD kAlreadyExists = 183;
// Buffers for names the cluster hands out or takes that may be longer than an entry holds.
constexpr int kLongNameChars = 1024;

// A cluster handle that is closed, through its own close function, when it
// goes out of scope; a null handle is never closed.
template <typename H, typename R> class Opened {
public:
  Opened(H handle, R(WINAPI *close)(H)) : handle_(handle), close_(close) {}
  ~Opened() {
    if (handle_ != nullptr)
      close_(handle_);
  }
  Opened(const Opened &) = delete;
  Opened &operator=(const Opened &) = delete;
  H get() const { return handle_; }
  explicit operator bool() const { return handle_ != nullptr; }

private:
  H handle_;
  R(WINAPI *close_)(H);
};

template <typename F> bool bindEntry(HMODULE module, const char *name, F &slot) {
  slot = reinterpret_cast<F>(reinterpret_cast<void (*)()>(GetProcAddress(module, name)));
  return slot != nullptr;
}

// The whole terminated string into `capacity` wide characters. A string that
// does not fit becomes empty rather than cut, so it never names another object.
bool toWide(const char *text, WCHAR *out, int capacity) {
  if (text != nullptr && MultiByteToWideChar(CP_ACP, 0, text, -1, out, capacity) != 0)
    return true;
  out[0] = 0;
  return false;
}

void toNarrow(const WCHAR *text, char *out, int capacity) {
  if (WideCharToMultiByte(CP_ACP, 0, text, -1, out, capacity, nullptr, nullptr) == 0)
    out[0] = 0;
}

// Length of a wide string held in `capacity` characters; `capacity` when unterminated.
size_t boundedLength(const WCHAR *text, size_t capacity) {
  size_t length = 0;
  while (length < capacity && text[length] != 0)
    ++length;
  return length;
}

// Copies a wide name into an entry field; false (field empty) when it does not fit.
bool copyName(WCHAR *field, const WCHAR *name, size_t nameCapacity) {
  size_t length = boundedLength(name, nameCapacity);
  if (length >= static_cast<size_t>(kClusterNameChars)) {
    field[0] = 0;
    return false;
  }
  std::char_traits<WCHAR>::copy(field, name, length);
  field[length] = 0;
  return true;
}

ClusterResourceEntry makeEntry(const WCHAR *name, const WCHAR *group) {
  ClusterResourceEntry entry;
  copyName(entry.wideName, name, kClusterNameChars);
  copyName(entry.wideGroup, group, kClusterNameChars);
  toNarrow(entry.wideName, entry.name, kClusterNameChars);
  toNarrow(entry.wideGroup, entry.group, kClusterNameChars);
  return entry;
}

bool sameText(const WCHAR *left, const WCHAR *right) {
  return std::basic_string_view<WCHAR>(left) == std::basic_string_view<WCHAR>(right);
}

} // namespace

MSCSUtil::~MSCSUtil() {
  if (clusapiModule != nullptr)
    FreeLibrary(clusapiModule);
  if (resutilsModule != nullptr)
    FreeLibrary(resutilsModule);
}

int32_t MSCSUtil::LoadClusterApi() {
  if (resutilsModule == nullptr)
    resutilsModule = LoadLibraryA("resutils.dll");
  if (resutilsModule == nullptr)
    return -1;
  if (clusapiModule == nullptr)
    clusapiModule = LoadLibraryA("clusapi.dll");
  if (clusapiModule == nullptr)
    return -1;
  return BindClusapi() && BindResutils() ? 0 : -1;
}

// Looked up in a fixed order; the first missing entry point ends the binding.
bool MSCSUtil::BindClusapi() {
  HMODULE m = clusapiModule;
  return bindEntry(m, "MoveClusterGroup", moveClusterGroup) && bindEntry(m, "OpenCluster", openCluster) &&
         bindEntry(m, "CloseCluster", closeCluster) && bindEntry(m, "OpenClusterGroup", openClusterGroup) &&
         bindEntry(m, "CloseClusterGroup", closeClusterGroup) &&
         bindEntry(m, "OpenClusterNode", openClusterNode) &&
         bindEntry(m, "CloseClusterNode", closeClusterNode) &&
         bindEntry(m, "ClusterOpenEnum", clusterOpenEnum) && bindEntry(m, "ClusterEnum", clusterEnum) &&
         bindEntry(m, "ClusterCloseEnum", clusterCloseEnum) &&
         bindEntry(m, "GetClusterGroupState", getClusterGroupState) &&
         bindEntry(m, "ClusterGroupOpenEnum", clusterGroupOpenEnum) &&
         bindEntry(m, "ClusterGroupEnum", clusterGroupEnum) &&
         bindEntry(m, "OpenClusterResource", openClusterResource) &&
         bindEntry(m, "ClusterResourceCloseEnum", clusterResourceCloseEnum) &&
         bindEntry(m, "ClusterResourceEnum", clusterResourceEnum) &&
         bindEntry(m, "AddClusterResourceDependency", addClusterResourceDependency) &&
         bindEntry(m, "ClusterResourceOpenEnum", clusterResourceOpenEnum) &&
         bindEntry(m, "CloseClusterResource", closeClusterResource) &&
         bindEntry(m, "OnlineClusterResource", onlineClusterResource) &&
         bindEntry(m, "OfflineClusterResource", offlineClusterResource) &&
         bindEntry(m, "DeleteClusterResource", deleteClusterResource) &&
         bindEntry(m, "CreateClusterResource", createClusterResource) &&
         bindEntry(m, "DeleteClusterResourceType", deleteClusterResourceType) &&
         bindEntry(m, "CreateClusterResourceType", createClusterResourceType) &&
         bindEntry(m, "ClusterResourceTypeOpenEnum", clusterResourceTypeOpenEnum) &&
         bindEntry(m, "ClusterResourceTypeEnum", clusterResourceTypeEnum) &&
         bindEntry(m, "ClusterResourceTypeCloseEnum", clusterResourceTypeCloseEnum) &&
         bindEntry(m, "GetClusterResourceState", getClusterResourceState) &&
         bindEntry(m, "ClusterResourceControl", clusterResourceControl) &&
         bindEntry(m, "OnlineClusterGroup", onlineClusterGroup) &&
         bindEntry(m, "OfflineClusterGroup", offlineClusterGroup) &&
         bindEntry(m, "DeleteClusterGroup", deleteClusterGroup) &&
         bindEntry(m, "GetNodeClusterState", getNodeClusterState);
}

bool MSCSUtil::BindResutils() {
  HMODULE m = resutilsModule;
  return bindEntry(m, "ResUtilStartResourceService", resUtilStartResourceService) &&
         bindEntry(m, "ResUtilStopResourceService", resUtilStopResourceService) &&
         bindEntry(m, "ResUtilResourceTypesEqual", resUtilResourceTypesEqual);
}

bool MSCSUtil::IsNodeRunning() {
  DWORD state = 0;
  return getNodeClusterState(nullptr, &state) == ERROR_SUCCESS && state == kNodeRunning;
}

int32_t MSCSUtil::CreateResourceType(LPCWSTR typeName, LPCWSTR displayName, LPCWSTR dllName,
                                     DWORD looksAlivePollMs, DWORD isAlivePollMs) {
  if (!IsNodeRunning())
    return -1;
  Opened cluster(openCluster(nullptr), closeCluster);
  if (!cluster)
    return -1;
  DWORD rc = createClusterResourceType(cluster.get(), typeName, displayName, dllName, looksAlivePollMs,
                                       isAlivePollMs);
  return rc == ERROR_SUCCESS || rc == kAlreadyExists ? 0 : -1;
}

ClusterResourceList MSCSUtil::GetResourcesOfType(const char *typeName) {
  ClusterResourceList found;
  WCHAR wideType[kClusterNameChars];
  if (!toWide(typeName, wideType, kClusterNameChars) || !IsNodeRunning())
    return found;
  Opened cluster(openCluster(nullptr), closeCluster);
  if (!cluster)
    return found;
  Opened listing(clusterOpenEnum(cluster.get(), CLUSTER_ENUM_RESOURCE), clusterCloseEnum);
  if (!listing)
    return found;
  WCHAR name[kClusterNameChars];
  DWORD objectType = 0;
  // Any failure ends the listing, a name too long for an entry included.
  for (DWORD index = 0;; ++index) {
    DWORD size = kClusterNameChars;
    if (clusterEnum(listing.get(), index, &objectType, name, &size) != ERROR_SUCCESS)
      break;
    AppendIfOfType(cluster.get(), name, wideType, found);
  }
  return found;
}

void MSCSUtil::AppendIfOfType(HCLUSTER cluster, const WCHAR *name, const WCHAR *wideType,
                              ClusterResourceList &found) {
  Opened resource(openClusterResource(cluster, name), closeClusterResource);
  if (!resource)
    return;
  WCHAR type[kClusterNameChars] = {};
  DWORD returned = 0;
  // A type that cannot be read matches nothing.
  if (clusterResourceControl(resource.get(), nullptr, CLUSCTL_RESOURCE_GET_RESOURCE_TYPE, nullptr, 0, type,
                             sizeof type, &returned) != ERROR_SUCCESS)
    return;
  type[kClusterNameChars - 1] = 0;
  if (!sameText(type, wideType))
    return;
  WCHAR group[kClusterNameChars] = {};
  DWORD groupSize = kClusterNameChars;
  getClusterResourceState(resource.get(), nullptr, nullptr, group, &groupSize);
  group[kClusterNameChars - 1] = 0;
  found.push_back(makeEntry(name, group));
}

int32_t MSCSUtil::IsResourceOfType(const char *name, const char *typeName) {
  WCHAR wideName[kClusterNameChars];
  WCHAR wideType[kLongNameChars];
  if (!toWide(name, wideName, kClusterNameChars) || !toWide(typeName, wideType, kLongNameChars) ||
      !IsNodeRunning())
    return 0;
  Opened cluster(openCluster(nullptr), closeCluster);
  if (!cluster)
    return 0;
  Opened resource(openClusterResource(cluster.get(), wideName), closeClusterResource);
  if (!resource)
    return 0;
  return resUtilResourceTypesEqual(wideType, resource.get()) ? 1 : 0;
}

ClusterResourceList MSCSUtil::GetResourceDependencies(const char *name) {
  ClusterResourceList dependencies;
  WCHAR wideName[kClusterNameChars];
  if (!toWide(name, wideName, kClusterNameChars))
    return dependencies;
  Opened cluster(openCluster(nullptr), closeCluster);
  if (!cluster)
    return dependencies;
  Opened resource(openClusterResource(cluster.get(), wideName), closeClusterResource);
  if (!resource)
    return dependencies;
  Opened listing(clusterResourceOpenEnum(resource.get(), CLUSTER_RESOURCE_ENUM_DEPENDS),
                 clusterResourceCloseEnum);
  if (!listing)
    return dependencies;
  WCHAR dependency[kLongNameChars];
  static const WCHAR noGroup[1] = {0};
  DWORD type = 0;
  for (DWORD index = 0;; ++index) {
    DWORD size = kLongNameChars;
    if (clusterResourceEnum(listing.get(), index, &type, dependency, &size) != ERROR_SUCCESS)
      break;
    // A name longer than an entry holds is left out rather than cut into another name.
    if (boundedLength(dependency, kLongNameChars) < static_cast<size_t>(kClusterNameChars))
      dependencies.push_back(makeEntry(dependency, noGroup));
  }
  return dependencies;
}

int32_t MSCSUtil::DeleteResource(const char *name) {
  WCHAR wideName[kClusterNameChars];
  bool fits = toWide(name, wideName, kClusterNameChars);
  if (!IsNodeRunning())
    return -1;
  Opened cluster(openCluster(nullptr), closeCluster);
  if (!cluster)
    return -1;
  if (!fits)
    return 0; // no resource has such a name
  Opened resource(openClusterResource(cluster.get(), wideName), closeClusterResource);
  if (!resource)
    return 0;
  return deleteClusterResource(resource.get()) == ERROR_SUCCESS ? 0 : -1;
}

HRESOURCE MSCSUtil::CreateResource(const char *groupName, const char *name, const char *typeName) {
  WCHAR wideGroup[kClusterNameChars];
  WCHAR wideName[kClusterNameChars];
  WCHAR wideType[kClusterNameChars];
  if (!toWide(groupName, wideGroup, kClusterNameChars) || !toWide(name, wideName, kClusterNameChars) ||
      !toWide(typeName, wideType, kClusterNameChars) || !IsNodeRunning())
    return nullptr;
  Opened cluster(openCluster(nullptr), closeCluster);
  if (!cluster)
    return nullptr;
  Opened group(openClusterGroup(cluster.get(), wideGroup), closeClusterGroup);
  if (!group)
    return nullptr;
  return createClusterResource(group.get(), wideName, wideType, CLUSTER_RESOURCE_SEPARATE_MONITOR);
}

void MSCSUtil::CloseResource(HRESOURCE resource) {
  if (resource != nullptr)
    closeClusterResource(resource);
}

int32_t MSCSUtil::AddResourceDependencies(const char *name, const ClusterResourceList &dependencies) {
  WCHAR wideName[kClusterNameChars];
  toWide(name, wideName, kClusterNameChars);
  Opened cluster(openCluster(nullptr), closeCluster);
  if (!cluster)
    return -1;
  Opened resource(openClusterResource(cluster.get(), wideName), closeClusterResource);
  if (!resource)
    return -1;
  int32_t result = 0;
  for (const ClusterResourceEntry &entry : dependencies) {
    WCHAR dependencyName[kClusterNameChars];
    copyName(dependencyName, entry.wideName, kClusterNameChars);
    Opened dependency(openClusterResource(cluster.get(), dependencyName), closeClusterResource);
    if (!dependency)
      continue;
    if (addClusterResourceDependency(resource.get(), dependency.get()) != ERROR_SUCCESS)
      result = -1;
  }
  return result;
}
