// Writes a world through the Win32 surface, so that it is built exactly the
// way the programs running in it will see it. Failures are collected rather
// than stopping the build; `ok()` tells whether everything was written.
#pragma once

#include "platform/win32.h"

#include <cstdint>
#include <string>
#include <vector>

namespace kxlsim {

// Where registry writes go: a root key plus a key prefix. Other machines of
// the world live under HKLM\SOFTWARE\ZAV\KXLSIM\Machines\<NAME>.
struct RegTarget {
  HKEY root;
  std::string prefix; // "" or "...\" ending with a backslash
};

inline constexpr const char *kMachinesKey = "SOFTWARE\\ZAV\\KXLSIM\\Machines";

RegTarget localMachine();
RegTarget currentUser();
RegTarget remoteMachine(const std::string &computerName);

// Creates the world directory `hostDir` (which must not hold a world yet) with
// empty registry files and drive C:, and makes it this process's world.
// Returns false with a reason.
bool initWorld(const std::string &hostDir, std::string &error);

// Makes an existing world this process's world (KXLSIM_ROOT).
bool selectWorld(const std::string &hostDir, std::string &error);

class WorldWriter {
public:
  void createKey(const RegTarget &target, const std::string &key);
  void setString(const RegTarget &target, const std::string &key, const std::string &name,
                 const std::string &value);
  void setDword(const RegTarget &target, const std::string &key, const std::string &name, DWORD value);
  void setMultiString(const RegTarget &target, const std::string &key, const std::string &name,
                      const std::vector<std::string> &items);

  // Makes drive `letter` (a disk of the machine, or a shared cluster disk) exist.
  void addDrive(char letter);
  // Creates a Windows directory and its missing parents.
  void makeDirectory(const std::string &windowsPath);
  // Writes a file (parents created), replacing an existing one.
  void writeFile(const std::string &windowsPath, const std::vector<uint8_t> &bytes);
  void writeText(const std::string &windowsPath, const std::string &text);
  // Copies a file of the host (outside the world) into the world.
  void installHostFile(const std::string &hostPath, const std::string &windowsPath, bool executable);

  void note(const std::string &problem) { errors_.push_back(problem); }
  bool ok() const { return errors_.empty(); }
  const std::vector<std::string> &errors() const { return errors_; }

private:
  bool openKey(const RegTarget &target, const std::string &key, HKEY &out);
  void setValue(const RegTarget &target, const std::string &key, const std::string &name, DWORD type,
                const void *data, DWORD size);

  std::vector<std::string> errors_;
};

// "C:\A\b" -> "C:\A"; "" when there is no parent.
std::string windowsParent(const std::string &windowsPath);

} // namespace kxlsim
