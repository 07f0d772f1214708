// "odbc32.dll": the driver manager's environment handles and its list of
// data sources, read from the ODBC Data Sources keys of the machine (system
// data sources) and then of the user.
#include "platform/odbc.h"
#include "sim/common/simfail.h"
#include "sim/posix/handles.h"
#include "sim/posix/modules.h"
#include "sim/posix/reghelp.h"

#include <cstring>
#include <string>
#include <utility>
#include <vector>

using namespace kxlsim::posix;

namespace {

constexpr const char *kDataSourcesKey = "SOFTWARE\\ODBC\\ODBC.INI\\ODBC Data Sources";
// A broken driver manager: a dword named after a function is its every answer.
constexpr const char *kAnswersKey = "SOFTWARE\\ZAV\\KXLSIM\\Odbc";

bool fixedAnswer(const char *function, SQLRETURN &answer) {
  DWORD value = 0;
  if (!reg::readDword(HKEY_LOCAL_MACHINE, kAnswersKey, function, value))
    return false;
  answer = static_cast<SQLRETURN>(static_cast<int32_t>(value));
  return true;
}

struct EnvironmentObject : HandleObject {
  bool closableByCloseHandle() const override { return false; }
  std::vector<std::pair<std::string, std::string>> sources;
  size_t next = 0;
};

std::vector<std::pair<std::string, std::string>> dataSources(bool system, bool user) {
  std::vector<std::pair<std::string, std::string>> sources;
  if (system)
    sources = reg::stringValues(HKEY_LOCAL_MACHINE, kDataSourcesKey);
  if (user)
    for (auto &source : reg::stringValues(HKEY_CURRENT_USER, kDataSourcesKey))
      sources.push_back(std::move(source));
  return sources;
}

// Copies by ODBC's rule: the full length goes to `length`; a text that does
// not fit is cut and terminated, and reported as truncated.
bool copyTruncated(const std::string &text, SQLCHAR *out, SQLSMALLINT capacity, SQLSMALLINT *length) {
  if (length != nullptr)
    *length = static_cast<SQLSMALLINT>(text.size() > 32767 ? 32767 : text.size());
  if (out == nullptr)
    return true;
  if (capacity <= 0)
    return false;
  size_t fits = text.size() < static_cast<size_t>(capacity) ? text.size() : static_cast<size_t>(capacity) - 1;
  std::memcpy(out, text.data(), fits);
  out[fits] = '\0';
  return fits == text.size();
}

// Starts the list again for a "first" direction; false for an unknown one.
bool positionFor(EnvironmentObject &environment, SQLUSMALLINT direction) {
  switch (direction) {
  case SQL_FETCH_FIRST:
    environment.sources = dataSources(true, true);
    break;
  case SQL_FETCH_FIRST_SYSTEM:
    environment.sources = dataSources(true, false);
    break;
  case SQL_FETCH_FIRST_USER:
    environment.sources = dataSources(false, true);
    break;
  case SQL_FETCH_NEXT:
    return true;
  default:
    return false;
  }
  environment.next = 0;
  return true;
}

} // namespace

namespace kxlsim::posix::odbc32 {

SQLRETURN SQL_API SQLAllocEnv(SQLHENV *EnvironmentHandle) {
  if (EnvironmentHandle == nullptr)
    return SQL_ERROR;
  *EnvironmentHandle = nullptr;
  if (kxlsim::shouldFail("SQLAllocEnv"))
    return SQL_ERROR;
  if (SQLRETURN answer; fixedAnswer("SQLAllocEnv", answer))
    return answer;
  auto environment = std::make_unique<EnvironmentObject>();
  environment->sources = dataSources(true, true);
  *EnvironmentHandle = registerHandle(std::move(environment));
  return SQL_SUCCESS;
}

SQLRETURN SQL_API SQLDataSources(SQLHENV EnvironmentHandle, SQLUSMALLINT Direction, SQLCHAR *ServerName,
                                 SQLSMALLINT BufferLength1, SQLSMALLINT *NameLength1, SQLCHAR *Description,
                                 SQLSMALLINT BufferLength2, SQLSMALLINT *NameLength2) {
  if (kxlsim::shouldFail("SQLDataSources"))
    return SQL_ERROR;
  if (SQLRETURN answer; fixedAnswer("SQLDataSources", answer))
    return answer;
  auto *environment = lookupHandleAs<EnvironmentObject>(EnvironmentHandle);
  if (environment == nullptr)
    return SQL_INVALID_HANDLE;
  if (BufferLength1 < 0 || BufferLength2 < 0 || !positionFor(*environment, Direction))
    return SQL_ERROR;
  if (environment->next >= environment->sources.size())
    return SQL_NO_DATA;
  const auto &[name, driver] = environment->sources[environment->next++];
  bool whole = copyTruncated(name, ServerName, BufferLength1, NameLength1);
  whole = copyTruncated(driver, Description, BufferLength2, NameLength2) && whole;
  return whole ? SQL_SUCCESS : SQL_SUCCESS_WITH_INFO;
}

} // namespace kxlsim::posix::odbc32

namespace kxlsim::posix {

const ModuleDefinition &odbc32Module() {
  using namespace odbc32;
  static const ModuleExport exports[] = {
      {"SQLAllocEnv", exportAddress(&SQLAllocEnv)},
      {"SQLDataSources", exportAddress(&SQLDataSources)},
  };
  static const ModuleDefinition definition{"odbc32.dll", exports, sizeof exports / sizeof exports[0]};
  return definition;
}

} // namespace kxlsim::posix
