// The upgrade driver: a fixed sequence of steps, each of which either
// succeeds or ends the upgrade through one undo sequence.
#include "NT/kxliutil.h"

#include "NT/backup.h"
#include "NT/carryover.h"
#include "NT/dbmcfg.h"
#include "NT/driverstate.h"
#include "NT/editioncheck.h"
#include "NT/functiondir.h"
#include "NT/instfiles.h"
#include "NT/profilereg.h"
#include "NT/readnodetype.h"
#include "NT/runrecord.h"
#include "NT/services.h"
#include "NT/tools_run.h"
#include "cluster/clusterstep.h"
#include "install/installcopy.h"
#include "install/kxlinstance.h"
#include "platform/kxlsys.h"
#include "upgrade/records.h"

#include <cstring>
#include <iterator>

namespace {

constexpr int32_t kToCurrentServerType = 1;

// Trace points.
constexpr uint32_t kProbeActive = 10;
constexpr uint32_t kProbeNodeList = 11;
constexpr uint32_t kProbeCurrentCopy = 5;
constexpr uint32_t kProbeProfileMove = 80;
constexpr uint32_t kProbeServices = 90;
constexpr uint32_t kProbeReread = 100;
constexpr uint32_t kProbeInstanceFound = 110;
constexpr uint32_t kProbeEnvironment = 120;
constexpr uint32_t kProbeDbmConfig = 130;
constexpr uint32_t kProbeAuthType = 140;
constexpr uint32_t kProbeFunctionDir = 190;
constexpr uint32_t kProbeCluster = 200;
constexpr uint32_t kProbeForcedKeys = 210;
constexpr uint32_t kProbeDropFailed = 310;     // diagnostic log only
constexpr uint32_t kProbeUndoIncomplete = 320; // diagnostic log only

StepResult takeInstanceName(DriverState &state) {
  state.context.instance->GetName(state.instanceName, sizeof state.instanceName);
  if (isPartitioned(state.options))
    sqloPdbCommFncInit();
  return stepDone();
}

StepResult refuseActiveInstance(DriverState &state) {
  if (isInstanceActive(state.context, state.options))
    return stepFailed(kProbeActive, UPGRADE_RC_INSTANCE_ACTIVE);
  return stepDone();
}

// A partitioned instance whose node list is missing, empty or unreadable has
// no partition to check, move or re-point: refused before anything changes.
StepResult requireNodeList(DriverState &state) {
  if (!isPartitioned(state.options) ||
      (state.context.nodeList != nullptr && sqloNodeListCount(state.context.nodeList) > 0))
    return stepDone();
  state.options.tokenCount = 1;
  state.options.tokens[0] = state.options.instanceName;
  return stepFailed(kProbeNodeList, UPGRADE_RC_NO_NODE_LIST);
}

// The current copy in the context's list. The run has found it already; a
// list without it ends the upgrade before anything is touched.
StepResult findCurrentCopy(DriverState &state) {
  if (sqloGetCurrentInstallationName(state.currentCopyName, sizeof state.currentCopyName) != 0 ||
      state.context.copies == nullptr ||
      state.context.copies->Find(state.currentCopyName, &state.currentCopy) != 0)
    return stepFailed(kProbeCurrentCopy, UPGRADE_RC_NO_COPY);
  return stepDone();
}

// The node type from the instance's own kxlsystm; when that cannot be read,
// or gives no node type, the value the run bound the instance with stands.
StepResult readInstanceNodeType(DriverState &state) {
  state.context.instance->GetInstanceDir(state.instanceDir, sizeof state.instanceDir);
  IKXLINSTANCE snapshot;
  state.nodeType = state.context.nodeType;
  if (snapshot.ReloadDbmCfg(state.instanceDir) == 0 && isKnownNodeType(snapshot.GetNodeType()))
    state.nodeType = snapshot.GetNodeType();
  return stepDone();
}

StepResult checkCurrentEdition(DriverState &state) {
  int32_t rc = checkEdition(state.currentCopy, state.nodeType, state.options);
  if (rc == 0)
    return stepDone();
  uint32_t probe = editionCheckProbe(state.nodeType);
  uint32_t lastError = GetLastError();
  pdtData1(KXL_FN_UPGRADE_INSTANCE, probe, PD_TYPE_UINT32, sizeof lastError, &lastError);
  return stepFailed(probe, rc);
}

// A move that fails on one machine may have moved the key on others already:
// the undo reverts whatever was moved, machine by machine.
StepResult moveProfile(DriverState &state) {
  state.profileMoved = true;
  int32_t rc = moveInstanceProfile(state.context, state.options);
  return rc != 0 ? stepFailed(kProbeProfileMove, rc) : stepDone();
}

StepResult keepAudit(DriverState &state) {
  return keepAuditSettings(state);
}

StepResult upgradeServices(DriverState &state) {
  int32_t rc = upgradeInstanceServices(state.context, state.options);
  return rc != 0 ? stepFailed(kProbeServices, rc) : stepDone();
}

// kxlauditcopy.cfg is left in place when the tool fails; the undo removes it.
StepResult upgradeAudit(DriverState &state) {
  StepResult putBack = putBackAuditSettings(state);
  if (failed(putBack))
    return putBack;
  int32_t rc = runAuditTool();
  if (rc != 0)
    return stepFailed(kProbeAuditTool, rc);
  dropAuditCopy(state);
  return stepDone();
}

StepResult upgradeSsl(DriverState &state) {
  char copyPath[KXL_JOINED_PATH_SZ] = {};
  state.currentCopy->GetPath(copyPath, sizeof copyPath);
  int32_t rc = runSslTool(copyPath, state.instanceDir);
  return rc != 0 ? stepFailed(kProbeSslTool, rc) : stepDone();
}

StepResult rereadCopies(DriverState &state) {
  state.rereadCopies = new (std::nothrow) InstallCopyList(false, false);
  if (state.rereadCopies == nullptr || state.rereadCopies->status != 0)
    return stepFailed(kProbeReread, UPGRADE_RC_NO_COPY);
  return stepDone();
}

// The instance as the current copy lists it now, and the paths of the steps
// that follow: old files come from the backup from here on.
StepResult findUpgradedInstance(DriverState &state) {
  InstallCopy *copy = nullptr;
  IKXLINSTANCELIST *instances = nullptr;
  if (state.rereadCopies->Find(state.currentCopyName, &copy) != 0 || copy == nullptr ||
      copy->GetInstanceList(&instances) != 0 || instances == nullptr ||
      instances->Find(state.instanceName, &state.newInstance) != 0 || state.newInstance == nullptr)
    return stepFailed(kProbeInstanceFound, UPGRADE_RC_NO_COPY);
  state.newInstance->GetInstanceDir(state.newInstanceDir, sizeof state.newInstanceDir);
  joinPath(state.backupConfigFile, state.backupDir, "\\kxlsystm");
  joinPath(state.newConfigFile, state.newInstanceDir, "\\kxlsystm");
  return stepDone();
}

StepResult prepareEnvironment(DriverState &state) {
  sqloPutEnv(KXL_VAR_KXLINSTANCE, state.instanceName);
  sqlo_force_refresh_env();
  uint32_t partitioned = state.nodeType == KXL_NODE_TYPE_PARTITIONED ? 1 : 0;
  int32_t rc = sqleInitApplicationEnvironment(0, 0, partitioned, nullptr);
  return rc != 0 ? stepFailed(kProbeEnvironment, rc) : stepDone();
}

StepResult convertConfiguration(DriverState &state) {
  int32_t rc = upgradeDbmConfig(state.newConfigFile, state.backupConfigFile);
  if (rc == 0)
    return stepDone();
  pdtData1(KXL_FN_UPGRADE_INSTANCE, kProbeDbmConfig, PD_TYPE_INT32, sizeof rc, &rc);
  return stepFailed(kProbeDbmConfig, UPGRADE_RC_DBM_CONFIG_FAILED);
}

StepResult applyAuthenticationType(DriverState &state) {
  if ((state.options.flags & UPGRADE_FLAG_AUTH_TYPE) == 0)
    return stepDone();
  sqlfupd item = {SQLF_KTN_AUTHENTICATION, &state.options.authType};
  int32_t rc = sqlfusys(1, &item, &state.options.status);
  if (rc != 0 || sqlcaCode(state.options.status) != 0)
    return stepFailed(kProbeAuthType, UPGRADE_RC_SQLCA);
  return stepDone();
}

StepResult carryFiles(DriverState &state) {
  return carryOverFiles(state);
}

StepResult copyFunctions(DriverState &state) {
  char oldProfilePath[KXL_JOINED_PATH_SZ] = {};
  char newProfilePath[KXL_JOINED_PATH_SZ] = {};
  state.context.instance->GetInstanceParentDir(oldProfilePath, sizeof oldProfilePath);
  state.newInstance->GetInstanceParentDir(newProfilePath, sizeof newProfilePath);
  noteNewFunctionDirectory(state, newProfilePath);
  int32_t rc = copyFunctionDirectory(state.context, newProfilePath, oldProfilePath);
  return rc != 0 ? stepFailed(kProbeFunctionDir, rc) : stepDone();
}

StepResult upgradeCluster(DriverState &state) {
  if (!state.context.instance->isClustered)
    return stepDone();
  int32_t rc = upgradeClusterInstance(state.context, kToCurrentServerType, state.options,
                                      state.clusterJournal, [&state] { return writeRunRecord(state); });
  return rc != 0 ? stepFailed(kProbeCluster, rc) : stepDone();
}

// The other machines' old profile keys of a force-copy-name upgrade are kept
// until everything else has succeeded, so that a failure can put them back.
// A drop that fails before any of them is gone fails the upgrade, which is
// then undone whole, rather than leave a machine listing the instance under
// its old copy too.
StepResult dropForcedKeys(DriverState &state) {
  int32_t rc = dropForcedProfileKeys(state.context, state.options);
  return rc != 0 ? stepFailed(kProbeForcedKeys, rc) : stepDone();
}

StepResult cleanProfileRegistry(DriverState &) {
  runCleanupTool();
  return stepDone();
}

using Step = StepResult (*)(DriverState &);

struct DriverStep {
  Step run;
  // The run's record is written before it. The registry clean-up, which
  // follows the drop of the forced machines' old keys, has none of its own: a
  // record that failed there could only fail the upgrade once those keys can
  // no longer be put back, and a run finishing a killed one runs it again
  // anyway (it ignores its tool's result).
  bool changesMachine;
};

// The upgrade, in order.
constexpr DriverStep kSteps[] = {
    {takeInstanceName, false},   {refuseActiveInstance, false}, {requireNodeList, false},
    {findCurrentCopy, false},    {readInstanceNodeType, false}, {checkCurrentEdition, false},
    {makeBackup, true},          {copyToNewProfilePath, true},  {moveProfile, true},
    {keepAudit, true},           {upgradeServices, true},       {upgradeAudit, true},
    {upgradeSsl, true},          {rereadCopies, false},         {findUpgradedInstance, false},
    {prepareEnvironment, false}, {convertConfiguration, true},  {applyAuthenticationType, true},
    {carryFiles, true},          {copyFunctions, true},         {upgradeCluster, true},
    {dropForcedKeys, true},      {cleanProfileRegistry, false},
};

constexpr uint32_t stepIndex(Step step) {
  for (uint32_t i = 0; i < std::size(kSteps); ++i)
    if (kSteps[i].run == step)
      return i;
  return uint32_t(std::size(kSteps));
}

// A run killed before this step is put back; from it on, it is finished.
constexpr uint32_t kFirstStepKept = stepIndex(upgradeServices);
constexpr uint32_t kProfileMoveStep = stepIndex(moveProfile);

void releaseCopies(DriverState &state) {
  delete state.rereadCopies;
  state.rereadCopies = nullptr;
  state.newInstance = nullptr;
}

// Drops the instance that the services step re-created under the current
// copy: the product library puts back the instance's registration, profile
// key, service and configuration file as they were before the re-creation.
bool dropRecreatedInstance(DriverState &state) {
  uint32_t nodeType = state.context.recreatedNodeType;
  if (nodeType == 0)
    return true;
  int32_t rc = 0;
  if (nodeType == KXL_NODE_TYPE_PARTITIONED) {
    SQLO_INST_OUT first{}, second{};
    rc = sqlo_instance_delnode(state.instanceName, 0, nullptr, 0, &first, &second);
  }
  char directory[KXL_JOINED_PATH_SZ];
  joinPath(directory, state.options.profilePath, state.instanceName);
  int32_t dropRc = sqlo_instance_drop(state.instanceName, directory);
  rc = rc != 0 ? rc : dropRc;
  if (rc != 0) {
    pdLog(PD_LEVEL_SEVERE, KXL_FN_UPGRADE_INSTANCE, kProbeDropFailed, rc,
          "instance %s re-created under the current copy could not be dropped", state.instanceName);
    return false;
  }
  return true;
}

// What the undo achieved, for the final message. An incomplete undo keeps the
// backup so that nothing of the instance is lost.
void reportUndo(DriverState &state, bool changed, bool complete) {
  UpgradeOptions &options = state.options;
  if (!complete && state.backupChosen) {
    options.undoOutcome = UPGRADE_UNDO_INCOMPLETE;
    std::memcpy(options.keptBackupDir, state.backupDir, sizeof options.keptBackupDir);
    options.keptBackupDir[sizeof options.keptBackupDir - 1] = '\0';
    state.backupChosen = false;
    pdLog(PD_LEVEL_SEVERE, KXL_FN_UPGRADE_INSTANCE, kProbeUndoIncomplete, 0,
          "instance %s not restored completely; the backup of its directory is kept in %s",
          state.instanceName, options.keptBackupDir);
  } else if (!complete) {
    options.undoOutcome = UPGRADE_UNDO_INCOMPLETE;
  } else if (changed) {
    options.undoOutcome = UPGRADE_UNDO_COMPLETE;
  }
}

int32_t undo(DriverState &state, const StepResult &failure) {
  pdtError(KXL_FN_UPGRADE_INSTANCE, failure.probe, failure.rc);
  bool recreated = state.context.recreatedNodeType != 0;
  const ClusterJournal &cluster = state.clusterJournal;
  bool changed = recreated || state.profileMoved || state.profileCopyDir[0] != '\0' ||
                 cluster.typeRegistered || !cluster.resources.empty();
  // The cluster's resources first: the last step puts back its own changes.
  bool clusterBack = undoClusterConversion(cluster) == 0;
  // The re-creation next: it put the current copy's profile key and the
  // services as they were after the move, which the revert then undoes.
  bool dropped = dropRecreatedInstance(state);
  bool complete = dropped && clusterBack;
  if (state.profileMoved)
    complete = revertInstanceProfile(state.context, state.options) == 0 && complete;
  if (failure.rc < 0 && state.backupComplete)
    complete = restoreBackup(state) && complete;
  // The restore copies the backup over the directory: it removes no file.
  if (state.auditCopyMade)
    complete = dropAuditCopy(state) && complete;
  // A copy the instance is still registered in stays where it is.
  if (dropped)
    complete = removeProfileCopies(state) && complete;
  releaseCopies(state);
  reportUndo(state, changed, complete);
  removeBackup(state);
  closeRunRecord(state);
  return failure.rc;
}

// A finishing run that fails cannot undo a re-creation made by another
// process: it keeps its record and the backup, so the next run tries again.
int32_t keepForNextRun(DriverState &state, const StepResult &failure) {
  pdtError(KXL_FN_UPGRADE_INSTANCE, failure.probe, failure.rc);
  releaseCopies(state);
  state.options.undoOutcome = UPGRADE_UNDO_INCOMPLETE;
  std::memcpy(state.options.keptBackupDir, state.backupDir, sizeof state.options.keptBackupDir);
  state.options.keptBackupDir[sizeof state.options.keptBackupDir - 1] = '\0';
  return failure.rc;
}

int32_t stop(DriverState &state, const StepResult &failure) {
  return state.resumed ? keepForNextRun(state, failure) : undo(state, failure);
}

// Runs the steps from `from` on; the steps before it that change the machine
// were done by a killed run, whose record holds what they left.
int32_t runSteps(DriverState &state, uint32_t from) {
  for (state.step = 0; state.step < std::size(kSteps); ++state.step) {
    const DriverStep &step = kSteps[state.step];
    if (step.changesMachine && state.step < from)
      continue;
    if (step.changesMachine && !writeRunRecord(state))
      return stop(state, stepFailed(kProbeRunRecord, UPGRADE_RC_BACKUP_FAILED));
    StepResult result = step.run(state);
    if (failed(result))
      return stop(state, result);
  }
  releaseCopies(state);
  removeBackup(state);
  closeRunRecord(state);
  return 0;
}

void prepareRecord(DriverState &state) {
  runRecordPath(state.recordPath, state.options.currentInstallPath, state.options.instanceName);
  state.context.instance->GetCopyName(state.oldCopyName, sizeof state.oldCopyName);
  state.clustered = state.context.instance->isClustered != 0;
}

} // namespace

