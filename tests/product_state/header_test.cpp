// The library's declarations stand alone and the node list accessors read the
// documented little-endian layout.
#include "platform/kxlsys.h"

#include <gtest/gtest.h>

#include <vector>

namespace {

void put16(std::vector<unsigned char> &b, size_t at, uint16_t v) {
  b[at] = uint8_t(v);
  b[at + 1] = uint8_t(v >> 8);
}
void put32(std::vector<unsigned char> &b, size_t at, uint32_t v) {
  for (int i = 0; i < 4; ++i)
    b[at + i] = uint8_t(v >> (8 * i));
}

// One entry with host, two unused names and the machine name, padded to 4 bytes.
size_t putEntry(std::vector<unsigned char> &b, size_t at, int16_t node, uint32_t port,
                const std::string &host, const std::string &machine) {
  std::string names = host + '\0' + "n2" + '\0' + "n3x" + '\0' + machine + '\0';
  size_t len = (SQLO_NODE_NAMES + names.size() + 3) & ~size_t(3);
  b.resize(at + len);
  put16(b, at, uint16_t(len));
  put16(b, at + SQLO_NODE_NUMBER, uint16_t(node));
  put32(b, at + SQLO_NODE_PORT, port);
  b[at + SQLO_NODE_HOSTLEN] = uint8_t(host.size());
  b[at + SQLO_NODE_NAME2LEN] = 2;
  b[at + SQLO_NODE_NAME3LEN] = 3;
  b[at + SQLO_NODE_MACHLEN] = uint8_t(machine.size());
  std::copy(names.begin(), names.end(), b.begin() + at + SQLO_NODE_NAMES);
  return at + len;
}

TEST(ProductHeader, NodeListAccessorsWalkEntriesAtTheirOffsets) {
  std::vector<unsigned char> b(SQLO_NODELIST_HDR_INDEX + 8, 0);
  put32(b, SQLO_NODELIST_HDR_COUNT, 2);
  put32(b, SQLO_NODELIST_HDR_FIRST, uint32_t(b.size()));
  size_t second = putEntry(b, b.size(), 0, 0, "host1.example", "HOST1");
  size_t end = putEntry(b, second, -3, 1, "h2", "M2");
  put32(b, 8, uint32_t(end));

  ASSERT_EQ(sqloNodeListCount(b.data()), 2);
  const unsigned char *e = sqloNodeListFirst(b.data());
  ASSERT_NE(e, nullptr);
  EXPECT_EQ(sqloNodeNumber(e), 0);
  EXPECT_EQ(sqloNodePort(e), 0u);
  EXPECT_STREQ(sqloNodeHost(e), "host1.example");
  EXPECT_STREQ(sqloNodeMachine(e), "HOST1");
  e = sqloNodeNext(e);
  EXPECT_EQ(size_t(e - b.data()), second);
  EXPECT_EQ(sqloNodeNumber(e), -3);
  EXPECT_EQ(sqloNodePort(e), 1u);
  EXPECT_STREQ(sqloNodeMachine(e), "M2");
}

TEST(ProductHeader, EmptyNodeListHasNoFirstEntry) {
  std::vector<unsigned char> b(SQLO_NODELIST_HDR_INDEX, 0);
  put32(b, SQLO_NODELIST_HDR_FIRST, SQLO_NODELIST_HDR_INDEX);
  EXPECT_EQ(sqloNodeListFirst(b.data()), nullptr);
}

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
