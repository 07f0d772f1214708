#include "sim/kxlsim/scenarios.h"

#include "sim/posix/regfile.h"

namespace kxlsim {

namespace {

constexpr const char *kLocalComputer = "WINSRV1";
constexpr const char *kLocalHost = "winsrv1.zav.test";
constexpr const char *kRemoteComputer = "WINSRV2";
constexpr const char *kRemoteHost = "winsrv2.zav.test";

// The server edition in both side-by-side copies: the newer copy registers
// the product code with its fourth group raised by one, as a second copy of
// the same product does.
constexpr const char *kServerCode95 = "{6E1C2A40-9F3B-4D21-8A10-5B2C7D0E9A01}";
constexpr const char *kServerCode101 = "{6E1C2A40-9F3B-4D21-8A11-5B2C7D0E9A01}";
constexpr const char *kClientCode95 = "{6E1C2A49-9F3B-4D21-8A10-5B2C7D0E9A01}";
constexpr const char *kClientCode101 = "{6E1C2A49-9F3B-4D21-8A11-5B2C7D0E9A01}";
constexpr const char *kZelquorCode101 = "{6E1C2A4A-9F3B-4D21-8A10-5B2C7D0E9A01}";

IdentitySpec localIdentity() {
  IdentitySpec id;
  id.computerName = kLocalComputer;
  id.fullHostName = kLocalHost;
  return id;
}

IdentitySpec remoteIdentity() {
  IdentitySpec id;
  id.computerName = kRemoteComputer;
  id.fullHostName = kRemoteHost;
  return id;
}

CopySpec version8Copy() {
  CopySpec copy;
  copy.path = "C:\\Program Files\\ZAV\\KXL8";
  copy.version = 8;
  copy.release = 2;
  copy.components = {"KXL Server", "KXL Client"};
  copy.products = {{"srv", "", "KXL Server Edition"}, {"txt", "", "KXL Documentation"}};
  return copy;
}

CopySpec copy95() {
  CopySpec copy;
  copy.name = "KXL95";
  copy.path = "C:\\Program Files\\ZAV\\KXL95";
  copy.version = 9;
  copy.release = 5;
  copy.fixLevel = 3;
  copy.components = {"KXL Server", "KXL Client"};
  copy.products = {{"hpe", kServerCode95, "KXL Server Haldor Prime Edition"},
                   {"cli", kClientCode95, "KXL Client"}};
  return copy;
}

CopySpec copy101() {
  CopySpec copy;
  copy.name = "KXL101";
  copy.path = "C:\\Program Files\\ZAV\\KXL101";
  copy.version = 10;
  copy.release = 1;
  copy.components = {"KXL Server", "KXL Client", "KXL Zelquor Client"};
  copy.products = {{"hpe", kServerCode101, "KXL Server Haldor Prime Edition"},
                   {"cli", kClientCode101, "KXL Client"},
                   {"zqc", kZelquorCode101, "KXL Zelquor Client"}};
  copy.installCommand = true;
  return copy;
}

std::string serviceImage(const CopySpec &copy) {
  return copy.path + "\\bin\\kxlsyscs.exe";
}

void addVersion8Instance(WorldWriter &w, const CopySpec &copy) {
  InstanceRecord inst;
  inst.name = "V8INST";
  inst.directory = copy.path + "\\V8INST";
  inst.nodeType = 3;
  inst.version = 8;
  inst.release = 2;
  inst.smallLayout = true;
  addInstance(w, inst);
  addService(w, {"", inst.name, serviceImage(copy), "KXL - V8INST", "LocalSystem", 2, 1});
  w.writeText(copy.path + "\\function\\kxludf8.dll", "MZ user functions of V8INST\r\n");
}

void addSinglePartitionInstance(WorldWriter &w, const CopySpec &copy) {
  InstanceRecord inst;
  inst.name = "INST1";
  inst.copy = copy.name;
  inst.directory = copy.path + "\\INST1";
  inst.nodeType = 1;
  inst.version = copy.version;
  inst.release = copy.release;
  addInstance(w, inst);
  addService(w, {"", inst.name, serviceImage(copy), "KXL - KXL95 - INST1", "LocalSystem", 2, 1});
  w.writeText(inst.directory + "\\security\\kxlaudit.cfg",
              "# audit settings of INST1\r\nactive = yes\r\nerrortype = normal\r\nadmin = both\r\n"
              "instance = both\r\n");
  // The federation, classic connection, resource manager and metadata files
  // that an upgrade carries over when an instance has them.
  w.writeText(inst.directory + "\\cfg\\kxldj.ini", "[federation]\r\nenabled = no\r\n");
  w.writeText(inst.directory + "\\cfg\\djxclassic2.cfg", "classic = 2\r\n");
  w.writeText(inst.directory + "\\bin\\rsm.cfg", "rsm = on\r\n");
  w.writeText(inst.directory + "\\kxlmd_config.xml", "<config instance=\"INST1\"/>\r\n");
}

// Partitions 0 on this machine, 1 and 2 (logical port 1) on the other one.
void addPartitionedInstance(WorldWriter &w, const CopySpec &copy) {
  InstanceRecord inst;
  inst.name = "INST2";
  inst.copy = copy.name;
  inst.directory = copy.path + "\\INST2";
  inst.nodeType = 4;
  inst.version = copy.version;
  inst.release = copy.release;
  inst.profile = {{"KXLPORTRANGE", "60000:60003"}, {"KXLNODECOMPUTER", kLocalComputer}};
  inst.machines = {kRemoteComputer};
  inst.nodesFile = std::string("0 ") + kLocalHost + " " + kLocalComputer + " 0 \r\n" + "1 " + kRemoteHost +
                   " " + kRemoteComputer + " 0 \r\n" + "2 " + kRemoteHost + " " + kRemoteComputer + " 1 \r\n";
  addInstance(w, inst);
  const char *machines[] = {"", kRemoteComputer, kRemoteComputer};
  for (int node = 0; node < 3; ++node) {
    std::string service = "INST2-" + std::to_string(node);
    addService(w,
               {machines[node], service, serviceImage(copy), "KXL - KXL95 - " + service, ".\\kxlsvc", 2, 1});
  }
  w.writeText(copy.path + "\\function\\kxludf.dll", "MZ user functions of the KXL95 instances\r\n");
}

constexpr const char *kClusterName = "KXLCLUS";
constexpr DWORD kNodeRunning = 19;
constexpr DWORD kResourceOnline = 2;
constexpr DWORD kGroupPartlyOnline = 3;

// The two machines and the copies both of them have.
void addTwoMachines(WorldWriter &w, const InstallSources &sources, const CopySpec &old,
                    const CopySpec &current) {
  addMachineBase(w);
  addMachine(w, remoteIdentity());
  addHost(w, "winsrv2", kRemoteHost, kRemoteComputer);
  addHost(w, kRemoteHost, kRemoteHost, kRemoteComputer);
  addCopy(w, old, sources);
  addCopy(w, current, sources);
  addCopyRegistration(w, remoteMachine(kRemoteComputer), old);
  addCopyRegistration(w, remoteMachine(kRemoteComputer), current);
  w.setString(localMachine(), std::string(kSimRoot) + "\\AdminServer", "Name", "KXLDAS00");
}

// A clustered instance's profile and cluster profile on both nodes, and one
// stopped service per partition on each node (the cluster starts them).
void addClusteredInstance(WorldWriter &w, const CopySpec &copy, InstanceRecord inst,
                          const std::vector<std::string> &services) {
  std::string profilePath = windowsParent(inst.directory);
  inst.profile.insert(inst.profile.begin(), {"KXLCLUSTER", kClusterName});
  inst.machines = {kRemoteComputer};
  addInstance(w, inst);
  std::string machineList = std::string(kLocalComputer) + " " + kRemoteComputer;
  addClusterProfile(w, localMachine(), inst.name, machineList, profilePath);
  addClusterProfile(w, remoteMachine(kRemoteComputer), inst.name, machineList, profilePath);
  w.writeText(profilePath + "\\function\\kxludf.dll", "MZ user functions of " + inst.name + "\r\n");
  for (const char *machine : {"", kRemoteComputer})
    for (const std::string &service : services)
      addService(w, {machine, service, serviceImage(copy), "KXL - " + copy.name + " - " + service,
                     ".\\kxlsvc", 3, 1});
}

// CINST1, single partition, on the shared disk E: in its own group.
void addClusteredSingleInstance(WorldWriter &w, const CopySpec &copy) {
  InstanceRecord inst;
  inst.name = "CINST1";
  inst.copy = copy.name;
  inst.directory = "E:\\KXLPROF\\CINST1";
  inst.version = copy.version;
  inst.release = copy.release;
  addClusteredInstance(w, copy, inst, {"CINST1"});
  addClusterGroup(w, "CINST1 Group", kLocalComputer, kGroupPartlyOnline);
  addClusterResource(w, {"Disk E:", "Physical Disk", "CINST1 Group", {}, kResourceOnline});
  addClusterResource(w, {"Disk H:", "Physical Disk", "CINST1 Group", {}, kResourceOnline});
  addClusterResource(w, {"CINST1", "KXL", "CINST1 Group", {"Disk E:", "Disk H:"}});
}

// CINST2, partitions 0 on this node, 1 and 2 (logical port 1) on the other,
// on the shared disk F:; a group per node, partition 2 served by a resource
// of another type.
void addClusteredPartitionedInstance(WorldWriter &w, const CopySpec &copy) {
  InstanceRecord inst;
  inst.name = "CINST2";
  inst.copy = copy.name;
  inst.directory = "F:\\KXLPROF\\CINST2";
  inst.nodeType = 4;
  inst.version = copy.version;
  inst.release = copy.release;
  inst.profile = {{"KXLPORTRANGE", "60010:60013"}, {"KXLNODECOMPUTER", kLocalComputer}};
  inst.nodesFile = std::string("0 ") + kLocalHost + " " + kLocalComputer + " 0 \r\n" + "1 " + kRemoteHost +
                   " " + kRemoteComputer + " 0 \r\n" + "2 " + kRemoteHost + " " + kRemoteComputer + " 1 \r\n";
  addClusteredInstance(w, copy, inst, {"CINST2-0", "CINST2-1", "CINST2-2"});
  addClusterGroup(w, "CINST2 Group 0", kLocalComputer, kGroupPartlyOnline);
  addClusterGroup(w, "CINST2 Group 1", kRemoteComputer, kGroupPartlyOnline);
  addClusterResource(w, {"Disk F:", "Physical Disk", "CINST2 Group 0", {}, kResourceOnline});
  addClusterResource(w, {"CINST2-0", "KXL", "CINST2 Group 0", {"Disk F:"}});
  addClusterResource(w, {"Disk G:", "Physical Disk", "CINST2 Group 1", {}, kResourceOnline});
  addClusterResource(w, {"CINST2 IP", "IP Address", "CINST2 Group 1", {}, kResourceOnline});
  addClusterResource(w, {"CINST2-1", "KXL", "CINST2 Group 1", {"Disk G:", "CINST2 IP"}});
  addClusterResource(w, {"CINST2-2", "Generic Service", "CINST2 Group 1", {"Disk G:"}});
}

// Both nodes running the cluster service, the resource types, and the
// resources of an instance that no copy here owns.
void addCluster(WorldWriter &w) {
  w.setString(localMachine(), std::string(kSimRoot) + "\\Cluster", "ClusterName", kClusterName);
  addClusterNode(w, kLocalComputer, true, kNodeRunning);
  addClusterNode(w, kRemoteComputer, false, kNodeRunning);
  for (char drive : {'E', 'F', 'G', 'H', 'K'})
    w.addDrive(drive);
  addClusterResourceType(w, "Physical Disk", "clusres.dll");
  addClusterResourceType(w, "IP Address", "clusres.dll");
  addClusterResourceType(w, "Generic Service", "clusres.dll");
  addClusterResourceType(w, "KXL", "kxlclres.dll");
  addClusterGroup(w, "CINST3 Group", kRemoteComputer, kGroupPartlyOnline);
  addClusterResource(w, {"Disk K:", "Physical Disk", "CINST3 Group", {}, kResourceOnline});
  addClusterResource(w, {"CINST3", "KXL", "CINST3 Group", {"Disk K:"}});
  addClusterResource(w, {"CINST3-0", "KXL", "CINST3 Group", {"Disk K:"}});
  for (const char *module : {"clusapi.dll", "resutils.dll", "odbc32.dll"})
    addRuntimeModule(w, module);
}

void buildCluster(WorldWriter &w, const InstallSources &sources) {
  CopySpec old = copy95(), current = copy101();
  addTwoMachines(w, sources, old, current);
  addCluster(w);
  addClusteredSingleInstance(w, old);
  addClusteredPartitionedInstance(w, old);
  addServicesFile(
      w, {"KXL_CINST1         50020/tcp", "KXL_CINST2         60010/tcp", "KXL_CINST2_END     60013/tcp"});
}

void buildEmpty(WorldWriter &w, const InstallSources &) {
  addMachineBase(w);
}

void buildDemo(WorldWriter &w, const InstallSources &sources) {
  CopySpec v8 = version8Copy(), old = copy95(), current = copy101();
  addTwoMachines(w, sources, old, current);
  addCopy(w, v8, sources);

  addVersion8Instance(w, v8);
  addSinglePartitionInstance(w, old);
  addPartitionedInstance(w, old);
  addServicesFile(w, {"KXL_V8INST         50010/tcp", "KXL_INST1          50000/tcp",
                      "KXL_INST2          60000/tcp", "KXL_INST2_END      60003/tcp"});
  addRuntimeModule(w, "odbc32.dll");
}

} // namespace

void addMachineBase(WorldWriter &w) {
  addIdentity(w, localMachine(), localIdentity());
  addHost(w, "winsrv1", kLocalHost, kLocalComputer);
  addHost(w, kLocalHost, kLocalHost, kLocalComputer);
  w.makeDirectory("C:\\windows\\temp");
  addServicesFile(w, {});
}

const std::vector<Scenario> &scenarios() {
  static const std::vector<Scenario> table = {
      {"empty", "one machine without any copy of the product", buildEmpty},
      {"demo",
       "a version-8 installation with one instance; copy KXL95 (9.5) with INST1 and the partitioned INST2 "
       "over two machines; the current copy KXL101 (10.1) with the command",
       buildDemo},
      {"cluster",
       "a two-node cluster (WINSRV1, WINSRV2) with copies KXL95 and KXL101; the clustered CINST1 and the "
       "clustered, partitioned CINST2 owned by KXL95, their \"KXL\" resources, and another instance's",
       buildCluster},
  };
  return table;
}

const Scenario *findScenario(const std::string &name) {
  for (const Scenario &scenario : scenarios())
    if (name == scenario.name)
      return &scenario;
  return nullptr;
}

bool createWorld(const std::string &hostDir, const std::string &scenarioName, const InstallSources &sources,
                 std::vector<std::string> &errors) {
  const Scenario *scenario = findScenario(scenarioName);
  if (scenario == nullptr) {
    errors.push_back("unknown scenario " + scenarioName);
    return false;
  }
  std::string error;
  if (!initWorld(hostDir, error)) {
    errors.push_back(error);
    return false;
  }
  WorldWriter w;
  {
    // Nothing else uses the new world yet: write each hive once, not once per value.
    kxlsim::posix::hive::WriteBatch batch;
    scenario->build(w, sources);
    if (!batch.commit())
      w.note("the registry of the new world could not be written");
  }
  errors = w.errors();
  return w.ok();
}

} // namespace kxlsim
