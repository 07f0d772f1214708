// `kxlsim diff A B`: readable differences between two worlds, registry key by
// key and value by value (other machines named as machines), and files
// (added, removed, changed; text files line by line, binary files by size and
// hash).
#pragma once

#include <ostream>
#include <string>

namespace kxlsim {

// Writes the differences to `out`. Returns 0 when the worlds are equal, 1 when
// they differ, 2 when a world cannot be read (reason in `out`).
int diffWorlds(const std::string &hostDirA, const std::string &hostDirB, std::ostream &out);

// How a registry key path of a hive is shown: "HKLM\..." or "HKCU\..." on the
// local machine, "[NAME] HKLM\..." for the subtree of another machine.
std::string displayKeyPath(const std::string &fullPath);

} // namespace kxlsim
