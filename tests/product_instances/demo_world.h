// A copy of the demo world per case, with the current copy (KXL101) as the
// library's current installation, and readable differences against a
// snapshot taken earlier in the case.
#pragma once

#include "sim/kxlsim/diff.h"
#include "sim/kxlsim/snapshot.h"
#include "tests/support/product_world.h"
#include "tests/support/scenario_world.h"

#include <cstdint>
#include <sstream>
#include <string>
#include <vector>

namespace kxltest {

class DemoWorld : public ProductWorld {
protected:
  DemoWorld() : ProductWorld(kxltestsupport::CopyOf{kxltestsupport::scenarioWorld("demo")}) {}
  void SetUp() override {
    ProductWorld::SetUp();
    ASSERT_EQ(0, sqloSwitchToInstallationName("KXL101"));
  }

  // Copies the world aside; diff() compares against the latest snapshot.
  void snapshot() {
    before_ = world_.scratch("snapshot" + std::to_string(++snapshots_));
    std::string error;
    ASSERT_TRUE(kxlsim::snapshotWorld(worldRoot(), before_, error)) << error;
  }
  // The difference lines of the world against the snapshot ("" when equal).
  std::string diff() const {
    std::ostringstream out;
    kxlsim::diffWorlds(before_, worldRoot(), out);
    return out.str();
  }

  static void setInstance(const char *name) { setProcessVariable("KXLINSTANCE", name); }
  // A string value, "<no key>" or "<no value>".
  static std::string regString(const std::string &path, const char *name) {
    return regStringOr(path, name, "<no key>", "<no value>");
  }
  static std::vector<uint8_t> readFile(const std::string &windowsPath) {
    std::vector<uint8_t> data;
    readWholeFile(windowsPath, data);
    return data;
  }

  inline static const std::string kCopy = "C:\\Program Files\\ZAV\\KXL101";
  inline static const std::string kOldCopy = "C:\\Program Files\\ZAV\\KXL95";
  inline static const std::string kServices = "SOFTWARE\\ZAV\\KXLSIM\\Services\\";
  inline static const std::string kRemote = "SOFTWARE\\ZAV\\KXLSIM\\Machines\\WINSRV2\\";

private:
  std::string before_;
  int snapshots_ = 0;
};

} // namespace kxltest
