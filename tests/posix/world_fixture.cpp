#include "world_fixture.h"

#include "sim/common/simfail.h"
#include "sim/posix/world.h"

#include <cstdlib>
#include <fstream>
#include <ftw.h>
#include <sstream>
#include <sys/stat.h>
#include <unistd.h>

namespace kxlposixtest {

namespace {

int removeEntry(const char *path, const struct stat *, int, struct FTW *) {
  return remove(path);
}

} // namespace

void WorldTest::SetUp() {
  char cwd[4096];
  ASSERT_NE(getcwd(cwd, sizeof cwd), nullptr);
  startCwd_ = cwd;
  char pattern[] = "/tmp/kxlposix.XXXXXX";
  ASSERT_NE(mkdtemp(pattern), nullptr);
  root_ = pattern;
  makeFile("system.reg", "REGEDIT4\n");
  makeDir("drive_c");
  setenv("KXLSIM_ROOT", root_.c_str(), 1);
  unsetenv("KXLSIM_FAIL");
  unsetenv("TMP");
  unsetenv("TEMP");
  kxlsim::posix::resetWorldRoot();
  kxlsim::resetFaults();
}

void WorldTest::TearDown() {
  ASSERT_EQ(chdir(startCwd_.c_str()), 0);
  nftw(root_.c_str(), removeEntry, 16, FTW_DEPTH | FTW_PHYS);
  unsetenv("KXLSIM_ROOT");
  kxlsim::posix::resetWorldRoot();
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
