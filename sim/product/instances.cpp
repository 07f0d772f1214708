// Instances: creation under the current copy, partition entries and removal.
//
// An instance is its registry entry (SOFTWARE\ZAV\KXLSIM\Instances\<NAME>:
// "Directory", "Copy"), its profile key under its copy, its directory with the
// configuration file "kxlsystm", and its Windows services: one named after the
// instance (node types other than 2 and 4), or one "<NAME>-<node>" per
// partition entry. Creation may re-create an instance that exists already (an
// upgrade re-creates it in place); what it changed is remembered for this
// process, so that a drop or a partition removal in the same process puts the
// earlier state back exactly instead of losing the instance.
#include "sim/product/instances.h"
#include "platform/dbmcfgfile.h"
#include "platform/kxlsys.h"
#include "sim/common/names.h"
#include "sim/common/simfail.h"
#include "sim/posix/reghelp.h"
#include "sim/product/installation.h"
#include "sim/product/simstate.h"
#include "sim/product/simstore.h"
#include "sim/product/svcfile.h"
#include "sim/product/winpath.h"

#include <cstdio>
#include <cstring>
#include <string>
#include <vector>

namespace reg = kxlsim::posix::reg;

namespace {

using kxlprod::CopyInfo;
using kxlprod::KeySnapshot;

constexpr DWORD kAutoStart = 2;
constexpr DWORD kStoppedState = 1;
constexpr uint32_t kFirstTextSearchPort = 55000;
constexpr uint32_t kLargestPort = 65535;
constexpr char kDefaultAccount[] = "LocalSystem";
constexpr char kServerProgram[] = "kxlsyscs.exe";

// Reason codes of the text search configuration.
enum TextSearchReason : int32_t {
  kTextSearchOk = 0,
  kTextSearchPortInUse = 1,  // the port belongs to another services-file entry
  kTextSearchNameInUse = 2,  // the service name is in use with another port
  kTextSearchFileFailed = 3, // the services file cannot be written
  kTextSearchNoServer = 4,   // a client instance has no server to search for
  kTextSearchNoFreePort = 5, // no free port from 55000 on
};

// What a creation changed, to be put back by a drop in this process.
struct Creation {
  std::string instance;
  std::string entryKey, profileKey, serviceKey;
  KeySnapshot entry, profile, service;
  std::string directory;
  bool directoryExisted = false;
  bool configExisted = false;
  std::vector<uint8_t> config;
  std::string textSearchEntry; // services-file entry added, "" for none
};

struct AddedNode {
  std::string instance;
  int32_t node = 0;
  std::string serviceKey;
  KeySnapshot service;
};

std::vector<Creation> creations;
std::vector<AddedNode> addedNodes;

bool validInstanceName(const char *name) {
  if (name == nullptr || name[0] == '\0' || std::strlen(name) >= SQLO_INSTANCE_NAME_SZ)
    return false;
  return std::strpbrk(name, "\\/:*?\"<>| ") == nullptr;
}

std::string serverProgram(const CopyInfo &copy) {
  return kxlprod::joinPath(copy.path, std::string("bin\\") + kServerProgram);
}

std::string displayName(const CopyInfo &copy, const std::string &service) {
  return copy.v8 ? "KXL - " + service : "KXL - " + copy.name + " - " + service;
}

// A value, key or file that is not there, as against one that could not be
// read.
bool absent(LONG rc) {
  return rc == ERROR_FILE_NOT_FOUND || rc == ERROR_PATH_NOT_FOUND;
}

// Points a service at the copy's server program; an existing service keeps
// its start type and account unless an account is given. A start type or
// account that cannot be read fails the call: taking it for absent would
// hand the service the defaults (automatic start, the system account).
LONG writeService(const std::string &key, const CopyInfo &copy, const std::string &service,
                  const char *account) {
  DWORD start = kAutoStart;
  LONG read = kxlprod::readRegDword(HKEY_LOCAL_MACHINE, key, "Start", start);
  if (read != ERROR_SUCCESS && !absent(read))
    return read;
  std::string objectName = kDefaultAccount;
  if (account != nullptr && account[0] != '\0') {
    objectName = account;
  } else {
    std::string stored;
    read = reg::queryString(HKEY_LOCAL_MACHINE, key, "ObjectName", stored);
    if (read == ERROR_SUCCESS)
      objectName = stored;
    else if (!absent(read))
      return read;
  }
  LONG rc = reg::writeString(HKEY_LOCAL_MACHINE, key, "ImagePath", serverProgram(copy));
  if (rc == ERROR_SUCCESS)
    rc = reg::writeString(HKEY_LOCAL_MACHINE, key, "DisplayName", displayName(copy, service));
  if (rc == ERROR_SUCCESS)
    rc = reg::writeString(HKEY_LOCAL_MACHINE, key, "ObjectName", objectName);
  if (rc == ERROR_SUCCESS)
    rc = reg::writeDword(HKEY_LOCAL_MACHINE, key, "Start", start);
  if (rc == ERROR_SUCCESS)
    rc = reg::writeDword(HKEY_LOCAL_MACHINE, key, "State", kStoppedState);
  return rc;
}

template <typename Record>
typename std::vector<Record>::iterator findRecord(std::vector<Record> &records, const std::string &instance) {
  for (auto it = records.begin(); it != records.end(); ++it)
    if (kxlsim::equalsIgnoringCase(it->instance, instance))
      return it;
  return records.end();
}

// ---- creation -------------------------------------------------------------

struct CreateRequest {
  std::string instance;
  std::string profilePath;
  uint32_t nodeType = 0;
  const char *userName = nullptr;
  const char *clusterName = nullptr;
  bool textSearch = false;
  const char *textSearchService = nullptr;
  uint16_t textSearchPort = 0;
};

Creation snapshotFor(const CreateRequest &request, const CopyInfo &copy) {
  Creation c;
  c.instance = request.instance;
  c.entryKey = kxlprod::instanceRegistryKey(request.instance);
  c.profileKey = kxlprod::profileKey(copy, request.instance);
  c.serviceKey = kxlprod::serviceKeyPath("", request.instance);
  c.entry = kxlprod::takeKeySnapshot(HKEY_LOCAL_MACHINE, c.entryKey);
  c.profile = kxlprod::takeKeySnapshot(HKEY_LOCAL_MACHINE, c.profileKey);
  c.service = kxlprod::takeKeySnapshot(HKEY_LOCAL_MACHINE, c.serviceKey);
  c.directory = kxlprod::joinPath(request.profilePath, request.instance);
  c.directoryExisted = kxlprod::isDirectoryPath(c.directory);
  std::string configPath = kxlprod::joinPath(c.directory, "kxlsystm");
  c.configExisted = kxlprod::readWholeFile(configPath, DBMCFG_IMAGE_SZ, c.config) == ERROR_SUCCESS;
  return c;
}

void undoCreation(const Creation &c) {
  kxlprod::restoreKeySnapshot(HKEY_LOCAL_MACHINE, c.serviceKey, c.service);
  kxlprod::restoreKeySnapshot(HKEY_LOCAL_MACHINE, c.profileKey, c.profile);
  kxlprod::restoreKeySnapshot(HKEY_LOCAL_MACHINE, c.entryKey, c.entry);
  if (!c.textSearchEntry.empty()) {
    kxlprod::ServicesFile file;
    if (kxlprod::loadServicesFile(file) == 0 && kxlprod::removeServiceEntry(file, c.textSearchEntry))
      kxlprod::saveServicesFile(file);
  }
  std::string configPath = kxlprod::joinPath(c.directory, "kxlsystm");
  if (!c.directoryExisted)
    kxlprod::removeDirectoryTree(c.directory);
  else if (c.configExisted)
    kxlprod::writeWholeFile(configPath, c.config);
  else
    DeleteFileA(configPath.c_str());
}

int32_t writeConfiguration(const CopyInfo &copy, const CreateRequest &request, const std::string &directory) {
  std::string source =
      kxlprod::joinPath(copy.path, std::string("CFG\\") + dbmCfgTemplateName(request.nodeType));
  std::vector<uint8_t> image;
  LONG rc = kxlprod::readWholeFile(source, DBMCFG_IMAGE_SZ, image);
  if (absent(rc))
    return SQLO_RC_FILE_NOT_FOUND;
  if (rc != ERROR_SUCCESS || image.size() != DBMCFG_IMAGE_SZ)
    return SQLO_RC_IO_ERROR;
  if (!kxlprod::createDirectoryTree(directory, true))
    return SQLO_RC_PATH_NOT_FOUND;
  rc = kxlprod::writeWholeFile(kxlprod::joinPath(directory, "kxlsystm"), image);
  return rc == ERROR_SUCCESS ? 0 : SQLO_RC_IO_ERROR;
}

int32_t registerInstance(const CopyInfo &copy, const CreateRequest &request, const Creation &c) {
  LONG rc = reg::writeString(HKEY_LOCAL_MACHINE, c.entryKey, "Directory", c.directory);
  if (rc == ERROR_SUCCESS)
    rc = reg::writeString(HKEY_LOCAL_MACHINE, c.entryKey, "Copy", copy.v8 ? "" : copy.name);
  HKEY profile = nullptr;
  if (rc == ERROR_SUCCESS)
    rc = RegCreateKeyExA(HKEY_LOCAL_MACHINE, c.profileKey.c_str(), 0, nullptr, REG_OPTION_NON_VOLATILE,
                         KEY_ALL_ACCESS, nullptr, &profile, nullptr);
  if (rc == ERROR_SUCCESS)
    RegCloseKey(profile);
  if (rc == ERROR_SUCCESS && request.clusterName != nullptr && request.clusterName[0] != '\0')
    rc = reg::writeString(HKEY_LOCAL_MACHINE, c.profileKey, "KXLCLUSTER", request.clusterName);
  // Client instances run no server; a partitioned instance gets one service per
  // partition entry instead.
  if (rc == ERROR_SUCCESS && request.nodeType != 2 && request.nodeType != 4)
    rc = writeService(c.serviceKey, copy, request.instance, request.userName);
  return rc == ERROR_SUCCESS ? 0 : SQLO_RC_SYSTEM_ERROR;
}

bool firstFreePort(const kxlprod::ServicesFile &file, uint32_t &port) {
  for (port = kFirstTextSearchPort; port <= kLargestPort; ++port)
    if (!kxlprod::portInUse(file, port))
      return true;
  return false;
}

// Reserves the text search service in the services file; the reason code.
int32_t configureTextSearch(const CreateRequest &request, Creation &c) {
  if (request.nodeType == 2)
    return kTextSearchNoServer;
  std::string name = request.textSearchService != nullptr && request.textSearchService[0] != '\0'
                         ? std::string(request.textSearchService)
                         : "KXLTS_" + request.instance;
  kxlprod::ServicesFile file;
  if (kxlprod::loadServicesFile(file) != 0)
    return kTextSearchFileFailed;
  uint32_t existing = 0;
  if (kxlprod::findServiceEntry(file, name, existing))
    return request.textSearchPort == 0 || existing == request.textSearchPort ? kTextSearchOk
                                                                             : kTextSearchNameInUse;
  uint32_t port = request.textSearchPort;
  if (port != 0 && kxlprod::portInUse(file, port))
    return kTextSearchPortInUse;
  if (port == 0 && !firstFreePort(file, port))
    return kTextSearchNoFreePort;
  kxlprod::addServiceEntry(file, name, port);
  if (kxlprod::saveServicesFile(file) != 0)
    return kTextSearchFileFailed;
  c.textSearchEntry = name;
  return kTextSearchOk;
}

int32_t createInstance(const CreateRequest &request, int32_t *textSearchReasonCode) {
  CopyInfo copy;
  if (!kxlprod::currentCopy(copy))
    return SQLO_RC_NO_INSTALLATION;
  Creation c = snapshotFor(request, copy);
  int32_t rc = writeConfiguration(copy, request, c.directory);
  if (rc == 0)
    rc = registerInstance(copy, request, c);
  if (rc != 0) {
    undoCreation(c);
    return rc;
  }
  if (request.textSearch) {
    int32_t reason = configureTextSearch(request, c);
    if (textSearchReasonCode != nullptr)
      *textSearchReasonCode = reason;
  }
  auto earlier = findRecord(creations, request.instance);
  if (earlier != creations.end())
    creations.erase(earlier);
  creations.push_back(std::move(c));
  return 0;
}

// ---- removal --------------------------------------------------------------

// Removes "<NAME>-<digits>" services of this machine.
void removePartitionServices(const std::string &instance) {
  std::vector<std::string> names;
  reg::listSubkeys(HKEY_LOCAL_MACHINE, std::string(kxlprod::kSimRoot) + "\\Services", names);
  std::string prefix = instance + "-";
  for (const std::string &name : names) {
    bool digits = name.size() > prefix.size() &&
                  name.find_first_not_of("0123456789", prefix.size()) == std::string::npos;
    if (digits && kxlprod::startsWithIgnoringCase(name, prefix))
      SHDeleteKeyA(HKEY_LOCAL_MACHINE, kxlprod::serviceKeyPath("", name).c_str());
  }
}

// Removes an instance this process did not create: every trace of it on this machine.
int32_t removeInstance(const std::string &instance, const char *instanceDir) {
  std::string directory, copyName;
  bool registered = kxlprod::readInstanceEntry(instance, directory, copyName);
  if (instanceDir != nullptr && instanceDir[0] != '\0')
    directory = kxlprod::unquotedPath(instanceDir);
  std::string serviceKey = kxlprod::serviceKeyPath("", instance);
  bool hasService = reg::keyExists(HKEY_LOCAL_MACHINE, serviceKey);
  bool hasDirectory = !directory.empty() && kxlprod::isDirectoryPath(directory);
  if (!registered && !hasService && !hasDirectory)
    return SQLO_RC_NOT_FOUND;
  CopyInfo copy;
  if (registered && kxlprod::findCopy(copyName.empty() ? kxlprod::kV8CopyName : copyName, copy))
    SHDeleteKeyA(HKEY_LOCAL_MACHINE, kxlprod::profileKey(copy, instance).c_str());
  SHDeleteKeyA(HKEY_LOCAL_MACHINE, serviceKey.c_str());
  removePartitionServices(instance);
  SHDeleteKeyA(HKEY_LOCAL_MACHINE, kxlprod::instanceRegistryKey(instance).c_str());
  if (hasDirectory)
    return kxlprod::removeDirectoryTree(directory);
  return 0;
}

// ---- partition entries ----------------------------------------------------

void setOut(SQLO_INST_OUT *out, int32_t code) {
  if (out == nullptr)
    return;
  std::memset(out, 0, sizeof *out);
  out->code = code;
}

int32_t reportNode(SQLO_INST_OUT *out1, SQLO_INST_OUT *out2, int32_t code) {
  setOut(out1, code);
  setOut(out2, code);
  return code;
}

// The machine prefix of a partition's host: this machine for no host, else
// the host's computer as the host names give it.
bool partitionMachine(const char *hostName, std::string &prefix) {
  if (hostName == nullptr || hostName[0] == '\0')
    return kxlprod::machineKeyPrefix(nullptr, prefix);
  std::string computer;
  if (reg::queryString(HKEY_LOCAL_MACHINE, std::string(kxlprod::kSimRoot) + "\\Hosts\\" + hostName,
                       "Computer", computer) != ERROR_SUCCESS)
    return false;
  return kxlprod::machineKeyPrefix(computer.c_str(), prefix);
}

std::string partitionService(const std::string &instance, int32_t node) {
  char name[32];
  std::snprintf(name, sizeof name, "%s-%d", instance.c_str(), static_cast<int>(node));
  return name;
}

auto findNode(const std::string &instance, int32_t node) {
  for (auto it = addedNodes.begin(); it != addedNodes.end(); ++it)
    if (it->node == node && kxlsim::equalsIgnoringCase(it->instance, instance))
      return it;
  return addedNodes.end();
}

} // namespace

