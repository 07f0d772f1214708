// The library's current instance, its audit settings file and audit events.
#include "sim/common/events.h"
#include "tests/support/product_world.h"

#include <algorithm>
#include <cstring>

namespace {

class AuditTest : public kxltest::ProductWorld {
protected:
  void SetUp() override {
    ProductWorld::SetUp();
    registerInstance("INST1", "C:\\KXL\\INST1", "COPY1");
  }
  void TearDown() override {
    sqlosins("");
    ProductWorld::TearDown();
  }

  static void writeSettings(const std::string &text) {
    writeFile("C:\\KXL\\INST1\\security\\kxlaudit.cfg", text);
  }

  static std::string events() { return kxltestsupport::readHostFile(kxlsim::eventsPath()); }
};

TEST_F(AuditTest, CurrentInstanceMustBeRegistered) {
  EXPECT_NE(0, sqlosins("")) << "no instance: nothing to act on";
  EXPECT_NE(0, sqlosins(nullptr));
  EXPECT_NE(0, sqlosins("NOSUCH"));
  EXPECT_NE(0, sqlosins("TOOLONGNAME"));
  EXPECT_EQ(0, sqlosins("INST1"));
  SQLEX_AUDIT_SETTINGS settings;
  EXPECT_EQ(0, sqlexAuditGetInstanceSettings(false, &settings, nullptr));
  EXPECT_NE(0, sqlosins("NOSUCH"));
  EXPECT_NE(0, sqlexAuditGetInstanceSettings(false, &settings, nullptr))
      << "a refused switch leaves no current instance behind";
}

TEST_F(AuditTest, SettingsFileIsReadIntoTheRecord) {
  ASSERT_EQ(0, sqlosins("INST1"));
  SQLEX_AUDIT_SETTINGS settings;
  std::memset(&settings, 0x5A, sizeof settings);
  ASSERT_EQ(0, sqlexAuditGetInstanceSettings(false, &settings, nullptr));
  EXPECT_EQ(settings.active, 0) << "no file: auditing is off";
  EXPECT_EQ(settings.classMask1, 0u);
  EXPECT_EQ(settings.size, 72u);

  writeSettings("# audit of INST1\r\n ACTIVE = Yes \r\nerrortype=audit\nadmin = success, failure\n"
                "instance = failure # failures only\n\n");
  ASSERT_EQ(0, sqlexAuditGetInstanceSettings(false, &settings, nullptr));
  EXPECT_EQ(settings.active, 1);
  EXPECT_EQ(settings.errorType, 1);
  EXPECT_EQ(settings.classMask1, 0x3u);
  EXPECT_EQ(settings.classMask2, 0u);
  EXPECT_EQ(settings.classMask4, 0x2u);
}

TEST_F(AuditTest, MalformedSettingsAreRefusedAndLeaveAuditingOff) {
  ASSERT_EQ(0, sqlosins("INST1"));
  SQLEX_AUDIT_SETTINGS settings;
  for (const char *text : {"active = yes\nadmin = sometimes\n", "active = yes\nfrobnicate = 1\n", "active\n",
                           "active = maybe\n"}) {
    writeSettings(text);
    EXPECT_NE(0, sqlexAuditGetInstanceSettings(false, &settings, nullptr)) << text;
    EXPECT_EQ(settings.active, 0) << text;
  }
  // An explicit file wins over the current instance's.
  writeFile("C:\\other\\audit.cfg", "active = yes\n");
  EXPECT_EQ(0, sqlexAuditGetInstanceSettings(false, &settings, "C:\\other\\audit.cfg"));
  EXPECT_EQ(settings.active, 1);
  failCalls("sqlexAuditGetInstanceSettings:1");
  EXPECT_NE(0, sqlexAuditGetInstanceSettings(false, &settings, nullptr));
}

TEST_F(AuditTest, EventsAreAppendedForTheCurrentInstance) {
  sqlca ca;
  sqloinca(&ca);
  {
    sqlexAuditData event(0x80000000u, 53, -1092, 1);
    EXPECT_NE(0, event.logEvent(&ca)) << "no current instance";
    EXPECT_NE(ca.sqlcode, 0) << "the failure is reported in the status block";
  }
  EXPECT_EQ(events(), "");

  ASSERT_EQ(0, sqlosins("INST1"));
  sqloinca(&ca);
  sqlexAuditData admin(0x80000000u, 53, -1092, 1);
  ASSERT_EQ(0, admin.logEvent(&ca));
  sqlexAuditData instance(0x20000000u, 1, 0, 0);
  instance.setInstanceName("INST1", 5);
  ASSERT_EQ(0, instance.logEvent(&ca));
  EXPECT_EQ(ca.sqlcode, 0);
  std::string log = events();
  for (const char *field : {"\"event\":\"audit\"", "\"category\":\"0x80000000\"", "\"audit_event\":\"53\"",
                            "\"sqlcode\":\"-1092\"", "\"data\":\"INST1\""})
    EXPECT_NE(log.find(field), std::string::npos) << field << "\n" << log;
  EXPECT_EQ(std::count(log.begin(), log.end(), '\n'), 2);

  failCalls("logEvent:1");
  EXPECT_NE(0, admin.logEvent(&ca));
  EXPECT_LT(ca.sqlcode, 0);
}

} // namespace
