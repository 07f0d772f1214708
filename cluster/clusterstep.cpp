#include "cluster/clusterstep.h"

#include "cluster/mscsutil.h"
#include "install/kxlinstance.h"
#include "platform/kxlsys.h"
#include "upgrade/records.h"

#include <cstdlib>
#include <cstring>

namespace {

constexpr char kOldType[] = "KXL";
constexpr char kNewType[] = "KXL Server";
constexpr char kNewTypeDll[] = "kxlserver.dll";
constexpr DWORD kLooksAlivePollMs = 5000;
constexpr DWORD kIsAlivePollMs = 60000;
constexpr char kNodesFile[] = "\\kxlnodes.cfg";
constexpr size_t kPartitionNameSize = 30;
constexpr size_t kInstanceNameSize = 9;
constexpr size_t kPathSize = 261;

// Trace points.
constexpr uint32_t kProbeApi = 10;
constexpr uint32_t kProbeType = 20;
constexpr uint32_t kProbeName = 30;
constexpr uint32_t kProbeDeleteResult = 47;
constexpr uint32_t kProbeDelete = 50;
constexpr uint32_t kProbeGone = 60;
constexpr uint32_t kProbeBackWithoutDependencies = 65;
constexpr uint32_t kProbeBack = 70;
constexpr uint32_t kProbeDependencies = 80;

// A short ASCII constant as the cluster API's wide text.
template <size_t N> struct Wide {
  explicit Wide(const char (&text)[N]) {
    for (size_t i = 0; i < N; ++i)
      chars[i] = static_cast<WCHAR>(static_cast<unsigned char>(text[i]));
  }
  WCHAR chars[N];
};

int32_t failed(uint32_t probe, int32_t rc) {
  pdtError(KXL_FN_UPGRADE_CLUSTER_INSTANCE, probe, rc);
  return rc;
}

bool sameName(const char *a, const char *b) {
  return std::strlen(a) == std::strlen(b) && sqlomcpi(a, b, 0) == 0;
}

// The instance directory's nodes file, quoted when the directory is; a path
// that does not fit is cut at 260 characters. False when the directory cannot
// be had: "\kxlnodes.cfg" of the current drive could be another instance's.
bool nodesFilePath(const IKXLINSTANCE &instance, char (&path)[kPathSize]) {
  std::memset(path, 0, sizeof path);
  if (instance.GetInstanceDir(path, sizeof path) != 0 || path[0] == '\0')
    return false;
  size_t length = std::strlen(path);
  if (path[length - 1] == '"')
    path[--length] = '\0';
  std::strncat(path, kNodesFile, sizeof path - 1 - length);
  length = std::strlen(path);
  if (path[0] == '"' && length < sizeof path - 1) {
    path[length] = '"';
    path[length + 1] = '\0';
  }
  return true;
}

// A node list read from the instance's nodes file for one membership test,
// released when the test is done.
class NodesFile {
public:
  NodesFile(const IKXLINSTANCE &instance, const UpgradeOptions &options) {
    char path[kPathSize];
    if (!nodesFilePath(instance, path))
      return;
    uint32_t entries = 0, maxNode = 0;
    if (sqloReadKxlnodes(path, 4, &list_, 5, &entries, &maxNode, 1, options.instanceName, 1, 0) != 0) {
      std::free(list_);
      list_ = nullptr;
    }
  }
  ~NodesFile() { std::free(list_); }
  NodesFile(const NodesFile &) = delete;
  NodesFile &operator=(const NodesFile &) = delete;

