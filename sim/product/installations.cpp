// Installations: the current copy, switching between copies, and the instance
// registry (SOFTWARE\ZAV\KXLSIM\Instances\<NAME>: "Directory", "Copy").
#include "platform/kxlsys.h"
#include "sim/common/names.h"
#include "sim/common/simfail.h"
#include "sim/posix/reghelp.h"
#include "sim/product/installation.h"
#include "sim/product/text.h"

#include <cstring>
#include <new>
#include <string>
#include <vector>

namespace reg = kxlsim::posix::reg;

struct OSSInstanceList {
  std::vector<std::string> names;
  std::vector<kxlprod::CopyInfo> copies; // read once for the whole walk
  size_t next = 0;
};

namespace {

using kxlprod::CopyInfo;

std::string instancesKey() {
  return std::string(kxlprod::kSimRoot) + "\\Instances";
}

enum class EntryRead { read, absent, failed };

// Fills `info` from the instance's registry entry. An entry without a
// directory is absent (removed meanwhile); an entry without a copy belongs to
// the version-8 installation. Any other failed read is a failure, never taken
// for either.
EntryRead readInstance(const std::string &name, const std::vector<CopyInfo> &copies,
                       OSSInstanceInfo_t &info) {
  std::string key = instancesKey() + "\\" + name;
  std::string directory;
  LONG rc = reg::queryString(HKEY_LOCAL_MACHINE, key, "Directory", directory);
  if (rc != ERROR_SUCCESS)
    return rc == ERROR_FILE_NOT_FOUND ? EntryRead::absent : EntryRead::failed;
  std::string copyName;
  rc = reg::queryString(HKEY_LOCAL_MACHINE, key, "Copy", copyName);
  if (rc != ERROR_SUCCESS && rc != ERROR_FILE_NOT_FOUND)
    return EntryRead::failed;
  std::memset(&info, 0, sizeof info);
  info.version = 1;
  info.size = sizeof info;
  info.instanceType = OSS_INSTANCE_TYPE_SERVER;
  kxlprod::copyBounded(name, info.instanceName, sizeof info.instanceName);
  kxlprod::copyBounded(directory, info.instanceDir, sizeof info.instanceDir);
  kxlprod::copyBounded(copyName, info.copyName, sizeof info.copyName);
  const std::string owner = copyName.empty() ? kxlprod::kV8CopyName : copyName;
  for (const CopyInfo &copy : copies) {
    if (kxlsim::equalsIgnoringCase(copy.name, owner)) {
      kxlprod::copyBounded(copy.path, info.installPath, sizeof info.installPath);
      break;
    }
  }
  return EntryRead::read;
}

EntryRead readInstance(const std::string &name, OSSInstanceInfo_t &info) {
  std::vector<CopyInfo> copies;
  kxlprod::listCopies(copies);
  return readInstance(name, copies, info);
}

// The instance's registry name as stored (case preserved), found ignoring case.
bool findInstanceName(const std::string &wanted, std::string &stored) {
  std::vector<std::string> names;
  if (reg::listSubkeys(HKEY_LOCAL_MACHINE, instancesKey(), names) != ERROR_SUCCESS)
    return false;
  for (const std::string &name : names) {
    if (kxlsim::equalsIgnoringCase(name, wanted)) {
      stored = name;
      return true;
    }
  }
  return false;
}

uint32_t adminServerInfo(OSSInstanceInfo_t &info) {
  std::string name;
  if (reg::queryString(HKEY_LOCAL_MACHINE, std::string(kxlprod::kSimRoot) + "\\AdminServer", "Name", name) !=
          ERROR_SUCCESS ||
      name.empty())
    return OSS_RC_NOT_FOUND;
  std::string stored;
  if (!findInstanceName(name, stored) || readInstance(stored, info) != EntryRead::read) {
    // An administration server without an instance entry: its name is all there is.
    std::memset(&info, 0, sizeof info);
    info.version = 1;
    info.size = sizeof info;
    kxlprod::copyBounded(name, info.instanceName, sizeof info.instanceName);
  }
  info.instanceType = OSS_INSTANCE_TYPE_ADMIN;
  return 0;
}

} // namespace

