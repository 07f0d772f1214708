// The converters, checked against values worked out by hand from the rules.
#include "tests/dbmcfg/cfgimage.h"

#include <cstring>

namespace dbmtest {
namespace {

using ConvertTest = DbmWorld;

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
  ASSERT_EQ(0, convert(target.sealed(), source.sealed(), &out));
  ASSERT_EQ(kFull, out.size());
  EXPECT_EQ(r32(out, 0), byteSum(out));
  EXPECT_EQ(5000, r16(out, 36));
  EXPECT_EQ(1, r16(out, 794));
  EXPECT_EQ(200, r16(out, 796));
  EXPECT_EQ(2, r16(out, 1034));
  EXPECT_EQ("CFGX", rtext(out, 3392));
  EXPECT_EQ("SRVNAME", rtext(out, 458)) << "trailing blanks removed";
  EXPECT_EQ("TGTNAME", rtext(out, 2625)) << "an unset name keeps the target's";
  EXPECT_EQ(" ", rtext(out, 2754)) << "the first character stays";
  EXPECT_EQ("DESC", rtext(out, 396));
  EXPECT_EQ("TGTCODE", rtext(out, 1076)) << "\"0\" marks the source's block unset";
  EXPECT_EQ("NINE", rtext(out, 1096));
  EXPECT_EQ("T818", rtext(out, 818));
  EXPECT_EQ("LAST", rtext(out, 9370));
  EXPECT_EQ("NODEBLK", rtext(out, 52));
  EXPECT_EQ(7, r16(out, 22));
  EXPECT_EQ("IDENT", rtext(out, 422));
  EXPECT_EQ(9, r16(out, 84));
  EXPECT_EQ(4096u, r32(out, 3124));
  EXPECT_EQ(4, r16(out, 1930)) << "mode 5 becomes 4";
  EXPECT_EQ(1, r16(out, 3434)) << "switch at 86 with mode 5";
  EXPECT_EQ(7, r16(out, 3432));
  EXPECT_EQ(11, r16(out, 3416));
  EXPECT_EQ(0x1122334455667788ull, r64(out, 3424));
  EXPECT_EQ(99u, r32(out, 3436));
  EXPECT_EQ("EXTRA", rtext(out, 2883));
  EXPECT_EQ("S2204", rtext(out, 2204));
  EXPECT_EQ("LONGSTR", rtext(out, 2336));
  EXPECT_EQ(3, r16(out, 3388));
  EXPECT_EQ(5u, r32(out, 3464));
  EXPECT_EQ("PATH1128", rtext(out, 1128));
  EXPECT_EQ("S3468", rtext(out, 3468));
  EXPECT_EQ(std::string(14, 'A'), rtext(out, 6540)) << "an unterminated string stays in its field";
  EXPECT_EQ("Z", rtext(out, 6555));
  EXPECT_EQ(42u, r64(out, 9120));
  EXPECT_EQ(6, r16(out, 1942));
  EXPECT_EQ(16, r16(out, 44)) << "server values are not the general converter's";
}

TEST_F(ConvertTest, GeneralConverterOlderLevelsAndReleases) {
  Cfg source(2, 0x0A00, 7900);
  source.text(679, "OLDNAME1").text(1040, "ABCDEFGH").u32(3436, 99).u32(3464, 5).text(1128, "X");
  source.text(52, "NODEBLK").u16(1930, 2).u16(86, 0).u16(3434, 8);
  Cfg target(4, 0x0D00);
  target.text(2754, "KEEP").u32(3436, 5).text(466, "ZZ").u32(3464, 9);
  Bytes out;
  ASSERT_EQ(0, convert(target.sealed(), source.sealed(), &out));
  EXPECT_EQ("OLDNAME1", rtext(out, 458));
  EXPECT_EQ("OLDNAME1", rtext(out, 679));
  EXPECT_EQ("ABCDEFGH", rtext(out, 2625));
  EXPECT_EQ("ABCDEFGH", rtext(out, 1040));
  EXPECT_EQ("KEEP", rtext(out, 2754));
  EXPECT_EQ(5u, r32(out, 3436)) << "level below 8102";
  EXPECT_EQ(9u, r32(out, 3464)) << "release 0x0A00 has no value at 3464";
  EXPECT_EQ("", rtext(out, 1128));
  EXPECT_EQ("NODEBLK", rtext(out, 52));
  EXPECT_EQ(0, r16(out, 1930)) << "mode 2 becomes 0";
  EXPECT_EQ(1, r16(out, 3432));
  EXPECT_EQ(8, r16(out, 3434));

  Cfg plugin(2, 0x0B00, 8150);
  plugin.text(3440, "PLUGNAMEX").u32(3436, 99).text(2204, "NO").u32(3464, 77);
  ASSERT_EQ(0, convert(Cfg(4, 0x0D00).text(2891, "Q").sealed(), plugin.sealed(), &out));
  EXPECT_EQ("PLUGNAME", rtext(out, 2883));
  EXPECT_EQ(99u, r32(out, 3436));
  EXPECT_EQ("", rtext(out, 2204));
  EXPECT_EQ(77u, r32(out, 3464));

  ASSERT_EQ(0, convert(Cfg(5, 0x0D00).text(52, "MINE").sealed(), source.sealed(), &out));
  EXPECT_EQ("MINE", rtext(out, 52)) << "not into a type-5 target";
}

TEST_F(ConvertTest, SameTypeMergeOfAnOldPartitionedSource) {
  Bytes table = partitionTable();
  sqlz_krcbp->partitionTable = reinterpret_cast<const SQLO_NODELIST *>(table.data());
  sqlz_krcbp->currentPartition = 0;
  sqlz_krcbp->partitionFlag = 1;
  Bytes out;
  ASSERT_EQ(0, convert(serverTarget().sealed(), serverSource(4, 0x0A00).sealed(), &out));
  EXPECT_EQ(20, r16(out, 44));
  EXPECT_EQ(3, r16(out, 62));
  EXPECT_EQ(2, r16(out, 98));
  EXPECT_EQ(500u, r32(out, 88));
  EXPECT_EQ(500u, r32(out, 1948));
  EXPECT_EQ("BLOCK180", rtext(out, 180));
  EXPECT_EQ(100u, r32(out, 68));
  EXPECT_EQ(0.5f, rf32(out, 808));
  EXPECT_EQ(10, r16(out, 798));
  EXPECT_EQ(66, r16(out, 1074)) << "raised to 66";
  EXPECT_EQ(0xFFFFFFFFu, r32(out, 804));
  EXPECT_EQ(5u, r64(out, 1968));
  EXPECT_EQ(1, out[1976]);
  EXPECT_EQ(500u, r32(out, 3088)) << "unset: half of the source's value at 76";
  EXPECT_EQ("REMOTE", rtext(out, 100));
  EXPECT_EQ(3000u, r32(out, 3460)) << "largest of the three pools";
  EXPECT_EQ(256u, r32(out, 3096));
  EXPECT_EQ(0xFFFFFFFFu, r32(out, 3100));
  EXPECT_EQ(0xFFFFFFFFu, r32(out, 3104));
  EXPECT_EQ(2000u, r32(out, 3092)) << "8000 over 2 partitions on hostA plus 2";
  EXPECT_EQ(960u, r32(out, 3084)) << "1000 - 40";
  EXPECT_EQ("BIG", rtext(out, 1977));
  EXPECT_EQ(77u, r32(out, 3108));
  EXPECT_EQ(0, r16(out, 1126));
  EXPECT_EQ(0u, r32(out, 76));
  EXPECT_EQ(0u, r32(out, 80));
  EXPECT_EQ(1, out[kFlags + flagIndexOf(803)]);
  EXPECT_EQ(1, out[kFlags + flagIndexOf(79)]);
  EXPECT_EQ(3u, r32(out, 10908)) << "from 3456 before release 0x0D00";
  EXPECT_EQ(3, r16(out, 48));
  EXPECT_EQ("C745", rtext(out, 745));
  EXPECT_EQ("D115", rtext(out, 115));
  EXPECT_EQ(20, r16(out, 3112));
  EXPECT_EQ(50, r16(out, 3118));
  EXPECT_EQ(2.5f, rf32(out, 3120));
}

// A flag index the platform cannot give for another reason than an unknown
// parameter is never taken for "no flag": the conversion fails, the target
// stays as it was.
TEST_F(ConvertTest, ParameterLookupThatFailsFailsTheConversion) {
  Bytes target = serverTarget().sealed();
  Bytes out;
  for (const char *fault : {"sqlf_get_param_info:1", "sqlf_get_param_info:2"}) {
    SCOPED_TRACE(fault);
    failCalls(fault);
    EXPECT_EQ(SQLO_RC_SYSTEM_ERROR, convert(target, serverSource(4, 0x0A00).sealed(), &out));
    failCalls("");
    EXPECT_EQ(target, out);
  }
}

TEST_F(ConvertTest, PartitionDivisorCases) {
  Bytes table = partitionTable();
  sqlz_krcbp->partitionTable = reinterpret_cast<const SQLO_NODELIST *>(table.data());
  Bytes source = serverSource(4, 0x0A00).sealed();
  Bytes out;
  ASSERT_EQ(0, sqloPutEnv(KXL_VAR_KXLEXTRAAGENTS, "1"));
  ASSERT_EQ(0, convert(serverTarget().sealed(), source, &out));
  EXPECT_EQ(2666u, r32(out, 3092)) << "8000 / (2 + 1)";
  ASSERT_EQ(0, sqloPutEnv(KXL_VAR_KXLEXTRAAGENTS, "-2"));
  ASSERT_EQ(0, convert(serverTarget().sealed(), source, &out));
  EXPECT_EQ(8000u, r32(out, 3092)) << "a divisor of 0 divides nothing";
  ASSERT_EQ(0, sqloPutEnv(KXL_VAR_KXLEXTRAAGENTS, nullptr));
  sqlz_krcbp->currentPartition = 7;
  ASSERT_EQ(0, convert(serverTarget().sealed(), source, &out));
  EXPECT_EQ(8000u, r32(out, 3092)) << "no entry for the current partition";
  sqlz_krcbp->partitionTable = nullptr;
  ASSERT_EQ(0, convert(serverTarget().sealed(), serverSource(4, 0x0A00).u32(3092, 100).sealed(), &out));
  EXPECT_EQ(895u, r32(out, 3092)) << "raised to 895, which is in range";
}

TEST_F(ConvertTest, SameTypeMergeOfACurrentSource) {
  Cfg source = serverSource(4, 0x0D00);
  source.byte(kFlags + 5, 7).byte(kFlags + 300, 9).u32(3092, 5000);
  Bytes out;
  ASSERT_EQ(0, convert(serverTarget().byte(kFlags + 6, 1).sealed(), source.sealed(), &out));
  EXPECT_EQ(7, out[kFlags + 5]);
  EXPECT_EQ(9, out[kFlags + 300]);
  EXPECT_EQ(0, out[kFlags + 6]) << "the whole flag area is the source's";
  EXPECT_EQ(4000u, r32(out, 3460));
  EXPECT_EQ(5000u, r32(out, 3092));
  EXPECT_EQ(300u, r32(out, 3096)) << "the target's own";
  EXPECT_EQ(5u, r32(out, 10908));
  EXPECT_EQ(200u, r32(out, 3084)) << "copied unset, then out of range";
  EXPECT_EQ(100u, r32(out, 3088));
}

TEST_F(ConvertTest, ServerConvertersDifferWhereTheirTableSays) {
  Bytes out;
  // Type 1: only 3118 of the tuning fields; 3084 without 3080 when 38 is 0.
  ASSERT_EQ(
      0, convert(serverTarget().sealed(), serverSource(1, 0x0B00).u16(38, 0).u32(3092, 900).sealed(), &out));
  EXPECT_EQ(66, r16(out, 1074));
  EXPECT_EQ(1000u, r32(out, 3084));
  EXPECT_EQ(7, r16(out, 3112));
  EXPECT_EQ(50, r16(out, 3118));
  EXPECT_EQ(3, r16(out, 48));
  EXPECT_EQ(900u, r32(out, 3092)) << "release 0x0B00 copies the pool";
  EXPECT_EQ(4000u, r32(out, 3460));
  // Type 3 from a type-3 source: a floor of 46, no tuning fields.
  ASSERT_EQ(0, convert(serverTarget().sealed(), serverSource(3, 0x0B00).sealed(), &out));
  EXPECT_EQ(46, r16(out, 1074));
  EXPECT_EQ(960u, r32(out, 3084));
  EXPECT_EQ(9, r16(out, 3118));
  EXPECT_EQ("A696", rtext(out, 696));
  // Type 3 into a type-3 target from a type-1 source: the floor stays 66.
  ASSERT_EQ(0, convert(Cfg(3, 0x0D00).sealed(), serverSource(1, 0x0B00).sealed(), &out));
  EXPECT_EQ(66, r16(out, 1074));
  // Type 5: the remote settings stay the target's.
  ASSERT_EQ(0, convert(serverTarget().sealed(), serverSource(5, 0x0B00).sealed(), &out));
  EXPECT_EQ(66, r16(out, 1074));
  EXPECT_EQ(2, r16(out, 48));
  EXPECT_EQ("", rtext(out, 696));
  EXPECT_EQ(9, r16(out, 3118));
}

TEST_F(ConvertTest, BlockAt3128OnlyBetweenFilesOfOneRelease) {
  Bytes out;
  ASSERT_EQ(0, convert(Cfg(2, 0x0D05).sealed(), Cfg(2, 0x0D00).text(3128, "CARRY").sealed(), &out));
  EXPECT_EQ("CARRY", rtext(out, 3128));
  ASSERT_EQ(0, convert(Cfg(2, 0x0D00).sealed(), Cfg(2, 0x0C00).text(3128, "CARRY").sealed(), &out));
  EXPECT_EQ("", rtext(out, 3128));
}

TEST_F(ConvertTest, SmallLayoutBothWays) {
  Cfg small(4, 0x0C00, 8200, kSmall);
  small.u16(36, 5000).byte(3584 + 7, 5).byte(4095, 6);
  Bytes out;
  ASSERT_EQ(0, convert(serverTarget().sealed(), small.sealed(), &out));
  EXPECT_EQ(5000, r16(out, 36));
  EXPECT_EQ(5, out[kFlags + 7]) << "the small flag area moves to the end";
  EXPECT_EQ(6, out[kFull - 1]);

  Cfg smallTarget(2, 0x0B00, 8200, kSmall);
  smallTarget.byte(3584 + 9, 4).text(396, "OWN");
  ASSERT_EQ(0, convert(smallTarget.sealed(), Cfg(2, 0x0D00).u16(36, 4500).sealed(), &out));
  ASSERT_EQ(kFull, out.size()) << "rewritten in the current layout";
  EXPECT_EQ(r32(out, 0), byteSum(out));
  EXPECT_EQ(4, out[kFlags + 9]);
  EXPECT_EQ("OWN", rtext(out, 396));
  EXPECT_EQ(4500, r16(out, 36));
}

} // namespace
} // namespace dbmtest
