// Creating instances under the current copy and removing what a creation made.
// The registrations of a creation are in the end-to-end upgrade's exact changes.
// Re-creating an instance and its partition 0 and undoing both are driven by
// the upgrade's failure table (tests/driver) and the re-creation cases
// (tests/services_env), which add and remove partition 0 on this machine only.
#include "demo_world.h"

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

} // namespace
} // namespace kxltest
