#include "demo_world.h"

#include "sim/common/simfail.h"
#include "sim/kxlsim/diff.h"
#include "sim/kxlsim/scenarios.h"
#include "sim/kxlsim/snapshot.h"
#include "sim/kxlsim/world_writer.h"
#include "sim/posix/world.h"
#include "sim/product/state.h"

#include <cstdlib>
#include <filesystem>
#include <sstream>

namespace kxltest {

namespace {

std::string makeTempDir() {
  std::string pattern = (std::filesystem::temp_directory_path() / "kxlprod-d-XXXXXX").string();
  return mkdtemp(pattern.data()) != nullptr ? pattern : std::string();
}

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
    base_ = makeTempDir();
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
  base_ = makeTempDir();
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
  HKEY key = nullptr;
  if (RegOpenKeyExA(HKEY_LOCAL_MACHINE, path.c_str(), 0, KEY_QUERY_VALUE, &key) != ERROR_SUCCESS)
    return "<no key>";
  char data[1024] = {};
  DWORD size = sizeof data - 1;
  LONG rc = RegQueryValueExA(key, name, nullptr, nullptr, reinterpret_cast<BYTE *>(data), &size);
  RegCloseKey(key);
  return rc == ERROR_SUCCESS ? std::string(data) : "<no value>";
}

DWORD DemoWorld::regDword(const std::string &path, const char *name) {
  HKEY key = nullptr;
  if (RegOpenKeyExA(HKEY_LOCAL_MACHINE, path.c_str(), 0, KEY_QUERY_VALUE, &key) != ERROR_SUCCESS)
    return 0xDEADu;
  DWORD value = 0xDEADu, size = sizeof value;
  RegQueryValueExA(key, name, nullptr, nullptr, reinterpret_cast<BYTE *>(&value), &size);
  RegCloseKey(key);
  return value;
}

bool DemoWorld::keyExists(const std::string &path) {
  HKEY key = nullptr;
  if (RegOpenKeyExA(HKEY_LOCAL_MACHINE, path.c_str(), 0, KEY_QUERY_VALUE, &key) != ERROR_SUCCESS)
    return false;
  RegCloseKey(key);
  return true;
}

void DemoWorld::setDword(const std::string &path, const char *name, DWORD value) {
  HKEY key = nullptr;
  ASSERT_EQ(ERROR_SUCCESS, RegCreateKeyExA(HKEY_LOCAL_MACHINE, path.c_str(), 0, nullptr, 0, KEY_ALL_ACCESS,
                                           nullptr, &key, nullptr));
  RegSetValueExA(key, name, 0, REG_DWORD, reinterpret_cast<const BYTE *>(&value), sizeof value);
  RegCloseKey(key);
}

void DemoWorld::setString(const std::string &path, const char *name, const std::string &value) {
  HKEY key = nullptr;
  ASSERT_EQ(ERROR_SUCCESS, RegCreateKeyExA(HKEY_LOCAL_MACHINE, path.c_str(), 0, nullptr, 0, KEY_ALL_ACCESS,
                                           nullptr, &key, nullptr));
  RegSetValueExA(key, name, 0, REG_SZ, reinterpret_cast<const BYTE *>(value.c_str()),
                 DWORD(value.size() + 1));
  RegCloseKey(key);
}

std::vector<uint8_t> DemoWorld::readFile(const std::string &windowsPath) {
  std::vector<uint8_t> data;
  HANDLE file = CreateFileA(windowsPath.c_str(), GENERIC_READ, FILE_SHARE_READ, nullptr, OPEN_EXISTING,
                            FILE_ATTRIBUTE_NORMAL, nullptr);
  if (file == INVALID_HANDLE_VALUE)
    return data;
  uint8_t chunk[4096];
  DWORD got = 0;
  while (ReadFile(file, chunk, sizeof chunk, &got, nullptr) && got > 0)
    data.insert(data.end(), chunk, chunk + got);
  CloseHandle(file);
  return data;
}

void DemoWorld::writeFile(const std::string &windowsPath, const std::vector<uint8_t> &data) {
  HANDLE file = CreateFileA(windowsPath.c_str(), GENERIC_WRITE, 0, nullptr, CREATE_ALWAYS,
                            FILE_ATTRIBUTE_NORMAL, nullptr);
  ASSERT_NE(file, INVALID_HANDLE_VALUE) << windowsPath;
  DWORD written = 0;
  WriteFile(file, data.data(), DWORD(data.size()), &written, nullptr);
  CloseHandle(file);
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
