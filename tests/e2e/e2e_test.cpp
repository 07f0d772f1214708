// The command's main jobs from the outside, in worlds built by kxlsim and seen
// as kxlsim shows and compares them: the single-partition instance of the 9.5
// copy in the demo world, and the clustered instances of the cluster world.
// The failures of the cluster step are driven the same way, each followed by
// a plain run that then succeeds.
#include "sim/kxlsim/show.h"
#include "tests/support/command_world.h"

#include <algorithm>
#include <filesystem>
#include <functional>
#include <sstream>
#include <string>
#include <vector>

namespace {

namespace fs = std::filesystem;
constexpr const char *kResources = "SOFTWARE\\ZAV\\KXLSIM\\Cluster\\Resources\\";
constexpr const char *kGroups = "SOFTWARE\\ZAV\\KXLSIM\\Cluster\\Groups\\";
constexpr const char *kServerType = "  type  KXL Server       kxlserver.dll";
constexpr const char *kCinst1Converted =
    "    CINST1         KXL Server       offline  depends on Disk E:, Disk H:";
constexpr const char *kCinst1Unchanged =
    "    CINST1         KXL              offline  depends on Disk E:, Disk H:";

// The clustered upgrades of the cluster world.
using Args = std::vector<std::string>;
const Args kSingle{"-p", "C:\\Program Files\\ZAV\\KXL101", "CINST1"};
const Args kPartitioned{"-u", "kxlsvc,Secret1", "CINST2"};

std::vector<std::string> lines(const std::string &text) {
  std::vector<std::string> out;
  std::istringstream in(text);
  for (std::string line; std::getline(in, line);)
    out.push_back(line);
  return out;
}

bool hasLine(const std::string &text, const std::string &line) {
  std::vector<std::string> all = lines(text);
  return std::find(all.begin(), all.end(), line) != all.end();
}

// The lines of `text` that `keep` holds for, each ended with a newline.
template <typename Keep> std::string linesWhere(const std::string &text, Keep keep) {
  std::string out;
  for (const std::string &line : lines(text))
    out += keep(line) ? line + "\n" : "";
  return out;
}

// The registry lines of a diff.
std::string registryChanges(const std::string &diff) {
  return linesWhere(diff, [](const std::string &line) { return line.rfind("registry ", 0) == 0; });
}

// Everything the upgrade changes, and nothing else (no backup is left in
// C:\windows\temp): one line a key, value or file, a file's content pinned by
// its size and hash.
const char kExpectedChanges[] = R"(registry - HKLM\SOFTWARE\ZAV\KXL\InstalledCopies\KXL95\PROFILES\INST1
registry ~ HKLM\SOFTWARE\ZAV\KXLSIM\Instances\INST1 "Copy": "KXL95" -> "KXL101"
registry ~ HKLM\SOFTWARE\ZAV\KXLSIM\Instances\INST1 "Directory": "C:\Program Files\ZAV\KXL95\INST1" -> "C:\Program Files\ZAV\KXL101\INST1"
registry ~ HKLM\SOFTWARE\ZAV\KXLSIM\Services\INST1 "DisplayName": "KXL - KXL95 - INST1" -> "KXL - KXL101 - INST1"
registry ~ HKLM\SOFTWARE\ZAV\KXLSIM\Services\INST1 "ImagePath": "C:\Program Files\ZAV\KXL95\bin\kxlsyscs.exe" -> "C:\Program Files\ZAV\KXL101\bin\kxlsyscs.exe"
registry + HKLM\SOFTWARE\ZAV\KXL\InstalledCopies\KXL101\PROFILES\INST1
file + C:\KXLDBMIG.TXT (440 bytes, fnv 99c1bf416a879d93)
file + C:\Program Files\ZAV\KXL101\INST1\bin\rsm.cfg (10 bytes, fnv cf1a9f0cdf3562f0)
file + C:\Program Files\ZAV\KXL101\INST1\cfg\djxclassic2.cfg (13 bytes, fnv 44a60aba95ae67c5)
file + C:\Program Files\ZAV\KXL101\INST1\cfg\kxldj.ini (28 bytes, fnv 807da70b3e7841df)
file + C:\Program Files\ZAV\KXL101\INST1\kxlmd_config.xml (28 bytes, fnv 7d5c60b04106967e)
file + C:\Program Files\ZAV\KXL101\INST1\kxlsystm (16384 bytes, fnv 3920934884e75c52)
file + C:\Program Files\ZAV\KXL101\INST1\security\kxlaudit.cfg (120 bytes, fnv cbc80e32e98b4190)
file + C:\Program Files\ZAV\KXL101\function\kxludf.dll (42 bytes, fnv d5018ea7f0c59122)
file + C:\upgrade.log (62 bytes, fnv 9b1eb0d4870202bd)
file + events.jsonl (805 bytes, fnv d398b08fdd4bb417)
)";