  // True when one partition's name ("%s-%d": instance name, node number) is
  // `resource`, ignoring case. The walk goes by the header's count and first
  // entry and by each entry's own length, and never leaves the block.
  bool namesPartition(const char *instanceName, const char *resource) const {
    if (list_ == nullptr)
      return false;
    const unsigned char *block = reinterpret_cast<const unsigned char *>(list_);
    size_t size = sqloNodeListSize(list_);
    size_t offset = sqloLe32(list_, SQLO_NODELIST_HDR_FIRST);
    for (int32_t left = sqloNodeListCount(list_); left > 0; --left) {
      if (offset > size || size - offset < SQLO_NODE_NUMBER + 2)
        return false;
      const unsigned char *entry = block + offset;
      char partition[kPartitionNameSize];
      ossSnprintf(partition, sizeof partition, "%s-%d", instanceName, int(sqloNodeNumber(entry)));
      if (sameName(partition, resource))
        return true;
      offset += sqloNodeLength(entry);
    }
    return false;
  }

private:
  SQLO_NODELIST *list_ = nullptr;
};

// Whether a listed resource is the instance's: its name, or for a
// partitioned instance one of its partitions' names (the nodes file read
// afresh for each resource tested).
bool isInstanceResource(const ClusterResourceEntry &resource, const IKXLINSTANCE &instance,
                        const UpgradeOptions &options) {
  pdtEntry(KXL_FN_IS_INSTANCE_RESOURCE);
  bool member = false;
  if (options.partitionedInstance == 0)
    member = sameName(resource.name, options.instanceName);
  else
    member = NodesFile(instance, options).namesPartition(options.instanceName, resource.name);
  pdtExit(KXL_FN_IS_INSTANCE_RESOURCE, member ? 1 : 0, 0);
  return member;
}

// What one conversion works with: the cluster binding and the two type names.
struct Conversion {
  MSCSUtil &cluster;
  const char *fromType;
  const char *toType;
};

// A handle that CreateResource returned, closed when done with.
class CreatedResource {
public:
  CreatedResource(MSCSUtil &cluster, HRESOURCE handle) : cluster_(cluster), handle_(handle) {}
  ~CreatedResource() { cluster_.CloseResource(handle_); }
  CreatedResource(const CreatedResource &) = delete;
  CreatedResource &operator=(const CreatedResource &) = delete;
  explicit operator bool() const { return handle_ != nullptr; }

private:
  MSCSUtil &cluster_;
  HRESOURCE handle_;
};

// Puts a resource whose new-type creation failed back under its old type
// with its dependencies.
int32_t putBack(const Conversion &step, const ClusterResourceEntry &resource,
                const ClusterResourceList &dependencies) {
  CreatedResource back(step.cluster,
                       step.cluster.CreateResource(resource.group, resource.name, step.fromType));
  if (!back)
    return failed(kProbeGone, CLUSTER_RC_NOT_RECREATED);
  if (step.cluster.AddResourceDependencies(resource.name, dependencies) != 0)
    return failed(kProbeBackWithoutDependencies, CLUSTER_RC_NOT_RECREATED);
  return failed(kProbeBack, CLUSTER_RC_NOT_CONVERTED);
}

// Deletes one resource and creates it anew under the new type, in its group,
// with the dependencies it had.
int32_t convert(const Conversion &step, const ClusterResourceEntry &resource) {
  ClusterResourceList dependencies = step.cluster.GetResourceDependencies(resource.name);
  int32_t deleted = step.cluster.DeleteResource(resource.name);
  if (deleted != 0) {
    pdtError(KXL_FN_UPGRADE_CLUSTER_INSTANCE, kProbeDeleteResult, deleted);
    return failed(kProbeDelete, CLUSTER_RC_NOT_DELETED);
  }
  CreatedResource created(step.cluster,
                          step.cluster.CreateResource(resource.group, resource.name, step.toType));
  if (!created)
    return putBack(step, resource, dependencies);
  if (step.cluster.AddResourceDependencies(resource.name, dependencies) != 0)
    return failed(kProbeDependencies, CLUSTER_RC_NOT_CONVERTED);
  return 0;
}

int32_t convertInstanceResources(MSCSUtil &cluster, const UpgradeContext &context, int32_t toServerType,
                                 const UpgradeOptions &options) {
  if (cluster.LoadClusterApi() != 0)
    return failed(kProbeApi, CLUSTER_RC_NO_API);
  static const Wide newType(kNewType);
  static const Wide newTypeDll(kNewTypeDll);
  if (cluster.CreateResourceType(newType.chars, newType.chars, newTypeDll.chars, kLooksAlivePollMs,
                                 kIsAlivePollMs) != 0)
    return failed(kProbeType, CLUSTER_RC_NOT_CONVERTED);
  char name[kInstanceNameSize] = {};
  if (context.instance == nullptr || context.instance->GetName(name, sizeof name) != 0)
    return failed(kProbeName, CLUSTER_RC_NOT_CONVERTED);
  pdtData1(KXL_FN_UPGRADE_CLUSTER_INSTANCE, kProbeName, PD_TYPE_STRING, sizeof name, name);

  Conversion step{cluster, toServerType != 0 ? kOldType : kNewType, toServerType != 0 ? kNewType : kOldType};
  for (const ClusterResourceEntry &resource : cluster.GetResourcesOfType(step.fromType)) {
    if (!isInstanceResource(resource, *context.instance, options) ||
        cluster.IsResourceOfType(resource.name, step.fromType) == 0)
      continue;
    int32_t rc = convert(step, resource);
    if (rc != 0)
      return rc;
  }
  return 0;
}

} // namespace

int32_t upgradeClusterInstance(UpgradeContext &context, int32_t toServerType, UpgradeOptions &options) {
  pdtEntry(KXL_FN_UPGRADE_CLUSTER_INSTANCE);
  // Owned for exactly the step's duration: the modules are freed on every way out.
  MSCSUtil cluster;
  int32_t rc = convertInstanceResources(cluster, context, toServerType, options);
  pdtExit(KXL_FN_UPGRADE_CLUSTER_INSTANCE, rc, 0);
  return rc;
}
