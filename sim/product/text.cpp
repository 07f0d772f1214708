// Names and text: case-insensitive compare, upper-casing, the instance name
// check, the password prompt and the environment's language.
#include "sim/product/text.h"

#include "platform/kxlsys.h"
#include "sim/common/simfail.h"
#include "sim/posix/reghelp.h"
#include "sim/product/installation.h"

#include <cstdio>
#include <cstring>

namespace reg = kxlsim::posix::reg;

namespace kxlprod {
namespace {

constexpr uint32_t kInstanceNameClass = 16;
constexpr std::size_t kMaxInstanceName = 8;
constexpr std::size_t kMaxOtherName = 128;
constexpr const char kDefaultLanguage[] = "en_US";

char upper(char c) {
  return c >= 'a' && c <= 'z' ? char(c - 'a' + 'A') : c;
}
char lower(char c) {
  return c >= 'A' && c <= 'Z' ? char(c - 'A' + 'a') : c;
}
bool isLetter(char c) {
  return (c >= 'A' && c <= 'Z') || (c >= 'a' && c <= 'z');
}
bool isDigit(char c) {
  return c >= '0' && c <= '9';
}

// Letters, digits and "@", "#", "$", "_" after a leading letter.
bool isValidName(const char *name, std::size_t maxLength) {
  std::size_t length = strnlen(name, maxLength + 1);
  if (length == 0 || length > maxLength || !isLetter(name[0]))
    return false;
  for (std::size_t i = 1; i < length; ++i) {
    char c = name[i];
    if (!isLetter(c) && !isDigit(c) && c != '@' && c != '#' && c != '$' && c != '_')
      return false;
  }
  return true;
}

bool isWord(std::string_view text, std::size_t minLength, std::size_t maxLength, bool digitsToo) {
  if (text.size() < minLength || text.size() > maxLength)
    return false;
  for (char c : text) {
    if (!isLetter(c) && !(digitsToo && isDigit(c)))
      return false;
  }
  return true;
}

// The "Language" value of the machine identity, "" when absent.
std::string identityLanguage() {
  std::string value;
  reg::queryString(HKEY_LOCAL_MACHINE, std::string(kSimRoot) + "\\Identity", "Language", value);
  return value;
}

std::string environmentValue(const char *name) {
  char value[64] = {};
  DWORD length = GetEnvironmentVariableA(name, value, sizeof value);
  return length > 0 && length < sizeof value ? std::string(value) : std::string();
}

// Reads one line from the handle into password (cut to size - 1, the rest of
// the line is consumed). False at end of input before any character.
bool readLine(HANDLE input, char *password, uint32_t size) {
  uint32_t used = 0;
  bool any = false;
  for (;;) {
    char c = 0;
    DWORD got = 0;
    if (!ReadFile(input, &c, 1, &got, nullptr) || got == 0)
      break;
    any = true;
    if (c == '\n')
      break;
    if (c == '\r')
      continue;
    if (used + 1 < size)
      password[used++] = c;
  }
  password[used] = '\0';
  return any;
}

} // namespace

bool copyBounded(const std::string &text, char *buffer, size_t size) {
  if (buffer == nullptr || size == 0)
    return false;
  size_t n = text.size() < size ? text.size() : size - 1;
  std::memcpy(buffer, text.data(), n);
  buffer[n] = '\0';
  return n == text.size();
}

std::string normalizeLanguage(std::string_view locale) {
  std::string_view base = locale.substr(0, locale.find_first_of(".@"));
  if (base == "C" || base == "POSIX")
    return kDefaultLanguage;
  std::size_t cut = base.find_first_of("_-");
  std::string_view language = base.substr(0, cut);
  std::string_view territory = cut == std::string_view::npos ? std::string_view() : base.substr(cut + 1);
  if (!isWord(language, 2, 3, false))
    return "";
  if (cut != std::string_view::npos && !isWord(territory, 2, 3, true))
    return "";
  std::string out;
  for (char c : language)
    out += lower(c);
  if (!territory.empty()) {
    out += '_';
    for (char c : territory)
      out += upper(c);
  }
  return out;
}

std::string environmentLanguage() {
  for (const std::string &source :
       {identityLanguage(), environmentValue("LC_ALL"), environmentValue("LANG")}) {
    std::string normalized = normalizeLanguage(source);
    if (!normalized.empty())
      return normalized;
  }
  return kDefaultLanguage;
}

} // namespace kxlprod

