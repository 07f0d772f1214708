// The product system library: every operation, type and data item the command
// and its engine use, declared once. Results are 32-bit codes, 0 for success.
// Codes of the "oss" operations are unsigned (0x9000xxxx family); the "sqlo"
// family returns signed codes (0x8xxxxxxx values read as negative numbers).
//
// Unless a comment says otherwise: strings are NUL-terminated single-byte text,
// output buffers are never written past the size given (or past the size this
// header documents for that buffer), and a null pointer where an input string is
// expected means "none".
#pragma once

#include "platform/win32.h"

#include <cstddef>
#include <cstdint>
#include <cstring>

// ---------------------------------------------------------------------------
// Sizes of text fields (bytes, terminator included)
// ---------------------------------------------------------------------------
inline constexpr uint32_t SQLO_INSTANCE_NAME_SZ = 9;  // 8 characters
inline constexpr uint32_t SQLO_COPY_NAME_SZ = 129;    // installation (copy) name
inline constexpr uint32_t SQLO_PATH_SZ = 261;         // path
inline constexpr uint32_t SQLO_HOSTNAME_SZ = 256;     // TCP/IP host name
inline constexpr uint32_t SQLO_COMPUTERNAME_SZ = 16;  // Windows computer name
inline constexpr uint32_t SQLO_PREG_VALUE_SZ = 256;   // profile value, default capacity
inline constexpr uint32_t SQLO_PREG_PROFILE_SZ = 129; // profile name
inline constexpr uint32_t SQLE_AUTHID_SZ = 129;       // authorization ID buffer
inline constexpr uint32_t SQLO_MSG_BUFFER_SZ = 4096;  // message text buffer
inline constexpr uint32_t SQLO_PORT_TEXT_SZ = 10;     // port / service entry text

// ---------------------------------------------------------------------------
// Result codes callers test
// ---------------------------------------------------------------------------
inline constexpr uint32_t OSS_RC_END_OF_LIST = 0x900001BEu;    // instance list exhausted
inline constexpr uint32_t OSS_RC_PATH_NOT_FOUND = 0x9000001Au; // path does not exist
inline constexpr uint32_t OSS_RC_NULL_ARGUMENT = 0x9000000Cu;
inline constexpr uint32_t OSS_RC_BUFFER_TOO_SMALL = 0x90000008u;
inline constexpr uint32_t OSS_RC_NOT_FOUND = 0x9000006Du; // no instance of that name
inline constexpr uint32_t OSS_RC_NO_MEMORY = 0x9000000Du;
inline constexpr uint32_t OSS_RC_FAILED = 0x90000002u; // system call failed

inline constexpr int32_t sqloCode(uint32_t code) {
  return static_cast<int32_t>(code);
}
inline constexpr int32_t SQLO_RC_INVALID_ARGUMENT = sqloCode(0x870F0001u);
inline constexpr int32_t SQLO_RC_NO_MEMORY = sqloCode(0x870F0002u);
inline constexpr int32_t SQLO_RC_ACCESS_DENIED = sqloCode(0x870F0003u);
inline constexpr int32_t SQLO_RC_IO_ERROR = sqloCode(0x870F0004u);
inline constexpr int32_t SQLO_RC_NOT_FOUND = sqloCode(0x870F0005u);        // generic "no such object"
inline constexpr int32_t SQLO_RC_SYSTEM_ERROR = sqloCode(0x870F0006u);     // an OS call failed
inline constexpr int32_t SQLO_RC_FILE_NOT_FOUND = sqloCode(0x860F000Au);   // copy: source file missing
inline constexpr int32_t SQLO_RC_FILE_NOT_FOUND_W = sqloCode(0x870F000Au); // same, reported as warning
inline constexpr int32_t SQLO_RC_PATH_NOT_FOUND = sqloCode(0x870F0011u);   // a directory is missing
inline constexpr int32_t SQLO_RC_DISK_FULL = sqloCode(0x870F0012u);        // no room on the target's drive
inline constexpr int32_t SQLO_RC_FILE_EXISTED = sqloCode(0x070F00CBu);     // open: existing file replaced
inline constexpr int32_t SQLO_RC_PREG_END = sqloCode(0x870F0105u);         // profile enumeration ended
inline constexpr int32_t SQLO_RC_PREG_NOT_SET = sqloCode(0x870F0106u);     // variable has no value
inline constexpr int32_t SQLO_RC_PREG_NO_PROFILE = sqloCode(0x870F0107u);  // profile key missing
inline constexpr int32_t SQLO_RC_PREG_BAD_VARIABLE = sqloCode(0x870F0108u);
inline constexpr int32_t SQLO_RC_NO_INSTALLATION = sqloCode(0x870F0110u); // copy unknown / not found
inline constexpr int32_t SQLO_RC_MACHINE_UNREACHABLE = sqloCode(0x870F0120u);
inline constexpr int32_t SQLO_RC_SVC_NOT_FOUND = sqloCode(0x870F0130u); // service does not exist
inline constexpr int32_t SQLO_RC_SVC_STOPPED = sqloCode(0x870F0131u);
inline constexpr int32_t SQLO_RC_SVC_RUNNING = sqloCode(0x870F0132u); // active
inline constexpr int32_t SQLO_RC_SVC_STOP_PENDING = sqloCode(0x870F0133u);
inline constexpr int32_t SQLO_RC_SVC_START_PENDING = sqloCode(0x870F0136u); // active
inline constexpr int32_t SQLO_RC_SVC_PAUSED = sqloCode(0x870F0137u);        // active
inline constexpr int32_t SQLO_RC_SVC_EXISTS = 1073;                         // register: already there
inline constexpr int32_t SQLO_RC_EXEC_FAILED = sqloCode(0x870F0140u);       // program could not start

