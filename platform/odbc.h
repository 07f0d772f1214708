// The ODBC driver manager ("odbc32.dll"), bound at run time by name: the types
// and constants of the two entry points the command uses, and their
// function-pointer types PFN_SQLAllocEnv and PFN_SQLDataSources.
#pragma once

#include "platform/win32.h"

#if defined(_WIN32)

#include <sql.h>
#include <sqlext.h>

#else // simulated Windows

#define SQL_API
typedef signed short SQLSMALLINT;
typedef unsigned short SQLUSMALLINT;
typedef SQLSMALLINT SQLRETURN;
typedef unsigned char SQLCHAR;
typedef void *SQLHANDLE;
typedef SQLHANDLE SQLHENV;

#define SQL_SUCCESS 0
#define SQL_SUCCESS_WITH_INFO 1
#define SQL_NO_DATA 100
#define SQL_ERROR (-1)
#define SQL_INVALID_HANDLE (-2)
#define SQL_FETCH_NEXT 1
#define SQL_FETCH_FIRST 2
#define SQL_FETCH_FIRST_USER 31
#define SQL_FETCH_FIRST_SYSTEM 32
#define SQL_MAX_DSN_LENGTH 32

#endif // simulated Windows

typedef SQLRETURN(SQL_API *PFN_SQLAllocEnv)(SQLHENV *EnvironmentHandle);
typedef SQLRETURN(SQL_API *PFN_SQLDataSources)(SQLHENV EnvironmentHandle, SQLUSMALLINT Direction,
                                               SQLCHAR *ServerName, SQLSMALLINT BufferLength1,
                                               SQLSMALLINT *NameLength1, SQLCHAR *Description,
                                               SQLSMALLINT BufferLength2, SQLSMALLINT *NameLength2);
