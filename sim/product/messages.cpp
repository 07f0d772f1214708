// The message service: texts from the MO catalogs of the current
// installation, "<installation>\msg\<language>\<catalog>", falling back to
// the "en_US" catalog, with tokens put into their placeholders.
#include "platform/kxlsys.h"
#include "sim/common/simfail.h"
#include "sim/product/mocatalog.h"
#include "sim/product/text.h"
#include "sim/product/winpath.h"

#include <cstdio>
#include <cstring>
#include <string>
#include <vector>

namespace kxlprod {
namespace {

constexpr const char kFallbackLanguage[] = "en_US";

std::string catalogFileName(const char *catalog) {
  std::string name = catalog;
  bool hasSuffix =
      name.size() >= 3 && startsWithIgnoringCase(std::string_view(name).substr(name.size() - 3), ".mo");
  return hasSuffix ? name : name + ".mo";
}

bool findInLanguage(const std::string &install, const char *language, const std::string &file,
                    const char *key, MoCatalog &catalog, std::string_view &text) {
  std::string path = joinPath(joinPath(joinPath(install, "msg"), language), file);
  return loadCatalogFile(path.c_str(), catalog) && catalog.find(key, text);
}

// The catalog text for `key`: the environment's language first, then en_US.
// `catalog` keeps the text's storage.
bool findMessage(const char *catalogName, const char *key, MoCatalog &catalog, std::string_view &text) {
  std::string install;
  if (catalogName == nullptr || catalogName[0] == '\0' || !currentInstallationPath(install))
    return false;
  std::string file = catalogFileName(catalogName);
  std::string language = environmentLanguage();
  return findInLanguage(install, language.c_str(), file, key, catalog, text) ||
         findInLanguage(install, kFallbackLanguage, file, key, catalog, text);
}

// The caller's tokens, one per placeholder at most; a null token ends them.
std::vector<std::string_view> callerTokens(const uint64_t *lengths, const char *const *tokens,
                                           std::size_t placeholders) {
  std::vector<std::string_view> out;
  for (std::size_t i = 0; tokens != nullptr && i < placeholders && tokens[i] != nullptr; ++i) {
    std::size_t length = lengths != nullptr ? strnlen(tokens[i], lengths[i]) : std::strlen(tokens[i]);
    out.emplace_back(tokens[i], length);
  }
  return out;
}

// The tokens of a status block: its token field, separated by 0xFF.
std::vector<std::string_view> sqlcaTokens(const sqlca &ca) {
  std::size_t length = ca.sqlerrml < 0 ? 0 : std::size_t(ca.sqlerrml);
  if (length > sizeof ca.sqlerrmc)
    length = sizeof ca.sqlerrmc;
  std::string_view field(ca.sqlerrmc, strnlen(ca.sqlerrmc, length));
  std::vector<std::string_view> out;
  while (!field.empty()) {
    std::size_t cut = field.find(SQLCA_TOKEN_SEPARATOR);
    out.push_back(field.substr(0, cut));
    if (cut == std::string_view::npos)
      break;
    field.remove_prefix(cut + 1);
  }
  return out;
}

// Breaks lines longer than `width` at their last blank within the width.
void wrapLines(char *text, uint32_t width) {
  std::size_t lineStart = 0, lastBlank = std::string::npos;
  for (std::size_t i = 0; text[i] != '\0'; ++i) {
    if (text[i] == '\n') {
      lineStart = i + 1;
      lastBlank = std::string::npos;
      continue;
    }
    if (text[i] == ' ')
      lastBlank = i;
    if (i - lineStart >= width && lastBlank != std::string::npos) {
      text[lastBlank] = '\n';
      lineStart = lastBlank + 1;
      lastBlank = std::string::npos;
    }
  }
}

} // namespace
} // namespace kxlprod

using namespace kxlprod;

extern "C" {

int32_t sqlogmsg(const char *catalog, uint32_t number, const uint64_t *tokenLengths,
                 const char *const *tokens, char *buffer, uint32_t size, int32_t *rc, uint32_t reserved1,
                 uint32_t reserved2, uint32_t reserved3) {
  (void)reserved1;
  (void)reserved2;
  (void)reserved3;
  int32_t status = SQLO_RC_INVALID_ARGUMENT;
  int32_t length = 0;
  if (buffer != nullptr && size > 0) {
    buffer[0] = '\0';
    char key[16];
    std::snprintf(key, sizeof key, "KXL%04u", number);
    MoCatalog store;
    std::string_view text;
    status = SQLO_RC_NOT_FOUND;
    if (kxlsim::shouldFail("sqlogmsg")) {
      status = SQLO_RC_IO_ERROR;
    } else if (findMessage(catalog, key, store, text)) {
      auto values = callerTokens(tokenLengths, tokens, countPlaceholders(text));
      length = int32_t(fillPlaceholders(text, values, buffer, size));
      status = 0;
    }
  }
  if (rc != nullptr)
    *rc = status;
  return status == 0 ? length : status;
}

int32_t sqlaintp_api(char *buffer, uint32_t size, uint32_t lineWidth, const char *catalog, const sqlca *ca) {
  if (buffer == nullptr || size == 0 || ca == nullptr)
    return SQLO_RC_INVALID_ARGUMENT;
  buffer[0] = '\0';
  if (kxlsim::shouldFail("sqlaintp_api"))
    return SQLO_RC_IO_ERROR;
  int32_t code = ca->sqlcode;
  char key[16];
  std::snprintf(key, sizeof key, "SQL%04lld%c", code < 0 ? -(long long)code : (long long)code,
                code < 0 ? 'N' : (code > 0 ? 'W' : 'I'));
  MoCatalog store;
  std::string_view text;
  if (!findMessage(catalog, key, store, text))
    return SQLO_RC_NOT_FOUND;
  int32_t length = int32_t(fillPlaceholders(text, sqlcaTokens(*ca), buffer, size));
  if (lineWidth > 0)
    wrapLines(buffer, lineWidth);
  return length;
}

} // extern "C"
