#include "cluster/clusterstep.h"

#include "cluster/mscsutil.h"
#include "install/ilist.h"
#include "install/kxlinstance.h"
#include "platform/kxlsys.h"
#include "upgrade/errortrace.h"
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
constexpr uint32_t kProbeNodes = 35;   // the nodes file could not be read
constexpr uint32_t kProbeRead = 40;    // the cluster's state could not be read
constexpr uint32_t kProbeJournal = 45; // the journal could not be saved
constexpr uint32_t kProbeDeleteResult = 47;
constexpr uint32_t kProbeDelete = 50;
constexpr uint32_t kProbeGone = 60;
constexpr uint32_t kProbeBackWithoutDependencies = 65;
constexpr uint32_t kProbeBack = 70;
constexpr uint32_t kProbeDependencies = 80;
constexpr uint32_t kProbeUndo = 90; // a resource or the type could not be put back

// A short ASCII constant as the cluster API's wide text.
template <size_t N> struct Wide {
  explicit Wide(const char (&text)[N]) {
    for (size_t i = 0; i < N; ++i)
      chars[i] = static_cast<WCHAR>(static_cast<unsigned char>(text[i]));
  }
  WCHAR chars[N];
};

const WCHAR *newTypeName() {
  static const Wide name(kNewType);
  return name.chars;
}

constexpr ErrorTrace failed{KXL_FN_UPGRADE_CLUSTER_INSTANCE};

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

enum class Membership { member, other, unreadable };

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

  // Whether one partition's name ("%s-%d": instance name, node number) is
  // `resource`, ignoring case; unreadable when the list could not be read or
  // a name formed. The walk goes by the header's count and first entry and by
  // each entry's own length, and never leaves the block.
  Membership namesPartition(const char *instanceName, const char *resource) const {
    if (list_ == nullptr)
      return Membership::unreadable;
    const unsigned char *block = reinterpret_cast<const unsigned char *>(list_);
    size_t size = sqloNodeListSize(list_);
    size_t offset = sqloLe32(list_, SQLO_NODELIST_HDR_FIRST);
    for (int32_t left = sqloNodeListCount(list_); left > 0; --left) {
      if (offset > size || size - offset < SQLO_NODE_NUMBER + 2)
        return Membership::other;
      const unsigned char *entry = block + offset;
      char partition[kPartitionNameSize];
      if (ossSnprintf(partition, sizeof partition, "%s-%d", instanceName, int(sqloNodeNumber(entry))) < 0)
        return Membership::unreadable;
      if (kxliSameName(partition, resource))
        return Membership::member;
      offset += sqloNodeLength(entry);
    }
    return Membership::other;
  }

private:
  SQLO_NODELIST *list_ = nullptr;
};

// Whether a listed resource is the instance's: its name, or for a
// partitioned instance one of its partitions' names (the nodes file read
// afresh for each resource tested; a file that cannot be read names no
// partition, and ends the step rather than pass the resource over).
Membership instanceResource(const ClusterResourceEntry &resource, const IKXLINSTANCE &instance,
                            const UpgradeOptions &options) {
  pdtEntry(KXL_FN_IS_INSTANCE_RESOURCE);
  Membership member = Membership::other;
  if (!isPartitioned(options)) {
    member = kxliSameName(resource.name, options.instanceName) ? Membership::member : Membership::other;
  } else {
    member = NodesFile(instance, options).namesPartition(options.instanceName, resource.name);
  }
  pdtExit(KXL_FN_IS_INSTANCE_RESOURCE, member == Membership::member ? 1 : 0, 0);
  return member;
}

// What one conversion works with: the cluster binding and the two type names.
struct Conversion {
  MSCSUtil &cluster;
  const char *fromType;
  const char *toType;
};

Conversion conversionOf(MSCSUtil &cluster, int32_t toServerType) {
  return {cluster, toServerType != 0 ? kOldType : kNewType, toServerType != 0 ? kNewType : kOldType};
}

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

DWORD monitorOf(const ClusterResourceFacts &resource) {
  return resource.separateMonitor ? CLUSTER_RESOURCE_SEPARATE_MONITOR : CLUSTER_RESOURCE_DEFAULT_MONITOR;
}

