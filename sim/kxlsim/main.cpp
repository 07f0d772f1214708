// kxlsim: create, show, compare and snapshot simulated machines (worlds).
#include "sim/common/worldroot.h"
#include "sim/kxlsim/diff.h"
#include "sim/kxlsim/scenarios.h"
#include "sim/kxlsim/show.h"
#include "sim/kxlsim/snapshot.h"

#include <cstring>
#include <filesystem>
#include <iostream>
#include <string>

namespace {

namespace fs = std::filesystem;

int usage() {
  std::cerr << "usage: kxlsim create DIR [--scenario NAME] [--command PATH] [--tools PATH] [--messages DIR]\n"
               "       kxlsim show DIR\n"
               "       kxlsim diff A B\n"
               "       kxlsim snapshot DIR OUT\n"
               "       kxlsim scenarios\n";
  return 2;
}

std::string ownDirectory() {
  std::string program = kxlsim::posix::resolvedProgramPath();
  return program.empty() ? "." : kxlsim::posix::parentDirectory(program);
}

// The first of the candidates that exists; "" when none does.
std::string firstExisting(std::initializer_list<std::string> candidates) {
  std::error_code ec;
  for (const std::string &candidate : candidates)
    if (!candidate.empty() && fs::is_regular_file(candidate, ec))
      return candidate;
  return "";
}

struct CreateOptions {
  std::string dir;
  std::string scenario = "demo";
  std::string command;
  std::string tools;
  std::string messages = KXLSIM_MESSAGE_DIR;
};

bool parseCreate(int argc, char **argv, CreateOptions &options) {
  for (int i = 2; i < argc; ++i) {
    std::string arg = argv[i];
    bool hasValue = i + 1 < argc;
    if (arg == "--scenario" && hasValue)
      options.scenario = argv[++i];
    else if (arg == "--command" && hasValue)
      options.command = argv[++i];
    else if (arg == "--tools" && hasValue)
      options.tools = argv[++i];
    else if (arg == "--messages" && hasValue)
      options.messages = argv[++i];
    else if (options.dir.empty() && arg.rfind("--", 0) != 0)
      options.dir = arg;
    else
      return false;
  }
  return !options.dir.empty();
}

int create(int argc, char **argv) {
  CreateOptions options;
  if (!parseCreate(argc, argv, options))
    return usage();
  std::string here = ownDirectory();
  kxlsim::InstallSources sources;
  sources.toolsPath =
      options.tools.empty() ? firstExisting({here + "/kxltools", KXLSIM_TOOLS_PATH}) : options.tools;
  sources.commandPath =
      options.command.empty()
          ? firstExisting({here + "/kxliupgrade", std::string(KXLSIM_BUILD_ROOT) + "/engn/sqo/kxliupgrade"})
          : options.command;
  sources.messageDir = options.messages;
  if (sources.toolsPath.empty()) {
    std::cerr << "kxlsim: the tools program kxltools is not built (give --tools PATH)\n";
    return 1;
  }
  if (sources.commandPath.empty())
    std::cerr << "kxlsim: note: the command kxliupgrade is not built; the current copy has no command\n";
  std::vector<std::string> errors;
  bool ok = kxlsim::createWorld(options.dir, options.scenario, sources, errors);
  for (const std::string &error : errors)
    std::cerr << "kxlsim: " << error << '\n';
  return ok ? 0 : 1;
}

int show(const std::string &dir) {
  std::string error;
  if (!kxlsim::selectWorld(dir, error)) {
    std::cerr << "kxlsim: " << error << '\n';
    return 2;
  }
  kxlsim::showWorld(std::cout);
  return 0;
}

int snapshot(const std::string &dir, const std::string &out) {
  std::string error;
  if (kxlsim::snapshotWorld(dir, out, error))
    return 0;
  std::cerr << "kxlsim: " << error << '\n';
  return 1;
}

int listScenarios() {
  for (const kxlsim::Scenario &scenario : kxlsim::scenarios())
    std::cout << scenario.name << "  " << scenario.summary << '\n';
  return 0;
}

} // namespace

int main(int argc, char **argv) {
  if (argc < 2)
    return usage();
  std::string verb = argv[1];
  if (verb == "create")
    return create(argc, argv);
  if (verb == "show" && argc == 3)
    return show(argv[2]);
  if (verb == "diff" && argc == 4)
    return kxlsim::diffWorlds(argv[2], argv[3], std::cout);
  if (verb == "snapshot" && argc == 4)
    return snapshot(argv[2], argv[3]);
  if (verb == "scenarios" && argc == 2)
    return listScenarios();
  return usage();
}
