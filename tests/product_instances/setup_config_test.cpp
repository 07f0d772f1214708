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

// The table as text: "partitions N, this P, shared yes|no:" and the host of each slot.
std::string partitionTable() {
  const unsigned char *table = tableBytes();
  if (table == nullptr)
    return "<no table>";
  std::string text = "partitions " + std::to_string(sqloLe32(table, 16)) + ", this " +
                     std::to_string(sqlz_krcbp->currentPartition) + ", shared " +
                     (sqlz_krcbp->partitionFlag != 0 ? "yes:" : "no:");
  for (uint32_t slot = 0; slot < sqloLe32(table, 12); ++slot) {
    uint32_t offset = sqloLe32(table, SQLO_NODELIST_HDR_INDEX + 4 * size_t(slot));
    text += offset == 0 ? " <none>" : " " + std::string(reinterpret_cast<const char *>(table + offset + 22));
  }
  return text;
}

TEST_F(AppEnvironment, TheInstanceNodesFileBecomesThePartitionTable) {
  const struct {
    const char *instance;
    uint32_t partitioned;
    int32_t rc, sqlcode;
    const char *table;
  } rows[] = {
      {nullptr, 0, SQLO_RC_INVALID_ARGUMENT, -1042, "<no table>"},
      {"INST1", 1, SQLO_RC_FILE_NOT_FOUND_W, -1042, "<no table>"}, // INST1 has no nodes file
      {"INST1", 0, 0, 0, "partitions 1, this 0, shared no: winsrv1.zav.test"},
      {"INST2", 1, 0, 0,
       "partitions 3, this 0, shared yes: winsrv1.zav.test winsrv2.zav.test winsrv2.zav.test"},
  };
  for (const auto &row : rows) {
    SCOPED_TRACE(row.table);
    setInstance(row.instance);
    sqlca ca{};
    EXPECT_EQ(row.rc, sqleInitApplicationEnvironment(0, 0, row.partitioned, &ca));
    EXPECT_EQ(ca.sqlcode, row.sqlcode);
    EXPECT_EQ(partitionTable(), row.table);
  }
  // Partition 0 is the first entry, and entries follow each other by their length.
  const unsigned char *entry = tableBytes() + sqloLe32(tableBytes(), 20);
  EXPECT_EQ(entry, tableBytes() + sqloLe32(tableBytes(), 24));
  EXPECT_EQ(sqloLe16(entry + sqloLe16(entry, 0), 2), 1u);
  failCalls("sqleInitApplicationEnvironment:1");
  sqlca ca{};
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
