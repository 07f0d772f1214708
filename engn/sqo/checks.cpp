#include "engn/sqo/checks.h"

#include "NT/instfiles.h"
#include "NT/kxliutil.h"
#include "engn/sqo/boundedtext.h"
#include "engn/sqo/installswitch.h"
#include "engn/sqo/messages.h"
#include "engn/sqo/run.h"
#include "platform/kxlsys.h"
#include "platform/odbc.h"

#include <cstring>
#include <initializer_list>

namespace {

constexpr uint16_t kAdminBits = 0x04 | 0x10;
constexpr uint32_t kShortIdSize = 10;

constexpr uint32_t kDirectorySize = 255;
// Program path, six fixed words, the log path and the quoted directory, each
// bounded by a path buffer: the block never has to be cut.
constexpr std::size_t kArgBlockSize = 4 * SQLO_PATH_SZ + 64;
constexpr uint32_t kMaxDataSources = 65536; // more than any machine's ODBC list
constexpr char kCheckToolName[] = "kxlckupgrade";
constexpr char kDriverText[] = "ZAV KXL ODBC DRIVER";

// A sequence of NUL-terminated strings ending with an empty one.
class ArgumentBlock {
public:
  void add(const char *text) {
    std::size_t length = std::strlen(text);
    if (used_ + length + 2 > sizeof block_)
      return;
    std::memcpy(block_ + used_, text, length + 1);
    used_ += length + 1;
    block_[used_] = '\0';
  }
  const char *data() const { return block_; }

private:
  char block_[kArgBlockSize] = {};
  std::size_t used_ = 0;
};

std::size_t textLength(const char *text) {
  return std::strlen(text);
}

// "dir\name" without doubling the backslash of a drive root.
void appendPathIn(TextBuilder &out, const char *directory, const char *name) {
  std::size_t length = textLength(directory);
  out.append(directory);
  if (length == 0 || directory[length - 1] != '\\')
    out.append('\\');
  out.append(name);
}

// The directory in double quotes; a drive root loses its backslash so that the
// quote closes right after the colon.
void quotedDirectory(char *buffer, std::size_t size, const char *directory) {
  ossSnprintf(buffer, size, "\"%s\"", directory);
  std::size_t length = textLength(buffer);
  if (length > 4 && std::strcmp(buffer + length - 3, ":\\\"") == 0) {
    buffer[length - 2] = '"';
    buffer[length - 1] = '\0';
  }
}

// The check's explanation in the user's language, else in English.
void messageFile(char *buffer, std::size_t size, const char *installPath) {
  ossSnprintf(buffer, size, "%s\\msg\\%s\\KXLDBMIG.TXT", installPath, sqloGetNormalizedEnvLang(1));
  if (!ossPathExists(buffer))
    ossSnprintf(buffer, size, "%s\\msg\\%s\\KXLDBMIG.TXT", installPath, "en_US");
}

int exitCodeResult(uint32_t exitCode, UpgradeOptions &options, const char *logPath) {
  switch (exitCode) {
  case 0:
  case 2:
    return 0;
  case 1:
    printInstanceMessage("KXLIMIGR", UPGRADE_MSG_CHECK_WARNINGS, "kxlckupgrade warning", nullptr);
    return 0;
  case 3:
    // The run stops after a failed check, so the token texts may live in
    // fields nothing reads any more.
    copyText(options.profilePath, sizeof options.profilePath, logPath);
    options.tokenCount = 1;
    options.tokens[0] = options.profilePath;
    return UPGRADE_RC_CHECK_PROBLEMS;
  default:
    ossSnprintf(options.authTypeName, sizeof options.authTypeName, "%d", static_cast<int>(exitCode));
    options.tokenCount = 2;
    options.tokens[0] = kCheckToolName;
    options.tokens[1] = options.authTypeName;
    return UPGRADE_RC_CHECK_FAILED;
  }
}

// Where the check works: the current directory and the paths formed in it.
struct CheckPlace {
  char directory[kDirectorySize + 1] = {};
  char quoted[SQLO_PATH_SZ] = {};
  char messageCopy[SQLO_PATH_SZ] = {};
  char logPath[SQLO_PATH_SZ] = {}; // in double quotes
};

// False when the current directory cannot be had or a path formed in it does
// not fit whole: a cut log-file argument would lose its closing quote and the
// file name, and an empty directory would send the tool elsewhere.
bool findCheckPlace(CheckPlace &place) {
  DWORD length = GetCurrentDirectoryA(kDirectorySize, place.directory);
  if (length == 0 || length >= kDirectorySize)
    return false;
  quotedDirectory(place.quoted, sizeof place.quoted, place.directory);
  TextBuilder copy(place.messageCopy, sizeof place.messageCopy);
  appendPathIn(copy, place.directory, "KXLDBMIG.TXT");
  TextBuilder log(place.logPath, sizeof place.logPath);
  log.append('"');
  appendPathIn(log, place.directory, "upgrade.log");
  log.append('"');
  return copy.whole() && log.whole();
}

int runCheckTool(UpgradeContext &context, UpgradeOptions &options) {
  CheckPlace place;
  if (!findCheckPlace(place))
    return UPGRADE_RC_CHECK_DIRECTORY;
  char source[SQLO_PATH_SZ];
  messageFile(source, sizeof source, options.currentInstallPath);
  sqlocopy(source, place.messageCopy, 0);

  char program[SQLO_PATH_SZ];
  ossSnprintf(source, sizeof source, "%s\\misc\\kxlckupgrade.exe", options.currentInstallPath);
  ossSnprintf(program, sizeof program, "%s\\bin\\kxlckupgrade.exe", context.copyPath);
  sqlocopy(source, program, 0);

  ArgumentBlock block;
  for (const char *argument :
       {static_cast<const char *>(program), "-h", "-m", "-not1", "-l",
        static_cast<const char *>(place.logPath), "-t", static_cast<const char *>(place.quoted)})
    block.add(argument);
  uint32_t processId = 0;
  SQLO_EXEC_RESULT result{};
  int32_t rc = sqloexec2(program, block.data(), 0, SQLO_EXEC_WAIT, &processId, &result, 0, 0);
  if (rc != 0)
    return rc;
  return exitCodeResult(result.exitCode, options, place.logPath);
}

bool describesProductDriver(const SQLCHAR *description, const char *driverText) {
  return sqlomcpi(reinterpret_cast<const char *>(description), driverText,
                  static_cast<uint32_t>(textLength(driverText))) == 0;
}

template <typename Function> Function boundEntry(HMODULE module, const char *name) {
  FARPROC entry = GetProcAddress(module, name);
  return reinterpret_cast<Function>(reinterpret_cast<void (*)()>(entry));
}

bool fetched(SQLRETURN rc) {
  return rc == SQL_SUCCESS || rc == SQL_SUCCESS_WITH_INFO;
}

// Fetches one data source; a description is only ever read once fetched.
SQLRETURN fetchSource(PFN_SQLDataSources dataSources, SQLHENV environment, SQLUSMALLINT direction,
                      SQLCHAR (&description)[256]) {
  SQLCHAR name[256] = {};
  SQLSMALLINT nameLength = 0, descriptionLength = 0;
  SQLRETURN rc = dataSources(environment, direction, name, sizeof name, &nameLength, description,
                             sizeof description, &descriptionLength);
  description[sizeof description - 1] = 0;
  return rc;
}

// Walks the data sources until one uses the driver. Any answer but success
// ends the walk, and so does a list longer than any machine keeps, so that a
// driver manager answering something unexpected never keeps the run from
// ending. `outcome` as findOdbcDataSources reports it; an unexpected answer
// to the first fetch counts as an error.
bool scanDataSources(PFN_SQLAllocEnv allocEnv, PFN_SQLDataSources dataSources, const char *driverText,
                     int32_t &outcome) {
  SQLHENV environment = nullptr;
  if (!fetched(allocEnv(&environment)) || environment == nullptr) {
    outcome = SQL_ERROR;
    return false;
  }
  SQLCHAR description[256] = {};
  SQLRETURN rc = fetchSource(dataSources, environment, SQL_FETCH_FIRST, description);
  if (!fetched(rc)) {
    outcome = rc == SQL_NO_DATA || rc == SQL_INVALID_HANDLE ? rc : SQL_ERROR;
    return false;
  }
  outcome = rc;
  if (describesProductDriver(description, driverText))
    return true;
  outcome = 0;
  for (uint32_t fetches = 1; fetches < kMaxDataSources; ++fetches) {
    if (!fetched(fetchSource(dataSources, environment, SQL_FETCH_NEXT, description)))
      return false;
    if (describesProductDriver(description, driverText)) {
      outcome = 1;
      return true;
    }
  }
  return false;
}

} // namespace