bool createAs(MSCSUtil &cluster, const ClusterResourceFacts &resource, const char *type, DWORD flags) {
  return bool(CreatedResource(
      cluster, cluster.CreateResource(resource.entry.group, resource.entry.name, type, flags)));
}

// Puts a resource whose new-type creation failed back under its old type
// with its monitor and dependencies.
int32_t putBack(const Conversion &step, const ClusterResourceFacts &resource) {
  if (!createAs(step.cluster, resource, step.fromType, monitorOf(resource)))
    return failed(kProbeGone, CLUSTER_RC_NOT_RECREATED);
  if (step.cluster.AddResourceDependencies(resource.entry.name, resource.dependencies) != 0)
    return failed(kProbeBackWithoutDependencies, CLUSTER_RC_NOT_RECREATED);
  return failed(kProbeBack, CLUSTER_RC_NOT_CONVERTED);
}

// Deletes one resource and creates it anew under the new type, in its group,
// with the dependencies it had.
int32_t convert(const Conversion &step, const ClusterResourceFacts &resource) {
  int32_t deleted = step.cluster.DeleteResource(resource.entry.name);
  if (deleted != 0) {
    pdtError(KXL_FN_UPGRADE_CLUSTER_INSTANCE, kProbeDeleteResult, deleted);
    return failed(kProbeDelete, CLUSTER_RC_NOT_DELETED);
  }
  if (!createAs(step.cluster, resource, step.toType, CLUSTER_RESOURCE_SEPARATE_MONITOR))
    return putBack(step, resource);
  if (step.cluster.AddResourceDependencies(resource.entry.name, resource.dependencies) != 0)
    return failed(kProbeDependencies, CLUSTER_RC_NOT_CONVERTED);
  return 0;
}

// Whether `now` holds the first of `all`'s dependencies, in their order: the
// rest can then be added to give them all in order.
bool isPrefix(const ClusterResourceList &now, const ClusterResourceList &all) {
  if (now.size() > all.size())
    return false;
  for (std::size_t i = 0; i < now.size(); ++i)
    if (!kxliSameName(now[i].name, all[i].name))
      return false;
  return true;
}

// Brings a journaled resource, in whatever state a killed run or a failure
// left it, to `type` in its group with every dependency it had, in order. A
// resource of another type, or whose dependencies are not the first of its
// own in order, is deleted and created anew.
int32_t settle(MSCSUtil &cluster, const ClusterResourceFacts &recorded, const char *type, DWORD flags) {
  ClusterResourceFacts now;
  if (cluster.ReadResource(recorded.entry.name, now) != 0)
    return failed(kProbeRead, CLUSTER_RC_NOT_CONVERTED);
  bool fits = std::strcmp(now.type, type) == 0 && isPrefix(now.dependencies, recorded.dependencies);
  if (now.exists && !fits) {
    if (cluster.DeleteResource(recorded.entry.name) != 0)
      return failed(kProbeDelete, CLUSTER_RC_NOT_DELETED);
    now = ClusterResourceFacts{};
  }
  if (!now.exists && !createAs(cluster, recorded, type, flags))
    return failed(kProbeGone, CLUSTER_RC_NOT_RECREATED);
  ClusterResourceList missing(recorded.dependencies.begin() + std::ptrdiff_t(now.dependencies.size()),
                              recorded.dependencies.end());
  if (cluster.AddResourceDependencies(recorded.entry.name, missing) != 0)
    return failed(kProbeDependencies, CLUSTER_RC_NOT_CONVERTED);
  return 0;
}

// Registers the new type, noting first in the journal when this run is the
// one that registers it.
int32_t registerNewType(MSCSUtil &cluster, ClusterJournal &journal, const ClusterJournalSave &save) {
  static const Wide newTypeDll(kNewTypeDll);
  int32_t registered = cluster.ResourceTypeExists(newTypeName());
  if (registered < 0)
    return failed(kProbeType, CLUSTER_RC_NOT_CONVERTED);
  if (registered == 0 && !journal.typeRegistered) {
    journal.typeRegistered = true;
    if (!save())
      return failed(kProbeJournal, CLUSTER_RC_NOT_CONVERTED);
  }
  if (cluster.CreateResourceType(newTypeName(), newTypeName(), newTypeDll.chars, kLooksAlivePollMs,
                                 kIsAlivePollMs) != 0)
    return failed(kProbeType, CLUSTER_RC_NOT_CONVERTED);
  return 0;
}

