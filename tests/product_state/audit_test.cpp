// The library's current instance, its audit settings file and audit events.
// The events of a whole upgrade are in the end-to-end upgrade's exact changes.
#include "sim/common/events.h"
#include "tests/support/product_world.h"

#include <cstring>
#include <string>

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
};

TEST_F(AuditTest, CurrentInstanceMustBeRegistered) {
  SQLEX_AUDIT_SETTINGS settings;
  EXPECT_NE(0, sqlexAuditGetInstanceSettings(false, &settings, nullptr)) << "no instance: nothing to act on";
  for (const char *refused : {"", static_cast<const char *>(nullptr), "NOSUCH", "TOOLONGNAME"})
    EXPECT_NE(0, sqlosins(refused)) << (refused ? refused : "null");
  EXPECT_EQ(0, sqlosins("INST1"));
  EXPECT_EQ(0, sqlexAuditGetInstanceSettings(false, &settings, nullptr));
  EXPECT_NE(0, sqlosins("NOSUCH"));
  EXPECT_NE(0, sqlexAuditGetInstanceSettings(false, &settings, nullptr))
      << "a refused switch leaves no current instance behind";
}

// The record's fields as text; a refused file must leave auditing off.
std::string settingsRead(const char *path = nullptr) {
  SQLEX_AUDIT_SETTINGS s;
  std::memset(&s, 0x5A, sizeof s);
  if (sqlexAuditGetInstanceSettings(false, &s, path) != 0)
    return "refused, active " + std::to_string(s.active);
  return "size " + std::to_string(s.size) + " active " + std::to_string(s.active) + " errortype " +
         std::to_string(s.errorType) + " admin " + std::to_string(s.classMask1) + " reserved " +
         std::to_string(s.classMask2) + " instance " + std::to_string(s.classMask4);
}

TEST_F(AuditTest, SettingsFileIsReadIntoTheRecord) {
  ASSERT_EQ(0, sqlosins("INST1"));
  EXPECT_EQ(settingsRead(), "size 72 active 0 errortype 0 admin 0 reserved 0 instance 0") << "no file";
  const std::pair<const char *, const char *> rows[] = {
      {"# audit of INST1\r\n ACTIVE = Yes \r\nerrortype=audit\nadmin = success, failure\n"
       "instance = failure # failures only\n\n",
       "size 72 active 1 errortype 1 admin 3 reserved 0 instance 2"},
      {"active = yes\nadmin = sometimes\n", "refused, active 0"},
      {"active = yes\nfrobnicate = 1\n", "refused, active 0"},
      {"active\n", "refused, active 0"},
      {"active = maybe\n", "refused, active 0"},
  };
  for (const auto &[text, read] : rows) {
    writeFile("C:\\KXL\\INST1\\security\\kxlaudit.cfg", text);
    EXPECT_EQ(settingsRead(), read) << text;
  }
  writeFile("C:\\other\\audit.cfg", "active = yes\n");
  EXPECT_EQ(settingsRead("C:\\other\\audit.cfg").substr(0, 17), "size 72 active 1 ")
      << "an explicit file wins over the current instance's";
  failCalls("sqlexAuditGetInstanceSettings:1");
  EXPECT_EQ(settingsRead().substr(0, 7), "refused");
}

TEST_F(AuditTest, EventsAreAppendedForTheCurrentInstanceWithTheirTextBounded) {
  sqlca ca;
  sqloinca(&ca);
  sqlexAuditData event(0x20000000u, 1, -5, 3);
  EXPECT_NE(0, event.logEvent(&ca)) << "no current instance";
  EXPECT_NE(ca.sqlcode, 0) << "the failure is reported in the status block";
  const std::string events = kxlsim::eventsPath();
  EXPECT_EQ(kxltestsupport::readHostFile(events), "");

  ASSERT_EQ(0, sqlosins("INST1"));
  sqloinca(&ca);
  std::string longName(300, 'A');
  event.setInstanceName(longName.c_str(), longName.size());
  ASSERT_EQ(0, event.logEvent(&ca));
  EXPECT_EQ(ca.sqlcode, 0);
  EXPECT_EQ(kxltestsupport::readHostFile(events),
            "{\"audit_event\":\"1\",\"category\":\"0x20000000\",\"data\":\"" +
                std::string(SQLEX_AUDIT_MAX_TEXT, 'A') +
                "\",\"errortype\":\"3\",\"event\":\"audit\",\"instance\":\"INST1\",\"sqlcode\":\"-5\"}\n");
}

} // namespace
