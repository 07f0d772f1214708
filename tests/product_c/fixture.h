// Helpers over the product library's test world for the authority, audit and
// service cases.
#pragma once

#include "world_fixture.h"

#include <string>

namespace kxltest {

class SimWorld : public ProductWorld {
protected:
  // The "State" of a service of this machine ("") or of another one.
  static void setServiceState(const std::string &machine, const std::string &name, DWORD state) {
    std::string prefix = machine.empty() ? "" : "SOFTWARE\\ZAV\\KXLSIM\\Machines\\" + machine + "\\";
    setDword(prefix + "SOFTWARE\\ZAV\\KXLSIM\\Services\\" + name, "State", state);
  }

  static constexpr const char *kIdentity = "SOFTWARE\\ZAV\\KXLSIM\\Identity";
};

} // namespace kxltest
