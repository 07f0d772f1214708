// The services step of the upgrade: re-creates the instance under the current
// copy and makes every service of the instance run the current copy's programs.
#pragma once

#include "upgrade/records.h"

#include <cstdint>

class UpgradeContext;

inline constexpr uint32_t KXL_FN_UPGRADE_INSTANCE_SERVICES = 0x18780500u;

// The account the services step found `service` on `machine` (as the step
// names it) running under before it gave it the account of -u; null when the
// step recorded none (no -u, or no such service).
const char *serviceAccountBefore(const UpgradeContext &context, const char *machine, const char *service);

// Re-creates the context's instance under the current copy (through
// upgradeInstanceEnvironment) and re-points its services. Writes the context's
// service start type word. 0 on success; -1 with the reason in options.status.
int32_t upgradeInstanceServices(UpgradeContext &context, UpgradeOptions &options);
