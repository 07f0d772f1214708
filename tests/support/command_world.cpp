#include "tests/support/command_world.h"

#include "sim/kxlsim/diff.h"
#include "sim/kxlsim/snapshot.h"
#include "tests/support/command_run.h"
#include "tests/support/scenario_world.h"

#include <sstream>

namespace kxltest {

using kxltestsupport::readHostFile;

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

void CommandWorld::resetWorld(const std::string &scenario) {
  if (machine_)
    machine_->leave();
  machine_ = std::make_unique<kxltestsupport::TempWorld>(
      "kxlcmd", kxltestsupport::CopyOf{kxltestsupport::scenarioWorld(scenario)});
  ASSERT_FALSE(root().empty()) << "no copy of the " << scenario << " world";
  machine_->enter();
  world.installHostFile(KXL_COMMAND, std::string(kCurrentCopy) + "\\bin\\kxliupgrade.exe", true);
  ASSERT_TRUE(world.ok());
}

CommandOutcome CommandWorld::runInWorld(const std::vector<std::string> &args,
                                        std::vector<std::string> settings, const std::string &program,
                                        const std::string &cwd) {
  std::string tag = machine_->scratch("run" + std::to_string(++runs_));
  std::string eventLog = machine_->host("events.jsonl"), diagLog = machine_->host("kxldiag.log");
  std::size_t eventsBefore = readHostFile(eventLog).size(), diagBefore = readHostFile(diagLog).size();
  settings.insert(settings.begin(), {"KXLSIM_ROOT=" + root(), "KXLTRACE=" + tag + ".trace"});
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
  std::string copy = machine_->scratch("snapshot" + std::to_string(++snapshots_)), error;
  EXPECT_TRUE(kxlsim::snapshotWorld(root(), copy, error)) << error;
  return copy;
}

std::string CommandWorld::changesSince(const std::string &snapshot) const {
  std::ostringstream out;
  kxlsim::diffWorlds(snapshot, root(), out);
  return out.str();
}

std::string CommandWorld::hostPath(const std::string &windowsPath) const {
  return kxltestsupport::drivePath(root(), windowsPath);
}

} // namespace kxltest
