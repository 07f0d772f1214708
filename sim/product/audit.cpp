// Audit: the library's current instance, its audit settings and the events
// recorded for it.
//
// Settings live in the instance directory's "security\kxlaudit.cfg", a small
// text file of "key = value" lines ('#' starts a comment, blank lines and
// surrounding blanks are ignored, keys and words in any case):
//   active    = yes | no                    auditing on or off (default no)
//   errortype = normal | audit              copied into every event (0 / 1)
//   admin     = none | success | failure | both    outcomes of the administration class
//   checking  = ...                         (same words) reserved class
//   objmaint  = ...                         (same words) reserved class
//   instance  = ...                         (same words) outcomes of the instance class
// Outcome words map to bits 0x1 (success) and 0x2 (failure) of the class mask;
// several words may be given separated by commas. A missing file means
// auditing is off; a line that does not follow this form makes the file invalid.
// Events go to the world's event log as {"event":"audit", ...}.
#include "platform/kxlsys.h"
#include "sim/common/events.h"
#include "sim/common/names.h"
#include "sim/common/simfail.h"
#include "sim/posix/reghelp.h"
#include "sim/product/simstate.h"

#include <cctype>
#include <cstdio>
#include <string>

namespace reg = kxlsim::posix::reg;

namespace {

constexpr size_t kMaxSettingsBytes = 8192;
constexpr char kInstancesKey[] = "SOFTWARE\\ZAV\\KXLSIM\\Instances\\";

std::string currentInstance;

std::string trimmed(const std::string &text) {
  size_t first = 0, last = text.size();
  while (first < last && std::isspace(static_cast<unsigned char>(text[first])))
    ++first;
  while (last > first && std::isspace(static_cast<unsigned char>(text[last - 1])))
    --last;
  return text.substr(first, last - first);
}

// Outcome bits of a comma-separated word list; false for an unknown word.
bool parseOutcomes(const std::string &value, uint64_t &mask) {
  mask = 0;
  size_t start = 0;
  for (;;) {
    size_t comma = value.find(',', start);
    std::string word =
        trimmed(value.substr(start, comma == std::string::npos ? std::string::npos : comma - start));
    if (kxlsim::equalsIgnoringCase(word, "success"))
      mask |= 0x1;
    else if (kxlsim::equalsIgnoringCase(word, "failure"))
      mask |= 0x2;
    else if (kxlsim::equalsIgnoringCase(word, "both"))
      mask |= 0x3;
    else if (!kxlsim::equalsIgnoringCase(word, "none"))
      return false;
    if (comma == std::string::npos)
      return true;
    start = comma + 1;
  }
}

bool parseFlag(const std::string &value, const char *on, const char *off, unsigned char &out) {
  if (kxlsim::equalsIgnoringCase(value, on))
    out = 1;
  else if (kxlsim::equalsIgnoringCase(value, off))
    out = 0;
  else
    return false;
  return true;
}

bool applySetting(const std::string &key, const std::string &value, SQLEX_AUDIT_SETTINGS &settings) {
  if (kxlsim::equalsIgnoringCase(key, "active"))
    return parseFlag(value, "yes", "no", settings.active);
  if (kxlsim::equalsIgnoringCase(key, "errortype"))
    return parseFlag(value, "audit", "normal", settings.errorType);
  struct ClassKey {
    const char *name;
    uint64_t *mask;
  };
  const ClassKey classes[] = {{"admin", &settings.classMask1},
                              {"checking", &settings.classMask2},
                              {"objmaint", &settings.classMask3},
                              {"instance", &settings.classMask4}};
  for (const ClassKey &entry : classes)
    if (kxlsim::equalsIgnoringCase(key, entry.name))
      return parseOutcomes(value, *entry.mask);
  return false;
}

bool parseSettings(const std::string &text, SQLEX_AUDIT_SETTINGS &settings) {
  size_t start = 0;
  while (start < text.size()) {
    size_t end = text.find('\n', start);
    std::string line = text.substr(start, end == std::string::npos ? std::string::npos : end - start);
    start = end == std::string::npos ? text.size() : end + 1;
    line = trimmed(line.substr(0, line.find('#')));
    if (line.empty())
      continue;
    size_t equals = line.find('=');
    if (equals == std::string::npos ||
        !applySetting(trimmed(line.substr(0, equals)), trimmed(line.substr(equals + 1)), settings))
      return false;
  }
  return true;
}

void clearSettings(SQLEX_AUDIT_SETTINGS &settings) {
  settings = SQLEX_AUDIT_SETTINGS{};
  settings.version = 1;
  settings.size = sizeof settings;
}

// The settings file of the current instance ("" when it has none).
std::string instanceSettingsPath() {
  std::string directory;
  if (currentInstance.empty() || reg::queryString(HKEY_LOCAL_MACHINE, kInstancesKey + currentInstance,
                                                  "Directory", directory) != ERROR_SUCCESS)
    return std::string();
  return directory + "\\security\\kxlaudit.cfg";
}

std::string hexCode(uint32_t value) {
  char text[16];
  std::snprintf(text, sizeof text, "0x%08X", value);
  return text;
}

} // namespace

