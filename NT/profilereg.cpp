#include "NT/profilereg.h"

#include "NT/localhost.h"
#include "NT/services.h"

#include "install/installcopy.h"
#include "install/iutil.h"
#include "install/kxlinstance.h"
#include "platform/kxlsys.h"
#include "upgrade/errortrace.h"
#include "upgrade/records.h"

#include <cstddef>
#include <cstdio>
#include <cstring>
#include <string>
#include <vector>

namespace {

constexpr const char kProductRoot[] = "SOFTWARE\\ZAV\\KXL";
constexpr const char kServiceProgram[] = "kxlsyscs.exe";
constexpr const char kClusterListValue[] = "KXLCLUSTERLIST";
constexpr const char kLegacyPathValue[] = "KXLPATH";
constexpr int32_t kFirstNamedCopyVersion = 9; // copies from 9 on keep profiles under their name
constexpr size_t kKeyPathSize = 512;
constexpr size_t kCopyNameSize = 129;   // 128 characters
constexpr DWORD kRegValueBuffer = 257;  // 256 bytes read, plus a terminator kept back
constexpr size_t kServiceNameSize = 30; // "%s-%d": 29 characters
constexpr size_t kDisplayNameSize = 256;
constexpr size_t kProgramPathSize = 261;
constexpr DWORD kUnknownSystemError = 31; // a failed call that left no error code

// Trace points.
constexpr uint32_t kProbeLocalHost = 10;
constexpr uint32_t kProbePartitionOpen = 10;
constexpr uint32_t kProbePartitionKey = 20;
constexpr uint32_t kProbeLocalKey = 30;
constexpr uint32_t kProbeComputerName = 40;
constexpr uint32_t kProbeClusterName = 50;
constexpr uint32_t kProbeClusterList = 55;
constexpr uint32_t kProbeClusterOpen = 60;
constexpr uint32_t kProbeClusterKey = 70;
constexpr uint32_t kProbeCreateKey = 100;
constexpr uint32_t kProbeCopyKey = 110;
constexpr uint32_t kProbeDropKey = 120;
constexpr uint32_t kProbeForcedKeysLeft = 210; // diagnostic log only
constexpr uint32_t kProbeServiceNotBack = 220; // the undo could not put a service back

// snprintf that reports whether the whole text fitted.
template <class... Args> bool formatWhole(char *buffer, size_t size, const char *format, Args... args) {
  int length = std::snprintf(buffer, size, format, args...);
  return length >= 0 && static_cast<size_t>(length) < size;
}

// The keys one machine's move works on, and what they were formed from.
struct ProfileKeys {
  char currentCopy[kCopyNameSize] = {};
  char ownerCopy[kCopyNameSize] = {}; // the owning copy's name; empty for the single-copy layout
  int32_t ownerVersion = 0;           // major version of the copy that owned the instance
  char current[kKeyPathSize] = {};    // profile key under the current copy
  char force[kKeyPathSize] = {};      // force-copy-name placeholder of the current copy
  char old[kKeyPathSize] = {};        // profile key under the owning copy
};

bool namedProfileKey(char (&path)[kKeyPathSize], const char *copy, const char *instance) {
  return formatWhole(path, sizeof path, "%s\\InstalledCopies\\%s\\PROFILES\\%s", kProductRoot, copy,
                     instance);
}

// 0 when the owning copy's version cannot be had at all: without it the old
// key is unknown, and guessing could move another installation's profile.
int32_t ownerMajorVersion(const UpgradeContext &context) {
  if (context.copy == nullptr)
    return 0;
  CopyVersion *version = nullptr;
  context.copy->GetVersion(&version);
  int32_t major = version != nullptr ? version->version : 0;
  delete version;
  return major;
}

bool formOldKey(const UpgradeContext &context, const char *instance, ProfileKeys &keys) {
  if (keys.ownerVersion < kFirstNamedCopyVersion)
    return formatWhole(keys.old, sizeof keys.old, "%s\\PROFILES\\%s", kProductRoot, instance);
  if (context.instance == nullptr ||
      context.instance->GetCopyName(keys.ownerCopy, sizeof keys.ownerCopy) != 0)
    return false;
  return namedProfileKey(keys.old, keys.ownerCopy, instance);
}

bool loadKeys(const UpgradeContext &context, const UpgradeOptions &options, ProfileKeys &keys) {
  if (sqloGetCurrentInstallationName(keys.currentCopy, sizeof keys.currentCopy) != 0 ||
      keys.currentCopy[0] == '\0')
    return false;
  keys.currentCopy[sizeof keys.currentCopy - 1] = '\0';
  keys.ownerVersion = ownerMajorVersion(context);
  if (keys.ownerVersion <= 0)
    return false;
  const char *instance = options.instanceName;
  return namedProfileKey(keys.current, keys.currentCopy, instance) &&
         formatWhole(keys.force, sizeof keys.force, "%s\\FORCE_COPY_NAME\\InstalledCopies\\%s\\PROFILES\\%s",
                     kProductRoot, keys.currentCopy, instance) &&
         formOldKey(context, instance, keys);
}

// RegCreateKeyExA as the move and its undo call it.
LONG createKey(HKEY root, const char *path, HKEY *key, DWORD *disposition) {
  return RegCreateKeyExA(root, path, 0, nullptr, REG_OPTION_NON_VOLATILE, KEY_ALL_ACCESS, nullptr, key,
                         disposition);
}

// True when the key exists and holds neither values nor subkeys.
bool isEmptyKey(HKEY root, const char *path) {
  HKEY key = nullptr;
  if (RegOpenKeyExA(root, path, 0, KEY_READ, &key) != ERROR_SUCCESS)
    return false;
  char name[4];
  DWORD size = sizeof name;
  bool empty = RegEnumKeyExA(key, 0, name, &size, nullptr, nullptr, nullptr, nullptr) == ERROR_NO_MORE_ITEMS;
  size = sizeof name;
  empty =
      empty && RegEnumValueA(key, 0, name, &size, nullptr, nullptr, nullptr, nullptr) == ERROR_NO_MORE_ITEMS;
  RegCloseKey(key);
  return empty;
}

// The length of the first key on `path` below the product root that does not
// exist: creating `path` makes that key and the ones below it. The whole
// length when every parent exists, or when one cannot be opened for another
// reason (it is then never taken for one this run made).
size_t createdFrom(HKEY root, const char *path) {
  const size_t rootLength = sizeof kProductRoot - 1;
  size_t length = std::strlen(path);
  for (size_t at = rootLength + 1; at < length; ++at) {
    if (path[at] != '\\')
      continue;
    std::string parent(path, at);
    HKEY key = nullptr;
    LONG rc = RegOpenKeyExA(root, parent.c_str(), 0, KEY_READ, &key);
    if (rc == ERROR_SUCCESS) {
      RegCloseKey(key);
      continue;
    }
    return rc == ERROR_FILE_NOT_FOUND ? at : length;
  }
  return length;
}

// Deletes a key this run created, and the parents below the product root that
// are empty now, from the key of length `createdAt` on (the ones creating it
// made; 0: any empty parent).
void deleteCreatedKey(HKEY root, const char *path, size_t createdAt = 0) {
  SHDeleteKeyA(root, path);
  char parent[kKeyPathSize];
  if (!formatWhole(parent, sizeof parent, "%s", path))
    return;
  const size_t rootLength = sizeof kProductRoot - 1;
  for (char *cut = std::strrchr(parent, '\\');
       cut != nullptr && static_cast<size_t>(cut - parent) > rootLength &&
       static_cast<size_t>(cut - parent) >= createdAt;
       cut = std::strrchr(parent, '\\')) {
    *cut = '\0';
    if (!isEmptyKey(root, parent))
      return;
    RegDeleteKeyA(root, parent);
  }
}

enum class OldKey { deleted, putBack, bothKept };

// The old key goes once it is copied. A delete that fails may have removed
// part of it (subkeys go one by one): the copy is put back over it, so that
// the old key is whole when the move fails. When even that fails, both keys
// stay.
OldKey deleteOldKey(HKEY root, const ProfileKeys &keys, const char *target) {
  if (SHDeleteKeyA(root, keys.old) == ERROR_SUCCESS)
    return OldKey::deleted;
  HKEY oldKey = nullptr;
  DWORD disposition = 0;
  if (createKey(root, keys.old, &oldKey, &disposition) != ERROR_SUCCESS)
    return OldKey::bothKept;
  bool putBack = SHCopyKeyA(root, target, oldKey, 0) == ERROR_SUCCESS;
  RegCloseKey(oldKey);
  return putBack ? OldKey::putBack : OldKey::bothKept;
}

// In force mode the old key stays until the whole upgrade has succeeded
// (dropForcedProfileKeys): it holds the machine's profile values, which a
// failed upgrade must put back.
int32_t moveKey(HKEY root, const ProfileKeys &keys, bool force) {
  const char *target = force ? keys.force : keys.current;
  size_t createdAt = createdFrom(root, target);
  HKEY newKey = nullptr;
  DWORD disposition = 0;
  if (createKey(root, target, &newKey, &disposition) != ERROR_SUCCESS)
    return ErrorTrace{KXL_FN_MOVE_INSTANCE_PROFILE}(kProbeCreateKey, UPGRADE_RC_NO_COPY);
  int32_t rc = 0;
  bool bothKept = false;
  if (!force && !kxliSameText(keys.old, target, kKeyPathSize)) {
    if (SHCopyKeyA(root, keys.old, newKey, 0) != ERROR_SUCCESS) {
      rc = ErrorTrace{KXL_FN_MOVE_INSTANCE_PROFILE}(kProbeCopyKey, UPGRADE_RC_NO_COPY);
    } else if (OldKey old = deleteOldKey(root, keys, target); old != OldKey::deleted) {
      rc = ErrorTrace{KXL_FN_MOVE_INSTANCE_PROFILE}(kProbeDropKey, UPGRADE_RC_NO_COPY);
      bothKept = old == OldKey::bothKept;
    }
  }
  RegCloseKey(newKey);
  // A key this call created for a move that failed would be taken for a
  // move; the old key is whole again. Parents that existed before stay.
  if (rc != 0 && !bothKept && disposition == REG_CREATED_NEW_KEY)
    deleteCreatedKey(root, target, createdAt);
  return rc;
}

int32_t revertKey(HKEY root, const ProfileKeys &keys, bool force) {
  size_t createdAt = createdFrom(root, keys.old);
  HKEY oldKey = nullptr;
  DWORD disposition = 0;
  if (createKey(root, keys.old, &oldKey, &disposition) != ERROR_SUCCESS)
    return ErrorTrace{KXL_FN_REVERT_INSTANCE_PROFILE}(kProbeCreateKey, UPGRADE_RC_NO_COPY);
  int32_t rc = 0;
  bool created = disposition != REG_OPENED_EXISTING_KEY;
  bool copied = true;
  if (!force && created) {
    copied = SHCopyKeyA(root, keys.current, oldKey, 0) == ERROR_SUCCESS;
    if (copied)
      SHDeleteKeyA(root, keys.current);
  }
  RegCloseKey(oldKey);
  // An old key left empty (or half copied) would read as one already put
  // back: a later undo would keep it and leave the profile under the current
  // copy.
  if (!copied) {
    deleteCreatedKey(root, keys.old, createdAt);
    rc = ErrorTrace{KXL_FN_REVERT_INSTANCE_PROFILE}(kProbeCopyKey, UPGRADE_RC_NO_COPY);
  }
  // A forced machine keeps its old key through the upgrade: only the
  // placeholder goes, and an old key that was not there is not invented.
  if (force) {
    deleteCreatedKey(root, keys.force);
    if (created)
      deleteCreatedKey(root, keys.old);
  }
  return rc;
}

// After a successful force-copy-name upgrade: the old key of a forced machine.
// A key that is gone already (a run that was killed after deleting it) is
// what the drop wants.
int32_t dropForcedKey(HKEY root, const ProfileKeys &keys) {
  if (kxliSameText(keys.old, keys.force, kKeyPathSize))
    return 0;
  LONG rc = SHDeleteKeyA(root, keys.old);
  if (rc != ERROR_SUCCESS && rc != ERROR_FILE_NOT_FOUND)
    return ErrorTrace{KXL_FN_MOVE_INSTANCE_PROFILE}(kProbeDropKey, UPGRADE_RC_NO_COPY);
  return 0;
}

using KeyOperation = int32_t (*)(UpgradeContext &, HKEY, UpgradeOptions &, uint8_t);

// One pass over the instance's machines: the per-machine operation, the trace
// identifier it reports under, the one machine registry kept open, and the
// machines already handled by name, so that a machine named by both the node
// list and the cluster list is handled once.
struct MachineWalk {
  UpgradeContext &context;
  UpgradeOptions &options;
  uint32_t function;
  KeyOperation operation;
  const ProfileKeys *keys; // the undo's service names; null for the move
  SQLO_PREG_MACHINE *machine = nullptr;
  std::vector<std::string> handled;
  // The undo goes on past a machine it cannot handle, so that every machine
  // it can reach is put back; it reports the first failure.
  bool keepGoing = false;
  // Forced machines whose operation succeeded; with goOnOnceForced, the walk
  // goes on past a failure once there is one, as for the undo.
  uint32_t forcedDone = 0;
  bool goOnOnceForced = false;
  // The undo's first service that could not be put back: the undo goes on,
  // but does not count as complete.
  int32_t serviceFailure = 0;

