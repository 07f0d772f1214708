// Conversion of an instance's database manager configuration file kxlsystm
// from the layout of the release that wrote it into the current copy's layout.
#pragma once

#include "upgrade/codes.h"

#include <cstdint>

// Trace identifier of upgradeDbmConfig.
inline constexpr uint32_t KXL_FN_UPGRADE_DBM_CONFIG = 0x18780530u;

// Carries the settings of the saved file at sourcePath (only read) into the
// file at targetPath and rewrites the target in the current 16384-byte layout.
// Both are Windows paths (quotes allowed). Returns 0, or one of the codes
// above; on failure neither file has been changed.
int32_t upgradeDbmConfig(const char *targetPath, const char *sourcePath);
