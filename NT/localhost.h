// This machine's full TCP/IP host name, as the services step, the profile
// registry and the instance environment each need it.
#pragma once

#include "platform/kxlsys.h"

// Fills `host` with the full host name, terminated inside the buffer. False
// when the platform cannot tell; `host` is then empty.
bool readLocalFullHostName(char (&host)[SQLO_HOSTNAME_SZ]);
