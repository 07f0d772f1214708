#include "sim/kxlsim/snapshot.h"

#include <filesystem>

namespace kxlsim {

namespace fs = std::filesystem;

bool snapshotWorld(const std::string &hostDir, const std::string &outDir, std::string &error) {
  std::error_code ec;
  if (!fs::is_regular_file(fs::path(hostDir) / "system.reg", ec)) {
    error = hostDir + " holds no world (no system.reg)";
    return false;
  }
  if (fs::exists(outDir, ec)) {
    error = outDir + " exists already";
    return false;
  }
  fs::copy(hostDir, outDir, fs::copy_options::recursive | fs::copy_options::copy_symlinks, ec);
  if (ec) {
    error = "cannot copy " + hostDir + " to " + outDir + ": " + ec.message();
    return false;
  }
  return true;
}

} // namespace kxlsim
