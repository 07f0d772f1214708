// The converters, checked against values worked out by hand from the rules;
// and refused files and failing streams, which leave both files as they were.
#include "tests/dbmcfg/cfgimage.h"

namespace dbmtest {
namespace {

class ConvertTest : public DbmWorld {
protected:
  // Converts and compares the target's fields named by `wanted` (see fieldsAt).
  static void expectConverted(const Bytes &target, const Bytes &source, const std::string &wanted,
                              Bytes *result = nullptr) {
    Bytes out;
    ASSERT_EQ(0, convert(target, source, &out));
    EXPECT_EQ(wanted, fieldsAt(out, wanted));
    if (result != nullptr)
      *result = out;
  }
};

// A target of node type 4 whose server values the range check accepts.
Cfg serverTarget(uint16_t release = 0x0D00) {
  Cfg cfg(4, release);
  cfg.u16(44, 16).u16(62, 2).u32(64, 300).u32(68, 64).u32(72, 64).u16(1074, 80).u16(1106, 180);
  cfg.u32(1936, 20).u32(1932, 256).u32(88, 15).u32(1948, 15).u16(98, 1).u32(812, 1000).u16(796, 128);
  cfg.f32(808, 0.25f).u32(800, 32).u32(804, 20000).u16(1038, 16).u16(816, 16000).u32(24, 5);
  cfg.u32(3088, 100).u32(3084, 200).u32(3456, 1).u32(10908, 1).u32(3092, 1024).u32(3460, 256);
  cfg.u32(3096, 300).u32(3100, 200).u32(3104, 200).u16(3112, 7).u16(3114, 5).u16(3116, 60);
  cfg.u16(3118, 9).f32(3120, 1.25f).u16(48, 2);
  return cfg;
}

// A server source with a distinct in-range value in every server field.
Cfg serverSource(uint16_t type, uint16_t release) {
  Cfg cfg(type, release);
  cfg.u16(44, 20).u16(62, 3).u16(98, 2).u32(88, 500).text(180, "BLOCK180").u32(68, 100).u32(72, 200);
  cfg.f32(808, 0.5f).u32(812, 50).u16(798, 10).u16(1074, 10).u16(1106, 300).u16(1038, 20);
  cfg.u16(816, 1000).u32(800, 64).u32(804, 0xFFFFFFFF).u64(1968, 5).byte(1976, 1).u32(1932, 100);
  cfg.u32(1936, 30).u32(64, 300).u32(3088, 0xFFFFFFFF).u32(92, 7).u32(3456, 3).u16(96, 1);
  cfg.text(100, "REMOTE").u32(3096, 1000).u32(3100, 3000).u32(3104, 2000).u32(3092, 8000);
  cfg.u32(3084, 0xFFFFFFFF).u32(24, 10).u32(3080, 40).u16(38, 1).text(1977, "BIG").u32(32, 5);
  cfg.u32(1944, 6).u32(3108, 77).u16(84, 9).u16(1126, 1).u32(76, 1000).u32(80, 9).u16(48, 3);
  cfg.text(696, "A696").text(1108, "B11").text(745, "C745").text(115, "D115").u16(3112, 20);
  cfg.u16(3114, 30).u16(3116, 40).u16(3118, 50).f32(3120, 2.5f).u32(3460, 4000).u32(10908, 5);
  return cfg;
}

// Partition table: 0 and 1 on hostA, 2 on hostB.
Bytes partitionTable() {
  const char *hosts[] = {"hostA", "hostA", "hostB"};
  Bytes table(24 + 4 * 3);
  for (int node = 0; node < 3; ++node) {
    Bytes entry(32, 0);
    entry[0] = uint8_t(entry.size());
    entry[2] = uint8_t(node);
    std::memcpy(entry.data() + 22, hosts[node], 6);
    uint32_t at = uint32_t(table.size());
    std::memcpy(table.data() + 24 + 4 * node, &at, 4);
    table.insert(table.end(), entry.begin(), entry.end());
  }
  uint32_t header[] = {uint32_t(table.size()), 3, 3, 36};
  std::memcpy(table.data(), "SQLONODE", 8);
  std::memcpy(table.data() + 8, header, sizeof header);
  return table;
}

// Flag area index of a parameter token as the platform gives it.
int32_t flagIndexOf(uint32_t token) {
  SQLF_PARAM_INFO info{};
  int32_t index = -1;
  EXPECT_EQ(0, sqlf_get_param_info(token, 0, &info, &index));
  return index;
}

// Names lose trailing blanks (458); an unset name keeps the target's (2625);
// a blank string keeps its first character (2754); "0" marks the source's
// block unset (1076); mode 5 becomes 4 (1930) with the switch at 86 going to
// 3434; an unterminated string stays in its field (6540); the server value at
// 44 is not the general converter's.
TEST_F(ConvertTest, GeneralConverterCarriesNamesStringsAndMappedMode) {
  Cfg source(2, 0x0D00);
  source.u16(36, 5000).u16(794, 1).u16(796, 200).u16(1034, 2).text(3392, "CFGX").text(458, "SRVNAME   ");
  source.text(2754, "    ").text(396, "DESC").text(1076, "0123").text(1096, "NINE").text(9370, "LAST");
  source.text(52, "NODEBLK").u16(22, 7).text(422, "IDENT").u16(46, 1).u16(86, 1).u16(50, 1).u16(84, 9);
  source.u32(3124, 4096).u16(1930, 5).u16(3432, 7).u16(3416, 11).u64(3424, 0x1122334455667788ull);
  source.u32(3436, 99).text(2883, "EXTRA").text(2204, "S2204").text(2336, "LONGSTR").u16(3388, 3);
  source.u16(3390, 4).u32(3464, 5).text(1128, "PATH1128").text(3468, "S3468");
  source.text(6540, std::string(15, 'A')).text(6555, "Z").u64(9120, 42).u16(1942, 6).u16(44, 100);
  Cfg target = serverTarget();
  target.text(2625, "TGTNAME").text(1076, "TGTCODE").text(818, "T818");
  Bytes out;
  expectConverted(
      target.sealed(), source.sealed(),
      "h36=5000 h794=1 h796=200 h1034=2 h22=7 h84=9 h1930=4 h3434=1 h3432=7 h3416=11 h3388=3 h1942=6 "
      "h44=16 w3124=4096 w3436=99 w3464=5 t3392=CFGX t458=SRVNAME t2625=TGTNAME t2754=_ t396=DESC "
      "t1076=TGTCODE t1096=NINE t818=T818 t9370=LAST t52=NODEBLK t422=IDENT t2883=EXTRA t2204=S2204 "
      "t2336=LONGSTR t1128=PATH1128 t3468=S3468 t6540=AAAAAAAAAAAAAA t6555=Z",
      &out);
  ASSERT_EQ(kFull, out.size());
  EXPECT_EQ(r32(out, 0), byteSum(out));
  EXPECT_EQ(0x1122334455667788ull, r64(out, 3424));
  EXPECT_EQ(42u, r64(out, 9120));
}

// Below level 8102 the value at 3436 is not carried, release 0x0A00 has none
// at 3464, mode 2 becomes 0; nothing goes into a type-5 target at 52.
TEST_F(ConvertTest, GeneralConverterOlderLevelsAndReleases) {
  Cfg source(2, 0x0A00, 7900);
  source.text(679, "OLDNAME1").text(1040, "ABCDEFGH").u32(3436, 99).u32(3464, 5).text(1128, "X");
  source.text(52, "NODEBLK").u16(1930, 2).u16(86, 0).u16(3434, 8);
  Cfg target(4, 0x0D00);
  target.text(2754, "KEEP").u32(3436, 5).text(466, "ZZ").u32(3464, 9);
  expectConverted(target.sealed(), source.sealed(),
                  "h1930=0 h3432=1 h3434=8 w3436=5 w3464=9 t458=OLDNAME1 t679=OLDNAME1 t2625=ABCDEFGH "
                  "t1040=ABCDEFGH t2754=KEEP t1128= t52=NODEBLK");
  Cfg plugin(2, 0x0B00, 8150);
  plugin.text(3440, "PLUGNAMEX").u32(3436, 99).text(2204, "NO").u32(3464, 77);
  expectConverted(Cfg(4, 0x0D00).text(2891, "Q").sealed(), plugin.sealed(),
                  "w3436=99 w3464=77 t2883=PLUGNAME t2204=");
  expectConverted(Cfg(5, 0x0D00).text(52, "MINE").sealed(), source.sealed(), "t52=MINE");
}

// 1074 is raised to 66; 3088 unset becomes half the source's value at 76;
// 3460 the largest of the three pools; 3092 is 8000 over the 2 partitions on
// hostA plus 2; 3084 is 1000 - 40; 10908 comes from 3456 before 0x0D00.
TEST_F(ConvertTest, SameTypeMergeOfAnOldPartitionedSource) {
  Bytes table = partitionTable();
  sqlz_krcbp->partitionTable = reinterpret_cast<const SQLO_NODELIST *>(table.data());
  sqlz_krcbp->currentPartition = 0;
  sqlz_krcbp->partitionFlag = 1;
  Bytes out;
  expectConverted(
      serverTarget().sealed(), serverSource(4, 0x0A00).sealed(),
      "h44=20 h62=3 h98=2 h798=10 h1074=66 h1126=0 h48=3 h3112=20 h3118=50 w88=500 w1948=500 w68=100 "
      "w804=4294967295 w3088=500 w3460=3000 w3096=256 w3100=4294967295 w3104=4294967295 w3092=2000 "
      "w3084=960 w3108=77 w76=0 w80=0 w10908=3 t180=BLOCK180 t100=REMOTE t1977=BIG t745=C745 t115=D115",
      &out);
  EXPECT_EQ(0.5f, rf32(out, 808));
  EXPECT_EQ(2.5f, rf32(out, 3120));
  EXPECT_EQ(5u, r64(out, 1968));
  EXPECT_EQ(Bytes({1, 1, 1}),
            Bytes({out[1976], out[kFlags + flagIndexOf(803)], out[kFlags + flagIndexOf(79)]}));
}

// A flag index the platform cannot give for another reason than an unknown
// parameter is never taken for "no flag": the conversion fails, the target
// stays as it was.
TEST_F(ConvertTest, ParameterLookupThatFailsFailsTheConversion) {
  Bytes target = serverTarget().sealed();
  Bytes out;
  for (const char *fault : {"sqlf_get_param_info:1", "sqlf_get_param_info:2"}) {
    EXPECT_EQ(SQLO_RC_SYSTEM_ERROR, convert(target, serverSource(4, 0x0A00).sealed(), &out, fault)) << fault;
    EXPECT_EQ(target, out) << fault;
  }
}

// 8000 over (2 + 1) with one extra agent; a divisor of 0, or no entry for the
// current partition, divides nothing; without a table 100 is raised to 895.
TEST_F(ConvertTest, PartitionDivisorCases) {
  Bytes table = partitionTable();
  sqlz_krcbp->partitionTable = reinterpret_cast<const SQLO_NODELIST *>(table.data());
  const Bytes source = serverSource(4, 0x0A00).sealed();
  ASSERT_EQ(0, sqloPutEnv(KXL_VAR_KXLEXTRAAGENTS, "1"));
  expectConverted(serverTarget().sealed(), source, "w3092=2666");
  ASSERT_EQ(0, sqloPutEnv(KXL_VAR_KXLEXTRAAGENTS, "-2"));
  expectConverted(serverTarget().sealed(), source, "w3092=8000");
  ASSERT_EQ(0, sqloPutEnv(KXL_VAR_KXLEXTRAAGENTS, nullptr));
  sqlz_krcbp->currentPartition = 7;
  expectConverted(serverTarget().sealed(), source, "w3092=8000");
  sqlz_krcbp->partitionTable = nullptr;
  expectConverted(serverTarget().sealed(), serverSource(4, 0x0A00).u32(3092, 100).sealed(), "w3092=895");
}

// The whole flag area is the source's; 3096 stays the target's own; 3084 is
// copied unset, then out of range.
TEST_F(ConvertTest, SameTypeMergeOfACurrentSource) {
  Cfg source = serverSource(4, 0x0D00);
  source.byte(kFlags + 5, 7).byte(kFlags + 300, 9).u32(3092, 5000);
  Bytes out;
  expectConverted(serverTarget().byte(kFlags + 6, 1).sealed(), source.sealed(),
                  "w3460=4000 w3092=5000 w3096=300 w10908=5 w3084=200 w3088=100", &out);
  EXPECT_EQ(Bytes({7, 9, 0}), Bytes({out[kFlags + 5], out[kFlags + 300], out[kFlags + 6]}));
}

// Type 1 keeps only 3118 of the tuning fields and takes 3084 without 3080 when
// 38 is 0, and release 0x0B00 copies the pool; type 3 from a type-3 source has
// a floor of 46 and no tuning fields, from a type-1 source the floor stays 66;
// type 5 leaves the remote settings the target's.
TEST_F(ConvertTest, ServerConvertersDifferWhereTheirTableSays) {
  const Bytes target = serverTarget().sealed();
  expectConverted(target, serverSource(1, 0x0B00).u16(38, 0).u32(3092, 900).sealed(),
                  "h1074=66 h3112=7 h3118=50 h48=3 w3084=1000 w3092=900 w3460=4000");
  expectConverted(target, serverSource(3, 0x0B00).sealed(), "h1074=46 h3118=9 w3084=960 t696=A696");
  expectConverted(Cfg(3, 0x0D00).sealed(), serverSource(1, 0x0B00).sealed(), "h1074=66");
  expectConverted(target, serverSource(5, 0x0B00).sealed(), "h1074=66 h48=2 h3118=9 t696=");
}

TEST_F(ConvertTest, BlockAt3128OnlyBetweenFilesOfOneRelease) {
  expectConverted(Cfg(2, 0x0D05).sealed(), Cfg(2, 0x0D00).text(3128, "CARRY").sealed(), "t3128=CARRY");
  expectConverted(Cfg(2, 0x0D00).sealed(), Cfg(2, 0x0C00).text(3128, "CARRY").sealed(), "t3128=");
}

// The small flag area moves to the end of the current layout, and a small
// target is rewritten in the current layout.
TEST_F(ConvertTest, SmallLayoutBothWays) {
  Cfg small(4, 0x0C00, 8200, kSmall);
  small.u16(36, 5000).byte(3584 + 7, 5).byte(4095, 6);
  Bytes out;
  expectConverted(serverTarget().sealed(), small.sealed(), "h36=5000", &out);
  EXPECT_EQ(Bytes({5, 6}), Bytes({out[kFlags + 7], out[kFull - 1]}));

  Cfg smallTarget(2, 0x0B00, 8200, kSmall);
  smallTarget.byte(3584 + 9, 4).text(396, "OWN");
  expectConverted(smallTarget.sealed(), Cfg(2, 0x0D00).u16(36, 4500).sealed(), "h36=4500 t396=OWN", &out);
  ASSERT_EQ(kFull, out.size());
  EXPECT_EQ(r32(out, 0), byteSum(out));
  EXPECT_EQ(4, out[kFlags + 9]);
}

Bytes good(uint16_t type = 2) {
  return Cfg(type, 0x0D00).u16(36, 5000).sealed();
}

Bytes flipped(Bytes image, size_t at) {
  image[at] ^= 1;
  return image;
}

TEST_F(ConvertTest, MissingFilesAreRefused) {
  writeFile(kTarget, good());
  EXPECT_EQ(-100, upgradeDbmConfig(kTarget, "C:\\dbm\\saved\\none"));
  EXPECT_EQ(-100, upgradeDbmConfig("C:\\dbm\\new\\none", kTarget));
  EXPECT_EQ(-100, upgradeDbmConfig(nullptr, kTarget));
  expectConverted(good(), Cfg(2, 0x0D05).sealed(), ""); // only bits 8-11 of the release count
}

// The source's first read takes two calls of sqloread (data, end of file), the
// third is the second read of a small file. sqloopenp and sqloclose are called
// for source, target and rewrite; a small target is read twice, so its rewrite
// is the fourth close, and the restored file is short again.
TEST_F(ConvertTest, RefusedFilesAndFailingStreamsLeaveBothFiles) {
  const Bytes small = Cfg(2, 0x0C00, 8200, kSmall).u16(36, 5000).sealed();
  const Bytes wrongLength = Cfg(2, 0x0D00, 8200, 8192).sealed();
  const struct {
    Bytes target, source;
    const char *faults;
    int32_t rc;
  } rows[] = {
      {good(), wrongLength, nullptr, -100},
      {wrongLength, good(), nullptr, -100},
      {good(), Bytes(), nullptr, -100},
      {good(), Cfg(2, 0x0E05).sealed(), nullptr, -101},
      {Cfg(2, 0x0900).sealed(), good(), nullptr, -101},
      {good(), Cfg(2, 0x0E00, 8200, kSmall).sealed(), nullptr, -101},
      {good(), flipped(good(), 5000), nullptr, -102},
      {flipped(good(), 5000), good(), nullptr, -102},
      {good(), flipped(small, 4000), nullptr, -5050},
      {flipped(small, 4000), good(), nullptr, -5050},
      {good(), small, "sqloread:3", -5005},
      {good(), good(), "sqloopenp:3", -100},
      {good(), good(), "sqlowrite:1", -100},
      {good(), good(), "sqloclose:3", -100},
      {Cfg(2, 0x0B00, 8200, kSmall).sealed(), good(), "sqloclose:4", -100},
      {good(), good(), "sqloopenp:2", -100},
  };
  for (size_t i = 0; i < std::size(rows); ++i) {
    Bytes out;
    EXPECT_EQ(rows[i].rc, convert(rows[i].target, rows[i].source, &out, rows[i].faults)) << "row " << i;
    EXPECT_EQ(rows[i].target, out) << "row " << i;
  }
  for (const auto &[target, source] : {std::pair<uint16_t, uint16_t>{1, 4},
                                       {2, 4},
                                       {3, 4},
                                       {5, 4},
                                       {0, 1},
                                       {6, 1},
                                       {1, 0},
                                       {4, 6},
                                       {9, 9}}) {
    Bytes out;
    EXPECT_EQ(-5065, convert(good(target), good(source), &out)) << target << " from " << source;
    EXPECT_EQ(good(target), out);
  }
}

} // namespace
} // namespace dbmtest
