// The cluster API ("clusapi.dll") and the resource utility library
// ("resutils.dll"), bound at run time by name. On Windows the types come from
// the system's cluster header; elsewhere they are declared here with Windows' values.
// Either way this header adds one function-pointer type per entry point the
// command looks up, named PFN_<entry point>.
#pragma once

#include "platform/win32.h"

#if defined(_WIN32)

// The toolchain's cluster header declares its newer types twice when it is
// asked for them; the entry points bound here all predate them. Its resource
// utility header does not build on its own, and only the service handle type
// of the three resource utility entry points is needed from it.
#include <winsvc.h>
#pragma push_macro("_WIN32_WINNT")
#undef _WIN32_WINNT
#define _WIN32_WINNT 0x0502
#include <clusapi.h>
#pragma pop_macro("_WIN32_WINNT")

#else // simulated Windows

typedef struct _HCLUSTER *HCLUSTER;
typedef struct _HNODE *HNODE;
typedef struct _HGROUP *HGROUP;
typedef struct _HRESOURCE *HRESOURCE;
typedef struct _HCLUSENUM *HCLUSENUM;
typedef struct _HGROUPENUM *HGROUPENUM;
typedef struct _HRESENUM *HRESENUM;
typedef struct _HRESTYPEENUM *HRESTYPEENUM;
struct SC_HANDLE__;
typedef SC_HANDLE__ *SC_HANDLE;
typedef SC_HANDLE *LPSC_HANDLE;

typedef enum NODE_CLUSTER_STATE {
  ClusterStateNotInstalled = 0x00000000,
  ClusterStateNotConfigured = 0x00000001,
  ClusterStateNotRunning = 0x00000003,
  ClusterStateRunning = 0x00000013
} NODE_CLUSTER_STATE;

typedef enum CLUSTER_RESOURCE_STATE {
  ClusterResourceStateUnknown = -1,
  ClusterResourceInherited = 0,
  ClusterResourceInitializing = 1,
  ClusterResourceOnline = 2,
  ClusterResourceOffline = 3,
  ClusterResourceFailed = 4,
  ClusterResourcePending = 128,
  ClusterResourceOnlinePending = 129,
  ClusterResourceOfflinePending = 130
} CLUSTER_RESOURCE_STATE;

typedef enum CLUSTER_GROUP_STATE {
  ClusterGroupStateUnknown = -1,
  ClusterGroupOnline = 0,
  ClusterGroupOffline = 1,
  ClusterGroupFailed = 2,
  ClusterGroupPartialOnline = 3,
  ClusterGroupPending = 4
} CLUSTER_GROUP_STATE;

typedef enum CLUSTER_ENUM {
  CLUSTER_ENUM_NODE = 0x00000001,
  CLUSTER_ENUM_RESTYPE = 0x00000002,
  CLUSTER_ENUM_RESOURCE = 0x00000004,
  CLUSTER_ENUM_GROUP = 0x00000008,
  CLUSTER_ENUM_NETWORK = 0x00000010,
  CLUSTER_ENUM_NETINTERFACE = 0x00000020
} CLUSTER_ENUM;

typedef enum CLUSTER_RESOURCE_ENUM {
  CLUSTER_RESOURCE_ENUM_DEPENDS = 0x00000001,
  CLUSTER_RESOURCE_ENUM_PROVIDES = 0x00000002,
  CLUSTER_RESOURCE_ENUM_NODES = 0x00000004
} CLUSTER_RESOURCE_ENUM;

typedef enum CLUSTER_RESOURCE_TYPE_ENUM {
  CLUSTER_RESOURCE_TYPE_ENUM_NODES = 0x00000001,
  CLUSTER_RESOURCE_TYPE_ENUM_RESOURCES = 0x00000002
} CLUSTER_RESOURCE_TYPE_ENUM;

typedef enum CLUSTER_GROUP_ENUM {
  CLUSTER_GROUP_ENUM_CONTAINS = 0x00000001,
  CLUSTER_GROUP_ENUM_NODES = 0x00000002
} CLUSTER_GROUP_ENUM;

typedef enum CLUSTER_RESOURCE_CREATE_FLAGS {
  CLUSTER_RESOURCE_DEFAULT_MONITOR = 0,
  CLUSTER_RESOURCE_SEPARATE_MONITOR = 1
} CLUSTER_RESOURCE_CREATE_FLAGS;

