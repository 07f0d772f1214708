#include "sim/kxlsim/show.h"

#include "sim/kxlsim/dbmcfg_image.h"
#include "sim/kxlsim/scenario_parts.h"
#include "sim/kxlsim/world_reader.h"
#include "sim/posix/modules/cluster.h"
#include "sim/posix/reghelp.h"

#include <algorithm>
#include <cstdio>
#include <string>

namespace kxlsim {

namespace {

void row(std::ostream &out, const char *format, const std::string &a, const std::string &b,
         const std::string &c, const std::string &d) {
  char line[1200];
  int length = std::snprintf(line, sizeof line, format, a.c_str(), b.c_str(), c.c_str(), d.c_str());
  std::string text(line, length < 0 ? 0 : std::min<size_t>(size_t(length), sizeof line - 1));
  text.erase(text.find_last_not_of(' ') + 1);
  out << text << '\n';
}

std::string versionText(const std::string &copyKey) {
  std::string key = copyKey + "\\CurrentVersion";
  std::string version = stringValue(localMachine(), key, "Version");
  std::string release = stringValue(localMachine(), key, "Release");
  return release.empty() ? version : version + "." + release;
}

void showCopies(std::ostream &out) {
  out << "Copies:\n";
  std::string v8Version =
      stringValue(localMachine(), std::string(kProductRoot) + "\\CurrentVersion", "Version");
  if (!v8Version.empty() && v8Version[0] == '8')
    row(out, "  %-12s %-8s %s%s", "KXLV8", versionText(kProductRoot),
        stringValue(localMachine(), kProductRoot, "KXL Path Name"), "");
  for (const std::string &name : subkeys(localMachine(), std::string(kProductRoot) + "\\InstalledCopies")) {
    std::string key = copyRegistryKey(name);
    row(out, "  %-12s %-8s %s%s", name, versionText(key), stringValue(localMachine(), key, "KXL Path Name"),
        "");
  }
}

std::string nodeTypeText(const std::string &directory) {
  std::vector<uint8_t> head;
  if (!readFileHead(directory + "\\kxlsystm", kDbmCfgOffsetNodeType + 2, head) ||
      head.size() < kDbmCfgOffsetNodeType + 2)
    return "-";
  return std::to_string(readU16(head, kDbmCfgOffsetNodeType));
}

void showInstances(std::ostream &out) {
  out << "Instances:\n";
  std::string root = std::string(kSimRoot) + "\\Instances";
  for (const std::string &name : subkeys(localMachine(), root)) {
    std::string directory = stringValue(localMachine(), root + "\\" + name, "Directory");
    std::string copy = stringValue(localMachine(), root + "\\" + name, "Copy");
    row(out, "  %-12s copy %-8s node type %-2s %s", name, copy.empty() ? "KXLV8" : copy,
        nodeTypeText(directory), directory);
  }
}

void showServicesOf(std::ostream &out, const RegTarget &machine, const std::string &qualifier) {
  std::string root = std::string(kSimRoot) + "\\Services";
  for (const std::string &name : subkeys(machine, root)) {
    std::string key = root + "\\" + name;
    std::string startState = "start " + std::to_string(dwordValue(machine, key, "Start", 0)) + " state " +
                             std::to_string(dwordValue(machine, key, "State", 0));
    row(out, "  %-20s %-17s %s%s", qualifier + name, startState, stringValue(machine, key, "ImagePath"), "");
  }
}

std::vector<std::string> otherMachines() {
  return subkeys(localMachine(), kMachinesKey);
}

void showServices(std::ostream &out) {
  out << "Services:\n";
  showServicesOf(out, localMachine(), "");
  for (const std::string &machine : otherMachines())
    showServicesOf(out, remoteMachine(machine), machine + "\\");
}

void showMachines(std::ostream &out) {
  out << "Machines:\n";
  std::string identity = std::string(kSimRoot) + "\\Identity";
  row(out, "  %-12s %-8s %s%s", stringValue(localMachine(), identity, "ComputerName"), "(local)",
      stringValue(localMachine(), identity, "FullHostName"), "");
  for (const std::string &machine : otherMachines())
    row(out, "  %-12s %-8s %s%s", machine, "", stringValue(remoteMachine(machine), identity, "FullHostName"),
        "");
}

struct StateName {
  DWORD state;
  const char *name;
};

template <size_t N> std::string stateText(DWORD state, const StateName (&names)[N]) {
  for (const StateName &entry : names)
    if (entry.state == state)
      return entry.name;
  return "state " + std::to_string(state);
}

constexpr StateName kNodeStates[] = {{ClusterStateRunning, "running"},
                                     {ClusterStateNotRunning, "stopped"},
                                     {ClusterStateNotInstalled, "not installed"}};
constexpr StateName kResourceStates[] = {{DWORD(ClusterResourceOnline), "online"},
                                         {DWORD(ClusterResourceOffline), "offline"},
                                         {DWORD(ClusterResourceFailed), "failed"}};

std::string joined(const std::vector<std::string> &items) {
  std::string text;
  for (const std::string &item : items)
    text += (text.empty() ? "" : ", ") + item;
  return text;
}

void showResourcesOfGroup(std::ostream &out, const std::string &group) {
  namespace cl = kxlsim::posix::cluster;
  for (const std::string &name : subkeys(localMachine(), cl::kResourcesKey)) {
    if (cl::resourceField(name, "Group") != group)
      continue;
    std::vector<std::string> dependsOn;
    kxlsim::posix::reg::readMultiString(HKEY_LOCAL_MACHINE, cl::resourceKey(name), "DependsOn", dependsOn);
    std::string depends = dependsOn.empty() ? "" : "depends on " + joined(dependsOn);
    row(out, "    %-14s %-16s %-8s %s", name, cl::resourceField(name, "Type"),
        stateText(cl::resourceState(name), kResourceStates), depends);
  }
}

// Nodes, resource types, and the groups with their resources, as the
// simulated cluster modules report them.
void showCluster(std::ostream &out) {
  namespace cl = kxlsim::posix::cluster;
  if (!keyExists(localMachine(), cl::kClusterKey))
    return;
  out << "Cluster " << stringValue(localMachine(), cl::kClusterKey, "ClusterName") << ":\n";
  for (const std::string &node : cl::nodeNames())
    row(out, "  node  %-12s %s%s%s", node, stateText(cl::nodeStateOf(node), kNodeStates), "", "");
  for (const std::string &type : subkeys(localMachine(), cl::kTypesKey))
    row(out, "  type  %-16s %s%s%s", type,
        stringValue(localMachine(), std::string(cl::kTypesKey) + "\\" + type, "DllName"), "", "");
  for (const std::string &group : subkeys(localMachine(), cl::kGroupsKey)) {
    row(out, "  group %-16s owner %s%s%s", group, cl::groupOwner(group), "", "");
    showResourcesOfGroup(out, group);
  }
}

} // namespace

void showWorld(std::ostream &out) {
  showCopies(out);
  showInstances(out);
  showServices(out);
  showMachines(out);
  showCluster(out);
}

} // namespace kxlsim
