// The cluster of the simulated machine, kept in its registry under
// SOFTWARE\ZAV\KXLSIM\Cluster: "NodeState", ResourceTypes\<type>,
// Groups\<group>, Resources\<name> ("Type", "Group", "DependsOn", "State"),
// and optionally Nodes\<node> (else the local computer is the only node).
// A resource named like a service of the node owning its group is online
// exactly while that service runs.
// Shared by the cluster API and the resource utility library.
#pragma once

#include "platform/clusapi.h"
#include "sim/posix/handles.h"

#include <string>
#include <vector>

// The entry points of a module: in the simulated machine's own namespace, or,
// in the Windows build where each module is a DLL, the DLL's exports.
#ifdef _WIN32
#define KXL_MODULE_ENTRY_POINTS(module)                                                                      \
  namespace kxlsim::posix::module {}                                                                         \
  extern "C" {
#define KXL_MODULE_ENTRY_POINTS_END }
#else
#define KXL_MODULE_ENTRY_POINTS(module) namespace kxlsim::posix::module {
#define KXL_MODULE_ENTRY_POINTS_END }
#endif

namespace kxlsim::posix::cluster {

constexpr const char *kClusterKey = "SOFTWARE\\ZAV\\KXLSIM\\Cluster";
constexpr const char *kResourcesKey = "SOFTWARE\\ZAV\\KXLSIM\\Cluster\\Resources";
constexpr const char *kGroupsKey = "SOFTWARE\\ZAV\\KXLSIM\\Cluster\\Groups";
constexpr const char *kTypesKey = "SOFTWARE\\ZAV\\KXLSIM\\Cluster\\ResourceTypes";
constexpr const char *kNodesKey = "SOFTWARE\\ZAV\\KXLSIM\\Cluster\\Nodes";

// The machine's services and their "State" values, which resource states follow.
constexpr const char *kServicesKey = "SOFTWARE\\ZAV\\KXLSIM\\Services";
constexpr DWORD kServiceStopped = 1;
constexpr DWORD kServiceRunning = 4;

// Cluster handles live in the kernel-object table but only their own Close*
// functions close them.
struct ClusterHandle : HandleObject {
  bool closableByCloseHandle() const override { return false; }
};

struct ClusterObject : ClusterHandle {};

// A group, resource or node, by its name as stored.
struct NamedObject : ClusterHandle {
  std::string name;
};
struct GroupObject : NamedObject {};
struct ResourceObject : NamedObject {};
struct NodeObject : NamedObject {};

// Narrow (ANSI) form of a cluster object name; false for a null or empty
// name, one the ANSI code page cannot hold, or one with a backslash.
bool narrowName(LPCWSTR wide, std::string &narrow);
std::u16string wideName(const std::string &narrow);

// The stored spelling of `name` among the subkeys of `parent`; false when none.
bool findObject(const char *parent, const std::string &name, std::string &stored);

std::string resourceKey(const std::string &name);

std::string localComputerName();
// The cluster key of another machine of the world.
std::string clusterKeyOfMachine(const std::string &computer);
// The state of the cluster service on the node whose cluster key is `key`.
DWORD nodeStateAt(const std::string &key);
// The state of the cluster service on a node, the local one or another.
DWORD nodeStateOf(const std::string &computer);
// The cluster's nodes; the local computer alone when none are listed.
std::vector<std::string> nodeNames();

std::string resourceField(const std::string &resource, const char *field);
std::string groupKey(const std::string &group);
// The node owning a group; the local computer when none is recorded.
std::string groupOwner(const std::string &group);
// The key of the service that a resource of the same name runs as on the
// node owning its group; false when that node has no such service.
bool resourceServiceKey(const std::string &resource, std::string &key);
// A resource's state as the cluster reports it.
DWORD resourceState(const std::string &resource);

// A resource handle whose resource still exists, or null (error set).
ResourceObject *liveResource(HRESOURCE handle);

} // namespace kxlsim::posix::cluster
