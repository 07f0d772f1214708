// The sweep's table: per scenario, the points grouped by what a failure (or a
// kill) there leaves, in Markdown.
#include "tests/sweep/sweep_world.h"

#include <fstream>
#include <map>
#include <tuple>

namespace kxlsweep {

namespace {

constexpr std::size_t kShownDifferences = 8;

struct Group {
  std::map<std::string, std::vector<unsigned long>> calls; // function -> call numbers
  int count = 0;
};

// "1-4, 7" for the call numbers 1, 2, 3, 4, 7.
std::string ranges(const std::vector<unsigned long> &calls) {
  std::string text;
  for (std::size_t i = 0; i < calls.size();) {
    std::size_t j = i;
    while (j + 1 < calls.size() && calls[j + 1] == calls[j] + 1)
      ++j;
    text += (text.empty() ? "" : ", ") + std::to_string(calls[i]);
    if (j > i)
      text += "-" + std::to_string(calls[j]);
    i = j + 1;
  }
  return text;
}

std::string cell(std::string text) {
  std::string escaped;
  for (char c : text)
    escaped += c == '|' ? std::string("\\|") : std::string(1, c);
  return escaped;
}

std::string pointsCell(const Group &group) {
  std::string text;
  for (const auto &[name, calls] : group.calls)
    text += (text.empty() ? "" : "; ") + ("`" + name + "` " + ranges(calls));
  return cell(text);
}

std::string leftCell(const PointOutcome &outcome) {
  std::string text;
  for (std::size_t i = 0; i < outcome.left.size() && i < kShownDifferences; ++i)
    text += (i == 0 ? "" : "<br>") + cell(outcome.left[i]);
  if (outcome.left.size() > kShownDifferences)
    text += "<br>and " + std::to_string(outcome.left.size() - kShownDifferences) + " more";
  for (const std::string &problem : outcome.problems)
    text += (text.empty() ? "" : "<br>") + ("**" + cell(problem) + "**");
  return text.empty() ? "nothing" : text;
}

// Points whose runs end alike and leave the same, together.
using GroupKey = std::tuple<std::string, std::string, std::string>;

} // namespace

bool writeTable(const std::string &path, bool kill, const std::vector<PointOutcome> &outcomes) {
  std::ofstream out(path);
  std::map<std::string, std::map<GroupKey, std::pair<Group, const PointOutcome *>>> byScenario;
  std::vector<std::string> order;
  for (const PointOutcome &outcome : outcomes) {
    if (byScenario.find(outcome.scenario) == byScenario.end())
      order.push_back(outcome.scenario);
    std::string how =
        kill ? outcome.kind : outcome.kind + " | " + cell(outcome.result + " " + outcome.message);
    GroupKey key{how, leftCell(outcome),
                 outcome.rerunNeeded ? (outcome.rerunSucceeded ? "yes" : "**no**") : "-"};
    auto &entry = byScenario[outcome.scenario][key];
    entry.first.calls[outcome.point.name].push_back(outcome.point.call);
    ++entry.first.count;
    entry.second = &outcome;
  }
  for (const std::string &scenario : order) {
    out << "\n### " << scenario << "\n\n";
    out << (kill ? "| Killed at | Points | Outcome | Left behind | Rerun succeeded |\n|---|---|---|---|---|\n"
                 : "| Failing call | Points | Outcome | Result and message | Left behind | Rerun succeeded "
                   "|\n|---|---|---|---|---|---|\n");
    for (const auto &[key, entry] : byScenario[scenario])
      out << "| " << pointsCell(entry.first) << " | " << entry.first.count << " | " << std::get<0>(key)
          << " | " << std::get<1>(key) << " | " << std::get<2>(key) << " |\n";
  }
  return bool(out);
}

} // namespace kxlsweep
