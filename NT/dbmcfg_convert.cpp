// The converters: the general one every conversion starts with, and the server
// rules that the same-type merge and the type-1, type-3 and type-5 converters
// add to it. A is the target image, B the source image.
#include "NT/dbmcfg_internal.h"

#include <algorithm>
#include <cstring>
#include <span>

namespace kxldbm {

namespace {

// Field: always copied. Block: copied when its first source byte is not zero.
// String: a NUL-terminated text copied with its terminator, never past `size`.
enum class Copy : uint8_t { Field, Block, String };

struct CopyStep {
  Copy kind;
  uint16_t offset;
  uint16_t size;
};

constexpr CopyStep field(uint16_t offset, uint16_t size) {
  return {Copy::Field, offset, size};
}
constexpr CopyStep block(uint16_t offset, uint16_t size) {
  return {Copy::Block, offset, size};
}
constexpr CopyStep text(uint16_t offset, uint16_t size) {
  return {Copy::String, offset, size};
}

void copyString(unsigned char *a, const unsigned char *b, uint32_t offset, uint32_t size) {
  const void *end = std::memchr(b + offset, '\0', size - 1);
  size_t length = end != nullptr ? static_cast<const unsigned char *>(end) - (b + offset) : size - 1;
  std::memcpy(a + offset, b + offset, length);
  a[offset + length] = '\0';
}

void applyCopies(unsigned char *a, const unsigned char *b, std::span<const CopyStep> steps) {
  for (const CopyStep &step : steps) {
    if (step.kind == Copy::String)
      copyString(a, b, step.offset, step.size);
    else if (step.kind == Copy::Field || b[step.offset] != 0)
      std::memcpy(a + step.offset, b + step.offset, step.size);
  }
}

// ---- general converter ------------------------------------------------------

constexpr uint16_t kLevelNames = 8200;   // long names, extra strings
constexpr uint16_t kLevelPlugins = 8102; // value at 3436 and the short name at 3440
constexpr uint16_t kLongName = 128;      // long name field, followed by its terminator
constexpr uint16_t kShortName = 8;       // name field of the older levels
constexpr uint16_t kNames[] = {458, 2625, 2754};
constexpr uint16_t kShortNames[] = {679, 1040, 1057}; // older home of each of kNames
constexpr uint16_t kLongNameExtra = 2883;
constexpr uint16_t kShortNameExtra = 3440;
constexpr uint16_t kCodeBlock = 1076; // 20 bytes; "0" in its first byte means unset
constexpr uint16_t kCodeBlockSize = 20;
constexpr uint16_t kNodeBlock = 52; // 9 bytes, not carried into a type-5 target
constexpr uint16_t kNodeBlockSize = 9;
constexpr uint16_t kMode = 1930;
constexpr uint16_t kModeFlagA = 3434;
constexpr uint16_t kModeFlagB = 3432;
constexpr uint16_t kSwitch86 = 86;

constexpr CopyStep kLeadCopies[] = {field(36, 2), field(794, 2), field(796, 2), field(1034, 2),
                                    block(3392, 24)};
constexpr CopyStep kDescriptionCopies[] = {block(396, 26)};
constexpr CopyStep kBlockCopies[] = {block(1096, 9), block(818, 216), block(9370, 216)};
constexpr CopyStep kValueCopies[] = {field(22, 2), block(422, 36), field(46, 2),  field(86, 2),
                                     field(50, 2), field(84, 2),   field(3124, 4)};
constexpr CopyStep kTailCopies[] = {field(3416, 2), field(3424, 8)};
constexpr CopyStep kLevelCopies[] = {field(3436, 4)};
constexpr CopyStep kNamedLevelCopies[] = {text(2204, 33),  text(2237, 33), text(2270, 33), text(2303, 33),
                                          text(2336, 256), text(2592, 33), field(3388, 2), field(3390, 2)};
constexpr CopyStep kRelease11Copies[] = {field(3464, 4)};
constexpr CopyStep kRelease12Copies[] = {text(1128, 802)};
constexpr CopyStep kRelease13Copies[] = {
    text(3468, 1024), text(4492, 1024), text(5516, 1024), text(6540, 15), text(6555, 256),
    text(6811, 256),  text(7067, 1024), text(8091, 1029), field(9120, 8), field(1942, 2)};

void copyLongName(unsigned char *a, const unsigned char *b, uint16_t offset) {
  if (b[offset] == 0)
    return;
  std::memcpy(a + offset, b + offset, kLongName);
  a[offset + kLongName] = '\0';
}

// An 8-byte name of an older level, put into its new field and, when asked,
// kept in its old one too.
void copyShortName(unsigned char *a, const unsigned char *b, uint16_t from, uint16_t to, bool keepOld) {
  if (b[from] == 0)
    return;
  std::memcpy(a + to, b + from, kShortName);
  if (keepOld)
    std::memcpy(a + from, b + from, kShortName);
  a[to + kShortName] = '\0';
}

void copyNames(unsigned char *a, const unsigned char *b) {
  bool longNames = get16(b, kLevelOffset) >= kLevelNames;
  for (size_t i = 0; i < std::size(kNames); ++i) {
    if (longNames)
      copyLongName(a, b, kNames[i]);
    else
      copyShortName(a, b, kShortNames[i], kNames[i], true);
  }
}

// Trailing blanks of a name become NULs; its first character stays.
void trimName(unsigned char *a, uint16_t offset) {
  const void *end = std::memchr(a + offset, '\0', kLongName + 1);
  size_t length = end != nullptr ? static_cast<const unsigned char *>(end) - (a + offset) : kLongName + 1;
  for (size_t at = length; at > 1 && a[offset + at - 1] == ' '; --at)
    a[offset + at - 1] = '\0';
}

// The mode at 1930 keeps only its newer values; the two flags beside it take
// over what the dropped values meant.
void convertMode(unsigned char *a, const unsigned char *b) {
  uint16_t mode = get16(b, kMode);
  uint16_t mapped = mode;
  if (mode == 2)
    mapped = 0;
  else if (mode == 3 || mode == 5 || mode == 6)
    mapped = 4;
  put16(a, kMode, mapped);
  bool switched = static_cast<int16_t>(get16(b, kSwitch86)) == 1 && (mode == 5 || mode == 2);
  put16(a, kModeFlagA, switched ? 1 : get16(b, kModeFlagA));
  put16(a, kModeFlagB, mode == 2 ? 1 : get16(b, kModeFlagB));
}

void copyLevelFields(unsigned char *a, const unsigned char *b) {
  uint16_t level = get16(b, kLevelOffset);
  if (level < kLevelPlugins)
    return;
  applyCopies(a, b, kLevelCopies);
  if (level >= kLevelNames) {
    copyLongName(a, b, kLongNameExtra);
    applyCopies(a, b, kNamedLevelCopies);
  } else {
    copyShortName(a, b, kShortNameExtra, kLongNameExtra, false);
  }
}

void copyReleaseFields(unsigned char *a, const unsigned char *b) {
  uint16_t release = releaseCode(b);
  if (release >= kRelease11)
    applyCopies(a, b, kRelease11Copies);
  if (release >= kRelease12)
    applyCopies(a, b, kRelease12Copies);
  if (release >= kRelease13)
    applyCopies(a, b, kRelease13Copies);
}

// ---- server rules -----------------------------------------------------------

// Which fields at 3112-3120 a converter carries.
enum class Tuning : uint8_t { All, Only3118, None };

struct ServerVariant {
  bool lowerAgentFloorFromType3; // u16 at 1074: at least 46 for a type-3 source
  bool subtract3080Only38;       // 3084 fallback subtracts 3080 only when 38 is 1
  bool carryRemote;              // u16 at 48 and the blocks at 696, 1108, 745, 115
  Tuning tuning;
};

constexpr ServerVariant kMergeVariant{false, false, true, Tuning::All};
constexpr ServerVariant kType1Variant{true, true, true, Tuning::Only3118};
constexpr ServerVariant kType3Variant{true, true, true, Tuning::None};
constexpr ServerVariant kType5Variant{true, true, false, Tuning::None};

constexpr uint16_t kAgents = 1074;
constexpr uint16_t kAgentFloor = 66;
constexpr uint16_t kAgentFloorType3 = 46;
constexpr uint16_t kHeap = 88;
constexpr uint16_t kHeapCopy = 1948;
constexpr uint16_t kPool = 3092;
constexpr uint32_t kPoolFloor = 895;
constexpr uint16_t kPoolBest = 3460;
constexpr uint16_t kPoolSizes[] = {3096, 3100, 3104};
constexpr uint16_t kReset1126 = 1126;
constexpr uint16_t kMemory = 76;
constexpr uint16_t kMemoryB = 80;
constexpr uint16_t kShare = 3088;
constexpr uint16_t kFree = 3084;
constexpr uint16_t kReserved = 3080;
constexpr uint16_t kSwitch38 = 38;
constexpr uint16_t kLimit = 10908;
constexpr uint16_t kLimitOld = 3456;
constexpr uint32_t kUnset = 0xFFFFFFFFu;

// Plain copies of the server rules; none of them touches a field that a later
// rule reads or changes, except 3084 and 3088, which rule 11 then rewrites.
constexpr CopyStep kServerCopies[] = {
    field(44, 2),   field(62, 2),   field(98, 2),   block(180, 216), field(68, 4),     field(72, 4),
    field(808, 4),  field(812, 4),  field(798, 2),  field(1106, 2),  field(1038, 2),   field(816, 2),
    field(800, 4),  field(804, 4),  field(1968, 8), field(1976, 1),  field(1932, 4),   field(1936, 4),
    field(64, 4),   field(3088, 4), field(92, 4),   field(3456, 4),  field(96, 2),     block(100, 15),
    field(3084, 4), field(24, 4),   field(3080, 4), field(38, 2),    block(1977, 227), field(32, 4),
    field(1944, 4), field(3108, 4), field(1940, 2), field(84, 2)};
constexpr CopyStep kPoolCopies[] = {field(kPoolBest, 4), field(kPool, 4)};
constexpr CopyStep kRemoteCopies[] = {field(48, 2), block(696, 49), block(1108, 5), block(745, 49),
                                      block(115, 65)};
constexpr CopyStep kTuningCopies[] = {field(3112, 2), field(3114, 2), field(3116, 2), field(3118, 2),
                                      field(3120, 4)};
constexpr CopyStep kTuning3118[] = {field(3118, 2)};

const ServerVariant &variantOf(Converter converter) {
  switch (converter) {
  case Converter::Type1:
    return kType1Variant;
  case Converter::Type3:
    return kType3Variant;
  case Converter::Type5:
    return kType5Variant;
  default:
    return kMergeVariant;
  }
}

void copyAgents(unsigned char *a, const unsigned char *b, const ServerVariant &variant) {
  uint16_t floor = variant.lowerAgentFloorFromType3 && nodeType(b) == 3 ? kAgentFloorType3 : kAgentFloor;
  put16(a, kAgents, std::max(get16(b, kAgents), floor));
}

// Older sources had three pool sizes; the largest becomes the one pool, and the
// pool at 3092 is shared by the partitions of this host.
void convertPools(unsigned char *a, const unsigned char *b, const ServerInputs &inputs) {
  if (releaseCode(b) >= kRelease11) {
    applyCopies(a, b, kPoolCopies);
    return;
  }
  int32_t largest = static_cast<int32_t>(get32(b, kPoolSizes[0]));
  for (uint16_t offset : kPoolSizes) {
    largest = std::max(largest, static_cast<int32_t>(get32(b, offset)));
    put32(a, offset, 0);
  }
  put32(a, kPoolBest, static_cast<uint32_t>(largest));
  uint32_t pool = get32(b, kPool);
  put32(a, kPool, inputs.partitionDivisor != 0 ? pool / inputs.partitionDivisor : pool);
}

void setFlag(unsigned char *a, int32_t index) {
  if (index >= 0 && index < static_cast<int32_t>(kFlagAreaSize))
    a[kFlagArea + index] = 1;
}

// Releases before 0x0C00 kept memory settings that no longer exist; their
// values seed the settings that replaced them.
void convertMemory(unsigned char *a, const unsigned char *b, const ServerVariant &variant,
                   const ServerInputs &inputs) {
  if (releaseCode(b) >= kRelease12) {
    std::memcpy(a + kFlagArea, b + kFlagArea, kFlagAreaSize);
    return;
  }
  put32(a, kMemory, 0);
  put32(a, kMemoryB, 0);
  if (get32(a, kShare) == kUnset)
    put32(a, kShare, get32(b, kMemory) >> 1);
  setFlag(a, inputs.flagIndex803);
  setFlag(a, inputs.flagIndex79);
  if (get32(b, kFree) == kUnset) {
    bool subtract = !variant.subtract3080Only38 || static_cast<int16_t>(get16(b, kSwitch38)) == 1;
    put32(a, kFree, get32(b, kMemory) - (subtract ? get32(b, kReserved) : 0));
  }
}

void copyTuning(unsigned char *a, const unsigned char *b, Tuning tuning) {
  if (tuning == Tuning::All)
    applyCopies(a, b, kTuningCopies);
  else if (tuning == Tuning::Only3118)
    applyCopies(a, b, kTuning3118);
}

} // namespace

void convertGeneral(unsigned char *a, const unsigned char *b) {
  applyCopies(a, b, kLeadCopies);
  copyNames(a, b);
  for (uint16_t offset : kNames)
    trimName(a, offset);
  applyCopies(a, b, kDescriptionCopies);
  if (b[kCodeBlock] != '0')
    std::memcpy(a + kCodeBlock, b + kCodeBlock, kCodeBlockSize);
  applyCopies(a, b, kBlockCopies);
  if (b[kNodeBlock] != 0 && nodeType(a) != 5)
    std::memcpy(a + kNodeBlock, b + kNodeBlock, kNodeBlockSize);
  applyCopies(a, b, kValueCopies);
  convertMode(a, b);
  applyCopies(a, b, kTailCopies);
  copyLevelFields(a, b);
  copyReleaseFields(a, b);
}

void applyServerRules(unsigned char *a, const unsigned char *b, Converter converter,
                      const ServerInputs &inputs) {
  const ServerVariant &variant = variantOf(converter);
  applyCopies(a, b, kServerCopies);
  put32(a, kHeap, get32(b, kHeap));
  put32(a, kHeapCopy, get32(b, kHeap));
  copyAgents(a, b, variant);
  convertPools(a, b, inputs);
  put32(a, kPool, std::max(get32(a, kPool), kPoolFloor));
  put16(a, kReset1126, 0);
  convertMemory(a, b, variant, inputs);
  put32(a, kLimit, get32(b, releaseCode(b) < kRelease13 ? kLimitOld : kLimit));
  if (variant.carryRemote)
    applyCopies(a, b, kRemoteCopies);
  copyTuning(a, b, variant.tuning);
}

} // namespace kxldbm