// ---------------------------------------------------------------------------
// Environment and profile variables, by number
// ---------------------------------------------------------------------------
inline constexpr uint32_t KXL_VAR_KXLINSTANCE = 55;      // current instance (process environment)
inline constexpr uint32_t KXL_VAR_KXLINSTPROF = 57;      // instance profile path
inline constexpr uint32_t KXL_VAR_KXLPORTRANGE = 159;    // "first:last" communication ports
inline constexpr uint32_t KXL_VAR_KXLNODECOMPUTER = 160; // computer of partition 0
inline constexpr uint32_t KXL_VAR_KXLWORKSTATION = 230;  // derive workstation name (flag text)
inline constexpr uint32_t KXL_VAR_KXLEXTRAAGENTS = 253;  // extra agents per host
inline constexpr uint32_t KXL_VAR_KXLRESERVEDINST = 259; // instance reserved by the global profile

// Profile name that selects the copy's global profile.
inline constexpr const char KXL_GLOBAL_PROFILE_NAME[] = "KXLGLOBALPF";

// Actions of sqloPRegValue(PE) and sqloPRegProfile(PE).
inline constexpr uint32_t SQLO_PREG_GET = 3;      // read a variable
inline constexpr uint32_t SQLO_PREG_SET = 4;      // write a variable at instance/global level
inline constexpr uint32_t SQLO_PREG_UNSET = 5;    // remove a variable
inline constexpr uint32_t SQLO_PREG_FIRST = 1;    // first profile name
inline constexpr uint32_t SQLO_PREG_NEXT = 2;     // next profile name
inline constexpr uint32_t SQLO_PREG_REFRESH = 17; // re-read the current installation's registry
inline constexpr int32_t SQLO_PREG_ANY_NODE = -1; // node argument: not partition specific

// ---------------------------------------------------------------------------
// Status block
// ---------------------------------------------------------------------------
struct sqlca {
  char sqlcaid[8];    // "SQLCA   "
  int32_t sqlcabc;    // 136
  int32_t sqlcode;    // result code (SQLCODE)
  int16_t sqlerrml;   // length of sqlerrmc
  char sqlerrmc[70];  // tokens, separated by 0xFF
  char sqlerrp[8];    // producer tag (no terminator)
  int32_t sqlerrd[6]; // diagnostic words
  char sqlwarn[11];   // warning flags
  char sqlstate[5];   // SQLSTATE
};
static_assert(sizeof(sqlca) == 136);
static_assert(offsetof(sqlca, sqlcode) == 12);
static_assert(offsetof(sqlca, sqlerrmc) == 18);
static_assert(offsetof(sqlca, sqlerrp) == 88);
static_assert(offsetof(sqlca, sqlerrd) == 96);
static_assert(offsetof(sqlca, sqlstate) == 131);

inline constexpr char SQLCA_TOKEN_SEPARATOR = '\xFF';

inline int32_t sqlcaCode(const sqlca &ca) {
  return ca.sqlcode;
}
inline void sqlcaSetCode(sqlca &ca, int32_t code) {
  ca.sqlcode = code;
}
// Writes the producer tag: up to 8 characters, blank padded, no terminator.
inline void sqlcaSetProducer(sqlca &ca, const char *tag) {
  std::memset(ca.sqlerrp, ' ', sizeof ca.sqlerrp);
  size_t n = tag ? std::strlen(tag) : 0;
  std::memcpy(ca.sqlerrp, tag ? tag : "", n < sizeof ca.sqlerrp ? n : sizeof ca.sqlerrp);
}

// ---------------------------------------------------------------------------
// Instance registry record
// ---------------------------------------------------------------------------
inline constexpr uint32_t OSS_INSTANCE_TYPE_SERVER = 1;
inline constexpr uint32_t OSS_INSTANCE_TYPE_ADMIN = 2; // administration server instance

struct OSSInstanceInfo_t {
  uint32_t version;       // record version, 1
  uint32_t size;          // 2712
  uint32_t instanceType;  // OSS_INSTANCE_TYPE_*
  uint32_t flags;         // reserved, 0
  char instanceName[128]; // instance name
  char instanceDir[2048]; // instance directory (Windows path)
  char installPath[256];  // installation path of the owning copy ("" when unknown)
  char reserved[128];
  char copyName[136]; // owning copy; empty for the version-8 installation
};
static_assert(sizeof(OSSInstanceInfo_t) == 2712);
static_assert(offsetof(OSSInstanceInfo_t, instanceName) == 16);
static_assert(offsetof(OSSInstanceInfo_t, instanceDir) == 144);
static_assert(offsetof(OSSInstanceInfo_t, copyName) == 2576);

