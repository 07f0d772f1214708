#include "engn/sqo/installswitch.h"

#include "install/kxlinstance.h"
#include "upgrade/records.h"

namespace {

bool makeCurrent(const char *copyName) {
  return sqloSwitchToInstallationName(copyName) == 0 &&
         sqloPRegProfilePE(SQLO_PREG_REFRESH, nullptr, SQLO_PREG_ANY_NODE) == 0;
}

} // namespace

bool currentInstallationName(char *name, uint32_t size) {
  name[0] = '\0';
  return sqloGetCurrentInstallationName(name, size) == 0 && name[0] != '\0';
}

InstallationSwitch::InstallationSwitch(const IKXLINSTANCE *instance) {
  char owner[SQLO_COPY_NAME_SZ] = {};
  if (instance == nullptr || instance->GetCopyName(owner, sizeof owner) != 0 ||
      !currentInstallationName(current_, sizeof current_)) {
    result_ = UPGRADE_RC_NO_COPY;
    return;
  }
  if (sqlomcpi(current_, owner, SQLO_COPY_NAME_SZ) == 0)
    return;
  // Marked before the attempt: a switch that failed half way is put back too.
  switched_ = true;
  if (!makeCurrent(owner))
    result_ = UPGRADE_RC_NO_COPY;
}

int32_t InstallationSwitch::switchBack() {
  if (switched_) {
    switched_ = false;
    if (!makeCurrent(current_))
      result_ = UPGRADE_RC_NO_COPY;
  }
  return result_;
}

InstallationSwitch::~InstallationSwitch() {
  switchBack();
}

void putInstanceEnvironment(const char *instanceName) {
  sqloPutEnv(KXL_VAR_KXLINSTANCE, instanceName);
  sqlo_force_refresh_env();
}