int upgradeInstance(UpgradeContext &context, UpgradeOptions &options) {
  pdtEntry(KXL_FN_UPGRADE_INSTANCE);
  DriverState state(context, options);
  int32_t rc = UPGRADE_RC_NO_COPY;
  if (context.instance != nullptr) {
    prepareRecord(state);
    rc = runSteps(state, 0);
  }
  pdtExit(KXL_FN_UPGRADE_INSTANCE, rc, 0);
  return rc;
}

KilledRunFound findKilledRun(UpgradeContext &context, const UpgradeOptions &options, KilledRun &run) {
  UpgradeContext scratchContext;
  UpgradeOptions scratchOptions = options;
  DriverState recorded(scratchContext, scratchOptions);
  char path[KXL_JOINED_PATH_SZ];
  runRecordPath(path, options.currentInstallPath, options.instanceName);
  RecordRead read = readRunRecord(path, recorded);
  if (read == RecordRead::none)
    return KilledRunFound::none;
  // A run that ended but whose record could not be removed left nothing to take up.
  if (read == RecordRead::read && recorded.step == kRunRecordEnded) {
    removeRunRecordFile(path);
    return KilledRunFound::none;
  }
  InstallCopy *oldCopy = nullptr;
  bool usable = read == RecordRead::read && recorded.step < std::size(kSteps) &&
                context.copies->Find(recorded.oldCopyName, &oldCopy) == 0 &&
                sqlomcpi(recorded.instanceName, options.instanceName, 0) == 0;
  if (!usable) {
    pdLog(PD_LEVEL_WARNING, KXL_FN_UPGRADE_INSTANCE, kProbeRunRecord, 0,
          "the record %s of an earlier run cannot be used; it is set aside", path);
    setRunRecordAside(path);
    return KilledRunFound::unusable;
  }
  std::memcpy(run.oldCopy, recorded.oldCopyName, sizeof recorded.oldCopyName);
  std::memcpy(run.instanceDir, recorded.savedInstanceDir, sizeof recorded.savedInstanceDir);
  run.clustered = recorded.clustered;
  return KilledRunFound::found;
}