int checkLocalAdmin(sqlca *status) {
  pdtEntry(KXL_FN_CHECK_LOCAL_ADMIN);
  sqlz_krcbp->utilityMode = 1;
  char id[SQLE_AUTHID_SZ] = {};
  int rc = 0;
  int32_t idRc = sqleget_authid(id);
  if (idRc != 0 && idRc != 1) {
    sqlcaSetCode(*status, UPGRADE_SQLCODE_NO_AUTH_ID);
    rc = UPGRADE_RC_SQLCA;
  } else {
    int32_t admin = sqloIsLocalAdmin();
    if (admin < 0) {
      rc = admin;
    } else if ((admin & kAdminBits) == 0) {
      char shortId[kShortIdSize];
      ossSnprintf(shortId, sizeof shortId, "%s", id);
      const uint64_t lengths[] = {textLength(shortId)};
      const char *tokens[] = {shortId};
      sqlegsca(UPGRADE_SQLCODE_NOT_ADMIN, 1, lengths, tokens, status);
      rc = UPGRADE_RC_SQLCA;
    }
  }
  if (rc != 0)
    pdtError(KXL_FN_CHECK_LOCAL_ADMIN, 1, rc);
  pdtExit(KXL_FN_CHECK_LOCAL_ADMIN, rc, 0);
  return rc;
}

