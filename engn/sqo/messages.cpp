// Final messages: catalog texts through the product library, written to
// standard output exactly as they are (never as a format string).
#include "engn/sqo/messages.h"

#include "engn/sqo/boundedtext.h"
#include "platform/kxlsys.h"

#include <cctype>
#include <cstdio>
#include <cstring>

namespace {

constexpr uint32_t kTraceInstanceMessage = 0x187805A1;

constexpr char kInstanceCatalog[] = "kxlinst.mo";
constexpr char kCommandCatalog[] = "kxlclp.mo";
constexpr char kSqlCatalog[] = "kxlsql.mo";
constexpr char kNewCommandName[] = "KXLIUPGRADE";

// Work buffer of replaceMessageToken: one more than a message buffer.
constexpr std::size_t kWorkBufferSize = SQLO_MSG_BUFFER_SZ + 1;

// Display words of node types 1 to 4.
constexpr const char *kInstanceTypeWords[] = {"STANDALONE", "CLIENT", "SERVER", "PARTITIONED"};

void writeText(const char *text) {
  std::fwrite(text, 1, std::strlen(text), stdout);
  std::fflush(stdout);
}

const char *orEmpty(const char *text) {
  return text != nullptr ? text : "";
}

uint32_t messageNumber(int code) {
  return code < 0 ? 0u - uint32_t(code) : uint32_t(code);
}

void printInstanceFallback(const char *prefix, const char *text, int code) {
  std::printf("%s:%s, RC = %d\n", orEmpty(prefix), orEmpty(text), code);
  std::fflush(stdout);
}

// First occurrence of `needle` in `haystack`, ignoring the case of ASCII letters.
const char *findIgnoringCase(const char *haystack, const char *needle) {
  std::size_t length = std::strlen(needle);
  for (const char *at = haystack; *at != '\0'; ++at) {
    if (sqlomcpi(at, needle, uint32_t(length)) == 0)
      return at;
  }
  return length == 0 ? haystack : nullptr;
}

void fillCodePlaceholders(char *message, const char *prefix, int code, const UpgradeOptions *options) {
  if (code == UPGRADE_MSG_DEPRECATED_COMMAND) {
    replaceMessageToken(message, SQLO_MSG_BUFFER_SZ, "\"<deprecated-command-name>\"", orEmpty(prefix));
    replaceMessageToken(message, SQLO_MSG_BUFFER_SZ, "\"<new-command-name>\"", kNewCommandName);
    return;
  }
  if (options == nullptr)
    return;
  if (code == UPGRADE_MSG_TEXT_SEARCH) {
    char reason[16] = {};
    std::snprintf(reason, sizeof reason, "%d", int(options->partitionRecord.textSearchReasonCode));
    replaceMessageToken(message, SQLO_MSG_BUFFER_SZ, "\"<reason-code>\"", reason);
  } else if (code == UPGRADE_RC_EDITION_MISMATCH) {
    char name[UPGRADE_INSTANCE_NAME_SZ] = {};
    copyText(name, sizeof name, options->instanceName);
    replaceMessageToken(message, SQLO_MSG_BUFFER_SZ, "\"<instance-name>\"", name);
    replaceMessageToken(message, SQLO_MSG_BUFFER_SZ, "\"<original-instance-type>\"",
                        instanceTypeWord(options->oldInstanceType));
    replaceMessageToken(message, SQLO_MSG_BUFFER_SZ, "\"<upgraded-instance-type>\"",
                        instanceTypeWord(options->newInstanceType));
  }
}

bool isPlaceholderNameCharacter(char c) {
  return std::isalnum(static_cast<unsigned char>(c)) || c == '-' || c == '_';
}

// The next quoted placeholder ("<name>", quotes included) at or after `from`;
// null when there is none. `end` gets the character after it.
const char *nextQuotedPlaceholder(const char *from, const char *&end) {
  for (const char *open = std::strstr(from, "\"<"); open != nullptr; open = std::strstr(open + 1, "\"<")) {
    const char *name = open + 2;
    const char *close = name;
    while (isPlaceholderNameCharacter(*close))
      ++close;
    if (close != name && close[0] == '>' && close[1] == '"') {
      end = close + 2;
      return open;
    }
  }
  return nullptr;
}

} // namespace

