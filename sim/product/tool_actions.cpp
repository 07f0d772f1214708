#include "sim/product/tool_actions.h"

#include "sim/common/names.h"
#include "sim/posix/reghelp.h"
#include "sim/product/installation.h"
#include "sim/product/simstate.h"
#include "sim/product/simstore.h"
#include "sim/product/winpath.h"

#include <cstdio>
#include <sstream>

namespace reg = kxlsim::posix::reg;

namespace kxlsim {

namespace {

constexpr size_t kMaxConfigBytes = 1 << 20;
constexpr int kUsageError = 2;

// Replaces an earlier mark of `marker` in the file with one for the copy; the
// file keeps every other line. False when the file is missing or unwritable.
bool markUpgraded(const std::string &path, const std::string &marker, const std::string &copyName) {
  std::string text;
  if (kxlprod::readSmallTextFile(path, kMaxConfigBytes, text) != ERROR_SUCCESS)
    return false;
  std::istringstream lines(text);
  std::string line, kept;
  while (std::getline(lines, line)) {
    std::string bare = !line.empty() && line.back() == '\r' ? line.substr(0, line.size() - 1) : line;
    if (bare.rfind(marker, 0) != 0)
      kept += bare + "\r\n";
  }
  kept += marker + copyName + "\r\n";
  return kxlprod::writeWholeFile(path, std::vector<uint8_t>(kept.begin(), kept.end())) == ERROR_SUCCESS;
}

bool findCopyName(const std::string &name, kxlprod::CopyInfo &copy) {
  return !name.empty() && kxlprod::findCopy(name, copy);
}

// The value after `option`; false when the option or its value is missing.
bool optionValue(const std::vector<std::string> &args, const char *option, std::string &value) {
  for (size_t i = 0; i + 1 < args.size(); ++i) {
    if (args[i] == option) {
      value = kxlprod::unquotedPath(args[i + 1].c_str());
      return !value.empty();
    }
  }
  return false;
}

} // namespace

void upgradeAuditConfig(const std::string &copyName) {
  std::string directory, copy;
  if (!kxlprod::readInstanceEntry(kxlprod::processInstance(), directory, copy))
    return;
  markUpgraded(kxlprod::joinPath(directory, "security\\kxlaudit.cfg"), "# upgraded for copy ", copyName);
}

int upgradeSslConfig(const std::string &copyName, const std::vector<std::string> &args) {
  std::string client, server;
  if (!optionValue(args, "-c", client) || !optionValue(args, "-s", server))
    return kUsageError;
  for (const std::string &path : {client, server})
    markUpgraded(path, "; upgraded for copy ", copyName);
  return 0;
}

void cleanProfiles(const std::string &copyName, const std::vector<std::string> &args) {
  kxlprod::CopyInfo copy;
  if (args.empty() || !kxlsim::equalsIgnoringCase(args[0], "-cleanup") || !findCopyName(copyName, copy))
    return;
  std::vector<std::string> profiles;
  std::string profilesKey = kxlprod::copyKey(copy) + "\\PROFILES";
  reg::listSubkeys(HKEY_LOCAL_MACHINE, profilesKey, profiles);
  for (const std::string &name : profiles)
    if (!reg::keyExists(HKEY_LOCAL_MACHINE, kxlprod::instanceRegistryKey(name)))
      SHDeleteKeyA(HKEY_LOCAL_MACHINE, (profilesKey + "\\" + name).c_str());
}

int runToolWork(const std::string &program, int argc, char **argv) {
  kxlprod::CopyInfo copy;
  std::string copyName = kxlprod::ownCopy(copy) ? copy.name : std::string();
  std::vector<std::string> args(argv + (argc > 0 ? 1 : 0), argv + (argc > 0 ? argc : 0));
  if (program == "kxlimaudcfg")
    upgradeAuditConfig(copyName);
  else if (program == "kxlimsslcfg")
    return upgradeSslConfig(copyName, args);
  else if (program == "kxlset")
    cleanProfiles(copyName, args);
  return 0;
}

} // namespace kxlsim