// The facts of a listed resource of the instance, noted in the journal
// before the resource is touched.
int32_t noteResource(const Conversion &step, const ClusterResourceEntry &resource, ClusterJournal &journal,
                     const ClusterJournalSave &save) {
  ClusterResourceFacts facts;
  // Listed as of the from type a moment ago: anything else is a failed read.
  if (step.cluster.IsResourceOfType(resource.name, step.fromType) == 0 ||
      step.cluster.ReadResource(resource.name, facts) != 0 || !facts.exists)
    return failed(kProbeRead, CLUSTER_RC_NOT_CONVERTED);
  journal.resources.push_back(facts);
  if (!save())
    return failed(kProbeJournal, CLUSTER_RC_NOT_CONVERTED);
  return 0;
}

int32_t convertInstanceResources(MSCSUtil &cluster, const UpgradeContext &context, int32_t toServerType,
                                 const UpgradeOptions &options, ClusterJournal &journal,
                                 const ClusterJournalSave &save) {
  if (cluster.LoadClusterApi() != 0)
    return failed(kProbeApi, CLUSTER_RC_NO_API);
  if (int32_t rc = registerNewType(cluster, journal, save); rc != 0)
    return rc;
  char name[kInstanceNameSize] = {};
  if (context.instance == nullptr || context.instance->GetName(name, sizeof name) != 0)
    return failed(kProbeName, CLUSTER_RC_NOT_CONVERTED);
  pdtData1(KXL_FN_UPGRADE_CLUSTER_INSTANCE, kProbeName, PD_TYPE_STRING, sizeof name, name);

  Conversion step = conversionOf(cluster, toServerType);
  // What an earlier, killed run had begun is finished first.
  for (const ClusterResourceFacts &resource : journal.resources)
    if (int32_t rc = settle(cluster, resource, step.toType, CLUSTER_RESOURCE_SEPARATE_MONITOR); rc != 0)
      return rc;
  ClusterResourceList resources;
  if (cluster.GetResourcesOfType(step.fromType, resources) != 0)
    return failed(kProbeRead, CLUSTER_RC_NOT_CONVERTED);
  for (const ClusterResourceEntry &resource : resources) {
    Membership member = instanceResource(resource, *context.instance, options);
    if (member == Membership::unreadable)
      return failed(kProbeNodes, CLUSTER_RC_NOT_CONVERTED);
    if (member == Membership::other)
      continue;
    if (int32_t rc = noteResource(step, resource, journal, save); rc != 0)
      return rc;
    if (int32_t rc = convert(step, journal.resources.back()); rc != 0)
      return rc;
  }
  return 0;
}

} // namespace

int32_t upgradeClusterInstance(UpgradeContext &context, int32_t toServerType, UpgradeOptions &options,
                               ClusterJournal &journal, const ClusterJournalSave &save) {
  pdtEntry(KXL_FN_UPGRADE_CLUSTER_INSTANCE);
  // Owned for exactly the step's duration: the modules are freed on every way out.
  MSCSUtil cluster;
  int32_t rc = convertInstanceResources(cluster, context, toServerType, options, journal, save);
  pdtExit(KXL_FN_UPGRADE_CLUSTER_INSTANCE, rc, 0);
  return rc;
}

int32_t upgradeClusterInstance(UpgradeContext &context, int32_t toServerType, UpgradeOptions &options) {
  ClusterJournal journal;
  return upgradeClusterInstance(context, toServerType, options, journal, [] { return true; });
}

int32_t undoClusterConversion(const ClusterJournal &journal) {
  if (!journal.typeRegistered && journal.resources.empty())
    return 0;
  MSCSUtil cluster;
  if (cluster.LoadClusterApi() != 0)
    return failed(kProbeUndo, -1);
  int32_t rc = 0;
  for (auto resource = journal.resources.rbegin(); resource != journal.resources.rend(); ++resource)
    if (settle(cluster, *resource, resource->type, monitorOf(*resource)) != 0)
      rc = -1;
  if (journal.typeRegistered && cluster.DeleteResourceType(newTypeName()) != 0)
    rc = -1;
  return rc != 0 ? failed(kProbeUndo, rc) : 0;
}
