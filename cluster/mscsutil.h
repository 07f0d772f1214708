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
  // The resources whose type name is exactly `typeName`, in enumeration order.
  ClusterResourceList GetResourcesOfType(const char *typeName);
  // Nonzero when resource `name` is of type `typeName`.
  int32_t IsResourceOfType(const char *name, const char *typeName);
  // The resources `name` depends on, in enumeration order, with empty groups.
  ClusterResourceList GetResourceDependencies(const char *name);
  // Deletes a resource; one that cannot be opened counts as deleted. 0 or -1.
  int32_t DeleteResource(const char *name);
  // Creates a resource in its own monitor: its open handle, or null. The
  // caller releases a non-null handle with CloseResource.
  HRESOURCE CreateResource(const char *groupName, const char *name, const char *typeName);
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
  // Appends resource `name` to `found` when its type name is exactly `wideType`.
  void AppendIfOfType(HCLUSTER cluster, const WCHAR *name, const WCHAR *wideType, ClusterResourceList &found);
};
