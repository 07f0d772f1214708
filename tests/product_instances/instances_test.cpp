// Creating instances under the current copy and removing what a creation made.
// The registrations of a creation are in the end-to-end upgrade's exact changes.
// Re-creating an instance and its partition 0 and undoing both are driven by
// the upgrade's failure table (tests/driver) and the re-creation cases
// (tests/services_env), which add and remove partition 0 on this machine only.
// Also the application environment's partition table, parameter lookup, and
// updates of the current instance's configuration file.
#include "demo_world.h"
#include "sim/kxlsim/dbmcfg_image.h"

#include <cstring>

namespace kxltest {
namespace {

class Instances : public DemoWorld {
protected:
  // Creates NAME under C:\inst; the result of the call.
  static int32_t create(const char *name, uint32_t nodeType, const char *user = nullptr,
                        uint8_t textSearch = 0, const char *tsService = nullptr, uint16_t tsPort = 0,
                        int32_t *reason = nullptr, const char *cluster = nullptr) {
    int32_t ownReason = -7, extra = -7;
    int32_t rc = sqlo_instance_create_extended(
        name, "C:\\inst", kCopy.c_str(), 0, user, user ? "s3cret!pw" : nullptr, 0, 1, nodeType, cluster, 1, 1,
        textSearch, tsService, tsPort, reason ? reason : &ownReason, &extra);
    EXPECT_EQ(extra, 0);
    return rc;
  }
};

TEST_F(Instances, CreationTakesTheTemplateOfEachNodeTypeAndRegistersTheInstance) {
  const char *templates[] = {"kxlsyssv", "kxlsysrq", "kxlsyssr", "kxlsysmp", "kxlsysst"};
  for (uint32_t type = 1; type <= 5; ++type) {
    std::string name = "NEW" + std::to_string(type);
    SCOPED_TRACE(name);
    ASSERT_EQ(0, create(name.c_str(), type, type == 3 ? ".\\kxluser" : nullptr));
    EXPECT_EQ(readFile("C:\\inst\\" + name + "\\kxlsystm"),
              readFile(kCopy + "\\CFG\\" + templates[type - 1]));
    bool hasService = type != 2 && type != 4;
    EXPECT_EQ(keyExists(kServices + name), hasService);
    if (!hasService)
      continue;
    EXPECT_EQ(regString(kServices + name, "ImagePath"), kCopy + "\\bin\\kxlsyscs.exe");
    EXPECT_EQ(regString(kServices + name, "DisplayName"), "KXL - KXL101 - " + name);
    EXPECT_EQ(regString(kServices + name, "ObjectName"), type == 3 ? ".\\kxluser" : "LocalSystem");
  }
  for (const char *file : {"/system.reg", "/system.reg.log"}) {
    std::string text = kxltestsupport::readHostFile(worldRoot() + file);
    EXPECT_EQ(text.find("s3cret"), std::string::npos) << "no password in " << file;
  }
}

TEST_F(Instances, RefusesBadArgumentsAndMissingTemplates) {
  EXPECT_EQ(SQLO_RC_INVALID_ARGUMENT, create("TOOLONGNAME", 1));
  EXPECT_EQ(SQLO_RC_INVALID_ARGUMENT, create("BAD\\N", 1));
  EXPECT_EQ(SQLO_RC_INVALID_ARGUMENT, create("NEW", 6));
  snapshot();
  ASSERT_TRUE(DeleteFileA((kCopy + "\\CFG\\kxlsyssr").c_str()));
  EXPECT_EQ(SQLO_RC_FILE_NOT_FOUND, create("NEW", 3));
  EXPECT_EQ(diff(), "file - C:\\Program Files\\ZAV\\KXL101\\CFG\\kxlsyssr\n")
      << "nothing but the removed template";
}

TEST_F(Instances, DropUndoesACreationCompletely) {
  snapshot();
  int32_t reason = -1;
  ASSERT_EQ(0, create("NEWI", 1, ".\\kxluser", 1, nullptr, 0, &reason, "KXLCLUS"));
  EXPECT_EQ(reason, 0);
  EXPECT_EQ(regString("SOFTWARE\\ZAV\\KXL\\InstalledCopies\\KXL101\\PROFILES\\NEWI", "KXLCLUSTER"),
            "KXLCLUS");
  EXPECT_NE(readText("C:\\windows\\system32\\drivers\\etc\\services").find("KXLTS_NEWI"), std::string::npos);
  ASSERT_EQ(0, sqlo_instance_drop("NEWI", "C:\\inst\\NEWI"));
  EXPECT_EQ(diff(), "");
}

TEST_F(Instances, TextSearchReportsWhyItCouldNotBeConfigured) {
  int32_t reason = -1;
  ASSERT_EQ(0, create("TSA", 1, nullptr, 1, "kxltsa", 60002, &reason));
  EXPECT_EQ(reason, 1) << "60002 lies in INST2's range";
  ASSERT_EQ(0, create("TSB", 1, nullptr, 1, "KXL_INST1", 50001, &reason));
  EXPECT_EQ(reason, 2) << "the name is taken with another port";
  ASSERT_EQ(0, create("TSC", 2, nullptr, 1, nullptr, 0, &reason));
  EXPECT_EQ(reason, 4) << "a client has no text search";
  ASSERT_EQ(0, create("TSD", 1, nullptr, 1, nullptr, 0, &reason));
  EXPECT_EQ(reason, 0);
  EXPECT_NE(readText("C:\\windows\\system32\\drivers\\etc\\services").find("KXLTS_TSD          55000/tcp"),
            std::string::npos);
}

TEST_F(Instances, InjectedFailuresChangeNothing) {
  snapshot();
  failCalls("sqlo_instance_create_extended:1,sqlo_instance_addnode:1,sqlo_instance_drop:1");
  EXPECT_NE(0, create("NEWF", 1));
  SQLO_INST_OUT out1{}, out2{};
  EXPECT_NE(0, sqlo_instance_addnode("INST1", 0, nullptr, 0, nullptr, nullptr, &out1, &out2));
  EXPECT_NE(out2.code, 0);
  EXPECT_NE(0, sqlo_instance_drop("INST1", nullptr));
  EXPECT_EQ(diff(), "");
  failCalls("RegSetValueExA:3");
  EXPECT_NE(0, create("NEWF", 1)) << "a failed registry write part way";
  EXPECT_EQ(diff(), "") << "what was written is taken back";
}

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