  bool goesOn() const { return keepGoing || (goOnOnceForced && forcedDone > 0); }

  MachineWalk(UpgradeContext &c, UpgradeOptions &o, uint32_t f, KeyOperation op, const ProfileKeys *k)
      : context(c), options(o), function(f), operation(op), keys(k) {}
  ~MachineWalk() { release(); }
  MachineWalk(const MachineWalk &) = delete;
  MachineWalk &operator=(const MachineWalk &) = delete;

  void release() {
    if (machine != nullptr)
      sqloPRegMachineClose(&machine);
  }

  bool handledAlready(const char *machineName) const {
    for (const std::string &name : handled)
      if (kxliSameText(name.c_str(), machineName, SQLO_COMPUTERNAME_SZ))
        return true;
    return false;
  }
};

int32_t onLocalMachine(MachineWalk &walk, uint32_t probe) {
  int32_t rc = walk.operation(walk.context, HKEY_LOCAL_MACHINE, walk.options, 0);
  if (rc != 0)
    pdtError(walk.function, probe, rc);
  return rc;
}

int32_t onMachine(MachineWalk &walk, const char *machineName, uint8_t force, uint32_t openProbe,
                  uint32_t keyProbe) {
  walk.handled.emplace_back(machineName);
  if (sqloPRegMachineOpen(machineName, &walk.machine) != 0 || walk.machine == nullptr)
    return ErrorTrace{walk.function}(openProbe, UPGRADE_RC_MACHINE_REGISTRY);
  int32_t rc = walk.operation(walk.context, walk.machine->hklm, walk.options, force);
  if (rc != 0)
    pdtError(walk.function, keyProbe, rc);
  else if (force != 0)
    ++walk.forcedDone;
  return rc;
}

// ---------------------------------------------------------------------------
// Partitions
// ---------------------------------------------------------------------------

// The node list's entries in order. An entry whose names would run past it or
// past the block ends the walk.
class NodeCursor {
public:
  explicit NodeCursor(const SQLO_NODELIST *list)
      : base_(reinterpret_cast<const unsigned char *>(list)),
        left_(list != nullptr ? sqloNodeListCount(list) : 0),
        entry_(list != nullptr ? sqloNodeListFirst(list) : nullptr),
        size_(list != nullptr ? sqloNodeListSize(list) : 0) {}

