#include "engn/sqo/installswitch.h"

#include "install/kxlinstance.h"

namespace {

void makeCurrent(const char *copyName) {
  sqloSwitchToInstallationName(copyName);
  sqloPRegProfilePE(SQLO_PREG_REFRESH, nullptr, SQLO_PREG_ANY_NODE);
}

} // namespace

bool currentInstallationName(char *name, uint32_t size) {
  name[0] = '\0';
  return sqloGetCurrentInstallationName(name, size) == 0 && name[0] != '\0';
}

InstallationSwitch::InstallationSwitch(const IKXLINSTANCE *instance) {
  char owner[SQLO_COPY_NAME_SZ] = {};
  if (instance == nullptr || instance->GetCopyName(owner, sizeof owner) != 0)
    return;
  currentInstallationName(current_, sizeof current_);
  if (sqlomcpi(current_, owner, SQLO_COPY_NAME_SZ) == 0)
    return;
  makeCurrent(owner);
  switched_ = true;
}

InstallationSwitch::~InstallationSwitch() {
  if (switched_)
    makeCurrent(current_);
}

void putInstanceEnvironment(const char *instanceName) {
  sqloPutEnv(KXL_VAR_KXLINSTANCE, instanceName);
  sqlo_force_refresh_env();
}
