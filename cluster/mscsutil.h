// The cluster API, bound at run time so that the command starts on machines
// without the cluster feature, and the few cluster operations the upgrade of a
// clustered instance needs. Each operation opens the cluster handles it uses
// and closes them before it returns; between calls the object holds only the
// bound entry points and the two modules.
#pragma once

#include "platform/clusapi.h"
#include "platform/win32.h"

#include <cstdint>
#include <vector>

// Capacity of a resource or group name in an entry, terminator included.
inline constexpr int kClusterNameChars = 65;

// One cluster resource as the listings report it. Group fields are empty in
// dependency lists.
struct ClusterResourceEntry {
  WCHAR wideName[kClusterNameChars] = {};
  WCHAR wideGroup[kClusterNameChars] = {};
  char name[kClusterNameChars] = {};
  char group[kClusterNameChars] = {};
};

using ClusterResourceList = std::vector<ClusterResourceEntry>;

// What the cluster holds of one resource: whether it is listed and, when it
// is, its type, its group (in `entry`), its monitor and its dependencies.
struct ClusterResourceFacts {
  bool exists = false;
  ClusterResourceEntry entry;
  char type[kClusterNameChars] = {};
  bool separateMonitor = false;
  ClusterResourceList dependencies;
};

class MSCSUtil {
public:
  MSCSUtil() = default;
  // Frees "clusapi.dll", then "resutils.dll", each only when it was loaded.
  virtual ~MSCSUtil();
  MSCSUtil(const MSCSUtil &) = delete;
  MSCSUtil &operator=(const MSCSUtil &) = delete;

  // Loads both modules and binds all entry points: 0, or -1 at the first
  // missing module or entry point (what was loaded stays until destruction).
  int32_t LoadClusterApi();