extern "C" {

int32_t sqloGetCurrentInstallationName(char *buffer, uint32_t size) {
  if (kxlsim::shouldFail("sqloGetCurrentInstallationName"))
    return SQLO_RC_NO_INSTALLATION;
  if (buffer == nullptr || size == 0)
    return SQLO_RC_INVALID_ARGUMENT;
  buffer[0] = '\0';
  CopyInfo copy;
  if (!kxlprod::currentCopy(copy))
    return SQLO_RC_NO_INSTALLATION;
  if (!kxlprod::copyBounded(copy.name, buffer, size)) {
    buffer[0] = '\0';
    return SQLO_RC_INVALID_ARGUMENT;
  }
  return 0;
}

int32_t sqloSwitchToInstallationName(const char *copyName) {
  if (kxlsim::shouldFail("sqloSwitchToInstallationName"))
    return SQLO_RC_NO_INSTALLATION;
  if (copyName == nullptr || copyName[0] == '\0')
    return SQLO_RC_INVALID_ARGUMENT;
  CopyInfo target;
  if (!kxlprod::findCopy(copyName, target))
    return SQLO_RC_NO_INSTALLATION;
  CopyInfo own;
  bool isOwn = kxlprod::ownCopy(own) && kxlsim::equalsIgnoringCase(own.name, target.name);
  kxlprod::setSwitchedCopy(isOwn ? std::string() : target.name);
  return 0;
}

uint32_t ossOpenInstanceList(const char *product, OSSInstanceListHandle *handle, bool, bool) {
  if (kxlsim::shouldFail("ossOpenInstanceList"))
    return OSS_RC_FAILED;
  if (product == nullptr || handle == nullptr)
    return OSS_RC_NULL_ARGUMENT;
  *handle = nullptr;
  auto *list = new (std::nothrow) OSSInstanceList;
  if (list == nullptr)
    return OSS_RC_NO_MEMORY;
  if (reg::listSubkeys(HKEY_LOCAL_MACHINE, instancesKey(), list->names) != ERROR_SUCCESS) {
    delete list;
    return OSS_RC_FAILED;
  }
  kxlprod::listCopies(list->copies);
  *handle = list;
  return 0;
}

uint32_t ossGetNextInstance(OSSInstanceListHandle handle, OSSInstanceInfo_t *info, bool) {
  if (kxlsim::shouldFail("ossGetNextInstance"))
    return OSS_RC_FAILED;
  if (handle == nullptr || info == nullptr)
    return OSS_RC_NULL_ARGUMENT;
  // Entries removed since the list was opened are passed over; an entry that
  // cannot be read ends the walk with a failure, so that no list is taken
  // for whole without it.
  while (handle->next < handle->names.size()) {
    EntryRead read = readInstance(handle->names[handle->next++], handle->copies, *info);
    if (read == EntryRead::read)
      return 0;
    if (read == EntryRead::failed)
      return OSS_RC_FAILED;
  }
  std::memset(info, 0, sizeof *info);
  return OSS_RC_END_OF_LIST;
}

uint32_t ossCloseInstanceList(OSSInstanceListHandle handle) {
  // The iteration state goes even when the close reports a failure.
  bool fail = kxlsim::shouldFail("ossCloseInstanceList");
  delete handle;
  return fail ? OSS_RC_FAILED : 0;
}

uint32_t ossGetInstanceInfo(const char *name, uint32_t, const char *, OSSInstanceInfo_t *info, bool) {
  if (kxlsim::shouldFail("ossGetInstanceInfo"))
    return OSS_RC_FAILED;
  if (name == nullptr || info == nullptr)
    return OSS_RC_NULL_ARGUMENT;
  if (std::strcmp(name, OSS_ADMIN_SERVER_INSTANCE) == 0)
    return adminServerInfo(*info);
  std::string stored;
  if (!findInstanceName(name, stored))
    return OSS_RC_NOT_FOUND;
  EntryRead read = readInstance(stored, *info);
  return read == EntryRead::read ? 0 : (read == EntryRead::absent ? OSS_RC_NOT_FOUND : OSS_RC_FAILED);
}

} // extern "C"
