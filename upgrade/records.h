// The records one run of the command works with, shared by the front end and
// the upgrade engine: the option and result record (cleared with zero bytes at
// start-up, filled by the command line, read by every later step: the checks,
// the engine and the message printer) and the context the run is bound to.
#pragma once

#include "install/installcopy.h"
#include "install/kxlinstance.h"
#include "platform/kxlsys.h"
#include "upgrade/codes.h"

#include <cstdint>
#include <cstdlib>
#include <optional>
#include <string>
#include <vector>

// ---------------------------------------------------------------------------
// Field capacities (bytes, terminator included)
// ---------------------------------------------------------------------------
inline constexpr uint32_t UPGRADE_AUTH_NAME_SZ = 20;     // -a value, 19 characters
inline constexpr uint32_t UPGRADE_PATH_SZ = 261;         // -p value and install path
inline constexpr uint32_t UPGRADE_USER_NAME_SZ = 31;     // -u name, 30 characters
inline constexpr uint32_t UPGRADE_PASSWORD_SZ = 256;     // password, 255 characters
inline constexpr uint32_t UPGRADE_INSTANCE_NAME_SZ = 9;  // 8 characters
inline constexpr uint32_t UPGRADE_PROGRAM_NAME_SZ = 256; // "KXLIUPGRADE" or "KXLIMIGR"
inline constexpr uint32_t UPGRADE_TS_SERVICE_SZ = 15;    // text search service, 14 characters
inline constexpr uint32_t UPGRADE_CLUSTER_NAME_SZ = 16;  // cluster name
inline constexpr uint32_t UPGRADE_PORT_TEXT_SZ = 10;     // port or service entry text
inline constexpr uint32_t UPGRADE_HOST_NAME_SZ = 256;    // TCP/IP host name
inline constexpr uint32_t UPGRADE_COMPUTER_NAME_SZ = 16; // Windows computer name
inline constexpr uint32_t UPGRADE_NET_NAME_SZ = 256;     // network name of partition 0
inline constexpr uint32_t UPGRADE_MAX_TOKENS = 2;        // message tokens in the record

// ---------------------------------------------------------------------------
// Bits of UpgradeOptions::flags
// ---------------------------------------------------------------------------
inline constexpr uint16_t UPGRADE_FLAG_TOOL = 0x01;               // always set by this tool
inline constexpr uint16_t UPGRADE_FLAG_AUTH_TYPE = 0x02;          // authType is to be applied (-a)
inline constexpr uint16_t UPGRADE_FLAG_PROFILE_PATH_MOVES = 0x04; // profile path changes with the upgrade
inline constexpr uint16_t UPGRADE_FLAG_INSTALLER = 0x08;          // installer mode (-install)
inline constexpr uint16_t UPGRADE_FLAG_FORCE_COPY_NAME = 0x10;    // force-copy-name mode (-forcecn)
inline constexpr uint16_t UPGRADE_FLAG_ENGINE = 0x20;             // tested by the upgrade engine only
inline constexpr uint16_t UPGRADE_FLAG_CONTENT_EXTENDER = 0x40;   // current copy has the content extender

// ---------------------------------------------------------------------------
// Authentication type codes (-a)
// ---------------------------------------------------------------------------
inline constexpr uint16_t UPGRADE_AUTH_SERVER = 0;
inline constexpr uint16_t UPGRADE_AUTH_CLIENT = 1;
inline constexpr uint16_t UPGRADE_AUTH_DCS = 2;
inline constexpr uint16_t UPGRADE_AUTH_DCE = 3;
inline constexpr uint16_t UPGRADE_AUTH_SERVER_ENCRYPT = 4;
inline constexpr uint16_t UPGRADE_AUTH_DCS_ENCRYPT = 5;
inline constexpr uint16_t UPGRADE_AUTH_DCE_SERVER_ENCRYPT = 6;
inline constexpr uint16_t UPGRADE_AUTH_KERBEROS = 7;
inline constexpr uint16_t UPGRADE_AUTH_KERBEROS_SERVER_ENCRYPT = 8;

// The instance-creation block that the services step hands to the instance
// environment step. The front end writes only the text search fields.
struct PartitionRecord {
  char portStart[UPGRADE_PORT_TEXT_SZ];        // first communication port or service entry
  char portEnd[UPGRADE_PORT_TEXT_SZ];          // last port
  char hostName[UPGRADE_HOST_NAME_SZ];         // TCP/IP host name of partition 0
  char computerName[UPGRADE_COMPUTER_NAME_SZ]; // Windows computer name of partition 0
  char netName[UPGRADE_NET_NAME_SZ];           // network name written after the partition entry
  char clusterName[UPGRADE_CLUSTER_NAME_SZ];   // the instance's cluster, filled by the engine
  uint8_t serviceStepFlag;                     // 1 once the services step runs the creation
  char textSearchService[UPGRADE_TS_SERVICE_SZ];
  uint16_t textSearchPort;      // 1024..65535, 0 when none was given
  uint8_t textSearchRequested;  // 1 once a -j value has been accepted
  int32_t textSearchReasonCode; // written by the instance creation (warning 1273)
  int32_t extraMessage;         // further message number, written by the instance creation
};

