// Temporary worlds for the kxlsim tests.
#pragma once

#include "sim/kxlsim/scenarios.h"

#include <gtest/gtest.h>

#include <string>

namespace kxlsim::test {

// The build's tools program and catalogs.
InstallSources buildSources();

// A fresh temporary directory, removed with the fixture.
class TempDirTest : public ::testing::Test {
protected:
  void SetUp() override;
  void TearDown() override;
  // A path inside the temporary directory (not created).
  std::string path(const std::string &name) const { return base_ + "/" + name; }
  // Builds the scenario into path(name) and makes it this process's world.
  std::string makeWorld(const std::string &name, const std::string &scenario);

private:
  std::string base_;
};

std::string readHostFile(const std::string &path);

// One demo world shared by the tests of this process (building one takes a
// while); tests that change a world work on a snapshot of it.
const std::string &sharedDemoWorld();

} // namespace kxlsim::test
