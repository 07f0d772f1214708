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
  setDword(key.get(), "Marker", 7);
  ASSERT_EQ(ERROR_SUCCESS, open("One\\Two\\Three", probe));
  DWORD type = 0;
  string data;
  EXPECT_EQ(ERROR_SUCCESS, query(probe.get(), "Marker", type, data));
}

TEST_F(RegistryTest, OpenOfMissingKeyIsFileNotFound) {
  Key key;
  EXPECT_EQ(ERROR_FILE_NOT_FOUND, open("Missing", key));
  EXPECT_EQ(ERROR_FILE_NOT_FOUND, open("Missing\\Deeper", key));
}

// --- Values --------------------------------------------------------------

TEST_F(RegistryTest, MissingValueIsFileNotFound) {
  DWORD type = 0;
  string data;
  EXPECT_EQ(ERROR_FILE_NOT_FOUND, query(root_.get(), "Missing", type, data));
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

TEST_F(RegistryTest, EveryValueTypeRoundTrips) {
  const BYTE binary[] = {0x00, 0xFF, 0x10, 0x00, 0x7F};
  ASSERT_EQ(ERROR_SUCCESS, RegSetValueExA(root_.get(), "Bin", 0, REG_BINARY, binary, sizeof binary));
  setDword(root_.get(), "Dword", 0xDEADBEEF);
  const char multi[] = "first\0second\0"; // two strings and the closing empty one
  ASSERT_EQ(ERROR_SUCCESS, RegSetValueExA(root_.get(), "Multi", 0, REG_MULTI_SZ,
                                          reinterpret_cast<const BYTE *>(multi), sizeof multi));
  setString(root_.get(), "Expand", "%SystemRoot%\\kxl", REG_EXPAND_SZ);

  DWORD type = 0;
  string data;
  ASSERT_EQ(ERROR_SUCCESS, query(root_.get(), "Bin", type, data));
  EXPECT_EQ(static_cast<DWORD>(REG_BINARY), type);
  EXPECT_EQ(string(reinterpret_cast<const char *>(binary), sizeof binary), data);

  ASSERT_EQ(ERROR_SUCCESS, query(root_.get(), "Dword", type, data));
  EXPECT_EQ(static_cast<DWORD>(REG_DWORD), type);
  ASSERT_EQ(4u, data.size());
  DWORD number = 0;
  std::memcpy(&number, data.data(), sizeof number);
  EXPECT_EQ(0xDEADBEEFu, number);

  ASSERT_EQ(ERROR_SUCCESS, query(root_.get(), "Multi", type, data));
  EXPECT_EQ(static_cast<DWORD>(REG_MULTI_SZ), type);
  EXPECT_EQ(string(multi, sizeof multi), data);

  // Reading does not expand the variables.
  ASSERT_EQ(ERROR_SUCCESS, query(root_.get(), "Expand", type, data));
  EXPECT_EQ(static_cast<DWORD>(REG_EXPAND_SZ), type);
  EXPECT_EQ(string("%SystemRoot%\\kxl", sizeof "%SystemRoot%\\kxl"), data);
}

TEST_F(RegistryTest, DefaultValueHasTheEmptyName) {
  setString(root_.get(), "", "default");
  DWORD type = 0;
  string viaEmpty, viaNull;
  ASSERT_EQ(ERROR_SUCCESS, query(root_.get(), "", type, viaEmpty));
  ASSERT_EQ(ERROR_SUCCESS, query(root_.get(), nullptr, type, viaNull));
  EXPECT_EQ(viaEmpty, viaNull);
  EXPECT_STREQ("default", viaNull.c_str());
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
  DWORD type = 0;
  string data;
  ASSERT_EQ(ERROR_SUCCESS, query(root_.get(), "VALUENAME", type, data));
  EXPECT_STREQ("first", data.c_str());
  // Writing under another case replaces the data and keeps the stored name.
  setString(root_.get(), "valuename", "second");
  ASSERT_EQ(ERROR_SUCCESS, query(root_.get(), "ValueName", type, data));
  EXPECT_STREQ("second", data.c_str());
  EXPECT_EQ((std::set<string>{"ValueName"}), listValues(root_.get()).names);
}

// --- Copying and deleting trees ------------------------------------------

TEST_F(RegistryTest, CopyKeyMergesValuesAndTheWholeSubtree) {
  Key source, inner, deepest;
  ASSERT_EQ(ERROR_SUCCESS, create("Source", source));
  setString(source.get(), "Shared", "from source");
  setDword(source.get(), "Count", 3);
  ASSERT_EQ(ERROR_SUCCESS, create("Source\\Inner", inner));
  setString(inner.get(), "Level", "one");
  ASSERT_EQ(ERROR_SUCCESS, create("Source\\Inner\\Deepest", deepest));
  setString(deepest.get(), "Level", "two");

  Key target;
  ASSERT_EQ(ERROR_SUCCESS, create("Target", target));
  setString(target.get(), "Shared", "old");
  setString(target.get(), "Kept", "untouched");

  ASSERT_EQ(ERROR_SUCCESS, SHCopyKeyA(root_.get(), "Source", target.get(), 0));

  DWORD type = 0;
  string data;
  ASSERT_EQ(ERROR_SUCCESS, query(target.get(), "Shared", type, data));
  EXPECT_STREQ("from source", data.c_str());
  ASSERT_EQ(ERROR_SUCCESS, query(target.get(), "Kept", type, data));
  EXPECT_STREQ("untouched", data.c_str());
  ASSERT_EQ(ERROR_SUCCESS, query(target.get(), "Count", type, data));
  EXPECT_EQ(static_cast<DWORD>(REG_DWORD), type);
  Key copied;
  ASSERT_EQ(ERROR_SUCCESS, open("Target\\Inner\\Deepest", copied));
  ASSERT_EQ(ERROR_SUCCESS, query(copied.get(), "Level", type, data));
  EXPECT_STREQ("two", data.c_str());
  ASSERT_EQ(ERROR_SUCCESS, open("Target\\Inner", copied));
  ASSERT_EQ(ERROR_SUCCESS, query(copied.get(), "Level", type, data));
  EXPECT_STREQ("one", data.c_str());
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
