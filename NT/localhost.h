// This machine's full TCP/IP host name, as the services step, the profile
// registry and the instance environment each need it, and how names of hosts,
// machines, services and keys are compared.
#pragma once

#include "platform/kxlsys.h"

#include <cstddef>

// Fills `host` with the full host name, terminated inside the buffer. False
// when the platform cannot tell; `host` is then empty.
bool readLocalFullHostName(char (&host)[SQLO_HOSTNAME_SZ]);

// Equal ignoring ASCII case over at most `limit` characters. Made here, not
// with the library's compare: a compare that failed would read as
// "different", and this machine would be taken for another one.
bool sameName(const char *a, const char *b, std::size_t limit);
