// Checks around the upgrade: the caller's authority and the databases before
// it, ODBC data sources that need cataloguing again after it.
#pragma once

#include "upgrade/records.h"

#include <cstdint>

class UpgradeContext;

inline constexpr uint32_t KXL_FN_CHECK_LOCAL_ADMIN = 0x187805C0u;
inline constexpr uint32_t KXL_FN_RUN_DATABASE_CHECK = 0x187805C1u;
inline constexpr uint32_t KXL_FN_FIND_ODBC_SOURCES = 0x187805C2u;

// 0 when the user may upgrade; -1 with the reason in `status` (SQLCODE -1403:
// no authorization ID; -1092 naming the user: not an administrator); another
// negative value from the platform's administrator test.
int checkLocalAdmin(sqlca *status);

// Refuses an active instance (-1953), then runs the database check tool of the
// instance's copy over its databases from the current directory: 0 to go on
// (warnings print message 1225), -1205 or -1069 with the record's tokens set,
// -1927 when the current directory is too long to work in, -1918 when the
// instance's installation cannot be switched to and back, or the program
// start's own failure.
int runDatabaseCheck(UpgradeContext &context, UpgradeOptions &options);

// True when an ODBC data source uses the product's driver (of copy `copyName`,
// or of any copy when null). *status: the last fetch's result, SQL_NO_DATA
// when there are no data sources, SQL_ERROR or SQL_INVALID_HANDLE on an ODBC
// error, ERROR_NOT_FOUND without ODBC.
bool findOdbcDataSources(const char *copyName, int32_t *status);
