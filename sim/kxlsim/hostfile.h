// Whole files of the host, read in one piece (worlds hold large programs).
#pragma once

#include <filesystem>
#include <string>

namespace kxlsim {

// The bytes of `path`; false when it cannot be read.
bool readHostFile(const std::filesystem::path &path, std::string &out);

} // namespace kxlsim
