// Registry behaviour the command relies on, as Windows has it.
#include "conformance.h"

#include <cstring>
#include <set>
#include <string>

namespace kxltest {
namespace {

using std::string;

// Names of the subkeys (or values) of a key, with the result that ended the walk.
struct Listing {
  std::set<string> names;
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

// --- Creating and opening keys -------------------------------------------

TEST_F(RegistryTest, CreateReportsNewThenExistingKey) {
  Key key;
  DWORD disposition = 0;
  ASSERT_EQ(ERROR_SUCCESS, create("Fresh", key, &disposition));
  EXPECT_EQ(static_cast<DWORD>(REG_CREATED_NEW_KEY), disposition);
  ASSERT_EQ(ERROR_SUCCESS, create("Fresh", key, &disposition));
  EXPECT_EQ(static_cast<DWORD>(REG_OPENED_EXISTING_KEY), disposition);
}

TEST_F(RegistryTest, CreateMakesEveryMissingIntermediateKey) {
  Key key;
  DWORD disposition = 0;
  ASSERT_EQ(ERROR_SUCCESS, create("One\\Two\\Three", key, &disposition));
  EXPECT_EQ(static_cast<DWORD>(REG_CREATED_NEW_KEY), disposition);
  Key probe;
  EXPECT_EQ(ERROR_SUCCESS, open("One", probe));
  EXPECT_EQ(ERROR_SUCCESS, open("One\\Two", probe));
  // The key created last is the one returned.
  setString(key.get(), "Marker", "7");
  ASSERT_EQ(ERROR_SUCCESS, open("One\\Two\\Three", probe));
  EXPECT_EQ("7", text(probe.get(), "Marker"));
}

TEST_F(RegistryTest, OpenOfMissingKeyIsFileNotFound) {
  Key key;
  EXPECT_EQ(ERROR_FILE_NOT_FOUND, open("Missing", key));
  EXPECT_EQ(ERROR_FILE_NOT_FOUND, open("Missing\\Deeper", key));
}

// --- Values --------------------------------------------------------------

TEST_F(RegistryTest, MissingValueIsFileNotFound) {
  EXPECT_EQ("<rc 2>", text(root_.get(), "Missing"));
  EXPECT_EQ(ERROR_FILE_NOT_FOUND, RegDeleteValueA(root_.get(), "Missing"));
}

TEST_F(RegistryTest, StringSizeCountsTheTerminatorAndNullDataQueriesIt) {
  setString(root_.get(), "Name", "abc");
  DWORD type = REG_NONE;
  DWORD size = 0;
  ASSERT_EQ(ERROR_SUCCESS, RegQueryValueExA(root_.get(), "Name", nullptr, &type, nullptr, &size));
  EXPECT_EQ(static_cast<DWORD>(REG_SZ), type);
  EXPECT_EQ(4u, size);
}

TEST_F(RegistryTest, ShortBufferIsMoreDataWithTheNeededSize) {
  setString(root_.get(), "Name", "abcdefgh");
  BYTE small[3];
  DWORD size = sizeof small;
  EXPECT_EQ(ERROR_MORE_DATA, RegQueryValueExA(root_.get(), "Name", nullptr, nullptr, small, &size));
  EXPECT_EQ(9u, size);
  // An exact fit succeeds.
  BYTE exact[9];
  size = sizeof exact;
  ASSERT_EQ(ERROR_SUCCESS, RegQueryValueExA(root_.get(), "Name", nullptr, nullptr, exact, &size));
  EXPECT_EQ(9u, size);
  EXPECT_STREQ("abcdefgh", reinterpret_cast<const char *>(exact));
}

// Reading does not expand the variables of REG_EXPAND_SZ.
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
}

TEST_F(RegistryTest, DefaultValueHasTheEmptyName) {
  setString(root_.get(), "", "default");
  EXPECT_EQ("default", text(root_.get(), ""));
  EXPECT_EQ("default", text(root_.get(), nullptr));
}

// --- Enumeration ---------------------------------------------------------

TEST_F(RegistryTest, EnumKeysListsEachSubkeyThenNoMoreItems) {
  Key key;
  for (const char *name : {"Zulu", "alpha", "Mike"})
    ASSERT_EQ(ERROR_SUCCESS, create(name, key));
  Key grandchild;
  ASSERT_EQ(ERROR_SUCCESS, create("Mike\\Inner", grandchild)); // not a direct subkey
  Listing listing = listSubkeys(root_.get());
  EXPECT_EQ(ERROR_NO_MORE_ITEMS, listing.end);
  EXPECT_EQ((std::set<string>{"Zulu", "alpha", "Mike"}), listing.names);
  EXPECT_TRUE(listing.lengthsMatch);
}

// Windows lists values in the order they were created and Wine sorts them: the
// command must not depend on either, so only the set of names is checked.
TEST_F(RegistryTest, EnumValuesListsEachValueThenNoMoreItems) {
  setString(root_.get(), "Zeta", "1");
  setDword(root_.get(), "alpha", 2);
  setString(root_.get(), "Mid", "three");
  Listing listing = listValues(root_.get());
  EXPECT_EQ(ERROR_NO_MORE_ITEMS, listing.end);
  EXPECT_EQ((std::set<string>{"Zeta", "alpha", "Mid"}), listing.names);
  EXPECT_TRUE(listing.lengthsMatch);
}

TEST_F(RegistryTest, EnumValueReportsTypeAndDataSize) {
  setString(root_.get(), "Only", "hello");
  char name[32];
  DWORD length = sizeof name;
  DWORD type = REG_NONE;
  BYTE data[32];
  DWORD size = sizeof data;
  ASSERT_EQ(ERROR_SUCCESS, RegEnumValueA(root_.get(), 0, name, &length, nullptr, &type, data, &size));
  EXPECT_STREQ("Only", name);
  EXPECT_EQ(4u, length);
  EXPECT_EQ(static_cast<DWORD>(REG_SZ), type);
  EXPECT_EQ(6u, size);
  EXPECT_STREQ("hello", reinterpret_cast<const char *>(data));
}

TEST_F(RegistryTest, EnumerationWithShortBuffersIsMoreData) {
  Key key;
  ASSERT_EQ(ERROR_SUCCESS, create("RatherLongName", key));
  setString(root_.get(), "RatherLongValueName", "long enough data");
  char name[4];
  DWORD length = sizeof name;
  EXPECT_EQ(ERROR_MORE_DATA,
            RegEnumKeyExA(root_.get(), 0, name, &length, nullptr, nullptr, nullptr, nullptr));
  length = sizeof name;
  EXPECT_EQ(ERROR_MORE_DATA,
            RegEnumValueA(root_.get(), 0, name, &length, nullptr, nullptr, nullptr, nullptr));
  // A data buffer too small is refused as well.
  char fullName[64];
  length = sizeof fullName;
  BYTE data[4];
  DWORD size = sizeof data;
  EXPECT_EQ(ERROR_MORE_DATA, RegEnumValueA(root_.get(), 0, fullName, &length, nullptr, nullptr, data, &size));
  // Room for the name and its terminator is enough.
  char fits[15];
  length = sizeof fits;
  ASSERT_EQ(ERROR_SUCCESS, RegEnumKeyExA(root_.get(), 0, fits, &length, nullptr, nullptr, nullptr, nullptr));
  EXPECT_EQ(14u, length);
  EXPECT_STREQ("RatherLongName", fits);
}

// --- Names ---------------------------------------------------------------

TEST_F(RegistryTest, KeyNamesIgnoreCaseAndKeepTheirCase) {
  Key key;
  ASSERT_EQ(ERROR_SUCCESS, create("MixedCase", key));
  Key other;
  EXPECT_EQ(ERROR_SUCCESS, open("MIXEDCASE", other));
  DWORD disposition = 0;
  ASSERT_EQ(ERROR_SUCCESS, create("mixedcase", other, &disposition));
  EXPECT_EQ(static_cast<DWORD>(REG_OPENED_EXISTING_KEY), disposition);
  EXPECT_EQ((std::set<string>{"MixedCase"}), listSubkeys(root_.get()).names);
}

TEST_F(RegistryTest, ValueNamesIgnoreCaseAndKeepTheirCase) {
  setString(root_.get(), "ValueName", "first");
  EXPECT_EQ("first", text(root_.get(), "VALUENAME"));
  // Writing under another case replaces the data and keeps the stored name.
  setString(root_.get(), "valuename", "second");
  EXPECT_EQ("second", text(root_.get(), "ValueName"));
  EXPECT_EQ((std::set<string>{"ValueName"}), listValues(root_.get()).names);
}

// --- Copying and deleting trees ------------------------------------------

TEST_F(RegistryTest, CopyKeyMergesValuesAndTheWholeSubtree) {
  Key source, inner, deepest, target;
  ASSERT_EQ(ERROR_SUCCESS, create("Source", source));
  setString(source.get(), "Shared", "from source");
  setDword(source.get(), "Count", 3);
  ASSERT_EQ(ERROR_SUCCESS, create("Source\\Inner", inner));
  setString(inner.get(), "Level", "one");
  ASSERT_EQ(ERROR_SUCCESS, create("Source\\Inner\\Deepest", deepest));
  setString(deepest.get(), "Level", "two");
  ASSERT_EQ(ERROR_SUCCESS, create("Target", target));
  setString(target.get(), "Shared", "old");
  setString(target.get(), "Kept", "untouched");

  ASSERT_EQ(ERROR_SUCCESS, SHCopyKeyA(root_.get(), "Source", target.get(), 0));
  EXPECT_EQ("from source", text(target.get(), "Shared"));
  EXPECT_EQ("untouched", text(target.get(), "Kept"));
  DWORD type = 0;
  string data;
  ASSERT_EQ(ERROR_SUCCESS, query(target.get(), "Count", type, data));
  EXPECT_EQ(static_cast<DWORD>(REG_DWORD), type);
  Key copied;
  ASSERT_EQ(ERROR_SUCCESS, open("Target\\Inner\\Deepest", copied));
  EXPECT_EQ("two", text(copied.get(), "Level"));
  ASSERT_EQ(ERROR_SUCCESS, open("Target\\Inner", copied));
  EXPECT_EQ("one", text(copied.get(), "Level"));
  // The source stays as it was.
  EXPECT_EQ((std::set<string>{"Shared", "Count"}), listValues(source.get()).names);
}

TEST_F(RegistryTest, CopyKeyFromMissingSourceIsFileNotFound) {
  Key target;
  ASSERT_EQ(ERROR_SUCCESS, create("Target", target));
  EXPECT_EQ(ERROR_FILE_NOT_FOUND, SHCopyKeyA(root_.get(), "NoSuchSource", target.get(), 0));
  EXPECT_TRUE(listSubkeys(target.get()).names.empty());
}

TEST_F(RegistryTest, DeleteKeyTreeRemovesTheSubtree) {
  Key key;
  ASSERT_EQ(ERROR_SUCCESS, create("Tree\\Branch\\Leaf", key));
  setString(key.get(), "Value", "x");
  key.reset();
  EXPECT_EQ(ERROR_SUCCESS, SHDeleteKeyA(root_.get(), "Tree"));
  EXPECT_EQ(ERROR_FILE_NOT_FOUND, open("Tree", key));
  EXPECT_EQ(ERROR_FILE_NOT_FOUND, SHDeleteKeyA(root_.get(), "Tree"));
}

TEST_F(RegistryTest, DeleteKeyRefusesAKeyWithSubkeys) {
  Key key;
  ASSERT_EQ(ERROR_SUCCESS, create("Parent\\Child", key));
  key.reset();
  EXPECT_EQ(ERROR_ACCESS_DENIED, RegDeleteKeyA(root_.get(), "Parent"));
  EXPECT_EQ(ERROR_SUCCESS, open("Parent\\Child", key));
  key.reset();
  EXPECT_EQ(ERROR_SUCCESS, RegDeleteKeyA(root_.get(), "Parent\\Child"));
  EXPECT_EQ(ERROR_SUCCESS, RegDeleteKeyA(root_.get(), "Parent"));
  EXPECT_EQ(ERROR_FILE_NOT_FOUND, RegDeleteKeyA(root_.get(), "Parent"));
}

TEST_F(RegistryTest, CloseOfABadHandleIsInvalidHandle) {
  EXPECT_EQ(ERROR_INVALID_HANDLE, RegCloseKey(nullptr));
  HKEY key = nullptr;
  ASSERT_EQ(ERROR_SUCCESS, RegOpenKeyExA(root_.get(), "", 0, KEY_READ, &key));
  EXPECT_EQ(ERROR_SUCCESS, RegCloseKey(key));
  EXPECT_EQ(ERROR_INVALID_HANDLE, RegCloseKey(key));
}

// --- The 32-bit view of HKLM\SOFTWARE ------------------------------------

class RegistryViewTest : public Win32Test {
protected:
  void SetUp() override {
    Win32Test::SetUp();
    if (HasFatalFailure())
      return;
    path_ = "SOFTWARE\\KxlConformance\\" + uniqueName();
  }
  void TearDown() override {
    for (REGSAM view : {static_cast<REGSAM>(KEY_WOW64_32KEY), static_cast<REGSAM>(KEY_WOW64_64KEY)}) {
      Key software;
      if (RegOpenKeyExA(HKEY_LOCAL_MACHINE, "SOFTWARE", 0, KEY_ALL_ACCESS | view, software.put()) == 0) {
        SHDeleteKeyA(software.get(), path_.c_str() + std::strlen("SOFTWARE\\"));
        RegDeleteKeyA(software.get(), "KxlConformance");
      }
    }
    Win32Test::TearDown();
  }
  LONG createIn(REGSAM view, Key &key, DWORD *disposition) {
    return RegCreateKeyExA(HKEY_LOCAL_MACHINE, path_.c_str(), 0, nullptr, REG_OPTION_NON_VOLATILE,
                           KEY_ALL_ACCESS | view, nullptr, key.put(), disposition);
  }
  LONG openIn(REGSAM view, Key &key) {
    return RegOpenKeyExA(HKEY_LOCAL_MACHINE, path_.c_str(), 0, KEY_READ | view, key.put());
  }
  // Writing HKLM needs administrator rights on Windows.
  bool mayWrite(LONG rc) { return rc != ERROR_ACCESS_DENIED; }

