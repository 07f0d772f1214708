// The one way the engine reads and rewrites an instance's kxlsystm: the
// product library's file calls, which take Windows paths as they come (a
// quoted profile path included), and the little-endian field and checksum
// helpers of the 16384-byte image.
#pragma once

#include "platform/dbmcfgfile.h"
#include "platform/kxlsys.h"

#include <cstdint>

namespace kxlcfg {

inline constexpr uint32_t kImageSize = DBMCFG_IMAGE_SZ;

// ---- fields -----------------------------------------------------------------
void put16(unsigned char *image, uint32_t offset, uint16_t value);
void put32(unsigned char *image, uint32_t offset, uint32_t value);
// Stores the checksum of a 16384-byte image at offset 0.
void sealImage(unsigned char *image);

// ---- files ------------------------------------------------------------------
enum class Access : uint8_t {
  Read,    // the file must exist; only read
  Update,  // the file must exist; open for reading and writing
  Rewrite, // the file must exist; written from its start without being cut
  Replace, // created, or its whole content replaced
};

// One open file, closed on every way out.
class File {
public:
  File(const char *path, Access access);
  ~File();
  File(const File &) = delete;
  File &operator=(const File &) = delete;

  bool isOpen() const { return handle_ != nullptr; }
  SQLO_FHANDLE handle() const { return handle_; }
  // Reads until `size` bytes are in `buffer` or the file ends; *filled is the
  // count. 0 or the failing read's code.
  int32_t readUpTo(unsigned char *buffer, uint32_t size, uint32_t *filled) const;
  // Closes now; false when the stream reports an error.
  bool close();

private:
  SQLO_FHANDLE handle_ = nullptr;
};

enum class WriteResult : uint8_t { Written, NotOpened, Failed };

// Opens `path` with `access` and writes `size` bytes from its start; a short
// write or a failing close counts as Failed.
WriteResult writeWhole(const char *path, Access access, const unsigned char *bytes, uint32_t size);

} // namespace kxlcfg
