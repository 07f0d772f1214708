// A fresh, empty world per test, removed afterwards.
#pragma once

#include "sim/common/simfail.h"
#include "sim/posix/world.h"

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
    std::string pattern = (std::filesystem::temp_directory_path() / "kxlworldXXXXXX").string();
    ASSERT_NE(mkdtemp(pattern.data()), nullptr);
    root = pattern;
    writeText(root + "/system.reg", "REGEDIT4\n\n");
    std::filesystem::create_directories(root + "/drive_c");
    setenv("KXLSIM_ROOT", root.c_str(), 1);
    unsetenv("KXLSIM_FAIL");
    posix::resetWorldRoot();
    resetFaults();
  }
  void TearDown() override {
    unsetenv("KXLSIM_ROOT");
    unsetenv("KXLSIM_FAIL");
    posix::resetWorldRoot();
    resetFaults();
    std::filesystem::remove_all(root);
  }
  std::string root;
};

} // namespace kxlsim::testing
