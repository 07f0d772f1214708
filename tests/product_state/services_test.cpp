// Service states on this and other machines, and nodes files. Which states
// count as active, per partition and machine, is checked through the
// command's instance checks (tests/run).
#include "tests/support/product_world.h"

#include <cstdlib>

namespace {

class ServicesTest : public kxltest::ProductWorld {
protected:
  void SetUp() override {
    ProductWorld::SetUp();
    setString(kIdentity, "ComputerName", "WINSRV1");
  }
  // Reads C:\I\kxlnodes.cfg holding `text`: "number host machine port" per entry, or "<rc N>".
  static std::string nodes(const char *text) {
    writeFile("C:\\I\\kxlnodes.cfg", text);
    SQLO_NODELIST *list = nullptr;
    uint32_t count = 0, maxNode = 0;
    int32_t rc = sqloReadKxlnodes("C:\\I\\kxlnodes.cfg", 4, &list, 5, &count, &maxNode, 1, "I", 1, 0);
    if (rc != 0)
      return list == nullptr ? "<rc " + std::to_string(rc) + ">" : "a failure left a list";
    std::string shown = "count " + std::to_string(count) + " max " + std::to_string(maxNode);
    const unsigned char *entry = sqloNodeListFirst(list);
    for (int i = 0; i < sqloNodeListCount(list); ++i, entry = sqloNodeNext(entry)) {
      shown += "; " + std::to_string(sqloNodeNumber(entry)) + " " + sqloNodeHost(entry) + " " +
               sqloNodeMachine(entry) + " " + std::to_string(sqloNodePort(entry));
      EXPECT_LE(size_t(entry + sqloNodeLength(entry) - reinterpret_cast<const unsigned char *>(list)),
                sqloNodeListSize(list));
    }
    std::free(list);
    return shown;
  }
};

TEST_F(ServicesTest, StatesMapToTheirCodesOnThisAndOtherMachines) {
  SQLO_SVC_OUT out{};
  setServiceState("", "INST1", 99);
  EXPECT_EQ(SQLO_RC_SYSTEM_ERROR, sqloQueryKXLService("INST1", &out, nullptr)) << "an unknown state";
  setServiceState("", "INST1", 4);
  EXPECT_EQ(SQLO_RC_SVC_RUNNING, sqloQueryKXLService("inst1", &out, "winsrv1"))
      << "the local computer by name, any case";
  EXPECT_EQ(out.serviceState, 4u);
  EXPECT_EQ(SQLO_RC_MACHINE_UNREACHABLE, sqloQueryKXLService("INST1", &out, "WINSRV2"));
  EXPECT_EQ(SQLO_RC_MACHINE_UNREACHABLE, sqloQueryKXLService("INST1", &out, "AVERYLONGCOMPUTERNAME"));
  setServiceState("WINSRV2", "INST2-1", 4);
  EXPECT_EQ(SQLO_RC_SVC_NOT_FOUND, sqloQueryKXLService("INST2-9", &out, "WINSRV2"));
  failCalls("sqloQueryKXLService:1");
  EXPECT_NE(SQLO_RC_SVC_RUNNING, sqloQueryKXLService("INST1", &out, nullptr));
}

TEST_F(ServicesTest, NodesFilesBecomeNodeListsOrAreRefused) {
  EXPECT_EQ(nodes("0 winsrv1.zav.test WINSRV1 0 \r\n\r\n1 winsrv2.zav.test WINSRV2 0 net2\r\n"
                  "3 winsrv2.zav.test WINSRV2 1\r\n"),
            "count 3 max 3; 0 winsrv1.zav.test WINSRV1 0; 1 winsrv2.zav.test WINSRV2 0; "
            "3 winsrv2.zav.test WINSRV2 1");
  EXPECT_EQ(nodes(""), "count 0 max 0");
  for (const char *text : {"0 host\r\n", "x host M 0\r\n", "1000 host M 0\r\n", "0 h M 0\r\n0 h M 1\r\n",
                           "0 h M 0 net extra\r\n", "0 h AVERYLONGCOMPUTERNAME 0\r\n"})
    EXPECT_EQ(nodes(text).rfind("<rc ", 0), 0u) << text;
  // Reading again releases the earlier list; a failure leaves none.
  SQLO_NODELIST *list = nullptr;
  uint32_t count = 0, maxNode = 0;
  writeFile("C:\\I\\kxlnodes.cfg", "0 h M 0\r\n");
  ASSERT_EQ(0, sqloReadKxlnodes("C:\\I\\kxlnodes.cfg", 4, &list, 5, &count, &maxNode, 1, "I", 1, 0));
  EXPECT_NE(0, sqloReadKxlnodes("C:\\I\\missing.cfg", 4, &list, 5, &count, &maxNode, 1, "I", 1, 0));
  EXPECT_EQ(list, nullptr);
}

} // namespace
