// The machine's services file (C:\windows\system32\drivers\etc\services):
// lines "<name> <port>/<protocol> [aliases] [# comment]". Internal to the
// product library.
#pragma once

#include <cstdint>
#include <string>
#include <vector>

namespace kxlprod {

struct ServicesFile {
  std::vector<std::string> lines; // without line ends
  bool exists = false;
};

// 0, or a library code when the file exists but cannot be read.
int32_t loadServicesFile(ServicesFile &file);
// Writes the lines back with "\r\n" line ends; 0 or a library code.
int32_t saveServicesFile(const ServicesFile &file);

// The port of the entry `name` (ignoring case); false when there is none.
bool findServiceEntry(const ServicesFile &file, const std::string &name, uint32_t &port);
// True when an entry, or the range between an entry "<X>" and "<X>_END", holds the port.
bool portInUse(const ServicesFile &file, uint32_t port);
void addServiceEntry(ServicesFile &file, const std::string &name, uint32_t port);
// Removes the entries of that name; true when one was there.
bool removeServiceEntry(ServicesFile &file, const std::string &name);

} // namespace kxlprod