using DemoE2eTest = kxltest::CommandWorld;

// The diagnostic log names the backup folder, whose name differs per run: it
// is checked for that line and left out of the exact changes.
TEST_F(DemoE2eTest, SinglePartitionInstanceMovesToTheCurrentCopy) {
  std::string before = snapshot();
  kxltest::CommandOutcome upgrade = runInWorld({"INST1"}, {}, "kxliupgrade.exe", "C:\\");
  EXPECT_EQ(upgrade.exitCode, 0) << upgrade.out << upgrade.err;
  EXPECT_NE(upgrade.out.find("KXLIUPGRADE"), std::string::npos) << upgrade.out;
  std::string diff = changesSince(before);
  EXPECT_EQ(linesWhere(diff,
                       [](const std::string &line) {
                         return line.rfind(" ", 0) != 0 && line.rfind("file + kxldiag.log", 0) != 0;
                       }),
            kExpectedChanges)
      << diff;
  EXPECT_NE(diff.find("\\INST1 is backed up in C:\\windows\\temp\\KXL"), std::string::npos) << diff;
}

class ClusterE2eTest : public kxltest::CommandWorld {
protected:
  void SetUp() override {
    CommandWorld::SetUp();
    resetWorld("cluster");
  }

  // The run's output and errors together in `out`.
  kxltest::CommandOutcome upgrade(const std::vector<std::string> &args, const std::string &faults = "") {
    kxltest::CommandOutcome run = runInWorld(args, {"KXLSIM_FAIL=" + faults});
    run.out += run.err;
    return run;
  }

  std::string show() {
    std::ostringstream out;
    kxlsim::showWorld(out);
    return out.str();
  }
};

// CINST1's registry changes on both nodes; its resource keeps group and
// dependencies (no line) and stays on E: though -p names another path.
const char kSingleChanges[] = R"(registry - HKLM\SOFTWARE\ZAV\KXL\InstalledCopies\KXL95\PROFILES\CINST1
registry ~ HKLM\SOFTWARE\ZAV\KXLSIM\Cluster\Resources\CINST1 "SeparateMonitor": dword:0 -> dword:1
registry ~ HKLM\SOFTWARE\ZAV\KXLSIM\Cluster\Resources\CINST1 "Type": "KXL" -> "KXL Server"
registry ~ HKLM\SOFTWARE\ZAV\KXLSIM\Instances\CINST1 "Copy": "KXL95" -> "KXL101"
registry - [WINSRV2] HKLM\SOFTWARE\ZAV\KXL\InstalledCopies\KXL95\PROFILES\CINST1
registry ~ [WINSRV2] HKLM\SOFTWARE\ZAV\KXLSIM\Services\CINST1 "DisplayName": "KXL - KXL95 - CINST1" -> "KXL - KXL101 - CINST1"
registry ~ [WINSRV2] HKLM\SOFTWARE\ZAV\KXLSIM\Services\CINST1 "ImagePath": "C:\Program Files\ZAV\KXL95\bin\kxlsyscs.exe" -> "C:\Program Files\ZAV\KXL101\bin\kxlsyscs.exe"
registry ~ HKLM\SOFTWARE\ZAV\KXLSIM\Services\CINST1 "DisplayName": "KXL - KXL95 - CINST1" -> "KXL - KXL101 - CINST1"
registry ~ HKLM\SOFTWARE\ZAV\KXLSIM\Services\CINST1 "ImagePath": "C:\Program Files\ZAV\KXL95\bin\kxlsyscs.exe" -> "C:\Program Files\ZAV\KXL101\bin\kxlsyscs.exe"
registry + HKLM\SOFTWARE\ZAV\KXL\InstalledCopies\KXL101\PROFILES\CINST1
registry + HKLM\SOFTWARE\ZAV\KXLSIM\Cluster\ResourceTypes\KXL Server
registry + [WINSRV2] HKLM\SOFTWARE\ZAV\KXL\InstalledCopies\KXL101\PROFILES\CINST1
)";

