#include "install/kxlinstance.h"

#include "install/iutil.h"
#include "platform/kxlsys.h"
#include "platform/win32.h"

#include <cstdio>
#include <cstring>
#include <new>

namespace {

// Read and set-value access to an instance's profile key.
constexpr REGSAM kProfileAccess = KEY_READ | KEY_SET_VALUE;
constexpr const char kClusterValue[] = "KXLCLUSTER";

// The platform reports every copy's instances; this one belongs to `owner` when
// its copy is the owner, or when it has no copy and the owner is the
// version-8 installation.
bool belongsTo(const OSSInstanceInfo_t &info, const char *ownerName) {
  if (kxliSameName(info.copyName, ownerName))
    return true;
  return info.copyName[0] == '\0' && kxliSameName(ownerName, KXLI_V8_COPY_NAME);
}

// The record's text fields are the platform's; make sure each ends in its field.
void terminateFields(OSSInstanceInfo_t &info) {
  info.instanceName[sizeof info.instanceName - 1] = '\0';
  info.instanceDir[sizeof info.instanceDir - 1] = '\0';
  info.copyName[sizeof info.copyName - 1] = '\0';
}

} // namespace

// ---------------------------------------------------------------------------
// IKXLINSTANCE
// ---------------------------------------------------------------------------

IKXLINSTANCE::IKXLINSTANCE()
    : copyName{}, instanceDir{}, name{}, clusterName{}, isClustered(0), clusterUnreadable(0), dbmCfgImage{} {}

IKXLINSTANCE::IKXLINSTANCE(const char *instanceName, const char *owner, const char *directory)
    : copyName{}, instanceDir{}, name{}, clusterName{}, isClustered(0), clusterUnreadable(0), dbmCfgImage{} {
  kxliSetString(copyName, sizeof copyName, owner);
  kxliSetString(name, sizeof name, instanceName);
  kxliSetString(instanceDir, sizeof instanceDir, directory);
  // A missing kxlsystm leaves the snapshot empty; the instance still counts.
  kxliReadDbmCfg(instanceDir, dbmCfgImage, sizeof dbmCfgImage);
  if (copyName[0] != '\0')
    readClusterName();
}

IKXLINSTANCE::~IKXLINSTANCE() = default;

void IKXLINSTANCE::readClusterName() {
  char key[KXLI_PATH_BUFFER_SZ];
  if (kxliSameName(copyName, KXLI_V8_COPY_NAME))
    std::snprintf(key, sizeof key, "SOFTWARE\\ZAV\\KXL\\PROFILES\\%s", name);
  else
    std::snprintf(key, sizeof key, "SOFTWARE\\ZAV\\KXL\\InstalledCopies\\%s\\PROFILES\\%s", copyName, name);
  LONG rc = kxliReadRegString(HKEY_LOCAL_MACHINE, key, kProfileAccess, kClusterValue, clusterName,
                              sizeof clusterName);
  if (rc == ERROR_SUCCESS) {
    isClustered = 1;
    return;
  }
  clusterName[0] = '\0';
  // A missing key or value is an instance outside a cluster; anything else
  // leaves the question open.
  clusterUnreadable = rc == ERROR_FILE_NOT_FOUND ? 0 : 1;
}

uint32_t IKXLINSTANCE::GetName(char *buffer, uint32_t size) const {
  return kxliGetString(name, buffer, size);
}

uint32_t IKXLINSTANCE::GetInstanceDir(char *buffer, uint32_t size) const {
  return kxliGetString(instanceDir, buffer, size);
}

uint32_t IKXLINSTANCE::GetClusterName(char *buffer, uint32_t size) const {
  return kxliGetString(clusterName, buffer, size);
}

// The directory is taken to end in "\" + name. One shorter than that has no
// parent to give, and yields "" rather than a cut before its start.
uint32_t IKXLINSTANCE::GetInstanceParentDir(char *buffer, uint32_t size) const {
  if (buffer == nullptr)
    return KXLI_RC_NULL_ARGUMENT;
  size_t dirLength = std::strlen(instanceDir);
  size_t cut = std::strlen(name) + 1;
  size_t keep = dirLength > cut ? dirLength - cut : 0;
  if (size < keep + 1)
    return KXLI_RC_BUFFER_TOO_SMALL;
  std::memcpy(buffer, instanceDir, keep);
  buffer[keep] = '\0';
  return 0;
}

