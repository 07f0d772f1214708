#include "cluster/mscsutil.h"

#include "install/ilist.h"

#include <algorithm>
#include <cstring>
#include <iterator>
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

// False (and `out` empty) when the text cannot be converted: a name that
// could not be read, never an empty one.
bool toNarrow(const WCHAR *text, char *out, int capacity) {
  if (WideCharToMultiByte(CP_ACP, 0, text, -1, out, capacity, nullptr, nullptr) != 0)
    return true;
  out[0] = 0;
  return false;
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

// An entry of both forms of a name and its group; false when either cannot be converted.
bool makeEntry(const WCHAR *name, const WCHAR *group, ClusterResourceEntry &entry) {
  entry = ClusterResourceEntry{};
  copyName(entry.wideName, name, kClusterNameChars);
  copyName(entry.wideGroup, group, kClusterNameChars);
  bool named = toNarrow(entry.wideName, entry.name, kClusterNameChars);
  return (toNarrow(entry.wideGroup, entry.group, kClusterNameChars) || group[0] == 0) && named;
}

bool sameText(const WCHAR *left, const WCHAR *right) {
  return std::basic_string_view<WCHAR>(left) == std::basic_string_view<WCHAR>(right);
}

// Reads one DWORD of a property list at `at`, moving past it; false past the end.
bool takeDword(const std::vector<unsigned char> &list, size_t &at, DWORD &value) {
  if (list.size() < 4 || at > list.size() - 4)
    return false;
  value = DWORD(list[at]) | DWORD(list[at + 1]) << 8 | DWORD(list[at + 2]) << 16 | DWORD(list[at + 3]) << 24;
  at += 4;
  return true;
}

// Skips a value of `bytes` bytes padded to whole DWORDs; false past the end.
bool skipPadded(const std::vector<unsigned char> &list, size_t &at, DWORD bytes) {
  size_t padded = (size_t(bytes) + 3) / 4 * 4;
  if (padded > list.size() - at)
    return false;
  at += padded;
  return true;
}

// The DWORD property `wanted` of a property list; false when the list does not hold it.
bool dwordProperty(const std::vector<unsigned char> &list, const char16_t *wanted, DWORD &value) {
  size_t at = 0;
  DWORD count = 0;
  if (!takeDword(list, at, count))
    return false;
  for (DWORD i = 0; i < count; ++i) {
    DWORD syntax = 0, bytes = 0;
    if (!takeDword(list, at, syntax) || syntax != CLUSPROP_SYNTAX_NAME || !takeDword(list, at, bytes))
      return false;
    size_t nameAt = at;
    if (!skipPadded(list, at, bytes))
      return false;
    std::u16string name(bytes / 2, u'\0');
    std::memcpy(name.data(), list.data() + nameAt, name.size() * 2);
    name.resize(std::char_traits<char16_t>::length(name.c_str()));
    DWORD valueSyntax = 0, valueBytes = 0;
    if (!takeDword(list, at, valueSyntax) || !takeDword(list, at, valueBytes))
      return false;
    size_t valueAt = at;
    if (!skipPadded(list, at, valueBytes))
      return false;
    if (name == wanted && valueSyntax == CLUSPROP_SYNTAX_LIST_VALUE_DWORD && valueBytes == 4)
      return takeDword(list, valueAt, value);
    DWORD endMark = 0;
    if (!takeDword(list, at, endMark) || endMark != CLUSPROP_SYNTAX_ENDMARK)
      return false;
  }
  return false;
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

template <typename R, typename Body> R MSCSUtil::WithCluster(R failed, Body body) {
  Opened cluster(openCluster(nullptr), closeCluster);
  return cluster ? body(cluster.get()) : failed;
}

template <typename Body> int32_t MSCSUtil::WithNamedInRunningCluster(const char *name, Body body) {
  WCHAR wideName[kClusterNameChars];
  if (!toWide(name, wideName, kClusterNameChars) || !IsNodeRunning())
    return -1;
  return WithCluster(-1,
                     [&](HCLUSTER cluster) { return body(cluster, static_cast<const WCHAR *>(wideName)); });
}

int32_t MSCSUtil::CreateResourceType(LPCWSTR typeName, LPCWSTR displayName, LPCWSTR dllName,
                                     DWORD looksAlivePollMs, DWORD isAlivePollMs) {
  if (!IsNodeRunning())
    return -1;
  return WithCluster(-1, [&](HCLUSTER cluster) {
    DWORD rc =
        createClusterResourceType(cluster, typeName, displayName, dllName, looksAlivePollMs, isAlivePollMs);
    return rc == ERROR_SUCCESS || rc == kAlreadyExists ? 0 : -1;
  });
}

int32_t MSCSUtil::ResourceTypeExists(LPCWSTR typeName) {
  return WithCluster(-1, [&](HCLUSTER cluster) {
    Opened listing(clusterResourceTypeOpenEnum(cluster, typeName, CLUSTER_RESOURCE_TYPE_ENUM_NODES),
                   clusterResourceTypeCloseEnum);
    if (listing)
      return 1;
    return GetLastError() == ERROR_RESOURCE_TYPE_NOT_FOUND ? 0 : -1;
  });
}

int32_t MSCSUtil::DeleteResourceType(LPCWSTR typeName) {
  return WithCluster(-1, [&](HCLUSTER cluster) {
    DWORD rc = deleteClusterResourceType(cluster, typeName);
    return rc == ERROR_SUCCESS || rc == ERROR_RESOURCE_TYPE_NOT_FOUND ? 0 : -1;
  });
}

template <typename Visit> bool MSCSUtil::ForEachResource(HCLUSTER cluster, Visit visit) {
  Opened listing(clusterOpenEnum(cluster, CLUSTER_ENUM_RESOURCE), clusterCloseEnum);
  if (!listing)
    return false;
  WCHAR name[kClusterNameChars];
  DWORD objectType = 0;
  for (DWORD index = 0;; ++index) {
    DWORD size = kClusterNameChars;
    DWORD rc = clusterEnum(listing.get(), index, &objectType, name, &size);
    if (rc == ERROR_NO_MORE_ITEMS)
      return true;
    if (rc == ERROR_MORE_DATA)
      continue; // no resource of the upgrade has such a name
    if (rc != ERROR_SUCCESS)
      return false;
    if (!visit(name))
      return true;
  }
}

int32_t MSCSUtil::GetResourcesOfType(const char *typeName, ClusterResourceList &found) {
  found.clear();
  return WithNamedInRunningCluster(typeName, [&](HCLUSTER cluster, const WCHAR *wideType) {
    bool read = true;
    bool listed = ForEachResource(cluster, [&](const WCHAR *name) {
      read = AppendIfOfType(cluster, name, wideType, found);
      return read;
    });
    return listed && read ? 0 : -1;
  });
}

bool MSCSUtil::ReadType(HRESOURCE resource, WCHAR (&type)[kClusterNameChars]) {
  std::fill(std::begin(type), std::end(type), WCHAR(0));
  DWORD returned = 0;
  if (clusterResourceControl(resource, nullptr, CLUSCTL_RESOURCE_GET_RESOURCE_TYPE, nullptr, 0, type,
                             sizeof type, &returned) != ERROR_SUCCESS)
    return false;
  type[kClusterNameChars - 1] = 0;
  return true;
}

bool MSCSUtil::ReadGroup(HRESOURCE resource, WCHAR (&group)[kClusterNameChars]) {
  std::fill(std::begin(group), std::end(group), WCHAR(0));
  DWORD groupSize = kClusterNameChars;
  if (getClusterResourceState(resource, nullptr, nullptr, group, &groupSize) == ClusterResourceStateUnknown)
    return false;
  group[kClusterNameChars - 1] = 0;
  return true;
}

bool MSCSUtil::ReadSeparateMonitor(HRESOURCE resource, bool &separate) {
  std::vector<unsigned char> properties(kLongNameChars);
  DWORD returned = 0;
  DWORD rc = clusterResourceControl(resource, nullptr, CLUSCTL_RESOURCE_GET_COMMON_PROPERTIES, nullptr, 0,
                                    properties.data(), DWORD(properties.size()), &returned);
  if (rc == ERROR_MORE_DATA) {
    properties.resize(returned);
    rc = clusterResourceControl(resource, nullptr, CLUSCTL_RESOURCE_GET_COMMON_PROPERTIES, nullptr, 0,
                                properties.data(), DWORD(properties.size()), &returned);
  }
  DWORD value = 0;
  if (rc != ERROR_SUCCESS || returned > properties.size())
    return false;
  properties.resize(returned);
  if (!dwordProperty(properties, u"SeparateMonitor", value))
    return false;
  separate = value != 0;
  return true;
}

bool MSCSUtil::AppendIfOfType(HCLUSTER cluster, const WCHAR *name, const WCHAR *wideType,
                              ClusterResourceList &found) {
  Opened resource(openClusterResource(cluster, name), closeClusterResource);
  WCHAR type[kClusterNameChars];
  if (!resource || !ReadType(resource.get(), type))
    return false;
  if (!sameText(type, wideType))
    return true;
  WCHAR group[kClusterNameChars];
  if (!ReadGroup(resource.get(), group))
    return false;
  ClusterResourceEntry entry;
  if (!makeEntry(name, group, entry))
    return false;
  found.push_back(entry);
  return true;
}

// Cluster object names compare ignoring case.
int32_t MSCSUtil::IsListed(HCLUSTER cluster, const WCHAR *name) {
  bool listed = false;
  if (!ForEachResource(cluster, [&](const WCHAR *listedAs) {
        listed = kxliSameText(listedAs, name, SIZE_MAX);
        return !listed;
      }))
    return -1;
  return listed ? 1 : 0;
}

int32_t MSCSUtil::ReadResource(const char *name, ClusterResourceFacts &facts) {
  facts = ClusterResourceFacts{};
  return WithNamedInRunningCluster(name, [&](HCLUSTER cluster, const WCHAR *wideName) {
    int32_t listed = IsListed(cluster, wideName);
    if (listed < 0)
      return -1;
    facts.exists = listed == 1;
    return !facts.exists || ReadListedResource(cluster, wideName, facts) ? 0 : -1;
  });
}

bool MSCSUtil::ReadListedResource(HCLUSTER cluster, const WCHAR *name, ClusterResourceFacts &facts) {
  Opened resource(openClusterResource(cluster, name), closeClusterResource);
  WCHAR type[kClusterNameChars], group[kClusterNameChars];
  if (!resource || !ReadType(resource.get(), type) || !ReadGroup(resource.get(), group) ||
      !ReadSeparateMonitor(resource.get(), facts.separateMonitor))
    return false;
  if (!toNarrow(type, facts.type, kClusterNameChars) || !makeEntry(name, group, facts.entry))
    return false;
  return GetResourceDependencies(facts.entry.name, facts.dependencies) == 0;
}

int32_t MSCSUtil::IsResourceOfType(const char *name, const char *typeName) {
  WCHAR wideName[kClusterNameChars];
  WCHAR wideType[kLongNameChars];
  if (!toWide(name, wideName, kClusterNameChars) || !toWide(typeName, wideType, kLongNameChars) ||
      !IsNodeRunning())
    return 0;
  return WithCluster(0, [&](HCLUSTER cluster) {
    Opened resource(openClusterResource(cluster, wideName), closeClusterResource);
    if (!resource)
      return 0;
    return resUtilResourceTypesEqual(wideType, resource.get()) ? 1 : 0;
  });
}

int32_t MSCSUtil::GetResourceDependencies(const char *name, ClusterResourceList &dependencies) {
  dependencies.clear();
  WCHAR wideName[kClusterNameChars];
  if (!toWide(name, wideName, kClusterNameChars))
    return -1;
  return WithCluster(-1, [&](HCLUSTER cluster) { return ReadDependencies(cluster, wideName, dependencies); });
}

int32_t MSCSUtil::ReadDependencies(HCLUSTER cluster, const WCHAR *wideName,
                                   ClusterResourceList &dependencies) {
  Opened resource(openClusterResource(cluster, wideName), closeClusterResource);
  if (!resource)
    return -1;
  Opened listing(clusterResourceOpenEnum(resource.get(), CLUSTER_RESOURCE_ENUM_DEPENDS),
                 clusterResourceCloseEnum);
  if (!listing)
    return -1;
  WCHAR dependency[kLongNameChars];
  static const WCHAR noGroup[1] = {0};
  DWORD type = 0;
  for (DWORD index = 0;; ++index) {
    DWORD size = kLongNameChars;
    DWORD rc = clusterResourceEnum(listing.get(), index, &type, dependency, &size);
    if (rc == ERROR_NO_MORE_ITEMS)
      return 0;
    if (rc != ERROR_SUCCESS)
      return -1;
    // A name longer than an entry holds is left out rather than cut into another name.
    if (boundedLength(dependency, kLongNameChars) >= static_cast<size_t>(kClusterNameChars))
      continue;
    ClusterResourceEntry entry;
    if (!makeEntry(dependency, noGroup, entry))
      return -1;
    dependencies.push_back(entry);
  }
}

int32_t MSCSUtil::DeleteResource(const char *name) {
  WCHAR wideName[kClusterNameChars];
  bool fits = toWide(name, wideName, kClusterNameChars);
  if (!IsNodeRunning())
    return -1;
  return WithCluster(-1, [&](HCLUSTER cluster) {
    if (!fits)
      return 0; // no resource has such a name
    Opened resource(openClusterResource(cluster, wideName), closeClusterResource);
    if (!resource)
      return 0;
    return deleteClusterResource(resource.get()) == ERROR_SUCCESS ? 0 : -1;
  });
}

HRESOURCE MSCSUtil::CreateResource(const char *groupName, const char *name, const char *typeName,
                                   DWORD flags) {
  WCHAR wideGroup[kClusterNameChars];
  WCHAR wideName[kClusterNameChars];
  WCHAR wideType[kClusterNameChars];
  if (!toWide(groupName, wideGroup, kClusterNameChars) || !toWide(name, wideName, kClusterNameChars) ||
      !toWide(typeName, wideType, kClusterNameChars) || !IsNodeRunning())
    return nullptr;
  return WithCluster(HRESOURCE(nullptr), [&](HCLUSTER cluster) {
    Opened group(openClusterGroup(cluster, wideGroup), closeClusterGroup);
    if (!group)
      return HRESOURCE(nullptr);
    return createClusterResource(group.get(), wideName, wideType, flags);
  });
}

void MSCSUtil::CloseResource(HRESOURCE resource) {
  if (resource != nullptr)
    closeClusterResource(resource);
}

int32_t MSCSUtil::AddResourceDependencies(const char *name, const ClusterResourceList &dependencies) {
  WCHAR wideName[kClusterNameChars];
  toWide(name, wideName, kClusterNameChars);
  return WithCluster(-1, [&](HCLUSTER cluster) { return AddDependencies(cluster, wideName, dependencies); });
}

int32_t MSCSUtil::AddDependencies(HCLUSTER cluster, const WCHAR *wideName,
                                  const ClusterResourceList &dependencies) {
  Opened resource(openClusterResource(cluster, wideName), closeClusterResource);
  if (!resource)
    return -1;
  int32_t result = 0;
  for (const ClusterResourceEntry &entry : dependencies) {
    // By the narrow name, which every entry has (a journal read back holds no other).
    WCHAR dependencyName[kClusterNameChars];
    if (!toWide(entry.name, dependencyName, kClusterNameChars)) {
      result = -1;
      continue;
    }
    Opened dependency(openClusterResource(cluster, dependencyName), closeClusterResource);
    // A dependency that is gone is passed over; one the cluster still lists is not.
    if (!dependency) {
      if (IsListed(cluster, dependencyName) != 0)
        result = -1;
      continue;
    }
    if (addClusterResourceDependency(resource.get(), dependency.get()) != ERROR_SUCCESS)
      result = -1;
  }
  return result;
}
