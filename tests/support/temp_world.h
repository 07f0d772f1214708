// The one way tests make a temporary machine on POSIX hosts: a fresh
// directory with empty machine and user hives and a drive C:, selected for the
// process through KXLSIM_ROOT with no fault plan, and removed again.
// Header-only, so that it needs no library beyond the simulator the test
// already links.
#pragma once

#ifndef _WIN32
#include "sim/common/simfail.h"
#include "sim/posix/world.h"

#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <string>
#include <system_error>

namespace kxltestsupport {

// A new directory "<stem>.XXXXXX" in the host's temporary folder; "" on failure.
inline std::string newTempDir(const std::string &stem) {
  std::string pattern = (std::filesystem::temp_directory_path() / (stem + ".XXXXXX")).string();
  return mkdtemp(pattern.data()) != nullptr ? pattern : std::string();
}

class TempWorld {
public:
  // Builds the empty machine; root() is "" when that failed.
  explicit TempWorld(const std::string &stem) : root_(newTempDir(stem)) {
    if (root_.empty())
      return;
    std::error_code failed;
    std::filesystem::create_directories(root_ + "/drive_c", failed);
    if (failed || !writeHive("system.reg") || !writeHive("user.reg")) {
      std::filesystem::remove_all(root_, failed);
      root_.clear();
    }
  }
  ~TempWorld() {
    if (entered_)
      leave();
    std::error_code ignored;
    if (!root_.empty())
      std::filesystem::remove_all(root_, ignored);
  }
  TempWorld(const TempWorld &) = delete;
  TempWorld &operator=(const TempWorld &) = delete;

  const std::string &root() const { return root_; }

  // Makes this the process's machine, with no faults planned.
  void enter() {
    setenv("KXLSIM_ROOT", root_.c_str(), 1);
    entered_ = true;
    forgetProcessState();
  }

  // The process has no machine again.
  void leave() {
    unsetenv("KXLSIM_ROOT");
    entered_ = false;
    forgetProcessState();
  }

private:
  static void forgetProcessState() {
    unsetenv("KXLSIM_FAIL");
    kxlsim::posix::resetWorldRoot();
    kxlsim::resetFaults();
  }
  bool writeHive(const char *name) const {
    std::ofstream out(root_ + "/" + name, std::ios::binary);
    out << "REGEDIT4\n\n";
    return static_cast<bool>(out.flush());
  }

  std::string root_;
  bool entered_ = false;
};

} // namespace kxltestsupport
#endif
