#include "sim/kxlsim/hostfile.h"

#include <fstream>

namespace kxlsim {

bool readHostFile(const std::filesystem::path &path, std::string &out) {
  std::ifstream in(path, std::ios::binary | std::ios::ate);
  if (!in)
    return false;
  std::streamoff size = in.tellg();
  if (size < 0)
    return false;
  out.resize(static_cast<size_t>(size));
  in.seekg(0);
  return static_cast<bool>(in.read(out.data(), size)) || size == 0;
}

} // namespace kxlsim
