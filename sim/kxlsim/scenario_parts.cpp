#include "sim/kxlsim/scenario_parts.h"

#include "sim/common/installer.h"
#include "sim/kxlsim/dbmcfg_image.h"
#include "sim/tools/tool_names.h"

#include <cctype>
#include <filesystem>

namespace kxlsim {

namespace fs = std::filesystem;

namespace {

constexpr const char *kSystemFolder = "C:\\windows\\system32";
constexpr const char *kUninstallKey = "SOFTWARE\\Microsoft\\Windows\\CurrentVersion\\Uninstall";

std::string levelText(const CopySpec &copy) {
  return std::to_string(copy.version) + "." + std::to_string(copy.release) + "." +
         std::to_string(copy.modification) + "." + std::to_string(copy.fixLevel);
}

void setValues(WorldWriter &w, const RegTarget &target, const std::string &key, const NamedValues &values) {
  w.createKey(target, key);
  for (const auto &[name, value] : values)
    w.setString(target, key, name, value);
}

void addVersion(WorldWriter &w, const RegTarget &machine, const CopySpec &copy) {
  std::string key = copyRegistryKey(copy.name) + "\\CurrentVersion";
  w.setString(machine, key, "Version", std::to_string(copy.version));
  w.setString(machine, key, "Release", std::to_string(copy.release));
  w.setString(machine, key, "Modification", std::to_string(copy.modification));
  if (!copy.name.empty())
    w.setString(machine, key, "Fix Level", std::to_string(copy.fixLevel));
  w.setString(machine, key, "Service Level", "kxl" + levelText(copy));
}

// Catalog folders of the build are named like "en_US".
bool isLanguageFolder(const std::string &name) {
  return name.size() == 5 && std::islower(static_cast<unsigned char>(name[0])) &&
         std::islower(static_cast<unsigned char>(name[1])) && name[2] == '_' &&
         std::isupper(static_cast<unsigned char>(name[3])) &&
         std::isupper(static_cast<unsigned char>(name[4]));
}

void addMessageFiles(WorldWriter &w, const std::string &copyPath, const std::string &messageDir) {
  std::error_code ec;
  for (const fs::directory_entry &lang : fs::directory_iterator(messageDir, ec)) {
    std::string langName = lang.path().filename().string();
    if (!lang.is_directory() || !isLanguageFolder(langName))
      continue;
    for (const fs::directory_entry &file : fs::directory_iterator(lang.path(), ec)) {
      std::string ext = file.path().extension().string();
      if (file.is_regular_file() && (ext == ".mo" || ext == ".TXT"))
        w.installHostFile(file.path().string(),
                          copyPath + "\\msg\\" + langName + "\\" + file.path().filename().string(), false);
    }
  }
  if (ec)
    w.note("cannot read the message catalogs in " + messageDir + ": " + ec.message());
}

void addPrograms(WorldWriter &w, const CopySpec &copy, const InstallSources &sources) {
  for (const char *program : kToolPrograms)
    w.installHostFile(sources.toolsPath, copy.path + "\\bin\\" + program + ".exe", true);
  w.installHostFile(sources.toolsPath, copy.path + "\\misc\\kxlckupgrade.exe", true);
  if (copy.installCommand && !sources.commandPath.empty())
    w.installHostFile(sources.commandPath, copy.path + "\\bin\\kxliupgrade.exe", true);
}

void addTemplates(WorldWriter &w, const CopySpec &copy) {
  DbmRelease release = dbmReleaseForVersion(copy.version, copy.release);
  for (int nodeType = 1; nodeType <= 5; ++nodeType)
    w.writeFile(copy.path + "\\CFG\\" + dbmCfgTemplateName(nodeType), makeDbmCfgImage(nodeType, release));
}

void addProducts(WorldWriter &w, const CopySpec &copy) {
  for (const ProductSpec &product : copy.products) {
    w.writeText(copy.path + "\\CFG\\kxl" + product.code + ".lvl",
                product.displayName + " " + levelText(copy) + "\r\n");
    if (copy.name.empty() || product.productCode.empty())
      continue;
    registerInstalledProduct(w, product, copy.path + "\\", levelText(copy));
  }
}

std::string profileKey(const std::string &copyName, const std::string &instanceName) {
  return copyRegistryKey(copyName) + "\\PROFILES\\" + instanceName;
}

} // namespace

void registerInstalledProduct(WorldWriter &w, const ProductSpec &product, const std::string &location,
                              const std::string &version) {
  w.setString(localMachine(), installerProductKey(product.productCode), "ProductName", product.displayName);
  std::string properties = installerPropertiesKey(product.productCode);
  w.setString(localMachine(), properties, "InstallLocation", location);
  w.setString(localMachine(), properties, "DisplayName", product.displayName);
  w.setString(localMachine(), properties, "DisplayVersion", version);
  w.setDword(localMachine(), properties, "WindowsInstaller", 1);
  std::string uninstall = std::string(kUninstallKey) + "\\" + product.productCode;
  w.setString(localMachine(), uninstall, "InstallLocation", location);
  w.setString(localMachine(), uninstall, "DisplayName", product.displayName);
  w.setString(localMachine(), uninstall, "DisplayVersion", version);
}

std::string copyRegistryKey(const std::string &copyName) {
  if (copyName.empty())
    return kProductRoot;
  return std::string(kProductRoot) + "\\InstalledCopies\\" + copyName;
}

void addIdentity(WorldWriter &w, const RegTarget &machine, const IdentitySpec &identity) {
  std::string key = std::string(kSimRoot) + "\\Identity";
  w.setString(machine, key, "ComputerName", identity.computerName);
  w.setString(machine, key, "FullHostName", identity.fullHostName);
  w.setString(machine, key, "AuthId", identity.authId);
  w.setDword(machine, key, "LocalAdmin", identity.localAdmin);
  w.setString(machine, key, "Language", identity.language);
  w.setString(machine, key, "CpuMeasure", identity.cpuMeasure);
  w.setString(machine, key, "CommBandwidth", identity.commBandwidth);
  w.setString(machine, key, "AssistantName", identity.fullHostName);
  w.setDword(machine, key, "ContentExtender", identity.contentExtender);
}

void addHost(WorldWriter &w, const std::string &host, const std::string &fullName,
             const std::string &computer) {
  std::string key = std::string(kSimRoot) + "\\Hosts\\" + host;
  w.setString(localMachine(), key, "FullName", fullName);
  w.setString(localMachine(), key, "Computer", computer);
}

void addMachine(WorldWriter &w, const IdentitySpec &identity) {
  addIdentity(w, remoteMachine(identity.computerName), identity);
}

void addCopyRegistration(WorldWriter &w, const RegTarget &machine, const CopySpec &copy) {
  std::string key = copyRegistryKey(copy.name);
  w.setString(machine, key, "KXL Path Name", copy.path);
  addVersion(w, machine, copy);
  w.createKey(machine, key + "\\COMPONENTS");
  for (const std::string &component : copy.components)
    w.setString(machine, key + "\\COMPONENTS", component, "");
  NamedValues global = {{"KXLPATH", copy.path}, {"KXLINSTPROF", copy.path}};
  global.insert(global.end(), copy.globalProfile.begin(), copy.globalProfile.end());
  setValues(w, machine, key + "\\GLOBAL_PROFILE", global);
  w.createKey(machine, key + "\\PROFILES");
}

void addCopyFiles(WorldWriter &w, const CopySpec &copy, const InstallSources &sources) {
  addPrograms(w, copy, sources);
  addTemplates(w, copy);
  addMessageFiles(w, copy.path, sources.messageDir);
}

void addCopy(WorldWriter &w, const CopySpec &copy, const InstallSources &sources) {
  addCopyRegistration(w, localMachine(), copy);
  addCopyFiles(w, copy, sources);
  addProducts(w, copy);
}

void addInstance(WorldWriter &w, const InstanceRecord &instance) {
  std::string registryKey = std::string(kSimRoot) + "\\Instances\\" + instance.name;
  w.setString(localMachine(), registryKey, "Directory", instance.directory);
  w.setString(localMachine(), registryKey, "Copy", instance.copy);
  setValues(w, localMachine(), profileKey(instance.copy, instance.name), instance.profile);
  for (const std::string &machine : instance.machines)
    setValues(w, remoteMachine(machine), profileKey(instance.copy, instance.name), instance.profile);

  DbmRelease release = dbmReleaseForVersion(instance.version, instance.release);
  w.writeFile(instance.directory + "\\kxlsystm",
              makeDbmCfgImage(instance.nodeType, release, instance.smallLayout));
  if (!instance.nodesFile.empty()) {
    w.writeText(instance.directory + "\\kxlnodes.cfg", instance.nodesFile);
    w.writeText(instance.directory + "\\kxlprofile.bat",
                "@echo off\r\nSET KXLINSTANCE=" + instance.name + "\r\n");
  }
}

void addService(WorldWriter &w, const ServiceSpec &service) {
  RegTarget machine = service.machine.empty() ? localMachine() : remoteMachine(service.machine);
  std::string key = std::string(kSimRoot) + "\\Services\\" + service.name;
  w.setString(machine, key, "ImagePath", service.imagePath);
  w.setString(machine, key, "DisplayName", service.displayName);
  w.setString(machine, key, "ObjectName", service.objectName);
  w.setDword(machine, key, "Start", service.start);
  w.setDword(machine, key, "State", service.state);
}

void addServicesFile(WorldWriter &w, const std::vector<std::string> &lines) {
  std::string text = "# Port numbers of network services\r\n"
                     "echo                7/tcp\r\n"
                     "ftp                21/tcp\r\n"
                     "telnet             23/tcp\r\n"
                     "smtp               25/tcp    mail\r\n"
                     "http               80/tcp    www\r\n";
  for (const std::string &line : lines)
    text += line + "\r\n";
  w.writeText(std::string(kSystemFolder) + "\\drivers\\etc\\services", text);
}

void addOdbcDataSource(WorldWriter &w, const RegTarget &hive, const std::string &name,
                       const std::string &driver) {
  w.setString(hive, "SOFTWARE\\ODBC\\ODBC.INI\\ODBC Data Sources", name, driver);
}

void addRuntimeModule(WorldWriter &w, const std::string &moduleName) {
  w.writeText(std::string(kSystemFolder) + "\\" + moduleName,
              "MZ simulated run-time module " + moduleName + "\r\n");
}

void setToolExitCode(WorldWriter &w, const std::string &program, DWORD exitCode) {
  w.setDword(localMachine(), std::string(kSimRoot) + "\\Tools\\" + program, "ExitCode", exitCode);
}

namespace {

const std::string kClusterKey = std::string(kSimRoot) + "\\Cluster";

} // namespace

void addClusterNode(WorldWriter &w, const std::string &computer, bool local, DWORD nodeState) {
  w.setDword(local ? localMachine() : remoteMachine(computer), kClusterKey, "NodeState", nodeState);
  w.createKey(localMachine(), kClusterKey + "\\Nodes\\" + computer);
}

void addClusterResourceType(WorldWriter &w, const std::string &type, const std::string &dllName) {
  std::string key = kClusterKey + "\\ResourceTypes\\" + type;
  w.setString(localMachine(), key, "DisplayName", type);
  w.setString(localMachine(), key, "DllName", dllName);
  w.setDword(localMachine(), key, "LooksAlivePollInterval", 5000);
  w.setDword(localMachine(), key, "IsAlivePollInterval", 60000);
}

void addClusterGroup(WorldWriter &w, const std::string &group, const std::string &ownerNode, DWORD state) {
  std::string key = kClusterKey + "\\Groups\\" + group;
  w.setString(localMachine(), key, "OwnerNode", ownerNode);
  w.setDword(localMachine(), key, "State", state);
}

void addClusterResource(WorldWriter &w, const ClusterResourceSpec &resource) {
  std::string key = kClusterKey + "\\Resources\\" + resource.name;
  w.setString(localMachine(), key, "Type", resource.type);
  w.setString(localMachine(), key, "Group", resource.group);
  w.setMultiString(localMachine(), key, "DependsOn", resource.dependsOn);
  w.setDword(localMachine(), key, "State", resource.state);
  w.setDword(localMachine(), key, "SeparateMonitor", 0);
}

void addClusterProfile(WorldWriter &w, const RegTarget &machine, const std::string &instance,
                       const std::string &machineList, const std::string &profilePath) {
  std::string key = "Cluster\\ZAV\\KXL\\PROFILES\\" + instance;
  w.setString(machine, key, "KXLCLUSTERLIST", machineList);
  w.setString(machine, key, "KXLINSTPROF", profilePath);
}

} // namespace kxlsim