  // Registers a resource type; one that already exists counts as registered. 0 or -1.
  int32_t CreateResourceType(LPCWSTR typeName, LPCWSTR displayName, LPCWSTR dllName, DWORD looksAlivePollMs,
                             DWORD isAlivePollMs);
  // Whether a resource type is registered: 1 or 0; -1 when that cannot be told.
  int32_t ResourceTypeExists(LPCWSTR typeName);
  // Unregisters a resource type that no resource uses; one that is not
  // registered counts as removed. 0 or -1.
  int32_t DeleteResourceType(LPCWSTR typeName);
  // The resources whose type name is exactly `typeName`, in enumeration order
  // (a name too long for an entry is passed over). 0, or -1 when the listing
  // or a listed resource's type or group cannot be read.
  int32_t GetResourcesOfType(const char *typeName, ClusterResourceList &found);
  // Nonzero when resource `name` is of type `typeName`.
  int32_t IsResourceOfType(const char *name, const char *typeName);
  // The resources `name` depends on, in enumeration order, with empty groups;
  // a name longer than an entry holds is left out. 0, or -1 when the resource
  // or its listing cannot be read.
  int32_t GetResourceDependencies(const char *name, ClusterResourceList &dependencies);
  // Reads resource `name` (its name ignoring case): not listed gives 0 with
  // `facts.exists` false. -1 when the listing or any fact cannot be read.
  int32_t ReadResource(const char *name, ClusterResourceFacts &facts);
  // Deletes a resource; one that cannot be opened counts as deleted. 0 or -1.
  int32_t DeleteResource(const char *name);
  // Creates a resource, in its own monitor unless `flags` say otherwise: its
  // open handle, or null. The caller releases a non-null handle with CloseResource.
  HRESOURCE CreateResource(const char *groupName, const char *name, const char *typeName,
                           DWORD flags = CLUSTER_RESOURCE_SEPARATE_MONITOR);
  // Releases a handle that CreateResource returned.
  void CloseResource(HRESOURCE resource);
  // Makes `name` depend on each listed resource that can be opened. 0, or -1
  // when adding any of them failed.
  int32_t AddResourceDependencies(const char *name, const ClusterResourceList &dependencies);

protected:
  PFN_MoveClusterGroup moveClusterGroup = nullptr;
  PFN_OpenCluster openCluster = nullptr;
  PFN_CloseCluster closeCluster = nullptr;
  PFN_OpenClusterGroup openClusterGroup = nullptr;
  PFN_CloseClusterGroup closeClusterGroup = nullptr;
  PFN_OpenClusterNode openClusterNode = nullptr;
  PFN_CloseClusterNode closeClusterNode = nullptr;
  PFN_ClusterOpenEnum clusterOpenEnum = nullptr;
  PFN_ClusterEnum clusterEnum = nullptr;
  PFN_ClusterCloseEnum clusterCloseEnum = nullptr;
  PFN_GetClusterGroupState getClusterGroupState = nullptr;
  PFN_ClusterGroupOpenEnum clusterGroupOpenEnum = nullptr;
  PFN_ClusterGroupEnum clusterGroupEnum = nullptr;
  PFN_ClusterResourceControl clusterResourceControl = nullptr;
  PFN_OnlineClusterGroup onlineClusterGroup = nullptr;
  PFN_OfflineClusterGroup offlineClusterGroup = nullptr;
  PFN_DeleteClusterGroup deleteClusterGroup = nullptr;
  PFN_ClusterResourceOpenEnum clusterResourceOpenEnum = nullptr;
  PFN_ClusterResourceEnum clusterResourceEnum = nullptr;
  PFN_AddClusterResourceDependency addClusterResourceDependency = nullptr;
  PFN_OpenClusterResource openClusterResource = nullptr;
  PFN_CloseClusterResource closeClusterResource = nullptr;
  PFN_OnlineClusterResource onlineClusterResource = nullptr;
  PFN_OfflineClusterResource offlineClusterResource = nullptr;
  PFN_DeleteClusterResource deleteClusterResource = nullptr;
  PFN_CreateClusterResource createClusterResource = nullptr;
  PFN_GetClusterResourceState getClusterResourceState = nullptr;
  PFN_DeleteClusterResourceType deleteClusterResourceType = nullptr;
  PFN_CreateClusterResourceType createClusterResourceType = nullptr;
  PFN_ClusterResourceTypeOpenEnum clusterResourceTypeOpenEnum = nullptr;
  PFN_ClusterResourceTypeEnum clusterResourceTypeEnum = nullptr;
  PFN_ClusterResourceTypeCloseEnum clusterResourceTypeCloseEnum = nullptr;
  PFN_ClusterResourceCloseEnum clusterResourceCloseEnum = nullptr;
  PFN_GetNodeClusterState getNodeClusterState = nullptr;
  PFN_ResUtilStartResourceService resUtilStartResourceService = nullptr;
  PFN_ResUtilStopResourceService resUtilStopResourceService = nullptr;
  PFN_ResUtilResourceTypesEqual resUtilResourceTypesEqual = nullptr;
  HMODULE clusapiModule = nullptr;
  HMODULE resutilsModule = nullptr;

private:
  bool BindClusapi();
  bool BindResutils();
  bool IsNodeRunning();
  // Runs `body` with the cluster opened for it (closed afterwards); `failed`
  // when the cluster does not open.
  template <typename R, typename Body> R WithCluster(R failed, Body body);
  // Runs `body` with the cluster and the wide form of `name`; -1 when the name
  // does not convert, the node's cluster service is not running or the
  // cluster does not open.
  template <typename Body> int32_t WithNamedInRunningCluster(const char *name, Body body);
  int32_t ReadDependencies(HCLUSTER cluster, const WCHAR *wideName, ClusterResourceList &dependencies);
  int32_t AddDependencies(HCLUSTER cluster, const WCHAR *wideName, const ClusterResourceList &dependencies);
  // Appends resource `name` to `found` when its type name is exactly
  // `wideType`; false when its type or group cannot be read.
  bool AppendIfOfType(HCLUSTER cluster, const WCHAR *name, const WCHAR *wideType, ClusterResourceList &found);
  // Calls `visit` for each resource name the cluster lists (a name too long
  // for an entry passed over) until it returns false; false when the listing fails.
  template <typename Visit> bool ForEachResource(HCLUSTER cluster, Visit visit);
  bool ReadListedResource(HCLUSTER cluster, const WCHAR *name, ClusterResourceFacts &facts);
  // Whether the cluster lists resource `name` (ignoring case): 1 or 0; -1 when the listing fails.
  int32_t IsListed(HCLUSTER cluster, const WCHAR *name);
  // A resource's type name, its group's name and its monitor; false when not read.
  bool ReadType(HRESOURCE resource, WCHAR (&type)[kClusterNameChars]);
  bool ReadGroup(HRESOURCE resource, WCHAR (&group)[kClusterNameChars]);
  bool ReadSeparateMonitor(HRESOURCE resource, bool &separate);
};
