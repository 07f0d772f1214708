// Installed copies: building the list, one copy's registration, lookups and
// the version record.
#include "install/installcopy.h"
#include "install/kxlinstance.h"
#include "install_world.h"

#include <cstdio>
#include <sstream>

namespace {

using kxltest::InstallWorld;
using Names = std::vector<std::string>;

class CopyList : public InstallWorld {};

// The list: the version-8 installation first (its copy key is the product
// root), taken only for a version whose leading number is 8 and failing the
// whole list when it cannot be read; copies without a path are passed over.
TEST_F(CopyList, BuiltFromTheRegistrations) {
  const struct {
    const char *copies;  // "NAME" registered at C:\NAME; "NAME=" without a path
    const char *version; // of the version-8 layout, null: none
    const char *v8Path;  // null: none
    const char *fault;
    uint32_t status;
    const char *names;
  } rows[] = {
      {"AKXL KXL95", "8", "C:\\SQLLIB", nullptr, 0, "KXLV8 AKXL KXL95"},
      {"KXL95", "9", "C:\\SQLLIB", nullptr, 0, "KXL95"},
      {"KXL95", "", "C:\\SQLLIB", nullptr, 0, "KXL95"},
      {"KXL95", "x8", "C:\\SQLLIB", nullptr, 0, "KXL95"},
      {"KXL95", "8.2", "C:\\SQLLIB", nullptr, 0, "KXLV8 KXL95"},
      {"KXL95", "8", nullptr, nullptr, 1, ""},
      {"GOOD1 HALF= GOOD2", nullptr, nullptr, nullptr, 0, "GOOD1 GOOD2"},
      {"", nullptr, nullptr, nullptr, 0, ""},
      {"", "8", "C:\\SQLLIB", nullptr, 0, "KXLV8"},
      {"KXL95", nullptr, nullptr, "RegEnumKeyExA:1", 1, ""},
  };
  for (const auto &row : rows) {
    SCOPED_TRACE(std::string(row.copies) + " / " + (row.version != nullptr ? row.version : "-"));
    SHDeleteKeyA(HKEY_LOCAL_MACHINE, "SOFTWARE\\ZAV\\KXL");
    std::istringstream copies(row.copies);
    for (std::string copy; copies >> copy;)
      if (copy.back() == '=')
        setString(kCopies + copy.substr(0, copy.size() - 1), "Other", "x");
      else
        registerCopy(copy, "C:\\" + copy);
    if (row.version != nullptr)
      setString("SOFTWARE\\ZAV\\KXL\\CurrentVersion", "Version", row.version);
    if (row.v8Path != nullptr)
      setString("SOFTWARE\\ZAV\\KXL", "KXL Path Name", row.v8Path);
    failCalls(row.fault);
    InstallCopyList list(false, false);
    failCalls(nullptr);
    EXPECT_EQ(row.status, list.status);
    std::string listed;
    for (InstallCopy *copy : elements(list)) {
      char name[65] = {}, key[256] = {};
      copy->GetName(name, sizeof name);
      listed += (listed.empty() ? "" : " ") + std::string(name);
      ASSERT_EQ(0u, copy->GetRegistryKey(key, sizeof key));
      bool v8 = listed == KXLI_V8_COPY_NAME;
      EXPECT_EQ(v8 ? "SOFTWARE\\ZAV\\KXL" : kCopies + std::string(name), key);
      EXPECT_EQ(v8, copy == list.v8Copy);
      EXPECT_EQ(v8 ? 1 : 0, copy->IsV8Copy());
    }
    EXPECT_EQ(row.names, listed);
    EXPECT_EQ(listed.starts_with(KXLI_V8_COPY_NAME), list.v8Copy != nullptr);
  }
  SHDeleteKeyA(HKEY_LOCAL_MACHINE, "SOFTWARE\\ZAV\\KXL");
  InstallCopyList none(false, false);
  InstallCopy *found = nullptr;
  EXPECT_EQ(KXLI_RC_NAME_NOT_FOUND, none.Find("KXL95", &found));
  EXPECT_EQ(nullptr, found);
}

TEST_F(CopyList, FindsCopiesIgnoringCaseAndKeepsTheCallersCursor) {
  registerCopy("COPY1", "C:\\C1");
  registerCopy("COPY2", "C:\\C2");
  registerCopy("COPY3", "C:\\C3");
  InstallCopyList list(false, false);
  InstallCopy *walked = list.Next();
  walked = list.Next();
  InstallCopy *found = nullptr;
  ASSERT_EQ(0u, list.Find("copy1", &found));
  char name[65] = {};
  found->GetName(name, sizeof name);
  EXPECT_STREQ("COPY1", name);
  EXPECT_EQ(walked, list.Current());
  InstallCopy *untouched = found;
  EXPECT_EQ(KXLI_RC_NAME_NOT_FOUND, list.Find("COPY", &untouched));
  EXPECT_EQ(found, untouched);
  EXPECT_EQ(walked, list.Current());
  EXPECT_EQ(KXLI_RC_NULL_ARGUMENT, list.Find("COPY1", nullptr));
}

class Copy : public InstallWorld {};

// A copy's path loses one trailing backslash. A 32-bit view copy is
// registered in the 32-bit view of the registry, which the default view does
// not see, and needs its Components key; without the 32-bit view that key is
// not required.
TEST_F(Copy, ReadsItsPathAndTellsWhyItIsUnusable) {
  registerCopy("A", "C:\\Prog\\KXL\\");
  registerCopy("B", "C:\\Prog\\KXL");
  registerCopy("C", "C:\\Prog\\KXL\\\\");
  registerCopy("KXL64", "C:\\K64");
  const std::string view32Key = "SOFTWARE\\Wow6432Node\\ZAV\\KXL\\InstalledCopies\\KXL32";
  setString(view32Key, "KXL Path Name", "C:\\K32");
  const struct {
    const char *copy;
    bool view32;
    uint32_t status;
    const char *path;
  } rows[] = {{"A", false, KXLI_COPY_OK, "C:\\Prog\\KXL"},        {"B", false, KXLI_COPY_OK, "C:\\Prog\\KXL"},
              {"C", false, KXLI_COPY_OK, "C:\\Prog\\KXL\\"},      {"KXL64", false, KXLI_COPY_OK, "C:\\K64"},
              {"NOPE", false, KXLI_COPY_UNREADABLE, ""},          {"KXL32", false, KXLI_COPY_UNREADABLE, ""},
              {"KXL32", true, KXLI_COPY_NO_COMPONENTS, "C:\\K32"}};
  for (const auto &row : rows) {
    InstallCopy copy(row.copy, row.view32, false);
    EXPECT_EQ(row.status, copy.GetStatus()) << row.copy;
    char path[256] = {};
    copy.GetPath(path, sizeof path);
    EXPECT_STREQ(row.path, path) << row.copy;
    EXPECT_EQ(0, copy.GetComponents().GetCount());
    EXPECT_TRUE(!row.view32 || copy.GetRegistryView() == KXLI_VIEW32);
  }
  setString(view32Key + "\\COMPONENTS", "KXL Client", "");
  InstallCopy complete("KXL32", true, false);
  EXPECT_EQ(KXLI_COPY_OK, complete.GetStatus());
  EXPECT_EQ(Names({"KXL Client"}), strings(complete.GetComponents()));
}

TEST_F(Copy, ListsItsComponentsFromTheMachineOrTheUser) {
  std::string key = std::string(kCopies) + "KXL101";
  registerCopy("KXL101", "C:\\K101");
  setString(key + "\\COMPONENTS", "KXL Server", "");
  setString(key + "\\COMPONENTS", "KXL Client", "");
  InstallCopy machine("KXL101", false, false);
  EXPECT_EQ(0, machine.IsPerUserCopy());
  EXPECT_EQ(Names({"KXL Client", "KXL Server"}), strings(machine.GetComponents()));

  setValue(HKEY_LOCAL_MACHINE, key + "\\Users");
  setValue(HKEY_CURRENT_USER, key + "\\COMPONENTS", "KXL Own Client", "");
  InstallCopy perUser("KXL101", false, false);
  EXPECT_EQ(1, perUser.IsPerUserCopy());
  EXPECT_EQ(Names({"KXL Own Client"}), strings(perUser.GetComponents()));
}

TEST_F(Copy, StringGettersNeedRoomForTheTerminator) {
  registerCopy("KXL95", "C:\\Prog");
  InstallCopy copy("KXL95", false, false);
  char name[6] = {'x', 'x', 'x', 'x', 'x', 'x'};
  EXPECT_EQ(KXLI_RC_BUFFER_TOO_SMALL, copy.GetName(name, 5));
  EXPECT_EQ('x', name[0]);
  EXPECT_EQ(0u, copy.GetName(name, 6));
  EXPECT_STREQ("KXL95", name);
  EXPECT_EQ(KXLI_RC_NULL_ARGUMENT, copy.GetName(nullptr, 6));
  EXPECT_EQ(KXLI_RC_BUFFER_TOO_SMALL, copy.GetPath(name, 7));
  EXPECT_EQ(KXLI_RC_NULL_ARGUMENT, copy.GetRegistryKey(nullptr, 300));
  // A name is cut to 64 characters.
  InstallCopy longName(std::string(70, 'N').c_str(), false, false);
  char cut[80] = {};
  ASSERT_EQ(0u, longName.GetName(cut, sizeof cut));
  EXPECT_EQ(std::string(64, 'N'), cut);
}

// The version record from CurrentVersion, handed out in every case: the
// version-8 installation has no fix level; reading stops at the first missing
// value with the registry's code; without the key the record is empty.
TEST_F(Copy, ReadsItsVersionRecord) {
  registerV8("C:\\SQLLIB");
  setVersion("SOFTWARE\\ZAV\\KXL", "8", "2", "1", "7", "");
  registerCopy("KXL95", "C:\\K95");
  setVersion(std::string(kCopies) + "KXL95", "9", "5", "0", "3", "kxl9.5.0.3");
  registerCopy("KXL97", "C:\\K97");
  setVersion(std::string(kCopies) + "KXL97", "9", "7", "2", "", "kxl9.7");
  registerCopy("KXL98", "C:\\K98");
  const struct {
    const char *copy;
    uint32_t rc;
    const char *record; // "version.release.modification.fix service"
  } rows[] = {{"KXL95", 0, "9.5.0.3 kxl9.5.0.3"},
              {KXLI_V8_COPY_NAME, 0, "8.2.1.0 "},
              {"KXL97", ERROR_FILE_NOT_FOUND, "9.7.2.0 "},
              {"KXL98", ERROR_FILE_NOT_FOUND, "0.0.0.0 "}};
  for (const auto &row : rows) {
    InstallCopy copy(row.copy, false, false);
    CopyVersion *out = nullptr;
    EXPECT_EQ(row.rc, copy.GetVersion(&out)) << row.copy;
    ASSERT_NE(nullptr, out) << row.copy;
    char record[128] = {};
    std::snprintf(record, sizeof record, "%d.%d.%d.%d %s", out->version, out->release, out->modification,
                  out->fixLevel, out->serviceLevel);
    EXPECT_STREQ(row.record, record) << row.copy;
    delete out;
    EXPECT_EQ(KXLI_RC_NULL_ARGUMENT, copy.GetVersion(nullptr));
  }
}

TEST_F(Copy, KeepsItsInstanceListAndRetriesAFailedOne) {
  registerCopy("KXL95", "C:\\K95");
  registerInstance("INST1", "C:\\K95\\INST1", "KXL95");
  InstallCopy copy("KXL95", false, false);
  EXPECT_EQ(KXLI_RC_NULL_ARGUMENT, copy.GetInstanceList(nullptr));
  failCalls("ossOpenInstanceList:1");
  IKXLINSTANCELIST *list = nullptr;
  EXPECT_EQ(KXLI_RC_NOT_USABLE, copy.GetInstanceList(&list));
  EXPECT_EQ(nullptr, list);
  // The failed build is not handed out later as if it were whole.
  ASSERT_EQ(0u, copy.GetInstanceList(&list));
  ASSERT_NE(nullptr, list);
  EXPECT_EQ(1, list->GetCount());
  IKXLINSTANCELIST *again = nullptr;
  ASSERT_EQ(0u, copy.GetInstanceList(&again));
  EXPECT_EQ(list, again);
  InstallCopy nameless("", false, false);
  EXPECT_EQ(KXLI_RC_NOT_USABLE, nameless.GetInstanceList(&again));
}

} // namespace