struct OSSInstanceList; // opaque iteration state
typedef OSSInstanceList *OSSInstanceListHandle;

// Pseudo instance name for ossGetInstanceInfo: the administration server instance.
inline constexpr const char OSS_ADMIN_SERVER_INSTANCE[] = "DAS";

// ---------------------------------------------------------------------------
// Path parameter block of ossPathTest / ossDirectoryCreate: four 64-bit words
// ---------------------------------------------------------------------------
inline constexpr uint64_t OSS_PATH_PARAM_VERSION = 0x09070000;
struct OSSPathParam {
  uint64_t version; // OSS_PATH_PARAM_VERSION
  const char *path; // Windows path
  uint64_t options; // ossPathTest: 1 = test existence (the only test offered)
  uint64_t mode;    // ossDirectoryCreate: 2 = create missing parent directories too
};
static_assert(sizeof(OSSPathParam) == 32);

// ---------------------------------------------------------------------------
// Files
// ---------------------------------------------------------------------------
struct sqlo_file;
typedef sqlo_file *SQLO_FHANDLE;

// Open flags of sqloopenp (bits).
inline constexpr uint32_t SQLO_SYNC = 0x0001; // write through
inline constexpr uint32_t SQLO_WRITEONLY = 0x0002;
inline constexpr uint32_t SQLO_READONLY = 0x0004;
inline constexpr uint32_t SQLO_CREATE = 0x0008; // create, or replace the content of an existing
                                                // file (then the result is SQLO_RC_FILE_EXISTED)
inline constexpr uint32_t SQLO_OPEN = 0x0010;   // the file must exist
inline constexpr uint32_t SQLO_BINARY = 0x0040; // no text translation (always the case here)
inline constexpr uint32_t SQLO_SHAREREAD = 0x0100;
inline constexpr uint32_t SQLO_SHAREWRITE = 0x0200;
inline constexpr uint32_t SQLO_SEQUENTIAL = 0x0400; // access pattern hint
inline constexpr uint32_t SQLO_READWRITE = SQLO_READONLY | SQLO_WRITEONLY;
// Mode: permission bits written as hexadecimal digits, like octal (0x750, 0x644).
inline constexpr uint32_t SQLO_MODE_FILE = 0x644;    // owner reads and writes, others read
inline constexpr uint32_t SQLO_MODE_PROGRAM = 0x750; // owner all, group reads and runs

// Result record of sqloexec2.
struct SQLO_EXEC_RESULT {
  uint32_t state;    // 1 when the program ran to its end
  uint32_t exitCode; // the program's exit code
  uint32_t processId;
  uint32_t reserved;
};
static_assert(offsetof(SQLO_EXEC_RESULT, exitCode) == 4);

// Flag word of sqloexec2.
inline constexpr uint32_t SQLO_EXEC_WAIT = 0x40;   // wait for the program to end
inline constexpr uint32_t SQLO_EXEC_BYNAME = 0x80; // the program text is a command line; the
                                                   // program is found in the current copy's bin

// ---------------------------------------------------------------------------
// Node list (parsed kxlnodes.cfg), one block; little-endian at fixed offsets.
//   header: 0 char[8] "SQLONODE", 8 u32 block size, 12 u32 number of index slots N,
//           16 i32 entry count, 20 u32 offset of first entry,
//           24 u32[N] entry offset per node number (0 = none)
//   entry:  0 u16 length, 2 i16 node number, 4 u32 logical port, 8 u8 host length,
//           16 u8 second-name length, 17 u8 third-name length, 18 u8 machine length,
//           22 host\0 second\0 third\0 machine\0
// The kernel partition table (sqlz_krcb) has the same layout.
// ---------------------------------------------------------------------------
struct SQLO_NODELIST; // the block; read it only through the accessors below

inline constexpr uint32_t SQLO_NODELIST_HDR_COUNT = 16;
inline constexpr uint32_t SQLO_NODELIST_HDR_FIRST = 20;
inline constexpr uint32_t SQLO_NODELIST_HDR_INDEX = 24;
inline constexpr uint32_t SQLO_NODE_LENGTH = 0;
inline constexpr uint32_t SQLO_NODE_NUMBER = 2;
inline constexpr uint32_t SQLO_NODE_PORT = 4;
inline constexpr uint32_t SQLO_NODE_HOSTLEN = 8;
inline constexpr uint32_t SQLO_NODE_NAME2LEN = 16;
inline constexpr uint32_t SQLO_NODE_NAME3LEN = 17;
inline constexpr uint32_t SQLO_NODE_MACHLEN = 18;
inline constexpr uint32_t SQLO_NODE_NAMES = 22;
inline constexpr int32_t SQLO_MAX_NODE_NUMBER = 999;

