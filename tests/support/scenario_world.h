// Worlds built by kxlsim from a named scenario with the build's tools program
// and message catalogs (no command installed). Building one takes a while, so
// each scenario is built once per test program and removed at its end; cases
// read it where it is, or change a copy of their own
// (TempWorld(stem, CopyOf{scenarioWorld(...)})).
#pragma once

#include "sim/kxlsim/scenario_parts.h"

#include <string>

namespace kxltestsupport {

// The host folder of the scenario's world; "" (with the reasons reported as
// failures of the current case) when it cannot be built.
const std::string &scenarioWorld(const std::string &scenario);

// The build's tools program and catalogs, as scenario worlds are built with.
kxlsim::InstallSources buildSources();

} // namespace kxltestsupport