  const unsigned char *next() {
    if (left_ <= 0 || entry_ == nullptr || !wellFormed(entry_)) {
      left_ = 0;
      return nullptr;
    }
    const unsigned char *current = entry_;
    --left_;
    entry_ = sqloNodeNext(entry_);
    return current;
  }

private:
  bool wellFormed(const unsigned char *entry) const {
    size_t offset = static_cast<size_t>(entry - base_);
    if (offset >= size_ || size_ - offset < SQLO_NODE_NAMES)
      return false;
    size_t length = sqloNodeLength(entry);
    size_t names = 25u + entry[SQLO_NODE_HOSTLEN] + entry[SQLO_NODE_NAME2LEN] + entry[SQLO_NODE_NAME3LEN];
    size_t machineEnd = names + entry[SQLO_NODE_MACHLEN];
    return length <= size_ - offset && machineEnd < length &&
           entry[SQLO_NODE_NAMES + entry[SQLO_NODE_HOSTLEN]] == 0 && entry[machineEnd] == 0;
  }

  const unsigned char *base_;
  int32_t left_;
  const unsigned char *entry_;
  size_t size_;
};

uint8_t forceFor(const UpgradeOptions &options, const char *localHost, const unsigned char *entry) {
  bool forced = (options.flags & UPGRADE_FLAG_FORCE_COPY_NAME) != 0 &&
                !kxliSameText(sqloNodeHost(entry), localHost, SQLO_HOSTNAME_SZ);
  return forced ? 1 : 0;
}

int32_t localFullHostName(MachineWalk &walk, char (&host)[SQLO_HOSTNAME_SZ]) {
  if (readLocalFullHostName(host))
    return 0;
  walk.options.status.sqlcode = UPGRADE_SQLCODE_PARTITION_SETUP;
  return ErrorTrace{walk.function}(kProbeLocalHost, UPGRADE_RC_SQLCA);
}

using EntryHook = void (*)(MachineWalk &, const unsigned char *entry, uint8_t force, const char *localHost);

// Each machine once (the entries of logical port 0), then the hook for every entry.
int32_t walkPartitions(MachineWalk &walk, const char *localHost, EntryHook hook) {
  NodeCursor nodes(walk.context.nodeList);
  int32_t first = 0;
  for (const unsigned char *entry = nodes.next(); entry != nullptr; entry = nodes.next()) {
    uint8_t force = forceFor(walk.options, localHost, entry);
    if (sqloNodePort(entry) == 0) {
      int32_t rc = onMachine(walk, sqloNodeMachine(entry), force, kProbePartitionOpen, kProbePartitionKey);
      if (rc != 0 && !walk.goesOn())
        return rc;
      first = first != 0 ? first : rc;
    }
    if (hook != nullptr)
      hook(walk, entry, force, localHost);
  }
  return first;
}

// ---------------------------------------------------------------------------
// Cluster machines
// ---------------------------------------------------------------------------

int32_t lastSystemError() {
  DWORD code = GetLastError();
  return static_cast<int32_t>(code != 0 ? code : kUnknownSystemError);
}

// The machine names of the cluster profile's list; empty when the key or the
// value is missing. Any other failure (a list that cannot be read, is longer
// than the buffer or whose key name cannot be formed) is not an empty list:
// taking it for one would leave the other machines' keys under the old copy.
bool readClusterList(const char *instance, char (&list)[kRegValueBuffer]) {
  char key[kKeyPathSize];
  list[0] = '\0';
  if (!formatWhole(key, sizeof key, "Cluster\\ZAV\\KXL\\PROFILES\\%s", instance))
    return false;
  // A failed read leaves the list empty.
  LONG rc = kxliReadRegString(HKEY_LOCAL_MACHINE, key, KEY_ALL_ACCESS, kClusterListValue, list, sizeof list);
  return rc == ERROR_SUCCESS || kxliIsMissing(rc);
}

// The cluster's machines, read once per run and kept: the undo walks the
// machines the move walked (after a kill, the next run reads them afresh).
bool clusterMachines(MachineWalk &walk, char (&list)[kRegValueBuffer]) {
  if (!walk.context.clusterMachines) {
    if (!readClusterList(walk.options.instanceName, list))
      return false;
    walk.context.clusterMachines = list;
  }
  std::snprintf(list, sizeof list, "%s", walk.context.clusterMachines->c_str());
  return true;
}

// The machines of the cluster list that the first pass did not handle, through
// the machine registry. The local computer is never among them: its key is the
// first pass's (the local machine, or its partitions), and the undo handles
// exactly the machines the move handled.
int32_t walkCluster(MachineWalk &walk) {
  char computer[SQLO_COMPUTERNAME_SZ] = {};
  uint32_t size = sizeof computer;
  if (sqloGetComputerNameA(computer, &size) == 0)
    return ErrorTrace{walk.function}(kProbeComputerName, lastSystemError());
  computer[sizeof computer - 1] = '\0';
  char *clusterName = walk.options.partitionRecord.clusterName;
  uint32_t nameRc = walk.context.instance->GetClusterName(clusterName, UPGRADE_CLUSTER_NAME_SZ);
  if (nameRc != 0)
    return ErrorTrace{walk.function}(kProbeClusterName, static_cast<int32_t>(nameRc));
  char list[kRegValueBuffer];
  if (!clusterMachines(walk, list))
    return ErrorTrace{walk.function}(kProbeClusterList, UPGRADE_RC_NO_COPY);
  int32_t first = 0;
  for (char *name = list; *name != '\0';) {
    char *end = std::strchr(name, ' ');
    char *rest = end != nullptr ? end + 1 : name + std::strlen(name);
    if (end != nullptr)
      *end = '\0';
    int32_t rc = 0;
    if (name[0] != '\0' && !kxliSameText(name, computer, SQLO_COMPUTERNAME_SZ) && !walk.handledAlready(name))
      rc = onMachine(walk, name, 0, kProbeClusterOpen, kProbeClusterKey);
    if (rc != 0 && !walk.keepGoing)
      return rc;
    first = first != 0 ? first : rc;
    name = rest;
  }
  return first;
}

bool isClustered(const UpgradeContext &context) {
  return context.instance != nullptr && context.instance->isClustered != 0;
}

// ---------------------------------------------------------------------------
// The undo's services
// ---------------------------------------------------------------------------

// The name the owning copy gives its services: "KXL - <service>" for
// version-8 copies, else with the owning copy's name, as before the upgrade.
void serviceDisplayName(const ProfileKeys &keys, const char *service, char (&display)[kDisplayNameSize]) {
  if (keys.ownerVersion < kFirstNamedCopyVersion)
    std::snprintf(display, sizeof display, "KXL - %s", service);
  else
    std::snprintf(display, sizeof display, "KXL - %s - %s", keys.ownerCopy, service);
}

// The owning copy's service program. A path that does not fit leaves the
// buffer empty, so that the service keeps the program it has.
void ownerProgramPath(const UpgradeContext &context, char (&path)[kProgramPathSize]) {
  if (!formatWhole(path, sizeof path, "%s\\bin\\%s", context.copyPath, kServiceProgram))
    path[0] = '\0';
}

// The machine's registry for reading: the walk's open one when it is that
// machine's, else that machine opened anew; null when it cannot be reached.
HKEY machineRoot(MachineWalk &walk, const char *machineName) {
  if (walk.machine == nullptr ||
      !kxliSameText(walk.machine->machineName, machineName, SQLO_COMPUTERNAME_SZ)) {
    if (sqloPRegMachineOpen(machineName, &walk.machine) != 0 || walk.machine == nullptr)
      return nullptr;
  }
  return walk.machine->hklm;
}

// A partition on another host runs the program of the installation recorded
// in that machine's legacy global profile, when it records one.
void remoteProgramPath(MachineWalk &walk, const char *machineName, char (&path)[kProgramPathSize]) {
  HKEY root = machineRoot(walk, machineName);
  char key[kKeyPathSize];
  char installPath[kRegValueBuffer];
  if (root == nullptr || !formatWhole(key, sizeof key, "%s\\GLOBAL_PROFILE", kProductRoot) ||
      kxliReadRegString(root, key, KEY_READ, kLegacyPathValue, installPath, sizeof installPath) !=
          ERROR_SUCCESS ||
      installPath[0] == '\0')
    return;
  char remote[kProgramPathSize];
  if (formatWhole(remote, sizeof remote, "%s\\bin\\%s", installPath, kServiceProgram))
    std::memcpy(path, remote, sizeof path);
}

const char *textOrNull(const char *text) {
  return text[0] != '\0' ? text : nullptr;
}

void serviceNotBack(MachineWalk &walk, int32_t rc) {
  pdtError(walk.function, kProbeServiceNotBack, rc);
  if (walk.serviceFailure == 0)
    walk.serviceFailure = rc;
}

void repointService(MachineWalk &walk, const char *service, const char *machine, const char *program,
                    const char *account, const char *password, const char *display) {
  SQLO_SVC_OUT out{};
  int32_t rc = sqloChangeNTServiceConfig(
      service, machine, SQLO_SVC_NO_CHANGE, static_cast<uint32_t>(walk.context.serviceStartType),
      SQLO_SVC_NO_CHANGE, program, nullptr, nullptr, nullptr, account, password, display, &out);
  // A service that is not there has nothing to put back.
  if (rc != 0 && rc != SQLO_RC_SVC_NOT_FOUND)
    serviceNotBack(walk, rc);
}

bool forceCopyName(const UpgradeOptions &options) {
  return (options.flags & UPGRADE_FLAG_FORCE_COPY_NAME) != 0;
}

// How the undo points one partition's service at the owning copy again.
struct OwnedService {
  const char *machine = nullptr;  // null: this machine
  const char *listedAs = nullptr; // the machine as the services step named it
  bool remoteProgram = false;     // the program of that machine's recorded installation
  bool keepProgram = false;       // a forced partition keeps the program it has
};

// The service's program and display name as the owning copy gives them, and
// the account the services step found it running under before it gave it the
// account of -u (none recorded: the account stays as it is). The earlier
// account's password cannot be read, so none is passed.
void repointOwnedService(MachineWalk &walk, const char *service, const OwnedService &how) {
  char program[kProgramPathSize];
  ownerProgramPath(walk.context, program);
  if (how.remoteProgram)
    remoteProgramPath(walk, how.machine, program);
  char display[kDisplayNameSize];
  serviceDisplayName(*walk.keys, service, display);
  const char *account = serviceAccountBefore(walk.context, how.listedAs, service);
  repointService(walk, service, how.machine, how.keepProgram ? nullptr : textOrNull(program), account,
                 nullptr, display);
}

void partitionServiceName(const MachineWalk &walk, const unsigned char *entry,
                          char (&service)[kServiceNameSize]) {
  std::snprintf(service, sizeof service, "%s-%d", walk.options.instanceName, sqloNodeNumber(entry));
}

void repointPartitionService(MachineWalk &walk, const unsigned char *entry, uint8_t force,
                             const char *localHost) {
  OwnedService how;
  how.machine = sqloNodeMachine(entry);
  how.listedAs = how.machine;
  how.remoteProgram =
      !forceCopyName(walk.options) && !kxliSameText(sqloNodeHost(entry), localHost, SQLO_HOSTNAME_SZ);
  how.keepProgram = force != 0;
  char service[kServiceNameSize];
  partitionServiceName(walk, entry, service);
  repointOwnedService(walk, service, how);
}

// The services that the services step re-pointed on the machines of the
// instance's cluster: every partition's on every machine, the local one
// included; for a single-partition instance the other machines' (the local
// service is the local pass's).
void repointClusterServices(MachineWalk &walk) {
  char computer[SQLO_COMPUTERNAME_SZ] = {};
  uint32_t size = sizeof computer;
  if (sqloGetComputerNameA(computer, &size) == 0)
    computer[0] = '\0';
  computer[sizeof computer - 1] = '\0';
  char list[kRegValueBuffer];
  if (!clusterMachines(walk, list)) {
    serviceNotBack(walk, UPGRADE_RC_NO_COPY);
    return;
  }
  bool partitioned = isPartitioned(walk.options);
  for (char *name = std::strtok(list, " "); name != nullptr; name = std::strtok(nullptr, " ")) {
    bool local = computer[0] != '\0' && kxliSameText(name, computer, SQLO_COMPUTERNAME_SZ);
    OwnedService how;
    how.machine = local ? nullptr : name;
    how.listedAs = name;
    if (!partitioned) {
      how.remoteProgram = !local;
      if (!local)
        repointOwnedService(walk, walk.options.instanceName, how);
      continue;
    }
    how.remoteProgram = !local && !forceCopyName(walk.options);
    how.keepProgram = forceCopyName(walk.options);
    NodeCursor nodes(walk.context.nodeList);
    for (const unsigned char *entry = nodes.next(); entry != nullptr; entry = nodes.next()) {
      char service[kServiceNameSize];
      partitionServiceName(walk, entry, service);
      repointOwnedService(walk, service, how);
    }
  }
}

void repointLocalService(MachineWalk &walk) {
  char program[kProgramPathSize];
  char display[kDisplayNameSize];
  ownerProgramPath(walk.context, program);
  serviceDisplayName(*walk.keys, walk.options.instanceName, display);
  repointService(walk, walk.options.instanceName, nullptr, textOrNull(program), nullptr, nullptr, display);
}

// ---------------------------------------------------------------------------
// The two passes
// ---------------------------------------------------------------------------

int32_t moveMachines(MachineWalk &walk) {
  if (!isPartitioned(walk.options))
    return onLocalMachine(walk, kProbeLocalKey);
  char localHost[SQLO_HOSTNAME_SZ] = {};
  if ((walk.options.flags & UPGRADE_FLAG_FORCE_COPY_NAME) != 0) {
    int32_t rc = localFullHostName(walk, localHost);
    if (rc != 0)
      return rc;
  }
  return walkPartitions(walk, localHost, nullptr);
}

// The old profile keys of the forced partitions' machines.
int32_t dropForcedMachines(MachineWalk &walk) {
  if (!isPartitioned(walk.options) || (walk.options.flags & UPGRADE_FLAG_FORCE_COPY_NAME) == 0)
    return 0;
  char localHost[SQLO_HOSTNAME_SZ] = {};
  int32_t rc = localFullHostName(walk, localHost);
  return rc != 0 ? rc : walkPartitions(walk, localHost, nullptr);
}

int32_t revertMachines(MachineWalk &walk) {
  if (!isPartitioned(walk.options)) {
    int32_t rc = onLocalMachine(walk, kProbeLocalKey);
    if (rc == 0)
      repointLocalService(walk);
    return rc;
  }
  char localHost[SQLO_HOSTNAME_SZ] = {};
  int32_t rc = localFullHostName(walk, localHost);
  return rc != 0 ? rc : walkPartitions(walk, localHost, repointPartitionService);
}

int32_t keysOrFailure(const UpgradeContext &context, const UpgradeOptions &options, ProfileKeys &keys,
                      uint32_t function) {
  return loadKeys(context, options, keys) ? 0 : ErrorTrace{function}(kProbeCreateKey, UPGRADE_RC_NO_COPY);
}

// The walk's operation after a successful force-copy-name upgrade.
int32_t dropForcedProfileKey(UpgradeContext &context, HKEY machineRoot, UpgradeOptions &options,
                             uint8_t force) {
  if (force == 0)
    return 0;
  ProfileKeys keys;
  int32_t rc = keysOrFailure(context, options, keys, KXL_FN_MOVE_INSTANCE_PROFILE);
  return rc != 0 ? rc : dropForcedKey(machineRoot, keys);
}

} // namespace