inline uint32_t sqloLe32(const void *block, size_t offset) {
  const unsigned char *p = static_cast<const unsigned char *>(block) + offset;
  return uint32_t(p[0]) | uint32_t(p[1]) << 8 | uint32_t(p[2]) << 16 | uint32_t(p[3]) << 24;
}
inline uint16_t sqloLe16(const void *block, size_t offset) {
  const unsigned char *p = static_cast<const unsigned char *>(block) + offset;
  return uint16_t(p[0] | p[1] << 8);
}
inline uint32_t sqloNodeListSize(const void *list) {
  return sqloLe32(list, 8);
}
inline int32_t sqloNodeListCount(const void *list) {
  return static_cast<int32_t>(sqloLe32(list, SQLO_NODELIST_HDR_COUNT));
}
// First entry, or null for an empty list.
inline const unsigned char *sqloNodeListFirst(const void *list) {
  if (sqloNodeListCount(list) <= 0)
    return nullptr;
  return static_cast<const unsigned char *>(list) + sqloLe32(list, SQLO_NODELIST_HDR_FIRST);
}
inline uint16_t sqloNodeLength(const unsigned char *entry) {
  return sqloLe16(entry, SQLO_NODE_LENGTH);
}
inline const unsigned char *sqloNodeNext(const unsigned char *entry) {
  return entry + sqloNodeLength(entry);
}
inline int16_t sqloNodeNumber(const unsigned char *entry) {
  return static_cast<int16_t>(sqloLe16(entry, SQLO_NODE_NUMBER));
}
inline uint32_t sqloNodePort(const unsigned char *entry) {
  return sqloLe32(entry, SQLO_NODE_PORT);
}
inline const char *sqloNodeHost(const unsigned char *entry) {
  return reinterpret_cast<const char *>(entry + SQLO_NODE_NAMES);
}
inline const char *sqloNodeMachine(const unsigned char *entry) {
  return reinterpret_cast<const char *>(entry + 25 + entry[SQLO_NODE_HOSTLEN] + entry[SQLO_NODE_NAME2LEN] +
                                        entry[SQLO_NODE_NAME3LEN]);
}

// ---------------------------------------------------------------------------
// Process control block
// ---------------------------------------------------------------------------
struct sqlz_krcb {
  const SQLO_NODELIST *partitionTable; // null until the application environment is set up
  int16_t currentPartition;            // 0..999
  uint16_t reserved0;
  uint32_t partitionFlag; // nonzero: several partitions share a host
  unsigned char reserved1[25390 - 16];
  uint16_t utilityMode; // set to 1 by instance utilities before they start work
  unsigned char reserved2[25600 - 25392];
};
static_assert(offsetof(sqlz_krcb, currentPartition) == 8);
static_assert(offsetof(sqlz_krcb, partitionFlag) == 12);
static_assert(offsetof(sqlz_krcb, utilityMode) == 25390);
static_assert(sizeof(sqlz_krcb) == 25600);
inline constexpr size_t SQLZ_KRCB_UTILITY_MODE = 25390;

// ---------------------------------------------------------------------------
// Services
// ---------------------------------------------------------------------------
inline constexpr uint32_t SQLO_SVC_NO_CHANGE = 0xFFFFFFFFu;
inline constexpr uint32_t SQLO_SVC_AUTO_START = 2;
inline constexpr uint32_t SQLO_SVC_DEMAND_START = 3;
inline constexpr uint32_t SQLO_SVC_DISABLED = 4;

// Output buffer of the service calls: the system error behind a failure.
struct SQLO_SVC_OUT {
  int32_t systemError;
  uint32_t serviceState; // 1 stopped, 2 start pending, 3 stop pending, 4 running, 7 paused
  char message[256];
};

struct SQLO_SVC_CONFIG {
  uint32_t serviceType;
  int32_t startType; // 2 auto, 3 demand, 4 disabled
  uint32_t errorControl;
  char programPath[SQLO_PATH_SZ];
  char account[257];
  char displayName[257];
};

// Out records of sqlo_instance_addnode / delnode.
struct SQLO_INST_OUT {
  int32_t code; // 0 or the failure's result
  int32_t reason;
  char token[72];
};

// ---------------------------------------------------------------------------
// Configuration assistant profile interface records
// ---------------------------------------------------------------------------
inline constexpr uint32_t CAPRO_QUERY_MACHINE_NAME = 3;
struct CAPRO_REQUEST {
  uint32_t queryKind; // CAPRO_QUERY_MACHINE_NAME
  unsigned char reserved[1148];
  char machineName[256]; // at 1152: the machine's name
  unsigned char tail[1720 - 1408];
};
static_assert(sizeof(CAPRO_REQUEST) == 1720);
static_assert(offsetof(CAPRO_REQUEST, machineName) == 1152);
struct CAPRO_RESULT {
  int32_t code;
  int32_t reason;
  unsigned char reserved[64];
};
static_assert(sizeof(CAPRO_RESULT) == 72);