TEST_F(ClusterE2eTest, ClusteredInstanceUpgradesAndASecondRunConvertsNothing) {
  std::string before = snapshot();
  kxltest::CommandOutcome first = upgrade(kSingle);
  EXPECT_EQ(first.exitCode, 0) << first.out;
  EXPECT_EQ(first.out.rfind("KXL1000I", 0), 0u) << first.out;
  std::string diff = changesSince(before);
  EXPECT_EQ(registryChanges(diff), kSingleChanges);
  EXPECT_TRUE(hasLine(diff,
                      "file ~ E:\\KXLPROF\\CINST1\\kxlsystm (16384 bytes, fnv 635b0f9ae34d87ac -> 16384 "
                      "bytes, fnv 3920934884e75c52)"))
      << diff;
  EXPECT_TRUE(hasLine(show(), kCinst1Converted));

  std::string converted = snapshot();
  kxltest::CommandOutcome second = upgrade({"-install", "CINST1"});
  EXPECT_EQ(second.exitCode, 0) << second.out;
  EXPECT_NE(second.trace.find("exit 0x18780509 rc=0"), std::string::npos)
      << "the step ran and converted nothing";
  EXPECT_EQ(changesSince(converted).find("Cluster"), std::string::npos);
}

// CINST2's partitions on both nodes (also its cluster's machines): each key moves
// once; partition 2's resource and CINST3's are of other types and stay.
// CINST2's three partition services on one machine ("[WINSRV2] " or ""),
// re-pointed under the account given.
std::string partitionServiceChanges(const std::string &machine) {
  std::string out;
  for (const char *p : {"CINST2-0", "CINST2-1", "CINST2-2"}) {
    std::string key = "registry ~ " + machine + "HKLM\\SOFTWARE\\ZAV\\KXLSIM\\Services\\" + p;
    out += key + " \"DisplayName\": \"KXL - KXL95 - " + p + "\" -> \"KXL - KXL101 - " + p + "\"\n";
    out +=
        key +
        R"( "ImagePath": "C:\Program Files\ZAV\KXL95\bin\kxlsyscs.exe" -> "C:\Program Files\ZAV\KXL101\bin\kxlsyscs.exe")"
        "\n";
    out += key + R"( "ObjectName": ".\kxlsvc" -> "kxlsvc")"
                 "\n";
  }
  return out;
}

const std::string kPartitionedChanges =
    std::string(R"(registry - HKLM\SOFTWARE\ZAV\KXL\InstalledCopies\KXL95\PROFILES\CINST2
registry ~ HKLM\SOFTWARE\ZAV\KXLSIM\Cluster\Resources\CINST2-0 "SeparateMonitor": dword:0 -> dword:1
registry ~ HKLM\SOFTWARE\ZAV\KXLSIM\Cluster\Resources\CINST2-0 "Type": "KXL" -> "KXL Server"
registry ~ HKLM\SOFTWARE\ZAV\KXLSIM\Cluster\Resources\CINST2-1 "SeparateMonitor": dword:0 -> dword:1
registry ~ HKLM\SOFTWARE\ZAV\KXLSIM\Cluster\Resources\CINST2-1 "Type": "KXL" -> "KXL Server"
registry ~ HKLM\SOFTWARE\ZAV\KXLSIM\Instances\CINST2 "Copy": "KXL95" -> "KXL101"
registry ~ [WINSRV2] HKLM\Cluster\ZAV\KXL\PROFILES\CINST2 "KXLINSTPROF": "X:\OLD" -> "F:\KXLPROF"
registry - [WINSRV2] HKLM\SOFTWARE\ZAV\KXL\InstalledCopies\KXL95\PROFILES\CINST2
)") +
    partitionServiceChanges("[WINSRV2] ") + partitionServiceChanges("") +
    R"(registry + HKLM\SOFTWARE\ZAV\KXL\InstalledCopies\KXL101\PROFILES\CINST2
registry + HKLM\SOFTWARE\ZAV\KXLSIM\Cluster\ResourceTypes\KXL Server
registry + [WINSRV2] HKLM\SOFTWARE\ZAV\KXL\InstalledCopies\KXL101\PROFILES\CINST2
)";

