// A fresh demo world per case, with the current copy (KXL101) as the
// library's current installation, and readable differences against a
// snapshot taken earlier in the case.
#pragma once

#include "platform/kxlsys.h"
#include "tests/support/world_access.h"

#include <gtest/gtest.h>

#include <cstdint>
#include <string>
#include <vector>

namespace kxltest {

class DemoWorld : public ::testing::Test, public WorldAccess {
protected:
  void SetUp() override;
  void TearDown() override;

  // Copies the world aside; diff() compares against the latest snapshot.
  void snapshot();
  // The difference lines of the world against the snapshot ("" when equal).
  std::string diff();

  // KXLSIM_FAIL for the rest of the case.
  static void failCalls(const char *faults);
  static void setInstance(const char *name);

  // A string value, "<no key>" or "<no value>".
  static std::string regString(const std::string &path, const char *name);
  static std::vector<uint8_t> readFile(const std::string &windowsPath);
  static std::string readText(const std::string &windowsPath);

  const std::string &root() const { return world_; }

  static constexpr const char *kCopy = "C:\\Program Files\\ZAV\\KXL101";
  static constexpr const char *kOldCopy = "C:\\Program Files\\ZAV\\KXL95";
  static constexpr const char *kServices = "SOFTWARE\\ZAV\\KXLSIM\\Services\\";
  static constexpr const char *kInstances = "SOFTWARE\\ZAV\\KXLSIM\\Instances\\";
  static constexpr const char *kRemote = "SOFTWARE\\ZAV\\KXLSIM\\Machines\\WINSRV2\\";

private:
  std::string base_, world_, before_;
  int snapshots_ = 0;
};

uint32_t checksumOf(const std::vector<uint8_t> &image);
uint32_t le32(const std::vector<uint8_t> &image, size_t offset);
uint16_t le16(const std::vector<uint8_t> &image, size_t offset);

} // namespace kxltest
