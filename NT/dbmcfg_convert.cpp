// The converters: the general one every conversion starts with, and the server
// rules that the same-type merge and the type-1, type-3 and type-5 converters
// add to it. A is the target image, B the source image.
#include "NT/dbmcfg_fields.h"
#include "NT/dbmcfg_internal.h"

#include <algorithm>
#include <cstring>
#include <span>

namespace kxldbm {

namespace {

void copyString(unsigned char *a, const unsigned char *b, uint32_t offset, uint32_t size) {
  const void *end = std::memchr(b + offset, '\0', size - 1);
  size_t length = end != nullptr ? static_cast<const unsigned char *>(end) - (b + offset) : size - 1;
  std::memcpy(a + offset, b + offset, length);
  a[offset + length] = '\0';
}

// Each field as its form says: a scalar always, a block when its first byte is
// set, a string bounded by its field.
void applyCopies(unsigned char *a, const unsigned char *b, std::span<const Field> fields) {
  for (const Field &field : fields) {
    if (field.form == Form::Text)
      copyString(a, b, field.offset, field.size);
    else if (field.form != Form::Block || b[field.offset] != 0)
      std::memcpy(a + field.offset, b + field.offset, field.size);
  }
}

// ---- general converter ------------------------------------------------------

constexpr uint16_t kLevelNames = 8200;   // long names, extra strings
constexpr uint16_t kLevelPlugins = 8102; // value at 3436 and the short name at 3440
constexpr Field kNames[] = {kName458, kName2625, kName2754};
constexpr Field kOldNames[] = {kOldName679, kOldName1040, kOldName1057}; // older home of each of kNames

constexpr Field kLeadCopies[] = {kU16_36, kU16_794, kU16_796, kU16_1034, kBlock3392};
constexpr Field kDescriptionCopies[] = {kBlock396};
constexpr Field kBlockCopies[] = {kBlock1096, kBlock818, kBlock9370};
constexpr Field kValueCopies[] = {kU16_22, kBlock422, kWorkstationFlag, kSwitch86,
                                  kI16_50, kU16_84,   kClientComponent};
constexpr Field kTailCopies[] = {kU16_3416, kU64_3424};
constexpr Field kLevelCopies[] = {kU32_3436};
constexpr Field kNamedLevelCopies[] = {kText2204, kText2237, kText2270, kText2303,
                                       kText2336, kText2592, kU16_3388, kU16_3390};
constexpr Field kRelease11Copies[] = {kI32_3464};
constexpr Field kRelease12Copies[] = {kText1128};
constexpr Field kRelease13Copies[] = {kText3468, kText4492, kText5516, kText6540, kText6555,
                                      kText6811, kText7067, kText8091, kU64_9120, kU16_1942};

void copyLongName(unsigned char *a, const unsigned char *b, const Field &name) {
  if (b[name.offset] == 0)
    return;
  std::memcpy(a + name.offset, b + name.offset, name.size);
  a[name.offset + name.size] = '\0';
}

// A name of an older level, put into its new field and, when asked, kept in
// its old one too.
void copyShortName(unsigned char *a, const unsigned char *b, const Field &from, const Field &to,
                   bool keepOld) {
  if (b[from.offset] == 0)
    return;
  std::memcpy(a + to.offset, b + from.offset, from.size);
  if (keepOld)
    std::memcpy(a + from.offset, b + from.offset, from.size);
  a[to.offset + from.size] = '\0';
}

void copyNames(unsigned char *a, const unsigned char *b) {
  bool longNames = get16(b, kLevelOffset) >= kLevelNames;
  for (size_t i = 0; i < std::size(kNames); ++i) {
    if (longNames)
      copyLongName(a, b, kNames[i]);
    else
      copyShortName(a, b, kOldNames[i], kNames[i], true);
  }
}

// Trailing blanks of a name become NULs; its first character stays.
void trimName(unsigned char *a, const Field &name) {
  const uint32_t bound = name.size + 1u; // the name and its terminator
  const void *end = std::memchr(a + name.offset, '\0', bound);
  size_t length = end != nullptr ? static_cast<const unsigned char *>(end) - (a + name.offset) : bound;
  for (size_t at = length; at > 1 && a[name.offset + at - 1] == ' '; --at)
    a[name.offset + at - 1] = '\0';
}

// The mode at 1930 keeps only its newer values; the two flags beside it take
// over what the dropped values meant.
void convertMode(unsigned char *a, const unsigned char *b) {
  uint16_t mode = get16(b, kMode.offset);
  uint16_t mapped = mode;
  if (mode == 2)
    mapped = 0;
  else if (mode == 3 || mode == 5 || mode == 6)
    mapped = 4;
  put16(a, kMode.offset, mapped);
  bool switched = static_cast<int16_t>(get16(b, kSwitch86.offset)) == 1 && (mode == 5 || mode == 2);
  put16(a, kModeFlagA.offset, switched ? 1 : get16(b, kModeFlagA.offset));
  put16(a, kModeFlagB.offset, mode == 2 ? 1 : get16(b, kModeFlagB.offset));
}

void copyLevelFields(unsigned char *a, const unsigned char *b) {
  uint16_t level = get16(b, kLevelOffset);
  if (level < kLevelPlugins)
    return;
  applyCopies(a, b, kLevelCopies);
  if (level >= kLevelNames) {
    copyLongName(a, b, kName2883);
    applyCopies(a, b, kNamedLevelCopies);
  } else {
    copyShortName(a, b, kOldName3440, kName2883, false);
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

constexpr uint16_t kAgentFloor = 66;
constexpr uint16_t kAgentFloorType3 = 46;
constexpr uint32_t kPoolFloor = 895;
constexpr Field kPoolSizes[] = {kPoolSize3096, kPoolSize3100, kPoolSize3104};
constexpr uint32_t kUnset = 0xFFFFFFFFu;

// Plain copies of the server rules; none of them touches a field that a later
// rule reads or changes, except 3084 and 3088, which rule 11 then rewrites.
constexpr Field kServerCopies[] = {
    kU16_44,    kU16_62,   kI16_98,   kBlock180, kU32_68,   kU32_72,      kCpuMeasure, kI32_812,  kU16_798,
    kU16_1106,  kU16_1038, kU16_816,  kU32_800,  kI32_804,  kWorkstation, kI32_1932,   kI32_1936, kU32_64,
    kShare,     kI32_92,   kLimitOld, kU16_96,   kBlock100, kFree,        kI32_24,     kReserved, kSwitch38,
    kBlock1977, kI32_32,   kI32_1944, kU32_3108, kU16_1940, kU16_84};
constexpr Field kPoolCopies[] = {kPoolBest, kPool};
constexpr Field kRemoteCopies[] = {kU16_48, kBlock696, kBlock1108, kBlock745, kBlock115};
constexpr Field kTuningCopies[] = {kU16_3112, kU16_3114, kU16_3116, kU16_3118, kBandwidth};
constexpr Field kTuning3118[] = {kU16_3118};

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
  put16(a, kAgents.offset, std::max(get16(b, kAgents.offset), floor));
}

// Older sources had three pool sizes; the largest becomes the one pool, and the
// pool at 3092 is shared by the partitions of this host.
void convertPools(unsigned char *a, const unsigned char *b, const ServerInputs &inputs) {
  if (releaseCode(b) >= kRelease11) {
    applyCopies(a, b, kPoolCopies);
    return;
  }
  int32_t largest = static_cast<int32_t>(get32(b, kPoolSizes[0].offset));
  for (const Field &size : kPoolSizes) {
    largest = std::max(largest, static_cast<int32_t>(get32(b, size.offset)));
    put32(a, size.offset, 0);
  }
  put32(a, kPoolBest.offset, static_cast<uint32_t>(largest));
  uint32_t pool = get32(b, kPool.offset);
  put32(a, kPool.offset, inputs.partitionDivisor != 0 ? pool / inputs.partitionDivisor : pool);
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
  put32(a, kMemory.offset, 0);
  put32(a, kMemoryB.offset, 0);
  if (get32(a, kShare.offset) == kUnset)
    put32(a, kShare.offset, get32(b, kMemory.offset) >> 1);
  setFlag(a, inputs.flagIndex803);
  setFlag(a, inputs.flagIndex79);
  if (get32(b, kFree.offset) == kUnset) {
    bool subtract = !variant.subtract3080Only38 || static_cast<int16_t>(get16(b, kSwitch38.offset)) == 1;
    put32(a, kFree.offset, get32(b, kMemory.offset) - (subtract ? get32(b, kReserved.offset) : 0));
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
  for (const Field &name : kNames)
    trimName(a, name);
  applyCopies(a, b, kDescriptionCopies);
  if (b[kCodeBlock.offset] != '0')
    std::memcpy(a + kCodeBlock.offset, b + kCodeBlock.offset, kCodeBlock.size);
  applyCopies(a, b, kBlockCopies);
  if (b[kNodeBlock.offset] != 0 && nodeType(a) != 5)
    std::memcpy(a + kNodeBlock.offset, b + kNodeBlock.offset, kNodeBlock.size);
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
  put32(a, kHeap.offset, get32(b, kHeap.offset));
  put32(a, kHeapCopy.offset, get32(b, kHeap.offset));
  copyAgents(a, b, variant);
  convertPools(a, b, inputs);
  put32(a, kPool.offset, std::max(get32(a, kPool.offset), kPoolFloor));
  put16(a, kI16_1126.offset, 0);
  convertMemory(a, b, variant, inputs);
  put32(a, kLimit.offset, get32(b, releaseCode(b) < kRelease13 ? kLimitOld.offset : kLimit.offset));
  if (variant.carryRemote)
    applyCopies(a, b, kRemoteCopies);
  copyTuning(a, b, variant.tuning);
}

} // namespace kxldbm
