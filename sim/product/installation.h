// Installed copies as the library sees them, and the process-wide current
// installation. Internal to the product library.
#pragma once

#include "platform/win32.h"

#include <string>
#include <vector>

namespace kxlprod {

// Name under which the version-8 (single-copy) installation is known.
inline constexpr char kV8CopyName[] = "KXLV8";
inline constexpr char kProductRoot[] = "SOFTWARE\\ZAV\\KXL";
inline constexpr char kSimRoot[] = "SOFTWARE\\ZAV\\KXLSIM";

struct CopyInfo {
  std::string name; // copy name, or kV8CopyName
  std::string path; // installation path, no trailing backslash
  bool v8 = false;
};

// Every registered copy: the version-8 installation first when
// SOFTWARE\ZAV\KXL\CurrentVersion "Version" is 8, then InstalledCopies\<copy>
// that have a "KXL Path Name". Registry failures other than missing keys are returned.
LONG listCopies(std::vector<CopyInfo> &copies);

// The copy of that name (ignoring case).
bool findCopy(const std::string &name, CopyInfo &copy);

// The copy whose installation path holds the running program (the deepest one
// when paths nest).
bool ownCopy(CopyInfo &copy);

// The current installation: the one switched to, else the program's own copy.
bool currentCopy(CopyInfo &copy);

// Registry keys (under HKEY_LOCAL_MACHINE) of a copy.
std::string copyKey(const CopyInfo &copy);
std::string profileKey(const CopyInfo &copy, const std::string &instance);
std::string globalProfileKey(const CopyInfo &copy);

// Switching: an empty name returns to the program's own copy.
void setSwitchedCopy(const std::string &name);

// Forgets the switch (tests).
void resetInstallationState();

} // namespace kxlprod
