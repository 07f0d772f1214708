#include "NT/environment.h"

#include "NT/cfgfile.h"
#include "NT/dbmcfg_fields.h"
#include "NT/localhost.h"
#include "NT/pathjoin.h"
#include "platform/kxlsys.h"
#include "platform/win32.h"
#include "upgrade/errortrace.h"

#include <cctype>
#include <cstring>

namespace {

constexpr uint32_t kFullHostName = 5;
constexpr uint32_t kResolveFlags = 1;
constexpr uint32_t kReservePorts = 3;
constexpr uint32_t kNodesFileFlags = 842;     // create, write only, shared, binary
constexpr uint32_t kProfileScriptFlags = 843; // the same, written through
constexpr uint32_t kCharsetClassPrefix = 13;  // the name characters follow the class prefix
constexpr size_t kWorkstationChars = kxldbm::kWorkstation.size - 1;
constexpr const char kClientComponent[] = "KXL Zelquor Client";

// Trace points, one per step that can fail.
enum Probe : uint32_t {
  kProbeCreate = 10,
  kProbeOpen = 20,
  kProbeRead = 21,
  kProbeCpu = 22,
  kProbeBandwidth = 23,
  kProbeSeek = 24,
  kProbeWrite = 25,
  kProbeCommInit = 30,
  kProbeHost = 31,
  kProbeComputer = 32,
  kProbePorts = 33,
  kProbeVariables = 34,
  kProbeAddNode = 35,
  kProbeNodesFile = 36,
  kProbeProfileScript = 37,
};

constexpr ErrorTrace traced{KXL_FN_UPGRADE_INSTANCE_ENVIRONMENT};

// The -1 result whose reason is SQLCODE -1042 in the caller's status block.
int32_t commFailure(uint32_t probe, sqlca *ca) {
  if (ca != nullptr)
    sqlcaSetCode(*ca, UPGRADE_SQLCODE_PARTITION_SETUP);
  return traced(probe, UPGRADE_RC_SQLCA);
}

// What this call has created, so that a failure can take it away again.
struct CreatedInstance {
  const char *name = nullptr;
  char directory[KXL_JOINED_PATH_SZ] = {};
  bool partitionAdded = false;
};

void undoCreation(const CreatedInstance &created) {
  if (created.partitionAdded) {
    SQLO_INST_OUT first{}, second{};
    sqlo_instance_delnode(created.name, 0, nullptr, 0, &first, &second);
  }
  sqlo_instance_drop(created.name, created.directory);
}

// ---- the configuration image ----------------------------------------------

void putF32(unsigned char *image, const kxldbm::Field &field, float value) {
  uint32_t bits = 0;
  static_assert(sizeof bits == sizeof value);
  std::memcpy(&bits, &value, sizeof bits);
  kxlcfg::put32(image, field.offset, bits);
}

// Writes `text` into its field, zero-padded; false when it does not fit.
bool putText(unsigned char *image, const kxldbm::Field &field, const char *text) {
  size_t length = std::strlen(text);
  if (length >= field.size)
    return false;
  std::memset(image + field.offset, 0, field.size);
  std::memcpy(image + field.offset, text, length);
  return true;
}

// The copy's components and its Java folder. True when a field was written.
bool tuneComponents(unsigned char *image, const char *installPath) {
  char copyName[SQLO_COPY_NAME_SZ] = {};
  if (sqloGetCurrentInstallationName(copyName, sizeof copyName) != 0)
    return false;
  char keyPath[64 + SQLO_COPY_NAME_SZ];
  ossSnprintf(keyPath, sizeof keyPath, "SOFTWARE\\ZAV\\KXL\\INSTALLEDCOPIES\\%s\\COMPONENTS", copyName);
  HKEY key = nullptr;
  if (RegOpenKeyExA(HKEY_LOCAL_MACHINE, keyPath, 0, KEY_QUERY_VALUE, &key) != ERROR_SUCCESS)
    return false;
  bool changed = false;
  if (RegQueryValueExA(key, kClientComponent, nullptr, nullptr, nullptr, nullptr) == ERROR_SUCCESS) {
    kxlcfg::put32(image, kxldbm::kClientComponent.offset, ENV_CLIENT_COMPONENT_VALUE);
    changed = true;
  }
  if (installPath != nullptr) {
    char javaPath[KXL_JOINED_PATH_SZ];
    joinPath(javaPath, installPath, "java\\jdk");
    OSSPathParam test{OSS_PATH_PARAM_VERSION, javaPath, 1, 0};
    // A path too long for its field is left out rather than written cut.
    if (ossPathTest(&test) == 0 && putText(image, kxldbm::kJavaPath, javaPath))
      changed = true;
  }
  RegCloseKey(key);
  return changed;
}

// Decimal text of (instance profiles other than the global one) - 1, or "".
void workstationSuffix(char *suffix, size_t size) {
  char globalName[SQLO_PREG_VALUE_SZ] = {};
  uint32_t variable = KXL_VAR_KXLINSTANCE;
  bool known = sqloPRegValue(SQLO_PREG_GET, &variable, 0, globalName, KXL_GLOBAL_PROFILE_NAME) == 0;
  uint32_t count = 0;
  char profile[SQLO_PREG_PROFILE_SZ] = {};
  for (uint32_t action = SQLO_PREG_FIRST; sqloPRegProfile(action, profile) == 0; action = SQLO_PREG_NEXT) {
    profile[sizeof profile - 1] = '\0';
    if (!known || sqlomcpi(profile, globalName, SQLO_PREG_VALUE_SZ) != 0)
      ++count;
  }
  suffix[0] = '\0';
  if (count > 1)
    ossSnprintf(suffix, size, "%u", count - 1);
}

// The machine's name as the configuration assistant reports it.
bool assistantMachineName(char *name, size_t size) {
  if (caProIfInit() != 0)
    return false;
  CAPRO_REQUEST request;
  std::memset(&request, 0, sizeof request);
  request.queryKind = CAPRO_QUERY_MACHINE_NAME;
  CAPRO_RESULT result{};
  bool found = caProIfQuery(&request, &result) == 0;
  if (found)
    ossSnprintf(name, size, "%.*s", static_cast<int>(sizeof request.machineName - 1), request.machineName);
  caProIfTerm();
  return found;
}

bool isNameCharacter(char c) {
  return c != '\0' && std::strchr(sqlz_charset + kCharsetClassPrefix, c) != nullptr;
}

// Machine name up to its first ".", upper case, a letter first, cut so that the
// profile suffix fits into 8 characters; false when no name can be formed.
bool workstationName(char *name) {
  char machine[sizeof(CAPRO_REQUEST::machineName)] = {};
  if (!assistantMachineName(machine, sizeof machine))
    return false;
  machine[std::strcspn(machine, ".")] = '\0';
  if (machine[0] == '\0')
    return false;
  for (char *c = machine; *c != '\0'; ++c)
    *c = static_cast<char>(std::toupper(static_cast<unsigned char>(*c)));
  if (!std::isalpha(static_cast<unsigned char>(machine[0])))
    machine[0] = 'd';
  char suffix[16];
  workstationSuffix(suffix, sizeof suffix);
  size_t suffixLength = std::strlen(suffix);
  size_t keep = suffixLength < kWorkstationChars ? kWorkstationChars - suffixLength : 0;
  ossSnprintf(name, kxldbm::kWorkstation.size, "%.*s%s", static_cast<int>(keep), machine, suffix);
  for (char *c = name + 1; *c != '\0'; ++c)
    if (!isNameCharacter(*c))
      *c = '_';
  return true;
}

// The machine-specific fields of a server image. `changed` is set when one
// is written; a failed measure ends the tuning with its code.
int32_t tuneMeasures(unsigned char *image, uint32_t workstationFlag, bool &changed) {
  uint16_t nodeType = sqloLe16(image, DBMCFG_NODE_TYPE_OFFSET);
  if (nodeType == 2)
    return 0;
  float cpu = 0;
  int32_t rc = sqlocpum(&cpu);
  if (rc != 0)
    return traced(kProbeCpu, rc);
  putF32(image, kxldbm::kCpuMeasure, cpu);
  changed = true;
  if (nodeType == KXL_NODE_TYPE_PARTITIONED) {
    float bandwidth = 0;
    rc = sqloGetCommBandwidth(&bandwidth, nodeType);
    if (rc != 0)
      return traced(kProbeBandwidth, rc);
    putF32(image, kxldbm::kBandwidth, bandwidth);
  }
  char name[kxldbm::kWorkstation.size] = {};
  if (workstationName(name))
    putText(image, kxldbm::kWorkstation, name);
  if (workstationFlag != 0)
    kxlcfg::put16(image, kxldbm::kWorkstationFlag.offset, 1);
  return 0;
}

// Reads the whole image; the file is closed again before the tuning writes.
int32_t readImage(const char *path, unsigned char *image) {
  kxlcfg::File file(path, kxlcfg::Access::Update);
  if (!file.isOpen())
    return traced(kProbeOpen, UPGRADE_RC_CONFIG_FILE);
  uint32_t got = 0;
  if (file.readUpTo(image, kxlcfg::kImageSize, &got) != 0 || got != kxlcfg::kImageSize)
    return traced(kProbeRead, UPGRADE_RC_CONFIG_FILE);
  return 0;
}

// Writes the sealed image over the file from its start: a file that cannot
// be opened again counts as the failed rewind, a short write as the failed write.
int32_t rewriteImage(const char *path, unsigned char *image) {
  kxlcfg::sealImage(image);
  switch (kxlcfg::writeWhole(path, kxlcfg::Access::Rewrite, image, kxlcfg::kImageSize)) {
  case kxlcfg::WriteResult::Written:
    return 0;
  case kxlcfg::WriteResult::NotOpened:
    return traced(kProbeSeek, UPGRADE_RC_CONFIG_FILE);
  case kxlcfg::WriteResult::Failed:
    break;
  }
  return traced(kProbeWrite, UPGRADE_RC_CONFIG_FILE);
}

int32_t tuneConfigFile(const char *instanceDir, const char *installPath, uint32_t workstationFlag) {
  char path[KXL_JOINED_PATH_SZ];
  joinPath(path, instanceDir, "kxlsystm");
  unsigned char image[kxlcfg::kImageSize];
  int32_t rc = readImage(path, image);
  if (rc != 0)
    return rc;
  bool changed = tuneComponents(image, installPath);
  rc = tuneMeasures(image, workstationFlag, changed);
  if (rc == 0 && changed)
    rc = rewriteImage(path, image);
  return rc;
}

// ---- partition 0 ----------------------------------------------------------

// The record's text fields end inside their fields whatever the caller left there.
void terminateFields(PartitionRecord &record) {
  record.portStart[sizeof record.portStart - 1] = '\0';
  record.portEnd[sizeof record.portEnd - 1] = '\0';
  record.hostName[sizeof record.hostName - 1] = '\0';
  record.computerName[sizeof record.computerName - 1] = '\0';
  record.netName[sizeof record.netName - 1] = '\0';
}

// A given host must resolve; an empty one becomes this machine's short host name.
int32_t settleHostName(PartitionRecord &record, sqlca *ca) {
  if (record.hostName[0] != '\0') {
    char resolved[SQLO_HOSTNAME_SZ] = {};
    if (sqloPdbTcpIpResolveHostName(record.hostName, resolved, kFullHostName, kResolveFlags) != 0)
      return traced(kProbeHost, UPGRADE_RC_HOST_UNKNOWN);
    return 0;
  }
  if (!readLocalFullHostName(record.hostName))
    return commFailure(kProbeHost, ca);
  record.hostName[std::strcspn(record.hostName, ".")] = '\0';
  return 0;
}

int32_t settleComputerName(PartitionRecord &record, sqlca *ca) {
  if (record.computerName[0] != '\0')
    return 0;
  uint32_t size = sizeof record.computerName;
  if (sqloGetComputerNameA(record.computerName, &size) == 0) {
    record.computerName[0] = '\0';
    return commFailure(kProbeComputer, ca);
  }
  record.computerName[sizeof record.computerName - 1] = '\0';
  return 0;
}

int32_t settlePorts(const char *instanceName, PartitionRecord &record) {
  if (record.portStart[0] != '\0' && record.portEnd[0] != '\0')
    return 0;
  if (sqloUpdateServiceFile(kReservePorts, instanceName, record.portStart, record.portEnd) != 0)
    return traced(kProbePorts, UPGRADE_RC_SERVICES_FILE);
  terminateFields(record);
  return 0;
}

int32_t setInstanceVariable(const char *instanceName, uint32_t variable, const char *value) {
  char text[SQLO_PREG_VALUE_SZ];
  // A value that could not be formed is never set as an empty one.
  if (ossSnprintf(text, sizeof text, "%s", value) < 0 ||
      sqloPRegValuePE(SQLO_PREG_SET, &variable, 0, text, instanceName, SQLO_PREG_ANY_NODE, 0) != 0)
    return traced(kProbeVariables, UPGRADE_RC_NO_COPY);
  return 0;
}

int32_t setPartitionVariables(const char *instanceName, const PartitionRecord &record) {
  char ports[2 * SQLO_PORT_TEXT_SZ];
  if (ossSnprintf(ports, sizeof ports, "%s:%s", record.portStart, record.portEnd) < 0)
    return traced(kProbeVariables, UPGRADE_RC_NO_COPY);
  int32_t rc = setInstanceVariable(instanceName, KXL_VAR_KXLPORTRANGE, ports);
  if (rc == 0)
    rc = setInstanceVariable(instanceName, KXL_VAR_KXLNODECOMPUTER, record.computerName);
  return rc;
}

int32_t addPartitionZero(CreatedInstance &created, const char *userName, const char *password) {
  SQLO_INST_OUT first{}, second{};
  int32_t rc = sqlo_instance_addnode(created.name, 0, nullptr, 0, userName, password, &first, &second);
  if (rc == 0) {
    created.partitionAdded = true;
    return 0;
  }
  // The out record carries the reason; a call that fails without one still fails.
  return traced(kProbeAddNode, second.code != 0 ? second.code : rc);
}

bool writeTextFile(const char *directory, const char *name, uint32_t flags, const char *text) {
  char path[KXL_JOINED_PATH_SZ];
  joinPath(path, directory, name);
  SQLO_FHANDLE handle = nullptr;
  int32_t rc = sqloopenp(path, flags, SQLO_MODE_FILE, &handle, 0);
  if (rc != 0 && rc != SQLO_RC_FILE_EXISTED)
    return false;
  uint32_t length = static_cast<uint32_t>(std::strlen(text));
  uint32_t written = 0;
  bool complete = sqlowrite(handle, text, length, &written) == 0 && written == length;
  return sqloclose(handle) == 0 && complete;
}

int32_t writePartitionFiles(const CreatedInstance &created, const PartitionRecord &record, sqlca *ca) {
  char line[SQLO_HOSTNAME_SZ + SQLO_COMPUTERNAME_SZ + UPGRADE_NET_NAME_SZ + 16];
  // A text that could not be formed is never written as an empty file.
  if (ossSnprintf(line, sizeof line, "0 %s %s 0 %s\r\n", record.hostName, record.computerName,
                  record.netName) < 0 ||
      !writeTextFile(created.directory, "kxlnodes.cfg", kNodesFileFlags, line))
    return commFailure(kProbeNodesFile, ca);
  char script[64];
  if (ossSnprintf(script, sizeof script, "@echo off%sSET KXLINSTANCE=%s%s", "\r\n", created.name, "\r\n") <
          0 ||
      !writeTextFile(created.directory, "kxlprofile.bat", kProfileScriptFlags, script))
    return commFailure(kProbeProfileScript, ca);
  return 0;
}

int32_t setUpPartitionZero(CreatedInstance &created, const char *userName, const char *password,
                           PartitionRecord &record, sqlca *ca) {
  terminateFields(record);
  if (sqloPdbCommFncInit() != 0)
    return commFailure(kProbeCommInit, ca);
  int32_t rc = settleHostName(record, ca);
  if (rc == 0)
    rc = settleComputerName(record, ca);
  if (rc == 0)
    rc = settlePorts(created.name, record);
  if (rc == 0)
    rc = setPartitionVariables(created.name, record);
  if (rc == 0)
    rc = addPartitionZero(created, userName, password);
  if (rc == 0)
    rc = writePartitionFiles(created, record, ca);
  return rc;
}

int32_t createInstance(const char *instanceName, const char *instanceProfilePath, const char *installPath,
                       const char *userName, const char *password, uint32_t oldNodeType, uint32_t newNodeType,
                       PartitionRecord *partitionRecord, uint32_t createFlag) {
  PartitionRecord none{};
  PartitionRecord &record = partitionRecord != nullptr ? *partitionRecord : none;
  record.clusterName[sizeof record.clusterName - 1] = '\0';
  record.textSearchService[sizeof record.textSearchService - 1] = '\0';
  const char *clusterName = record.clusterName[0] != '\0' ? record.clusterName : nullptr;
  return sqlo_instance_create_extended(
      instanceName, instanceProfilePath, installPath, 0, userName, password, 0, oldNodeType, newNodeType,
      clusterName, record.serviceStepFlag, createFlag, record.textSearchRequested, record.textSearchService,
      record.textSearchPort, &record.textSearchReasonCode, &record.extraMessage);
}

} // namespace

