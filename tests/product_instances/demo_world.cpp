#include "demo_world.h"

#include "sim/common/simfail.h"
#include "sim/kxlsim/diff.h"
#include "sim/kxlsim/scenarios.h"
#include "sim/kxlsim/snapshot.h"
#include "sim/kxlsim/world_writer.h"
#include "sim/posix/world.h"
#include "sim/product/state.h"
#include "tests/support/temp_world.h"

#include <cstdlib>
#include <filesystem>
#include <sstream>

namespace kxltest {

namespace {

// Building the demo world takes a while: it is built once per process and
// every case works on a copy of it.
class DemoTemplate : public ::testing::Environment {
public:
  const std::string &world() {
    if (world_.empty() && !failed_)
      build();
    return world_;
  }
  void TearDown() override {
    std::error_code ignored;
    if (!base_.empty())
      std::filesystem::remove_all(base_, ignored);
  }

private:
  void build() {
    base_ = kxltestsupport::newTempDir("kxlprod-demo");
    kxlsim::InstallSources sources;
    sources.toolsPath = KXL_TEST_TOOLS;
    sources.messageDir = KXL_TEST_MESSAGES;
    std::vector<std::string> errors;
    failed_ = base_.empty() || !kxlsim::createWorld(base_ + "/demo", "demo", sources, errors);
    if (!failed_)
      world_ = base_ + "/demo";
  }
  std::string base_, world_;
  bool failed_ = false;
};

DemoTemplate *demoTemplate =
    static_cast<DemoTemplate *>(::testing::AddGlobalTestEnvironment(new DemoTemplate));

} // namespace

void DemoWorld::SetUp() {
  unsetenv("KXLSIM_FAIL");
  unsetenv("KXLINSTANCE");
  kxlsim::resetFaults();
  base_ = kxltestsupport::newTempDir("kxlprod-demo");
  ASSERT_FALSE(base_.empty());
  ASSERT_FALSE(demoTemplate->world().empty()) << "the demo world cannot be built";
  world_ = base_ + "/w";
  std::string error;
  ASSERT_TRUE(kxlsim::snapshotWorld(demoTemplate->world(), world_, error)) << error;
  ASSERT_TRUE(kxlsim::selectWorld(world_, error)) << error;
  kxlprod::resetLibraryState();
  ASSERT_EQ(0, sqloSwitchToInstallationName("KXL101"));
}

void DemoWorld::TearDown() {
  unsetenv("KXLSIM_FAIL");
  unsetenv("KXLINSTANCE");
  kxlsim::resetFaults();
  kxlprod::resetLibraryState();
  unsetenv("KXLSIM_ROOT");
  kxlsim::posix::resetWorldRoot();
  std::error_code ignored;
  std::filesystem::remove_all(base_, ignored);
}

void DemoWorld::snapshot() {
  before_ = base_ + "/snap" + std::to_string(++snapshots_);
  std::string error;
  ASSERT_TRUE(kxlsim::snapshotWorld(world_, before_, error)) << error;
}

std::string DemoWorld::diff() {
  std::ostringstream out;
  kxlsim::diffWorlds(before_, world_, out);
  return out.str();
}

void DemoWorld::failCalls(const char *faults) {
  setenv("KXLSIM_FAIL", faults, 1);
  kxlsim::resetFaults();
}

void DemoWorld::setInstance(const char *name) {
  if (name == nullptr)
    unsetenv("KXLINSTANCE");
  else
    setenv("KXLINSTANCE", name, 1);
}

std::string DemoWorld::regString(const std::string &path, const char *name) {
  return regStringOr(path, name, "<no key>", "<no value>");
}

std::vector<uint8_t> DemoWorld::readFile(const std::string &windowsPath) {
  std::vector<uint8_t> data;
  readWholeFile(windowsPath, data);
  return data;
}

std::string DemoWorld::readText(const std::string &windowsPath) {
  std::vector<uint8_t> data = readFile(windowsPath);
  return std::string(data.begin(), data.end());
}

uint32_t le32(const std::vector<uint8_t> &image, size_t offset) {
  return sqloLe32(image.data(), offset);
}

uint16_t le16(const std::vector<uint8_t> &image, size_t offset) {
  return sqloLe16(image.data(), offset);
}

uint32_t checksumOf(const std::vector<uint8_t> &image) {
  uint32_t sum = 0;
  for (size_t i = 4; i < image.size(); ++i)
    sum += image[i];
  return sum;
}

} // namespace kxltest
