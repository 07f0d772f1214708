// Conversion of an instance's database manager configuration file kxlsystm
// from the layout of the release that wrote it into the current copy's layout.
#pragma once

#include <cstdint>

// Trace identifier of upgradeDbmConfig.
inline constexpr uint32_t KXL_FN_UPGRADE_DBM_CONFIG = 0x18780530u;

// Result codes of upgradeDbmConfig.
inline constexpr int32_t KXL_DBMCFG_RC_FILE = -100;            // open, length or stream error
inline constexpr int32_t KXL_DBMCFG_RC_RELEASE = -101;         // unknown release code
inline constexpr int32_t KXL_DBMCFG_RC_CHECKSUM = -102;        // 16384-byte image damaged
inline constexpr int32_t KXL_DBMCFG_RC_SMALL_READ = -5005;     // small file: second read short
inline constexpr int32_t KXL_DBMCFG_RC_SMALL_CHECKSUM = -5050; // small file damaged
inline constexpr int32_t KXL_DBMCFG_RC_NODE_TYPES = -5065;     // node-type pair not supported

// Carries the settings of the saved file at sourcePath (only read) into the
// file at targetPath and rewrites the target in the current 16384-byte layout.
// Both are Windows paths (quotes allowed). Returns 0, or one of the codes
// above; on failure neither file has been changed.
int32_t upgradeDbmConfig(const char *targetPath, const char *sourcePath);
