// Installed copies: building the list, one copy's registration, lookups and
// the version record.
#include "install/installcopy.h"
#include "install/kxlinstance.h"
#include "install_world.h"

#include <cstring>

namespace {

using kxltest::InstallWorld;
using Names = std::vector<std::string>;

class CopyList : public InstallWorld {};

TEST_F(CopyList, PutsTheVersion8InstallationFirst) {
  registerCopy("AKXL", "C:\\A");
  registerCopy("KXL95", "C:\\Prog\\KXL95");
  registerV8("C:\\SQLLIB");
  InstallCopyList list(false, false);
  ASSERT_EQ(0u, list.status);
  EXPECT_EQ(Names({"KXLV8", "AKXL", "KXL95"}), names(list));
  ASSERT_NE(nullptr, list.v8Copy);
  EXPECT_EQ(list.v8Copy, elements(list).front());
  char key[256] = {};
  ASSERT_EQ(0u, list.v8Copy->GetRegistryKey(key, sizeof key));
  EXPECT_STREQ("SOFTWARE\\ZAV\\KXL", key);
  EXPECT_EQ(1, list.v8Copy->IsV8Copy());
  InstallCopy *other = elements(list)[2];
  ASSERT_EQ(0u, other->GetRegistryKey(key, sizeof key));
  EXPECT_STREQ("SOFTWARE\\ZAV\\KXL\\InstalledCopies\\KXL95", key);
  EXPECT_EQ(0, other->IsV8Copy());
}

TEST_F(CopyList, TakesTheVersion8InstallationOnlyForVersion8) {
  registerCopy("KXL95", "C:\\Prog\\KXL95");
  setString("SOFTWARE\\ZAV\\KXL", "KXL Path Name", "C:\\SQLLIB");
  for (const char *version : {"9", "", "x8"}) {
    setString("SOFTWARE\\ZAV\\KXL\\CurrentVersion", "Version", version);
    InstallCopyList list(false, false);
    EXPECT_EQ(Names({"KXL95"}), names(list)) << version;
    EXPECT_EQ(nullptr, list.v8Copy);
  }
  // Only the leading number counts.
  setString("SOFTWARE\\ZAV\\KXL\\CurrentVersion", "Version", "8.2");
  InstallCopyList list(false, false);
  EXPECT_EQ(Names({"KXLV8", "KXL95"}), names(list));
}

TEST_F(CopyList, FailsWholeWhenTheVersion8InstallationCannotBeRead) {
  registerCopy("KXL95", "C:\\Prog\\KXL95");
  setString("SOFTWARE\\ZAV\\KXL\\CurrentVersion", "Version", "8");
  InstallCopyList list(false, false);
  EXPECT_EQ(1u, list.status);
  EXPECT_EQ(0, list.GetCount());
  EXPECT_EQ(nullptr, list.v8Copy);
}

TEST_F(CopyList, SkipsCopiesWithoutAPath) {
  registerCopy("GOOD1", "C:\\G1");
  createKey(HKEY_LOCAL_MACHINE, std::string(kCopies) + "HALF");
  setString(std::string(kCopies) + "HALF", "Other", "x");
  registerCopy("GOOD2", "C:\\G2");
  InstallCopyList list(false, false);
  EXPECT_EQ(0u, list.status);
  EXPECT_EQ(Names({"GOOD1", "GOOD2"}), names(list));
}

TEST_F(CopyList, IsEmptyButValidWithoutAnyRegistration) {
  InstallCopyList none(false, false);
  EXPECT_EQ(0u, none.status);
  EXPECT_EQ(0, none.GetCount());
  InstallCopy *found = nullptr;
  EXPECT_EQ(KXLI_RC_NAME_NOT_FOUND, none.Find("KXL95", &found));
  EXPECT_EQ(nullptr, found);
  registerV8("C:\\SQLLIB");
  InstallCopyList v8Only(false, false);
  EXPECT_EQ(0u, v8Only.status);
  EXPECT_EQ(Names({"KXLV8"}), names(v8Only));
}

TEST_F(CopyList, FailsWhenTheCopiesCannotBeEnumerated) {
  registerCopy("KXL95", "C:\\Prog\\KXL95");
  failCalls("RegEnumKeyExA:1");
  InstallCopyList list(false, false);
  EXPECT_EQ(1u, list.status);
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

TEST_F(Copy, RemovesOneTrailingBackslashFromItsPath) {
  registerCopy("A", "C:\\Prog\\KXL\\");
  registerCopy("B", "C:\\Prog\\KXL");
  registerCopy("C", "C:\\Prog\\KXL\\\\");
  const struct {
    const char *copy;
    const char *path;
  } cases[] = {{"A", "C:\\Prog\\KXL"}, {"B", "C:\\Prog\\KXL"}, {"C", "C:\\Prog\\KXL\\"}};
  for (const auto &c : cases) {
    InstallCopy copy(c.copy, false, false);
    char path[256] = {};
    ASSERT_EQ(0u, copy.GetPath(path, sizeof path));
    EXPECT_STREQ(c.path, path) << c.copy;
  }
}

TEST_F(Copy, ReportsWhyItIsUnusable) {
  InstallCopy missing("NOPE", false, false);
  EXPECT_EQ(KXLI_COPY_UNREADABLE, missing.GetStatus());
  // A 32-bit view copy is registered in the 32-bit view of the registry.
  const std::string view32Key = "SOFTWARE\\Wow6432Node\\ZAV\\KXL\\InstalledCopies\\KXL32";
  setString(view32Key, "KXL Path Name", "C:\\K32");
  InstallCopy noComponents("KXL32", true, false);
  EXPECT_EQ(KXLI_COPY_NO_COMPONENTS, noComponents.GetStatus());
  EXPECT_EQ(KXLI_VIEW32, noComponents.GetRegistryView());
  char path[256] = {};
  ASSERT_EQ(0u, noComponents.GetPath(path, sizeof path));
  EXPECT_STREQ("C:\\K32", path);
  // The default view does not see it.
  InstallCopy defaultView("KXL32", false, false);
  EXPECT_EQ(KXLI_COPY_UNREADABLE, defaultView.GetStatus());
  createKey(HKEY_LOCAL_MACHINE, view32Key + "\\Components");
  setString(view32Key + "\\COMPONENTS", "KXL Client", "");
  InstallCopy complete("KXL32", true, false);
  EXPECT_EQ(KXLI_COPY_OK, complete.GetStatus());
  EXPECT_EQ(Names({"KXL Client"}), strings(complete.GetComponents()));
  // Without the 32-bit view the Components key is not required.
  registerCopy("KXL64", "C:\\K64");
  InstallCopy bare("KXL64", false, false);
  EXPECT_EQ(KXLI_COPY_OK, bare.GetStatus());
  EXPECT_EQ(0, bare.GetComponents().GetCount());
}

TEST_F(Copy, ListsItsComponentsFromTheMachineOrTheUser) {
  std::string key = std::string(kCopies) + "KXL101";
  registerCopy("KXL101", "C:\\K101");
  setString(key + "\\COMPONENTS", "KXL Server", "");
  setString(key + "\\COMPONENTS", "KXL Client", "");
  InstallCopy machine("KXL101", false, false);
  EXPECT_EQ(0, machine.IsPerUserCopy());
  EXPECT_EQ(Names({"KXL Client", "KXL Server"}), strings(machine.GetComponents()));

  createKey(HKEY_LOCAL_MACHINE, key + "\\Users");
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

class Version : public InstallWorld {
protected:
  // GetVersion's code and the record, which is handed out in every case.
  uint32_t read(InstallCopy &copy, CopyVersion &record) {
    CopyVersion *out = nullptr;
    uint32_t rc = copy.GetVersion(&out);
    EXPECT_NE(nullptr, out);
    if (out != nullptr) {
      record = *out;
      delete out;
    }
    return rc;
  }
  static std::vector<int32_t> numbers(const CopyVersion &record) {
    return {record.version, record.release, record.modification, record.fixLevel};
  }
};

TEST_F(Version, FillsTheRecordFromCurrentVersion) {
  registerCopy("KXL95", "C:\\K95");
  setVersion(std::string(kCopies) + "KXL95", "9", "5", "0", "3", "kxl9.5.0.3");
  InstallCopy copy("KXL95", false, false);
  CopyVersion record{};
  ASSERT_EQ(0u, read(copy, record));
  EXPECT_EQ(std::vector<int32_t>({9, 5, 0, 3}), numbers(record));
  EXPECT_STREQ("kxl9.5.0.3", record.serviceLevel);
}

TEST_F(Version, OfTheVersion8InstallationHasNoFixLevel) {
  registerV8("C:\\SQLLIB");
  setVersion("SOFTWARE\\ZAV\\KXL", "8", "2", "1", "7", "");
  InstallCopy copy(KXLI_V8_COPY_NAME, false, false);
  CopyVersion record{};
  ASSERT_EQ(0u, read(copy, record));
  EXPECT_EQ(std::vector<int32_t>({8, 2, 1, 0}), numbers(record));
  EXPECT_STREQ("", record.serviceLevel);
}

TEST_F(Version, StopsAtTheFirstMissingValueWithTheRegistryCode) {
  registerCopy("KXL97", "C:\\K97");
  setVersion(std::string(kCopies) + "KXL97", "9", "7", "2", "", "kxl9.7");
  InstallCopy copy("KXL97", false, false);
  CopyVersion record{};
  EXPECT_EQ(static_cast<uint32_t>(ERROR_FILE_NOT_FOUND), read(copy, record));
  EXPECT_EQ(std::vector<int32_t>({9, 7, 2, 0}), numbers(record));
  EXPECT_STREQ("", record.serviceLevel);
}

TEST_F(Version, WithoutAVersionKeyGivesAnEmptyRecord) {
  registerCopy("KXL95", "C:\\K95");
  InstallCopy copy("KXL95", false, false);
  CopyVersion record{};
  record.version = 99;
  EXPECT_EQ(static_cast<uint32_t>(ERROR_FILE_NOT_FOUND), read(copy, record));
  EXPECT_EQ(0, record.version);
  EXPECT_EQ(KXLI_RC_NULL_ARGUMENT, copy.GetVersion(nullptr));
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