extern "C" {

int32_t sqlosins(const char *instanceName) {
  if (kxlsim::shouldFail("sqlosins"))
    return SQLO_RC_SYSTEM_ERROR;
  currentInstance.clear();
  if (instanceName == nullptr || instanceName[0] == '\0')
    return SQLO_RC_NOT_FOUND; // no instance to act on
  std::string name = instanceName;
  if (name.size() >= SQLO_INSTANCE_NAME_SZ || !reg::keyExists(HKEY_LOCAL_MACHINE, kInstancesKey + name))
    return SQLO_RC_NOT_FOUND;
  currentInstance = name;
  return 0;
}

int32_t sqlexAuditGetInstanceSettings(bool, SQLEX_AUDIT_SETTINGS *settings, const char *path) {
  if (kxlsim::shouldFail("sqlexAuditGetInstanceSettings"))
    return SQLO_RC_IO_ERROR;
  if (settings == nullptr)
    return SQLO_RC_INVALID_ARGUMENT;
  clearSettings(*settings);
  std::string file = path != nullptr && path[0] != '\0' ? std::string(path) : instanceSettingsPath();
  if (file.empty())
    return SQLO_RC_NOT_FOUND;
  std::string text;
  LONG rc = kxlprod::readSmallTextFile(file, kMaxSettingsBytes, text);
  if (rc == ERROR_FILE_NOT_FOUND || rc == ERROR_PATH_NOT_FOUND)
    return 0; // no settings: auditing is off
  if (rc != ERROR_SUCCESS)
    return SQLO_RC_IO_ERROR;
  if (!parseSettings(text, *settings)) {
    clearSettings(*settings);
    return SQLO_RC_INVALID_ARGUMENT;
  }
  return 0;
}

} // extern "C"

int32_t sqlexAuditData::logEvent(sqlca *ca) {
  int32_t rc = 0;
  if (kxlsim::shouldFail("logEvent"))
    rc = SQLO_RC_IO_ERROR;
  else if (currentInstance.empty())
    rc = SQLO_RC_NOT_FOUND;
  else {
    kxlsim::EventFields fields = {{"category", hexCode(category_)},
                                  {"audit_event", std::to_string(event_)},
                                  {"sqlcode", std::to_string(sqlcode_)},
                                  {"errortype", std::to_string(errorType_)},
                                  {"instance", currentInstance}};
    if (instance_[0] != '\0')
      fields.emplace_back("data", instance_);
    if (!kxlsim::appendEvent("audit", fields))
      rc = SQLO_RC_IO_ERROR;
  }
  if (rc != 0 && ca != nullptr)
    sqlzRcToSqlca(0, ca, "SQLEXAUD", rc, 0, 0);
  return rc;
}