TEST_F(ClusterE2eTest, ClusteredPartitionedInstanceUpgradesOnEveryNode) {
  world.setString(kxlsim::remoteMachine("WINSRV2"), "Cluster\\ZAV\\KXL\\PROFILES\\CINST2", "KXLINSTPROF",
                  "X:\\OLD");
  std::string before = snapshot();
  kxltest::CommandOutcome run = upgrade(kPartitioned);
  EXPECT_EQ(run.exitCode, 0) << run.out;
  EXPECT_EQ(registryChanges(changesSince(before)), kPartitionedChanges);
  std::string cluster = show();
  for (const char *line : {"    CINST2-0       KXL Server       offline  depends on Disk F:",
                           "    CINST2-1       KXL Server       offline  depends on Disk G:, CINST2 IP",
                           "    CINST2-2       Generic Service  offline  depends on Disk G:",
                           "    CINST3         KXL              offline  depends on Disk K:",
                           "    CINST3-0       KXL              offline  depends on Disk K:"})
    EXPECT_TRUE(hasLine(cluster, line)) << line << "\n" << cluster;
}

// State of the cluster that cannot be read is never taken for a value: the
// clustered flag (once read as "not clustered"), the cluster's machine list
// (once read as empty, leaving WINSRV2's key under the old copy), the cluster
// profile's key name and a service's account (once read as absent, giving the
// re-created service the system account). Each ends the run with the world as
// it was; the first is refused before anything changes, the others undone.
TEST_F(ClusterE2eTest, ClusterStateThatCannotBeReadFailsTheRunUnchanged) {
  for (const auto &[faults, message] : {std::pair("RegOpenKeyExA:27", "KXL1918E"),
                                        {"RegQueryValueExA:13", "KXL1918E"},
                                        {"RegOpenKeyExA:187", "KXL1918E"},
                                        {"RegQueryValueExA:114", "KXL1918E"},
                                        {"ossSnprintf:6", "KXLIMIGR:processing"},
                                        {"RegQueryValueExA:138", "KXLIMIGR:processing"}}) {
    SCOPED_TRACE(faults);
    std::string before = snapshot();
    kxltest::CommandOutcome run = upgrade(kSingle, faults);
    EXPECT_NE(run.exitCode, 0) << run.out;
    EXPECT_EQ(run.out.rfind(message, 0), 0u) << run.out;
    EXPECT_EQ(registryChanges(changesSince(before)), "");
  }
  std::string before = snapshot();
  EXPECT_EQ(upgrade(kSingle).exitCode, 0);
  EXPECT_EQ(registryChanges(changesSince(before)), kSingleChanges);
}

// The step tells the instance's resources by a comparison that cannot fail:
// a failed library compare once read as "another resource", and the run
// ended in success with the resource unconverted.
TEST_F(ClusterE2eTest, FailedLibraryCompareStillFindsTheInstanceResource) {
  for (int call = 1; call <= 12; ++call) {
    SCOPED_TRACE(call);
    std::string before = snapshot();
    kxltest::CommandOutcome run = upgrade(kSingle, "sqlomcpi:" + std::to_string(call));
    if (run.exitCode == 0)
      EXPECT_TRUE(hasLine(show(), kCinst1Converted)) << "a completed run converted the resource";
    else
      EXPECT_EQ(registryChanges(changesSince(before)), "") << run.out;
    resetWorld("cluster");
  }
}

// One way the cluster step can end, and the repair after which a plain run succeeds.
struct StepCase {
  const char *name;
  const Args *args;
  std::function<void(ClusterE2eTest &)> prepare; // may be empty
  std::string faults;
  int result;                      // the step's, and so the run's
  std::vector<std::string> errors; // the step's error lines
  bool typeRegistered;
  std::vector<std::string> afterwards;          // lines of kxlsim show
  std::function<void(ClusterE2eTest &)> repair; // before the plain run; may be empty
  std::vector<std::string> rerun;               // lines of kxlsim show after the plain run
};

using Prepare = std::function<void(ClusterE2eTest &)>;
const char *const kClusterKey = "SOFTWARE\\ZAV\\KXLSIM\\Cluster";
const char *const kClusApi = "C:\\windows\\system32\\clusapi.dll";

