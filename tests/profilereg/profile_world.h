// A machine with three copies (version 8, 9.1 and the current 10.1), instance
// INST1 owned by one of them, other machines of the world for partitions and
// cluster nodes, and helpers that seed and read profile keys and services.
#pragma once

#include "../install/install_world.h"
#include "NT/profilereg.h"
#include "install/installcopy.h"
#include "install/kxlinstance.h"
#include "upgrade/records.h"

#include <cstdio>
#include <memory>
#include <string>

namespace kxltest {

inline constexpr char kRoot[] = "SOFTWARE\\ZAV\\KXL";
inline constexpr char kLocal[] = ""; // the local machine
inline constexpr char kV8[] = "";    // the single-copy layout
inline constexpr char kCurrent[] = "KXL101";
inline constexpr char kOld[] = "KXL95";

class ProfileWorld : public InstallWorld {
protected:
  void SetUp() override {
    InstallWorld::SetUp();
    if (IsSkipped() || HasFatalFailure())
      return;
    for (const char *copy : {kCurrent, kOld}) {
      std::string path = std::string("C:\\") + copy;
      registerCopy(copy, path);
      setVersion(std::string(kCopies) + copy, copy == kOld ? "9" : "10", "1", "0", "0", "s");
    }
    registerV8("C:\\KXL8");
    setVersion(kRoot, "8", "2", "0", "", "s8");
    setString("SOFTWARE\\ZAV\\KXLSIM\\Identity", "ComputerName", "HOSTA");
    setString("SOFTWARE\\ZAV\\KXLSIM\\Identity", "FullHostName", "hosta.zav.test");
    ASSERT_EQ(0, sqloSwitchToInstallationName(kCurrent));
    std::snprintf(options_.instanceName, sizeof options_.instanceName, "INST1");
  }

  // The instance belongs to `copy` ("KXLV8" for the version-8 installation).
  void ownBy(const char *copy) {
    owner_ = std::make_unique<InstallCopy>(copy, false, false);
    ASSERT_EQ(0u, owner_->GetStatus()) << copy;
    instance_ = std::make_unique<IKXLINSTANCE>("INST1", owner_->name, "C:\\prof\\INST1");
    context_.copy = owner_.get();
    owner_->GetPath(context_.copyPath, sizeof context_.copyPath);
    context_.instance = instance_.get();
  }

  // Owned by `copy`, with the profile key seeded under `under` on each of `machines`.
  void ownWith(const char *copy, const char *under, std::initializer_list<const char *> machines) {
    ownBy(copy);
    for (const char *machine : machines)
      seedProfile(machine, under);
  }

  // A path of `machine`'s HKEY_LOCAL_MACHINE ("" the local machine).
  static std::string at(const std::string &machine, const std::string &path) {
    return machine.empty() ? path : "SOFTWARE\\ZAV\\KXLSIM\\Machines\\" + machine + "\\" + path;
  }

  // INST1's profile key under `copy` ("" the single-copy layout).
  static std::string profile(const std::string &copy) {
    return copy.empty() ? std::string(kRoot) + "\\PROFILES\\INST1"
                        : std::string(kRoot) + "\\InstalledCopies\\" + copy + "\\PROFILES\\INST1";
  }

  static std::string forceProfile() {
    return std::string(kRoot) + "\\FORCE_COPY_NAME\\InstalledCopies\\" + kCurrent + "\\PROFILES\\INST1";
  }

  // A profile key with a value naming the machine and a subkey with a value;
  // a machine other than the local one comes into being with it.
  static void seedProfile(const std::string &machine, const std::string &copy) {
    setString(at(machine, profile(copy)), "KXLMARK", "mark-" + machine);
    setString(at(machine, profile(copy) + "\\Node0"), "Port", "60000");
  }

  // The seeded profile sits under `copy` of `machine`, values and subkeys.
  static void expectProfileAt(const std::string &machine, const std::string &copy) {
    EXPECT_EQ("mark-" + machine, getString(at(machine, profile(copy)), "KXLMARK")) << machine << " " << copy;
    EXPECT_EQ("60000", getString(at(machine, profile(copy) + "\\Node0"), "Port")) << machine << " " << copy;
  }

  static void expectMoved(const std::string &machine, const std::string &from, const std::string &to) {
    expectProfileAt(machine, to);
    EXPECT_FALSE(keyExists(at(machine, profile(from)))) << machine << " " << from;
  }

  static void expectUntouched(const std::string &machine, const std::string &from, const std::string &to) {
    expectProfileAt(machine, from);
    EXPECT_FALSE(keyExists(at(machine, profile(to)))) << machine << " " << to;
  }

  // Nodes file lines "<node> <host> <machine> <port>"; the instance becomes partitioned.
  void loadNodes(const std::string &lines) {
    const std::string file = "C:\\prof\\INST1\\kxlnodes.cfg";
    writeFile(file, std::vector<unsigned char>(lines.begin(), lines.end()));
    uint32_t entries = 0, maxNode = 0;
    ASSERT_EQ(0,
              sqloReadKxlnodes(file.c_str(), 4, &context_.nodeList, 5, &entries, &maxNode, 1, "INST1", 1, 0));
    options_.partitionedInstance = 1;
  }

  // The instance is clustered on `cluster`, with the cluster profile's machine list.
  void clusterOn(const char *cluster, const std::string &machines) {
    setString(profile(kOld), "KXLCLUSTER", cluster);
    setString("Cluster\\ZAV\\KXL\\PROFILES\\INST1", "KXLCLUSTERLIST", machines);
  }

  static void addService(const std::string &machine, const std::string &name, const std::string &image) {
    std::string key = at(machine, "SOFTWARE\\ZAV\\KXLSIM\\Services\\" + name);
    setString(key, "ImagePath", image);
    setString(key, "DisplayName", "before");
    setString(key, "ObjectName", "LocalSystem");
  }

  static std::string service(const std::string &machine, const std::string &name, const char *value) {
    return getString(at(machine, "SOFTWARE\\ZAV\\KXLSIM\\Services\\" + name), value);
  }

  static DWORD serviceStart(const std::string &name) {
    return getDword("SOFTWARE\\ZAV\\KXLSIM\\Services\\" + name, "Start");
  }

  std::unique_ptr<InstallCopy> owner_;
  std::unique_ptr<IKXLINSTANCE> instance_;
  UpgradeContext context_;
  UpgradeOptions options_{};
};

} // namespace kxltest
