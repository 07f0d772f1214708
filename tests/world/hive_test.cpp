// The REGEDIT4 text form of a hive: every value type round-trips, the output does not
// depend on insertion order, and damaged files are refused rather than half read. Names
// ignoring case and merging trees are stated by the Win32 suite.
#include "sim/posix/regfile.h"

#include <gtest/gtest.h>

#include <sstream>

namespace kxlsim::posix::hive {
namespace {

const std::string kRoot = "HKEY_LOCAL_MACHINE";

std::vector<BYTE> bytes(const std::string &text, bool terminated = true) {
  std::vector<BYTE> data(text.begin(), text.end());
  if (terminated)
    data.push_back(0);
  return data;
}

TEST(HiveText, EveryValueTypeRoundTrips) {
  Key root;
  bool created = false;
  Key &zav = createKey(root, {"SOFTWARE", "ZAV", "KXL"}, created);
  setValue(zav, "", REG_SZ, bytes("default"));
  setValue(zav, "Path \"quoted\" \\x", REG_SZ, bytes("C:\\Program Files\\KXL \"10\"\\"));
  setValue(zav, "Count", REG_DWORD, {0x2a, 0, 0, 0});
  setValue(zav, "Big", REG_QWORD, {1, 2, 3, 4, 5, 6, 7, 0x80});
  setValue(zav, "Expand", REG_EXPAND_SZ, bytes("%SystemRoot%\\x"));
  setValue(zav, "Multi", REG_MULTI_SZ, {'a', 0, 'b', 'c', 0, 0});
  std::vector<BYTE> blob(200);
  for (size_t i = 0; i < blob.size(); ++i)
    blob[i] = static_cast<BYTE>(i * 7);
  setValue(zav, "Blob", REG_BINARY, blob);
  setValue(zav, "Empty", REG_SZ, {});
  setValue(zav, "TwoLines", REG_SZ, bytes("one\r\ntwo"));
  setValue(zav, "Unterminated", REG_SZ, bytes("raw", false));
  setValue(zav, "ShortDword", REG_DWORD, {1, 2, 3});
  setValue(zav, "Nothing", REG_NONE, {});
  setValue(zav, "B", REG_SZ, bytes("B"));
  setValue(zav, "a", REG_SZ, bytes("a"));
  createKey(root, {"SOFTWARE", "Empty Key"}, created);
  createKey(root, {"SOFTWARE", "aaa"}, created);
  std::string text = formatHive(root, kRoot);
  Key parsed;
  std::string error;
  ASSERT_TRUE(parseHive(text, kRoot, parsed, error)) << error << "\n" << text;
  EXPECT_EQ(formatHive(parsed, kRoot), text); // the text names every byte: the same text is the same tree

  EXPECT_EQ(text.rfind("REGEDIT4\n", 0), 0u);
  for (const char *line :
       {"[HKEY_LOCAL_MACHINE\\SOFTWARE\\Empty Key]\n", "@=\"default\"\n",
        "\"Path \\\"quoted\\\" \\\\x\"=\"C:\\\\Program Files\\\\KXL \\\"10\\\"\\\\\"\n",
        "\"Count\"=dword:0000002a\n", "\"Big\"=hex(b):01,02,03,04,05,06,07,80\n",
        "\"Multi\"=hex(7):61,00,62,63,00,00\n", "\"Expand\"=hex(2):25,", "\"Blob\"=hex:00,07,0e,",
        // Strings that the quoted form cannot give back exactly are kept as bytes.
        "\"Unterminated\"=hex(1):72,61,77\n", "\"Empty\"=hex(1):\n"})
    EXPECT_NE(text.find(line), std::string::npos) << line;

  // Long data is wrapped within eighty columns.
  std::istringstream lines(text);
  int continued = 0;
  for (std::string line; std::getline(lines, line); continued += !line.empty() && line.back() == '\\')
    EXPECT_LE(line.size(), 80u) << line;
  EXPECT_GE(continued, 6); // the 200-byte blob alone needs several lines
  // Sorted ignoring case, whatever the order of insertion: "a" comes before "B", unlike in byte order.
  EXPECT_LT(text.find("\\aaa]"), text.find("\\Empty Key]"));
  EXPECT_LT(text.find("\"a\"="), text.find("\"B\"="));
}

TEST(HiveText, HandWrittenFilesAreRead) {
  const char *text = "REGEDIT4\r\n"
                     "; a comment\r\n"
                     "\r\n"
                     "[hkey_local_machine\\Software\\A]\r\n"
                     "\"Bin\"=hex:0A, FF ,\\\r\n"
                     "    10\r\n"
                     "\"D\"=dword:FFFFFFFF\r\n"
                     "@=\"x\"\r\n";
  Key tree;
  std::string error;
  ASSERT_TRUE(parseHive(text, kRoot, tree, error)) << error;
  const Key *a = findKey(tree, {"SOFTWARE", "a"});
  ASSERT_NE(a, nullptr);
  EXPECT_EQ(a->name, "A");
  EXPECT_EQ(a->values.at("bin").data, (std::vector<BYTE>{0x0a, 0xff, 0x10}));
  EXPECT_EQ(a->values.at("d").data, (std::vector<BYTE>{0xff, 0xff, 0xff, 0xff}));
  EXPECT_EQ(a->values.at("").data, bytes("x"));
}

TEST(HiveText, DamagedFilesAreRefused) {
  const char *damaged[] = {
      "[HKEY_LOCAL_MACHINE\\A]\n\"v\"=\"x\"\n",               // no header
      "REGEDIT4\n\"v\"=\"x\"\n",                              // value outside a key
      "REGEDIT4\n[HKEY_LOCAL_MACHINE\\A]\n\"v\"=\"x\n",       // string cut short
      "REGEDIT4\n[HKEY_LOCAL_MACHINE\\A]\n\"v\"=hex:1,zz\n",  // not hex
      "REGEDIT4\n[HKEY_LOCAL_MACHINE\\A]\n\"v\"=hex:01,\\\n", // continuation cut short
      "REGEDIT4\n[HKEY_LOCAL_MACHINE\\A]\n\"v\"=dword:123456789\n",
      "REGEDIT4\n[HKEY_CURRENT_USER\\A]\n",    // another root
      "REGEDIT4\n[HKEY_LOCAL_MACHINE\\A\n",    // section cut short
      "REGEDIT4\n[HKEY_LOCAL_MACHINE\\\\A]\n", // empty key name
      "REGEDIT4\n[-HKEY_LOCAL_MACHINE\\A]\n",
      "REGEDIT4\n[HKEY_LOCAL_MACHINE\\A]\ngarbage\n",
  };
  for (const char *text : damaged) {
    Key tree;
    std::string error;
    EXPECT_FALSE(parseHive(text, kRoot, tree, error)) << text;
    EXPECT_FALSE(error.empty());
  }
}

} // namespace
} // namespace kxlsim::posix::hive
