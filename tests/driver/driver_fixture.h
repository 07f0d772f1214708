// The demo world afresh for every case (tests/support/command_world.h), the
// command run there with an optional fault, and the means to see what the
// upgrade driver did: its trace, the registry, and the files of a directory tree.
#pragma once

#include "sim/kxlsim/world_reader.h"
#include "tests/support/command_world.h"

#include <filesystem>
#include <map>
#include <string>
#include <vector>

namespace drivertest {

inline constexpr const char *kOldInstanceDir = "C:\\Program Files\\ZAV\\KXL95\\INST1";
inline constexpr const char *kNewInstanceDir = "C:\\Program Files\\ZAV\\KXL101\\INST1";

struct DriverFailure {
  long long probe, rc;
};

struct Outcome : kxltest::CommandOutcome {
  long long driverResult = -999999; // from the driver's exit trace line
  bool driverRan = false;
  std::vector<DriverFailure> failures; // the driver's error trace lines
};

// The profile key of an instance under a copy.
inline std::string profileKey(const std::string &copyName, const std::string &instance) {
  return kxlsim::copyRegistryKey(copyName) + "\\PROFILES\\" + instance;
}

class DriverTest : public kxltest::CommandWorld {
public:
  // Runs the command with `args`; `faults` is the KXLSIM_FAIL value ("" none),
  // `kill` the KXLSIM_KILL value ("" none).
  Outcome run(const std::vector<std::string> &args, const std::string &faults = "",
              const std::string &kill = "");

  // The driver failed once, at `probe`, with `rc`, and returned it.
  static void expectFailure(const Outcome &outcome, long long probe, long long rc);

  // Relative path -> content of every file below a directory.
  std::map<std::string, std::string> tree(const std::string &windowsPath) const;
  bool exists(const std::string &windowsPath) const { return std::filesystem::exists(hostPath(windowsPath)); }
  // The whole content of a file ("" when it cannot be read).
  std::string fileContent(const std::string &windowsPath) const {
    return kxltestsupport::readHostFile(hostPath(windowsPath));
  }
  void removeTree(const std::string &windowsPath) const {
    std::error_code ignored;
    std::filesystem::remove_all(hostPath(windowsPath), ignored);
  }
  // A backup folder is in the world's temporary directory.
  bool hasBackup() const;

  // Keeps a copy of the world as it is now, for worldChanges.
  void keepWorld() { kept_ = snapshot(); }
  // What differs between the kept world and the world now, as `kxlsim diff`
  // shows it, without the logs and the database check tool's files in the
  // current directory ("" when nothing else differs).
  std::string worldChanges() const;

  // Registry of the local machine.
  bool keyExists(const std::string &key) const { return kxlsim::keyExists(kxlsim::localMachine(), key); }
  std::string stringValue(const std::string &key, const std::string &name) const {
    return kxlsim::stringValue(kxlsim::localMachine(), key, name);
  }
  DWORD dwordValue(const std::string &key, const std::string &name) const {
    return kxlsim::dwordValue(kxlsim::localMachine(), key, name, 0xFFFFFFFFu);
  }

private:
  std::string kept_;
};

} // namespace drivertest
