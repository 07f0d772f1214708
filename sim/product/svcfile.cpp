// The services file and the port ranges reserved in it for instances: an
// instance's range is the pair of entries "KXL_<INSTANCE>" (first port) and
// "KXL_<INSTANCE>_END" (last port), four ports by default.
#include "sim/product/svcfile.h"

#include "platform/kxlsys.h"
#include "sim/common/names.h"
#include "sim/common/simfail.h"
#include "sim/product/simstate.h"
#include "sim/product/simstore.h"

#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <sstream>

namespace kxlprod {

namespace {

constexpr char kServicesFilePath[] = "C:\\windows\\system32\\drivers\\etc\\services";
constexpr size_t kMaxServicesFileBytes = 1 << 20;
constexpr uint32_t kFirstInstancePort = 60000;
constexpr uint32_t kInstancePorts = 4;
constexpr uint32_t kLargestPort = 65535;
constexpr uint32_t kReserveAction = 3;

struct Entry {
  std::string name;
  uint32_t port = 0;
};

// An entry line; false for comments, blank and malformed lines.
bool parseEntry(const std::string &line, Entry &entry) {
  std::istringstream words(line);
  std::string portText;
  if (!(words >> entry.name >> portText) || entry.name[0] == '#')
    return false;
  size_t slash = portText.find('/');
  std::string digits = portText.substr(0, slash);
  if (digits.empty() || digits.size() > 5 || digits.find_first_not_of("0123456789") != std::string::npos)
    return false;
  entry.port = static_cast<uint32_t>(std::strtoul(digits.c_str(), nullptr, 10));
  return true;
}

std::vector<Entry> entries(const ServicesFile &file) {
  std::vector<Entry> all;
  Entry entry;
  for (const std::string &line : file.lines)
    if (parseEntry(line, entry))
      all.push_back(entry);
  return all;
}

std::string rangeName(const std::string &instance, bool last) {
  return "KXL_" + instance + (last ? "_END" : "");
}

bool rangeIsFree(const ServicesFile &file, uint32_t first) {
  for (uint32_t port = first; port < first + kInstancePorts; ++port)
    if (portInUse(file, port))
      return false;
  return true;
}

// The instance's range, existing or newly reserved; false when no room is left.
bool reserveRange(ServicesFile &file, const std::string &instance, uint32_t &first, uint32_t &last) {
  if (findServiceEntry(file, rangeName(instance, false), first) &&
      findServiceEntry(file, rangeName(instance, true), last))
    return true;
  for (first = kFirstInstancePort; first + kInstancePorts - 1 <= kLargestPort; first += kInstancePorts) {
    if (!rangeIsFree(file, first))
      continue;
    last = first + kInstancePorts - 1;
    removeServiceEntry(file, rangeName(instance, false));
    removeServiceEntry(file, rangeName(instance, true));
    addServiceEntry(file, rangeName(instance, false), first);
    addServiceEntry(file, rangeName(instance, true), last);
    return true;
  }
  return false;
}

} // namespace

int32_t loadServicesFile(ServicesFile &file) {
  file = ServicesFile{};
  std::string text;
  LONG rc = readSmallTextFile(kServicesFilePath, kMaxServicesFileBytes, text);
  if (rc == ERROR_FILE_NOT_FOUND || rc == ERROR_PATH_NOT_FOUND)
    return 0;
  if (rc != ERROR_SUCCESS)
    return SQLO_RC_IO_ERROR;
  file.exists = true;
  std::istringstream lines(text);
  std::string line;
  while (std::getline(lines, line)) {
    if (!line.empty() && line.back() == '\r')
      line.pop_back();
    file.lines.push_back(line);
  }
  return 0;
}

int32_t saveServicesFile(const ServicesFile &file) {
  std::string text;
  for (const std::string &line : file.lines)
    text += line + "\r\n";
  if (text.size() > kMaxServicesFileBytes)
    return SQLO_RC_IO_ERROR;
  return writeWholeFile(kServicesFilePath, std::vector<uint8_t>(text.begin(), text.end())) == ERROR_SUCCESS
             ? 0
             : SQLO_RC_IO_ERROR;
}

bool findServiceEntry(const ServicesFile &file, const std::string &name, uint32_t &port) {
  for (const Entry &entry : entries(file)) {
    if (kxlsim::equalsIgnoringCase(entry.name, name)) {
      port = entry.port;
      return true;
    }
  }
  return false;
}

bool portInUse(const ServicesFile &file, uint32_t port) {
  std::vector<Entry> all = entries(file);
  for (const Entry &entry : all) {
    if (entry.port == port)
      return true;
    uint32_t last = 0;
    if (entry.port < port && findServiceEntry(file, entry.name + "_END", last) && port <= last)
      return true;
  }
  return false;
}

void addServiceEntry(ServicesFile &file, const std::string &name, uint32_t port) {
  char line[128];
  std::snprintf(line, sizeof line, "%-18s %u/tcp", name.c_str(), static_cast<unsigned>(port));
  file.lines.emplace_back(line);
}

bool removeServiceEntry(ServicesFile &file, const std::string &name) {
  bool removed = false;
  Entry entry;
  for (size_t i = file.lines.size(); i-- > 0;) {
    if (parseEntry(file.lines[i], entry) && kxlsim::equalsIgnoringCase(entry.name, name)) {
      file.lines.erase(file.lines.begin() + static_cast<std::ptrdiff_t>(i));
      removed = true;
    }
  }
  return removed;
}

} // namespace kxlprod

extern "C" {

int32_t sqloUpdateServiceFile(uint32_t action, const char *instanceName, char *portStart, char *portEnd) {
  if (kxlsim::shouldFail("sqloUpdateServiceFile"))
    return SQLO_RC_IO_ERROR;
  if (action != kxlprod::kReserveAction || instanceName == nullptr || instanceName[0] == '\0' ||
      std::strlen(instanceName) >= SQLO_INSTANCE_NAME_SZ || portStart == nullptr || portEnd == nullptr)
    return SQLO_RC_INVALID_ARGUMENT;
  kxlprod::ServicesFile file;
  int32_t rc = kxlprod::loadServicesFile(file);
  if (rc != 0)
    return rc;
  size_t linesBefore = file.lines.size();
  uint32_t first = 0, last = 0;
  if (!kxlprod::reserveRange(file, instanceName, first, last))
    return SQLO_RC_NOT_FOUND;
  if (file.lines.size() != linesBefore || !file.exists)
    rc = kxlprod::saveServicesFile(file);
  if (rc != 0)
    return rc;
  std::snprintf(portStart, SQLO_PORT_TEXT_SZ, "%u", static_cast<unsigned>(first));
  std::snprintf(portEnd, SQLO_PORT_TEXT_SZ, "%u", static_cast<unsigned>(last));
  return 0;
}

} // extern "C"
