#include "world_fixture.h"

#include "sim/common/simfail.h"
#include "sim/posix/world.h"

#include <cstdlib>
#include <fstream>
#include <sstream>
#include <sys/stat.h>
#include <unistd.h>

namespace kxlposixtest {

void WorldTest::SetUp() {
  char cwd[4096];
  ASSERT_NE(getcwd(cwd, sizeof cwd), nullptr);
  startCwd_ = cwd;
  root_ = world_.root();
  ASSERT_FALSE(root_.empty());
  unsetenv("TMP");
  unsetenv("TEMP");
  world_.enter();
}

void WorldTest::TearDown() {
  ASSERT_EQ(chdir(startCwd_.c_str()), 0);
}

void WorldTest::makeDir(const std::string &relative) const {
  std::string path = root_;
  std::stringstream parts(relative);
  std::string part;
  while (std::getline(parts, part, '/')) {
    path += "/" + part;
    mkdir(path.c_str(), 0777);
  }
}

void WorldTest::makeFile(const std::string &relative, const std::string &content) const {
  auto slash = relative.rfind('/');
  if (slash != std::string::npos)
    makeDir(relative.substr(0, slash));
  std::ofstream(host(relative), std::ios::binary) << content;
}

std::string WorldTest::readFile(const std::string &hostFile) const {
  std::ifstream in(hostFile, std::ios::binary);
  std::stringstream text;
  text << in.rdbuf();
  return text.str();
}

bool WorldTest::exists(const std::string &relative) const {
  struct stat info {};
  return lstat(host(relative).c_str(), &info) == 0;
}

void WorldTest::setMachineString(const char *key, const char *name, const std::string &value) const {
  HKEY opened = nullptr;
  ASSERT_EQ(
      RegCreateKeyExA(HKEY_LOCAL_MACHINE, key, 0, nullptr, 0, KEY_ALL_ACCESS, nullptr, &opened, nullptr),
      ERROR_SUCCESS);
  ASSERT_EQ(RegSetValueExA(opened, name, 0, REG_SZ, reinterpret_cast<const BYTE *>(value.c_str()),
                           static_cast<DWORD>(value.size() + 1)),
            ERROR_SUCCESS);
  RegCloseKey(opened);
}

void WorldTest::setMachineDword(const char *key, const char *name, DWORD value) const {
  HKEY opened = nullptr;
  ASSERT_EQ(
      RegCreateKeyExA(HKEY_LOCAL_MACHINE, key, 0, nullptr, 0, KEY_ALL_ACCESS, nullptr, &opened, nullptr),
      ERROR_SUCCESS);
  ASSERT_EQ(RegSetValueExA(opened, name, 0, REG_DWORD, reinterpret_cast<const BYTE *>(&value), sizeof value),
            ERROR_SUCCESS);
  RegCloseKey(opened);
}

} // namespace kxlposixtest
