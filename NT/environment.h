// Re-creation of an instance under the current copy: the instance itself, its
// configuration file tuned to this machine and, for a partitioned instance,
// partition 0. Whatever a failing call created is removed again.
#pragma once

#include "platform/kxlsys.h"
#include "upgrade/records.h"

#include <cstdint>

inline constexpr uint32_t KXL_FN_UPGRADE_INSTANCE_ENVIRONMENT = 0x18780540u;

// What this step writes into the client component field of kxlsystm when the
// copy has the client component.
inline constexpr uint32_t ENV_CLIENT_COMPONENT_VALUE = 2048;

// Creates instanceName under instanceProfilePath with the copy at installPath
// (may be null), tunes its kxlsystm and, when newNodeType is 4 and a partition
// record is given, sets up partition 0 (the record's empty fields are filled).
// userName / password: null when not given. 0 on success, else the failing
// step's result (-1 with SQLCODE -1042 in `ca` where documented) and nothing of
// the new instance is left.
int32_t upgradeInstanceEnvironment(const char *instanceName, const char *instanceProfilePath,
                                   const char *installPath, const char *userName, const char *password,
                                   uint32_t oldNodeType, uint32_t newNodeType,
                                   PartitionRecord *partitionRecord, sqlca *ca, uint32_t createFlag,
                                   uint32_t workstationFlag);
