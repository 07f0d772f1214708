// The one way tests make a temporary machine on POSIX hosts: a fresh folder
// holding a world (empty machine and user hives and a drive C:, the run-time
// modules' files if asked for, or a copy of another world), selected for the
// process with no fault plan, and removed again. Header-only, so that it needs
// no library beyond the simulator the test already links.
#pragma once

#ifndef _WIN32
#include "sim/common/simfail.h"
#include "sim/posix/world.h"

#include <unistd.h>

#include <climits>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <string>
#include <system_error>

namespace kxltestsupport {

// A new directory "<stem>.XXXXXX" in the host's temporary folder; "" on failure.
inline std::string newTempDir(const std::string &stem) {
  std::string pattern = (std::filesystem::temp_directory_path() / (stem + ".XXXXXX")).string();
  return mkdtemp(pattern.data()) != nullptr ? pattern : std::string();
}

// The whole content of a host file ("" when it cannot be read).
inline std::string readHostFile(const std::string &path) {
  std::ifstream in(path, std::ios::binary);
  return std::string(std::istreambuf_iterator<char>(in), std::istreambuf_iterator<char>());
}

// Writes (replacing) a whole host file, making its folders; false when that failed.
inline bool writeHostFile(const std::string &path, const std::string &content) {
  std::error_code ignored;
  std::filesystem::create_directories(std::filesystem::path(path).parent_path(), ignored);
  std::ofstream out(path, std::ios::binary);
  out << content;
  return static_cast<bool>(out.flush());
}

// What a new machine holds beside its empty hives and drive C:.
enum class Machine {
  kEmpty,
  kModules, // clusapi.dll, resutils.dll and odbc32.dll in C:\windows\system32, for LoadLibraryA
};

// A world to copy instead of building an empty one (a scenario world built
// once per process and changed by one case only).
struct CopyOf {
  std::string world;
};

class TempWorld {
public:
  // root() is "" when the world could not be made.
  explicit TempWorld(const std::string &stem, Machine machine = Machine::kEmpty) : base_(newTempDir(stem)) {
    if (!base_.empty() && !(makeEmpty() && (machine == Machine::kEmpty || addModules())))
      discard();
  }
  TempWorld(const std::string &stem, const CopyOf &source) : base_(newTempDir(stem)) {
    std::error_code failed;
    if (!base_.empty())
      std::filesystem::copy(source.world, world(), std::filesystem::copy_options::recursive, failed);
    if (failed || source.world.empty())
      discard();
  }
  ~TempWorld() {
    if (entered_)
      leave();
    discard();
  }
  TempWorld(const TempWorld &) = delete;
  TempWorld &operator=(const TempWorld &) = delete;

  // The world's host folder.
  const std::string &root() const { return root_; }
  // Host path of `relative` in the world ("drive_c/A/b").
  std::string host(const std::string &relative) const { return root_ + "/" + relative; }
  // A host path beside the world, for what the case keeps outside it (snapshots, reports).
  std::string scratch(const std::string &name) const { return base_ + "/" + name; }

  // Makes this the process's machine, with no faults planned and no
  // temporary folder named by the host; leave() also returns to the working
  // directory the case started in.
  void enter() {
    char cwd[PATH_MAX];
    startCwd_ = getcwd(cwd, sizeof cwd) != nullptr ? cwd : "/";
    setenv("KXLSIM_ROOT", root_.c_str(), 1);
    unsetenv("TMP");
    unsetenv("TEMP");
    entered_ = true;
    forgetProcessState();
  }
  // A temporary folder a case named inside the world is no host folder: left
  // set, it would break the next world's making in the same process.
  void leave() {
    if (chdir(startCwd_.c_str()) != 0)
      startCwd_.clear();
    unsetenv("KXLSIM_ROOT");
    unsetenv("TMP");
    unsetenv("TEMP");
    entered_ = false;
    forgetProcessState();
  }

private:
  std::string world() {
    root_ = base_ + "/world";
    return root_;
  }
  bool makeEmpty() {
    std::error_code failed;
    std::filesystem::create_directories(world() + "/drive_c", failed);
    return !failed && writeHostFile(host("system.reg"), "REGEDIT4\n\n") &&
           writeHostFile(host("user.reg"), "REGEDIT4\n\n");
  }
  bool addModules() {
    bool written = true;
    for (const char *module : {"clusapi.dll", "resutils.dll", "odbc32.dll"})
      written = written && writeHostFile(host("drive_c/windows/system32/") + module, "MZ");
    return written;
  }
  void discard() {
    std::error_code ignored;
    if (!base_.empty())
      std::filesystem::remove_all(base_, ignored);
    base_.clear();
    root_.clear();
  }
  static void forgetProcessState() {
    unsetenv("KXLSIM_FAIL");
    kxlsim::posix::resetWorldRoot();
    kxlsim::resetFaults();
  }

  std::string base_, root_, startCwd_;
  bool entered_ = false;
};

} // namespace kxltestsupport
#endif