  string path_;
};

TEST_F(RegistryViewTest, ThirtyTwoBitViewIsSeparateFromTheSixtyFourBitView) {
  Key key;
  DWORD disposition = 0;
  LONG rc = createIn(KEY_WOW64_32KEY, key, &disposition);
  if (!mayWrite(rc))
    GTEST_SKIP() << "HKEY_LOCAL_MACHINE is not writable for this account";
  ASSERT_EQ(ERROR_SUCCESS, rc);
  EXPECT_EQ(static_cast<DWORD>(REG_CREATED_NEW_KEY), disposition);
  Key probe;
  EXPECT_EQ(ERROR_SUCCESS, openIn(KEY_WOW64_32KEY, probe));
  EXPECT_EQ(ERROR_FILE_NOT_FOUND, openIn(0, probe));
  EXPECT_EQ(ERROR_FILE_NOT_FOUND, openIn(KEY_WOW64_64KEY, probe));
  // The same path in the 64-bit view is a key of its own.
  Key native;
  ASSERT_EQ(ERROR_SUCCESS, createIn(0, native, &disposition));
  EXPECT_EQ(static_cast<DWORD>(REG_CREATED_NEW_KEY), disposition);
}

TEST_F(RegistryViewTest, ThirtyTwoBitViewLiesUnderWow6432Node) {
  Key key;
  LONG rc = createIn(KEY_WOW64_32KEY, key, nullptr);
  if (!mayWrite(rc))
    GTEST_SKIP() << "HKEY_LOCAL_MACHINE is not writable for this account";
  ASSERT_EQ(ERROR_SUCCESS, rc);
  string redirected = "SOFTWARE\\WOW6432Node\\" + path_.substr(std::strlen("SOFTWARE\\"));
  Key probe;
  EXPECT_EQ(ERROR_SUCCESS, RegOpenKeyExA(HKEY_LOCAL_MACHINE, redirected.c_str(), 0, KEY_READ, probe.put()));
}

} // namespace
} // namespace kxltest
