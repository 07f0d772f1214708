// The range check of a converted image: every value the server may not accept
// is replaced by a safe one. A type-2 target (no server) has its server values
// cleared instead.
#include "NT/dbmcfg_internal.h"

#include <bit>
#include <cmath>

namespace kxldbm {

namespace {

enum class Width : uint8_t { U16, I16, U32, I32, F32 };

enum class Check : uint8_t {
  Same,       // the rule the other node types get (only as an alternative)
  Outside,    // a value outside [low, high] becomes `value`
  OutsideNot, // as Outside, but -1 is kept
  OutsideRef, // a value outside [low, high] becomes the value at `other`
  Always,     // always becomes `value`
  NonzeroTo,  // a nonzero value becomes `value`
  UnlessRef1, // becomes `value` unless the value at `other` is 1
  Keep,       // left as it is
};

struct Rule {
  Check check;
  double low;
  double high;
  double value;
  uint16_t other;
};

constexpr Rule outside(double low, double high, double value) {
  return {Check::Outside, low, high, value, 0};
}
constexpr Rule outsideKeepUnset(double low, double high, double value) {
  return {Check::OutsideNot, low, high, value, 0};
}
constexpr Rule outsideFrom(double low, double high, uint16_t other) {
  return {Check::OutsideRef, low, high, 0, other};
}
constexpr Rule always(double value) {
  return {Check::Always, 0, 0, value, 0};
}
constexpr Rule nonzeroTo(double value) {
  return {Check::NonzeroTo, 0, 0, value, 0};
}
constexpr Rule unlessOneAt(uint16_t other, double value) {
  return {Check::UnlessRef1, 0, 0, value, other};
}
constexpr Rule kSame{Check::Same, 0, 0, 0, 0};
constexpr Rule kKeep{Check::Keep, 0, 0, 0, 0};
constexpr Rule kClear = always(0);

constexpr double kU16Max = 65535;
constexpr double kI32Max = 2147483647;

struct RangeRow {
  uint16_t offset;
  Width width;
  Rule server;      // node type 4, and 1, 3, 5 unless `otherServer` says otherwise
  Rule otherServer; // node types 1, 3, 5 (Same: as `server`)
  Rule noServer;    // node type 2 (Same: as `server`)
};

constexpr RangeRow row(uint16_t offset, Width width, Rule server, Rule noServer) {
  return {offset, width, server, kSame, noServer};
}
constexpr RangeRow row4(uint16_t offset, Width width, Rule type4, Rule others, Rule noServer) {
  return {offset, width, type4, others, noServer};
}

// In order: rows that read another field come after that field's own row.
constexpr RangeRow kRows[] = {
    row(36, Width::U16, outside(4096, kU16Max, 32767), kSame),
    row(44, Width::U16, outside(1, 256, 8), nonzeroTo(3)),
    row(62, Width::U16, outside(1, 6, 2), kClear),
    row(64, Width::U32, outside(250, kI32Max, 0), kClear),
    row(68, Width::U32, outside(8, 16384, 1024), kClear),
    row(72, Width::U32, outside(8, 16384, 1024), kClear),
    row(1074, Width::U16, outside(1, 60000, 66), kClear),
    row(1106, Width::U16, outside(1, 60000, 180), kClear),
    row(1936, Width::I32, outside(10, 256, 20), kClear),
    row(1932, Width::I32, outside(4, 1000, 256), kClear),
    row(88, Width::U32, outside(1, 524288, 15), kClear),
    row(1948, Width::U32, outsideFrom(1, 524288, 88), kKeep),
    row(96, Width::U16, outside(0, 1, 1), kClear),
    row(98, Width::I16, outside(0, 6, -1), kClear),
    row(812, Width::I32, outside(2, 524288, 1000), kClear),
    row(796, Width::U16, outside(16, 60000, 128), kSame),
    row(798, Width::U16, outside(0, 127, 64), always(64)),
    row(794, Width::U16, outside(0, 1, 1), kSame),
    row(1034, Width::U16, outside(0, 4, 3), kSame),
    row(808, Width::F32, outside(1e-10, 1.0, 4e-5), kClear),
    row(800, Width::U32, outside(32, 112000, 32), kClear),
    row(804, Width::I32, outsideKeepUnset(32, 112000, 20000), kClear),
    row(1038, Width::U16, outside(8, 1000, 16), kClear),
    row(816, Width::U16, outside(100, 32768, 16000), kClear),
    row(1930, Width::U16, outside(0, 12, 0), kSame),
    row(1940, Width::U16, unlessOneAt(1930, 1), kClear),
    row(24, Width::I32, outsideKeepUnset(1, 32767, -1), kClear),
    row(38, Width::I16, outside(0, 1, 0), kClear),
    row(76, Width::U32, always(0), kSame),
    row(80, Width::U32, always(0), kSame),
    row(3088, Width::I32, outside(0, 64000, 100), kClear),
    row(3080, Width::U32, outside(0, 64000, 0), kClear),
    row(3084, Width::I32, outside(0, 64000, 200), kClear),
    row(92, Width::I32, outsideKeepUnset(0, 64000, -1), kClear),
    row(3456, Width::I32, outside(1, 8, 1), kClear),
    row(10908, Width::I32, outside(1, 8, 1), kClear),
    row(3092, Width::U32, outside(895, 524288, 1024), kClear),
    row(3460, Width::U32, outside(128, 524288, 256), kClear),
    row(3096, Width::U32, outside(128, 524288, 256), kClear),
    row(3100, Width::I32, outsideKeepUnset(128, 524288, -1), kClear),
    row(3104, Width::I32, outsideKeepUnset(128, 524288, -1), kClear),
    row4(3112, Width::U16, outside(0, 100, 10), kClear, kClear),
    row4(3114, Width::U16, outside(0, 100, 5), kClear, kClear),
    row4(3116, Width::U16, outside(1, 1440, 60), kClear, kClear),
    row(3118, Width::U16, outside(1, 1440, 10), kClear),
    row4(3120, Width::F32, outside(0.1, 100000, 1.25), kClear, kClear),
    row(3124, Width::I32, outside(0, 524288, 2048), kSame),
    row(32, Width::I32, outside(0, 65000, 0), kClear),
    row(46, Width::U16, outside(0, 1, 1), kSame),
    row(1944, Width::I32, outside(0, 64000, 0), kClear),
    row(50, Width::I16, outside(0, 1, 0), kClear),
    row(1126, Width::I16, outside(0, 1, 0), kClear),
    row(86, Width::I16, outside(0, 1, 0), kSame),
    row4(3464, Width::I32, outsideKeepUnset(0, 32767, 0), kClear, kClear),
};

double readValue(const unsigned char *image, uint16_t offset, Width width) {
  switch (width) {
  case Width::U16:
    return get16(image, offset);
  case Width::I16:
    return static_cast<int16_t>(get16(image, offset));
  case Width::U32:
    return get32(image, offset);
  case Width::I32:
    return static_cast<int32_t>(get32(image, offset));
  case Width::F32:
    return std::bit_cast<float>(get32(image, offset));
  }
  return 0;
}

void writeValue(unsigned char *image, uint16_t offset, Width width, double value) {
  if (width == Width::F32)
    put32(image, offset, std::bit_cast<uint32_t>(static_cast<float>(value)));
  else if (width == Width::U16 || width == Width::I16)
    put16(image, offset, static_cast<uint16_t>(static_cast<int64_t>(value)));
  else
    put32(image, offset, static_cast<uint32_t>(static_cast<int64_t>(value)));
}

// Written so that a value that is not a number (a damaged float) is outside too.
bool isOutside(const Rule &rule, double value) {
  return !(value >= rule.low && value <= rule.high);
}

// Applies the rule to *value; true when it gives a new value to write back (a
// kept value is never rewritten, so a float keeps its exact bits).
bool applyRule(const unsigned char *image, const RangeRow &row, const Rule &rule, double *value) {
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
    replacement = readValue(image, rule.other, row.width);
    break;
  case Check::Always:
    replace = true;
    break;
  case Check::NonzeroTo:
    replace = *value != 0;
    break;
  case Check::UnlessRef1:
    replace = readValue(image, rule.other, Width::U16) != 1;
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
    double value = readValue(target, row.offset, row.width);
    if (applyRule(target, row, rule, &value))
      writeValue(target, row.offset, row.width, value);
  }
}

} // namespace kxldbm
