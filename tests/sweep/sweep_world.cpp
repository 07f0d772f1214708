// Worlds of the sweeps: built by kxlsim, copied per point, compared with
// kxlsim diff; the command run in them the way an administrator runs it.
#include "tests/sweep/sweep_world.h"

#include "sim/common/simfail.h"
#include "tests/support/command_run.h"
#include "tests/support/temp_world.h"

#include <algorithm>
#include <cstring>
#include <filesystem>
#include <sstream>

namespace kxlsweep {

namespace fs = std::filesystem;
using kxltestsupport::CommandRun;
using kxltestsupport::readHostFile;

namespace {

constexpr int kRunTimeoutSeconds = 120;
constexpr const char *kCommand = "drive_c/Program Files/ZAV/KXL101/bin/kxliupgrade.exe";

// The end-to-end scenarios. Scenarios of worlds that this build of kxlsim
// cannot make are left out.
const Scenario kScenarios[] = {
    {"single", "demo", {"INST1"}, "single-partition instance INST1 of the 9.5 copy"},
    {"in-place",
     "demo",
     {"-p", "C:\\Program Files\\ZAV\\KXL95", "INST1"},
     "INST1 with -p naming its present profile path"},
    {"version-8", "demo", {"V8INST"}, "instance V8INST of the version-8 installation"},
    {"partitioned",
     "demo",
     {"-u", "KXLADMIN,secret", "INST2"},
     "partitioned instance INST2 over two machines"},
    {"forcecn", "demo", {"-forcecn", "-u", "KXLADMIN,secret", "INST2"}, "INST2 with -forcecn"},
    {"cluster-single", "cluster", {"CINST1"}, "clustered single-partition instance CINST1"},
    {"cluster-partitioned",
     "cluster",
     {"-u", "kxlsvc,Secret1", "CINST2"},
     "clustered partitioned instance CINST2"},
};

// Files that every run writes or may write whatever happens: the event log,
// the diagnostic log and the database check's own log files.
constexpr const char *kLogFiles[] = {"events.jsonl", "kxldiag.log", "C:\\upgrade.log", "C:\\KXLDBMIG.TXT"};

// What a run that exits 0 may leave besides the world of a clean upgrade:
// the failures the command ignores on purpose, each listed with why in
// docs/fault-sweep.md. A difference is one of them when it is a file the
// clean upgrade does not have, whose path holds `folder` and ends with `end`.
struct IgnoredLeftover {
  const char *folder;
  const char *end;
};
constexpr IgnoredLeftover kIgnoredLeftovers[] = {
    {"\\", "\\kxlnodes.cfg.mig"},    // the saved nodes file could not be deleted
    {"\\CFG\\kxliupgrade-", ".run"}, // the run record could not be removed after the success
};

bool isIgnoredLeftover(const std::string &difference) {
  constexpr const char kAdded[] = "file + ";
  if (difference.rfind(kAdded, 0) != 0)
    return false;
  std::string path = difference.substr(sizeof kAdded - 1);
  path = path.substr(0, path.find(" ("));
  for (const IgnoredLeftover &ignored : kIgnoredLeftovers) {
    std::size_t length = std::strlen(ignored.end);
    if (path.find(ignored.folder) != std::string::npos && path.size() >= length &&
        path.compare(path.size() - length, length, ignored.end) == 0)
      return true;
  }
  return false;
}

bool onlyIgnoredLeftovers(const std::vector<std::string> &differences) {
  return std::all_of(differences.begin(), differences.end(), isIgnoredLeftover);
}

struct Run {
  int exitCode = 0;
  std::string out, err, trace;
};

Run runProgram(const std::string &program, const std::vector<std::string> &args,
               const std::vector<std::string> &settings, const std::string &cwd, SweepDir &dir) {
  CommandRun command;
  command.program = program;
  command.args = args;
  command.settings = settings;
  command.cwd = cwd;
  command.outFile = dir.file("out");
  command.errFile = dir.file("err");
  command.timeoutSeconds = kRunTimeoutSeconds;
  Run run;
  run.exitCode = kxltestsupport::runCommand(command);
  run.out = readHostFile(command.outFile);
  run.err = readHostFile(command.errFile);
  fs::remove(command.outFile);
  fs::remove(command.errFile);
  return run;
}

Run kxlsim(const std::vector<std::string> &args, SweepDir &dir) {
  return runProgram(programs().kxlsim, args, {}, "", dir);
}

// The command in `world`, started from the world's folder (current directory C:\).
Run upgrade(const std::string &world, const Scenario &scenario, std::vector<std::string> settings,
            SweepDir &dir) {
  std::string trace = dir.file("trace");
  settings.push_back("KXLSIM_ROOT=" + world);
  settings.push_back("KXLTRACE=" + trace);
  Run run = runProgram(world + "/" + kCommand, scenario.args, settings, world, dir);
  run.trace = readHostFile(trace);
  fs::remove(trace);
  return run;
}

bool copyWorld(const std::string &from, const std::string &to) {
  std::error_code failed;
  fs::remove_all(to, failed);
  fs::copy(from, to, fs::copy_options::recursive | fs::copy_options::copy_symlinks, failed);
  return !failed;
}

// The programs of a world are links to one stored copy each, so that a world
// is copied in a moment; a program started through its link still counts as
// installed where the link is.
bool linkPrograms(const std::string &world, const std::string &store) {
  std::error_code failed;
  fs::create_directories(store, failed);
  int stored = 0;
  std::vector<fs::path> programs;
  for (auto it = fs::recursive_directory_iterator(world, failed); !failed && it != fs::end(it);
       it.increment(failed)) {
    std::string name = it->path().filename().string();
    std::transform(name.begin(), name.end(), name.begin(), ::tolower);
    if (it->is_regular_file() && name.size() > 4 && name.substr(name.size() - 4) == ".exe")
      programs.push_back(it->path());
  }
  for (const fs::path &program : programs) {
    fs::path kept = fs::path(store) / std::to_string(++stored);
    fs::rename(program, kept, failed);
    if (!failed)
      fs::create_symlink(kept, program, failed);
    if (failed)
      return false;
  }
  return !failed;
}

bool isLogFile(const std::string &head) {
  // "file + PATH (...)", "file - PATH", "file ~ PATH ..."
  if (head.rfind("file ", 0) != 0 || head.size() < 7)
    return false;
  std::string path = head.substr(7);
  for (const char *log : kLogFiles) {
    std::size_t length = std::strlen(log);
    if (path.compare(0, length, log) == 0 && (path.size() == length || path[length] == ' '))
      return true;
  }
  return false;
}

struct Comparison {
  bool readable = true;
  std::vector<std::string> differences; // one head line each, logs left out
};

// The differences between two worlds, apart from logs and events.
Comparison compare(const std::string &a, const std::string &b, SweepDir &dir) {
  Run diff = kxlsim({"diff", a, b}, dir);
  Comparison result;
  result.readable = diff.exitCode == 0 || diff.exitCode == 1;
  std::istringstream lines(diff.out);
  for (std::string line; std::getline(lines, line);) {
    if (line.empty() || line[0] == ' ' || isLogFile(line))
      continue;
    result.differences.push_back(line);
  }
  if (!result.readable)
    result.differences.push_back("world cannot be read: " + diff.err.substr(0, diff.err.find('\n')));
  return result;
}

// The run's full result: the last exit line of its trace.
std::string finalResult(const std::string &trace) {
  std::size_t at = trace.rfind("\nexit ");
  if (at == std::string::npos)
    return "";
  std::size_t rc = trace.find("rc=", at);
  std::size_t end = trace.find('\n', at + 1);
  return rc == std::string::npos || rc > end ? "" : trace.substr(rc + 3, end - rc - 3);
}

std::string firstLine(const std::string &text) {
  return text.substr(0, text.find('\n'));
}

bool sanitizerReport(const std::string &err) {
  return err.find("Sanitizer") != std::string::npos || err.find("runtime error:") != std::string::npos;
}

void unsafeRun(PointOutcome &outcome, const std::string &problem) {
  outcome.problems.push_back(problem);
  outcome.unsafe = true;
}

void checkRun(const Run &run, bool killed, PointOutcome &outcome) {
  if (run.exitCode == kxltestsupport::kRunTimedOut)
    unsafeRun(outcome, "did not end");
  else if (run.exitCode == kxltestsupport::kRunNotExited)
    unsafeRun(outcome, "crashed");
  if (sanitizerReport(run.err))
    unsafeRun(outcome, "sanitizer report: " + firstLine(run.err));
  if (!killed && outcome.message.empty())
    unsafeRun(outcome, "no message");
}

// The same command again without any fault: it must leave the world of a clean upgrade.
void rerun(const Scenario &scenario, const ScenarioWorlds &worlds, const std::string &world, SweepDir &dir,
           PointOutcome &outcome) {
  outcome.rerunNeeded = true;
  Run again = upgrade(world, scenario, {}, dir);
  Comparison after = compare(worlds.clean, world, dir);
  outcome.rerunSucceeded = again.exitCode == 0 && after.readable && after.differences.empty();
  if (!outcome.rerunSucceeded) {
    std::string text = "rerun: exit " + std::to_string(again.exitCode) + " " + firstLine(again.out);
    for (const std::string &difference : after.differences)
      text += "; " + difference;
    outcome.problems.push_back(text);
  }
}

} // namespace

std::vector<Scenario> sweptScenarios(const std::vector<std::string> &only) {
  SweepDir scratch;
  std::string known = kxlsim({"scenarios"}, scratch).out;
  std::vector<Scenario> chosen;
  for (const Scenario &scenario : kScenarios) {
    bool buildable = known.find(scenario.worldScenario + " ") != std::string::npos;
    bool wanted = only.empty() || std::find(only.begin(), only.end(), scenario.name) != only.end();
    if (buildable && wanted)
      chosen.push_back(scenario);
  }
  return chosen;
}

Programs &programs() {
  static Programs chosen;
  return chosen;
}

SweepDir::SweepDir() : path_(kxltestsupport::newTempDir("kxlsweep")) {}

SweepDir::~SweepDir() {
  std::error_code ignored;
  if (!path_.empty())
    fs::remove_all(path_, ignored);
}

std::string SweepDir::file(const std::string &stem) {
  return path_ + "/" + stem + std::to_string(++files_);
}

bool isHook(const std::string &name) {
  return name == "trace" || name == "hivewrite";
}

bool prepareScenario(const Scenario &scenario, SweepDir &dir, ScenarioWorlds &worlds, std::string &problem) {
  std::string base = dir.path() + "/" + scenario.name;
  worlds.before = base + "/before";
  worlds.clean = base + "/clean";
  fs::create_directories(base);
  Run created = kxlsim(
      {"create", worlds.before, "--scenario", scenario.worldScenario, "--command", programs().command}, dir);
  if (created.exitCode != 0)
    return problem = "kxlsim create: " + created.err, false;
  if (!linkPrograms(worlds.before, base + "/programs") || !copyWorld(worlds.before, worlds.clean))
    return problem = "the world cannot be copied", false;
  std::string countFile = dir.file("counts");
  Run clean = upgrade(worlds.clean, scenario, {"KXLSIM_COUNT=" + countFile}, dir);
  if (clean.exitCode != 0)
    return problem = "the clean upgrade fails: " + firstLine(clean.out) + firstLine(clean.err), false;
  std::istringstream lines(readHostFile(countFile));
  std::string name;
  unsigned long count = 0;
  while (lines >> name >> count)
    worlds.counts[name] = count;
  return true;
}

PointOutcome tryPoint(const Scenario &scenario, const ScenarioWorlds &worlds, const Point &point, bool kill,
                      SweepDir &dir) {
  PointOutcome outcome;
  outcome.scenario = scenario.name;
  outcome.point = point;
  std::string world = dir.path() + "/" + scenario.name + "/point";
  if (!copyWorld(worlds.before, world)) {
    outcome.problems.push_back("the world cannot be copied");
    return outcome;
  }
  std::string setting =
      (kill ? "KXLSIM_KILL=" : "KXLSIM_FAIL=") + point.name + ":" + std::to_string(point.call);
  Run run = upgrade(world, scenario, {setting}, dir);
  outcome.exitCode = run.exitCode;
  outcome.result = finalResult(run.trace);
  outcome.message = firstLine(run.out);
  bool killed = kill && run.exitCode == kxlsim::kKilledExitCode;
  checkRun(run, killed, outcome);
  Comparison fromBefore = compare(worlds.before, world, dir);
  if (!fromBefore.readable) {
    outcome.kind = "registry damaged";
    unsafeRun(outcome, fromBefore.differences.back());
  } else if (killed) {
    Comparison fromClean = compare(worlds.clean, world, dir);
    bool complete = fromClean.differences.empty();
    outcome.kind = complete ? "killed after the upgrade was complete" : "killed";
    outcome.left = complete ? fromClean.differences : fromBefore.differences;
  } else if (run.exitCode == 0) {
    Comparison fromClean = compare(worlds.clean, world, dir);
    outcome.left = fromClean.differences;
    if (fromClean.differences.empty())
      outcome.kind = "completed";
    else if (onlyIgnoredLeftovers(fromClean.differences))
      outcome.kind = "completed, ignoring a failure";
    else
      outcome.kind = "completed, differs from a clean upgrade";
  } else {
    outcome.kind = fromBefore.differences.empty() ? "failed, nothing left changed" : "failed, left changed";
    outcome.left = fromBefore.differences;
  }
  if (kill && !killed)
    unsafeRun(outcome, "not killed: the run ended with " + std::to_string(run.exitCode));
  if (!kill && run.exitCode == 0 && !onlyIgnoredLeftovers(outcome.left))
    outcome.problems.push_back("exit 0 but not the world of a clean upgrade");
  if (!kill && run.exitCode != 0 && !outcome.left.empty())
    outcome.problems.push_back("the world before is not restored");
  outcome.promised = outcome.problems.empty();
  // A failed run that left the world as it was needs no rerun: that rerun is
  // the clean upgrade itself. A run that completed has nothing to rerun.
  bool changed = !outcome.left.empty() || !fromBefore.readable;
  if ((killed || run.exitCode != 0) && changed)
    rerun(scenario, worlds, world, dir, outcome);
  return outcome;
}

std::string describe(const PointOutcome &outcome) {
  std::string text = outcome.scenario + " " + outcome.point.name + ":" + std::to_string(outcome.point.call) +
                     ": " + outcome.kind + ", exit " + std::to_string(outcome.exitCode) + " (" +
                     outcome.result + ") " + outcome.message;
  for (const std::string &problem : outcome.problems)
    text += "\n    problem: " + problem;
  for (const std::string &left : outcome.left)
    text += "\n    left: " + left;
  return text;
}

} // namespace kxlsweep
