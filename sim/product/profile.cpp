// Environment and profile registry: values by number, the profiles of the
// current installation, and other machines' registries.
//
// Profile variables are string values named after the variable, in the
// instance's profile key (instance level) or the copy's GLOBAL_PROFILE key
// (global level) of the current installation.
#include "platform/kxlsys.h"
#include "sim/common/names.h"
#include "sim/common/simfail.h"
#include "sim/posix/reghelp.h"
#include "sim/product/installation.h"
#include "sim/product/simstore.h"
#include "sim/product/state.h"
#include "sim/product/text.h"

#include <cctype>
#include <cstring>
#include <map>
#include <new>
#include <string>
#include <vector>

namespace reg = kxlsim::posix::reg;

namespace {

using kxlprod::CopyInfo;

struct Variable {
  uint32_t number;
  const char *name;
  uint32_t capacity; // default value capacity in bytes, terminator included
};

constexpr Variable kVariables[] = {
    {KXL_VAR_KXLINSTANCE, "KXLINSTANCE", SQLO_INSTANCE_NAME_SZ},
    {KXL_VAR_KXLINSTPROF, "KXLINSTPROF", SQLO_PREG_VALUE_SZ},
    {KXL_VAR_KXLPORTRANGE, "KXLPORTRANGE", SQLO_PREG_VALUE_SZ},
    {KXL_VAR_KXLNODECOMPUTER, "KXLNODECOMPUTER", SQLO_PREG_VALUE_SZ},
    {KXL_VAR_KXLWORKSTATION, "KXLWORKSTATION", SQLO_PREG_VALUE_SZ},
    {KXL_VAR_KXLEXTRAAGENTS, "KXLEXTRAAGENTS", SQLO_PREG_VALUE_SZ},
    {KXL_VAR_KXLRESERVEDINST, "KXLRESERVEDINST", SQLO_INSTANCE_NAME_SZ},
};

const Variable *findVariable(uint32_t number) {
  for (const Variable &variable : kVariables)
    if (variable.number == number)
      return &variable;
  return nullptr;
}

// Values handed out by sqloGetEnvInternal live here until that variable is read again.
std::map<uint32_t, std::string> envValues;

// Profile enumeration of the current installation.
std::vector<std::string> profileNames;
size_t nextProfile = 0;

bool environmentValue(const char *name, std::string &value) {
  char buffer[4096];
  DWORD length = GetEnvironmentVariableA(name, buffer, sizeof buffer);
  if (length == 0 || length >= sizeof buffer)
    return false;
  value.assign(buffer, length);
  return true;
}

std::string currentInstance() {
  std::string instance;
  environmentValue("KXLINSTANCE", instance);
  return instance;
}

bool isGlobalProfile(const char *profile) {
  return profile != nullptr && kxlsim::equalsIgnoringCase(profile, KXL_GLOBAL_PROFILE_NAME);
}

// Keys a read looks in, in order.
std::vector<std::string> readKeys(const CopyInfo &copy, const char *profile) {
  if (isGlobalProfile(profile))
    return {kxlprod::globalProfileKey(copy)};
  if (profile != nullptr && profile[0] != '\0')
    return {kxlprod::profileKey(copy, profile)};
  std::vector<std::string> keys;
  std::string instance = currentInstance();
  if (!instance.empty())
    keys.push_back(kxlprod::profileKey(copy, instance));
  keys.push_back(kxlprod::globalProfileKey(copy));
  return keys;
}

// The key a write goes to; empty when the instance has no profile.
std::string writeKey(const CopyInfo &copy, const char *profile) {
  if (isGlobalProfile(profile))
    return kxlprod::globalProfileKey(copy);
  std::string instance = profile != nullptr && profile[0] != '\0' ? std::string(profile) : currentInstance();
  if (instance.empty())
    return kxlprod::globalProfileKey(copy);
  std::string key = kxlprod::profileKey(copy, instance);
  return reg::keyExists(HKEY_LOCAL_MACHINE, key) ? key : std::string();
}

bool readProfileValue(const CopyInfo &copy, const char *profile, const char *name, std::string &value) {
  for (const std::string &key : readKeys(copy, profile))
    if (reg::queryString(HKEY_LOCAL_MACHINE, key, name, value) == ERROR_SUCCESS)
      return true;
  return false;
}

int32_t getValue(const CopyInfo &copy, const Variable &variable, char *value, const char *profile,
                 uint32_t valueSize) {
  uint32_t capacity = valueSize != 0 ? valueSize : variable.capacity;
  std::string text;
  if (!readProfileValue(copy, profile, variable.name, text)) {
    value[0] = '\0';
    return SQLO_RC_PREG_NOT_SET;
  }
  kxlprod::copyBounded(text, value, capacity);
  return 0;
}

int32_t setValue(const CopyInfo &copy, const Variable &variable, const char *value, const char *profile) {
  std::string key = writeKey(copy, profile);
  if (key.empty())
    return SQLO_RC_PREG_NO_PROFILE;
  LONG rc = reg::writeString(HKEY_LOCAL_MACHINE, key, variable.name, value != nullptr ? value : "");
  return rc == ERROR_SUCCESS ? 0 : SQLO_RC_IO_ERROR;
}

int32_t unsetValue(const CopyInfo &copy, const Variable &variable, const char *profile) {
  std::string key = writeKey(copy, profile);
  if (key.empty())
    return SQLO_RC_PREG_NO_PROFILE;
  LONG rc = reg::deleteValue(HKEY_LOCAL_MACHINE, key, variable.name);
  return rc == ERROR_SUCCESS || rc == ERROR_FILE_NOT_FOUND ? 0 : SQLO_RC_IO_ERROR;
}

int32_t profileValue(uint32_t action, const uint32_t *number, char *value, const char *profile,
                     uint32_t valueSize) {
  const Variable *variable = number != nullptr ? findVariable(*number) : nullptr;
  if (variable == nullptr)
    return SQLO_RC_PREG_BAD_VARIABLE;
  CopyInfo copy;
  if (!kxlprod::currentCopy(copy))
    return SQLO_RC_NO_INSTALLATION;
  switch (action) {
  case SQLO_PREG_GET:
    return value != nullptr ? getValue(copy, *variable, value, profile, valueSize) : SQLO_RC_INVALID_ARGUMENT;
  case SQLO_PREG_SET:
    return setValue(copy, *variable, value, profile);
  case SQLO_PREG_UNSET:
    return unsetValue(copy, *variable, profile);
  default:
    return SQLO_RC_INVALID_ARGUMENT;
  }
}

int32_t nextProfileName(char *profileName) {
  if (nextProfile >= profileNames.size())
    return SQLO_RC_PREG_END;
  if (profileName != nullptr)
    kxlprod::copyBounded(profileNames[nextProfile], profileName, SQLO_PREG_PROFILE_SZ);
  ++nextProfile;
  return 0;
}

int32_t profileAction(uint32_t action, char *profileName) {
  CopyInfo copy;
  if (!kxlprod::currentCopy(copy))
    return SQLO_RC_NO_INSTALLATION;
  switch (action) {
  case SQLO_PREG_REFRESH:
    return 0;
  case SQLO_PREG_FIRST:
    nextProfile = 0;
    if (reg::listSubkeys(HKEY_LOCAL_MACHINE, kxlprod::copyKey(copy) + "\\PROFILES", profileNames) !=
        ERROR_SUCCESS)
      return SQLO_RC_IO_ERROR;
    return nextProfileName(profileName);
  case SQLO_PREG_NEXT:
    return nextProfileName(profileName);
  default:
    return SQLO_RC_INVALID_ARGUMENT;
  }
}

void releaseMachine(SQLO_PREG_MACHINE *machine) {
  if (machine == nullptr)
    return;
  if (machine->remote && machine->hklm != nullptr)
    RegCloseKey(machine->hklm);
  delete machine;
}

} // namespace