namespace kxlprod {

void resetInstanceState() {
  creations.clear();
  addedNodes.clear();
}

} // namespace kxlprod

extern "C" {

int32_t sqlo_instance_create_extended(const char *instanceName, const char *instanceProfilePath,
                                      const char *installPath, uint32_t reserved1, const char *userName,
                                      const char *password, uint32_t reserved2, uint32_t oldNodeType,
                                      uint32_t newNodeType, const char *clusterName, uint8_t serviceStepFlag,
                                      uint32_t createFlag, uint8_t textSearchRequested,
                                      const char *textSearchService, uint16_t textSearchPort,
                                      int32_t *textSearchReasonCode, int32_t *extraMessage) {
  // The instance is always created under the current copy, from that copy's
  // registered path; the password is never stored.
  (void)installPath, (void)reserved1, (void)password, (void)reserved2, (void)oldNodeType;
  (void)serviceStepFlag, (void)createFlag;
  if (textSearchReasonCode != nullptr)
    *textSearchReasonCode = 0;
  if (extraMessage != nullptr)
    *extraMessage = 0;
  if (kxlsim::shouldFail("sqlo_instance_create_extended"))
    return SQLO_RC_SYSTEM_ERROR;
  if (!validInstanceName(instanceName) || instanceProfilePath == nullptr ||
      dbmCfgTemplateName(newNodeType) == nullptr)
    return SQLO_RC_INVALID_ARGUMENT;
  CreateRequest request;
  request.instance = instanceName;
  request.profilePath = kxlprod::unquotedPath(instanceProfilePath);
  if (request.profilePath.empty() ||
      kxlprod::joinPath(request.profilePath, instanceName).size() >= SQLO_PATH_SZ)
    return SQLO_RC_INVALID_ARGUMENT;
  request.nodeType = newNodeType;
  request.userName = userName;
  request.clusterName = clusterName;
  request.textSearch = textSearchRequested != 0;
  request.textSearchService = textSearchService;
  request.textSearchPort = textSearchPort;
  return createInstance(request, textSearchReasonCode);
}

int32_t sqlo_instance_drop(const char *instanceName, const char *instanceDir) {
  if (kxlsim::shouldFail("sqlo_instance_drop"))
    return SQLO_RC_SYSTEM_ERROR;
  if (!validInstanceName(instanceName))
    return SQLO_RC_INVALID_ARGUMENT;
  auto created = findRecord(creations, instanceName);
  if (created == creations.end())
    return removeInstance(instanceName, instanceDir);
  undoCreation(*created);
  creations.erase(created);
  return 0;
}

int32_t sqlo_instance_addnode(const char *instanceName, int32_t node, const char *hostName, uint32_t port,
                              const char *userName, const char *password, SQLO_INST_OUT *out1,
                              SQLO_INST_OUT *out2) {
  (void)port, (void)password;
  if (kxlsim::shouldFail("sqlo_instance_addnode"))
    return reportNode(out1, out2, SQLO_RC_SYSTEM_ERROR);
  if (!validInstanceName(instanceName) || node < 0 || node > SQLO_MAX_NODE_NUMBER)
    return reportNode(out1, out2, SQLO_RC_INVALID_ARGUMENT);
  std::string directory, copyName;
  CopyInfo copy;
  if (!kxlprod::readInstanceEntry(instanceName, directory, copyName) ||
      !kxlprod::findCopy(copyName.empty() ? kxlprod::kV8CopyName : copyName, copy))
    return reportNode(out1, out2, SQLO_RC_NOT_FOUND);
  std::string prefix;
  if (!partitionMachine(hostName, prefix))
    return reportNode(out1, out2, SQLO_RC_MACHINE_UNREACHABLE);
  AddedNode added{
      instanceName, node, kxlprod::serviceKeyPath(prefix, partitionService(instanceName, node)), {}};
  added.service = kxlprod::takeKeySnapshot(HKEY_LOCAL_MACHINE, added.serviceKey);
  if (writeService(added.serviceKey, copy, partitionService(instanceName, node), userName) != ERROR_SUCCESS) {
    kxlprod::restoreKeySnapshot(HKEY_LOCAL_MACHINE, added.serviceKey, added.service);
    return reportNode(out1, out2, SQLO_RC_SYSTEM_ERROR);
  }
  auto earlier = findNode(instanceName, node);
  if (earlier != addedNodes.end())
    addedNodes.erase(earlier);
  addedNodes.push_back(std::move(added));
  return reportNode(out1, out2, 0);
}

int32_t sqlo_instance_delnode(const char *instanceName, int32_t node, const char *hostName, uint32_t port,
                              SQLO_INST_OUT *out1, SQLO_INST_OUT *out2) {
  (void)port;
  if (kxlsim::shouldFail("sqlo_instance_delnode"))
    return reportNode(out1, out2, SQLO_RC_SYSTEM_ERROR);
  if (!validInstanceName(instanceName) || node < 0 || node > SQLO_MAX_NODE_NUMBER)
    return reportNode(out1, out2, SQLO_RC_INVALID_ARGUMENT);
  auto added = findNode(instanceName, node);
  if (added != addedNodes.end()) {
    kxlprod::restoreKeySnapshot(HKEY_LOCAL_MACHINE, added->serviceKey, added->service);
    addedNodes.erase(added);
    return reportNode(out1, out2, 0);
  }
  std::string prefix;
  if (!partitionMachine(hostName, prefix))
    return reportNode(out1, out2, SQLO_RC_MACHINE_UNREACHABLE);
  std::string key = kxlprod::serviceKeyPath(prefix, partitionService(instanceName, node));
  if (!reg::keyExists(HKEY_LOCAL_MACHINE, key))
    return reportNode(out1, out2, SQLO_RC_SVC_NOT_FOUND);
  SHDeleteKeyA(HKEY_LOCAL_MACHINE, key.c_str());
  return reportNode(out1, out2, 0);
}

} // extern "C"
