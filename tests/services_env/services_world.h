// A machine with an older copy (KXL95) and the current copy (KXL10) for the
// re-creation cases: configuration templates, machine identity, an instance of
// the older copy with its service, and readers for what the cases check.
#pragma once

#include "../install/install_world.h"
#include "install/kxlinstance.h"
#include "platform/kxlsys.h"
#include "upgrade/records.h"

#include <cstdio>
#include <cstring>
#include <memory>
#include <string>

namespace kxltest {

class ServicesWorld : public InstallWorld {
protected:
  static constexpr const char *kCurrentCopy = "KXL10", *kCurrentPath = "C:\\KXL10";
  static constexpr const char *kOldCopy = "KXL95", *kOldPath = "C:\\KXL95";
  static constexpr const char *kProfilePath = "C:\\PROFILES", *kInstance = "INST1";
  static constexpr const char *kInstanceDir = "C:\\PROFILES\\INST1";
  static constexpr const char *kOldProgram = "C:\\KXL95\\bin\\kxlsyscs.exe";
  static constexpr const char *kNewProgram = "C:\\KXL10\\bin\\kxlsyscs.exe";

  void SetUp() override {
    InstallWorld::SetUp();
    if (IsSkipped())
      return;
    registerCopy(kOldCopy, kOldPath);
    registerCopy(kCurrentCopy, kCurrentPath);
    for (const auto &[name, value] : {std::pair{"ComputerName", "SERVER7"},
                                      {"FullHostName", "server7.zav.example"},
                                      {"AssistantName", "server7.zav.example"},
                                      {"CpuMeasure", "0.5"},
                                      {"CommBandwidth", "12.5"}})
      setString(kIdentity, name, value);
    makeDirectories(kProfilePath);
    writeFile("C:\\windows\\system32\\drivers\\etc\\services", std::string("#\n"));
    ASSERT_EQ(0, sqloSwitchToInstallationName(kCurrentCopy));
  }

  static std::string copyKey(const char *copy) { return kCopies + std::string(copy); }
  static std::string instanceKey(const std::string &name) {
    return "SOFTWARE\\ZAV\\KXLSIM\\Instances\\" + name;
  }

  // A sealed configuration image with its node type and a marker byte at 100.
  static Bytes validImage(uint16_t nodeType, uint8_t marker) {
    return Cfg(nodeType, 0, 0).byte(100, marker).sealed();
  }

  static void addTemplate(uint16_t nodeType) {
    static const char *const names[] = {"kxlsyssv", "kxlsysrq", "kxlsyssr", "kxlsysmp", "kxlsysst"};
    writeFile(std::string(kCurrentPath) + "\\CFG\\" + names[nodeType - 1], validImage(nodeType, 0x22));
  }

  static Bytes newConfig() {
    Bytes bytes;
    readWholeFile(std::string(kInstanceDir) + "\\kxlsystm", bytes);
    return bytes;
  }

  // The instance's configuration file: whole, sealed, and with the fields
  // `wanted` names (see dbmtest::fieldsAt).
  static void expectConfig(const std::string &wanted) {
    Bytes image = newConfig();
    ASSERT_EQ(dbmtest::kFull, image.size());
    EXPECT_EQ(wanted, dbmtest::fieldsAt(image, wanted));
    EXPECT_EQ(dbmtest::r32(image, 0), dbmtest::byteSum(image)) << "checksum";
  }

  // An instance profile key of the current copy (the creation adds its own).
  static void addProfile(const char *copy, const std::string &instance) {
    setString(copyKey(copy) + "\\PROFILES\\" + instance, "KXLINSTPROF", kProfilePath);
  }

  // INST1 of the older copy: directory, configuration, registration, service.
  static void addOldInstance(uint16_t nodeType, DWORD start = 3, bool withService = true) {
    writeFile(std::string(kInstanceDir) + "\\kxlsystm", validImage(nodeType, 0x33));
    registerInstance(kInstance, kInstanceDir, kOldCopy);
    addProfile(kCurrentCopy, kInstance);
    if (!withService)
      return;
    addOldService(serviceKey(kInstance), start);
    setString(serviceKey(kInstance), "DisplayName", "KXL - KXL95 - INST1");
  }

  // A stopped service of the older copy's program under the account OLDACCT.
  static void addOldService(const std::string &key, DWORD start) {
    setString(key, "ImagePath", kOldProgram);
    setString(key, "ObjectName", "OLDACCT");
    setDword(key, "Start", start);
    setDword(key, "State", 1);
  }

  // The options record the run hands the engine for INST1.
  static std::unique_ptr<UpgradeOptions> makeOptions() {
    auto options = std::make_unique<UpgradeOptions>();
    std::memset(options.get(), 0, sizeof *options);
    std::snprintf(options->instanceName, sizeof options->instanceName, "%s", kInstance);
    std::snprintf(options->profilePath, sizeof options->profilePath, "%s", kProfilePath);
    std::snprintf(options->currentInstallPath, sizeof options->currentInstallPath, "%s", kCurrentPath);
    options->flags = UPGRADE_FLAG_TOOL;
    sqloinca(&options->status);
    return options;
  }
};

} // namespace kxltest