// What the upgrade engine's undo achieved after a failed upgrade.
inline constexpr uint8_t UPGRADE_UNDO_NOTHING = 0;    // no failure, or nothing had been changed
inline constexpr uint8_t UPGRADE_UNDO_COMPLETE = 1;   // every change was put back
inline constexpr uint8_t UPGRADE_UNDO_INCOMPLETE = 2; // not everything; the backup is kept in keptBackupDir

struct UpgradeOptions {
  char authTypeName[UPGRADE_AUTH_NAME_SZ];
  uint16_t authType; // valid only with UPGRADE_FLAG_AUTH_TYPE
  char profilePath[UPGRADE_PATH_SZ];
  uint8_t quiet;
  uint8_t partitionedInstance; // 1: node type 4 (set by the checks); see isPartitioned
  char userName[UPGRADE_USER_NAME_SZ];
  char password[UPGRADE_PASSWORD_SZ];
  PartitionRecord partitionRecord;
  char instanceName[UPGRADE_INSTANCE_NAME_SZ]; // upper case
  uint32_t oldInstanceType;                    // node type the current copy cannot host (message 1231)
  uint32_t newInstanceType;                    // node type the current copy supports
  char currentInstallPath[UPGRADE_PATH_SZ];
  uint16_t flags; // UPGRADE_FLAG_*
  sqlca status;
  uint8_t tokenCount; // valid entries of tokens, 0..2
  const char *tokens[UPGRADE_MAX_TOKENS];
  char programName[UPGRADE_PROGRAM_NAME_SZ];
  uint8_t undoOutcome;                 // UPGRADE_UNDO_*, written by the upgrade engine
  char keptBackupDir[UPGRADE_PATH_SZ]; // the instance directory's backup, when it is kept
};

// Whether the run's instance is partitioned (KXL_NODE_TYPE_PARTITIONED): the
// checks set the option from the bound instance's node type before the engine
// runs, and a killed run's record keeps it.
inline bool isPartitioned(const UpgradeOptions &options) {
  return options.partitionedInstance != 0;
}

inline constexpr uint32_t UPGRADE_COPY_PATH_SZ = 261;
inline constexpr uint32_t UPGRADE_VAR159_SZ = 10;
inline constexpr int32_t UPGRADE_NO_SERVICE_STATE = -1;

// The installed copies and the instance one run works on. The front end reads
// the copies and binds the instance; the engine's steps read and update it.
// The account a service ran under before the services step gave it the
// account of -u; the undo gives it back.
struct ServiceAccount {
  std::string machine; // as the services step names it (a node list entry's or a cluster list's machine)
  std::string service;
  std::string account;
};

class UpgradeContext {
public:
  UpgradeContext() = default;
  ~UpgradeContext() {
    delete copies;
    std::free(nodeList);
  }
  UpgradeContext(const UpgradeContext &) = delete;
  UpgradeContext &operator=(const UpgradeContext &) = delete;

  InstallCopyList *copies = nullptr; // owned
  InstallCopy *copy = nullptr;       // the current copy, from setOwningCopy on the instance's
  IKXLINSTANCE *instance = nullptr;  // set by bindInstance
  char copyPath[UPGRADE_COPY_PATH_SZ] = {};
  uint32_t nodeType = 0;
  char var159Head[UPGRADE_VAR159_SZ] = {};
  char var159Tail[UPGRADE_VAR159_SZ] = {};
  SQLO_NODELIST *nodeList = nullptr; // std::malloc'ed by the platform, owned
  int32_t serviceStartType = UPGRADE_NO_SERVICE_STATE;
  // The node type the services step re-created the instance with under the
  // current copy; 0 while it has not been re-created. The driver's undo drops
  // a re-created instance again; the profile undo then knows that the
  // services were re-pointed.
  uint32_t recreatedNodeType = 0;
  // Filled by the services step before it changes any service's account.
  std::vector<ServiceAccount> serviceAccounts;
  // The cluster's machines ("KXLCLUSTERLIST") as the profile move read them;
  // the undo walks these, so that a read failing in the undo cannot leave a
  // machine moved. Unset until read in this process.
  std::optional<std::string> clusterMachines;
};
