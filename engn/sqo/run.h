// One run of the upgrade command: the context it works in and the order of
// its steps, from the command line to the exit code.
#pragma once

#include "platform/kxlsys.h"
#include "upgrade/records.h"

#include <cstdint>

// Trace identifiers of the run.
inline constexpr uint32_t KXL_FN_RUN_UPGRADE = 0x187805B0u;
inline constexpr uint32_t KXL_FN_RUN_CHECKS = 0x187805B1u;
inline constexpr uint32_t KXL_FN_BIND_INSTANCE = 0x187805B2u;
inline constexpr uint32_t KXL_FN_UPGRADE_CONTEXT = 0x187805B3u;
inline constexpr uint32_t KXL_FN_RUN_AUDIT = 0x187805B4u;

// The upgrade driver the run hands the bound instance to. The entry point
// passes the engine's upgradeInstance; tests pass drivers of their own.
using UpgradeDriver = int (*)(UpgradeContext &context, UpgradeOptions &options);

// The whole run; returns the exit code (0, 1 or 2 in installer mode).
int runUpgrade(int argc, const char *const *argv, UpgradeDriver driver);

// context.copy = copy, context.copyPath = its installation path.
void setOwningCopy(UpgradeContext &context, InstallCopy *copy);

// Binds the run to `instance`: KXLINSTANCE, node type, the two halves of
// profile variable 159 (read in the instance's own installation). 0;
// UPGRADE_RC_NODE_TYPE_UNKNOWN when kxlsystm gives no node type from 1 to 5;
// -1918 when the instance's installation cannot be switched to and back.
int bindInstance(UpgradeContext &context, IKXLINSTANCE *instance);
