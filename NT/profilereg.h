// The instance's profile registry key: moving it from the owning copy's branch
// to the current copy's on every machine that serves the instance, and the undo.
#pragma once

#include "platform/win32.h"
#include "upgrade/records.h"

#include <cstdint>

class UpgradeContext;

inline constexpr uint32_t KXL_FN_MOVE_INSTANCE_PROFILE = 0x18780506u;
inline constexpr uint32_t KXL_FN_REVERT_INSTANCE_PROFILE = 0x18780507u;

// Moves the profile key on the one machine whose HKEY_LOCAL_MACHINE is
// `machineRoot`. force 1: the current copy gets the empty force-copy-name key;
// the old key stays until dropForcedProfileKeys, so that a failed upgrade can
// put the machine's profile values back. A key created for a copy that failed
// is deleted again.
int32_t moveProfileKey(UpgradeContext &context, HKEY machineRoot, UpgradeOptions &options, uint8_t force);

// Moves the profile key on every machine of the instance: each partition's
// machine (partitioned), else the local one; then the other cluster machines.
int32_t moveInstanceProfile(UpgradeContext &context, UpgradeOptions &options);

// The undo of moveProfileKey on one machine: nothing when the old key still
// exists, otherwise the old key is rebuilt from the current copy's key. force
// 1: the force-copy-name key is deleted (the old key was never removed).
int32_t revertProfileKey(UpgradeContext &context, HKEY machineRoot, UpgradeOptions &options, uint8_t force);

// The undo of moveInstanceProfile, also after a move that failed part way;
// also points the instance's services at the owning copy's program and name
// again. Goes on past a machine it cannot reach and returns the first failure.
int32_t revertInstanceProfile(UpgradeContext &context, UpgradeOptions &options);

// After a successful force-copy-name upgrade of a partitioned instance: deletes
// the old profile key on the machines of the forced partitions. A failure
// before any old key is gone is returned: the upgrade can still be undone as
// a whole. Once one is gone it cannot come back: every other machine is then
// tried, a failure is written to the diagnostic log and the result is 0.
int32_t dropForcedProfileKeys(UpgradeContext &context, UpgradeOptions &options);