void spliceRecordTokens(const char *message, const UpgradeOptions &options, char *out, std::size_t size) {
  TextBuilder text(out, size);
  const char *cursor = orEmpty(message);
  uint32_t count = options.tokenCount < UPGRADE_MAX_TOKENS ? options.tokenCount : UPGRADE_MAX_TOKENS;
  for (uint32_t i = 0; i < count; ++i) {
    const char *end = nullptr;
    const char *open = nextQuotedPlaceholder(cursor, end);
    if (open == nullptr)
      break;
    text.append(cursor, std::size_t(open - cursor));
    text.append('"');
    text.append(orEmpty(options.tokens[i]));
    text.append('"');
    cursor = end;
  }
  text.append(cursor);
}

const char *instanceTypeWord(uint32_t nodeType) {
  if (nodeType >= 1 && nodeType <= sizeof kInstanceTypeWords / sizeof kInstanceTypeWords[0])
    return kInstanceTypeWords[nodeType - 1];
  return "";
}

void replaceMessageToken(char *message, std::size_t size, const char *placeholder, const char *value) {
  if (message == nullptr || placeholder == nullptr)
    return;
  if (std::strlen(message) + std::strlen(placeholder) > size)
    return;
  if (findIgnoringCase(message, placeholder) == nullptr)
    return;
  const char *open = std::strstr(message, "\"<");
  if (open == nullptr)
    return;
  // The closing mark is looked for after the opening one, so that a stray
  // '>"' earlier in the text cannot duplicate a part of it.
  const char *close = std::strstr(open, ">\"");
  if (close == nullptr)
    return;
  char work[kWorkBufferSize];
  TextBuilder out(work, sizeof work);
  out.append(message, std::size_t(open - message));
  out.append(orEmpty(value));
  out.append(close + 2);
  copyText(message, size, out.text());
}

void printInstanceMessage(const char *prefix, int code, const char *text, const UpgradeOptions *options) {
  pdtEntry(kTraceInstanceMessage);
  char message[SQLO_MSG_BUFFER_SZ] = {};
  int32_t detail = 0;
  int32_t length = sqlogmsg(kInstanceCatalog, messageNumber(code), nullptr, nullptr, message, sizeof message,
                            &detail, 0, 0, 0);
  if (length <= 0) {
    printInstanceFallback(prefix, text, code);
    pdtExit(kTraceInstanceMessage, length, 1);
    return;
  }
  message[sizeof message - 1] = '\0';
  fillCodePlaceholders(message, prefix, code, options);
  if (options == nullptr || options->tokenCount == 0) {
    writeText(message);
    if (code == UPGRADE_MSG_TEXT_SEARCH)
      printInstanceFallback(prefix, text, code);
  } else {
    char spliced[SQLO_MSG_BUFFER_SZ];
    spliceRecordTokens(message, *options, spliced, sizeof spliced);
    writeText(spliced);
  }
  pdtExit(kTraceInstanceMessage, 0, 0);
}

void printSqlcaMessage(const char *prefix, const sqlca *status, const char *text) {
  char message[SQLO_MSG_BUFFER_SZ] = {};
  int32_t length = status != nullptr ? sqlaintp_api(message, sizeof message, 0, kSqlCatalog, status) : 0;
  if (length > 0) {
    message[sizeof message - 1] = '\0';
    writeText(message);
    return;
  }
  std::printf("%s:%s, SQLCODE=%d\n", orEmpty(prefix), orEmpty(text),
              status != nullptr ? int(sqlcaCode(*status)) : 0);
  std::fflush(stdout);
}

void printSuccessMessage(const char *prefix, int code) {
  const char *tokens[] = {orEmpty(prefix), nullptr};
  const uint64_t lengths[] = {std::strlen(tokens[0]), 0};
  char message[SQLO_MSG_BUFFER_SZ] = {};
  int32_t detail = 0;
  int32_t length = sqlogmsg(kCommandCatalog, messageNumber(code), lengths, tokens, message, sizeof message,
                            &detail, 0, 0, 0);
  if (length > 0) {
    message[sizeof message - 1] = '\0';
    writeText(message);
    return;
  }
  std::printf("%s: processing completed successfully.\n", orEmpty(prefix));
  std::fflush(stdout);
}
