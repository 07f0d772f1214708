// KXLSIM_FAIL: which calls of which platform functions are made to fail.
#include "sim/common/simfail.h"

#include <cstdlib>
#include <map>
#include <mutex>
#include <set>
#include <string>

namespace kxlsim {

namespace {

struct FaultPlan {
  bool loaded = false;
  std::map<std::string, std::set<unsigned long>, std::less<>> failing; // name -> call numbers
  std::map<std::string, unsigned long, std::less<>> calls;
};

std::mutex planMutex;
FaultPlan plan;

// One "name:n" entry; malformed entries (no name, n not a positive number) are ignored.
void addEntry(const std::string &entry, FaultPlan &into) {
  size_t colon = entry.rfind(':');
  if (colon == std::string::npos || colon == 0 || colon + 1 >= entry.size())
    return;
  std::string count = entry.substr(colon + 1);
  if (count.find_first_not_of("0123456789") != std::string::npos || count.size() > 9)
    return;
  unsigned long n = std::strtoul(count.c_str(), nullptr, 10);
  if (n > 0)
    into.failing[entry.substr(0, colon)].insert(n);
}

void loadPlan(FaultPlan &into) {
  into = FaultPlan{};
  into.loaded = true;
  const char *env = std::getenv("KXLSIM_FAIL");
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

} // namespace

bool shouldFail(const char *functionName) {
  if (functionName == nullptr)
    return false;
  std::lock_guard<std::mutex> lock(planMutex);
  if (!plan.loaded)
    loadPlan(plan);
  if (plan.failing.empty())
    return false;
  unsigned long call = ++plan.calls[functionName];
  auto it = plan.failing.find(std::string_view(functionName));
  return it != plan.failing.end() && it->second.count(call) != 0;
}

void resetFaults() {
  std::lock_guard<std::mutex> lock(planMutex);
  loadPlan(plan);
}

} // namespace kxlsim
