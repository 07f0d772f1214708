// A machine with an older copy (KXL95) and the current copy (KXL10) for the
// re-creation cases: configuration templates, machine identity, an instance of
// the older copy with its service, and readers for what the cases check.
#pragma once

#include "../install/install_world.h"
#include "install/kxlinstance.h"
#include "platform/kxlsys.h"
#include "upgrade/records.h"

#include <cstdint>
#include <cstdio>
#include <cstring>
#include <memory>
#include <string>
#include <vector>

namespace kxltest {

class ServicesWorld : public InstallWorld {
protected:
  static constexpr const char *kCurrentCopy = "KXL10";
  static constexpr const char *kCurrentPath = "C:\\KXL10";
  static constexpr const char *kOldCopy = "KXL95";
  static constexpr const char *kOldPath = "C:\\KXL95";
  static constexpr const char *kProfilePath = "C:\\PROFILES";
  static constexpr const char *kInstance = "INST1";
  static constexpr const char *kInstanceDir = "C:\\PROFILES\\INST1";
  static constexpr const char *kSimRoot = "SOFTWARE\\ZAV\\KXLSIM\\";

  void SetUp() override {
    InstallWorld::SetUp();
    if (IsSkipped())
      return;
    registerCopy(kOldCopy, kOldPath);
    registerCopy(kCurrentCopy, kCurrentPath);
    setString(kIdentity, "ComputerName", "SERVER7");
    setString(kIdentity, "FullHostName", "server7.zav.example");
    setString(kIdentity, "AssistantName", "server7.zav.example");
    setString(kIdentity, "CpuMeasure", "0.5");
    setString(kIdentity, "CommBandwidth", "12.5");
    makeDirectories(kProfilePath);
    writeFile("C:\\windows\\system32\\drivers\\etc\\services", std::vector<unsigned char>{'#', '\n'});
    ASSERT_EQ(0, sqloSwitchToInstallationName(kCurrentCopy));
  }

  static std::string copyKey(const char *copy) {
    return std::string("SOFTWARE\\ZAV\\KXL\\InstalledCopies\\") + copy;
  }
  static std::string serviceKey(const std::string &service) {
    return kSimRoot + std::string("Services\\") + service;
  }
  static std::string instanceKey(const std::string &name) {
    return kSimRoot + std::string("Instances\\") + name;
  }

  // A configuration image with its node type, a marker byte and a valid checksum.
  static std::vector<unsigned char> validImage(uint16_t nodeType, unsigned char marker = 0x11) {
    std::vector<unsigned char> image = configImage(nodeType);
    image[100] = marker;
    setChecksum(image);
    return image;
  }

  static void setChecksum(std::vector<unsigned char> &image) {
    uint32_t sum = 0;
    for (size_t i = 4; i < image.size(); ++i)
      sum += image[i];
    std::memcpy(image.data(), &sum, sizeof sum);
  }

  static bool checksumValid(const std::vector<unsigned char> &image) {
    std::vector<unsigned char> copy = image;
    setChecksum(copy);
    return copy == image;
  }

  static void addTemplate(uint16_t nodeType) {
    static const char *const names[] = {"kxlsyssv", "kxlsysrq", "kxlsyssr", "kxlsysmp", "kxlsysst"};
    writeFile(std::string(kCurrentPath) + "\\CFG\\" + names[nodeType - 1], validImage(nodeType, 0x22));
  }

  static uint32_t u32At(const std::vector<unsigned char> &image, size_t offset) {
    return sqloLe32(image.data(), offset);
  }
  static float f32At(const std::vector<unsigned char> &image, size_t offset) {
    uint32_t bits = u32At(image, offset);
    float value = 0;
    std::memcpy(&value, &bits, sizeof value);
    return value;
  }
  static std::string textAt(const std::vector<unsigned char> &image, size_t offset, size_t size) {
    const char *text = reinterpret_cast<const char *>(image.data() + offset);
    return std::string(text, strnlen(text, size));
  }

  static std::vector<unsigned char> newConfig() {
    std::vector<unsigned char> bytes;
    readWholeFile(std::string(kInstanceDir) + "\\kxlsystm", bytes);
    return bytes;
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
    setString(key, "ImagePath", std::string(kOldPath) + "\\bin\\kxlsyscs.exe");
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