// ---------------------------------------------------------------------------
// Configuration parameters
// ---------------------------------------------------------------------------
struct SQLF_PARAM_INFO {
  uint32_t token;
  uint32_t type;   // 1 u16, 2 i16, 3 u32, 4 i32, 5 text
  uint32_t offset; // byte offset in the configuration image
  uint32_t length;
};
struct sqlfupd {
  uint16_t token; // parameter token (78: authentication type)
  void *ptrvalue; // the new value, of the parameter's type
};
inline constexpr uint16_t SQLF_KTN_AUTHENTICATION = 78;

// ---------------------------------------------------------------------------
// Audit
// ---------------------------------------------------------------------------
struct SQLEX_AUDIT_SETTINGS {
  uint32_t version;
  uint32_t size; // 72
  unsigned char reserved0[24];
  uint64_t classMask1;     // 32: outcome bits (0x1 success, 0x2 failure) of the admin class
  uint64_t classMask2;     // 40: reserved class
  uint64_t classMask3;     // 48: reserved class
  uint64_t classMask4;     // 56: outcome bits of the instance event class
  unsigned char reserved1; // 64
  unsigned char errorType; // 65: copied into every event
  unsigned char active;    // 66: auditing is on
  unsigned char reserved2[5];
};
static_assert(sizeof(SQLEX_AUDIT_SETTINGS) == 72);
static_assert(offsetof(SQLEX_AUDIT_SETTINGS, classMask1) == 32);
static_assert(offsetof(SQLEX_AUDIT_SETTINGS, classMask4) == 56);
static_assert(offsetof(SQLEX_AUDIT_SETTINGS, errorType) == 65);
static_assert(offsetof(SQLEX_AUDIT_SETTINGS, active) == 66);

inline constexpr uint32_t SQLEX_AUDIT_MAX_TEXT = 257;

// One audit event: build it, add what it carries, log it once.
class sqlexAuditData {
public:
  sqlexAuditData(uint32_t category, uint32_t event, int32_t sqlcode = 0, uint8_t errorType = 0)
      : category_(category), event_(event), sqlcode_(sqlcode), errorType_(errorType) {}
  ~sqlexAuditData() = default;
  sqlexAuditData(const sqlexAuditData &) = delete;
  sqlexAuditData &operator=(const sqlexAuditData &) = delete;

  void setSqlcode(int32_t sqlcode) { sqlcode_ = sqlcode; }
  void setErrorType(uint8_t errorType) { errorType_ = errorType; }
  // The instance name the event names: at most SQLEX_AUDIT_MAX_TEXT bytes are kept.
  void setInstanceName(const char *name, size_t length) {
    size_t n = length < SQLEX_AUDIT_MAX_TEXT ? length : SQLEX_AUDIT_MAX_TEXT;
    std::memcpy(instance_, name ? name : "", name ? n : 0);
    instance_[name ? n : 0] = '\0';
  }
  // Records the event for the current instance (sqlosins); 0 when recorded, else
  // the code, which is also put into `ca`.
  int32_t logEvent(sqlca *ca);

  uint32_t category() const { return category_; }
  uint32_t event() const { return event_; }
  int32_t sqlcode() const { return sqlcode_; }
  uint8_t errorType() const { return errorType_; }
  const char *instanceName() const { return instance_; }

private:
  uint32_t category_;
  uint32_t event_;
  int32_t sqlcode_;
  uint8_t errorType_;
  char instance_[SQLEX_AUDIT_MAX_TEXT + 1] = {};
};

// ---------------------------------------------------------------------------
// Diagnostics
// ---------------------------------------------------------------------------
inline constexpr uint32_t PD_LEVEL_SEVERE = 1;
inline constexpr uint32_t PD_LEVEL_ERROR = 2;
inline constexpr uint32_t PD_LEVEL_WARNING = 3;
inline constexpr uint32_t PD_LEVEL_INFO = 4;

// Data item types of the trace hooks.
inline constexpr uint32_t PD_TYPE_STRING = 1; // NUL-terminated text (size ignored)
inline constexpr uint32_t PD_TYPE_INT32 = 2;  // data points to an int32_t
inline constexpr uint32_t PD_TYPE_UINT32 = 3; // data points to a uint32_t
inline constexpr uint32_t PD_TYPE_INT64 = 4;  // data points to an int64_t
inline constexpr uint32_t PD_TYPE_BYTES = 5;  // `size` bytes, shown in hexadecimal

#if defined(__GNUC__)
#define KXL_PRINTF(fmt, first) __attribute__((format(printf, fmt, first)))
#else
#define KXL_PRINTF(fmt, first)
#endif