int32_t upgradeInstanceEnvironment(const char *instanceName, const char *instanceProfilePath,
                                   const char *installPath, const char *userName, const char *password,
                                   uint32_t oldNodeType, uint32_t newNodeType,
                                   PartitionRecord *partitionRecord, sqlca *ca, uint32_t createFlag,
                                   uint32_t workstationFlag) {
  pdtEntry(KXL_FN_UPGRADE_INSTANCE_ENVIRONMENT);
  int32_t rc = createInstance(instanceName, instanceProfilePath, installPath, userName, password, oldNodeType,
                              newNodeType, partitionRecord, createFlag);
  if (rc != 0) {
    traced(kProbeCreate, rc);
    pdtExit(KXL_FN_UPGRADE_INSTANCE_ENVIRONMENT, rc, kProbeCreate);
    return rc;
  }
  CreatedInstance created;
  created.name = instanceName;
  joinPath(created.directory, instanceProfilePath, instanceName);
  sqloPutEnv(KXL_VAR_KXLINSTANCE, instanceName);
  sqloPutEnv(KXL_VAR_KXLINSTPROF, instanceProfilePath);

  rc = tuneConfigFile(created.directory, installPath, workstationFlag);
  if (rc == 0 && newNodeType == 4 && partitionRecord != nullptr)
    rc = setUpPartitionZero(created, userName, password, *partitionRecord, ca);
  if (rc != 0)
    undoCreation(created);
  pdtExit(KXL_FN_UPGRADE_INSTANCE_ENVIRONMENT, rc, 0);
  return rc;
}
