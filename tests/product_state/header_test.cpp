// The library's declarations stand alone (this program links only the
// platform library): the inline helpers of the status block and audit record.
#include "platform/kxlsys.h"

#include <gtest/gtest.h>

#include <cstring>
#include <string>

namespace {

TEST(ProductHeader, ProducerTagIsBlankPaddedWithoutTerminator) {
  sqlca ca{};
  sqlcaSetProducer(ca, "KXLIUPGRADE");
  EXPECT_EQ(std::string(ca.sqlerrp, 8), "KXLIUPGR");
  sqlcaSetProducer(ca, "AB");
  EXPECT_EQ(std::string(ca.sqlerrp, 8), "AB      ");
  sqlcaSetCode(ca, -1092);
  EXPECT_EQ(sqlcaCode(ca), -1092);
}

TEST(ProductHeader, AuditEventKeepsAtMostTheMaximumText) {
  std::string longName(300, 'A');
  sqlexAuditData event(0x20000000u, 1, -5, 3);
  event.setInstanceName(longName.c_str(), longName.size());
  EXPECT_EQ(std::strlen(event.instanceName()), SQLEX_AUDIT_MAX_TEXT);
  event.setInstanceName("INST1", 5);
  EXPECT_STREQ(event.instanceName(), "INST1");
  EXPECT_EQ(event.sqlcode(), -5);
  EXPECT_EQ(event.errorType(), 3);
}

} // namespace