using namespace kxlprod;

extern "C" {

int32_t sqlomcpi(const char *a, const char *b, uint32_t length) {
  if (kxlsim::shouldFail("sqlomcpi"))
    return 1;
  if (a == nullptr || b == nullptr)
    return a == b ? 0 : (a == nullptr ? -1 : 1);
  // Length 0 compares over the first text's own length, so a caller's text
  // that was cut to its field still matches the word it begins; an empty text
  // matches only an empty word.
  std::size_t count = length != 0 ? length : std::strlen(a) + (a[0] == '\0' ? 1 : 0);
  for (std::size_t i = 0; i < count; ++i) {
    char x = upper(a[i]);
    char y = upper(b[i]);
    if (x != y)
      return (unsigned char)x < (unsigned char)y ? -1 : 1;
    if (x == '\0')
      return 0;
  }
  return 0;
}

int32_t sqlotoup(uint32_t length, uint32_t codepage, char *text) {
  (void)codepage; // single-byte text: only the ASCII letters change
  if (kxlsim::shouldFail("sqlotoup"))
    return SQLO_RC_INVALID_ARGUMENT;
  if (text == nullptr)
    return SQLO_RC_INVALID_ARGUMENT;
  std::size_t count = length != 0 ? strnlen(text, length) : std::strlen(text);
  for (std::size_t i = 0; i < count; ++i)
    text[i] = upper(text[i]);
  return 0;
}

int32_t sqloacss(const char *name, uint32_t nameClass) {
  if (kxlsim::shouldFail("sqloacss"))
    return SQLO_RC_INVALID_ARGUMENT;
  if (name == nullptr)
    return SQLO_RC_INVALID_ARGUMENT;
  std::size_t maxLength = nameClass == kInstanceNameClass ? kMaxInstanceName : kMaxOtherName;
  return isValidName(name, maxLength) ? 0 : SQLO_RC_INVALID_ARGUMENT;
}

int32_t sqlo_get_password(const char *userName, char *password, uint32_t size) {
  if (password != nullptr && size > 0)
    password[0] = '\0';
  if (kxlsim::shouldFail("sqlo_get_password"))
    return SQLO_RC_IO_ERROR;
  if (password == nullptr || size == 0)
    return SQLO_RC_INVALID_ARGUMENT;
  std::printf("Enter password for %s:", userName ? userName : "");
  std::fflush(stdout);
  HANDLE input = GetStdHandle(STD_INPUT_HANDLE);
  if (input == nullptr || input == INVALID_HANDLE_VALUE)
    return SQLO_RC_IO_ERROR;
  // On a console the typed characters are not shown; a pipe is read as it is.
  DWORD mode = 0;
  bool console = GetConsoleMode(input, &mode) != 0;
  if (console)
    SetConsoleMode(input, mode & ~DWORD(ENABLE_ECHO_INPUT));
  bool ok = readLine(input, password, size);
  if (console) {
    SetConsoleMode(input, mode);
    std::printf("\n");
    std::fflush(stdout);
  }
  return ok ? 0 : SQLO_RC_IO_ERROR;
}

const char *sqloGetNormalizedEnvLang(uint32_t kind) {
  (void)kind; // 1: the message language; no other kind is offered
  static char language[16];
  std::string value =
      kxlsim::shouldFail("sqloGetNormalizedEnvLang") ? kDefaultLanguage : environmentLanguage();
  std::snprintf(language, sizeof language, "%s", value.c_str());
  return language;
}

} // extern "C"