int32_t moveProfileKey(UpgradeContext &context, HKEY machineRoot, UpgradeOptions &options, uint8_t force) {
  pdtEntry(KXL_FN_MOVE_INSTANCE_PROFILE);
  ProfileKeys keys;
  int32_t rc = keysOrFailure(context, options, keys, KXL_FN_MOVE_INSTANCE_PROFILE);
  if (rc == 0)
    rc = moveKey(machineRoot, keys, force != 0);
  pdtExit(KXL_FN_MOVE_INSTANCE_PROFILE, rc, 0);
  return rc;
}

int32_t revertProfileKey(UpgradeContext &context, HKEY machineRoot, UpgradeOptions &options, uint8_t force) {
  pdtEntry(KXL_FN_REVERT_INSTANCE_PROFILE);
  ProfileKeys keys;
  int32_t rc = keysOrFailure(context, options, keys, KXL_FN_REVERT_INSTANCE_PROFILE);
  if (rc == 0)
    rc = revertKey(machineRoot, keys, force != 0);
  pdtExit(KXL_FN_REVERT_INSTANCE_PROFILE, rc, 0);
  return rc;
}

int32_t moveInstanceProfile(UpgradeContext &context, UpgradeOptions &options) {
  pdtEntry(KXL_FN_MOVE_INSTANCE_PROFILE);
  MachineWalk walk(context, options, KXL_FN_MOVE_INSTANCE_PROFILE, moveProfileKey, nullptr);
  int32_t rc = moveMachines(walk);
  if (rc == 0 && isClustered(context))
    rc = walkCluster(walk);
  walk.release();
  pdtExit(KXL_FN_MOVE_INSTANCE_PROFILE, rc, 0);
  return rc;
}

