// `kxlsim show`: what is installed in the world of this process.
#pragma once

#include <ostream>

namespace kxlsim {

// Lists copies (name, version, path), instances (name, copy, directory, node
// type), services (name, image, start, state) of every machine, and machines.
void showWorld(std::ostream &out);

} // namespace kxlsim
