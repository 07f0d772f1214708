// Loading, validating, expanding and writing kxlsystm images.
#include "NT/dbmcfg.h"
#include "NT/dbmcfg_internal.h"

#include <cstring>

namespace kxldbm {

namespace {

using kxlcfg::Access;
using kxlcfg::File;
using kxlcfg::WriteResult;

constexpr uint32_t kProbeRestoreFailed = 40;

// Reads the small file once more from its start, as the conversion of the
// small layout requires; a short read or an error is -5005.
int32_t rereadSmall(const char *path, unsigned char *small) {
  File file(path, Access::Read);
  if (!file.isOpen())
    return KXL_DBMCFG_RC_FILE;
  uint32_t filled = 0;
  if (file.readUpTo(small, kSmallSize, &filled) != 0 || filled < kSmallSize)
    return UPGRADE_RC_CONFIG_FILE;
  return 0;
}

} // namespace

int32_t checkRelease(const unsigned char *image) {
  uint16_t code = releaseCode(image);
  return code >= kRelease10 && code <= kRelease13 ? 0 : KXL_DBMCFG_RC_RELEASE;
}

int32_t verifyImage(const unsigned char *image) {
  return get32(image, 0) == dbmCfgChecksum(image, kImageSize) ? 0 : KXL_DBMCFG_RC_CHECKSUM;
}

int32_t expandSmall(const unsigned char *small, unsigned char *image) {
  if (get32(small, 0) != dbmCfgChecksum(small, kSmallSize))
    return KXL_DBMCFG_RC_SMALL_CHECKSUM;
  std::memset(image, 0, kImageSize);
  std::memcpy(image, small, kSmallFlagArea);
  std::memcpy(image + kFlagArea, small + kSmallFlagArea, kFlagAreaSize);
  sealImage(image);
  return 0;
}

int32_t loadFile(const char *path, FileRole role, LoadedFile &loaded) {
  std::memset(loaded.image, 0, kImageSize);
  std::memset(loaded.raw, 0, kImageSize);
  unsigned char small[kSmallSize] = {};
  {
    // The target is opened for update from the start so that a file that
    // cannot be rewritten is refused before anything is converted.
    File file(path, role == FileRole::Target ? Access::Update : Access::Read);
    if (!file.isOpen())
      return KXL_DBMCFG_RC_FILE;
    if (file.readUpTo(loaded.raw, kImageSize, &loaded.length) != 0)
      return KXL_DBMCFG_RC_FILE;
  }
  if (loaded.length != kImageSize && loaded.length != kSmallSize)
    return KXL_DBMCFG_RC_FILE;
  if (int32_t rc = checkRelease(loaded.raw); rc != 0)
    return rc;
  if (loaded.length == kSmallSize) {
    if (int32_t rc = rereadSmall(path, small); rc != 0)
      return rc;
    return expandSmall(small, loaded.image);
  }
  std::memcpy(loaded.image, loaded.raw, kImageSize);
  return verifyImage(loaded.image);
}

int32_t writeTarget(const char *path, const LoadedFile &target) {
  WriteResult result = kxlcfg::writeWhole(path, Access::Rewrite, target.image, kImageSize);
  if (result == WriteResult::Written)
    return 0;
  // A half-written file would be a damaged configuration: put back what was read.
  if (result == WriteResult::Failed &&
      kxlcfg::writeWhole(path, Access::Replace, target.raw, target.length) != WriteResult::Written)
    pdLog(PD_LEVEL_SEVERE, KXL_FN_UPGRADE_DBM_CONFIG, kProbeRestoreFailed, KXL_DBMCFG_RC_FILE,
          "kxlsystm could not be restored after a failed write");
  return KXL_DBMCFG_RC_FILE;
}

} // namespace kxldbm
