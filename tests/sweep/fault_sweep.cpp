// The fault sweep and the kill sweep of the installed command.
//
// For each scenario a clean upgrade is run once in a fresh world, counting
// how often each platform function and hook is called. Then, in a fresh copy
// of the world before the upgrade, the same command is run once per point:
// with that one call failing (KXLSIM_FAIL), or killed at that trace line or
// registry write (KXLSIM_KILL). Every run is checked against what the command
// promises, and the same command is then run again without any fault: it must
// leave the world of the clean upgrade. The last line gives the figures.
#include "tests/sweep/sweep_world.h"

#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <iostream>
#include <string>
#include <vector>

namespace {

using namespace kxlsweep;

struct Options {
  bool kill = false;
  std::size_t sample = 0; // points per scenario, 0 for all
  std::vector<std::string> scenarios;
  std::string table; // where the table of outcomes is written ("" none)
  bool verbose = false;
  bool safetyOnly = false; // the exit status speaks only of unsafe runs
};

bool parseOptions(int argc, char **argv, Options &options) {
  for (int i = 1; i < argc; ++i) {
    std::string arg = argv[i];
    bool hasValue = i + 1 < argc;
    if (arg == "--kill")
      options.kill = true;
    else if (arg == "--verbose")
      options.verbose = true;
    else if (arg == "--safety-only")
      options.safetyOnly = true;
    else if (arg == "--sample" && hasValue)
      options.sample = std::strtoul(argv[++i], nullptr, 10);
    else if (arg == "--scenario" && hasValue)
      options.scenarios.push_back(argv[++i]);
    else if (arg == "--table" && hasValue)
      options.table = argv[++i];
    else if (arg == "--command" && hasValue)
      kxlsweep::programs().command = argv[++i];
    else if (arg == "--kxlsim" && hasValue)
      kxlsweep::programs().kxlsim = argv[++i];
    else
      return false;
  }
  return true;
}

// Every point of a scenario's clean run, in a fixed order; with a sample, an
// even spread over them that keeps the first and the last.
std::vector<Point> pointsOf(const CallCounts &counts, bool kill, std::size_t sample) {
  std::vector<Point> points;
  for (const auto &[name, count] : counts) {
    if (isHook(name) != kill)
      continue;
    for (unsigned long n = 1; n <= count; ++n)
      points.push_back({name, n});
  }
  if (sample == 0 || points.size() <= sample)
    return points;
  std::vector<Point> chosen;
  for (std::size_t i = 0; i < sample; ++i)
    chosen.push_back(points[sample == 1 ? 0 : i * (points.size() - 1) / (sample - 1)]);
  return chosen;
}

struct Figures {
  int scenarios = 0;
  int points = 0;
  int promised = 0;
  int rerunsNeeded = 0;
  int rerunsSucceeded = 0;
  int unsafe = 0;
};

int sweepScenario(const Scenario &scenario, const Options &options, SweepDir &dir, Figures &figures,
                  std::vector<PointOutcome> &outcomes) {
  ScenarioWorlds worlds;
  std::string problem;
  if (!prepareScenario(scenario, dir, worlds, problem)) {
    std::cerr << scenario.name << ": " << problem << '\n';
    return 1;
  }
  ++figures.scenarios;
  for (const Point &point : pointsOf(worlds.counts, options.kill, options.sample)) {
    PointOutcome outcome = tryPoint(scenario, worlds, point, options.kill, dir);
    ++figures.points;
    figures.promised += outcome.promised ? 1 : 0;
    figures.unsafe += outcome.unsafe ? 1 : 0;
    figures.rerunsNeeded += outcome.rerunNeeded ? 1 : 0;
    figures.rerunsSucceeded += outcome.rerunNeeded && outcome.rerunSucceeded ? 1 : 0;
    if (!outcome.promised || (outcome.rerunNeeded && !outcome.rerunSucceeded) || options.verbose)
      std::cout << describe(outcome) << std::endl;
    outcomes.push_back(std::move(outcome));
  }
  return 0;
}

} // namespace

int main(int argc, char **argv) {
  Options options;
  if (!parseOptions(argc, argv, options)) {
    std::cerr << "usage: kxl_fault_sweep [--kill] [--sample N] [--scenario NAME]... [--table FILE] "
                 "[--verbose] [--safety-only] [--command PATH] [--kxlsim PATH]\n";
    return 2;
  }
  SweepDir dir;
  if (!dir.ok()) {
    std::cerr << "kxl_fault_sweep: no temporary folder\n";
    return 2;
  }
  Figures figures;
  std::vector<PointOutcome> outcomes;
  int problems = 0;
  for (const Scenario &scenario : sweptScenarios(options.scenarios))
    problems += sweepScenario(scenario, options, dir, figures, outcomes);
  if (!options.table.empty() && !writeTable(options.table, options.kill, outcomes))
    ++problems;
  std::printf(
      "%s sweep: scenarios %d, points tried %d, outcomes as promised %d, unsafe runs %d, reruns needed "
      "%d, reruns that succeeded %d\n",
      options.kill ? "kill" : "fault", figures.scenarios, figures.points, figures.promised, figures.unsafe,
      figures.rerunsNeeded, figures.rerunsSucceeded);
  bool allHeld = figures.promised == figures.points && figures.rerunsSucceeded == figures.rerunsNeeded;
  if (options.safetyOnly)
    allHeld = figures.unsafe == 0;
  return problems == 0 && allHeld ? 0 : 1;
}
