// The order of one run. Every failing step ends the run at the final message
// with its code; nothing is retried.
#include "engn/sqo/run.h"

#include "NT/instfiles.h"
#include "NT/kxliutil.h"
#include "NT/pathjoin.h"
#include "NT/readnodetype.h"
#include "engn/sqo/boundedtext.h"
#include "engn/sqo/checks.h"
#include "engn/sqo/cmdline.h"
#include "engn/sqo/installswitch.h"
#include "engn/sqo/messages.h"
#include "platform/odbc.h"
#include "upgrade/errortrace.h"

#include <algorithm>
#include <cctype>
#include <cstdio>
#include <cstring>
#include <new>

namespace {

constexpr uint32_t kAppKind = 9339413;
constexpr char kToolName[] = "KXLIUPGRADE";
constexpr char kLegacyName[] = "KXLIMIGR";
constexpr char kProducerTag[] = "KXLIUPGR";
constexpr uint32_t kModuleNameSize = 256;
constexpr uint32_t kVar159Size = SQLO_PREG_VALUE_SZ;

constexpr uint32_t kAuditAdminCategory = 0x80000000u;
constexpr uint32_t kAuditAdminEvent = 53;
constexpr uint32_t kAuditInstanceCategory = 0x20000000u;
constexpr uint32_t kAuditInstanceEvent = 1;
constexpr uint64_t kAuditSuccess = 0x1;
constexpr uint64_t kAuditFailure = 0x2;

// Check numbers reported to the trace when a check fails.
enum CheckPoint : uint32_t {
  kCheckInstanceKnown = 1,
  kCheckGlobalProfile = 2,
  kCheckAdministrator = 3,
  kCheckInstanceVersion = 4,
  kCheckInstallationNames = 5,
  kCheckSameCopy = 6,
  kCheckCurrentCopy = 7,
  kCheckCurrentVersion = 8,
  kCheckAccount = 9,
  kCheckDatabases = 10,
  kCheckDriver = 11,
  kCheckNoInstance = 12,
  kCheckNodeType = 13,
};

bool sameText(const char *a, const char *b, uint32_t length) {
  return sqlomcpi(a, b, length) == 0;
}

bool isInstallerMode(const UpgradeOptions &options) {
  return (options.flags & UPGRADE_FLAG_INSTALLER) != 0;
}

// The code, with the instance's name as the message's one token.
int withInstanceToken(UpgradeOptions &options, int code) {
  options.tokenCount = 1;
  options.tokens[0] = options.instanceName;
  return code;
}

constexpr ErrorTrace checkFailed{KXL_FN_RUN_CHECKS};

void dropTrailingBackslash(char *path) {
  std::size_t length = std::strlen(path);
  if (length > 0 && path[length - 1] == '\\')
    path[length - 1] = '\0';
}

// Version and release of a copy; false when its version cannot be read,
// which is never taken for a version 0.
bool copyVersion(InstallCopy *copy, int32_t &version, int32_t &release) {
  CopyVersion *record = nullptr;
  bool read = copy->GetVersion(&record) == 0 && record != nullptr;
  version = read ? record->version : 0;
  release = read ? record->release : 0;
  delete record;
  return read;
}

// Any executable whose path lacks the tool's name counts as the legacy command.
void findReportingName(UpgradeOptions &options) {
  char module[kModuleNameSize] = {};
  DWORD length = GetModuleFileNameA(nullptr, module, sizeof module);
  module[length < sizeof module ? length : sizeof module - 1] = '\0';
  for (char *c = module; *c != '\0'; ++c)
    *c = static_cast<char>(std::tolower(static_cast<unsigned char>(*c)));
  bool found = std::strstr(module, "kxliupgrade") != nullptr;
  copyText(options.programName, sizeof options.programName, found ? kToolName : kLegacyName);
}

// The copy whose instance list holds the instance; null when none does.
InstallCopy *findInstance(UpgradeContext &context, const char *name, IKXLINSTANCE **instance) {
  *instance = nullptr;
  InstallCopyList &copies = *context.copies;
  copies.Rewind();
  for (InstallCopy *copy = copies.Next(); copy != nullptr; copy = copies.Next()) {
    IKXLINSTANCELIST *list = nullptr;
    if (copy->GetInstanceList(&list) == 0 && list->Find(name, instance) == 0)
      return copy;
  }
  *instance = nullptr;
  return nullptr;
}

// -1139 when the global profile of the instance's copy reserves its name;
// -1918 when that profile cannot be reached.
int checkGlobalProfile(const IKXLINSTANCE *instance) {
  InstallationSwitch inCopy(instance);
  if (inCopy.result() != 0)
    return checkFailed(kCheckInstallationNames, inCopy.result());
  uint32_t variable = KXL_VAR_KXLRESERVEDINST;
  char value[SQLO_INSTANCE_NAME_SZ] = {};
  char name[SQLO_INSTANCE_NAME_SZ] = {};
  instance->GetName(name, sizeof name);
  bool reserved = sqloPRegValuePE(SQLO_PREG_GET, &variable, 0, value, KXL_GLOBAL_PROFILE_NAME,
                                  SQLO_PREG_ANY_NODE, sizeof value) == 0 &&
                  sameText(value, name, SQLO_INSTANCE_NAME_SZ);
  if (inCopy.switchBack() != 0)
    return checkFailed(kCheckInstallationNames, inCopy.result());
  return reserved ? checkFailed(kCheckGlobalProfile, UPGRADE_RC_RESERVED_INSTANCE) : 0;
}

int checkInstanceCopyVersion(InstallCopy *owner, UpgradeOptions &options) {
  if (isInstallerMode(options))
    return 0;
  int32_t version = 0, release = 0;
  if (!copyVersion(owner, version, release))
    return checkFailed(kCheckInstanceVersion, UPGRADE_RC_NO_COPY);
  if (version > 9 || (version == 9 && release >= 7))
    return checkFailed(kCheckInstanceVersion, withInstanceToken(options, UPGRADE_RC_BAD_VERSION));
  return 0;
}

int checkCopies(UpgradeContext &context, const IKXLINSTANCE *instance, UpgradeOptions &options) {
  char current[SQLO_COPY_NAME_SZ], owner[SQLO_COPY_NAME_SZ] = {};
  if (!currentInstallationName(current, sizeof current) || instance->GetCopyName(owner, sizeof owner) != 0 ||
      owner[0] == '\0')
    return checkFailed(kCheckInstallationNames, UPGRADE_RC_NO_COPY);
  if (!isInstallerMode(options) && sameText(owner, current, SQLO_COPY_NAME_SZ))
    return checkFailed(kCheckSameCopy, withInstanceToken(options, UPGRADE_RC_ALREADY_UPGRADED));
  InstallCopy *currentCopy = nullptr;
  if (context.copies->Find(current, &currentCopy) != 0)
    return checkFailed(kCheckCurrentCopy, UPGRADE_RC_NO_COPY);
  int32_t version = 0, release = 0;
  if (!copyVersion(currentCopy, version, release))
    return checkFailed(kCheckCurrentVersion, UPGRADE_RC_NO_COPY);
  if (version < 9)
    return checkFailed(kCheckCurrentVersion, withInstanceToken(options, UPGRADE_RC_BAD_VERSION));
  return 0;
}

// The profile path the instance will have after the upgrade; flag 0x04 when it moves.
void decideProfilePath(const IKXLINSTANCE *instance, UpgradeOptions &options) {
  char parent[SQLO_PATH_SZ] = {}, oldPath[SQLO_PATH_SZ] = {};
  instance->GetInstanceParentDir(parent, sizeof parent);
  expandLongPath(parent, oldPath, sizeof oldPath);
  if (instance->isClustered) {
    // Every node's cluster profile names the instance's path on the shared
    // disk and is written back unchanged: the instance stays there, -p or not.
    copyText(options.profilePath, sizeof options.profilePath, oldPath);
  } else if (options.profilePath[0] != '\0') {
    dropTrailingBackslash(options.profilePath);
    dropTrailingBackslash(oldPath);
  } else {
    bool networkShare = parent[0] == '\\' && parent[1] == '\\';
    copyText(options.profilePath, sizeof options.profilePath,
             networkShare ? parent : options.currentInstallPath);
  }
  if (!sameText(oldPath, options.profilePath, SQLO_PATH_SZ))
    options.flags |= UPGRADE_FLAG_PROFILE_PATH_MOVES;
}

int checkAccount(UpgradeContext &context, UpgradeOptions &options) {
  if (context.nodeType != KXL_NODE_TYPE_PARTITIONED)
    return 0;
  options.partitionedInstance = 1;
  if (hasNodeTypeTemplate(context, options, KXL_NODE_TYPE_PARTITIONED) &&
      (options.userName[0] == '\0' || options.password[0] == '\0'))
    return checkFailed(kCheckAccount, UPGRADE_RC_USAGE);
  return 0;
}

struct RunState {
  char auditInstance[SQLO_INSTANCE_NAME_SZ] = {}; // the instance handed to the driver
  bool odbcSourceFound = false;
  char tokenText[SQLO_PATH_SZ + 16] = {}; // a message token the options record points at
};

// The configuration file whose node type could not be read names itself in
// the message, without the quotes of a quoted directory.
int refuseUnknownNodeType(const IKXLINSTANCE *instance, UpgradeOptions &options, RunState &state) {
  char path[sizeof state.tokenText] = {};
  nodeTypeFilePath(instance, path, sizeof path);
  const char *start = path[0] == '"' ? path + 1 : path;
  std::size_t length = std::strlen(start);
  if (length > 0 && start[length - 1] == '"')
    --length;
  copyTextCut(state.tokenText, sizeof state.tokenText, start, length);
  options.tokenCount = 1;
  options.tokens[0] = state.tokenText;
  return checkFailed(kCheckNodeType, UPGRADE_RC_NODE_TYPE_UNKNOWN);
}

void lookForOdbcSources(RunState &state) {
  int32_t status = 0;
  state.odbcSourceFound = findOdbcDataSources(nullptr, &status);
  if (!state.odbcSourceFound &&
      (status == ERROR_NOT_FOUND || status == SQL_INVALID_HANDLE || status == SQL_ERROR))
    pdLog(PD_LEVEL_WARNING, KXL_FN_RUN_UPGRADE, 1, status, "ODBC data sources could not be listed");
}

// From the instance's upgrade on: binding, the last checks, the driver.
int upgradeFoundInstance(UpgradeContext &context, IKXLINSTANCE *instance, UpgradeOptions &options,
                         UpgradeDriver driver, RunState &state) {
  if (sqloIsContentExtenderInstalled(options.currentInstallPath) != 0)
    options.flags |= UPGRADE_FLAG_CONTENT_EXTENDER;
  int rc = bindInstance(context, instance);
  if (rc == UPGRADE_RC_NODE_TYPE_UNKNOWN)
    return refuseUnknownNodeType(instance, options, state);
  if (rc != 0)
    return checkFailed(kCheckInstallationNames, rc);
  rc = checkAccount(context, options);
  if (rc == 0 && !isInstallerMode(options)) {
    rc = runDatabaseCheck(context, options);
    if (rc != 0)
      checkFailed(kCheckDatabases, rc);
  }
  if (rc != 0)
    return rc;
  if (context.instance == nullptr)
    return checkFailed(kCheckNoInstance, rc);
  copyText(state.auditInstance, sizeof state.auditInstance, options.instanceName);
  rc = driver(context, options);
  if (rc != 0)
    return checkFailed(kCheckDriver, rc);
  lookForOdbcSources(state);
  return 0;
}

// A run of this command for the instance that was killed before it ended is
// taken up first, with the instance bound as it was before that run: it is
// either put back (and the run goes on as usual) or finished (`finished`).
int takeUpKilledRun(UpgradeContext &context, UpgradeOptions &options, RunState &state, bool &finished) {
  finished = false;
  KilledRun killed;
  InstallCopy *oldCopy = nullptr;
  if (findKilledRun(context, options, killed) != KilledRunFound::found ||
      context.copies->Find(killed.oldCopy, &oldCopy) != 0)
    return 0;
  IKXLINSTANCE previous(options.instanceName, oldCopy->name, killed.instanceDir);
  previous.isClustered = killed.clustered ? 1 : 0;
  setOwningCopy(context, oldCopy);
  bindInstance(context, &previous);
  copyText(state.auditInstance, sizeof state.auditInstance, options.instanceName);
  int rc = recoverKilledRun(context, options, &finished);
  context.instance = nullptr;
  if (finished && rc != 0)
    return checkFailed(kCheckDriver, rc);
  if (finished)
    lookForOdbcSources(state);
  return rc;
}

// Checks of caller, instance and copies, then the upgrade itself.
int checkAndUpgrade(UpgradeContext &context, UpgradeOptions &options, UpgradeDriver driver, RunState &state) {
  pdtEntry(KXL_FN_RUN_CHECKS);
  context.copy->GetPath(options.currentInstallPath, sizeof options.currentInstallPath);
  bool finished = false;
  int rc = takeUpKilledRun(context, options, state, finished);
  if (finished) {
    pdtExit(KXL_FN_RUN_CHECKS, rc, 0);
    return rc;
  }
  IKXLINSTANCE *instance = nullptr;
  InstallCopy *owner = findInstance(context, options.instanceName, &instance);
  if (owner == nullptr)
    rc = checkFailed(kCheckInstanceKnown, withInstanceToken(options, UPGRADE_RC_INSTANCE_UNKNOWN));
  else
    rc = checkGlobalProfile(instance);
  if (rc == 0) {
    setOwningCopy(context, owner);
    rc = checkLocalAdmin(&options.status);
    if (rc != 0)
      checkFailed(kCheckAdministrator, rc);
  }
  if (rc == 0)
    rc = checkInstanceCopyVersion(owner, options);
  if (rc == 0)
    rc = checkCopies(context, instance, options);
  if (rc == 0) {
    decideProfilePath(instance, options);
    rc = upgradeFoundInstance(context, instance, options, driver, state);
  }
  pdtExit(KXL_FN_RUN_CHECKS, rc, 0);
  return rc;
}

void printSuccess(const UpgradeOptions &options, const RunState &state) {
  if (options.partitionRecord.textSearchReasonCode != 0) {
    printInstanceMessage(kLegacyName, UPGRADE_MSG_TEXT_SEARCH, "processing completed", &options);
    return;
  }
  printSuccessMessage(kToolName, UPGRADE_MSG_SUCCESS);
  if (state.odbcSourceFound)
    printInstanceMessage(kLegacyName, UPGRADE_MSG_ODBC_SOURCES,
                         "DSN is founded,please re-catalog ODBC data sources ", nullptr);
  if (options.partitionRecord.extraMessage != 0)
    printInstanceMessage(kLegacyName, options.partitionRecord.extraMessage, "processing completed", nullptr);
}

// After a failed upgrade: whether the instance was put back, and when not,
// where the backup of its directory is kept.
void printUndoOutcome(const UpgradeOptions &options) {
  if (options.undoOutcome == UPGRADE_UNDO_COMPLETE) {
    printInstanceMessage(kLegacyName, UPGRADE_MSG_UNDO_COMPLETE, "processing complete", nullptr);
  } else if (options.undoOutcome == UPGRADE_UNDO_INCOMPLETE) {
    UpgradeOptions record{};
    record.tokenCount = 1;
    record.tokens[0] = options.keptBackupDir;
    printInstanceMessage(kLegacyName, UPGRADE_MSG_UNDO_INCOMPLETE, "processing complete", &record);
  }
}

void printFinalMessage(int rc, const UpgradeOptions &options, const RunState &state,
                       const char *savedInstance) {
  if (options.quiet)
    return;
  if (savedInstance[0] != '\0')
    putInstanceEnvironment(savedInstance);
  if (rc == UPGRADE_RC_USAGE)
    printInstanceMessage(kLegacyName, UPGRADE_RC_USAGE, "syntax error", &options);
  else if (rc == UPGRADE_RC_SQLCA)
    printSqlcaMessage(kLegacyName, &options.status, "processing complete");
  else if (rc == 0)
    printSuccess(options, state);
  else
    printInstanceMessage(kLegacyName, rc, "processing complete", &options);
  if (rc != 0)
    printUndoOutcome(options);
}

// Logs one audit event; false (and the run's result from the status block)
// when it could not be recorded.
bool logAuditEvent(uint32_t category, uint32_t event, const char *instanceName, int32_t sqlcode,
                   uint8_t errorType, UpgradeOptions &options) {
  sqlexAuditData data(category, event, sqlcode, errorType);
  if (instanceName != nullptr) {
    std::size_t length = std::strlen(instanceName);
    while (length > 0 && instanceName[length - 1] == ' ')
      --length;
    if (length > SQLEX_AUDIT_MAX_TEXT) {
      pdLog(PD_LEVEL_WARNING, KXL_FN_RUN_AUDIT, 2, 0, "Audit data exceeded maximum length, using maximum");
      length = SQLEX_AUDIT_MAX_TEXT;
    }
    data.setInstanceName(instanceName, length);
  }
  return data.logEvent(&options.status) == 0;
}

// A completed upgrade stays completed when its audit record cannot be read or
// written: the instance has moved and a rerun would only find it upgraded. The
// failure is printed after the final message (not in quiet mode) and recorded
// in the diagnostic log; the result stays 0. A failed run takes the audit's
// code as before.
int auditFailureResult(int runRc, const UpgradeOptions &options) {
  int auditRc = sqlcaCode(options.status);
  if (runRc != 0)
    return auditRc;
  pdLog(PD_LEVEL_WARNING, KXL_FN_RUN_AUDIT, 3, auditRc,
        "Upgrade completed; its audit record was not written");
  if (!options.quiet)
    printSqlcaMessage(kLegacyName, &options.status, "processing complete");
  return 0;
}

// The code an audit event carries: the status block's for a success or for a
// result the block explains (-1), else the result the run ended with.
int32_t auditedCode(int rc, const UpgradeOptions &options) {
  int32_t blockCode = sqlcaCode(options.status);
  if (rc == 0 || (rc == UPGRADE_RC_SQLCA && blockCode != 0))
    return blockCode;
  return rc;
}

// The audit record of the upgraded instance. Every run that did not upgrade
// it, a refusal with a positive code included, is audited as a failure.
int auditInstance(int rc, UpgradeOptions &options, const RunState &state, const char *savedInstance) {
  if (sqlosins(state.auditInstance) != 0)
    return rc;
  pdtEntry(KXL_FN_RUN_AUDIT);
  SQLEX_AUDIT_SETTINGS settings{};
  int32_t settingsRc = sqlexAuditGetInstanceSettings(false, &settings, nullptr);
  if (settingsRc != 0) {
    sqlzRcToSqlca(0, &options.status, kToolName, settingsRc, 0, 0);
    rc = auditFailureResult(rc, options);
  } else if (settings.active) {
    int32_t sqlcode = auditedCode(rc, options);
    uint64_t outcome = rc != 0 || sqlcode < 0 ? kAuditFailure : kAuditSuccess;
    bool logged = true;
    if (settings.classMask1 & outcome)
      logged =
          logAuditEvent(kAuditAdminCategory, kAuditAdminEvent, nullptr, sqlcode, settings.errorType, options);
    if (logged && (settings.classMask4 & outcome))
      logged = logAuditEvent(kAuditInstanceCategory, kAuditInstanceEvent, state.auditInstance, sqlcode,
                             settings.errorType, options);
    if (!logged)
      rc = auditFailureResult(rc, options);
  }
  sqlosins(savedInstance);
  pdtExit(KXL_FN_RUN_AUDIT, rc, 0);
  return rc;
}

int installerExitCode(int rc) {
  return rc > 0 ? 1 : (rc < 0 ? 2 : 0);
}

void printLegacyWarning(const UpgradeOptions &options) {
  if (!sameText(options.programName, kLegacyName, sizeof options.programName))
    return;
  std::fputs("\n\n", stdout);
  std::fflush(stdout);
  printInstanceMessage(kLegacyName, UPGRADE_MSG_DEPRECATED_COMMAND, "syntax warning", nullptr);
}

void savedInstanceAtStart(char *saved, std::size_t size) {
  char *value = nullptr;
  saved[0] = '\0';
  if (sqloGetEnvInternal(KXL_VAR_KXLINSTANCE, &value) == 0 && value != nullptr)
    copyTextCut(saved, size, value, SQLO_INSTANCE_NAME_SZ - 1);
}

void clearOptions(UpgradeOptions &options) {
  std::memset(&options, 0, sizeof options);
  sqloinca(&options.status);
  sqlcaSetProducer(options.status, kProducerTag);
  options.flags = UPGRADE_FLAG_TOOL;
}

// Reads the installed copies and finds the current copy: 0, or -1918 when the
// copies or the current copy cannot be had.
int32_t readInstalledCopies(UpgradeContext &context) {
  pdtEntry(KXL_FN_UPGRADE_CONTEXT);
  int32_t rc = 0;
  sqlo_create_init_app_data(kAppKind, &rc);
  sqlz_krcbp->utilityMode = 1;
  context.copies = new (std::nothrow) InstallCopyList(false, false);
  char current[SQLO_COPY_NAME_SZ];
  if (context.copies == nullptr || context.copies->status != 0 ||
      !currentInstallationName(current, sizeof current) || context.copies->Find(current, &context.copy) != 0)
    rc = UPGRADE_RC_NO_COPY;
  else
    rc = 0;
  pdtExit(KXL_FN_UPGRADE_CONTEXT, rc, 0);
  return rc;
}

} // namespace