// CINST1's group owned by the other node, where its service runs.
void runOnOtherNode(ClusterE2eTest &t, DWORD serviceState) {
  t.world.setString(kxlsim::localMachine(), std::string(kGroups) + "CINST1 Group", "OwnerNode", "WINSRV2");
  t.world.setDword(kxlsim::remoteMachine("WINSRV2"), "SOFTWARE\\ZAV\\KXLSIM\\Services\\CINST1", "State",
                   serviceState);
}

void setDependsOn(ClusterE2eTest &t, const std::string &resource, const std::vector<std::string> &names) {
  t.world.setMultiString(kxlsim::localMachine(), kResources + resource, "DependsOn", names);
}

const std::vector<std::string> kCinst2Unchanged = {
    "    CINST2-0       KXL              offline  depends on Disk F:",
    "    CINST2-1       KXL              offline  depends on Disk G:, CINST2 IP"};
const std::vector<std::string> kCinst2Converted = {
    "    CINST2-0       KXL Server       offline  depends on Disk F:",
    "    CINST2-1       KXL Server       offline  depends on Disk G:, CINST2 IP"};

// A failure of CINST1's step: its resource stays as it was, the type is not
// left registered, and after `repair` a plain run converts the resource.
StepCase singleFails(const char *name, const std::string &faults, int result, std::vector<std::string> errors,
                     Prepare prepare = {}, Prepare repair = {},
                     std::vector<std::string> afterwards = {kCinst1Unchanged}) {
  return {name, &kSingle, prepare, faults, result, errors, false, afterwards, repair, {kCinst1Converted}};
}

// The same for CINST2, whose partitions 0 and 1 have resources of the old type.
StepCase partitionedFails(const char *name, const std::string &faults, int result,
                          std::vector<std::string> errors) {
  return {name, &kPartitioned, {}, faults, result, errors, false, kCinst2Unchanged, {}, kCinst2Converted};
}

// Not a failure: CINST1's run succeeds, the type is registered, `shown` is in the cluster.
StepCase singleSucceeds(const char *name, Prepare prepare, const std::string &shown) {
  return {name, &kSingle, prepare, "", 0, {}, true, {shown}, {}, {}};
}

const std::vector<std::string> kStillOwned = {"probe=47 rc=-1", "probe=50 rc=-1254"};

// clang-format off
const StepCase kStepCases[] = {
    singleFails("ClusterLibraryMissing", "", -1251, {"probe=10 rc=-1251"},
                [](ClusterE2eTest &t) { fs::remove(t.hostPath(kClusApi)); },
                [](ClusterE2eTest &t) { t.world.writeText(kClusApi, "MZ simulated run-time module clusapi.dll\r\n"); }),
    singleFails("EntryPointMissing", "GetProcAddress:37", -1251, {"probe=10 rc=-1251"}),
    singleFails("LocalClusterServiceStopped", "", -1252, {"probe=20 rc=-1252"},
                [](ClusterE2eTest &t) { t.world.setDword(kxlsim::localMachine(), kClusterKey, "NodeState", 3); },
                [](ClusterE2eTest &t) { t.world.setDword(kxlsim::localMachine(), kClusterKey, "NodeState", 19); }),
    singleFails("TypeRegistrationRefused", "CreateClusterResourceType:1", -1252, {"probe=20 rc=-1252"}),
    singleFails("PutBackWithItsDependencies", "CreateClusterResource:1", -1252, {"probe=70 rc=-1252"}),
    // From here on the undo puts back what the step had changed: each
    // resource as it was, and the type it registered.
    singleFails("NewResourceWithoutAllDependencies", "AddClusterResourceDependency:1", -1252, {"probe=80 rc=-1252"}),
    singleFails("PutBackWithoutAllDependencies", "CreateClusterResource:1,AddClusterResourceDependency:1", -1253, {"probe=65 rc=-1253"}),
    singleFails("ResourceGone", "CreateClusterResource:1,CreateClusterResource:2", -1253, {"probe=60 rc=-1253"}),
    singleFails("OnlineOnTheOtherNode", "", -1254, kStillOwned, [](ClusterE2eTest &t) { runOnOtherNode(t, 4); },
                [](ClusterE2eTest &t) { runOnOtherNode(t, 1); },
                {"    CINST1         KXL              online   depends on Disk E:, Disk H:"}),
    singleFails("AnotherResourceDependsOnIt", "", -1254, kStillOwned,
                [](ClusterE2eTest &t) { kxlsim::addClusterResource(t.world, {"CINST1 App", "Generic Service", "CINST1 Group", {"CINST1"}}); },
                [](ClusterE2eTest &t) { setDependsOn(t, "CINST1 App", {}); }),
    partitionedFails("LaterPartitionNotDeleted", "DeleteClusterResource:2", -1254, kStillOwned),
    // A state the step cannot read ends it; nothing is taken for a value.
    singleFails("TypeCannotBeLookedUp", "ClusterResourceTypeOpenEnum:1", -1252, {"probe=20 rc=-1252"}),
    singleFails("ListingFails", "ClusterEnum:1", -1252, {"probe=40 rc=-1252"}),
    // The run's own reads of the nodes file come first and must succeed; the
    // step's first is the third.
    partitionedFails("NodesFileUnreadable", "sqloReadKxlnodes:3", -1252, {"probe=35 rc=-1252"}),
    // Not failures: a name in another letter case, a dependency that is gone.
    singleSucceeds("NameInAnotherCase",
                   [](ClusterE2eTest &t) {
                     SHDeleteKeyA(HKEY_LOCAL_MACHINE, (std::string(kResources) + "CINST1").c_str());
                     kxlsim::addClusterResource(t.world, {"cinst1", "KXL", "CINST1 Group", {"Disk E:", "Disk H:"}});
                   },
                   "    cinst1         KXL Server       offline  depends on Disk E:, Disk H:"),
    singleSucceeds("DependencyGone", [](ClusterE2eTest &t) { setDependsOn(t, "CINST1", {"Disk E:", "Disk Z:", "Disk H:"}); },
                   kCinst1Converted),
};
// clang-format on

