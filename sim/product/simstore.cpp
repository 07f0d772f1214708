#include "sim/product/simstore.h"

#include "sim/common/names.h"
#include "sim/posix/reghelp.h"
#include "sim/product/installation.h"
#include "sim/product/simstate.h"

#include <cstring>

namespace reg = kxlsim::posix::reg;

namespace kxlprod {

namespace {

constexpr size_t kMaxSnapshotValueBytes = 64 * 1024;

// The value at `index`: ERROR_SUCCESS, ERROR_NO_MORE_ITEMS at the end, or the failure.
LONG enumValue(HKEY key, DWORD index, KeySnapshot::Value &value) {
  char name[16384];
  DWORD nameSize = sizeof name;
  std::vector<uint8_t> data(kMaxSnapshotValueBytes);
  DWORD dataSize = static_cast<DWORD>(data.size());
  DWORD type = REG_NONE;
  LONG rc = RegEnumValueA(key, index, name, &nameSize, nullptr, &type, data.data(), &dataSize);
  if (rc != ERROR_SUCCESS)
    return rc;
  value.name.assign(name, nameSize < sizeof name ? nameSize : sizeof name - 1);
  value.type = type;
  data.resize(dataSize < data.size() ? dataSize : data.size());
  value.data = std::move(data);
  return ERROR_SUCCESS;
}

bool inSnapshot(const KeySnapshot &snapshot, const std::string &name) {
  for (const KeySnapshot::Value &value : snapshot.values)
    if (kxlsim::equalsIgnoringCase(value.name, name))
      return true;
  return false;
}

} // namespace

bool machineKeyPrefix(const char *machine, std::string &prefix) {
  prefix.clear();
  if (machine == nullptr || machine[0] == '\0' || kxlsim::equalsIgnoringCase(machine, localComputerName()))
    return true;
  if (std::strlen(machine) >= 16)
    return false;
  std::string key = std::string(kSimRoot) + "\\Machines\\" + machine;
  if (!reg::keyExists(HKEY_LOCAL_MACHINE, key))
    return false;
  prefix = key + "\\";
  return true;
}

std::string serviceKeyPath(const std::string &machinePrefix, const std::string &service) {
  return machinePrefix + kSimRoot + "\\Services\\" + service;
}

std::string instanceRegistryKey(const std::string &instance) {
  return std::string(kSimRoot) + "\\Instances\\" + instance;
}

bool readInstanceEntry(const std::string &instance, std::string &directory, std::string &copy) {
  if (instance.empty())
    return false;
  std::string key = instanceRegistryKey(instance);
  if (reg::queryString(HKEY_LOCAL_MACHINE, key, "Directory", directory) != ERROR_SUCCESS)
    return false;
  copy.clear();
  // No copy: the version-8 installation's. A copy that cannot be read is
  // never taken for that.
  LONG rc = reg::queryString(HKEY_LOCAL_MACHINE, key, "Copy", copy);
  return rc == ERROR_SUCCESS || rc == ERROR_FILE_NOT_FOUND;
}

std::string processInstance() {
  char buffer[256];
  DWORD length = GetEnvironmentVariableA("KXLINSTANCE", buffer, sizeof buffer);
  if (length == 0 || length >= sizeof buffer)
    return std::string();
  return std::string(buffer, length);
}

bool identityString(const char *name, std::string &value) {
  return reg::queryString(HKEY_LOCAL_MACHINE, kIdentityKey, name, value) == ERROR_SUCCESS;
}

std::string localComputerName() {
  std::string name;
  if (identityString("ComputerName", name) && !name.empty())
    return name;
  char system[64] = {};
  DWORD size = sizeof system;
  if (!GetComputerNameA(system, &size))
    return std::string();
  return std::string(system, size < sizeof system ? size : sizeof system - 1);
}

LONG readWholeFile(const std::string &windowsPath, size_t maxBytes, std::vector<uint8_t> &data) {
  std::string text;
  LONG rc = readSmallTextFile(windowsPath, maxBytes, text);
  if (rc == ERROR_SUCCESS)
    data.assign(text.begin(), text.end());
  return rc;
}

LONG writeWholeFile(const std::string &windowsPath, const std::vector<uint8_t> &data) {
  HANDLE file = CreateFileA(windowsPath.c_str(), GENERIC_WRITE, 0, nullptr, CREATE_ALWAYS,
                            FILE_ATTRIBUTE_NORMAL, nullptr);
  if (file == INVALID_HANDLE_VALUE)
    return static_cast<LONG>(GetLastError());
  DWORD written = 0;
  BOOL ok = data.empty() || WriteFile(file, data.data(), static_cast<DWORD>(data.size()), &written, nullptr);
  LONG rc = ok && written == data.size() ? ERROR_SUCCESS : static_cast<LONG>(GetLastError());
  if (rc == ERROR_SUCCESS && !ok)
    rc = ERROR_WRITE_FAULT;
  CloseHandle(file);
  return rc;
}

KeySnapshot takeKeySnapshot(HKEY root, const std::string &path) {
  KeySnapshot snapshot;
  reg::Key key;
  if (key.open(root, path, KEY_QUERY_VALUE) != ERROR_SUCCESS)
    return snapshot;
  snapshot.existed = true;
  KeySnapshot::Value value;
  LONG rc = ERROR_SUCCESS;
  for (DWORD index = 0; (rc = enumValue(key.get(), index, value)) == ERROR_SUCCESS; ++index)
    snapshot.values.push_back(value);
  snapshot.complete = rc == ERROR_NO_MORE_ITEMS;
  return snapshot;
}

void restoreKeySnapshot(HKEY root, const std::string &path, const KeySnapshot &snapshot) {
  if (!snapshot.existed) {
    SHDeleteKeyA(root, path.c_str());
    return;
  }
  KeySnapshot now = takeKeySnapshot(root, path);
  reg::Key key;
  if (key.create(root, path) != ERROR_SUCCESS)
    return;
  // Values added since are removed only when the snapshot holds every value
  // the key had: an incomplete one must never cost a value.
  for (const KeySnapshot::Value &value : now.values)
    if (snapshot.complete && !inSnapshot(snapshot, value.name))
      RegDeleteValueA(key.get(), value.name.c_str());
  for (const KeySnapshot::Value &value : snapshot.values)
    RegSetValueExA(key.get(), value.name.c_str(), 0, value.type, value.data.data(),
                   static_cast<DWORD>(value.data.size()));
}

} // namespace kxlprod
