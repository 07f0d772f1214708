// Command line: "-" or "/" options in any order and one instance name.
#include "engn/sqo/cmdline.h"

#include "engn/sqo/boundedtext.h"
#include "platform/kxlsys.h"
#include "platform/win32.h"

#include <cstring>

namespace {

constexpr uint32_t kTraceParse = 0x187805A0;

constexpr uint32_t kInstanceNameClass = 16;
constexpr std::size_t kMaxInstanceName = 8;
constexpr std::size_t kAuthValueChars = 19;
constexpr std::size_t kProfileValueChars = 260;
constexpr std::size_t kAccountValueChars = 286;
constexpr std::size_t kUserNameChars = 30;
constexpr std::size_t kPasswordChars = 255;
constexpr std::size_t kTextSearchValueSize = 80;
constexpr std::size_t kTextSearchServiceChars = 14;
constexpr uint32_t kMinPort = 1024;
constexpr uint32_t kMaxPort = 65535;
constexpr char kTextSearchKeyword[] = "TEXT_SEARCH";

enum class Option { Help, Quiet, AuthType, ProfilePath, Account, Installer, ForceCopyName, TextSearch, None };

struct OptionWord {
  const char *word;
  uint32_t length; // characters that decide; the rest of the argument is not looked at
  Option option;
};

constexpr OptionWord kOptionWords[] = {
    {"?", 1, Option::Help},
    {"q", 1, Option::Quiet},
    {"a", 1, Option::AuthType},
    {"p", 1, Option::ProfilePath},
    {"u", 1, Option::Account},
    {"install", 7, Option::Installer},
    {"forcecn", 7, Option::ForceCopyName},
    {"j", 1, Option::TextSearch},
};

struct AuthWord {
  const char *word;
  uint16_t code;
};

// Tried in this order; the first match wins.
constexpr AuthWord kAuthWords[] = {
    {"SERVER", UPGRADE_AUTH_SERVER},
    {"CLIENT", UPGRADE_AUTH_CLIENT},
    {"SERVER_ENCRYPT", UPGRADE_AUTH_SERVER_ENCRYPT},
    {"DCS", UPGRADE_AUTH_DCS},
    {"DCE", UPGRADE_AUTH_DCE},
    {"DCS_ENCRYPT", UPGRADE_AUTH_DCS_ENCRYPT},
    {"DCE_SERVER_ENCRYPT", UPGRADE_AUTH_DCE_SERVER_ENCRYPT},
    {"KERBEROS", UPGRADE_AUTH_KERBEROS},
    {"KERBEROS_SERVER_ENCRYPT", UPGRADE_AUTH_KERBEROS_SERVER_ENCRYPT},
};

// The arguments still to be read.
struct ArgCursor {
  int count;
  const char *const *args;
  int next;
};

bool isOptionArgument(const char *arg) {
  return arg[0] == '-' || arg[0] == '/';
}

Option findOption(const char *word) {
  for (const OptionWord &candidate : kOptionWords) {
    if (sqlomcpi(word, candidate.word, candidate.length) == 0)
      return candidate.option;
  }
  return Option::None;
}

// The value of an option with one: glued to it after one separator character
// when the argument is longer than three characters, else the next argument.
bool takeValue(ArgCursor &cursor, const char *arg, const char *&value) {
  if (std::strlen(arg) > 3) {
    value = arg + 3;
    return true;
  }
  if (cursor.next >= cursor.count || cursor.args[cursor.next] == nullptr)
    return false;
  value = cursor.args[cursor.next++];
  return true;
}

bool isAllDigits(const char *text) {
  for (; *text != '\0'; ++text) {
    if (*text < '0' || *text > '9')
      return false;
  }
  return true;
}

// Decimal value of a digits-only text, held below an upper bound so that
// long digit strings cannot overflow (they are out of range anyway).
uint32_t decimalValue(const char *text) {
  uint32_t value = 0;
  for (; *text != '\0'; ++text) {
    value = value * 10 + uint32_t(*text - '0');
    if (value > kMaxPort)
      return kMaxPort + 1;
  }
  return value;
}

int takeInstanceName(const char *arg, bool &haveInstance, UpgradeOptions &options) {
  if (haveInstance)
    return UPGRADE_RC_USAGE;
  if (std::strlen(arg) > kMaxInstanceName)
    return UPGRADE_RC_BAD_INSTANCE_NAME;
  haveInstance = true;
  copyText(options.instanceName, sizeof options.instanceName, arg);
  if (sqlotoup(uint32_t(std::strlen(options.instanceName)), 0, options.instanceName) != 0)
    return UPGRADE_RC_BAD_INSTANCE_NAME;
  if (sqloacss(options.instanceName, kInstanceNameClass) != 0)
    return UPGRADE_RC_BAD_INSTANCE_NAME;
  return 0;
}

int takeAuthType(const char *value, UpgradeOptions &options) {
  char word[UPGRADE_AUTH_NAME_SZ] = {};
  copyTextCut(word, sizeof word, value, kAuthValueChars);
  for (const AuthWord &candidate : kAuthWords) {
    if (sqlomcpi(word, candidate.word, 0) == 0) {
      copyText(options.authTypeName, sizeof options.authTypeName, word);
      options.authType = candidate.code;
      options.flags |= UPGRADE_FLAG_AUTH_TYPE;
      return 0;
    }
  }
  return UPGRADE_RC_USAGE;
}

int takeProfilePath(const char *value, UpgradeOptions &options) {
  char path[UPGRADE_PATH_SZ] = {};
  copyTextCut(path, sizeof path, value, kProfileValueChars);
  // A drive root typed with its backslash ("D:\") stands for the drive itself.
  std::size_t length = std::strlen(path);
  if (length >= 2 && path[length - 2] == ':')
    path[length - 1] = '\0';
  copyText(options.profilePath, sizeof options.profilePath, path);
  if (GetFileAttributesA(options.profilePath) == FILE_ATTRIBUTE_DIRECTORY)
    return 0;
  return ossIsDirectory(options.profilePath) ? 0 : UPGRADE_RC_BAD_PROFILE_PATH;
}

int takeAccount(const char *value, UpgradeOptions &options) {
  char account[kAccountValueChars + 1] = {};
  copyTextCut(account, sizeof account, value, kAccountValueChars);
  char *comma = std::strchr(account, ',');
  if (comma == nullptr) {
    if (std::strlen(account) > kUserNameChars)
      return UPGRADE_RC_BAD_ACCOUNT;
    copyText(options.userName, sizeof options.userName, account);
    return 0;
  }
  *comma = '\0';
  copyTextCut(options.userName, sizeof options.userName, account, kUserNameChars);
  copyTextCut(options.password, sizeof options.password, comma + 1, kPasswordChars);
  if (options.password[0] != '\0')
    return 0;
  if (sqlo_get_password(options.userName, options.password, sizeof options.password) != 0)
    return UPGRADE_RC_BAD_ACCOUNT;
  return 0;
}

// The whole keyword, in any case: an abbreviation or an empty word before the
// comma is refused as well.
bool isTextSearchKeyword(const char *word) {
  return sqlomcpi(word, kTextSearchKeyword, sizeof kTextSearchKeyword) == 0;
}

int storeTextSearchService(const char *name, PartitionRecord &record) {
  std::memset(record.textSearchService, 0, sizeof record.textSearchService);
  if (std::strlen(name) > kTextSearchServiceChars)
    return UPGRADE_RC_TEXT_SEARCH_RANGE;
  copyText(record.textSearchService, sizeof record.textSearchService, name);
  return 0;
}

int storeTextSearchPort(const char *digits, PartitionRecord &record) {
  uint32_t port = decimalValue(digits);
  if (port < kMinPort || port > kMaxPort)
    return UPGRADE_RC_TEXT_SEARCH_RANGE;
  record.textSearchPort = uint16_t(port);
  return 0;
}

// "TEXT_SEARCH,<service or port>": digits only (none counts as 0) is a port.
int takeServiceOrPort(const char *text, PartitionRecord &record) {
  if (isAllDigits(text))
    return storeTextSearchPort(text, record);
  return storeTextSearchService(text, record);
}

// "TEXT_SEARCH,<service>,<port>": the port must be a whole, nonzero number.
int takeServiceAndPort(char *service, char *port, PartitionRecord &record) {
  int rc = storeTextSearchService(service, record);
  if (rc != 0)
    return rc;
  if (port[0] == '\0' || !isAllDigits(port) || decimalValue(port) == 0)
    return UPGRADE_RC_BAD_TEXT_SEARCH;
  return storeTextSearchPort(port, record);
}

int takeTextSearch(const char *value, PartitionRecord &record) {
  char text[kTextSearchValueSize] = {};
  copyText(text, sizeof text, value);
  if (text[0] == '\0')
    return UPGRADE_RC_BAD_TEXT_SEARCH;
  char *firstComma = std::strchr(text, ',');
  if (firstComma != nullptr)
    *firstComma = '\0';
  if (!isTextSearchKeyword(text))
    return UPGRADE_RC_BAD_TEXT_SEARCH;
  // A second -j would silently lose one of the two settings: refuse it.
  if (record.textSearchRequested != 0)
    return UPGRADE_RC_BAD_TEXT_SEARCH;
  int rc = 0;
  if (firstComma != nullptr) {
    char *service = firstComma + 1;
    char *secondComma = std::strchr(service, ',');
    if (secondComma == nullptr) {
      rc = takeServiceOrPort(service, record);
    } else {
      *secondComma = '\0';
      rc = takeServiceAndPort(service, secondComma + 1, record);
    }
  }
  if (rc == 0)
    record.textSearchRequested = 1;
  return rc;
}

// The administration server instance is never upgraded by this command.
int checkAdminServer(const UpgradeOptions &options) {
  OSSInstanceInfo_t info;
  std::memset(&info, 0, sizeof info);
  if (ossGetInstanceInfo(OSS_ADMIN_SERVER_INSTANCE, 0, nullptr, &info, false) != 0)
    return 0;
  info.instanceName[sizeof info.instanceName - 1] = '\0';
  if (sqlomcpi(info.instanceName, options.instanceName, UPGRADE_INSTANCE_NAME_SZ) == 0)
    return UPGRADE_RC_ADMIN_SERVER;
  return 0;
}

int applyValueOption(Option option, const char *value, UpgradeOptions &options) {
  switch (option) {
  case Option::AuthType:
    return takeAuthType(value, options);
  case Option::ProfilePath:
    return takeProfilePath(value, options);
  case Option::Account:
    return takeAccount(value, options);
  case Option::TextSearch:
    return takeTextSearch(value, options.partitionRecord);
  default:
    return UPGRADE_RC_USAGE;
  }
}

int applyOption(ArgCursor &cursor, const char *arg, UpgradeOptions &options) {
  Option option = findOption(arg + 1);
  switch (option) {
  case Option::Quiet:
    options.quiet = 1;
    return 0;
  case Option::Installer:
    options.flags |= UPGRADE_FLAG_INSTALLER;
    return 0;
  case Option::ForceCopyName:
    options.flags |= UPGRADE_FLAG_FORCE_COPY_NAME;
    return 0;
  case Option::Help:
  case Option::None:
    return UPGRADE_RC_USAGE;
  default:
    break;
  }
  const char *value = nullptr;
  if (!takeValue(cursor, arg, value))
    return option == Option::TextSearch ? UPGRADE_RC_BAD_TEXT_SEARCH : UPGRADE_RC_USAGE;
  return applyValueOption(option, value, options);
}

int parseArguments(ArgCursor &cursor, UpgradeOptions &options) {
  bool haveInstance = false;
  while (cursor.next < cursor.count) {
    const char *arg = cursor.args[cursor.next++];
    if (arg == nullptr)
      return UPGRADE_RC_USAGE;
    int rc = isOptionArgument(arg) ? applyOption(cursor, arg, options)
                                   : takeInstanceName(arg, haveInstance, options);
    if (rc != 0) {
      pdtError(kTraceParse, uint32_t(cursor.next), rc);
      return rc;
    }
  }
  if (!haveInstance)
    return UPGRADE_RC_USAGE;
  return checkAdminServer(options);
}

} // namespace

int parseCommandLine(int argc, const char *const *argv, UpgradeOptions *options) {
  pdtEntry(kTraceParse);
  if (options == nullptr) {
    pdtExit(kTraceParse, UPGRADE_RC_USAGE, 0);
    return UPGRADE_RC_USAGE;
  }
  options->partitionRecord.textSearchRequested = 0;
  options->partitionRecord.textSearchReasonCode = 0;
  int rc = UPGRADE_RC_USAGE;
  if (argc >= 2 && argv != nullptr) {
    ArgCursor cursor{argc, argv, 1};
    rc = parseArguments(cursor, *options);
  }
  pdtExit(kTraceParse, rc, 0);
  return rc;
}
