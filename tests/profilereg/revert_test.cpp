// The undo of the profile move: keys back under the owning copy where the move
// reached, and services pointed at the owning copy's program again. The undo
// of whole runs, on every machine, is checked end to end by the driver's
// failure table.
#include "profile_world.h"

namespace {

using namespace kxltest;

class RevertProfile : public ProfileWorld {};

TEST_F(RevertProfile, UnreachableMachineDoesNotStopTheOthersComingBack) {
  ownWith(kOld, kCurrent, {kLocal, "M3"});
  loadNodes("0 hosta.zav.test HOSTA 0\n1 hostb.zav.test M9 0\n2 hostc.zav.test M3 0\n");
  startTrace();
  EXPECT_EQ(UPGRADE_RC_MACHINE_REGISTRY, revertInstanceProfile(context_, options_));
  expectMoved(kLocal, kCurrent, kOld);
  expectMoved("M3", kCurrent, kOld);
  EXPECT_NE(std::string::npos, traceText().find("error 0x18780507 probe=10 rc=-1913"));
}

TEST_F(RevertProfile, Version8OwnerGetsItsSingleCopyKeyAndShortDisplayName) {
  ownWith(KXLI_V8_COPY_NAME, kCurrent, {kLocal});
  addService(kLocal, "INST1", "C:\\KXL101\\bin\\kxlsyscs.exe");
  context_.serviceStartType = SQLO_SVC_DEMAND_START;
  EXPECT_EQ(0, revertInstanceProfile(context_, options_));
  expectMoved(kLocal, kCurrent, kV8);
  EXPECT_EQ("C:\\KXL8\\bin\\kxlsyscs.exe", service(kLocal, "INST1", "ImagePath"));
  EXPECT_EQ("KXL - INST1", service(kLocal, "INST1", "DisplayName"));
  EXPECT_EQ(DWORD(SQLO_SVC_DEMAND_START), serviceStart("INST1"));
}

TEST_F(RevertProfile, FailedCopyBackKeepsTheCurrentKeyAndTheService) {
  ownWith(kOld, kCurrent, {kLocal});
  addService(kLocal, "INST1", "C:\\KXL101\\bin\\kxlsyscs.exe");
  startTrace();
  failCalls("SHCopyKeyA:1");
  EXPECT_EQ(UPGRADE_RC_NO_COPY, revertInstanceProfile(context_, options_));
  expectProfileAt(kLocal, kCurrent);
  EXPECT_EQ("C:\\KXL101\\bin\\kxlsyscs.exe", service(kLocal, "INST1", "ImagePath"));
  EXPECT_NE(std::string::npos, traceText().find("error 0x18780507 probe=110 rc=-1918"));
}

TEST_F(RevertProfile, PartitionServicesOnEveryMachine) {
  ownWith(kOld, kCurrent, {kLocal, "M2", "M3"});
  setString(at("M2", std::string(kRoot) + "\\GLOBAL_PROFILE"), "KXLPATH", "D:\\KXLOLD");
  loadNodes(
      "0 hosta.zav.test HOSTA 0\n1 hostb.zav.test M2 0\n2 hostb.zav.test M2 1\n3 hostc.zav.test M3 0\n");
  addService(kLocal, "INST1-0", "C:\\KXL101\\bin\\kxlsyscs.exe");
  addService("M2", "INST1-1", "C:\\KXL101\\bin\\kxlsyscs.exe");
  addService("M2", "INST1-2", "C:\\KXL101\\bin\\kxlsyscs.exe");
  addService("M3", "INST1-3", "C:\\KXL101\\bin\\kxlsyscs.exe");
  std::snprintf(options_.userName, sizeof options_.userName, "svcuser");
  std::snprintf(options_.password, sizeof options_.password, "secret");
  context_.serviceStartType = SQLO_SVC_DEMAND_START;
  context_.recreatedNodeType = 4;
  // The services step gave INST1-1 the account of -u; INST1-2's was not recorded.
  setString(at("M2", "SOFTWARE\\ZAV\\KXLSIM\\Services\\INST1-1"), "ObjectName", "svcuser");
  context_.serviceAccounts = {{"M2", "INST1-1", ".\\oldacct"}};

  EXPECT_EQ(0, revertInstanceProfile(context_, options_));
  for (const char *machine : {kLocal, "M2", "M3"})
    expectMoved(machine, kCurrent, kOld);
  EXPECT_EQ("C:\\KXL95\\bin\\kxlsyscs.exe", service(kLocal, "INST1-0", "ImagePath"));
  EXPECT_EQ("D:\\KXLOLD\\bin\\kxlsyscs.exe", service("M2", "INST1-1", "ImagePath"));
  EXPECT_EQ("D:\\KXLOLD\\bin\\kxlsyscs.exe", service("M2", "INST1-2", "ImagePath"));
  // A host without a recorded installation runs the owning copy's program.
  EXPECT_EQ("C:\\KXL95\\bin\\kxlsyscs.exe", service("M3", "INST1-3", "ImagePath"));
  EXPECT_EQ("KXL - KXL95 - INST1-0", service(kLocal, "INST1-0", "DisplayName"));
  EXPECT_EQ("KXL - KXL95 - INST1-2", service("M2", "INST1-2", "DisplayName"));
  EXPECT_EQ(".\\oldacct", service("M2", "INST1-1", "ObjectName"));
  EXPECT_EQ("LocalSystem", service("M2", "INST1-2", "ObjectName"));
  EXPECT_EQ(DWORD(SQLO_SVC_DEMAND_START), serviceStart("INST1-0"));
}

// The undo handles the machines the move handled: the partitions' machine and
// the cluster's other machines, each once, and not the local machine that
// served no partition (whose profile already is the current copy's).
TEST_F(RevertProfile, ClusteredPartitionsUndoTheMachinesTheMoveHandled) {
  clusterOn("CLUS1", "HOSTA M2 m3 M3");
  ownBy(kOld);
  SHDeleteKeyA(HKEY_LOCAL_MACHINE, profile(kOld).c_str());
  ASSERT_FALSE(keyExists(profile(kOld)));
  seedProfile("M2", kOld);
  seedProfile("M3", kOld);
  seedProfile(kLocal, kCurrent);
  loadNodes("0 hostb.zav.test M2 0\n1 hostb.zav.test M2 1\n");
  ASSERT_EQ(0, moveInstanceProfile(context_, options_));
  expectMoved("M2", kOld, kCurrent);
  expectMoved("M3", kOld, kCurrent);
  ASSERT_FALSE(keyExists(profile(kOld)));

  EXPECT_EQ(0, revertInstanceProfile(context_, options_));
  expectMoved("M2", kCurrent, kOld);
  expectMoved("M3", kCurrent, kOld);
  expectUntouched(kLocal, kCurrent, kOld);
}

} // namespace
