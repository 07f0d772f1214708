// A fresh, empty world per test, removed afterwards.
#pragma once

#include "sim/common/simfail.h"
#include "sim/posix/world.h"
#include "tests/support/temp_world.h"

#include <gtest/gtest.h>

#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <sstream>
#include <string>

namespace kxlsim::testing {

inline std::string readText(const std::string &path) {
  std::ifstream in(path, std::ios::binary);
  std::stringstream text;
  text << in.rdbuf();
  return text.str();
}

inline void writeText(const std::string &path, const std::string &text) {
  std::ofstream(path, std::ios::binary) << text;
}

class WorldTest : public ::testing::Test {
protected:
  void SetUp() override {
    ASSERT_FALSE(world_.root().empty());
    world_.enter();
  }
  kxltestsupport::TempWorld world_{"kxlworld"};
  const std::string root = world_.root();
};

} // namespace kxlsim::testing