int runDatabaseCheck(UpgradeContext &context, UpgradeOptions &options) {
  pdtEntry(KXL_FN_RUN_DATABASE_CHECK);
  int rc = UPGRADE_RC_INSTANCE_ACTIVE;
  if (!isInstanceActive(context, options)) {
    InstallationSwitch inCopy(context.instance);
    rc = inCopy.result();
    if (rc == 0) {
      putInstanceEnvironment(options.instanceName);
      rc = runCheckTool(context, options);
    }
    int32_t back = inCopy.switchBack();
    if (rc == 0)
      rc = back;
  }
  pdtExit(KXL_FN_RUN_DATABASE_CHECK, rc, 0);
  return rc;
}

bool findOdbcDataSources(const char *copyName, int32_t *status) {
  pdtEntry(KXL_FN_FIND_ODBC_SOURCES);
  int32_t outcome = ERROR_NOT_FOUND;
  bool found = false;
  HMODULE odbc = LoadLibraryA("odbc32.dll");
  auto allocEnv = odbc != nullptr ? boundEntry<PFN_SQLAllocEnv>(odbc, "SQLAllocEnv") : nullptr;
  auto dataSources = odbc != nullptr ? boundEntry<PFN_SQLDataSources>(odbc, "SQLDataSources") : nullptr;
  if (allocEnv != nullptr && dataSources != nullptr) {
    char driverText[SQLO_PATH_SZ];
    if (copyName != nullptr)
      ossSnprintf(driverText, sizeof driverText, "%s - %s", kDriverText, copyName);
    else
      copyText(driverText, sizeof driverText, kDriverText);
    found = scanDataSources(allocEnv, dataSources, driverText, outcome);
  }
  if (status != nullptr)
    *status = outcome;
  pdtExit(KXL_FN_FIND_ODBC_SOURCES, found ? 1 : 0, 0);
  return found;
}
