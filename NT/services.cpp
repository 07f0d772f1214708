#include "NT/services.h"

#include "NT/environment.h"
#include "NT/kxliutil.h"
#include "NT/localhost.h"
#include "NT/nodetypechoice.h"
#include "NT/pathjoin.h"
#include "install/iutil.h"
#include "platform/kxlsys.h"
#include "platform/win32.h"
#include "upgrade/errortrace.h"
#include "upgrade/records.h"

#include <cstring>

namespace {

constexpr uint32_t kServiceNameSize = 30;  // "%s-%d": 29 characters
constexpr uint32_t kExtenderNameSize = 40; // "KXLEXT - " and a partition's service name
constexpr uint32_t kDisplayNameSize = SQLO_COPY_NAME_SZ + 64;
constexpr uint32_t kClusterValueSize = 257;
constexpr uint32_t kKxlPathSize = 256;
constexpr int32_t kDisabled = 4; // start type of partitions left on another copy's machine
constexpr const char kServerProgram[] = "kxlsyscs.exe";
constexpr const char kExtenderProgram[] = "ctelock.exe";
constexpr const char kMessageLibrary[] = "kxlwint64.dll";
constexpr const char kClusterList[] = "KXLCLUSTERLIST";
constexpr const char kClusterInstanceProfile[] = "KXLINSTPROF";

enum Probe : uint32_t {
  kProbeCopyName = 5,
  kProbeNodeTemplate = 7,
  kProbeClusterName = 10,
  kProbeSaveNodes = 20,
  kProbeServiceConfig = 30,
  kProbeServiceAccount = 35,
  kProbeEnvironment = 40,
  kProbeRestoreNodes = 50,
  kProbeServiceChange = 60,
  kProbeProgramPath = 65,
  kProbeName = 75,
  kProbeHostName = 70,
  kProbeClusterMachine = 80,
  kProbePartitionMachine = 90,
  kProbeSingleMachine = 210,
  kProbeClusterProfile = 220, // the cluster profile cannot be read or written
};

constexpr ErrorTrace traced{KXL_FN_UPGRADE_INSTANCE_SERVICES};

// A name, path or value the step forms and passes on. One that could not be
// formed ends the step: an empty one would mean "no change" to the library,
// or name nothing.
bool formed(int length) {
  return length >= 0;
}

int32_t unformed() {
  return traced(kProbeName, SQLO_RC_SYSTEM_ERROR);
}

// The cluster profile values, read before the instance is re-created and
// written to every machine of the cluster afterwards.
struct ClusterProfile {
  HKEY key = nullptr; // the local cluster profile key, open for the whole step
  char list[kClusterValueSize + 1] = {};
  char instanceProfile[kClusterValueSize + 1] = {};
  bool hasList = false;
  bool hasInstanceProfile = false;
};

struct ServicesStep {
  ServicesStep(UpgradeContext &c, UpgradeOptions &o) : context(c), options(o) {}

  UpgradeContext &context;
  UpgradeOptions &options;
  char instanceName[SQLO_INSTANCE_NAME_SZ] = {};
  char copyName[SQLO_COPY_NAME_SZ] = {};
  char localHost[SQLO_HOSTNAME_SZ] = {};
  char referenceService[kServiceNameSize] = {};
  char nodesFile[KXL_JOINED_PATH_SZ] = {};
  char savedNodesFile[KXL_JOINED_PATH_SZ] = {};
  bool nodesSaved = false; // the saved copy is there until it is put back
  ClusterProfile cluster;
  SQLO_PREG_MACHINE *machine = nullptr;

