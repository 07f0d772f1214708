// Host paths of the simulated machine on a POSIX host: where the world lives,
// found the same way by every simulated component (the Win32 surface, the
// event log). Not built for Windows, where the machine is the real one.
#pragma once

#include <string>

namespace kxlsim::posix {

// Host directory of the world: KXLSIM_ROOT when set, else the nearest directory
// above the running executable that holds system.reg. Empty when there is none.
const std::string &worldRoot();

// The running executable's host path, links resolved ("" when it cannot be
// read).
std::string resolvedProgramPath();

// Forgets the cached root (tests that switch KXLSIM_ROOT between worlds).
void resetWorldRoot();

// The folder part of a host path ("/" for a file at the root, "" for a bare
// name).
std::string parentDirectory(const std::string &path);

// The process's current host directory ("" when it cannot be read).
std::string currentHostDirectory();

// The path without trailing slashes ("/" stays).
std::string stripTrailingSlashes(std::string path);

} // namespace kxlsim::posix
