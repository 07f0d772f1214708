// The instance profile's "function" directory (user-defined routines), copied
// from the old instance profile path to the new one.
#pragma once

#include <cstdint>

class UpgradeContext;

inline constexpr uint32_t KXL_FN_COPY_FUNCTION_DIRECTORY = 0x18780523u;

// Copies "<old profile path>\function" to "<new profile path>\function" unless
// the new one exists already or the instance has node type 2 (no server).
// 0, or the directory copy's result.
int32_t copyFunctionDirectory(UpgradeContext &context, const char *newProfilePath,
                              const char *oldProfilePath);