  bool flag(uint16_t bit) const { return (options.flags & bit) != 0; }
  bool partitioned() const { return isPartitioned(options); }
  bool clustered() const { return context.instance != nullptr && context.instance->isClustered != 0; }
  const char *account() const { return options.userName[0] != '\0' ? options.userName : nullptr; }
  const char *password() const { return options.password[0] != '\0' ? options.password : nullptr; }
};

// One call of the service configuration change; null members change nothing.
struct ServiceChange {
  const char *service = nullptr;
  const char *machine = nullptr;
  int32_t startType = UPGRADE_NO_SERVICE_STATE;
  const char *program = nullptr;
  const char *account = nullptr;
  const char *password = nullptr;
  const char *displayName = nullptr;
};

// A service that is not there has nothing to change; any other failure ends
// the step, so that a service still running the old copy's program is never
// reported as upgraded.
int32_t changeService(const ServiceChange &change) {
  SQLO_SVC_OUT out{};
  int32_t rc = sqloChangeNTServiceConfig(change.service, change.machine, SQLO_SVC_NO_CHANGE,
                                         static_cast<uint32_t>(change.startType), SQLO_SVC_NO_CHANGE,
                                         change.program, nullptr, nullptr, nullptr, change.account,
                                         change.password, change.displayName, &out);
  return rc == 0 || rc == SQLO_RC_SVC_NOT_FOUND ? 0 : traced(kProbeServiceChange, rc);
}

int32_t restoreStartType(const ServicesStep &step, const char *service) {
  ServiceChange change;
  change.service = service;
  change.startType = step.context.serviceStartType;
  return changeService(change);
}

struct ProgramPaths {
  char server[KXL_JOINED_PATH_SZ] = {};
  char extender[KXL_JOINED_PATH_SZ] = {};
};

void programPaths(const char *installPath, ProgramPaths &paths) {
  char bin[KXL_JOINED_PATH_SZ];
  joinPath(bin, installPath, "bin");
  joinPath(paths.server, bin, kServerProgram);
  joinPath(paths.extender, bin, kExtenderProgram);
}

// The program paths from "KXLPATH" of the current copy's global profile in a
// machine's registry; the paths stay as they are when it has none. A profile
// or value that cannot be read is a failure, never taken for a missing one.
int32_t machineProgramPaths(HKEY hklm, const char *copyName, ProgramPaths &paths) {
  char keyPath[64 + SQLO_COPY_NAME_SZ];
  if (!formed(ossSnprintf(keyPath, sizeof keyPath, "%s\\InstalledCopies\\%s\\GLOBAL_PROFILE",
                          "SOFTWARE\\ZAV\\KXL", copyName)))
    return unformed();
  HKEY key = nullptr;
  LONG rc = RegOpenKeyExA(hklm, keyPath, 0, KEY_READ, &key);
  if (rc == ERROR_FILE_NOT_FOUND)
    return 0;
  if (rc != ERROR_SUCCESS)
    return traced(kProbeProgramPath, UPGRADE_RC_MACHINE_REGISTRY);
  char value[kKxlPathSize + 1] = {};
  DWORD size = kKxlPathSize;
  DWORD type = REG_NONE;
  rc = RegQueryValueExA(key, "KXLPATH", nullptr, &type, reinterpret_cast<BYTE *>(value), &size);
  RegCloseKey(key);
  if (rc != ERROR_SUCCESS && rc != ERROR_FILE_NOT_FOUND)
    return traced(kProbeProgramPath, UPGRADE_RC_MACHINE_REGISTRY);
  if (rc == ERROR_SUCCESS && (type == REG_SZ || type == REG_EXPAND_SZ) && value[0] != '\0')
    programPaths(value, paths);
  return 0;
}

int32_t openMachine(ServicesStep &step, const char *machineName, uint32_t probe) {
  if (sqloPRegMachineOpen(machineName, &step.machine) != 0)
    return traced(probe, UPGRADE_RC_MACHINE_REGISTRY);
  return 0;
}

// ---- cluster profile --------------------------------------------------------

bool clusterProfileKeyPath(const ServicesStep &step, char *path, size_t size) {
  return formed(ossSnprintf(path, size, "Cluster\\ZAV\\KXL\\PROFILES\\%s", step.instanceName));
}

// ERROR_SUCCESS with the value, a missing code, or the failure.
LONG readClusterValue(HKEY key, const char *name, char *value) {
  DWORD size = kClusterValueSize;
  LONG rc = RegQueryValueExA(key, name, nullptr, nullptr, reinterpret_cast<BYTE *>(value), &size);
  value[rc == ERROR_SUCCESS && size < kClusterValueSize ? size : 0] = '\0';
  return rc;
}

LONG writeClusterValue(HKEY key, const char *name, const char *value) {
  return RegSetValueExA(key, name, 0, REG_SZ, reinterpret_cast<const BYTE *>(value),
                        static_cast<DWORD>(std::strlen(value) + 1));
}

// Values that were missing before the re-creation are not invented afterwards.
int32_t writeClusterValues(HKEY key, const ClusterProfile &cluster) {
  if (key == nullptr)
    return 0;
  if ((cluster.hasList && writeClusterValue(key, kClusterList, cluster.list) != ERROR_SUCCESS) ||
      (cluster.hasInstanceProfile &&
       writeClusterValue(key, kClusterInstanceProfile, cluster.instanceProfile) != ERROR_SUCCESS))
    return traced(kProbeClusterProfile, UPGRADE_RC_MACHINE_REGISTRY);
  return 0;
}

// A machine without the instance's cluster profile key gets none.
int32_t writeMachineClusterValues(const ServicesStep &step) {
  char path[64];
  if (!clusterProfileKeyPath(step, path, sizeof path))
    return unformed();
  HKEY key = nullptr;
  LONG opened = RegOpenKeyExA(step.machine->hklm, path, 0, KEY_ALL_ACCESS, &key);
  if (kxliIsMissing(opened))
    return 0;
  if (opened != ERROR_SUCCESS)
    return traced(kProbeClusterProfile, UPGRADE_RC_MACHINE_REGISTRY);
  int32_t rc = writeClusterValues(key, step.cluster);
  RegCloseKey(key);
  return rc;
}

int32_t readClusterProfile(ServicesStep &step) {
  uint32_t rc = step.context.instance->GetClusterName(step.options.partitionRecord.clusterName,
                                                      sizeof step.options.partitionRecord.clusterName);
  if (rc != 0)
    return traced(kProbeClusterName, static_cast<int32_t>(rc));
  char path[64];
  if (!clusterProfileKeyPath(step, path, sizeof path))
    return unformed();
  ClusterProfile &cluster = step.cluster;
  LONG opened = RegOpenKeyExA(HKEY_LOCAL_MACHINE, path, 0, KEY_ALL_ACCESS, &cluster.key);
  if (opened != ERROR_SUCCESS) {
    cluster.key = nullptr;
    return kxliIsMissing(opened) ? 0 : traced(kProbeClusterProfile, UPGRADE_RC_MACHINE_REGISTRY);
  }
  LONG list = readClusterValue(cluster.key, kClusterList, cluster.list);
  LONG profile = readClusterValue(cluster.key, kClusterInstanceProfile, cluster.instanceProfile);
  if ((list != ERROR_SUCCESS && !kxliIsMissing(list)) ||
      (profile != ERROR_SUCCESS && !kxliIsMissing(profile)))
    return traced(kProbeClusterProfile, UPGRADE_RC_MACHINE_REGISTRY);
  cluster.hasList = list == ERROR_SUCCESS;
  cluster.hasInstanceProfile = profile == ERROR_SUCCESS;
  return 0;
}

// Calls `visit` for every machine named in the saved cluster list (names
// separated by single blanks) until it fails.
template <class Visit> int32_t forEachClusterMachine(const ServicesStep &step, Visit visit) {
  if (!step.cluster.hasList)
    return 0;
  char names[kClusterValueSize + 1];
  if (!formed(ossSnprintf(names, sizeof names, "%s", step.cluster.list)))
    return unformed();
  for (char *name = names; *name != '\0';) {
    char *end = name + std::strcspn(name, " ");
    bool last = *end == '\0';
    *end = '\0';
    if (*name != '\0') {
      int32_t rc = visit(name);
      if (rc != 0)
        return rc;
    }
    name = last ? end : end + 1;
  }
  return 0;
}

// ---- before the re-creation -------------------------------------------------

uint32_t workstationProfileFlag() {
  char value[SQLO_PREG_VALUE_SZ] = {};
  uint32_t variable = KXL_VAR_KXLWORKSTATION;
  if (sqloPRegValuePE(SQLO_PREG_GET, &variable, 0, value, nullptr, SQLO_PREG_ANY_NODE, 0) != 0)
    return 0;
  return sqloStr2Flag(value) == 1 ? 1 : 0;
}

// The product libraries see the instance's port range and profile path.
int32_t prepareEnvironment(const ServicesStep &step) {
  if (step.context.var159Head[0] != '\0') {
    char ports[19];
    if (!formed(ossSnprintf(ports, sizeof ports, "%s:%s", step.context.var159Head, step.context.var159Tail)))
      return unformed();
    sqloPutEnv(KXL_VAR_KXLPORTRANGE, ports);
    sqlo_force_refresh_env();
  }
  sqloPutEnv(KXL_VAR_KXLINSTPROF, step.options.profilePath);
  sqlo_force_refresh_env();
  return 0;
}

bool isCopied(int32_t rc) {
  return rc == 0 || rc == SQLO_RC_FILE_NOT_FOUND_W;
}

// "<path>.mig", inside the closing quote of a quoted path.
bool savedNodesFilePath(const char *path, char *saved) {
  size_t length = std::strlen(path);
  bool quoted = length > 0 && path[length - 1] == '"';
  int keep = static_cast<int>(quoted ? length - 1 : length);
  return formed(ossSnprintf(saved, KXL_JOINED_PATH_SZ, "%.*s.mig%s", keep, path, quoted ? "\"" : ""));
}

int32_t saveNodesFile(ServicesStep &step) {
  char directory[KXL_JOINED_PATH_SZ] = {};
  if (step.flag(UPGRADE_FLAG_PROFILE_PATH_MOVES))
    joinPath(directory, step.options.profilePath, step.instanceName);
  else if (step.context.instance != nullptr)
    step.context.instance->GetInstanceDir(directory, sizeof directory);
  joinPath(step.nodesFile, directory, "\\kxlnodes.cfg");
  if (!savedNodesFilePath(step.nodesFile, step.savedNodesFile))
    return unformed();
  int32_t rc = sqlocopy(step.nodesFile, step.savedNodesFile, 0);
  step.nodesSaved = rc == 0;
  return isCopied(rc) ? 0 : traced(kProbeSaveNodes, rc);
}

const unsigned char *firstNode(const UpgradeContext &context) {
  return context.nodeList != nullptr ? sqloNodeListFirst(context.nodeList) : nullptr;
}

bool partitionServiceName(const ServicesStep &step, const unsigned char *entry, char *name) {
  return formed(ossSnprintf(name, kServiceNameSize, "%s-%d", step.instanceName, sqloNodeNumber(entry)));
}

template <class Visit> int32_t forEachNode(const ServicesStep &step, Visit visit) {
  const unsigned char *entry = firstNode(step.context);
  int32_t count = entry != nullptr ? sqloNodeListCount(step.context.nodeList) : 0;
  for (int32_t i = 0; i < count; ++i, entry = sqloNodeNext(entry)) {
    int32_t rc = visit(entry);
    if (rc != 0)
      return rc;
  }
  return 0;
}

// The service whose start type the re-created services get: the first
// partition's, or the instance's own. A partitioned instance without a node
// list has none.
int32_t chooseReferenceService(ServicesStep &step) {
  bool named = true;
  if (!step.partitioned())
    named = formed(ossSnprintf(step.referenceService, sizeof step.referenceService, "%s", step.instanceName));
  else if (const unsigned char *entry = firstNode(step.context))
    named = partitionServiceName(step, entry, step.referenceService);
  return named ? 0 : unformed();
}

int32_t readStartType(ServicesStep &step) {
  if (step.referenceService[0] == '\0')
    return 0;
  SQLO_SVC_CONFIG config{};
  SQLO_SVC_OUT out{};
  if (sqloQueryNTServiceConfig(step.referenceService, nullptr, &config, &out) != 0)
    return traced(kProbeServiceConfig, UPGRADE_RC_NO_SERVICE_CONFIG);
  step.context.serviceStartType = config.startType;
  return 0;
}

// One service's account, read before the step gives it the account of -u. A
// service that does not exist has none to give back; any other failed read
// ends the step before anything is changed.
int32_t recordAccount(ServicesStep &step, const char *service, const char *machine) {
  SQLO_SVC_CONFIG config{};
  SQLO_SVC_OUT out{};
  int32_t rc = sqloQueryNTServiceConfig(service, machine, &config, &out);
  if (rc == SQLO_RC_SVC_NOT_FOUND)
    return 0;
  if (rc != 0)
    return traced(kProbeServiceAccount, UPGRADE_RC_NO_SERVICE_CONFIG);
  config.account[sizeof config.account - 1] = '\0';
  step.context.serviceAccounts.push_back({machine != nullptr ? machine : "", service, config.account});
  return 0;
}

// The partitions' services get the account of -u: their accounts before are
// kept for the undo, on every machine the step will change them on.
int32_t recordAccounts(ServicesStep &step) {
  step.context.serviceAccounts.clear();
  if (step.account() == nullptr || !step.partitioned())
    return 0;
  auto onMachine = [&](const char *machine) {
    return forEachNode(step, [&](const unsigned char *entry) {
      char service[kServiceNameSize];
      if (!partitionServiceName(step, entry, service))
        return unformed();
      return recordAccount(step, service, machine != nullptr ? machine : sqloNodeMachine(entry));
    });
  };
  if (step.clustered())
    return forEachClusterMachine(step, onMachine);
  return onMachine(nullptr);
}

int32_t recreateInstance(ServicesStep &step, int32_t newNodeType, uint32_t workstationFlag) {
  UpgradeOptions &options = step.options;
  options.partitionRecord.serviceStepFlag = 1;
  int32_t rc = upgradeInstanceEnvironment(step.instanceName, options.profilePath, options.currentInstallPath,
                                          step.account(), step.password(), step.context.nodeType,
                                          static_cast<uint32_t>(newNodeType), &options.partitionRecord,
                                          &options.status, 1, workstationFlag);
  return rc == 0 ? 0 : traced(kProbeEnvironment, rc);
}

// ---- partitioned instance -----------------------------------------------------

int32_t restoreNodesFile(ServicesStep &step) {
  int32_t rc = sqlocopy(step.savedNodesFile, step.nodesFile, 0);
  if (!isCopied(rc))
    return traced(kProbeRestoreNodes, rc);
  step.nodesSaved = false;
  sqlodelete(step.savedNodesFile, 0);
  return 0;
}

int32_t findLocalHost(ServicesStep &step) {
  if (!readLocalFullHostName(step.localHost)) {
    sqlcaSetCode(step.options.status, UPGRADE_SQLCODE_PARTITION_SETUP);
    return traced(kProbeHostName, UPGRADE_RC_SQLCA);
  }
  return 0;
}

bool isLocalHost(const ServicesStep &step, const unsigned char *entry) {
  return kxliSameText(sqloNodeHost(entry), step.localHost, SQLO_HOSTNAME_SZ);
}

// The extender service of a partition; an existing one is changed instead.
int32_t registerExtender(const ServicesStep &step, const unsigned char *entry, const ServiceChange &partition,
                         const char *program) {
  char service[kExtenderNameSize], display[kDisplayNameSize];
  if (!formed(ossSnprintf(service, sizeof service, "KXLEXT - %s", partition.service)) ||
      !formed(ossSnprintf(display, sizeof display, "KXLEXT - %s - %s-%d", step.copyName, step.instanceName,
                          sqloNodeNumber(entry))))
    return unformed();
  SQLO_SVC_OUT out{};
  int32_t rc = sqloRegisterNTService(partition.machine, service, display, 0, program, 0, partition.account,
                                     partition.password, kMessageLibrary, &out);
  if (rc != SQLO_RC_SVC_EXISTS)
    return rc == 0 ? 0 : traced(kProbeServiceChange, rc);
  ServiceChange change = partition;
  change.service = service;
  change.program = partition.startType == kDisabled ? nullptr : program;
  change.displayName = display;
  return changeService(change);
}

// Points one partition's services at the current copy's programs (the program
// paths given), or leaves a forced partition disabled on its old program.
int32_t repointPartitionServices(const ServicesStep &step, const unsigned char *entry, const char *machine,
                                 const ProgramPaths &paths, bool forced) {
  char service[kServiceNameSize], display[kDisplayNameSize];
  if (!partitionServiceName(step, entry, service) ||
      !formed(ossSnprintf(display, sizeof display, "KXL - %s - %s-%d", step.copyName, step.instanceName,
                          sqloNodeNumber(entry))))
    return unformed();
  ServiceChange change;
  change.service = service;
  change.machine = machine;
  change.startType = forced ? kDisabled : step.context.serviceStartType;
  change.program = forced ? nullptr : paths.server;
  change.account = step.account();
  change.password = step.password();
  change.displayName = display;
  int32_t rc = changeService(change);
  if (rc == 0 && step.flag(UPGRADE_FLAG_CONTENT_EXTENDER))
    rc = registerExtender(step, entry, change, paths.extender);
  return rc;
}

int32_t repointPartition(ServicesStep &step, const unsigned char *entry) {
  bool localHost = isLocalHost(step, entry);
  if (localHost && sqloNodePort(entry) == 0) {
    char service[kServiceNameSize];
    return partitionServiceName(step, entry, service) ? restoreStartType(step, service) : unformed();
  }
  ProgramPaths paths;
  programPaths(step.options.currentInstallPath, paths);
  bool forceCopyName = step.flag(UPGRADE_FLAG_FORCE_COPY_NAME);
  if (!forceCopyName && !localHost) {
    int32_t rc = openMachine(step, sqloNodeMachine(entry), kProbePartitionMachine);
    if (rc == 0)
      rc = machineProgramPaths(step.machine->hklm, step.copyName, paths);
    if (rc != 0)
      return rc;
  }
  return repointPartitionServices(step, entry, sqloNodeMachine(entry), paths, forceCopyName && !localHost);
}

// Every partition's service on one machine of the cluster, then the cluster
// profile there.
int32_t repointClusterMachine(ServicesStep &step, const char *machine) {
  int32_t rc = openMachine(step, machine, kProbeClusterMachine);
  if (rc != 0)
    return rc;
  bool forceCopyName = step.flag(UPGRADE_FLAG_FORCE_COPY_NAME);
  ProgramPaths paths;
  programPaths(step.options.currentInstallPath, paths);
  if (!forceCopyName)
    rc = machineProgramPaths(step.machine->hklm, step.copyName, paths);
  if (rc == 0)
    rc = forEachNode(step, [&](const unsigned char *entry) {
      return repointPartitionServices(step, entry, machine, paths, forceCopyName);
    });
  return rc != 0 ? rc : writeMachineClusterValues(step);
}

int32_t repointPartitions(ServicesStep &step) {
  int32_t rc = restoreNodesFile(step);
  if (rc == 0)
    rc = findLocalHost(step);
  if (rc != 0)
    return rc;
  if (step.clustered())
    return forEachClusterMachine(step,
                                 [&](const char *machine) { return repointClusterMachine(step, machine); });
  return forEachNode(step, [&](const unsigned char *entry) { return repointPartition(step, entry); });
}

// A failed step leaves the nodes file as it was and no saved copy of it: the
// undo's restore of the instance directory removes no file. A copy that
// cannot be put back stays, as the nodes file's only whole copy.
void putBackNodesFile(ServicesStep &step) {
  if (step.nodesSaved && sqlocopy(step.savedNodesFile, step.nodesFile, 0) == 0)
    sqlodelete(step.savedNodesFile, 0);
}

// ---- single service -------------------------------------------------------------

// The instance's service on another machine of its cluster.
int32_t repointClusterNode(ServicesStep &step, const char *machine) {
  int32_t rc = openMachine(step, machine, kProbeSingleMachine);
  if (rc != 0)
    return rc;
  if ((rc = writeMachineClusterValues(step)) != 0)
    return rc;
  ProgramPaths paths;
  programPaths(step.options.currentInstallPath, paths);
  rc = machineProgramPaths(step.machine->hklm, step.copyName, paths);
  if (rc != 0)
    return rc;
  char display[kDisplayNameSize];
  if (!formed(ossSnprintf(display, sizeof display, "KXL - %s - %s", step.copyName, step.instanceName)))
    return unformed();
  ServiceChange change;
  change.service = step.instanceName;
  change.machine = machine;
  change.startType = step.context.serviceStartType;
  change.program = paths.server;
  change.displayName = display;
  return changeService(change);
}

int32_t repointSingleService(ServicesStep &step) {
  int32_t rc = step.referenceService[0] != '\0' ? restoreStartType(step, step.referenceService) : 0;
  if (rc != 0 || !step.clustered())
    return rc;
  char local[SQLO_COMPUTERNAME_SZ] = {};
  uint32_t size = sizeof local;
  if (sqloGetComputerNameA(local, &size) == 0) {
    // Without the local name every machine is reached through its registry,
    // this one included; the services are changed all the same.
    local[0] = '\0';
    pdLog(PD_LEVEL_WARNING, KXL_FN_UPGRADE_INSTANCE_SERVICES, 200, 0, "local computer name unknown");
  }
  local[sizeof local - 1] = '\0';
  return forEachClusterMachine(step, [&](const char *machine) {
    if (local[0] != '\0' && kxliSameText(machine, local, SQLO_COMPUTERNAME_SZ))
      return writeClusterValues(step.cluster.key, step.cluster);
    return repointClusterNode(step, machine);
  });
}

// The current copy's name names the re-pointed services: read before
// anything is changed, and never taken as empty when the read fails.
int32_t readCopyName(ServicesStep &step) {
  if (sqloGetCurrentInstallationName(step.copyName, sizeof step.copyName) != 0 || step.copyName[0] == '\0')
    return traced(kProbeCopyName, UPGRADE_RC_NO_COPY);
  return 0;
}

int32_t runServicesStep(ServicesStep &step) {
  UpgradeContext &context = step.context;
  if (int32_t rc = readCopyName(step); rc != 0)
    return rc;
  uint32_t workstationFlag = workstationProfileFlag();
  int32_t newNodeType = chooseNodeType(context, step.options, context.nodeType);
  if (newNodeType < 0)
    return traced(kProbeNodeTemplate, newNodeType);
  int32_t rc = prepareEnvironment(step);
  if (rc == 0 &&
      !formed(ossSnprintf(step.instanceName, sizeof step.instanceName, "%s", step.options.instanceName)))
    rc = unformed();
  if (rc == 0 && step.clustered())
    rc = readClusterProfile(step);
  if (rc == 0 && step.partitioned())
    rc = saveNodesFile(step);
  if (rc == 0)
    rc = chooseReferenceService(step);
  if (rc != 0)
    return rc;
  if (context.nodeType != 2 && (rc = readStartType(step)) != 0)
    return rc;
  if ((rc = recordAccounts(step)) != 0 || (rc = recreateInstance(step, newNodeType, workstationFlag)) != 0)
    return rc;
  context.recreatedNodeType = static_cast<uint32_t>(newNodeType);
  if (newNodeType == KXL_NODE_TYPE_PARTITIONED && step.partitioned())
    return repointPartitions(step);
  if (newNodeType == 2)
    return 0;
  return repointSingleService(step);
}

} // namespace

const char *serviceAccountBefore(const UpgradeContext &context, const char *machine, const char *service) {
  const char *onMachine = machine != nullptr ? machine : "";
  for (const ServiceAccount &kept : context.serviceAccounts)
    if (kxliSameText(kept.machine.c_str(), onMachine, SQLO_COMPUTERNAME_SZ) &&
        kxliSameText(kept.service.c_str(), service, kServiceNameSize))
      return kept.account.c_str();
  return nullptr;
}

int32_t upgradeInstanceServices(UpgradeContext &context, UpgradeOptions &options) {
  pdtEntry(KXL_FN_UPGRADE_INSTANCE_SERVICES);
  ServicesStep step(context, options);
  int32_t rc = runServicesStep(step);
  if (rc != 0)
    putBackNodesFile(step);
  if (step.cluster.key != nullptr)
    RegCloseKey(step.cluster.key);
  sqloPRegMachineClose(&step.machine);
  pdtExit(KXL_FN_UPGRADE_INSTANCE_SERVICES, rc, 0);
  return rc;
}
