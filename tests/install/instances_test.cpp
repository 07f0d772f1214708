// Instances of a copy: membership from the instance registry, cluster
// membership, the configuration snapshot and the getters.
#include "install/installcopy.h"
#include "install/kxlinstance.h"
#include "install_world.h"

#include <memory>

namespace {

using kxltest::InstallWorld;
using Names = std::vector<std::string>;

// Instances of the version-8 installation and two copies: registered under
// their copy (in any case; none: the version-8 installation), clustered when
// their profile names a cluster, with or without a configuration file.
class Instances : public InstallWorld {
protected:
  void SetUp() override {
    InstallWorld::SetUp();
    registerV8("C:\\SQLLIB");
    registerCopy("KXL95", "C:\\Prog\\KXL95");
    registerCopy("KXL101", "C:\\Prog\\KXL101");
    for (const auto &[name, directory, copy] : {std::tuple{"INST1", "C:\\Prog\\KXL95\\INST1", "kxl95"},
                                                {"CLU1", "C:\\Prog\\KXL95\\CLU1", "KXL95"},
                                                {"NEW1", "C:\\Prog\\KXL101\\NEW1", "KXL101"},
                                                {"V8INST", "C:\\SQLLIB\\V8INST", ""},
                                                {"PROF1", "D:\\profiles\\PROF1", "KXL95"},
                                                {"V8CLU", "C:\\SQLLIB\\V8CLU", ""}})
      registerInstance(name, directory, copy);
    setString(std::string(kCopies) + "KXL95\\PROFILES\\CLU1", "KXLCLUSTER", "KXLCLUS");
    setString(std::string(kCopies) + "KXL95\\PROFILES\\INST1", "KXLPATH", "C:\\x");
    setString("SOFTWARE\\ZAV\\KXL\\PROFILES\\V8CLU", "KXLCLUSTER", "OLDCLUS");
    writeFile("C:\\Prog\\KXL95\\INST1\\kxlsystm", configImage(4));
    makeDirectories("C:\\Prog\\KXL95\\CLU1");
  }

  // The instance list of `copyName` in a fresh copy list.
  IKXLINSTANCELIST *instancesOf(const char *copyName) {
    copies_ = std::make_unique<InstallCopyList>(false, false);
    InstallCopy *copy = nullptr;
    EXPECT_EQ(0u, copies_->Find(copyName, &copy));
    IKXLINSTANCELIST *list = nullptr;
    if (copy != nullptr) {
      EXPECT_EQ(0u, copy->GetInstanceList(&list));
    }
    return list;
  }

  IKXLINSTANCE *instance(const char *copyName, const char *name) {
    IKXLINSTANCELIST *list = instancesOf(copyName);
    IKXLINSTANCE *found = nullptr;
    if (list != nullptr) {
      EXPECT_EQ(0u, list->Find(name, &found));
    }
    return found;
  }

