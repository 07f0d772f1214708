// Reading an instance's node type from its configuration file: the
// little-endian word at byte 40, zero-extended; a file that gives none keeps
// the previous value.
#include "NT/readnodetype.h"
#include "install/kxlinstance.h"
#include "install_world.h"

namespace {

using namespace kxltest;

class NodeType : public InstallWorld {};

TEST_F(NodeType, IsTheWordAtByte40OfTheFile) {
  const struct {
    const char *directory; // quotes are taken off
    Bytes file;            // empty: no file
    bool read;
    uint32_t nodeType;
  } rows[] = {
      {"C:\\P\\T1", configImage(1), true, 1},
      {"C:\\P\\T2", configImage(2), true, 2},
      {"C:\\P\\T3", configImage(3), true, 3},
      {"C:\\P\\T4", configImage(4), true, 4},
      {"C:\\P\\T5", configImage(5), true, 5},
      {"C:\\P\\T6", configImage(0xFF04), true, 0xFF04},
      {"\"C:\\My Dir\\Q\"", configImage(3, 4096), true, 3},
      {"C:\\P\\NOFILE", {}, false, 7},
      {"C:\\P\\SHORT", Bytes(41, 4), false, 7},
      {"C:\\P\\EXACT", Cfg(4, 0, 0, 42).sealed(), true, 4},
  };
  for (const auto &row : rows) {
    std::string directory = row.directory;
    std::erase(directory, '"');
    makeDirectories(directory);
    if (!row.file.empty())
      writeFile(directory + "\\kxlsystm", row.file);
    IKXLINSTANCE inst("INST1", nullptr, row.directory);
    uint32_t nodeType = 7;
    EXPECT_EQ(row.read, readNodeType(&inst, &nodeType) == 0) << row.directory;
    EXPECT_EQ(row.nodeType, nodeType) << row.directory;
  }
  IKXLINSTANCE inst("INST1", nullptr, "C:\\P\\T1");
  uint32_t nodeType = 0;
  EXPECT_NE(0, readNodeType(nullptr, &nodeType));
  EXPECT_NE(0, readNodeType(&inst, nullptr));
}

} // namespace
