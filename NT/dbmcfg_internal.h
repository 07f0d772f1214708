// Pieces of the configuration file conversion shared by its source files, its
// tests and its fuzz target. Everything here works on images in memory; only
// dbmcfg_image.cpp touches files (through NT/cfgfile.h) and only
// dbmcfg_platform.cpp asks the platform.
#pragma once

#include "NT/cfgfile.h"
#include "install/kxlinstance.h"
#include "platform/kxlsys.h"

#include <cstddef>
#include <cstdint>

namespace kxldbm {

// ---- layout ---------------------------------------------------------------
using kxlcfg::kImageSize; // current layout
inline constexpr uint32_t kSmallSize = DBMCFG_SMALL_SZ;
inline constexpr uint32_t kFlagAreaSize = DBMCFG_FLAG_AREA_SZ;
inline constexpr uint32_t kFlagArea = kImageSize - kFlagAreaSize;      // flag area of the current layout
inline constexpr uint32_t kSmallFlagArea = kSmallSize - kFlagAreaSize; // flag area of the small layout
inline constexpr uint32_t kReleaseOffset = DBMCFG_RELEASE_OFFSET;
inline constexpr uint32_t kLevelOffset = DBMCFG_LEVEL_OFFSET;
inline constexpr uint16_t kReleaseMask = 0x0F00; // release code bits of the release word
inline constexpr uint16_t kRelease10 = 0x0A00;   // oldest release code understood
inline constexpr uint16_t kRelease11 = 0x0B00;
inline constexpr uint16_t kRelease12 = 0x0C00;
inline constexpr uint16_t kRelease13 = 0x0D00; // newest release code understood

typedef unsigned char Image[kImageSize];

// ---- little-endian fields ---------------------------------------------------
inline uint16_t get16(const unsigned char *image, uint32_t offset) {
  return sqloLe16(image, offset);
}
inline uint32_t get32(const unsigned char *image, uint32_t offset) {
  return sqloLe32(image, offset);
}
inline uint64_t get64(const unsigned char *image, uint32_t offset) {
  return uint64_t(get32(image, offset)) | uint64_t(get32(image, offset + 4)) << 32;
}
using kxlcfg::put16;
using kxlcfg::put32;

inline uint16_t releaseCode(const unsigned char *image) {
  return get16(image, kReleaseOffset) & kReleaseMask;
}
inline uint16_t nodeType(const unsigned char *image) {
  return get16(image, DBMCFG_NODE_TYPE_OFFSET);
}

// ---- validation (dbmcfg_image.cpp) -------------------------------------------
using kxlcfg::sealImage;
// 0, or -101 when the release code is not one this conversion knows.
int32_t checkRelease(const unsigned char *image);
// 0, or -102 when the stored checksum of the image does not match its bytes.
int32_t verifyImage(const unsigned char *image);
// Verifies a 4096-byte small file (-5050 when damaged) and expands it into the
// cleared image: values in place, flag area moved to the end, checksum renewed.
int32_t expandSmall(const unsigned char *small, unsigned char *image);

// ---- platform inputs of the server rules (dbmcfg_platform.cpp) --------------
struct ServerInputs {
  // Flag area index of parameter tokens 803 and 79; -1 when the platform gives
  // none inside the 512-byte area.
  int32_t flagIndex803 = -1;
  int32_t flagIndex79 = -1;
  // What the value at 3092 of an old partitioned source is divided by; 0 when
  // there is nothing to divide by (no partition table, no entry for the current
  // partition, or a sum that is not positive).
  uint32_t partitionDivisor = 0;
  // The platform's failure to say where a parameter is (0 none): never taken
  // for a parameter it does not know, which has no index.
  int32_t platformFailure = 0;
};
// Asks the platform for what a source of this release code needs.
ServerInputs readServerInputs(uint16_t sourceRelease);

// ---- conversion (dbmcfg_convert.cpp, dbmcfg_range.cpp, dbmcfg_dispatch.cpp) --
enum class Converter : uint8_t { None, General, Type1, Type3, Type5, Merge };

// The converter for a (target, source) node-type pair; None when unsupported.
Converter selectConverter(uint16_t targetType, uint16_t sourceType);
// True when the converter runs the server rules and so needs ServerInputs.
bool needsServerInputs(Converter converter);

void convertGeneral(unsigned char *target, const unsigned char *source);
void applyServerRules(unsigned char *target, const unsigned char *source, Converter converter,
                      const ServerInputs &inputs);
// Brings every value of the target into the range its node type allows.
void rangeCheck(unsigned char *target);

// The whole conversion of two loaded images: dispatch, converter, finishing
// (carried block, range check, checksum). 0 or -5065; the target image is only
// changed on success.
int32_t convertImages(unsigned char *target, const unsigned char *source, const ServerInputs &inputs);

// ---- files (dbmcfg_image.cpp) -------------------------------------------------
enum class FileRole : uint8_t { Source, Target };

// A file as read: its bytes (raw, length) and the validated current-layout image.
struct LoadedFile {
  Image image;
  Image raw;
  uint32_t length = 0;
};

// Opens, reads and validates a file (the source only for reading, the target for
// update): 0, -100, -101, -102, -5005 or -5050.
int32_t loadFile(const char *path, FileRole role, LoadedFile &loaded);
// Rewrites the target with its 16384-byte image from the start; 0 or -100. A
// write that fails part way puts the bytes that were read back.
int32_t writeTarget(const char *path, const LoadedFile &target);

} // namespace kxldbm
