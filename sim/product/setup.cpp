// Set-up and status: library start-up, status blocks, the process control block
// and the name character set.
#include "platform/kxlsys.h"
#include "sim/common/simfail.h"

#include <cstdio>
#include <cstring>

namespace {

sqlz_krcb processControlBlock{};

// Codes of the library's own families have no SQLCODE of their own: they are
// reported as an unexpected system error carrying the code as its token.
constexpr int32_t kSystemErrorSqlcode = -1042;
constexpr int32_t kLargestSqlcode = 99999;

void initBlock(sqlca &ca) {
  std::memset(&ca, 0, sizeof ca);
  std::memcpy(ca.sqlcaid, "SQLCA   ", sizeof ca.sqlcaid);
  ca.sqlcabc = sizeof(sqlca);
}

void putTokens(sqlca &ca, uint32_t count, const uint64_t *lengths, const char *const *tokens) {
  size_t used = 0;
  for (uint32_t i = 0; i < count && tokens != nullptr; ++i) {
    const char *token = tokens[i] != nullptr ? tokens[i] : "";
    size_t length = lengths != nullptr ? static_cast<size_t>(lengths[i]) : std::strlen(token);
    size_t separator = i > 0 ? 1 : 0;
    if (used + separator >= sizeof ca.sqlerrmc)
      break;
    if (separator)
      ca.sqlerrmc[used++] = SQLCA_TOKEN_SEPARATOR;
    size_t room = sizeof ca.sqlerrmc - used;
    size_t n = length < room ? length : room;
    std::memcpy(ca.sqlerrmc + used, token, n);
    used += n;
  }
  ca.sqlerrml = static_cast<int16_t>(used);
}

} // namespace

extern "C" {

sqlz_krcb *sqlz_krcbp = &processControlBlock;

// The first 13 bytes name the set; from the fourteenth on, the characters a
// name may hold.
const char sqlz_charset[] = "KXLNAMECHARS:ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789@#$_";

uint32_t ossOneTimeOnly(void) {
  if (kxlsim::shouldFail("ossOneTimeOnly"))
    return OSS_RC_FAILED;
  return 0;
}

void sqloinca(sqlca *ca) {
  if (kxlsim::shouldFail("sqloinca") || ca == nullptr)
    return;
  initBlock(*ca);
}

int32_t sqlo_create_init_app_data(uint32_t appKind, int32_t *result) {
  int32_t rc = 0;
  if (kxlsim::shouldFail("sqlo_create_init_app_data"))
    rc = SQLO_RC_NO_MEMORY;
  else if (appKind == 0)
    rc = SQLO_RC_INVALID_ARGUMENT;
  if (result != nullptr)
    *result = rc;
  return rc;
}

int32_t sqlzRcToSqlca(uint32_t, sqlca *ca, const char *producer, int32_t rc, uint32_t, uint32_t) {
  if (kxlsim::shouldFail("sqlzRcToSqlca"))
    return SQLO_RC_SYSTEM_ERROR;
  if (ca == nullptr)
    return SQLO_RC_INVALID_ARGUMENT;
  initBlock(*ca);
  sqlcaSetProducer(*ca, producer);
  ca->sqlerrd[0] = rc;
  if (rc >= -kLargestSqlcode && rc <= kLargestSqlcode) {
    ca->sqlcode = rc;
    return 0;
  }
  ca->sqlcode = kSystemErrorSqlcode;
  char token[16];
  std::snprintf(token, sizeof token, "0x%08X", static_cast<unsigned>(rc));
  const char *tokens[] = {token};
  putTokens(*ca, 1, nullptr, tokens);
  return 0;
}

int32_t sqlegsca(int32_t sqlcode, uint32_t tokenCount, const uint64_t *tokenLengths,
                 const char *const *tokens, sqlca *ca) {
  if (kxlsim::shouldFail("sqlegsca"))
    return SQLO_RC_SYSTEM_ERROR;
  if (ca == nullptr || (tokenCount > 0 && tokens == nullptr))
    return SQLO_RC_INVALID_ARGUMENT;
  std::memset(ca->sqlerrmc, 0, sizeof ca->sqlerrmc);
  ca->sqlcode = sqlcode;
  putTokens(*ca, tokenCount, tokenLengths, tokens);
  return 0;
}

} // extern "C"
