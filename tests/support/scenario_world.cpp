#include "tests/support/scenario_world.h"

#include "sim/kxlsim/scenarios.h"
#include "tests/support/temp_world.h"

#include <gtest/gtest.h>

#include <unistd.h>

#include <map>

namespace kxltestsupport {

namespace {

// The built worlds, removed when the program ends; a child forked by a case
// that ends through exit() leaves them to its parent.
struct Built {
  ~Built() {
    std::error_code ignored;
    if (getpid() == owner && !base.empty())
      std::filesystem::remove_all(base, ignored);
  }
  pid_t owner = getpid();
  std::string base = newTempDir("kxlscenarios");
  std::map<std::string, std::string> worlds;
};

} // namespace

kxlsim::InstallSources buildSources() {
  kxlsim::InstallSources sources;
  sources.toolsPath = KXL_TEST_TOOLS;
  sources.messageDir = KXL_TEST_MESSAGES;
  return sources;
}

const std::string &scenarioWorld(const std::string &scenario) {
  static Built built;
  auto found = built.worlds.find(scenario);
  if (found != built.worlds.end())
    return found->second;
  std::string &world = built.worlds[scenario];
  std::vector<std::string> errors;
  if (!built.base.empty() &&
      kxlsim::createWorld(built.base + "/" + scenario, scenario, buildSources(), errors))
    world = built.base + "/" + scenario;
  for (const std::string &error : errors)
    ADD_FAILURE() << error;
  EXPECT_FALSE(world.empty()) << "the " << scenario << " world cannot be built";
  return world;
}

} // namespace kxltestsupport
