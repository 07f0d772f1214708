// The application environment's partition table, parameter lookup, and
// updates of the current instance's configuration file.
#include "demo_world.h"
#include "sim/kxlsim/dbmcfg_image.h"

#include <algorithm>
#include <cstring>

namespace kxltest {
namespace {

using AppEnvironment = DemoWorld;
using Configuration = DemoWorld;

const unsigned char *tableBytes() {
  return reinterpret_cast<const unsigned char *>(sqlz_krcbp->partitionTable);
}

std::string hostOfPartition(uint32_t partition) {
  if (partition >= sqloLe32(tableBytes(), 12))
    return "<no slot>";
  uint32_t offset = sqloLe32(tableBytes(), SQLO_NODELIST_HDR_INDEX + 4 * size_t(partition));
  if (offset == 0)
    return "<none>";
  return reinterpret_cast<const char *>(tableBytes() + offset + 22);
}

TEST_F(AppEnvironment, PartitionedInstanceGetsItsNodesFileAsTable) {
  setInstance("INST2");
  sqlca ca{};
  ASSERT_EQ(0, sqleInitApplicationEnvironment(0, 0, 1, &ca));
  EXPECT_EQ(ca.sqlcode, 0);
  ASSERT_NE(tableBytes(), nullptr);
  EXPECT_EQ(sqloLe32(tableBytes(), 16), 3u);
  uint32_t first = sqloLe32(tableBytes(), 20);
  EXPECT_EQ(first, sqloLe32(tableBytes(), 24)) << "partition 0 is the first entry";
  EXPECT_EQ(hostOfPartition(0), "winsrv1.zav.test");
  EXPECT_EQ(hostOfPartition(1), "winsrv2.zav.test");
  EXPECT_EQ(hostOfPartition(2), "winsrv2.zav.test");
  // Entries follow each other by their length.
  const unsigned char *entry = tableBytes() + first;
  entry += sqloLe16(entry, 0);
  EXPECT_EQ(sqloLe16(entry, 2), 1u);
  EXPECT_EQ(sqlz_krcbp->currentPartition, 0) << "the partition of this machine";
  EXPECT_NE(sqlz_krcbp->partitionFlag, 0u) << "two partitions share winsrv2";
}

TEST_F(AppEnvironment, SingleInstanceHasPartitionZeroOnThisHost) {
  setInstance("INST1");
  ASSERT_EQ(0, sqleInitApplicationEnvironment(0, 0, 0, nullptr));
  EXPECT_EQ(sqloLe32(tableBytes(), 16), 1u);
  EXPECT_EQ(hostOfPartition(0), "winsrv1.zav.test");
  EXPECT_EQ(hostOfPartition(1), "<no slot>") << "one slot only";
  EXPECT_EQ(sqlz_krcbp->currentPartition, 0);
  EXPECT_EQ(sqlz_krcbp->partitionFlag, 0u);
}

TEST_F(AppEnvironment, FailuresLeaveNoTableAndReportInTheStatusBlock) {
  sqlca ca{};
  setInstance(nullptr);
  EXPECT_NE(0, sqleInitApplicationEnvironment(0, 0, 0, &ca));
  EXPECT_EQ(ca.sqlcode, -1042);
  setInstance("INST1");
  EXPECT_EQ(SQLO_RC_FILE_NOT_FOUND_W, sqleInitApplicationEnvironment(0, 0, 1, &ca))
      << "INST1 has no nodes file";
  EXPECT_EQ(sqlz_krcbp->partitionTable, nullptr);
  failCalls("sqleInitApplicationEnvironment:1");
  EXPECT_NE(0, sqleInitApplicationEnvironment(0, 0, 0, &ca));
  EXPECT_EQ(sqlz_krcbp->partitionTable, nullptr);
}

TEST_F(Configuration, ParameterIndexesLieInTheFlagArea) {
  int32_t index79 = -1, index803 = -1, index78 = -1;
  SQLF_PARAM_INFO info{};
  ASSERT_EQ(0, sqlf_get_param_info(79, 0, &info, &index79));
  ASSERT_EQ(0, sqlf_get_param_info(803, 0, &info, &index803));
  ASSERT_EQ(0, sqlf_get_param_info(78, 0, &info, &index78));
  for (int32_t index : {index78, index79, index803})
    EXPECT_TRUE(index >= 0 && index < 512) << index;
  EXPECT_NE(index79, index803);
  EXPECT_EQ(info.offset, 28u);
  EXPECT_EQ(SQLO_RC_NOT_FOUND, sqlf_get_param_info(4711, 0, &info, &index78));
}

TEST_F(Configuration, AuthenticationTypeGoesIntoTheCurrentInstanceWithAValidChecksum) {
  std::string path = kOldCopy + "\\INST1\\kxlsystm";
  std::vector<uint8_t> before = readFile(path);
  setInstance("INST1");
  uint16_t type = 3;
  sqlfupd item{78, &type};
  sqlca ca{};
  ASSERT_EQ(0, sqlfusys(1, &item, &ca));
  EXPECT_EQ(ca.sqlcode, 0);
  std::vector<uint8_t> expected = before;
  expected[28] = 3;
  expected[29] = 0;
  kxlsim::dbmCfgSealChecksum(expected);
  EXPECT_EQ(readFile(path), expected) << "the type at byte 28 and the checksum, nothing else";
}

TEST_F(Configuration, BadUpdatesAndDamagedFilesChangeNothing) {
  std::string path = kOldCopy + "\\INST1\\kxlsystm";
  setInstance("INST1");
  snapshot();
  uint16_t type = 9;
  sqlfupd item{78, &type};
  sqlca ca{};
  EXPECT_EQ(-1, sqlfusys(1, &item, &ca));
  EXPECT_NE(ca.sqlcode, 0);
  item.token = 79;
  type = 1;
  EXPECT_EQ(-1, sqlfusys(1, &item, &ca)) << "only the authentication type can be updated";
  failCalls("sqlfusys:1");
  item.token = 78;
  EXPECT_EQ(-1, sqlfusys(1, &item, &ca));
  EXPECT_EQ(ca.sqlcode, -1042);
  EXPECT_EQ(diff(), "");
  std::vector<uint8_t> damaged = readFile(path);
  damaged[100] ^= 0x55;
  writeFile(path, damaged);
  EXPECT_EQ(-1, sqlfusys(1, &item, &ca));
  EXPECT_EQ(ca.sqlcode, -5005);
  EXPECT_EQ(readFile(path), damaged) << "a damaged file is not sealed";
}

} // namespace
} // namespace kxltest
