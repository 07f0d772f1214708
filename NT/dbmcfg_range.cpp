// The range check of a converted image: every value the server may not accept
// is replaced by a safe one. A type-2 target (no server) has its server values
// cleared instead.
#include "NT/dbmcfg_fields.h"
#include "NT/dbmcfg_internal.h"

#include <algorithm>
#include <bit>
#include <cmath>
#include <iterator>

namespace kxldbm {

namespace {

enum class Check : uint8_t {
  Same,       // the rule the other node types get (only as an alternative)
  Outside,    // a value outside [low, high] becomes `value`
  OutsideNot, // as Outside, but -1 is kept
  OutsideRef, // a value outside [low, high] becomes the value of `other`
  Always,     // always becomes `value`
  NonzeroTo,  // a nonzero value becomes `value`
  UnlessRef1, // becomes `value` unless the value of `other` is 1
  Keep,       // left as it is
};

struct Rule {
  Check check;
  double low;
  double high;
  double value;
  Field other;
};

constexpr Field kNoField{0, 0, Form::Bytes};

constexpr Rule outside(double low, double high, double value) {
  return {Check::Outside, low, high, value, kNoField};
}
constexpr Rule outsideKeepUnset(double low, double high, double value) {
  return {Check::OutsideNot, low, high, value, kNoField};
}
constexpr Rule outsideFrom(double low, double high, Field other) {
  return {Check::OutsideRef, low, high, 0, other};
}
constexpr Rule always(double value) {
  return {Check::Always, 0, 0, value, kNoField};
}
constexpr Rule nonzeroTo(double value) {
  return {Check::NonzeroTo, 0, 0, value, kNoField};
}
constexpr Rule unlessOneAt(Field other, double value) {
  return {Check::UnlessRef1, 0, 0, value, other};
}
constexpr Rule kSame{Check::Same, 0, 0, 0, kNoField};
constexpr Rule kKeep{Check::Keep, 0, 0, 0, kNoField};
constexpr Rule kClear = always(0);

constexpr double kU16Max = 65535;
constexpr double kI32Max = 2147483647;

struct RangeRow {
  Field field;
  Rule server;      // node type 4, and 1, 3, 5 unless `otherServer` says otherwise
  Rule otherServer; // node types 1, 3, 5 (Same: as `server`)
  Rule noServer;    // node type 2 (Same: as `server`)
};

constexpr RangeRow row(Field field, Rule server, Rule noServer) {
  return {field, server, kSame, noServer};
}
constexpr RangeRow row4(Field field, Rule type4, Rule others, Rule noServer) {
  return {field, type4, others, noServer};
}

// In order: rows that read another field come after that field's own row.
constexpr RangeRow kRows[] = {
    row(kU16_36, outside(4096, kU16Max, 32767), kSame),
    row(kU16_44, outside(1, 256, 8), nonzeroTo(3)),
    row(kU16_62, outside(1, 6, 2), kClear),
    row(kU32_64, outside(250, kI32Max, 0), kClear),
    row(kU32_68, outside(8, 16384, 1024), kClear),
    row(kU32_72, outside(8, 16384, 1024), kClear),
    row(kAgents, outside(1, 60000, 66), kClear),
    row(kU16_1106, outside(1, 60000, 180), kClear),
    row(kI32_1936, outside(10, 256, 20), kClear),
    row(kI32_1932, outside(4, 1000, 256), kClear),
    row(kHeap, outside(1, 524288, 15), kClear),
    row(kHeapCopy, outsideFrom(1, 524288, kHeap), kKeep),
    row(kU16_96, outside(0, 1, 1), kClear),
    row(kI16_98, outside(0, 6, -1), kClear),
    row(kI32_812, outside(2, 524288, 1000), kClear),
    row(kU16_796, outside(16, 60000, 128), kSame),
    row(kU16_798, outside(0, 127, 64), always(64)),
    row(kU16_794, outside(0, 1, 1), kSame),
    row(kU16_1034, outside(0, 4, 3), kSame),
    row(kCpuMeasure, outside(1e-10, 1.0, 4e-5), kClear),
    row(kU32_800, outside(32, 112000, 32), kClear),
    row(kI32_804, outsideKeepUnset(32, 112000, 20000), kClear),
    row(kU16_1038, outside(8, 1000, 16), kClear),
    row(kU16_816, outside(100, 32768, 16000), kClear),
    row(kMode, outside(0, 12, 0), kSame),
    row(kU16_1940, unlessOneAt(kMode, 1), kClear),
    row(kI32_24, outsideKeepUnset(1, 32767, -1), kClear),
    row(kSwitch38, outside(0, 1, 0), kClear),
    row(kMemory, always(0), kSame),
    row(kMemoryB, always(0), kSame),
    row(kShare, outside(0, 64000, 100), kClear),
    row(kReserved, outside(0, 64000, 0), kClear),
    row(kFree, outside(0, 64000, 200), kClear),
    row(kI32_92, outsideKeepUnset(0, 64000, -1), kClear),
    row(kLimitOld, outside(1, 8, 1), kClear),
    row(kLimit, outside(1, 8, 1), kClear),
    row(kPool, outside(895, 524288, 1024), kClear),
    row(kPoolBest, outside(128, 524288, 256), kClear),
    row(kPoolSize3096, outside(128, 524288, 256), kClear),
    row(kPoolSize3100, outsideKeepUnset(128, 524288, -1), kClear),
    row(kPoolSize3104, outsideKeepUnset(128, 524288, -1), kClear),
    row4(kU16_3112, outside(0, 100, 10), kClear, kClear),
    row4(kU16_3114, outside(0, 100, 5), kClear, kClear),
    row4(kU16_3116, outside(1, 1440, 60), kClear, kClear),
    row(kU16_3118, outside(1, 1440, 10), kClear),
    row4(kBandwidth, outside(0.1, 100000, 1.25), kClear, kClear),
    row(kClientComponent, outside(0, 524288, 2048), kSame),
    row(kI32_32, outside(0, 65000, 0), kClear),
    row(kWorkstationFlag, outside(0, 1, 1), kSame),
    row(kI32_1944, outside(0, 64000, 0), kClear),
    row(kI16_50, outside(0, 1, 0), kClear),
    row(kI16_1126, outside(0, 1, 0), kClear),
    row(kSwitch86, outside(0, 1, 0), kSame),
    row4(kI32_3464, outsideKeepUnset(0, 32767, 0), kClear, kClear),
};

constexpr bool isScalar16or32(const Field &field) {
  return field.form == Form::U16 || field.form == Form::I16 || field.form == Form::U32 ||
         field.form == Form::I32 || field.form == Form::F32;
}
static_assert(std::all_of(std::begin(kRows), std::end(kRows),
                          [](const RangeRow &row) { return isScalar16or32(row.field); }),
              "the range check reads and writes scalars of 16 and 32 bits only");

double readValue(const unsigned char *image, const Field &field) {
  switch (field.form) {
  case Form::U16:
    return get16(image, field.offset);
  case Form::I16:
    return static_cast<int16_t>(get16(image, field.offset));
  case Form::U32:
    return get32(image, field.offset);
  case Form::I32:
    return static_cast<int32_t>(get32(image, field.offset));
  case Form::F32:
    return std::bit_cast<float>(get32(image, field.offset));
  default:
    return 0;
  }
}

void writeValue(unsigned char *image, const Field &field, double value) {
  if (field.form == Form::F32)
    put32(image, field.offset, std::bit_cast<uint32_t>(static_cast<float>(value)));
  else if (field.size == 2)
    put16(image, field.offset, static_cast<uint16_t>(static_cast<int64_t>(value)));
  else
    put32(image, field.offset, static_cast<uint32_t>(static_cast<int64_t>(value)));
}

// Written so that a value that is not a number (a damaged float) is outside too.
bool isOutside(const Rule &rule, double value) {
  return !(value >= rule.low && value <= rule.high);
}

// Applies the rule to *value; true when it gives a new value to write back (a
// kept value is never rewritten, so a float keeps its exact bits).
bool applyRule(const unsigned char *image, const Rule &rule, double *value) {
  bool replace = false;
  double replacement = rule.value;
  switch (rule.check) {
  case Check::Outside:
    replace = isOutside(rule, *value);
    break;
  case Check::OutsideNot:
    replace = *value != -1 && isOutside(rule, *value);
    break;
  case Check::OutsideRef:
    replace = isOutside(rule, *value);
    replacement = readValue(image, rule.other);
    break;
  case Check::Always:
    replace = true;
    break;
  case Check::NonzeroTo:
    replace = *value != 0;
    break;
  case Check::UnlessRef1:
    replace = readValue(image, rule.other) != 1;
    break;
  case Check::Same:
  case Check::Keep:
    break;
  }
  if (replace)
    *value = replacement;
  return replace;
}

const Rule &ruleFor(const RangeRow &row, uint16_t type) {
  if (type == KXL_NODE_TYPE_CLIENT && row.noServer.check != Check::Same)
    return row.noServer;
  if (type != KXL_NODE_TYPE_CLIENT && type != KXL_NODE_TYPE_PARTITIONED &&
      row.otherServer.check != Check::Same)
    return row.otherServer;
  return row.server;
}

} // namespace

void rangeCheck(unsigned char *target) {
  uint16_t type = nodeType(target);
  for (const RangeRow &row : kRows) {
    const Rule &rule = ruleFor(row, type);
    double value = readValue(target, row.field);
    if (applyRule(target, rule, &value))
      writeValue(target, row.field, value);
  }
}

} // namespace kxldbm