int32_t revertInstanceProfile(UpgradeContext &context, UpgradeOptions &options) {
  pdtEntry(KXL_FN_REVERT_INSTANCE_PROFILE);
  ProfileKeys keys;
  MachineWalk walk(context, options, KXL_FN_REVERT_INSTANCE_PROFILE, revertProfileKey, &keys);
  walk.keepGoing = true;
  int32_t rc = keysOrFailure(context, options, keys, KXL_FN_REVERT_INSTANCE_PROFILE);
  if (rc == 0) {
    rc = revertMachines(walk);
    int32_t clusterRc = isClustered(context) ? walkCluster(walk) : 0;
    rc = rc != 0 ? rc : clusterRc;
    if (isClustered(context) && context.recreatedNodeType != 0)
      repointClusterServices(walk);
    rc = rc != 0 ? rc : walk.serviceFailure;
  }
  walk.release();
  pdtExit(KXL_FN_REVERT_INSTANCE_PROFILE, rc, 0);
  return rc;
}

int32_t dropForcedProfileKeys(UpgradeContext &context, UpgradeOptions &options) {
  pdtEntry(KXL_FN_MOVE_INSTANCE_PROFILE);
  MachineWalk walk(context, options, KXL_FN_MOVE_INSTANCE_PROFILE, dropForcedProfileKey, nullptr);
  walk.goOnOnceForced = true;
  int32_t rc = dropForcedMachines(walk);
  walk.release();
  if (rc != 0 && walk.forcedDone > 0) {
    pdLog(PD_LEVEL_WARNING, KXL_FN_MOVE_INSTANCE_PROFILE, kProbeForcedKeysLeft, rc,
          "old profile keys of the force-copy-name machines not all deleted");
    rc = 0;
  }
  pdtExit(KXL_FN_MOVE_INSTANCE_PROFILE, rc, 0);
  return rc;
}