uint32_t IKXLINSTANCE::GetCopyName(char *buffer, uint32_t size) const {
  if (copyName[0] == '\0')
    return KXLI_RC_NOT_USABLE;
  return kxliGetString(copyName, buffer, size);
}

uint16_t IKXLINSTANCE::GetNodeType() const {
  return sqloLe16(dbmCfgImage, DBMCFG_NODE_TYPE_OFFSET);
}

uint32_t IKXLINSTANCE::ReloadDbmCfg(const char *dir) {
  return kxliReadDbmCfg(dir != nullptr ? dir : instanceDir, dbmCfgImage, sizeof dbmCfgImage)
             ? 0
             : KXLI_RC_NULL_ARGUMENT;
}

// ---------------------------------------------------------------------------
// IKXLINSTANCELIST
// ---------------------------------------------------------------------------

namespace {

// An owner without a name owns nothing (every instance of the version-8
// installation would match the empty name).
bool named(const char *copyName) {
  return copyName != nullptr && copyName[0] != '\0';
}

// Calls place(info) for each instance the platform lists; 0 when the walk
// reached the end, else the first failure (of the walk or of place).
template <class Place> uint32_t walkInstances(Place place) {
  OSSInstanceListHandle handle = nullptr;
  if (ossOpenInstanceList("KXL", &handle, false, false) != 0)
    return 1;
  // The record is large; it lives on the heap for the walk.
  OSSInstanceInfo_t *info = new (std::nothrow) OSSInstanceInfo_t;
  uint32_t rc = info != nullptr ? 0 : KXLI_RC_NO_MEMORY;
  while (rc == 0) {
    std::memset(info, 0, sizeof *info);
    rc = ossGetNextInstance(handle, info, false);
    if (rc != 0)
      break;
    terminateFields(*info);
    rc = place(*info);
  }
  delete info;
  ossCloseInstanceList(handle);
  return rc == OSS_RC_END_OF_LIST ? 0 : rc;
}

uint32_t appendInstance(IKXLINSTANCELIST &list, const OSSInstanceInfo_t &info) {
  IKXLINSTANCE *instance =
      new (std::nothrow) IKXLINSTANCE(info.instanceName, list.copyName, info.instanceDir);
  return instance != nullptr ? list.Append(instance) : KXLI_RC_NO_MEMORY;
}

} // namespace

IKXLINSTANCELIST::IKXLINSTANCELIST(const char *owner, uint32_t initialStatus)
    : copyName{}, status(initialStatus) {
  kxliSetString(copyName, sizeof copyName, owner);
}

IKXLINSTANCELIST::IKXLINSTANCELIST(const char *owner) : IKXLINSTANCELIST(owner, named(owner) ? 0 : 1) {
  if (status != 0)
    return;
  uint32_t rc = walkInstances([&](const OSSInstanceInfo_t &info) -> uint32_t {
    return belongsTo(info, copyName) ? appendInstance(*this, info) : 0;
  });
  if (rc != 0)
    status = 1;
}

uint32_t IKXLINSTANCELIST::BuildForCopies(const char *const *copyNames, uint32_t count,
                                          IKXLINSTANCELIST **lists) {
  uint32_t rc = 0;
  for (uint32_t i = 0; i < count; ++i) {
    lists[i] = new (std::nothrow) IKXLINSTANCELIST(copyNames[i], named(copyNames[i]) ? 0 : 1);
    if (lists[i] == nullptr)
      rc = KXLI_RC_NO_MEMORY;
  }
  if (rc == 0)
    rc = walkInstances([&](const OSSInstanceInfo_t &info) -> uint32_t {
      uint32_t placed = 0;
      for (uint32_t i = 0; i < count && placed == 0; ++i)
        if (lists[i]->status == 0 && belongsTo(info, lists[i]->copyName))
          placed = appendInstance(*lists[i], info);
      return placed;
    });
  if (rc != 0)
    for (uint32_t i = 0; i < count; ++i) {
      delete lists[i];
      lists[i] = nullptr;
    }
  return rc;
}

IKXLINSTANCELIST::~IKXLINSTANCELIST() = default;

uint32_t IKXLINSTANCELIST::Find(const char *instanceName, IKXLINSTANCE **out) {
  return FindByName(instanceName, out);
}
