// The product's programs the upgrade runs: the audit configuration tool, the
// SSL configuration tool and the profile registry clean-up.
#pragma once

#include "NT/driverstate.h"

inline constexpr uint32_t kProbeAuditTool = 95;
inline constexpr uint32_t kProbeSslTool = 97;

// Capacity of the SSL tool's argument block, terminators included.
inline constexpr uint32_t kSslArgBlockSize = 781;

// Runs "kxlimaudcfg.exe" by name and waits; 0 or the run's failure.
int32_t runAuditTool();

// Builds the SSL tool's argument block into `block` (kSslArgBlockSize bytes,
// zero-filled first): the tool path, "-c", the quoted client file of
// `instanceDir`, "-s", the quoted server file, and an empty string. False
// when the block would not fit; nothing is ever written past its end.
bool buildSslArguments(char *block, const char *toolPath, const char *instanceDir);

// Runs "<copy path>\bin\kxlimsslcfg.exe" for `instanceDir`. A block that would
// not fit is refused with SQLO_RC_INVALID_ARGUMENT before anything runs.
int32_t runSslTool(const char *copyPath, const char *instanceDir);

// Runs "kxlset.exe -cleanup" by name; its outcome does not matter.
void runCleanupTool();
