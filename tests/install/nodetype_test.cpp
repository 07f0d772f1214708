// Reading an instance's node type from its configuration file.
#include "NT/readnodetype.h"
#include "install/kxlinstance.h"
#include "install_world.h"

namespace {

using kxltest::InstallWorld;

class NodeType : public InstallWorld {};

TEST_F(NodeType, IsTheWordAtByte40OfTheFile) {
  for (uint16_t type : {1, 2, 3, 4, 5}) {
    writeFile("C:\\P\\INST1\\kxlsystm", configImage(type));
    IKXLINSTANCE inst("INST1", nullptr, "C:\\P\\INST1");
    uint32_t nodeType = 99;
    ASSERT_EQ(0, readNodeType(&inst, &nodeType));
    EXPECT_EQ(type, nodeType);
  }
  // Little-endian and zero-extended.
  writeFile("C:\\P\\INST1\\kxlsystm", configImage(0xFF04));
  IKXLINSTANCE inst("INST1", nullptr, "C:\\P\\INST1");
  uint32_t nodeType = 0;
  ASSERT_EQ(0, readNodeType(&inst, &nodeType));
  EXPECT_EQ(0xFF04u, nodeType);
}

TEST_F(NodeType, IsReadFromSmallFilesAndQuotedDirectories) {
  writeFile("C:\\My Dir\\INST2\\kxlsystm", configImage(3, 4096));
  IKXLINSTANCE quoted("INST2", nullptr, "\"C:\\My Dir\\INST2\"");
  uint32_t nodeType = 0;
  ASSERT_EQ(0, readNodeType(&quoted, &nodeType));
  EXPECT_EQ(3u, nodeType);
}

TEST_F(NodeType, KeepsThePreviousValueWhenTheFileGivesNone) {
  makeDirectories("C:\\P\\NOFILE");
  IKXLINSTANCE missing("NOFILE", nullptr, "C:\\P\\NOFILE");
  uint32_t nodeType = 7;
  EXPECT_NE(0, readNodeType(&missing, &nodeType));
  EXPECT_EQ(7u, nodeType);

  writeFile("C:\\P\\SHORT\\kxlsystm", configImage(4, 41));
  IKXLINSTANCE shortFile("SHORT", nullptr, "C:\\P\\SHORT");
  EXPECT_NE(0, readNodeType(&shortFile, &nodeType));
  EXPECT_EQ(7u, nodeType);

  writeFile("C:\\P\\EXACT\\kxlsystm", configImage(4, 42));
  IKXLINSTANCE exact("EXACT", nullptr, "C:\\P\\EXACT");
  EXPECT_EQ(0, readNodeType(&exact, &nodeType));
  EXPECT_EQ(4u, nodeType);

  EXPECT_NE(0, readNodeType(nullptr, &nodeType));
  EXPECT_NE(0, readNodeType(&exact, nullptr));
}

} // namespace
