#include "NT/localhost.h"

#include <cctype>

namespace {

constexpr uint32_t kFullHostName = 5; // the kind of name asked for: fully qualified

} // namespace

bool readLocalFullHostName(char (&host)[SQLO_HOSTNAME_SZ]) {
  if (sqloPdbTcpIpGetFullHostName(host, kFullHostName) != 0) {
    host[0] = '\0';
    return false;
  }
  host[sizeof host - 1] = '\0';
  return true;
}

bool sameName(const char *a, const char *b, std::size_t limit) {
  for (std::size_t i = 0; i < limit; ++i) {
    int ca = std::tolower(static_cast<unsigned char>(a[i]));
    int cb = std::tolower(static_cast<unsigned char>(b[i]));
    if (ca != cb)
      return false;
    if (ca == '\0')
      return true;
  }
  return true;
}
