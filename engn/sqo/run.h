// One run of the upgrade command: the context it works in and the order of
// its steps, from the command line to the exit code.
#pragma once

#include "engn/sqo/options.h"
#include "install/installcopy.h"
#include "install/kxlinstance.h"
#include "platform/kxlsys.h"

#include <cstddef>
#include <cstdint>
#include <cstdlib>

inline constexpr uint32_t UPGRADE_COPY_PATH_SZ = 261;
inline constexpr uint32_t UPGRADE_VAR159_SZ = 10;
inline constexpr int32_t UPGRADE_NO_SERVICE_STATE = -1;

// Trace identifiers of the run.
inline constexpr uint32_t KXL_FN_RUN_UPGRADE = 0x187805B0u;
inline constexpr uint32_t KXL_FN_RUN_CHECKS = 0x187805B1u;
inline constexpr uint32_t KXL_FN_BIND_INSTANCE = 0x187805B2u;
inline constexpr uint32_t KXL_FN_UPGRADE_CONTEXT = 0x187805B3u;
inline constexpr uint32_t KXL_FN_RUN_AUDIT = 0x187805B4u;

class UpgradeContext {
public:
  // An empty context (no copies), for callers that fill it themselves.
  UpgradeContext() = default;
  // Reads the installed copies and finds the current copy; *result gets 0 or
  // the run's error code (-1918 when the copies or the current copy cannot be had).
  explicit UpgradeContext(int32_t *result);
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
};

// The upgrade driver the run hands the bound instance to. The entry point
// passes the engine's upgradeInstance; tests pass drivers of their own.
using UpgradeDriver = int (*)(UpgradeContext &context, UpgradeOptions &options);

// The whole run; returns the exit code (0, 1 or 2 in installer mode).
int runUpgrade(int argc, const char *const *argv, UpgradeDriver driver);

// context.copy = copy, context.copyPath = its installation path.
void setOwningCopy(UpgradeContext &context, InstallCopy *copy);

// Binds the run to `instance`: KXLINSTANCE, node type, the two halves of
// profile variable 159 (read in the instance's own installation). 0;
// UPGRADE_RC_NODE_TYPE_UNKNOWN when kxlsystm gives no node type from 1 to 5;
// -1918 when the instance's installation cannot be switched to and back.
int bindInstance(UpgradeContext &context, IKXLINSTANCE *instance);

// `path` with every existing component spelled as the file system has it
// (drive prefix and \\server kept); the rest from the first missing component
// on is kept as given. `output` holds `size` bytes and is always terminated.
void expandLongPath(const char *path, char *output, std::size_t size);
