#include "tests/support/command_world.h"

#include "sim/kxlsim/diff.h"
#include "sim/kxlsim/scenarios.h"
#include "sim/kxlsim/snapshot.h"
#include "tests/support/command_run.h"
#include "tests/support/temp_world.h"

#include <filesystem>
#include <map>
#include <sstream>

namespace kxltest {

namespace fs = std::filesystem;
using kxltestsupport::readHostFile;

namespace {

// The worlds built for the program, by scenario ("" when building failed),
// removed when it ends.
class Templates {
public:
  ~Templates() {
    std::error_code ignored;
    for (const std::string &dir : dirs_)
      fs::remove_all(dir, ignored);
  }
  const std::string &of(const std::string &scenario) {
    auto found = worlds_.find(scenario);
    if (found != worlds_.end())
      return found->second;
    std::string dir = kxltestsupport::newTempDir("kxlcmd-" + scenario);
    std::string world = dir + "/world";
    kxlsim::InstallSources sources{KXL_TOOLS, KXL_COMMAND, KXL_MESSAGES};
    std::vector<std::string> errors;
    if (!dir.empty())
      dirs_.push_back(dir);
    if (dir.empty() || !kxlsim::createWorld(world, scenario, sources, errors))
      world.clear();
    return worlds_[scenario] = world;
  }

private:
  std::map<std::string, std::string> worlds_;
  std::vector<std::string> dirs_;
};

Templates templates;

} // namespace

std::string field(const std::string &name, const std::string &value) {
  return "\"" + name + "\":\"" + value + "\"";
}

std::vector<std::string> eventsOf(const CommandOutcome &run, const std::string &kind) {
  std::vector<std::string> found;
  for (const std::string &line : run.events)
    if (line.find(field("event", kind)) != std::string::npos)
      found.push_back(line);
  return found;
}

void CommandWorld::SetUp() {
  temp_ = kxltestsupport::newTempDir("kxlcmd");
  ASSERT_FALSE(temp_.empty());
  root_ = temp_ + "/world";
  resetWorld();
}

void CommandWorld::TearDown() {
  std::error_code ignored;
  if (!HasFailure())
    fs::remove_all(temp_, ignored);
  else
    std::cerr << "the world of this case stays in " << temp_ << '\n';
}

void CommandWorld::resetWorld(const std::string &scenario) {
  const std::string &built = templates.of(scenario);
  ASSERT_FALSE(built.empty()) << "the " << scenario << " world could not be built";
  std::error_code failure;
  fs::remove_all(root_, failure);
  fs::copy(built, root_, fs::copy_options::recursive, failure);
  ASSERT_FALSE(failure) << failure.message();
  std::string reason;
  ASSERT_TRUE(kxlsim::selectWorld(root_, reason)) << reason;
}

CommandOutcome CommandWorld::runInWorld(const std::vector<std::string> &args,
                                        std::vector<std::string> settings, const std::string &program,
                                        const std::string &cwd) {
  std::string tag = temp_ + "/run" + std::to_string(++runs_);
  std::string eventLog = root_ + "/events.jsonl", diagLog = root_ + "/kxldiag.log";
  std::size_t eventsBefore = readHostFile(eventLog).size(), diagBefore = readHostFile(diagLog).size();
  settings.insert(settings.begin(), {"KXLSIM_ROOT=" + root_, "KXLTRACE=" + tag + ".trace"});
  kxltestsupport::CommandRun command{hostPath(std::string(kCurrentCopy) + "\\bin\\" + program),
                                     args,
                                     settings,
                                     cwd.empty() ? "" : hostPath(cwd),
                                     tag + ".out",
                                     tag + ".err"};
  CommandOutcome outcome;
  outcome.exitCode = kxltestsupport::runCommand(command);
  outcome.out = readHostFile(command.outFile);
  outcome.err = readHostFile(command.errFile);
  outcome.trace = readHostFile(tag + ".trace");
  std::istringstream added(readHostFile(eventLog).substr(eventsBefore));
  for (std::string line; std::getline(added, line);)
    outcome.events.push_back(line);
  outcome.diagnostics = readHostFile(diagLog).substr(diagBefore);
  return outcome;
}

std::string CommandWorld::snapshot() {
  std::string copy = temp_ + "/snapshot" + std::to_string(++snapshots_), error;
  EXPECT_TRUE(kxlsim::snapshotWorld(root_, copy, error)) << error;
  return copy;
}

std::string CommandWorld::changesSince(const std::string &snapshot) const {
  std::ostringstream out;
  kxlsim::diffWorlds(snapshot, root_, out);
  return out.str();
}

std::string CommandWorld::hostPath(const std::string &windowsPath) const {
  return kxltestsupport::drivePath(root_, windowsPath);
}

} // namespace kxltest
