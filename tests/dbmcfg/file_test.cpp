// Refused files and failing streams: the result code, and both files exactly
// as they were.
#include "NT/dbmcfg.h"
#include "tests/dbmcfg/cfgimage.h"

namespace dbmtest {
namespace {

class RefusalTest : public DbmWorld {
protected:
  // Converts and checks that neither file changed; gives the result.
  int32_t refuse(const Bytes &target, const Bytes &source, const char *faults = nullptr) {
    put(kTarget, target);
    put(kSource, source);
    if (faults != nullptr)
      failCalls(faults);
    int32_t rc = upgradeDbmConfig(kTarget, kSource);
    failCalls("");
    EXPECT_EQ(target, get(kTarget)) << "target changed, result " << rc;
    EXPECT_EQ(source, get(kSource)) << "source changed, result " << rc;
    return rc;
  }
};

Bytes good(uint16_t type = 2) {
  return Cfg(type, 0x0D00).u16(36, 5000).sealed();
}

TEST_F(RefusalTest, MissingFilesAndWrongLengths) {
  put(kTarget, good());
  EXPECT_EQ(-100, upgradeDbmConfig(kTarget, "C:\\dbm\\saved\\none"));
  EXPECT_EQ(-100, upgradeDbmConfig("C:\\dbm\\new\\none", kTarget));
  EXPECT_EQ(-100, upgradeDbmConfig(nullptr, kTarget));
  EXPECT_EQ(-100, refuse(good(), Cfg(2, 0x0D00, 8200, 8192).sealed()));
  EXPECT_EQ(-100, refuse(Cfg(2, 0x0D00, 8200, 8192).sealed(), good()));
  EXPECT_EQ(-100, refuse(good(), Bytes()));
}

TEST_F(RefusalTest, ReleaseCodes) {
  EXPECT_EQ(-101, refuse(good(), Cfg(2, 0x0E05).sealed()));
  EXPECT_EQ(-101, refuse(Cfg(2, 0x0900).sealed(), good()));
  EXPECT_EQ(-101, refuse(good(), Cfg(2, 0x0E00, 8200, kSmall).sealed()));
  Bytes out;
  EXPECT_EQ(0, convert(good(), Cfg(2, 0x0D05).sealed(), &out)) << "only bits 8-11 count";
}

TEST_F(RefusalTest, DamagedFiles) {
  Bytes damaged = good();
  damaged[5000] ^= 1;
  EXPECT_EQ(-102, refuse(good(), damaged));
  EXPECT_EQ(-102, refuse(damaged, good()));
  Bytes small = Cfg(2, 0x0C00, 8200, kSmall).u16(36, 5000).sealed();
  Bytes smallDamaged = small;
  smallDamaged[4000] ^= 1;
  EXPECT_EQ(-5050, refuse(good(), smallDamaged));
  EXPECT_EQ(-5050, refuse(smallDamaged, good()));
  // The source's first read takes two calls (data, end of file); the third is
  // the second read of the small file.
  EXPECT_EQ(-5005, refuse(good(), small, "sqloread:3"));
}

TEST_F(RefusalTest, UnsupportedNodeTypePairs) {
  const uint16_t pairs[][2] = {{1, 4}, {2, 4}, {3, 4}, {5, 4}, {0, 1}, {6, 1}, {1, 0}, {4, 6}, {9, 9}};
  for (const auto &pair : pairs)
    EXPECT_EQ(-5065, refuse(good(pair[0]), good(pair[1]))) << pair[0] << " from " << pair[1];
}

TEST_F(RefusalTest, FailingTargetStreamPutsTheFileBack) {
  // Calls to sqloopenp: source, target, rewrite; to sqloclose the same.
  EXPECT_EQ(-100, refuse(good(), good(), "sqloopenp:3"));
  EXPECT_EQ(-100, refuse(good(), good(), "sqlowrite:1"));
  EXPECT_EQ(-100, refuse(good(), good(), "sqloclose:3"));
  // A small target is read twice, so its rewrite is the fourth close; the
  // restored file is short again.
  EXPECT_EQ(-100, refuse(Cfg(2, 0x0B00, 8200, kSmall).sealed(), good(), "sqloclose:4"));
  EXPECT_EQ(-100, refuse(good(), good(), "sqloopenp:2"));
}

} // namespace
} // namespace dbmtest