  std::unique_ptr<InstallCopyList> copies_;
};

TEST_F(Instances, BelongToTheCopyNamedInTheInstanceRegistry) {
  EXPECT_EQ(Names({"CLU1", "INST1", "PROF1"}), names(*instancesOf("KXL95")));
  EXPECT_EQ(Names({"NEW1"}), names(*instancesOf("KXL101")));
  EXPECT_EQ(Names({"V8CLU", "V8INST"}), names(*instancesOf("KXLV8")));
  IKXLINSTANCELIST *list = instancesOf("KXL95");
  IKXLINSTANCE *found = nullptr;
  ASSERT_EQ(0u, list->Find("inst1", &found));
  char text[256] = {};
  ASSERT_EQ(0u, found->GetInstanceDir(text, sizeof text));
  EXPECT_STREQ("C:\\Prog\\KXL95\\INST1", text);
  EXPECT_EQ(KXLI_RC_NAME_NOT_FOUND, list->Find("INST", &found));
  EXPECT_EQ(KXLI_RC_NULL_ARGUMENT, list->Find("INST1", nullptr));
  // Its copy and parent directory; "D:\profiles" needs 12 bytes.
  IKXLINSTANCE *prof = instance("KXL95", "PROF1");
  ASSERT_NE(nullptr, prof);
  ASSERT_EQ(0u, prof->GetCopyName(text, sizeof text));
  EXPECT_STREQ("KXL95", text);
  ASSERT_EQ(0u, prof->GetInstanceParentDir(text, sizeof text));
  EXPECT_STREQ("D:\\profiles", text);
  EXPECT_EQ(KXLI_RC_BUFFER_TOO_SMALL, prof->GetInstanceParentDir(text, 11));
  EXPECT_EQ(0u, prof->GetInstanceParentDir(text, 12));
  EXPECT_EQ(KXLI_RC_NULL_ARGUMENT, prof->GetInstanceParentDir(nullptr, 12));
}

TEST_F(Instances, ListFailsWhenTheInstanceRegistryFails) {
  failCalls("ossGetNextInstance:1");
  IKXLINSTANCELIST failed("KXL95");
  EXPECT_EQ(1u, failed.status);
  IKXLINSTANCELIST ownerless(nullptr);
  EXPECT_EQ(1u, ownerless.status);
  IKXLINSTANCELIST nameless("");
  EXPECT_EQ(1u, nameless.status);
  // An entry whose copy cannot be read is never taken for an instance of the
  // version-8 installation: the walk fails.
  failCalls(nullptr);
  setDword("SOFTWARE\\ZAV\\KXLSIM\\Instances\\INST1", "Copy", 1);
  IKXLINSTANCELIST listed(KXLI_V8_COPY_NAME);
  EXPECT_EQ(1u, listed.status);
  IKXLINSTANCELIST owned("KXL95");
  EXPECT_EQ(1u, owned.status);
}

// The run walks the copies and asks each for its instance list: one walk of
// the instance registry serves every copy (a second walk would fail here), and
// the caller's walk of the copies goes on where it was.
TEST_F(Instances, ListsOfEveryCopyComeFromOneWalkThatKeepsTheCallersPlace) {
  InstallCopyList copies(false, false);
  failCalls("ossOpenInstanceList:2");
  std::vector<Names> seen;
  copies.Rewind();
  for (InstallCopy *copy = copies.Next(); copy != nullptr; copy = copies.Next()) {
    IKXLINSTANCELIST *list = nullptr;
    ASSERT_EQ(0u, copy->GetInstanceList(&list));
    seen.push_back(names(*list));
  }
  EXPECT_EQ(std::vector<Names>({{"V8CLU", "V8INST"}, {"NEW1"}, {"CLU1", "INST1", "PROF1"}}), seen);
}

TEST_F(Instances, AFailedWalkKeepsNoListAndTheNextRequestWalksAgain) {
  InstallCopyList copies(false, false);
  InstallCopy *copy = nullptr;
  ASSERT_EQ(0u, copies.Find("KXL95", &copy));
  IKXLINSTANCELIST *list = nullptr;
  failCalls("ossGetNextInstance:1,ossGetNextInstance:2");
  EXPECT_EQ(KXLI_RC_NOT_USABLE, copy->GetInstanceList(&list));
  failCalls("");
  ASSERT_EQ(0u, copy->GetInstanceList(&list));
  EXPECT_EQ(Names({"CLU1", "INST1", "PROF1"}), names(*list));
}

TEST_F(Instances, CutItsFieldsAndGuardItsParentDirectory) {
  IKXLINSTANCE inst("INSTANCE99", nullptr, "C:\\I");
  char text[256] = {};
  EXPECT_EQ(KXLI_RC_BUFFER_TOO_SMALL, inst.GetName(text, 8)) << "a name needs nine bytes";
  ASSERT_EQ(0u, inst.GetName(text, 9));
  EXPECT_STREQ("INSTANCE", text);
  // A directory shorter than "\" + name has no parent to give.
  ASSERT_EQ(0u, inst.GetInstanceParentDir(text, sizeof text));
  EXPECT_STREQ("", text);
  EXPECT_EQ(KXLI_RC_NOT_USABLE, inst.GetCopyName(text, sizeof text));
  EXPECT_EQ(0, inst.isClustered);
  std::string longDir(300, 'd');
  IKXLINSTANCE cut("I", nullptr, longDir.c_str());
  ASSERT_EQ(0u, cut.GetInstanceDir(text, sizeof text));
  EXPECT_EQ(std::string(255, 'd'), text);
}

// Clustered when the profile names a cluster; the configuration file is kept
// as a snapshot, and an instance without one is listed all the same.
TEST_F(Instances, KnowTheirClusterAndKeepASnapshotOfTheirConfiguration) {
  IKXLINSTANCE *clustered = instance("KXL95", "CLU1");
  ASSERT_NE(nullptr, clustered);
  EXPECT_EQ(1, clustered->isClustered);
  char cluster[16] = {};
  ASSERT_EQ(0u, clustered->GetClusterName(cluster, sizeof cluster));
  EXPECT_STREQ("KXLCLUS", cluster);
  EXPECT_EQ(KXLI_RC_BUFFER_TOO_SMALL, clustered->GetClusterName(cluster, 7));
  EXPECT_EQ(0, clustered->GetNodeType());
  EXPECT_EQ(1, instance("KXLV8", "V8CLU")->isClustered);

  IKXLINSTANCE *plain = instance("KXL95", "INST1");
  EXPECT_EQ(0, plain->isClustered);
  EXPECT_EQ(0u, plain->GetClusterName(cluster, sizeof cluster));
  EXPECT_STREQ("", cluster);
  EXPECT_EQ(4, plain->GetNodeType());
  EXPECT_EQ(0x5A, plain->dbmCfgImage[16383]);
  writeFile("C:\\Prog\\KXL95\\INST1\\kxlsystm", configImage(1));
  EXPECT_EQ(4, plain->GetNodeType());
}

TEST_F(Instances, ReloadTheirConfigurationFromAnyDirectory) {
  writeFile("C:\\Saved\\kxlsystm", configImage(3, 4096));
  writeFile("C:\\Home\\INST1\\kxlsystm", configImage(0x0105));
  IKXLINSTANCE holder;
  EXPECT_EQ(0, holder.GetNodeType());
  ASSERT_EQ(0u, holder.ReloadDbmCfg("C:\\Home\\INST1"));
  EXPECT_EQ(0x5A, holder.dbmCfgImage[16383]);
  ASSERT_EQ(0u, holder.ReloadDbmCfg("C:\\Saved"));
  EXPECT_EQ(3, holder.GetNodeType());
  EXPECT_EQ(0x5A, holder.dbmCfgImage[4095]);
  EXPECT_EQ(0, holder.dbmCfgImage[16383]) << "nothing of a longer file is left";
  // A missing file leaves the snapshot as it was.
  EXPECT_EQ(KXLI_RC_NULL_ARGUMENT, holder.ReloadDbmCfg("C:\\Nowhere"));
  EXPECT_EQ(3, holder.GetNodeType());

  IKXLINSTANCE inst("INST1", nullptr, "C:\\Home\\INST1");
  ASSERT_EQ(0u, inst.ReloadDbmCfg("C:\\Saved"));
  EXPECT_EQ(3, inst.GetNodeType());
  ASSERT_EQ(0u, inst.ReloadDbmCfg(nullptr));
  EXPECT_EQ(0x0105, inst.GetNodeType());
}

} // namespace
