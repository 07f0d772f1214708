// Loading, validating, expanding, sealing and writing kxlsystm images.
#include "NT/dbmcfg.h"
#include "NT/dbmcfg_internal.h"

#include <cstring>

namespace kxldbm {

namespace {

constexpr uint32_t kShare = SQLO_SHAREREAD | SQLO_SHAREWRITE;
// The source is only read; the target must be open for update from the start so
// that a file that cannot be rewritten is refused before anything is converted.
constexpr uint32_t kSourceFlags = SQLO_OPEN | SQLO_READONLY | SQLO_BINARY | kShare;
constexpr uint32_t kTargetFlags = SQLO_OPEN | SQLO_READWRITE | SQLO_BINARY | kShare;
// Writing from the start of an existing file without cutting it: a rewind.
constexpr uint32_t kRewriteFlags = SQLO_OPEN | SQLO_WRITEONLY | SQLO_BINARY | kShare;
// Putting the original bytes back replaces the whole content.
constexpr uint32_t kRestoreFlags = SQLO_CREATE | SQLO_WRITEONLY | SQLO_BINARY | kShare;
constexpr uint32_t kMode = 0x644;

constexpr uint32_t kProbeRestoreFailed = 40;

// One open file, closed on every way out.
class OpenFile {
public:
  OpenFile(const char *path, uint32_t flags) {
    int32_t rc = sqloopenp(path, flags, kMode, &handle_, 0);
    if (rc != 0 && rc != SQLO_RC_FILE_EXISTED)
      handle_ = nullptr;
  }
  ~OpenFile() {
    if (handle_ != nullptr)
      sqloclose(handle_);
  }
  OpenFile(const OpenFile &) = delete;
  OpenFile &operator=(const OpenFile &) = delete;

  bool isOpen() const { return handle_ != nullptr; }
  SQLO_FHANDLE handle() const { return handle_; }
  // Closes now; false when the stream reports an error.
  bool close() {
    SQLO_FHANDLE handle = handle_;
    handle_ = nullptr;
    return handle != nullptr && sqloclose(handle) == 0;
  }

private:
  SQLO_FHANDLE handle_ = nullptr;
};

// Reads the small file once more from its start, as the conversion of the
// small layout requires; a short read or an error is -5005.
int32_t rereadSmall(const char *path, unsigned char *small) {
  OpenFile file(path, kSourceFlags);
  if (!file.isOpen())
    return KXL_DBMCFG_RC_FILE;
  uint32_t filled = 0;
  if (readUpTo(file.handle(), small, kSmallSize, &filled) != 0 || filled < kSmallSize)
    return KXL_DBMCFG_RC_SMALL_READ;
  return 0;
}

enum class WriteResult : uint8_t { Written, NotOpened, Failed };

WriteResult writeWhole(const char *path, uint32_t flags, const unsigned char *bytes, uint32_t size) {
  OpenFile file(path, flags);
  if (!file.isOpen())
    return WriteResult::NotOpened;
  uint32_t written = 0;
  bool ok = sqlowrite(file.handle(), bytes, size, &written) == 0 && written == size;
  return file.close() && ok ? WriteResult::Written : WriteResult::Failed;
}

} // namespace

void put16(unsigned char *image, uint32_t offset, uint16_t value) {
  image[offset] = static_cast<unsigned char>(value);
  image[offset + 1] = static_cast<unsigned char>(value >> 8);
}

void put32(unsigned char *image, uint32_t offset, uint32_t value) {
  put16(image, offset, static_cast<uint16_t>(value));
  put16(image, offset + 2, static_cast<uint16_t>(value >> 16));
}

uint32_t checksum(const unsigned char *bytes, uint32_t size) {
  uint32_t sum = 0;
  for (uint32_t at = kChecksumStart; at < size; ++at)
    sum += bytes[at];
  return sum;
}

void sealImage(unsigned char *image) {
  put32(image, 0, checksum(image, kImageSize));
}

int32_t checkRelease(const unsigned char *image) {
  uint16_t code = releaseCode(image);
  return code >= kRelease10 && code <= kRelease13 ? 0 : KXL_DBMCFG_RC_RELEASE;
}

int32_t verifyImage(const unsigned char *image) {
  return get32(image, 0) == checksum(image, kImageSize) ? 0 : KXL_DBMCFG_RC_CHECKSUM;
}

int32_t expandSmall(const unsigned char *small, unsigned char *image) {
  if (get32(small, 0) != checksum(small, kSmallSize))
    return KXL_DBMCFG_RC_SMALL_CHECKSUM;
  std::memset(image, 0, kImageSize);
  std::memcpy(image, small, kSmallFlagArea);
  std::memcpy(image + kFlagArea, small + kSmallFlagArea, kFlagAreaSize);
  sealImage(image);
  return 0;
}

int32_t readUpTo(SQLO_FHANDLE file, unsigned char *buffer, uint32_t size, uint32_t *filled) {
  *filled = 0;
  while (*filled < size) {
    uint32_t got = 0;
    int32_t rc = sqloread(file, buffer + *filled, size - *filled, &got);
    if (rc != 0)
      return rc;
    if (got == 0)
      break;
    *filled += got;
  }
  return 0;
}

int32_t loadFile(const char *path, FileRole role, LoadedFile &loaded) {
  std::memset(loaded.image, 0, kImageSize);
  std::memset(loaded.raw, 0, kImageSize);
  unsigned char small[kSmallSize] = {};
  {
    OpenFile file(path, role == FileRole::Target ? kTargetFlags : kSourceFlags);
    if (!file.isOpen())
      return KXL_DBMCFG_RC_FILE;
    if (readUpTo(file.handle(), loaded.raw, kImageSize, &loaded.length) != 0)
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
  WriteResult result = writeWhole(path, kRewriteFlags, target.image, kImageSize);
  if (result == WriteResult::Written)
    return 0;
  // A half-written file would be a damaged configuration: put back what was read.
  if (result == WriteResult::Failed &&
      writeWhole(path, kRestoreFlags, target.raw, target.length) != WriteResult::Written)
    pdLog(PD_LEVEL_SEVERE, KXL_FN_UPGRADE_DBM_CONFIG, kProbeRestoreFailed, KXL_DBMCFG_RC_FILE,
          "kxlsystm could not be restored after a failed write");
  return KXL_DBMCFG_RC_FILE;
}

} // namespace kxldbm