void PrintTo(const StepCase &c, std::ostream *out) {
  *out << c.name;
}

class ClusterStepCase : public ClusterE2eTest, public ::testing::WithParamInterface<StepCase> {};

TEST_P(ClusterStepCase, EndsAsTheStepsLifecycleSaysAndAPlainRunThenSucceeds) {
  const StepCase &c = GetParam();
  if (c.prepare)
    c.prepare(*this);
  std::string before = snapshot();
  kxltest::CommandOutcome run = upgrade(*c.args, c.faults);
  EXPECT_NE(run.trace.find("exit 0x18780509 rc=" + std::to_string(c.result) + "\n"), std::string::npos)
      << run.trace;
  std::string errors;
  for (const std::string &error : c.errors)
    errors += "error 0x18780509 " + error + "\n";
  EXPECT_EQ(
      linesWhere(run.trace, [](const std::string &line) { return line.rfind("error 0x18780509 ", 0) == 0; }),
      errors);
  EXPECT_EQ(run.out.find("SQLCODE=0"), std::string::npos) << run.out;
  if (c.result != 0) {
    EXPECT_NE(run.trace.find("error 0x18780502 probe=200 rc=" + std::to_string(c.result)), std::string::npos);
    EXPECT_EQ(run.out.rfind("KXL" + std::to_string(-c.result) + "E", 0), 0u) << run.out;
    // Every node's services are back, the account given with -u aside (written as given).
    EXPECT_EQ(linesWhere(changesSince(before),
                         [](const std::string &line) {
                           return line.find("\\Services\\") != std::string::npos &&
                                  line.find("\"ObjectName\"") == std::string::npos;
                         }),
              "");
  } else {
    EXPECT_EQ(run.exitCode, 0) << run.out;
  }
  std::string cluster = show();
  EXPECT_EQ(hasLine(cluster, kServerType), c.typeRegistered) << cluster;
  for (const std::string &line : c.afterwards)
    EXPECT_TRUE(hasLine(cluster, line)) << line << "\n" << cluster;
  if (c.result == 0)
    return;

  if (c.repair)
    c.repair(*this);
  kxltest::CommandOutcome again = upgrade(*c.args);
  EXPECT_EQ(again.exitCode, 0) << again.out;
  cluster = show();
  for (const std::string &line : c.rerun)
    EXPECT_TRUE(hasLine(cluster, line)) << line << "\n" << cluster;
}

INSTANTIATE_TEST_SUITE_P(Cluster, ClusterStepCase, ::testing::ValuesIn(kStepCases),
                         [](const ::testing::TestParamInfo<StepCase> &info) { return info.param.name; });

} // namespace
