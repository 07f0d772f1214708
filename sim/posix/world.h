// The simulated machine on a POSIX host: where the world lives and how
// Windows paths map onto it. Internal to sim/ (the command never includes it).
#pragma once

#include "sim/common/worldroot.h"

#include <string>
#include <string_view>

namespace kxlsim::posix {

// Prints one line on standard error and exits nonzero when no world is found.
// Called by every Win32 entry point before it touches the world.
void requireWorld();

// Maps a Windows path ("C:\A\b", "\\SERVER\SHARE\x", relative to the current
// directory, "/" accepted as "\") to its host path in the world. Each existing
// component is matched ignoring case (the existing name wins); missing ones are
// kept as written. Returns false for a path that cannot lie in the world.
bool hostPath(std::string_view windowsPath, std::string &out);

// Names are matched against a listing of each folder kept per process for as
// long as the folder's change times are unchanged. The file calls of this
// process report the entries they add or remove, so that their own changes
// do not make the listing be read again (an added name is put in; a removal
// drops the folder's listing).
void noteEntryAdded(const std::string &hostPath);
void noteEntryRemoved(const std::string &hostPath);

// The Windows path of a host path inside the world ("" when outside it).
std::string windowsPath(std::string_view hostPath);

} // namespace kxlsim::posix
