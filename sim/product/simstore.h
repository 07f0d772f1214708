// The simulation's state as the instance, service, host and configuration
// families read and write it: machine subtrees, services, the instance
// registry, the machine identity, whole files, and registry key snapshots that
// let an operation be undone exactly. Internal to the product library.
#pragma once

#include "platform/win32.h"

#include <cstddef>
#include <cstdint>
#include <string>
#include <vector>

namespace kxlprod {

// Key prefix of a machine's HKEY_LOCAL_MACHINE inside the local registry: ""
// for this machine (no name, or the local computer name), else
// "SOFTWARE\ZAV\KXLSIM\Machines\<NAME>\". False when the machine cannot be reached.
bool machineKeyPrefix(const char *machine, std::string &prefix);

// The service's key (under HKEY_LOCAL_MACHINE) for a machine prefix.
std::string serviceKeyPath(const std::string &machinePrefix, const std::string &service);

// The instance registry key of an instance.
std::string instanceRegistryKey(const std::string &instance);

// "Directory" and "Copy" of an instance registry entry; false when it has
// none or it cannot be read (no copy: the version-8 installation's).
bool readInstanceEntry(const std::string &instance, std::string &directory, std::string &copy);

// The process's current instance (KXLINSTANCE), "" when unset.
std::string processInstance();

// A string value of the machine identity; false when missing.
bool identityString(const char *name, std::string &value);

// The local computer's name, the one source of it for the whole library: the
// machine identity's "ComputerName", else the system's name ("" when neither
// is known). A machine whose system name differs from its identity (a world
// imported into Windows or Wine) still agrees with itself everywhere.
std::string localComputerName();

// Binary file content of at most `maxBytes` bytes (Windows path, no quotes).
// Windows error codes; ERROR_MORE_DATA for a longer file.
LONG readWholeFile(const std::string &windowsPath, size_t maxBytes, std::vector<uint8_t> &data);
// Replaces (or creates) the file with `data`.
LONG writeWholeFile(const std::string &windowsPath, const std::vector<uint8_t> &data);

// The values of one key, so that a change can be put back as it was. Subkeys
// are not part of a snapshot.
struct KeySnapshot {
  struct Value {
    std::string name;
    DWORD type = REG_NONE;
    std::vector<uint8_t> data;
  };
  bool existed = false;
  bool complete = false; // every value could be read
  std::vector<Value> values;
};

KeySnapshot takeKeySnapshot(HKEY root, const std::string &path);
// Puts the key back: removed (with its subkeys) when it did not exist, else
// its values as they were (values added since are removed).
void restoreKeySnapshot(HKEY root, const std::string &path, const KeySnapshot &snapshot);

} // namespace kxlprod