// Property list entries (the syntax word that starts each).
typedef enum CLUSTER_PROPERTY_SYNTAX {
  CLUSPROP_SYNTAX_ENDMARK = 0x00000000,
  CLUSPROP_SYNTAX_NAME = 0x00040003,
  CLUSPROP_SYNTAX_LIST_VALUE_DWORD = 0x00010002
} CLUSTER_PROPERTY_SYNTAX;

// Resource control codes.
#define CLUSCTL_RESOURCE_GET_NAME 0x01000029
#define CLUSCTL_RESOURCE_GET_RESOURCE_TYPE 0x0100002D
#define CLUSCTL_RESOURCE_GET_COMMON_PROPERTIES 0x01000059
#define CLUSCTL_RESOURCE_GET_PRIVATE_PROPERTIES 0x01000081
#define CLUSCTL_RESOURCE_SET_PRIVATE_PROPERTIES 0x01400086

// Property names of resource types and resources.
#define CLUSREG_NAME_RESTYPE_NAME u"Name"
#define CLUSREG_NAME_RESTYPE_DLL_NAME u"DllName"
#define CLUSREG_NAME_RESTYPE_LOOKS_ALIVE u"LooksAlivePollInterval"
#define CLUSREG_NAME_RESTYPE_IS_ALIVE u"IsAlivePollInterval"
#define CLUSREG_NAME_RES_TYPE u"Type"

// Cluster error codes.
#define ERROR_DEPENDENT_RESOURCE_EXISTS 5001L
#define ERROR_DEPENDENCY_NOT_FOUND 5002L
#define ERROR_DEPENDENCY_ALREADY_EXISTS 5003L
#define ERROR_RESOURCE_NOT_ONLINE 5004L
#define ERROR_RESOURCE_NOT_FOUND 5007L
#define ERROR_GROUP_NOT_FOUND 5013L
#define ERROR_RESOURCE_ONLINE 5019L
#define ERROR_OBJECT_ALREADY_EXISTS 5010L
#define ERROR_RESOURCE_TYPE_NOT_FOUND 5078L
#define ERROR_CIRCULAR_DEPENDENCY 1059L
#define ERROR_INVALID_FUNCTION 1L
#define RPC_S_SERVER_UNAVAILABLE 1722L

#endif // simulated Windows

typedef DWORD(WINAPI *PFN_MoveClusterGroup)(HGROUP hGroup, HNODE hDestinationNode);
typedef HCLUSTER(WINAPI *PFN_OpenCluster)(LPCWSTR lpszClusterName);
typedef BOOL(WINAPI *PFN_CloseCluster)(HCLUSTER hCluster);
typedef HGROUP(WINAPI *PFN_OpenClusterGroup)(HCLUSTER hCluster, LPCWSTR lpszGroupName);
typedef BOOL(WINAPI *PFN_CloseClusterGroup)(HGROUP hGroup);
typedef HNODE(WINAPI *PFN_OpenClusterNode)(HCLUSTER hCluster, LPCWSTR lpszNodeName);
typedef BOOL(WINAPI *PFN_CloseClusterNode)(HNODE hNode);
typedef HCLUSENUM(WINAPI *PFN_ClusterOpenEnum)(HCLUSTER hCluster, DWORD dwType);
typedef DWORD(WINAPI *PFN_ClusterEnum)(HCLUSENUM hEnum, DWORD dwIndex, LPDWORD lpdwType, LPWSTR lpszName,
                                       LPDWORD lpcchName);
typedef DWORD(WINAPI *PFN_ClusterCloseEnum)(HCLUSENUM hEnum);
typedef CLUSTER_GROUP_STATE(WINAPI *PFN_GetClusterGroupState)(HGROUP hGroup, LPWSTR lpszNodeName,
                                                              LPDWORD lpcchNodeName);
typedef HGROUPENUM(WINAPI *PFN_ClusterGroupOpenEnum)(HGROUP hGroup, DWORD dwType);
typedef DWORD(WINAPI *PFN_ClusterGroupEnum)(HGROUPENUM hGroupEnum, DWORD dwIndex, LPDWORD lpdwType,
                                            LPWSTR lpszResourceName, LPDWORD lpcchName);
