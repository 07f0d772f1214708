#include "NT/localhost.h"

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
