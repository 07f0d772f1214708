// Process-wide state the front end changes for one instance and puts back:
// the product library's current installation and KXLINSTANCE.
#pragma once

#include "platform/kxlsys.h"

class IKXLINSTANCE;

// Switches the library to the installation that owns `instance` when that is
// not the current one, and back with switchBack() or when it goes out of scope.
// When the current installation or the instance's own cannot be named, or a
// switch fails, result() is -1918: profile reads would then be made in the
// wrong installation, so the caller stops before it reads anything.
class InstallationSwitch {
public:
  explicit InstallationSwitch(const IKXLINSTANCE *instance);
  ~InstallationSwitch();
  InstallationSwitch(const InstallationSwitch &) = delete;
  InstallationSwitch &operator=(const InstallationSwitch &) = delete;

  int32_t result() const { return result_; }
  // Switches back now; result(), or -1918 when switching back failed.
  int32_t switchBack();

private:
  char current_[SQLO_COPY_NAME_SZ] = {};
  bool switched_ = false;
  int32_t result_ = 0;
};

// The name of the current installation; false when it cannot be had or is empty.
bool currentInstallationName(char *name, uint32_t size);

// Makes `instanceName` the value of KXLINSTANCE ("" removes it) for this
// process, its profile reads and the programs it starts.
void putInstanceEnvironment(const char *instanceName);
