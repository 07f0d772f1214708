#include "NT/cfgfile.h"

namespace kxlcfg {

namespace {

constexpr uint32_t kShare = SQLO_SHAREREAD | SQLO_SHAREWRITE;

uint32_t flagsFor(Access access) {
  switch (access) {
  case Access::Read:
    return SQLO_OPEN | SQLO_READONLY | SQLO_BINARY | kShare;
  case Access::Update:
    return SQLO_OPEN | SQLO_READWRITE | SQLO_BINARY | kShare;
  case Access::Rewrite:
    // Opening an existing file for writing without cutting it starts at its
    // first byte: the rewind the library's calls have no other way to make.
    return SQLO_OPEN | SQLO_WRITEONLY | SQLO_BINARY | kShare;
  case Access::Replace:
    break;
  }
  return SQLO_CREATE | SQLO_WRITEONLY | SQLO_BINARY | kShare;
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

void sealImage(unsigned char *image) {
  put32(image, 0, dbmCfgChecksum(image, kImageSize));
}

File::File(const char *path, Access access) {
  int32_t rc = sqloopenp(path, flagsFor(access), SQLO_MODE_FILE, &handle_, 0);
  if (rc != 0 && rc != SQLO_RC_FILE_EXISTED)
    handle_ = nullptr;
}

File::~File() {
  if (handle_ != nullptr)
    sqloclose(handle_);
}

int32_t File::readUpTo(unsigned char *buffer, uint32_t size, uint32_t *filled) const {
  *filled = 0;
  while (*filled < size) {
    uint32_t got = 0;
    int32_t rc = sqloread(handle_, buffer + *filled, size - *filled, &got);
    if (rc != 0)
      return rc;
    if (got == 0)
      break;
    *filled += got;
  }
  return 0;
}

bool File::close() {
  SQLO_FHANDLE handle = handle_;
  handle_ = nullptr;
  return handle != nullptr && sqloclose(handle) == 0;
}

WriteResult writeWhole(const char *path, Access access, const unsigned char *bytes, uint32_t size) {
  File file(path, access);
  if (!file.isOpen())
    return WriteResult::NotOpened;
  uint32_t written = 0;
  bool ok = sqlowrite(file.handle(), bytes, size, &written) == 0 && written == size;
  return file.close() && ok ? WriteResult::Written : WriteResult::Failed;
}

} // namespace kxlcfg
