// The command's result codes and the numbers of the messages it prints, in
// one table. A negative result is the negative number of the message that
// reports it (catalog "kxlinst.mo"); UPGRADE_RC_SQLCA leaves the reason in the
// status block, whose SQLCODE names a message of "kxlsql.mo".
#pragma once

#include <cstdint>

// ---------------------------------------------------------------------------
// Results of the run and its checks (front end)
// ---------------------------------------------------------------------------
inline constexpr int32_t UPGRADE_RC_SQLCA = -1; // the status block holds the reason
inline constexpr int32_t UPGRADE_RC_USAGE = -1946;
inline constexpr int32_t UPGRADE_RC_BAD_INSTANCE_NAME = -1916;
inline constexpr int32_t UPGRADE_RC_BAD_PROFILE_PATH = -1920;
inline constexpr int32_t UPGRADE_RC_BAD_ACCOUNT = -1921;
inline constexpr int32_t UPGRADE_RC_BAD_TEXT_SEARCH = -1934;
inline constexpr int32_t UPGRADE_RC_TEXT_SEARCH_RANGE = -1701;
inline constexpr int32_t UPGRADE_RC_ADMIN_SERVER = -1954;
// The installed copies, the current copy or the instance's own copy cannot be
// had (also: its profile key or port variables cannot be read or created).
inline constexpr int32_t UPGRADE_RC_NO_COPY = -1918;
inline constexpr int32_t UPGRADE_RC_INSTANCE_UNKNOWN = 1951;
inline constexpr int32_t UPGRADE_RC_RESERVED_INSTANCE = -1139;
inline constexpr int32_t UPGRADE_RC_BAD_VERSION = -1949;
inline constexpr int32_t UPGRADE_RC_ALREADY_UPGRADED = 1950;
inline constexpr int32_t UPGRADE_RC_NODE_TYPE_UNKNOWN =
    -1926;                                                  // kxlsystm gives no node type (token: the file)
inline constexpr int32_t UPGRADE_RC_CHECK_PROBLEMS = -1205; // the database check found problems
inline constexpr int32_t UPGRADE_RC_CHECK_FAILED = -1069;   // the database check program failed
// The current directory cannot hold the check's files under paths that fit.
inline constexpr int32_t UPGRADE_RC_CHECK_DIRECTORY = -1927;

// ---------------------------------------------------------------------------
// Results of the upgrade engine
// ---------------------------------------------------------------------------
inline constexpr int32_t UPGRADE_RC_INSTANCE_ACTIVE = -1953;
inline constexpr int32_t UPGRADE_RC_DBM_CONFIG_FAILED = -1947;
// A partitioned instance whose node list is missing, empty or unreadable.
inline constexpr int32_t UPGRADE_RC_NO_NODE_LIST = -1960;
inline constexpr int32_t UPGRADE_RC_BACKUP_FAILED = -1969;
inline constexpr int32_t UPGRADE_RC_PROFILE_PATH_FAILED = -1959;
// The current copy has no edition for the instance's node type (two tokens).
inline constexpr int32_t UPGRADE_RC_EDITION_MISMATCH = 1231;
inline constexpr int32_t UPGRADE_RC_MACHINE_REGISTRY = -1913;  // a machine's registry cannot be opened
inline constexpr int32_t UPGRADE_RC_HOST_UNKNOWN = -1922;      // given host name does not resolve
inline constexpr int32_t UPGRADE_RC_SERVICES_FILE = -1923;     // ports cannot be reserved
inline constexpr int32_t UPGRADE_RC_NO_SERVICE_CONFIG = -1925; // a service's start type unreadable
inline constexpr int32_t UPGRADE_RC_CONFIG_FILE = -5005;       // kxlsystm cannot be read or written
// The cluster step.
inline constexpr int32_t CLUSTER_RC_NO_API = -1251;        // a module or entry point is missing
inline constexpr int32_t CLUSTER_RC_NOT_CONVERTED = -1252; // type, name, a read, or a resource put back whole
inline constexpr int32_t CLUSTER_RC_NOT_RECREATED = -1253; // a resource gone or without its dependencies
inline constexpr int32_t CLUSTER_RC_NOT_DELETED = -1254;   // a resource could not be deleted; unchanged
// The kxlsystm conversion (upgradeDbmConfig).
inline constexpr int32_t KXL_DBMCFG_RC_FILE = -100;            // open, length or stream error
inline constexpr int32_t KXL_DBMCFG_RC_RELEASE = -101;         // unknown release code
inline constexpr int32_t KXL_DBMCFG_RC_CHECKSUM = -102;        // 16384-byte image damaged
inline constexpr int32_t KXL_DBMCFG_RC_SMALL_CHECKSUM = -5050; // small file damaged
inline constexpr int32_t KXL_DBMCFG_RC_NODE_TYPES = -5065;     // node-type pair not supported

// ---------------------------------------------------------------------------
// SQLCODEs the command puts into the status block (with UPGRADE_RC_SQLCA)
// ---------------------------------------------------------------------------
// The partition settings could not be prepared (no full host name, no
// communication settings).
inline constexpr int32_t UPGRADE_SQLCODE_PARTITION_SETUP = -1042;
inline constexpr int32_t UPGRADE_SQLCODE_NO_AUTH_ID = -1403;
inline constexpr int32_t UPGRADE_SQLCODE_NOT_ADMIN = -1092; // token: the user

// ---------------------------------------------------------------------------
// Messages printed besides a result's own
// ---------------------------------------------------------------------------
inline constexpr int32_t UPGRADE_MSG_SUCCESS = 1000;        // "kxlclp.mo"
inline constexpr int32_t UPGRADE_MSG_CHECK_WARNINGS = 1225; // the database check warned
inline constexpr int32_t UPGRADE_MSG_TEXT_SEARCH = 1273;    // token: the reason code
inline constexpr int32_t UPGRADE_MSG_DEPRECATED_COMMAND = 1392;
inline constexpr int32_t UPGRADE_MSG_ODBC_SOURCES = 1917;     // data sources to catalog again
inline constexpr int32_t UPGRADE_MSG_UNDO_COMPLETE = 1971;    // the instance was put back
inline constexpr int32_t UPGRADE_MSG_UNDO_INCOMPLETE = -1972; // token: where the backup is kept
