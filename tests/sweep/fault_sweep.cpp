// The fault sweep and the kill sweep of the installed command.
//
// For each scenario a clean upgrade is run once in a fresh world, counting
// how often each platform function and hook is called. Then, in a fresh copy
// of the world before the upgrade, the same command is run once per point:
// with that one call failing (KXLSIM_FAIL), or killed at that trace line or
// registry write (KXLSIM_KILL). Every run is checked against what the command
// promises, and the same command is then run again without any fault: it must
// leave the world of the clean upgrade. The last line gives the figures.
#include "sim/common/simfail.h"
#include "tests/support/command_run.h"
#include "tests/support/temp_world.h"

#include <algorithm>
#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <iostream>
#include <map>
#include <sstream>
#include <string>
#include <tuple>
#include <vector>

namespace {

namespace fs = std::filesystem;
using kxltestsupport::readHostFile;

constexpr int kRunTimeoutSeconds = 120;
constexpr const char *kCommand = "drive_c/Program Files/ZAV/KXL101/bin/kxliupgrade.exe";

struct Options {
  bool kill = false, verbose = false;
  bool safetyOnly = false; // the exit status speaks only of unsafe runs
  std::size_t sample = 0;  // points per scenario, 0 for all
  std::vector<std::string> scenarios;
  std::string table; // where the table of outcomes is written ("" none)
  // The command installed into each world, and kxlsim (which takes the tools
  // program from beside itself when it is there).
  std::string command = KXL_COMMAND, kxlsim = KXL_KXLSIM;
} options;

bool parseOptions(int argc, char **argv) {
  const std::map<std::string, bool *> flags = {
      {"--kill", &options.kill}, {"--verbose", &options.verbose}, {"--safety-only", &options.safetyOnly}};
  const std::map<std::string, std::string *> values = {
      {"--table", &options.table}, {"--command", &options.command}, {"--kxlsim", &options.kxlsim}};
  for (int i = 1; i < argc; ++i) {
    std::string arg = argv[i];
    bool hasValue = i + 1 < argc;
    if (flags.count(arg) != 0)
      *flags.at(arg) = true;
    else if (values.count(arg) != 0 && hasValue)
      *values.at(arg) = argv[++i];
    else if (arg == "--sample" && hasValue)
      options.sample = std::strtoul(argv[++i], nullptr, 10);
    else if (arg == "--scenario" && hasValue)
      options.scenarios.push_back(argv[++i]);
    else
      return false;
  }
  return true;
}

// The sweep's own temporary folder, removed with it.
struct Scratch {
  std::string path = kxltestsupport::newTempDir("kxlsweep");
  int files = 0;
  ~Scratch() {
    std::error_code ignored;
    if (!path.empty())
      fs::remove_all(path, ignored);
  }
  std::string file(const std::string &stem) { return path + "/" + stem + std::to_string(++files); }
};
Scratch *scratch;

struct Scenario {
  std::string name;
  std::string worldScenario; // the kxlsim scenario its world is built from
  std::vector<std::string> args;
};

// The end-to-end scenarios; those of worlds this build of kxlsim cannot make are left out.
const Scenario kScenarios[] = {
    {"single", "demo", {"INST1"}},
    {"in-place", "demo", {"-p", "C:\\Program Files\\ZAV\\KXL95", "INST1"}},
    {"version-8", "demo", {"V8INST"}},
    {"partitioned", "demo", {"-u", "KXLADMIN,secret", "INST2"}},
    {"forcecn", "demo", {"-forcecn", "-u", "KXLADMIN,secret", "INST2"}},
    {"cluster-single", "cluster", {"CINST1"}},
    {"cluster-partitioned", "cluster", {"-u", "kxlsvc,Secret1", "CINST2"}},
};

// Files that every run writes or may write whatever happens: the event log,
// the diagnostic log and the database check's own log files.
constexpr const char *kLogFiles[] = {"events.jsonl", "kxldiag.log", "C:\\upgrade.log", "C:\\KXLDBMIG.TXT"};

// What a run that exits 0 may leave besides the world of a clean upgrade:
// the failures the command ignores on purpose, each listed with why in
// docs/fault-sweep.md. A difference is one of them when it is a file the
// clean upgrade does not have, whose path holds `folder` and ends with `end`.
constexpr struct {
  const char *folder, *end;
} kIgnoredLeftovers[] = {
    {"\\", "\\kxlnodes.cfg.mig"},    // the saved nodes file could not be deleted
    {"\\CFG\\kxliupgrade-", ".run"}, // the run record could not be removed after the success
};

bool isIgnoredLeftover(const std::string &difference) {
  if (difference.rfind("file + ", 0) != 0)
    return false;
  std::string path = difference.substr(7, difference.find(" (") - 7);
  return std::any_of(std::begin(kIgnoredLeftovers), std::end(kIgnoredLeftovers), [&](const auto &ignored) {
    return path.find(ignored.folder) != std::string::npos && path.ends_with(ignored.end);
  });
}

bool onlyIgnoredLeftovers(const std::vector<std::string> &differences) {
  return std::all_of(differences.begin(), differences.end(), isIgnoredLeftover);
}

struct Run {
  int exitCode = 0;
  std::string out, err, trace;
};

Run runProgram(const std::string &program, const std::vector<std::string> &args,
               const std::vector<std::string> &settings, const std::string &cwd) {
  kxltestsupport::CommandRun command{
      program, args, settings, cwd, scratch->file("out"), scratch->file("err"), kRunTimeoutSeconds};
  Run run{kxltestsupport::runCommand(command), readHostFile(command.outFile), readHostFile(command.errFile),
          ""};
  fs::remove(command.outFile);
  fs::remove(command.errFile);
  return run;
}

Run runKxlsim(const std::vector<std::string> &args) {
  return runProgram(options.kxlsim, args, {}, "");
}

// The command in `world`, started from the world's folder (current directory C:\).
Run upgrade(const std::string &world, const Scenario &scenario, std::vector<std::string> settings) {
  std::string trace = scratch->file("trace");
  settings.insert(settings.end(), {"KXLSIM_ROOT=" + world, "KXLTRACE=" + trace});
  Run run = runProgram(world + "/" + kCommand, scenario.args, settings, world);
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
  std::vector<fs::path> programs;
  for (auto it = fs::recursive_directory_iterator(world, failed); !failed && it != fs::end(it);
       it.increment(failed)) {
    std::string name = it->path().filename().string();
    std::transform(name.begin(), name.end(), name.begin(), ::tolower);
    if (it->is_regular_file() && name.size() > 4 && name.substr(name.size() - 4) == ".exe")
      programs.push_back(it->path());
  }
  for (std::size_t i = 0; i < programs.size() && !failed; ++i) {
    fs::path kept = fs::path(store) / std::to_string(i + 1);
    fs::rename(programs[i], kept, failed);
    if (!failed)
      fs::create_symlink(kept, programs[i], failed);
  }
  return !failed;
}

// "file + PATH (...)", "file - PATH", "file ~ PATH ..." of a log file.
bool isLogFile(const std::string &head) {
  std::string path =
      head.starts_with("file ") ? head.substr(std::min<std::size_t>(7, head.size())) + " " : "";
  return std::any_of(std::begin(kLogFiles), std::end(kLogFiles),
                     [&](const char *log) { return path.starts_with(std::string(log) + " "); });
}

struct Comparison {
  bool readable = true;
  std::vector<std::string> differences; // one head line each, logs left out
};

// The differences between two worlds, apart from logs and events.
Comparison compare(const std::string &a, const std::string &b) {
  Run diff = runKxlsim({"diff", a, b});
  Comparison result;
  result.readable = diff.exitCode == 0 || diff.exitCode == 1;
  std::istringstream lines(diff.out);
  for (std::string line; std::getline(lines, line);)
    if (!line.empty() && line[0] != ' ' && !isLogFile(line))
      result.differences.push_back(line);
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

using CallCounts = std::map<std::string, unsigned long>;

struct ScenarioWorlds {
  std::string before; // the world before the upgrade
  std::string clean;  // the world after a clean upgrade
  CallCounts counts;  // calls of the clean upgrade
};

// Builds the world before and runs the clean upgrade; false with a reason.
bool prepareScenario(const Scenario &scenario, ScenarioWorlds &worlds, std::string &problem) {
  std::string base = scratch->path + "/" + scenario.name;
  worlds.before = base + "/before";
  worlds.clean = base + "/clean";
  fs::create_directories(base);
  Run created = runKxlsim(
      {"create", worlds.before, "--scenario", scenario.worldScenario, "--command", options.command});
  if (created.exitCode != 0)
    return problem = "kxlsim create: " + created.err, false;
  if (!linkPrograms(worlds.before, base + "/programs") || !copyWorld(worlds.before, worlds.clean))
    return problem = "the world cannot be copied", false;
  std::string countFile = scratch->file("counts");
  Run clean = upgrade(worlds.clean, scenario, {"KXLSIM_COUNT=" + countFile});
  if (clean.exitCode != 0)
    return problem = "the clean upgrade fails: " + firstLine(clean.out) + firstLine(clean.err), false;
  std::istringstream lines(readHostFile(countFile));
  std::string name;
  unsigned long count = 0;
  while (lines >> name >> count)
    worlds.counts[name] = count;
  return true;
}

struct Point {
  std::string name;
  unsigned long call = 0;
};

// The two hooks are kill points; every other counted name is a platform function.
bool isHook(const std::string &name) {
  return name == "trace" || name == "hivewrite";
}

// Every point of a scenario's clean run, in a fixed order; with a sample, an
// even spread over them that keeps the first and the last.
std::vector<Point> pointsOf(const CallCounts &counts) {
  std::vector<Point> points, chosen;
  for (const auto &[name, count] : counts)
    for (unsigned long n = 1; isHook(name) == options.kill && n <= count; ++n)
      points.push_back({name, n});
  std::size_t sample = options.sample;
  if (sample == 0 || points.size() <= sample)
    return points;
  for (std::size_t i = 0; i < sample; ++i)
    chosen.push_back(points[sample == 1 ? 0 : i * (points.size() - 1) / (sample - 1)]);
  return chosen;
}

struct PointOutcome {
  std::string scenario;
  Point point;
  int exitCode = 0;
  std::string result;            // the run's full result, from its trace
  std::string message;           // the first line printed
  std::string kind;              // what the run did: completed, failed and left changed, killed, ...
  std::vector<std::string> left; // differences the run left (against the world before, or the clean one)
  std::vector<std::string> problems;
  bool unsafe = false; // a crash, a hang, a sanitizer report, no message, a damaged registry
  bool promised = false;
  bool rerunNeeded = false;
  bool rerunSucceeded = false;
};

void unsafeRun(PointOutcome &outcome, const std::string &problem) {
  outcome.problems.push_back(problem);
  outcome.unsafe = true;
}

void checkRun(const Run &run, bool killed, PointOutcome &outcome) {
  if (run.exitCode == kxltestsupport::kRunTimedOut)
    unsafeRun(outcome, "did not end");
  else if (run.exitCode == kxltestsupport::kRunNotExited)
    unsafeRun(outcome, "crashed");
  if (run.err.find("Sanitizer") != std::string::npos || run.err.find("runtime error:") != std::string::npos)
    unsafeRun(outcome, "sanitizer report: " + firstLine(run.err));
  if (!killed && outcome.message.empty())
    unsafeRun(outcome, "no message");
}

// The same command again without any fault: it must leave the world of a clean upgrade.
void rerun(const Scenario &scenario, const ScenarioWorlds &worlds, const std::string &world,
           PointOutcome &outcome) {
  outcome.rerunNeeded = true;
  Run again = upgrade(world, scenario, {});
  Comparison after = compare(worlds.clean, world);
  outcome.rerunSucceeded = again.exitCode == 0 && after.readable && after.differences.empty();
  if (!outcome.rerunSucceeded) {
    std::string text = "rerun: exit " + std::to_string(again.exitCode) + " " + firstLine(again.out);
    for (const std::string &difference : after.differences)
      text += "; " + difference;
    outcome.problems.push_back(text);
  }
}

PointOutcome tryPoint(const Scenario &scenario, const ScenarioWorlds &worlds, const Point &point) {
  bool kill = options.kill;
  PointOutcome outcome;
  outcome.scenario = scenario.name;
  outcome.point = point;
  std::string world = scratch->path + "/" + scenario.name + "/point";
  if (!copyWorld(worlds.before, world)) {
    outcome.problems.push_back("the world cannot be copied");
    return outcome;
  }
  std::string setting =
      (kill ? "KXLSIM_KILL=" : "KXLSIM_FAIL=") + point.name + ":" + std::to_string(point.call);
  Run run = upgrade(world, scenario, {setting});
  outcome.exitCode = run.exitCode;
  outcome.result = finalResult(run.trace);
  outcome.message = firstLine(run.out);
  bool killed = kill && run.exitCode == kxlsim::kKilledExitCode;
  checkRun(run, killed, outcome);
  Comparison fromBefore = compare(worlds.before, world);
  if (!fromBefore.readable) {
    outcome.kind = "registry damaged";
    unsafeRun(outcome, fromBefore.differences.back());
  } else if (killed) {
    Comparison fromClean = compare(worlds.clean, world);
    bool complete = fromClean.differences.empty();
    outcome.kind = complete ? "killed after the upgrade was complete" : "killed";
    outcome.left = complete ? fromClean.differences : fromBefore.differences;
  } else if (run.exitCode == 0) {
    outcome.left = compare(worlds.clean, world).differences;
    outcome.kind = outcome.left.empty()                 ? "completed"
                   : onlyIgnoredLeftovers(outcome.left) ? "completed, ignoring a failure"
                                                        : "completed, differs from a clean upgrade";
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
  if ((killed || run.exitCode != 0) && (!outcome.left.empty() || !fromBefore.readable))
    rerun(scenario, worlds, world, outcome);
  return outcome;
}

// One line about an outcome, for the sweep's own output.
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

// "1-4, 7" for the call numbers 1, 2, 3, 4, 7.
std::string ranges(const std::vector<unsigned long> &calls) {
  std::string text;
  for (std::size_t i = 0, j = 0; i < calls.size(); i = ++j) {
    while (j + 1 < calls.size() && calls[j + 1] == calls[j] + 1)
      ++j;
    text +=
        (text.empty() ? "" : ", ") + std::to_string(calls[i]) + (j > i ? "-" + std::to_string(calls[j]) : "");
  }
  return text;
}

std::string cell(const std::string &text) {
  std::string escaped;
  for (char c : text)
    escaped += c == '|' ? std::string("\\|") : std::string(1, c);
  return escaped;
}

std::string leftCell(const PointOutcome &outcome) {
  constexpr std::size_t kShown = 8;
  std::string text;
  for (std::size_t i = 0; i < outcome.left.size() && i < kShown; ++i)
    text += (i == 0 ? "" : "<br>") + cell(outcome.left[i]);
  if (outcome.left.size() > kShown)
    text += "<br>and " + std::to_string(outcome.left.size() - kShown) + " more";
  for (const std::string &problem : outcome.problems)
    text += (text.empty() ? "" : "<br>") + ("**" + cell(problem) + "**");
  return text.empty() ? "nothing" : text;
}

// The table, in Markdown: per scenario, the points grouped by how their runs
// end and what they leave.
bool writeTable(const std::vector<PointOutcome> &outcomes) {
  using Key = std::tuple<std::string, std::string, std::string>; // outcome, left behind, rerun
  using Calls = std::map<std::string, std::vector<unsigned long>>;
  std::map<std::string, std::map<Key, std::pair<Calls, int>>> byScenario;
  std::vector<std::string> order;
  for (const PointOutcome &outcome : outcomes) {
    if (byScenario.find(outcome.scenario) == byScenario.end())
      order.push_back(outcome.scenario);
    std::string how =
        options.kill ? outcome.kind : outcome.kind + " | " + cell(outcome.result + " " + outcome.message);
    Key key{how, leftCell(outcome), outcome.rerunNeeded ? (outcome.rerunSucceeded ? "yes" : "**no**") : "-"};
    auto &group = byScenario[outcome.scenario][key];
    group.first[outcome.point.name].push_back(outcome.point.call);
    ++group.second;
  }
  std::ofstream out(options.table);
  for (const std::string &scenario : order) {
    out << "\n### " << scenario << "\n\n"
        << (options.kill
                ? "| Killed at | Points | Outcome | Left behind | Rerun succeeded |\n|---|---|---|---|---|\n"
                : "| Failing call | Points | Outcome | Result and message | Left behind | Rerun succeeded "
                  "|\n|---|---|---|---|---|---|\n");
    for (const auto &[key, group] : byScenario[scenario]) {
      std::string points;
      for (const auto &[name, calls] : group.first)
        points += (points.empty() ? "" : "; ") + ("`" + name + "` " + ranges(calls));
      out << "| " << cell(points) << " | " << group.second << " | " << std::get<0>(key) << " | "
          << std::get<1>(key) << " | " << std::get<2>(key) << " |\n";
    }
  }
  return bool(out);
}

} // namespace

int main(int argc, char **argv) {
  if (!parseOptions(argc, argv)) {
    std::cerr << "usage: kxl_fault_sweep [--kill] [--sample N] [--scenario NAME]... [--table FILE] "
                 "[--verbose] [--safety-only] [--command PATH] [--kxlsim PATH]\n";
    return 2;
  }
  Scratch dir;
  scratch = &dir;
  if (dir.path.empty()) {
    std::cerr << "kxl_fault_sweep: no temporary folder\n";
    return 2;
  }
  std::string known = runKxlsim({"scenarios"}).out;
  int scenarios = 0, problems = 0;
  std::vector<PointOutcome> outcomes;
  for (const Scenario &scenario : kScenarios) {
    const std::vector<std::string> &only = options.scenarios;
    if (known.find(scenario.worldScenario + " ") == std::string::npos ||
        (!only.empty() && std::find(only.begin(), only.end(), scenario.name) == only.end()))
      continue;
    ScenarioWorlds worlds;
    std::string problem;
    if (!prepareScenario(scenario, worlds, problem)) {
      std::cerr << scenario.name << ": " << problem << '\n';
      ++problems;
      continue;
    }
    ++scenarios;
    for (const Point &point : pointsOf(worlds.counts)) {
      outcomes.push_back(tryPoint(scenario, worlds, point));
      const PointOutcome &outcome = outcomes.back();
      if (!outcome.promised || (outcome.rerunNeeded && !outcome.rerunSucceeded) || options.verbose)
        std::cout << describe(outcome) << std::endl;
    }
  }
  if (!options.table.empty() && !writeTable(outcomes))
    ++problems;
  auto count = [&](auto holds) {
    return static_cast<int>(std::count_if(outcomes.begin(), outcomes.end(), holds));
  };
  int points = static_cast<int>(outcomes.size()), promised = count([](auto &o) { return o.promised; });
  int unsafe = count([](auto &o) { return o.unsafe; }), needed = count([](auto &o) { return o.rerunNeeded; });
  int succeeded = count([](auto &o) { return o.rerunNeeded && o.rerunSucceeded; });
  std::printf(
      "%s sweep: scenarios %d, points tried %d, outcomes as promised %d, unsafe runs %d, reruns needed "
      "%d, reruns that succeeded %d\n",
      options.kill ? "kill" : "fault", scenarios, points, promised, unsafe, needed, succeeded);
  bool allHeld = options.safetyOnly ? unsafe == 0 : promised == points && succeeded == needed;
  return problems == 0 && allHeld ? 0 : 1;
}