int recoverKilledRun(UpgradeContext &context, UpgradeOptions &options, bool *finished) {
  pdtEntry(KXL_FN_UPGRADE_INSTANCE);
  UpgradeOptions given = options;
  DriverState state(context, options);
  char path[KXL_JOINED_PATH_SZ];
  runRecordPath(path, options.currentInstallPath, options.instanceName);
  int32_t rc = 0;
  *finished = false;
  if (readRunRecord(path, state) == RecordRead::read) {
    pdLog(PD_LEVEL_WARNING, KXL_FN_UPGRADE_INSTANCE, kProbeRunRecord, int32_t(state.step),
          "an earlier run of the upgrade of %s ended at step %u; its backup is %s", state.instanceName,
          unsigned(state.step), state.backupDir);
    // A move that was under way may have moved some machines already.
    state.profileMoved = state.profileMoved || state.step >= kProfileMoveStep;
    state.backupChosen = state.backupDir[0] != '\0';
    if (state.step < kFirstStepKept) {
      isInstanceActive(context, options); // loads the node list: the machines whose keys go back
      undo(state, stepFailed(kProbeRunRecord, UPGRADE_RC_BACKUP_FAILED));
      options = given;
    } else {
      *finished = true;
      state.resumed = true;
      // The instance's re-creation rewrites its files: it starts again from the backup.
      if (state.step == kFirstStepKept && !refreshFromBackup(state))
        rc = stop(state, stepFailed(kProbeRunRecord, UPGRADE_RC_BACKUP_FAILED));
      else
        rc = runSteps(state, state.step);
    }
  }
  pdtExit(KXL_FN_UPGRADE_INSTANCE, rc, 0);
  return rc;
}
