#include "world_fixture.h"
#include "tests/support/temp_world.h"

#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <iterator>

namespace kxlsim::test {

InstallSources buildSources() {
  InstallSources sources;
  sources.toolsPath = KXLSIM_TEST_TOOLS;
  sources.messageDir = KXLSIM_TEST_MESSAGES;
  return sources;
}

void TempDirTest::SetUp() {
  base_ = kxltestsupport::newTempDir("kxlsim-test");
  ASSERT_FALSE(base_.empty());
}

void TempDirTest::TearDown() {
  std::error_code ec;
  std::filesystem::remove_all(base_, ec);
}

std::string TempDirTest::makeWorld(const std::string &name, const std::string &scenario) {
  std::vector<std::string> errors;
  bool ok = createWorld(path(name), scenario, buildSources(), errors);
  EXPECT_TRUE(ok);
  for (const std::string &error : errors)
    ADD_FAILURE() << error;
  return path(name);
}

namespace {

class SharedWorldCleanup : public ::testing::Environment {
public:
  void TearDown() override {
    if (!base.empty()) {
      std::error_code ec;
      std::filesystem::remove_all(base, ec);
    }
  }
  std::string base;
};

SharedWorldCleanup *cleanup =
    static_cast<SharedWorldCleanup *>(::testing::AddGlobalTestEnvironment(new SharedWorldCleanup));

} // namespace

const std::string &sharedDemoWorld() {
  static const std::string world = [] {
    std::string pattern = kxltestsupport::newTempDir("kxlsim-demo");
    if (pattern.empty())
      return std::string();
    cleanup->base = pattern;
    std::vector<std::string> errors;
    if (!createWorld(pattern + "/demo", "demo", buildSources(), errors)) {
      for (const std::string &e : errors)
        ADD_FAILURE() << e;
      return std::string();
    }
    return pattern + "/demo";
  }();
  std::string error;
  EXPECT_FALSE(world.empty()) << "the demo world cannot be built";
  EXPECT_TRUE(selectWorld(world, error)) << error;
  return world;
}

std::string readHostFile(const std::string &path) {
  std::ifstream in(path, std::ios::binary);
  return std::string((std::istreambuf_iterator<char>(in)), std::istreambuf_iterator<char>());
}

} // namespace kxlsim::test
