// `kxlsim snapshot DIR OUT`: a copy of a world, to compare with later.
#pragma once

#include <string>

namespace kxlsim {

// Copies the world tree `hostDir` to `outDir`, which must not exist yet.
// Returns false with a reason.
bool snapshotWorld(const std::string &hostDir, const std::string &outDir, std::string &error);

} // namespace kxlsim
