// KXLSIM_FAIL, KXLSIM_KILL, KXLSIM_COUNT: which calls fail, where the process
// is killed, and how often each function was called.
#include "sim/common/simfail.h"

#include <atomic>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <map>
#include <mutex>
#include <set>
#include <string>

#ifdef _WIN32
#include <windows.h>
#endif

namespace kxlsim {

namespace {

using CallPlan = std::map<std::string, std::set<unsigned long>, std::less<>>; // name -> call numbers

constexpr const char *kOwnSettings[] = {"KXLSIM_FAIL", "KXLSIM_KILL", "KXLSIM_COUNT"};

struct FaultPlan {
  bool loaded = false;
  bool counting = false;
  CallPlan failing;
  CallPlan killing;
  std::string countFile;
  std::map<std::string, unsigned long, std::less<>> calls;
};

std::mutex planMutex;
// Never destroyed: registry files written back while the process exits still
// pass their kill points.
FaultPlan &thePlan() {
  static FaultPlan *plan = new FaultPlan;
  return *plan;
}
std::atomic<bool> inactive{false}; // loaded, and nothing to fail, kill or count
thread_local int serviceDepth = 0; // inside a simulated service's entry point

// One "name:n" entry; malformed entries (no name, n not a positive number) are ignored.
void addEntry(const std::string &entry, CallPlan &into) {
  size_t colon = entry.rfind(':');
  if (colon == std::string::npos || colon == 0 || colon + 1 >= entry.size())
    return;
  std::string count = entry.substr(colon + 1);
  if (count.find_first_not_of("0123456789") != std::string::npos || count.size() > 9)
    return;
  unsigned long n = std::strtoul(count.c_str(), nullptr, 10);
  if (n > 0)
    into[entry.substr(0, colon)].insert(n);
}

void readCallPlan(const char *variable, CallPlan &into) {
  const char *env = std::getenv(variable);
  if (env == nullptr)
    return;
  std::string text = env;
  size_t start = 0;
  while (start <= text.size()) {
    size_t comma = text.find(',', start);
    if (comma == std::string::npos)
      comma = text.size();
    addEntry(text.substr(start, comma - start), into);
    start = comma + 1;
  }
}

std::string variableText(const char *variable) {
  const char *value = std::getenv(variable);
  return value != nullptr ? value : "";
}

void writeCounts() {
  std::lock_guard<std::mutex> lock(planMutex);
  if (thePlan().countFile.empty())
    return;
  std::FILE *file = std::fopen(thePlan().countFile.c_str(), "w");
  if (file == nullptr)
    return;
  for (const auto &[name, count] : thePlan().calls)
    std::fprintf(file, "%s %lu\n", name.c_str(), count);
  std::fclose(file);
}

// Programs started by this process inherit its environment block; on a POSIX
// host the simulated CreateProcessA leaves these settings out, on Windows they
// are taken out of the block (the C run time's copy, which resetFaults reads,
// keeps them).
void keepSettingsFromChildren() {
#ifdef _WIN32
  for (const char *name : kOwnSettings)
    SetEnvironmentVariableA(name, nullptr);
#endif
}

void loadPlan(FaultPlan &into) {
  into = FaultPlan{};
  into.loaded = true;
  readCallPlan("KXLSIM_FAIL", into.failing);
  readCallPlan("KXLSIM_KILL", into.killing);
  into.countFile = variableText("KXLSIM_COUNT");
  into.counting = !into.failing.empty() || !into.killing.empty() || !into.countFile.empty();
  if (!into.countFile.empty()) {
    static bool registered = false;
    if (!registered)
      registered = std::atexit(writeCounts) == 0;
  }
  keepSettingsFromChildren();
  inactive = !into.counting;
}

bool planned(const CallPlan &calls, const char *name, unsigned long call) {
  auto it = calls.find(std::string_view(name));
  return it != calls.end() && it->second.count(call) != 0;
}

struct CallFate {
  bool fail = false;
  bool kill = false;
};

// Counts the call and tells whether it is to fail or to be killed.
CallFate countCall(const char *name, bool hook) {
  if (inactive || name == nullptr || (serviceDepth > 0 && !hook))
    return {};
  std::lock_guard<std::mutex> lock(planMutex);
  if (!thePlan().loaded)
    loadPlan(thePlan());
  if (!thePlan().counting)
    return {};
  unsigned long call = ++thePlan().calls[name];
  return {planned(thePlan().failing, name, call), planned(thePlan().killing, name, call)};
}

} // namespace

void killNow() {
  std::_Exit(kKilledExitCode);
}

bool shouldFail(const char *functionName) {
  CallFate fate = countCall(functionName, false);
  if (fate.kill)
    killNow();
  return fate.fail;
}

void killPoint(const char *hookName) {
  if (countCall(hookName, true).kill)
    killNow();
}

bool killDue(const char *hookName) {
  return countCall(hookName, true).kill;
}

ServiceCall::ServiceCall(const char *entryPoint) : failing_(shouldFail(entryPoint)) {
  ++serviceDepth;
}

ServiceCall::~ServiceCall() {
  --serviceDepth;
}

void resetFaults() {
  std::lock_guard<std::mutex> lock(planMutex);
  loadPlan(thePlan());
}

bool isOwnProcessSetting(const char *entry) {
  for (const char *name : kOwnSettings) {
    std::size_t length = std::strlen(name);
    if (std::strncmp(entry, name, length) == 0 && entry[length] == '=')
      return true;
  }
  return false;
}

} // namespace kxlsim
