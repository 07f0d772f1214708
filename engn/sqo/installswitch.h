// Process-wide state the front end changes for one instance and puts back:
// the product library's current installation and KXLINSTANCE.
#pragma once

#include "platform/kxlsys.h"

class IKXLINSTANCE;

// Switches the library to the installation that owns `instance` when that is
// not the current one, and back when it goes out of scope.
class InstallationSwitch {
public:
  explicit InstallationSwitch(const IKXLINSTANCE *instance);
  ~InstallationSwitch();
  InstallationSwitch(const InstallationSwitch &) = delete;
  InstallationSwitch &operator=(const InstallationSwitch &) = delete;

  bool switched() const { return switched_; }

private:
  char current_[SQLO_COPY_NAME_SZ] = {};
  bool switched_ = false;
};

// The name of the current installation; false when it cannot be had or is empty.
bool currentInstallationName(char *name, uint32_t size);

// Makes `instanceName` the value of KXLINSTANCE ("" removes it) for this
// process, its profile reads and the programs it starts.
void putInstanceEnvironment(const char *instanceName);
