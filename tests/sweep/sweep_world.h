// What the sweeps work with: the scenarios, their worlds before and after a
// clean upgrade, one point tried in a copy of the world, and its outcome.
#pragma once

#include <map>
#include <string>
#include <vector>

namespace kxlsweep {

// The programs the sweeps run: the command installed into each world, and
// kxlsim (which takes the tools program from beside itself when it is there).
struct Programs {
  std::string command = KXL_COMMAND;
  std::string kxlsim = KXL_KXLSIM;
};
Programs &programs();

struct Scenario {
  std::string name;
  std::string worldScenario; // the kxlsim scenario its world is built from
  std::vector<std::string> args;
  std::string description;
};

// The scenarios whose worlds kxlsim can build, those named in `only` (all when empty).
std::vector<Scenario> sweptScenarios(const std::vector<std::string> &only);

// The sweep's own temporary folder, removed with it.
class SweepDir {
public:
  SweepDir();
  ~SweepDir();
  SweepDir(const SweepDir &) = delete;
  SweepDir &operator=(const SweepDir &) = delete;
  bool ok() const { return !path_.empty(); }
  const std::string &path() const { return path_; }
  // A new file name in the folder.
  std::string file(const std::string &stem);

private:
  std::string path_;
  int files_ = 0;
};

using CallCounts = std::map<std::string, unsigned long>;

// The two hooks that are kill points; every other counted name is a platform function.
bool isHook(const std::string &name);

struct ScenarioWorlds {
  std::string before; // the world before the upgrade
  std::string clean;  // the world after a clean upgrade
  CallCounts counts;  // calls of the clean upgrade
};

// Builds the world before and runs the clean upgrade; false with a reason.
bool prepareScenario(const Scenario &scenario, SweepDir &dir, ScenarioWorlds &worlds, std::string &problem);

struct Point {
  std::string name;
  unsigned long call = 0;
};

struct PointOutcome {
  std::string scenario;
  Point point;
  int exitCode = 0;
  std::string result;            // the run's full result, from its trace
  std::string message;           // the first line printed
  std::string kind;              // what the run did: refused, completed, completed-ignoring, failed-left, ...
  std::vector<std::string> left; // differences the run left (against the world before, or the clean one)
  std::vector<std::string> problems;
  bool unsafe = false; // a crash, a hang, a sanitizer report, no message, a damaged registry
  bool promised = false;
  bool rerunNeeded = false;
  bool rerunSucceeded = false;
};

PointOutcome tryPoint(const Scenario &scenario, const ScenarioWorlds &worlds, const Point &point, bool kill,
                      SweepDir &dir);

// One line about an outcome, for the sweep's own output.
std::string describe(const PointOutcome &outcome);

// The table of what a failure (or a kill) at each point leaves, grouped, as Markdown.
bool writeTable(const std::string &path, bool kill, const std::vector<PointOutcome> &outcomes);

} // namespace kxlsweep