namespace kxlprod {

void resetProfileState() {
  envValues.clear();
  profileNames.clear();
  nextProfile = 0;
}

} // namespace kxlprod

extern "C" {

int32_t sqloGetEnvInternal(uint32_t variable, char **value) {
  if (kxlsim::shouldFail("sqloGetEnvInternal"))
    return SQLO_RC_SYSTEM_ERROR;
  const Variable *known = findVariable(variable);
  if (known == nullptr || value == nullptr)
    return SQLO_RC_PREG_BAD_VARIABLE;
  *value = nullptr;
  std::string text;
  bool found = environmentValue(known->name, text);
  CopyInfo copy;
  // The environment wins; the profile registry supplies what it lacks. The
  // current instance itself comes from the global profile only.
  if (!found && kxlprod::currentCopy(copy))
    found = readProfileValue(copy, variable == KXL_VAR_KXLINSTANCE ? KXL_GLOBAL_PROFILE_NAME : nullptr,
                             known->name, text);
  if (!found) {
    envValues.erase(variable);
    return 0;
  }
  std::string &stored = envValues[variable];
  stored = text;
  *value = stored.data();
  return 0;
}

int32_t sqloPutEnv(uint32_t variable, const char *value) {
  if (kxlsim::shouldFail("sqloPutEnv"))
    return SQLO_RC_NO_MEMORY;
  const Variable *known = findVariable(variable);
  if (known == nullptr)
    return SQLO_RC_PREG_BAD_VARIABLE;
  const char *newValue = value != nullptr && value[0] != '\0' ? value : nullptr;
  return SetEnvironmentVariableA(known->name, newValue) ? 0 : SQLO_RC_NO_MEMORY;
}

int32_t sqlo_force_refresh_env(void) {
  // Values are read from the environment on every call: nothing is cached.
  if (kxlsim::shouldFail("sqlo_force_refresh_env"))
    return SQLO_RC_SYSTEM_ERROR;
  return 0;
}

int32_t sqloPRegValuePE(uint32_t action, const uint32_t *variable, uint32_t, char *value, const char *profile,
                        int32_t, uint32_t valueSize) {
  if (kxlsim::shouldFail("sqloPRegValuePE"))
    return SQLO_RC_IO_ERROR;
  return profileValue(action, variable, value, profile, valueSize);
}

int32_t sqloPRegValue(uint32_t action, const uint32_t *variable, uint32_t, char *value, const char *profile) {
  if (kxlsim::shouldFail("sqloPRegValue"))
    return SQLO_RC_IO_ERROR;
  return profileValue(action, variable, value, profile, 0);
}

int32_t sqloPRegProfilePE(uint32_t action, char *profileName, int32_t) {
  if (kxlsim::shouldFail("sqloPRegProfilePE"))
    return SQLO_RC_IO_ERROR;
  return profileAction(action, profileName);
}

int32_t sqloPRegProfile(uint32_t action, char *profileName) {
  if (kxlsim::shouldFail("sqloPRegProfile"))
    return SQLO_RC_IO_ERROR;
  return profileAction(action, profileName);
}

int32_t sqloStr2Flag(const char *value) {
  if (kxlsim::shouldFail("sqloStr2Flag") || value == nullptr)
    return 0;
  static const char *const kTrue[] = {"1", "Y", "YES", "ON", "TRUE"};
  for (const char *word : kTrue)
    if (kxlsim::equalsIgnoringCase(value, word))
      return 1;
  return 0;
}

int32_t sqloPRegMachineOpen(const char *machineName, SQLO_PREG_MACHINE **handle) {
  if (kxlsim::shouldFail("sqloPRegMachineOpen"))
    return SQLO_RC_MACHINE_UNREACHABLE;
  if (handle == nullptr)
    return SQLO_RC_INVALID_ARGUMENT;
  releaseMachine(*handle);
  *handle = nullptr;
  std::string name = machineName != nullptr ? machineName : "";
  if (name.size() >= SQLO_COMPUTERNAME_SZ)
    return SQLO_RC_MACHINE_UNREACHABLE;
  auto *machine = new (std::nothrow) SQLO_PREG_MACHINE{};
  if (machine == nullptr)
    return SQLO_RC_NO_MEMORY;
  kxlprod::copyBounded(name, machine->machineName, sizeof machine->machineName);
  if (name.empty() || kxlsim::equalsIgnoringCase(name, kxlprod::localComputerName())) {
    machine->hklm = HKEY_LOCAL_MACHINE;
  } else {
    std::string key = std::string(kxlprod::kSimRoot) + "\\Machines\\" + name;
    machine->remote = true;
    if (RegOpenKeyExA(HKEY_LOCAL_MACHINE, key.c_str(), 0, KEY_ALL_ACCESS, &machine->hklm) != ERROR_SUCCESS) {
      machine->hklm = nullptr;
      releaseMachine(machine);
      return SQLO_RC_MACHINE_UNREACHABLE;
    }
  }
  *handle = machine;
  return 0;
}

int32_t sqloPRegMachineClose(SQLO_PREG_MACHINE **handle) {
  bool fail = kxlsim::shouldFail("sqloPRegMachineClose");
  if (handle != nullptr) {
    releaseMachine(*handle);
    *handle = nullptr;
  }
  return fail ? SQLO_RC_SYSTEM_ERROR : 0;
}

} // extern "C"
