// Service states on this and other machines, and nodes files.
#include "tests/support/product_world.h"

#include <cstdlib>

namespace {

class ServicesTest : public kxltest::ProductWorld {
protected:
  void SetUp() override {
    ProductWorld::SetUp();
    setString(kIdentity, "ComputerName", "WINSRV1");
  }
};

TEST_F(ServicesTest, StatesMapToTheirCodes) {
  SQLO_SVC_OUT out{};
  EXPECT_EQ(SQLO_RC_SVC_NOT_FOUND, sqloQueryKXLService("INST1", &out, nullptr));
  const std::pair<DWORD, int32_t> states[] = {{1, SQLO_RC_SVC_STOPPED},      {2, SQLO_RC_SVC_START_PENDING},
                                              {3, SQLO_RC_SVC_STOP_PENDING}, {4, SQLO_RC_SVC_RUNNING},
                                              {7, SQLO_RC_SVC_PAUSED},       {99, SQLO_RC_SYSTEM_ERROR}};
  for (const auto &[state, code] : states) {
    setServiceState("", "INST1", state);
    EXPECT_EQ(code, sqloQueryKXLService("INST1", &out, nullptr)) << state;
  }
  setServiceState("", "INST1", 4);
  EXPECT_EQ(SQLO_RC_SVC_RUNNING, sqloQueryKXLService("inst1", &out, "winsrv1"))
      << "the local computer by name, any case";
  EXPECT_EQ(out.serviceState, 4u);
  failCalls("sqloQueryKXLService:1");
  EXPECT_NE(SQLO_RC_SVC_RUNNING, sqloQueryKXLService("INST1", &out, nullptr));
}

TEST_F(ServicesTest, OtherMachinesAnswerFromTheirOwnRegistry) {
  SQLO_SVC_OUT out{};
  EXPECT_EQ(SQLO_RC_MACHINE_UNREACHABLE, sqloQueryKXLService("INST2-1", &out, "WINSRV2"));
  setServiceState("WINSRV2", "INST2-1", 4);
  setServiceState("", "INST2-1", 1);
  EXPECT_EQ(SQLO_RC_SVC_RUNNING, sqloQueryKXLService("INST2-1", &out, "WINSRV2"));
  EXPECT_EQ(SQLO_RC_SVC_STOPPED, sqloQueryKXLService("INST2-1", &out, nullptr));
  EXPECT_EQ(SQLO_RC_SVC_NOT_FOUND, sqloQueryKXLService("INST2-9", &out, "WINSRV2"));
  EXPECT_EQ(SQLO_RC_MACHINE_UNREACHABLE, sqloQueryKXLService("INST2-1", &out, "AVERYLONGCOMPUTERNAME"));
}

TEST_F(ServicesTest, NodesFileBecomesANodeList) {
  writeFile("C:\\I\\kxlnodes.cfg", "0 winsrv1.zav.test WINSRV1 0 \r\n\r\n"
                                   "1 winsrv2.zav.test WINSRV2 0 net2\r\n"
                                   "3 winsrv2.zav.test WINSRV2 1\r\n");
  SQLO_NODELIST *list = nullptr;
  uint32_t count = 0, maxNode = 0;
  ASSERT_EQ(0, sqloReadKxlnodes("C:\\I\\kxlnodes.cfg", 4, &list, 5, &count, &maxNode, 1, "INST2", 1, 0));
  ASSERT_NE(list, nullptr);
  EXPECT_EQ(count, 3u);
  EXPECT_EQ(maxNode, 3u);
  ASSERT_EQ(sqloNodeListCount(list), 3);
  const unsigned char *entry = sqloNodeListFirst(list);
  EXPECT_EQ(sqloNodeNumber(entry), 0);
  EXPECT_STREQ(sqloNodeHost(entry), "winsrv1.zav.test");
  EXPECT_STREQ(sqloNodeMachine(entry), "WINSRV1");
  entry = sqloNodeNext(entry);
  EXPECT_EQ(sqloNodeNumber(entry), 1);
  EXPECT_STREQ(sqloNodeMachine(entry), "WINSRV2") << "the network name sits between host and machine";
  entry = sqloNodeNext(entry);
  EXPECT_EQ(sqloNodeNumber(entry), 3);
  EXPECT_EQ(sqloNodePort(entry), 1u);
  EXPECT_LE(
      static_cast<size_t>(entry + sqloNodeLength(entry) - reinterpret_cast<const unsigned char *>(list)),
      sqloNodeListSize(list));

  // Reading again releases the earlier list; a failure leaves none.
  EXPECT_NE(0, sqloReadKxlnodes("C:\\I\\missing.cfg", 4, &list, 5, &count, &maxNode, 1, "INST2", 1, 0));
  EXPECT_EQ(list, nullptr);
}

TEST_F(ServicesTest, BrokenNodesFilesAreRefused) {
  SQLO_NODELIST *list = nullptr;
  uint32_t count = 0, maxNode = 0;
  for (const char *text : {"0 host\r\n", "x host M 0\r\n", "1000 host M 0\r\n", "0 h M 0\r\n0 h M 1\r\n",
                           "0 h M 0 net extra\r\n", "0 h AVERYLONGCOMPUTERNAME 0\r\n"}) {
    writeFile("C:\\I\\kxlnodes.cfg", text);
    EXPECT_NE(0, sqloReadKxlnodes("C:\\I\\kxlnodes.cfg", 4, &list, 5, &count, &maxNode, 1, "I", 1, 0))
        << text;
    EXPECT_EQ(list, nullptr) << text;
  }
  writeFile("C:\\I\\kxlnodes.cfg", "");
  ASSERT_EQ(0, sqloReadKxlnodes("C:\\I\\kxlnodes.cfg", 4, &list, 5, &count, &maxNode, 1, "I", 1, 0));
  EXPECT_EQ(sqloNodeListFirst(list), nullptr);
  std::free(list);
}

} // namespace