extern "C" {

// ---- set-up and status -----------------------------------------------------
// One-time set-up of the library; call before anything else. Repeated calls are harmless.
uint32_t ossOneTimeOnly(void);
// Initialises a status block: id "SQLCA   ", size 136, everything else zero.
void sqloinca(sqlca *ca);
// Sets up the application data of this process. `appKind` selects the kind of
// application (instance utilities pass 9339413); *result gets 0 or a code.
int32_t sqlo_create_init_app_data(uint32_t appKind, int32_t *result);
// Turns a library code into a status block: sqlcode = the SQLCODE for `rc`,
// producer tag = first 8 characters of `producer`. `options` and the two last
// words are reserved (pass 0).
int32_t sqlzRcToSqlca(uint32_t options, sqlca *ca, const char *producer, int32_t rc, uint32_t reserved1,
                      uint32_t reserved2);
// Fills a status block with `sqlcode` and `tokenCount` tokens (lengths in
// bytes), joined by 0xFF into sqlerrmc (70 bytes at most; longer text is cut).
int32_t sqlegsca(int32_t sqlcode, uint32_t tokenCount, const uint64_t *tokenLengths,
                 const char *const *tokens, sqlca *ca);
// Prepares the application environment of the current instance: its partition
// table in sqlz_krcbp. `partitioned` 1 for a partitioned instance. `ca` optional.
int32_t sqleInitApplicationEnvironment(uint32_t reserved1, uint32_t reserved2, uint32_t partitioned,
                                       sqlca *ca);

// The process control block (never null).
extern sqlz_krcb *sqlz_krcbp;
// The name character set: 13 bytes of class prefix, then every character a name may hold.
extern const char sqlz_charset[];

// ---- installations ---------------------------------------------------------
// Name of the copy whose installation path holds the running program; after
// sqloSwitchToInstallationName, the copy switched to.
int32_t sqloGetCurrentInstallationName(char *buffer, uint32_t size);
// Makes `copyName` the current installation of this process (profile reads
// follow it). The name of the running program's own copy switches back.
int32_t sqloSwitchToInstallationName(const char *copyName);
// Opens an iteration over the instances of every copy. `product` is "KXL";
// the two flags are reserved (pass false).
uint32_t ossOpenInstanceList(const char *product, OSSInstanceListHandle *handle, bool reserved1,
                             bool reserved2);
// Next instance into *info (cleared first); OSS_RC_END_OF_LIST after the last.
uint32_t ossGetNextInstance(OSSInstanceListHandle handle, OSSInstanceInfo_t *info, bool reserved);
uint32_t ossCloseInstanceList(OSSInstanceListHandle handle);
// One instance by name; OSS_ADMIN_SERVER_INSTANCE gives the administration
// server instance. `flags` and `path` are reserved (0, null); OSS_RC_NOT_FOUND
// when there is no such instance.
uint32_t ossGetInstanceInfo(const char *name, uint32_t flags, const char *path, OSSInstanceInfo_t *info,
                            bool reserved);

// ---- environment and profile registry ---------------------------------------
// *value = the variable's value (library storage, valid until the next change of
// that variable) or null when unset; 0, or SQLO_RC_PREG_BAD_VARIABLE.
int32_t sqloGetEnvInternal(uint32_t variable, char **value);
// Sets a process environment value (55 also for started programs). Null or ""
// removes it.
int32_t sqloPutEnv(uint32_t variable, const char *value);
// Makes values put with sqloPutEnv visible to the profile registry reads.
int32_t sqlo_force_refresh_env(void);
// Profile variable of the current installation.
//   action SQLO_PREG_GET: *variable read into `value`. Profile null: the current
//     instance (KXLINSTANCE), falling back to the global profile;
//     KXL_GLOBAL_PROFILE_NAME: the global profile; else that instance's profile.
//     SQLO_RC_PREG_NOT_SET when it has no value (value becomes "").
//   action SQLO_PREG_SET / SQLO_PREG_UNSET: writes / removes it at that level.
// `reserved` 0. `node`: SQLO_PREG_ANY_NODE. `valueSize`: capacity of `value`;
// 0 means the variable's own maximum: 9 bytes for KXLRESERVEDINST, else
// SQLO_PREG_VALUE_SZ. Longer values are cut.
int32_t sqloPRegValuePE(uint32_t action, const uint32_t *variable, uint32_t reserved, char *value,
                        const char *profile, int32_t node, uint32_t valueSize);
int32_t sqloPRegValue(uint32_t action, const uint32_t *variable, uint32_t reserved, char *value,
                      const char *profile);
// action SQLO_PREG_REFRESH: re-reads the current installation's registry
// (profileName ignored). SQLO_PREG_FIRST / SQLO_PREG_NEXT: enumerate the
// instance profiles into profileName (SQLO_PREG_PROFILE_SZ bytes);
// SQLO_RC_PREG_END after the last.
int32_t sqloPRegProfilePE(uint32_t action, char *profileName, int32_t node);
int32_t sqloPRegProfile(uint32_t action, char *profileName);
// 1 for a true text ("1", "Y", "YES", "ON", "TRUE", any case), else 0.
int32_t sqloStr2Flag(const char *value);

// Another machine's registry. hklm is that machine's HKEY_LOCAL_MACHINE.
struct SQLO_PREG_MACHINE {
  HKEY hklm;
  char machineName[SQLO_COMPUTERNAME_SZ];
  bool remote;
};
// *handle must be null or a handle from an earlier open, which is released
// first. SQLO_RC_MACHINE_UNREACHABLE for a machine that cannot be reached.
int32_t sqloPRegMachineOpen(const char *machineName, SQLO_PREG_MACHINE **handle);
// Releases the handle and sets *handle to null; a null *handle is fine.
int32_t sqloPRegMachineClose(SQLO_PREG_MACHINE **handle);

// ---- files and programs ----------------------------------------------------
int32_t sqloopenp(const char *path, uint32_t flags, uint32_t mode, SQLO_FHANDLE *handle, uint32_t reserved);
int32_t sqloread(SQLO_FHANDLE handle, void *buffer, uint32_t size, uint32_t *bytesRead);
int32_t sqlowrite(SQLO_FHANDLE handle, const void *buffer, uint32_t size, uint32_t *bytesWritten);
int32_t sqloclose(SQLO_FHANDLE handle);
// Copies one file over the target. SQLO_RC_FILE_NOT_FOUND_W when the source is missing,
// SQLO_RC_PATH_NOT_FOUND when the source's directory is missing; missing directories
// of the target are created.
int32_t sqlocopy(const char *source, const char *target, uint32_t flags);
// Copies a directory tree into `target` (created when missing). Note the order.
// Before writing anything it checks that the target's drive has room for the
// tree: SQLO_RC_DISK_FULL when it has not, SQLO_RC_IO_ERROR when the free
// space cannot be read. With SQLO_COPYDIR_SHOW_PROGRESS a copy that runs
// longer than a second shows its progress on standard error when that is a
// console.
inline constexpr uint32_t SQLO_COPYDIR_SHOW_PROGRESS = 0x1;
int32_t sqlocopydir(const char *target, const char *source, uint32_t flags);
int32_t sqlodelete(const char *path, uint32_t flags);
int32_t sqlodeletedir(const char *path);
// 0 when the path exists, OSS_RC_PATH_NOT_FOUND when not.
uint32_t ossPathTest(OSSPathParam *param);
uint32_t ossDirectoryCreate(OSSPathParam *param);
bool ossPathExists(const char *path);
bool ossIsDirectory(const char *path);
// snprintf: never writes past `size`, always terminates (size > 0).
int ossSnprintf(char *buffer, size_t size, const char *format, ...) KXL_PRINTF(3, 4);
// Runs a program. `program` is its path (or, with SQLO_EXEC_BYNAME, a command
// line whose first word names the program); `argBlock` is a sequence of
// NUL-terminated strings ending with an empty one, its first string the program
// (null: none). With SQLO_EXEC_WAIT waits and fills *result.
int32_t sqloexec2(const char *program, const char *argBlock, uint32_t reserved1, uint32_t flags,
                  uint32_t *processId, SQLO_EXEC_RESULT *result, uint32_t reserved2, uint32_t reserved3);

// ---- instances and services ------------------------------------------------
int32_t sqlo_instance_create_extended(const char *instanceName, const char *instanceProfilePath,
                                      const char *installPath, uint32_t reserved1, const char *userName,
                                      const char *password, uint32_t reserved2, uint32_t oldNodeType,
                                      uint32_t newNodeType, const char *clusterName, uint8_t serviceStepFlag,
                                      uint32_t createFlag, uint8_t textSearchRequested,
                                      const char *textSearchService, uint16_t textSearchPort,
                                      int32_t *textSearchReasonCode, int32_t *extraMessage);
int32_t sqlo_instance_addnode(const char *instanceName, int32_t node, const char *hostName, uint32_t port,
                              const char *userName, const char *password, SQLO_INST_OUT *out1,
                              SQLO_INST_OUT *out2);
int32_t sqlo_instance_delnode(const char *instanceName, int32_t node, const char *hostName, uint32_t port,
                              SQLO_INST_OUT *out1, SQLO_INST_OUT *out2);
int32_t sqlo_instance_drop(const char *instanceName, const char *instanceDir);
// Parses a nodes file into a node list block (std::malloc'ed; release with
// std::free). *list must be null or an earlier result, which is released first;
// on failure *list is null. `reserved*`: pass the documented values.
int32_t sqloReadKxlnodes(const char *path, uint32_t reserved1, SQLO_NODELIST **list, uint32_t reserved2,
                         uint32_t *entryCount, uint32_t *maxNode, uint32_t reserved3,
                         const char *instanceName, uint32_t reserved4, uint32_t reserved5);
// The service's state as SQLO_RC_SVC_*; machine null for this machine.
int32_t sqloQueryKXLService(const char *serviceName, SQLO_SVC_OUT *out, const char *machine);
int32_t sqloQueryNTServiceConfig(const char *serviceName, const char *machine, SQLO_SVC_CONFIG *config,
                                 SQLO_SVC_OUT *out);
// SQLO_SVC_NO_CHANGE / null arguments leave that setting as it is.
int32_t sqloChangeNTServiceConfig(const char *serviceName, const char *machine, uint32_t serviceType,
                                  uint32_t startType, uint32_t errorControl, const char *programPath,
                                  const char *loadOrderGroup, uint32_t *tag, const char *dependencies,
                                  const char *account, const char *password, const char *displayName,
                                  SQLO_SVC_OUT *out);
// SQLO_RC_SVC_EXISTS when the service exists already.
int32_t sqloRegisterNTService(const char *machine, const char *serviceName, const char *displayName,
                              uint32_t serviceKind, const char *programPath, uint32_t startType,
                              const char *account, const char *password, const char *messageLibrary,
                              SQLO_SVC_OUT *out);
// action 3: reserves a port range for the instance in the services file;
// portStart / portEnd (SQLO_PORT_TEXT_SZ bytes each) are filled.
int32_t sqloUpdateServiceFile(uint32_t action, const char *instanceName, char *portStart, char *portEnd);

// ---- hosts and measures ----------------------------------------------------
int32_t sqloPdbCommFncInit(void);
// hostName: SQLO_HOSTNAME_SZ bytes. kind 5: fully qualified name.
int32_t sqloPdbTcpIpGetFullHostName(char *hostName, uint32_t kind);
// 0 when hostName resolves; resolvedName (SQLO_HOSTNAME_SZ bytes) gets its full name.
int32_t sqloPdbTcpIpResolveHostName(const char *hostName, char *resolvedName, uint32_t kind, uint32_t flags);
// Nonzero on success; *size is the capacity in, the length out.
int32_t sqloGetComputerNameA(char *buffer, uint32_t *size);
int32_t sqlocpum(float *value);
int32_t sqloGetCommBandwidth(float *value, uint32_t nodeType);
int32_t caProIfInit(void);
int32_t caProIfQuery(CAPRO_REQUEST *request, CAPRO_RESULT *result);
int32_t caProIfTerm(void);

// ---- configuration ---------------------------------------------------------
// *index = the parameter's index in the configuration file's flag area.
int32_t sqlf_get_param_info(uint32_t token, uint32_t reserved, SQLF_PARAM_INFO *info, int32_t *index);
// Updates `count` parameters of the current instance's configuration.
int32_t sqlfusys(uint16_t count, sqlfupd *items, sqlca *ca);

// ---- names and text --------------------------------------------------------
// 0 when the two agree ignoring case over `length` characters (0: over the length of
// `a`, so a text cut to its field still matches the word it begins; "" matches only "").
int32_t sqlomcpi(const char *a, const char *b, uint32_t length);
// Upper-cases `length` characters of `text` in place. `codepage` 0: the current one.
int32_t sqlotoup(uint32_t length, uint32_t codepage, char *text);
// 0 when `name` is valid for the name class (16: instance name).
int32_t sqloacss(const char *name, uint32_t nameClass);
// Prompts for a password without echo; 0 and the password (cut to size - 1).
int32_t sqlo_get_password(const char *userName, char *password, uint32_t size);
// The environment's language, normalised ("en_US"); library storage.
const char *sqloGetNormalizedEnvLang(uint32_t kind);

// ---- messages --------------------------------------------------------------
// Message `number` of `catalog`, tokens put into its placeholders in order (a
// null token ends the list; the caller gives one per placeholder). Returns the
// text's length (> 0) or <= 0 when there is no text; *rc gets the detail.
int32_t sqlogmsg(const char *catalog, uint32_t number, const uint64_t *tokenLengths,
                 const char *const *tokens, char *buffer, uint32_t size, int32_t *rc, uint32_t reserved1,
                 uint32_t reserved2, uint32_t reserved3);
// Text for the block's SQLCODE; length (> 0) or <= 0. lineWidth 0: no wrapping.
int32_t sqlaintp_api(char *buffer, uint32_t size, uint32_t lineWidth, const char *catalog, const sqlca *ca);

// ---- authority and audit ---------------------------------------------------
// Negative on failure; else bits: 0x04 member of the local administrators, 0x10 the administrator.
int32_t sqloIsLocalAdmin(void);
// 0 or 1 (1: taken from the logon name) and the ID in buffer (SQLE_AUTHID_SZ bytes).
int32_t sqleget_authid(char *buffer);
// Makes `instanceName` the library's current instance ("" or null: none).
int32_t sqlosins(const char *instanceName);
// Audit settings of the current instance (from its security\kxlaudit.cfg, or
// from `path` when given).
int32_t sqlexAuditGetInstanceSettings(bool reserved, SQLEX_AUDIT_SETTINGS *settings, const char *path);
// Nonzero when the content extender is installed in that installation.
int32_t sqloIsContentExtenderInstalled(const char *installPath);

// ---- diagnostics -----------------------------------------------------------
// Writes one diagnostic record.
int32_t pdLog(uint32_t level, uint32_t functionId, uint32_t probe, int32_t rc, const char *format, ...)
    KXL_PRINTF(5, 6);
void pdtEntry(uint32_t functionId);
void pdtExit(uint32_t functionId, int64_t rc, uint32_t probe);
void pdtError(uint32_t functionId, uint32_t probe, int64_t rc);
void pdtData1(uint32_t functionId, uint32_t probe, uint32_t type, uint64_t size, const void *data);

} // extern "C"
