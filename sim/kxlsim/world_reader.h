// Reads the world of this process through the Win32 surface (for `show`).
#pragma once

#include "sim/kxlsim/world_writer.h"

#include <cstdint>
#include <string>
#include <vector>

namespace kxlsim {

std::vector<std::string> subkeys(const RegTarget &target, const std::string &key);
bool keyExists(const RegTarget &target, const std::string &key);
// "" when the value is missing or not a string.
std::string stringValue(const RegTarget &target, const std::string &key, const std::string &name);
// `fallback` when the value is missing or not a dword.
DWORD dwordValue(const RegTarget &target, const std::string &key, const std::string &name, DWORD fallback);
// Up to `limit` bytes of a file; false when it cannot be opened.
bool readFileHead(const std::string &windowsPath, size_t limit, std::vector<uint8_t> &out);

} // namespace kxlsim