typedef DWORD(WINAPI *PFN_ClusterResourceControl)(HRESOURCE hResource, HNODE hHostNode, DWORD dwControlCode,
                                                  LPVOID lpInBuffer, DWORD cbInBufferSize, LPVOID lpOutBuffer,
                                                  DWORD cbOutBufferSize, LPDWORD lpBytesReturned);
typedef DWORD(WINAPI *PFN_OnlineClusterGroup)(HGROUP hGroup, HNODE hDestinationNode);
typedef DWORD(WINAPI *PFN_OfflineClusterGroup)(HGROUP hGroup);
typedef DWORD(WINAPI *PFN_DeleteClusterGroup)(HGROUP hGroup);
typedef HRESENUM(WINAPI *PFN_ClusterResourceOpenEnum)(HRESOURCE hResource, DWORD dwType);
typedef DWORD(WINAPI *PFN_ClusterResourceEnum)(HRESENUM hResEnum, DWORD dwIndex, LPDWORD lpdwType,
                                               LPWSTR lpszName, LPDWORD lpcchName);
typedef DWORD(WINAPI *PFN_AddClusterResourceDependency)(HRESOURCE hResource, HRESOURCE hDependsOn);
typedef HRESOURCE(WINAPI *PFN_OpenClusterResource)(HCLUSTER hCluster, LPCWSTR lpszResourceName);
typedef BOOL(WINAPI *PFN_CloseClusterResource)(HRESOURCE hResource);
typedef DWORD(WINAPI *PFN_OnlineClusterResource)(HRESOURCE hResource);
typedef DWORD(WINAPI *PFN_OfflineClusterResource)(HRESOURCE hResource);
typedef DWORD(WINAPI *PFN_DeleteClusterResource)(HRESOURCE hResource);
typedef HRESOURCE(WINAPI *PFN_CreateClusterResource)(HGROUP hGroup, LPCWSTR lpszResourceName,
                                                     LPCWSTR lpszResourceType, DWORD dwFlags);
typedef CLUSTER_RESOURCE_STATE(WINAPI *PFN_GetClusterResourceState)(HRESOURCE hResource, LPWSTR lpszNodeName,
                                                                    LPDWORD lpcchNodeName,
                                                                    LPWSTR lpszGroupName,
                                                                    LPDWORD lpcchGroupName);
typedef DWORD(WINAPI *PFN_DeleteClusterResourceType)(HCLUSTER hCluster, LPCWSTR lpszResourceTypeName);
typedef DWORD(WINAPI *PFN_CreateClusterResourceType)(HCLUSTER hCluster, LPCWSTR lpszResourceTypeName,
                                                     LPCWSTR lpszDisplayName, LPCWSTR lpszResourceTypeDll,
                                                     DWORD dwLooksAlivePollInterval,
                                                     DWORD dwIsAlivePollInterval);
typedef HRESTYPEENUM(WINAPI *PFN_ClusterResourceTypeOpenEnum)(HCLUSTER hCluster, LPCWSTR lpszResourceTypeName,
                                                              DWORD dwType);
typedef DWORD(WINAPI *PFN_ClusterResourceTypeEnum)(HRESTYPEENUM hResTypeEnum, DWORD dwIndex, LPDWORD lpdwType,
                                                   LPWSTR lpszName, LPDWORD lpcchName);
typedef DWORD(WINAPI *PFN_ClusterResourceTypeCloseEnum)(HRESTYPEENUM hResTypeEnum);
typedef DWORD(WINAPI *PFN_ClusterResourceCloseEnum)(HRESENUM hResEnum);
typedef DWORD(WINAPI *PFN_GetNodeClusterState)(LPCWSTR lpszNodeName, LPDWORD pdwClusterState);
typedef DWORD(WINAPI *PFN_ResUtilStartResourceService)(LPCWSTR pszServiceName, LPSC_HANDLE phServiceHandle);
typedef DWORD(WINAPI *PFN_ResUtilStopResourceService)(LPCWSTR pszServiceName);
typedef BOOL(WINAPI *PFN_ResUtilResourceTypesEqual)(LPCWSTR lpszResourceTypeName, HRESOURCE hResource);