void setOwningCopy(UpgradeContext &context, InstallCopy *copy) {
  context.copy = copy;
  context.copyPath[0] = '\0';
  if (copy != nullptr)
    copy->GetPath(context.copyPath, sizeof context.copyPath);
}

namespace {

// The two halves of the port range variable: "first:last", or a first port
// whose last one lies four above it.
void splitVar159(UpgradeContext &context, const char *value) {
  const char *colon = std::strchr(value, ':');
  if (colon != nullptr && colon[1] != '\0') {
    copyTextCut(context.var159Head, sizeof context.var159Head, value,
                std::min<std::size_t>(static_cast<std::size_t>(colon - value), 8));
    copyTextCut(context.var159Tail, sizeof context.var159Tail, colon + 1, 9);
    return;
  }
  copyTextCut(context.var159Head, sizeof context.var159Head, value, 9);
  char tail[24];
  std::snprintf(tail, sizeof tail, "%ld", std::strtol(context.var159Head, nullptr, 10) + 4);
  copyTextCut(context.var159Tail, sizeof context.var159Tail, tail, 8);
}

} // namespace

int bindInstance(UpgradeContext &context, IKXLINSTANCE *instance) {
  pdtEntry(KXL_FN_BIND_INSTANCE);
  context.instance = instance;
  InstallationSwitch inCopy(instance);
  int rc = inCopy.result();
  if (rc == 0) {
    char name[SQLO_INSTANCE_NAME_SZ] = {};
    instance->GetName(name, sizeof name);
    putInstanceEnvironment(name);
    int32_t readRc = readNodeType(instance, &context.nodeType);
    if (readRc != 0 || !isKnownNodeType(context.nodeType)) {
      pdtError(KXL_FN_BIND_INSTANCE, 1, readRc);
      rc = UPGRADE_RC_NODE_TYPE_UNKNOWN;
    }
  }
  if (rc == 0 && instance->clusterUnreadable != 0) {
    pdtError(KXL_FN_BIND_INSTANCE, 2, UPGRADE_RC_NO_COPY);
    rc = UPGRADE_RC_NO_COPY;
  }
  uint32_t variable = KXL_VAR_KXLPORTRANGE;
  char value[kVar159Size] = {};
  if (rc == 0 &&
      sqloPRegValuePE(SQLO_PREG_GET, &variable, 0, value, nullptr, SQLO_PREG_ANY_NODE, sizeof value) == 0 &&
      value[0] != '\0')
    splitVar159(context, value);
  int32_t back = inCopy.switchBack();
  if (rc == 0)
    rc = back;
  pdtExit(KXL_FN_BIND_INSTANCE, rc, 0);
  return rc;
}

int runUpgrade(int argc, const char *const *argv, UpgradeDriver driver) {
  pdtEntry(KXL_FN_RUN_UPGRADE);
  ossOneTimeOnly();
  char savedInstance[SQLO_INSTANCE_NAME_SZ];
  savedInstanceAtStart(savedInstance, sizeof savedInstance);
  UpgradeOptions options;
  clearOptions(options);
  RunState state;
  UpgradeContext *context = nullptr;
  int rc = parseCommandLine(argc, argv, &options);
  if (rc == 0) {
    findReportingName(options);
    context = new (std::nothrow) UpgradeContext;
    rc = context == nullptr ? UPGRADE_RC_NO_COPY : readInstalledCopies(*context);
    if (rc == 0)
      rc = checkAndUpgrade(*context, options, driver, state);
  }
  printFinalMessage(rc, options, state, savedInstance);
  rc = auditInstance(rc, options, state, savedInstance);
  delete context;
  if (isInstallerMode(options))
    rc = installerExitCode(rc);
  printLegacyWarning(options);
  pdtExit(KXL_FN_RUN_UPGRADE, rc, 0);
  return rc;
}
