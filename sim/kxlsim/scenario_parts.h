// Building blocks of worlds: copies, instances, services, machines. Scenarios
// (scenarios.cpp) put them together; tests may build their own worlds from them.
#pragma once

#include "sim/kxlsim/world_writer.h"

#include <string>
#include <utility>
#include <vector>

namespace kxlsim {

// Files of the build that a world's copies receive.
struct InstallSources {
  std::string toolsPath;   // the multi-call program (host path)
  std::string commandPath; // the upgrade command; "" when it is not built
  std::string messageDir;  // compiled catalogs, one folder per language
};

using NamedValues = std::vector<std::pair<std::string, std::string>>;

// A product installed in a copy: its level marker and, for copies of version 9
// and later, its Windows Installer registration at the copy's folder.
struct ProductSpec {
  std::string code;        // marker "cfg\kxl<code>.lvl"
  std::string productCode; // braced GUID; "" registers nothing
  std::string displayName;
};

struct CopySpec {
  std::string name; // "" for the version-8 installation
  std::string path; // installation folder, no trailing backslash
  int version = 0;
  int release = 0;
  int modification = 0;
  int fixLevel = 0;
  std::vector<std::string> components;
  std::vector<ProductSpec> products;
  NamedValues globalProfile; // besides KXLPATH and KXLINSTPROF
  bool installCommand = false;
};

struct InstanceRecord {
  std::string name;
  std::string copy; // copy name; "" for the version-8 installation
  std::string directory;
  int nodeType = 1;
  int version = 0; // release whose file layout the instance's kxlsystm has
  int release = 0;
  bool smallLayout = false;
  NamedValues profile;               // instance-level profile variables
  std::string nodesFile;             // content of kxlnodes.cfg; "" for none
  std::vector<std::string> machines; // other machines that hold its profile
};

struct ServiceSpec {
  std::string machine; // "" for the local machine
  std::string name;
  std::string imagePath;
  std::string displayName;
  std::string objectName = "LocalSystem";
  DWORD start = 2; // 2 auto, 3 demand, 4 disabled
  DWORD state = 1; // 1 stopped, 4 running
};

struct IdentitySpec {
  std::string computerName;
  std::string fullHostName;
  std::string authId = "KXLADMIN";
  DWORD localAdmin = 0x14;
  std::string language = "en_US";
  std::string cpuMeasure = "0.00004";
  std::string commBandwidth = "100.0";
  DWORD contentExtender = 0;
};

// The cluster database: kept in the local machine's registry, where the
// simulated cluster modules read it; another node's subtree holds only the
// state of its cluster service.
struct ClusterResourceSpec {
  std::string name;
  std::string type;
  std::string group;
  std::vector<std::string> dependsOn;
  DWORD state = 3; // 2 online, 3 offline; a resource named like a service follows that service
};

inline constexpr const char *kProductRoot = "SOFTWARE\\ZAV\\KXL";
inline constexpr const char *kSimRoot = "SOFTWARE\\ZAV\\KXLSIM";

// The registry key of a copy ("SOFTWARE\ZAV\KXL" for the version-8 one).
std::string copyRegistryKey(const std::string &copyName);

// Machine identity and host-name entries of one machine.
void addIdentity(WorldWriter &w, const RegTarget &machine, const IdentitySpec &identity);
// A host name that resolves: its full name and computer.
void addHost(WorldWriter &w, const std::string &host, const std::string &fullName,
             const std::string &computer);
// A machine other than the local one (its identity under the machines key).
void addMachine(WorldWriter &w, const IdentitySpec &identity);

// The copy's registration on a machine; its files too on the local machine.
// The product as Windows Installer registers a machine-wide installation at
// `location` (with its trailing backslash): its advertisement, its installed
// properties and its entry in the list of installed programs.
void registerInstalledProduct(WorldWriter &w, const ProductSpec &product, const std::string &location,
                              const std::string &version);

void addCopyRegistration(WorldWriter &w, const RegTarget &machine, const CopySpec &copy);
void addCopyFiles(WorldWriter &w, const CopySpec &copy, const InstallSources &sources);
void addCopy(WorldWriter &w, const CopySpec &copy, const InstallSources &sources);

// The instance's registry entries, profile and files.
void addInstance(WorldWriter &w, const InstanceRecord &instance);
void addService(WorldWriter &w, const ServiceSpec &service);

// Lines appended to the services file (created with standard entries).
void addServicesFile(WorldWriter &w, const std::vector<std::string> &lines);
void addOdbcDataSource(WorldWriter &w, const RegTarget &hive, const std::string &name,
                       const std::string &driver);
// A loadable run-time module in the system folder ("odbc32.dll", ...).
void addRuntimeModule(WorldWriter &w, const std::string &moduleName);
void setToolExitCode(WorldWriter &w, const std::string &program, DWORD exitCode);

// A node of the cluster, the local machine or another, with the state of its
// cluster service (19 running, 3 stopped).
void addClusterNode(WorldWriter &w, const std::string &computer, bool local, DWORD nodeState);
void addClusterResourceType(WorldWriter &w, const std::string &type, const std::string &dllName);
void addClusterGroup(WorldWriter &w, const std::string &group, const std::string &ownerNode, DWORD state);
void addClusterResource(WorldWriter &w, const ClusterResourceSpec &resource);
// The instance's cluster profile on one machine: its machine list and profile path.
void addClusterProfile(WorldWriter &w, const RegTarget &machine, const std::string &instance,
                       const std::string &machineList, const std::string &profilePath);

} // namespace kxlsim
