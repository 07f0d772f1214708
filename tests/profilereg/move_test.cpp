// Moving INST1's profile key to the current copy: single machine, partitions,
// the force-copy-name mode and cluster machines, with the failures of each.
#include "profile_world.h"

namespace {

using namespace kxltest;

class MoveProfile : public ProfileWorld {};

TEST_F(MoveProfile, Version8SingleCopyKeyMovesAndIsDeleted) {
  ownWith(KXLI_V8_COPY_NAME, kV8, {kLocal});
  EXPECT_EQ(0, moveInstanceProfile(context_, options_));
  expectMoved(kLocal, kV8, kCurrent);
}

TEST_F(MoveProfile, InstanceOfTheCurrentCopyStaysWhereItIs) {
  ownWith(kCurrent, kCurrent, {kLocal});
  EXPECT_EQ(0, moveInstanceProfile(context_, options_));
  expectProfileAt(kLocal, kCurrent);
}

TEST_F(MoveProfile, NewKeyThatCannotBeCreatedChangesNothing) {
  ownWith(kOld, kOld, {kLocal});
  startTrace();
  failCalls("RegCreateKeyExA:1");
  EXPECT_EQ(UPGRADE_RC_NO_COPY, moveInstanceProfile(context_, options_));
  expectUntouched(kLocal, kOld, kCurrent);
  EXPECT_NE(std::string::npos, traceText().find("error 0x18780506 probe=100 rc=-1918"));
}

// Without the owning copy's version the old key is unknown: nothing is moved.
TEST_F(MoveProfile, OwnerWithoutVersionIsRefused) {
  registerCopy("KXLNOVER", "C:\\KXLNOVER");
  ownWith("KXLNOVER", kV8, {kLocal});
  EXPECT_EQ(UPGRADE_RC_NO_COPY, moveInstanceProfile(context_, options_));
  expectUntouched(kLocal, kV8, kCurrent);
}

TEST_F(MoveProfile, PartitionsSharingAMachineMoveItsKeyOnce) {
  ownWith(kOld, kOld, {kLocal, "M2"});
  loadNodes("0 hosta.zav.test HOSTA 0\n1 hostb.zav.test M2 0\n2 hostb.zav.test M2 1\n");
  EXPECT_EQ(0, moveInstanceProfile(context_, options_));
  expectMoved(kLocal, kOld, kCurrent);
  expectMoved("M2", kOld, kCurrent);
}

TEST_F(MoveProfile, ForceCopyNameGivesOtherHostsAnEmptyPlaceholder) {
  ownWith(kOld, kOld, {kLocal, "M2"});
  options_.flags |= UPGRADE_FLAG_FORCE_COPY_NAME;
  loadNodes("0 HOSTA.ZAV.TEST HOSTA 0\n1 hostb.zav.test M2 0\n");
  EXPECT_EQ(0, moveInstanceProfile(context_, options_));
  expectMoved(kLocal, kOld, kCurrent);
  EXPECT_FALSE(keyExists(forceProfile()));
  // The other host keeps its old key until the whole upgrade has succeeded.
  expectUntouched("M2", kOld, kCurrent);
  EXPECT_TRUE(keyExists(at("M2", forceProfile())));
  EXPECT_EQ("<missing>", getString(at("M2", forceProfile()), "KXLMARK"));
  EXPECT_FALSE(keyExists(at("M2", forceProfile() + "\\Node0")));

  EXPECT_EQ(0, dropForcedProfileKeys(context_, options_));
  EXPECT_FALSE(keyExists(at("M2", profile(kOld))));
  EXPECT_TRUE(keyExists(at("M2", forceProfile())));
  expectProfileAt(kLocal, kCurrent);
}

// The drop fails while every old key is still there (the upgrade can be
// undone whole); once one is gone it goes on past a machine it cannot reach.
TEST_F(MoveProfile, ForcedKeysDropFailsOnlyBeforeAnyKeyIsGone) {
  ownWith(kOld, kOld, {kLocal, "M2", "M3"});
  options_.flags |= UPGRADE_FLAG_FORCE_COPY_NAME;
  loadNodes("0 hosta.zav.test HOSTA 0\n1 hostb.zav.test M2 0\n2 hostc.zav.test M3 0\n");
  ASSERT_EQ(0, moveInstanceProfile(context_, options_));

  failCalls("SHDeleteKeyA:1");
  EXPECT_EQ(UPGRADE_RC_NO_COPY, dropForcedProfileKeys(context_, options_));
  expectUntouched("M2", kOld, kCurrent);
  expectUntouched("M3", kOld, kCurrent);

  failCalls("SHDeleteKeyA:2");
  EXPECT_EQ(0, dropForcedProfileKeys(context_, options_));
  EXPECT_FALSE(keyExists(at("M2", profile(kOld))));
  expectUntouched("M3", kOld, kCurrent);
  failCalls(nullptr);
}

TEST_F(MoveProfile, ForceCopyNameNeedsTheLocalHostName) {
  ownWith(kOld, kOld, {kLocal});
  options_.flags |= UPGRADE_FLAG_FORCE_COPY_NAME;
  loadNodes("0 hosta.zav.test HOSTA 0\n");
  failCalls("sqloPdbTcpIpGetFullHostName:1");
  EXPECT_EQ(UPGRADE_RC_SQLCA, moveInstanceProfile(context_, options_));
  EXPECT_EQ(UPGRADE_SQLCODE_PARTITION_SETUP, options_.status.sqlcode);
  expectUntouched(kLocal, kOld, kCurrent);
}

TEST_F(MoveProfile, UnreachablePartitionMachineStopsTheMove) {
  ownWith(kOld, kOld, {kLocal, "M2"});
  loadNodes("0 hosta.zav.test HOSTA 0\n1 hostc.zav.test M3 0\n2 hostb.zav.test M2 0\n");
  startTrace();
  EXPECT_EQ(UPGRADE_RC_MACHINE_REGISTRY, moveInstanceProfile(context_, options_));
  expectMoved(kLocal, kOld, kCurrent);
  expectUntouched("M2", kOld, kCurrent);
  EXPECT_NE(std::string::npos, traceText().find("error 0x18780506 probe=10 rc=-1913"));
}

TEST_F(MoveProfile, ClusteredInstanceMovesOnEveryListedMachine) {
  clusterOn("CLUS1", "M2 hosta M3");
  ownWith(kOld, kOld, {kLocal, "M2", "M3"});
  EXPECT_EQ(0, moveInstanceProfile(context_, options_));
  for (const char *machine : {kLocal, "M2", "M3"})
    expectMoved(machine, kOld, kCurrent);
  EXPECT_STREQ("CLUS1", options_.partitionRecord.clusterName);
}

TEST_F(MoveProfile, ClusterMachineUnreachableAfterTheLocalMove) {
  clusterOn("CLUS1", "HOSTA M9 M2");
  ownWith(kOld, kOld, {kLocal, "M2"});
  startTrace();
  EXPECT_EQ(UPGRADE_RC_MACHINE_REGISTRY, moveInstanceProfile(context_, options_));
  expectMoved(kLocal, kOld, kCurrent);
  expectUntouched("M2", kOld, kCurrent);
  EXPECT_NE(std::string::npos, traceText().find("error 0x18780506 probe=60 rc=-1913"));
}

TEST_F(MoveProfile, PartitionMachinesThatAreAlsoClusterMachinesMoveOnce) {
  clusterOn("CLUS1", "hosta m2 M3 M2");
  ownWith(kOld, kOld, {kLocal, "M2", "M3"});
  loadNodes("0 hosta.zav.test HOSTA 0\n1 hostb.zav.test M2 0\n");
  EXPECT_EQ(0, moveInstanceProfile(context_, options_));
  for (const char *machine : {kLocal, "M2", "M3"})
    expectMoved(machine, kOld, kCurrent);
}

} // namespace
