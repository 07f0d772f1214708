// Registry behaviour the command relies on, as Windows has it.
#include "conformance.h"

#include <cstring>
#include <functional>
#include <set>
#include <string>

namespace kxltest {
namespace {

using std::string;
using Names = std::set<string>;

// Names of the subkeys (or values) of a key, with the result that ended the walk.
struct Listing {
  Names names;
  LONG end = ERROR_SUCCESS;
  bool lengthsMatch = true; // every reported length was the name's length in characters
};

// Walks a key's names with one enumeration call (RegEnumKeyExA or RegEnumValueA).
template <typename Enumerate> Listing listNames(Enumerate enumerate) {
  Listing out;
  for (DWORD i = 0;; ++i) {
    char name[256];
    DWORD length = sizeof name;
    LONG rc = enumerate(i, name, &length);
    if (rc != ERROR_SUCCESS) {
      out.end = rc;
      return out;
    }
    out.lengthsMatch = out.lengthsMatch && length == std::strlen(name);
    out.names.insert(name);
  }
}

Listing listSubkeys(HKEY key) {
  return listNames([key](DWORD i, char *name, DWORD *length) {
    return RegEnumKeyExA(key, i, name, length, nullptr, nullptr, nullptr, nullptr);
  });
}

Listing listValues(HKEY key) {
  return listNames([key](DWORD i, char *name, DWORD *length) {
    return RegEnumValueA(key, i, name, length, nullptr, nullptr, nullptr, nullptr);
  });
}

// The string data of a value, or "<rc N>" when the query fails.
string text(HKEY key, const char *name) {
  BYTE data[256] = {};
  DWORD size = sizeof data - 1;
  LONG rc = RegQueryValueExA(key, name, nullptr, nullptr, data, &size);
  return rc == ERROR_SUCCESS ? string(reinterpret_cast<const char *>(data))
                             : "<rc " + std::to_string(rc) + ">";
}

// Missing intermediate keys are made; names ignore case and keep the spelling they were made with.
TEST_F(RegistryTest, CreateTellsNewFromExistingKeys) {
  const struct {
    const char *path;
    DWORD disposition;
  } rows[] = {{"One\\Two\\Three", REG_CREATED_NEW_KEY},
              {"One\\Two\\Three", REG_OPENED_EXISTING_KEY},
              {"ONE\\two", REG_OPENED_EXISTING_KEY},
              {"one\\TWO\\Four", REG_CREATED_NEW_KEY}};
  Key key, probe;
  for (const auto &row : rows) {
    DWORD disposition = 0;
    ASSERT_EQ(ERROR_SUCCESS, create(row.path, key, &disposition)) << row.path;
    EXPECT_EQ(row.disposition, disposition) << row.path;
  }
  setString(key.get(), "Marker", "7"); // the key created last is the one returned
  ASSERT_EQ(ERROR_SUCCESS, open("One\\Two\\four", probe));
  EXPECT_EQ("7", text(probe.get(), "Marker"));
  EXPECT_EQ(Names{"One"}, listSubkeys(root_.get()).names);
  ASSERT_EQ(ERROR_SUCCESS, open("one\\two", probe));
  EXPECT_EQ((Names{"Three", "Four"}), listSubkeys(probe.get()).names);
}

// Reading does not expand the variables of REG_EXPAND_SZ; the default value has the empty name;
// a name in another case is the same value.
TEST_F(RegistryTest, EveryValueTypeRoundTrips) {
  const DWORD number = 0xDEADBEEF;
  const struct {
    const char *name;
    DWORD type;
    string data;
  } rows[] = {
      {"Bin", REG_BINARY, string("\x00\xFF\x10\x00\x7F", 5)},
      {"Dword", REG_DWORD, string(reinterpret_cast<const char *>(&number), sizeof number)},
      {"Multi", REG_MULTI_SZ, string("first\0second\0", sizeof "first\0second\0")}, // two and the empty one
      {"Expand", REG_EXPAND_SZ, string("%SystemRoot%\\kxl", sizeof "%SystemRoot%\\kxl")},
      {"", REG_SZ, string("default", sizeof "default")},
  };
  for (const auto &row : rows)
    ASSERT_EQ(ERROR_SUCCESS, RegSetValueExA(root_.get(), row.name, 0, row.type,
                                            reinterpret_cast<const BYTE *>(row.data.data()),
                                            static_cast<DWORD>(row.data.size())));
  for (const auto &row : rows) {
    SCOPED_TRACE(row.name);
    DWORD type = 0;
    string data;
    ASSERT_EQ(ERROR_SUCCESS, query(root_.get(), row.name, type, data));
    EXPECT_EQ(row.type, type);
    EXPECT_EQ(row.data, data);
  }
  EXPECT_EQ("default", text(root_.get(), nullptr));
  // The size counts the terminator; no data buffer asks for it, a short one is refused with it.
  setString(root_.get(), "ValueName", "first");
  setString(root_.get(), "valuename", "abcdefgh"); // another case replaces the data, keeps the name
  EXPECT_EQ((Names{"Bin", "Dword", "Multi", "Expand", "", "ValueName"}), listValues(root_.get()).names);
  DWORD type = REG_NONE, size = 0;
  ASSERT_EQ(ERROR_SUCCESS, RegQueryValueExA(root_.get(), "VALUENAME", nullptr, &type, nullptr, &size));
  EXPECT_EQ(static_cast<DWORD>(REG_SZ), type);
  EXPECT_EQ(9u, size);
  BYTE small[3];
  size = sizeof small;
  EXPECT_EQ(ERROR_MORE_DATA, RegQueryValueExA(root_.get(), "ValueName", nullptr, nullptr, small, &size));
  EXPECT_EQ(9u, size);
  BYTE exact[9];
  size = sizeof exact;
  ASSERT_EQ(ERROR_SUCCESS, RegQueryValueExA(root_.get(), "ValueName", nullptr, nullptr, exact, &size));
  EXPECT_STREQ("abcdefgh", reinterpret_cast<const char *>(exact));
}

// A name of 255 characters is the longest a key may have. A buffer without room for the name
// and its terminator, or for the data, is refused with ERROR_MORE_DATA.
TEST_F(RegistryTest, EnumerationListsEachNameThenNoMoreItems) {
  const string longest(255, 'k');
  Key key;
  for (const char *name :
       {"Zulu", "alpha", longest.c_str(), "Mike\\Inner", "Mike"}) // Inner is not a direct subkey
    ASSERT_EQ(ERROR_SUCCESS, create(name, key));
  setString(root_.get(), "Zeta", "1");
  setDword(root_.get(), "alpha", 2);
  setString(key.get(), "Only", "hello");
  for (const Listing &listing : {listSubkeys(root_.get()), listValues(root_.get())}) {
    EXPECT_EQ(ERROR_NO_MORE_ITEMS, listing.end);
    EXPECT_TRUE(listing.lengthsMatch);
  }
  EXPECT_EQ((Names{"Zulu", "alpha", "Mike", longest}), listSubkeys(root_.get()).names);
  // Windows lists values in the order they were made and Wine sorts them: only the set counts.
  EXPECT_EQ((Names{"Zeta", "alpha"}), listValues(root_.get()).names);

  char name[5], keyClass[8] = "xxxxxxx";
  BYTE data[6];
  DWORD length = sizeof name - 1, type = REG_NONE, size = sizeof data - 1, classLength = sizeof keyClass;
  EXPECT_EQ(ERROR_MORE_DATA, RegEnumKeyExA(key.get(), 0, name, &length, nullptr, nullptr, nullptr, nullptr));
  length = sizeof name - 1;
  EXPECT_EQ(ERROR_MORE_DATA, RegEnumValueA(key.get(), 0, name, &length, nullptr, nullptr, nullptr, nullptr));
  length = sizeof name;
  EXPECT_EQ(ERROR_MORE_DATA, RegEnumValueA(key.get(), 0, name, &length, nullptr, nullptr, data, &size));
  length = size = sizeof data;
  ASSERT_EQ(ERROR_SUCCESS, RegEnumValueA(key.get(), 0, name, &length, nullptr, &type, data, &size));
  EXPECT_EQ((std::pair<string, DWORD>("Only", 4)), std::make_pair(string(name), length));
  EXPECT_EQ((std::pair<DWORD, DWORD>(REG_SZ, 6)), std::make_pair(type, size));
  EXPECT_STREQ("hello", reinterpret_cast<const char *>(data));
  // A key made without a class has the empty one.
  char inner[6];
  length = sizeof inner;
  ASSERT_EQ(ERROR_SUCCESS,
            RegEnumKeyExA(key.get(), 0, inner, &length, nullptr, keyClass, &classLength, nullptr));
  EXPECT_EQ((std::pair<string, DWORD>("Inner", 5)), std::make_pair(string(inner), length));
  EXPECT_EQ((std::pair<string, DWORD>("", 0)), std::make_pair(string(keyClass), classLength));
}

TEST_F(RegistryTest, CopyKeyMergesValuesAndTheWholeSubtree) {
  Key source, inner, deepest, target;
  ASSERT_EQ(ERROR_SUCCESS, create("Source", source));
  setString(source.get(), "Shared", "from source");
  setDword(source.get(), "Count", 3);
  ASSERT_EQ(ERROR_SUCCESS, create("Source\\Inner", inner));
  setString(inner.get(), "Level", "one");
  ASSERT_EQ(ERROR_SUCCESS, create("Source\\Inner\\Deepest", deepest));
  setString(deepest.get(), "Level", "two");
  ASSERT_EQ(ERROR_SUCCESS, create("Target\\INNER", target));
  ASSERT_EQ(ERROR_SUCCESS, create("Target", target));
  setString(target.get(), "SHARED", "old");
  setString(target.get(), "Kept", "untouched");

  ASSERT_EQ(ERROR_SUCCESS, SHCopyKeyA(root_.get(), "Source", target.get(), 0));
  EXPECT_EQ("from source", text(target.get(), "Shared"));
  EXPECT_EQ("untouched", text(target.get(), "Kept"));
  EXPECT_EQ((Names{"SHARED", "Kept", "Count"}), listValues(target.get()).names); // names keep their case
  EXPECT_EQ(Names{"INNER"}, listSubkeys(target.get()).names);
  DWORD type = 0;
  string data;
  ASSERT_EQ(ERROR_SUCCESS, query(target.get(), "Count", type, data));
  EXPECT_EQ(static_cast<DWORD>(REG_DWORD), type);
  Key copied;
  ASSERT_EQ(ERROR_SUCCESS, open("Target\\Inner\\Deepest", copied));
  EXPECT_EQ("two", text(copied.get(), "Level"));
  ASSERT_EQ(ERROR_SUCCESS, open("Target\\Inner", copied));
  EXPECT_EQ("one", text(copied.get(), "Level"));
  EXPECT_EQ((Names{"Shared", "Count"}), listValues(source.get()).names); // the source stays
}

// Each call refused, in order, with what it leaves: a key with subkeys is not deleted, a tree is.
TEST_F(RegistryTest, RefusedCallsTellWhy) {
  Key key, target;
  ASSERT_EQ(ERROR_SUCCESS, create("Target", target));
  ASSERT_EQ(ERROR_SUCCESS, create("Parent\\Child", key));
  key.reset();
  HKEY closed = nullptr;
  ASSERT_EQ(ERROR_SUCCESS, RegOpenKeyExA(root_.get(), "", 0, KEY_READ, &closed));
  const struct {
    const char *call;
    LONG expected;
    std::function<LONG()> run;
  } rows[] = {
      {"open missing", ERROR_FILE_NOT_FOUND, [&] { return open("Missing\\Deeper", key); }},
      {"query missing", ERROR_FILE_NOT_FOUND,
       [&] { return RegQueryValueExA(root_.get(), "Missing", nullptr, nullptr, nullptr, nullptr); }},
      {"delete missing value", ERROR_FILE_NOT_FOUND, [&] { return RegDeleteValueA(root_.get(), "Missing"); }},
      {"copy missing", ERROR_FILE_NOT_FOUND,
       [&] { return SHCopyKeyA(root_.get(), "None", target.get(), 0); }},
      {"delete with subkeys", ERROR_ACCESS_DENIED, [&] { return RegDeleteKeyA(root_.get(), "Parent"); }},
      {"still there", ERROR_SUCCESS, [&] { return open("Parent\\Child", key); }},
      {"delete leaf", ERROR_SUCCESS,
       [&] { return key.reset(), RegDeleteKeyA(root_.get(), "Parent\\Child"); }},
      {"delete emptied", ERROR_SUCCESS, [&] { return RegDeleteKeyA(root_.get(), "Parent"); }},
      {"delete deleted", ERROR_FILE_NOT_FOUND, [&] { return RegDeleteKeyA(root_.get(), "Parent"); }},
      {"make tree", ERROR_SUCCESS,
       [&] {
         LONG rc = create("Tree\\Branch\\Leaf", key);
         return rc != ERROR_SUCCESS ? rc : RegSetValueExA(key.get(), "V", 0, REG_SZ, (const BYTE *)"x", 2);
       }},
      {"delete tree", ERROR_SUCCESS, [&] { return key.reset(), SHDeleteKeyA(root_.get(), "Tree"); }},
      {"tree gone", ERROR_FILE_NOT_FOUND, [&] { return open("Tree", key); }},
      {"delete tree again", ERROR_FILE_NOT_FOUND, [&] { return SHDeleteKeyA(root_.get(), "Tree"); }},
      {"close null", ERROR_INVALID_HANDLE, [] { return RegCloseKey(nullptr); }},
      {"close", ERROR_SUCCESS, [&] { return RegCloseKey(closed); }},
      {"close again", ERROR_INVALID_HANDLE, [&] { return RegCloseKey(closed); }},
  };
  for (const auto &row : rows)
    EXPECT_EQ(row.expected, row.run()) << row.call;
  EXPECT_TRUE(listSubkeys(target.get()).names.empty());
}

// The 32-bit view of HKLM\SOFTWARE is a tree of its own below WOW6432Node. Writing HKLM needs
// administrator rights on Windows.
TEST_F(Win32Test, ThirtyTwoBitViewLiesUnderWow6432Node) {
  const string name = "KxlConformance\\" + uniqueName();
  Key key, software;
  DWORD disposition = 0;
  LONG rc = RegCreateKeyExA(HKEY_LOCAL_MACHINE, ("SOFTWARE\\" + name).c_str(), 0, nullptr, 0,
                            KEY_ALL_ACCESS | KEY_WOW64_32KEY, nullptr, key.put(), &disposition);
  if (rc == ERROR_ACCESS_DENIED)
    GTEST_SKIP() << "HKEY_LOCAL_MACHINE is not writable for this account";
  ASSERT_EQ(ERROR_SUCCESS, rc);
  EXPECT_EQ(static_cast<DWORD>(REG_CREATED_NEW_KEY), disposition);
  auto opens = [&](const string &path, REGSAM view) {
    return RegOpenKeyExA(HKEY_LOCAL_MACHINE, path.c_str(), 0, KEY_READ | view, key.put());
  };
  EXPECT_EQ(ERROR_SUCCESS, opens("SOFTWARE\\" + name, KEY_WOW64_32KEY));
  EXPECT_EQ(ERROR_SUCCESS, opens("SOFTWARE\\WOW6432Node\\" + name, 0));
  EXPECT_EQ(ERROR_FILE_NOT_FOUND, opens("SOFTWARE\\" + name, 0));
  EXPECT_EQ(ERROR_FILE_NOT_FOUND, opens("SOFTWARE\\" + name, KEY_WOW64_64KEY));
  key.reset();
  ASSERT_EQ(ERROR_SUCCESS, RegOpenKeyExA(HKEY_LOCAL_MACHINE, "SOFTWARE", 0, KEY_ALL_ACCESS | KEY_WOW64_32KEY,
                                         software.put()));
  EXPECT_EQ(ERROR_SUCCESS, SHDeleteKeyA(software.get(), name.c_str()));
  RegDeleteKeyA(software.get(), "KxlConformance"); // only when no other run has keys there
}

} // namespace
} // namespace kxltest
