// Every case gets a world of its own: a temporary directory with an empty
// machine registry and drive C:, selected through KXLSIM_ROOT.
#pragma once

#include "platform/win32.h"
#include "tests/support/temp_world.h"

#include <gtest/gtest.h>

#include <string>

namespace kxlposixtest {

class WorldTest : public ::testing::Test {
protected:
  void SetUp() override;
  void TearDown() override;

  // Host path of `relative` inside the world ("drive_c/A/b").
  std::string host(const std::string &relative) const { return root_ + "/" + relative; }
  void makeDir(const std::string &relative) const;
  void makeFile(const std::string &relative, const std::string &content = "") const;
  std::string readFile(const std::string &hostFile) const;
  bool exists(const std::string &relative) const;
  // A string value in HKLM, creating the key.
  void setMachineString(const char *key, const char *name, const std::string &value) const;
  void setMachineDword(const char *key, const char *name, DWORD value) const;

private:
  kxltestsupport::TempWorld world_{"kxlposix"};

protected:
  std::string root_;

private:
  std::string startCwd_;
};

} // namespace kxlposixtest
