// The range check, row by row: a value in range stays, a value below or above
// it is replaced, and a type-2 target gets its own value.
#include "NT/dbmcfg_internal.h"
#include "tests/dbmcfg/cfgimage.h"

#include <cmath>
#include <limits>

namespace dbmtest {
namespace {

enum W { U16, I16, U32, I32, F32 };

constexpr double kNone = std::numeric_limits<double>::quiet_NaN();

struct Row {
  uint32_t offset;
  W width;
  double good;  // stays for every server node type
  double below; // out of range (kNone: no such side)
  double above;
  double fix;   // what an out-of-range value becomes
  double type2; // what `good` becomes in a type-2 target (kNone: the same rule)
};

// Worked out from the rules by hand. Rows that read another field see an image
// that is otherwise zero: 88 becomes 15, 1930 stays 0.
const Row kRows[] = {
    {36, U16, 5000, 100, kNone, 32767, kNone},
    {44, U16, 10, 0, 300, 8, 3},
    {62, U16, 3, 0, 7, 2, 0},
    {64, U32, 300, 100, 2147483648.0, 0, 0},
    {68, U32, 500, 7, 16385, 1024, 0},
    {72, U32, 500, 7, 16385, 1024, 0},
    {1074, U16, 100, 0, 60001, 66, 0},
    {1106, U16, 200, 0, 60001, 180, 0},
    {1936, I32, 30, -5, 257, 20, 0},
    {1932, I32, 500, 3, 1001, 256, 0},
    {88, U32, 1000, 0, 524289, 15, 0},
    {1948, U32, 2000, 0, 524289, 15, 2000},
    {96, U16, 0, kNone, 2, 1, 0},
    {98, I16, 3, -2, 7, -1, 0},
    {812, I32, 5, 1, 524289, 1000, 0},
    {796, U16, 100, 15, 60001, 128, kNone},
    {798, U16, 100, kNone, 128, 64, 64},
    {794, U16, 0, kNone, 2, 1, kNone},
    {1034, U16, 4, kNone, 5, 3, kNone},
    {808, F32, 0.5, 1e-11, 1.5, 4e-5, 0},
    {800, U32, 64, 31, 112001, 32, 0},
    {804, I32, -1, 31, 112001, 20000, 0},
    {1038, U16, 20, 7, 1001, 16, 0},
    {816, U16, 1000, 99, 32769, 16000, 0},
    {1930, U16, 12, kNone, 13, 0, kNone},
    {24, I32, -1, 0, 32768, -1, 0},
    {38, I16, 1, -1, 2, 0, 0},
    {3088, I32, 50, -2, 64001, 100, 0},
    {3080, U32, 10, kNone, 64001, 0, 0},
    {3084, I32, 300, -1, 64001, 200, 0},
    {92, I32, -1, -2, 64001, -1, 0},
    {3456, I32, 8, 0, 9, 1, 0},
    {10908, I32, 1, 0, 9, 1, 0},
    {3092, U32, 895, 894, 524289, 1024, 0},
    {3460, U32, 128, 127, 524289, 256, 0},
    {3096, U32, 524288, 127, 524289, 256, 0},
    {3100, I32, -1, 127, 524289, -1, 0},
    {3104, I32, 200, 127, 524289, -1, 0},
    {3118, U16, 1440, 0, 1441, 10, 0},
    {3124, I32, 0, -1, 524289, 2048, kNone},
    {32, I32, 65000, -1, 65001, 0, 0},
    {46, U16, 0, kNone, 2, 1, kNone},
    {1944, I32, 64000, -1, 64001, 0, 0},
    {50, I16, 1, -1, 2, 0, 0},
    {1126, I16, 0, -1, 2, 0, 0},
    {86, I16, 1, -1, 2, 0, kNone},
};

// Rows whose rule holds for node type 4 only; types 1, 3 and 5 get 0.
const Row kType4Rows[] = {
    {3112, U16, 100, kNone, 101, 10, 0},    {3114, U16, 0, kNone, 101, 5, 0}, {3116, U16, 1, 0, 1441, 60, 0},
    {3120, F32, 50, 0.05, 100001, 1.25, 0}, {3464, I32, -1, -2, 32768, 0, 0},
};

// The row's field set to `value` in an otherwise empty image of `type`, read
// back after the range check.
double checked(uint16_t type, const Row &row, double value) {
  Cfg cfg(type, 0x0D00);
  if (row.width == F32)
    cfg.f32(row.offset, float(value));
  else if (row.width == U16 || row.width == I16)
    cfg.u16(row.offset, uint16_t(int64_t(value)));
  else
    cfg.u32(row.offset, uint32_t(int64_t(value)));
  Bytes image = cfg.sealed();
  kxldbm::rangeCheck(image.data());
  switch (row.width) {
  case U16:
    return r16(image, row.offset);
  case I16:
    return int16_t(r16(image, row.offset));
  case U32:
    return r32(image, row.offset);
  case I32:
    return int32_t(r32(image, row.offset));
  case F32:
    return rf32(image, row.offset);
  }
  return 0;
}

void expectValue(double expected, double actual, const char *what, const Row &row, uint16_t type) {
  if (expected == 0 || std::fabs(expected) >= 1)
    EXPECT_EQ(expected, actual) << what << " at " << row.offset << ", node type " << type;
  else
    EXPECT_FLOAT_EQ(float(expected), float(actual)) << what << " at " << row.offset << ", node type " << type;
}

void expectRow(const Row &row, uint16_t type) {
  expectValue(row.good, checked(type, row, row.good), "in range", row, type);
  for (double outside : {row.below, row.above})
    if (!std::isnan(outside))
      expectValue(row.fix, checked(type, row, outside), "outside", row, type);
}

// A type-2 target gets its own value where the row gives one; the type-4
// rows are cleared for every other type. 1948 is left as it is in a type-2
// target, and 44 is 3 there only when it was set.
TEST(RangeCheckTest, EveryRowForEveryNodeType) {
  for (uint16_t type : {1, 2, 3, 4, 5}) {
    for (const Row &row : kRows) {
      if (type == 2 && !std::isnan(row.type2))
        expectValue(row.type2, checked(2, row, row.good), "type 2", row, 2);
      else
        expectRow(row, type);
    }
    for (const Row &row : kType4Rows) {
      if (type == 4)
        expectRow(row, 4);
      else
        expectValue(0, checked(type, row, row.good), "cleared", row, type);
    }
  }
  EXPECT_EQ(0, checked(2, Row{1948, U32, 0, kNone, kNone, 0, 0}, 0));
  EXPECT_EQ(0, checked(2, Row{44, U16, 0, kNone, kNone, 0, 0}, 0));
}

// 1940 is left when 1930 is 1 and 1948 takes the value at 88; a value at 808
// that is not a number becomes the floor.
TEST(RangeCheckTest, RowsThatDependOnOtherFields) {
  const std::pair<Cfg, const char *> rows[] = {
      {Cfg(4, 0x0D00).u16(1930, 1).u16(1940, 0).u32(88, 700).u32(1948, 0).u32(76, 9),
       "h1940=0 w1948=700 w76=0"},
      {Cfg(1, 0x0D00).u16(1930, 4).u16(1940, 0).u32(80, 9), "h1940=1 w80=0"},
      {Cfg(2, 0x0D00).u16(1930, 1).u16(1940, 1).u32(76, 9), "h1940=0 w76=0"},
      {Cfg(4, 0x0D00).u32(808, 0x7FC00000), "w808=942130604"} // 0x3827C5AC,
  };
  for (const auto &[cfg, wanted] : rows) {
    Bytes image = cfg.sealed();
    kxldbm::rangeCheck(image.data());
    EXPECT_EQ(wanted, fieldsAt(image, wanted));
  }
}

} // namespace
} // namespace dbmtest
