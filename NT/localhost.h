// This machine's full TCP/IP host name, as the services step, the profile
// registry and the instance environment each need it. Names of hosts,
// machines, services and keys are compared with kxliSameText.
#pragma once

#include "platform/kxlsys.h"

#include <cstddef>

// Fills `host` with the full host name, terminated inside the buffer. False
// when the platform cannot tell; `host` is then empty.
bool readLocalFullHostName(char (&host)[SQLO_HOSTNAME_SZ]);
