// Named worlds that `kxlsim create --scenario NAME` builds. A scenario is a
// builder function over the parts of scenario_parts.h; add one by appending a
// row to the table in scenarios.cpp.
#pragma once

#include "sim/kxlsim/scenario_parts.h"

#include <string>
#include <vector>

namespace kxlsim {

struct Scenario {
  const char *name;
  const char *summary;
  void (*build)(WorldWriter &w, const InstallSources &sources);
};

const std::vector<Scenario> &scenarios();
const Scenario *findScenario(const std::string &name);

// The pieces every world has: the local machine's identity and host names,
// the system folders, the services file.
void addMachineBase(WorldWriter &w);

// Creates the world `hostDir` with the scenario. Returns false with the
// problems in `errors`.
bool createWorld(const std::string &hostDir, const std::string &scenarioName, const InstallSources &sources,
                 std::vector<std::string> &errors);

} // namespace kxlsim
