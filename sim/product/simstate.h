// Reading the simulation's own state: machine identity, services and small
// files. Internal to the product library.
#pragma once

#include "platform/win32.h"

#include <cstddef>
#include <string>

namespace kxlprod {

// HKEY_LOCAL_MACHINE\SOFTWARE\ZAV\KXLSIM\Identity of the local machine.
inline constexpr char kIdentityKey[] = "SOFTWARE\\ZAV\\KXLSIM\\Identity";

// A REG_DWORD value of `root`\`path`. Returns the registry's result code;
// `value` is set only on success (ERROR_BAD_FORMAT for another type).
LONG readRegDword(HKEY root, const std::string &path, const char *name, DWORD &value);

// The whole content of a file of at most `maxBytes` bytes (Windows path).
// ERROR_MORE_DATA for a longer file; Windows error codes otherwise.
LONG readSmallTextFile(const std::string &windowsPath, size_t maxBytes, std::string &text);

} // namespace kxlprod
