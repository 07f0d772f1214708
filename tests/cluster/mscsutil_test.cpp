// MSCSUtil over a world whose registry holds a small cluster. A probe class
// routes every handle-opening and handle-closing entry point through counters,
// so each case can check that no operation leaves a cluster handle open.
#include "cluster/mscsutil.h"

#include "cluster/clusterstep.h"
#include "install/kxlinstance.h"
#include "upgrade/records.h"

#include "sim/posix/modules.h"
#include "sim/posix/world.h"
#include "tests/support/world_access.h"

#include <gtest/gtest.h>

#include <set>
#include <string>
#include <vector>

namespace {

const std::string kCluster = "SOFTWARE\\ZAV\\KXLSIM\\Cluster";
const std::string kResources = kCluster + "\\Resources\\";

// Cluster handles that an operation opened and has not closed yet.
std::multiset<const void *> &liveHandles() {
  static std::multiset<const void *> live;
  return live;
}

template <typename F> struct OpenCounter;
template <typename H, typename... A> struct OpenCounter<H(WINAPI *)(A...)> {
  static inline H(WINAPI *real)(A...) = nullptr;
  static H WINAPI call(A... args) {
    H handle = real(args...);
    if (handle != nullptr)
      liveHandles().insert(handle);
    return handle;
  }
};

template <typename F> struct CloseCounter;
template <typename R, typename H> struct CloseCounter<R(WINAPI *)(H)> {
  static inline R(WINAPI *real)(H) = nullptr;
  static R WINAPI call(H handle) {
    auto found = liveHandles().find(handle);
    if (found != liveHandles().end())
      liveHandles().erase(found);
    return real(handle);
  }
};

template <template <typename> class Counter, typename F> void route(F &slot) {
  Counter<F>::real = slot;
  slot = &Counter<F>::call;
}

class ProbedMSCSUtil : public MSCSUtil {
public:
  int32_t Bind() {
    int32_t rc = LoadClusterApi();
    if (rc == 0) {
      route<OpenCounter>(openCluster);
      route<CloseCounter>(closeCluster);
      route<OpenCounter>(openClusterGroup);
      route<CloseCounter>(closeClusterGroup);
      route<OpenCounter>(clusterOpenEnum);
      route<CloseCounter>(clusterCloseEnum);
      route<OpenCounter>(openClusterResource);
      route<OpenCounter>(createClusterResource);
      route<CloseCounter>(closeClusterResource);
      route<OpenCounter>(clusterResourceOpenEnum);
      route<CloseCounter>(clusterResourceCloseEnum);
    }
    return rc;
  }
  // Which entry points a partial binding left set.
  bool BoundThroughCloseClusterResource() const { return moveClusterGroup && closeClusterResource; }
  bool AnyBoundAfterCloseClusterResource() const {
    return onlineClusterResource || getNodeClusterState || resUtilStartResourceService ||
           resUtilResourceTypesEqual;
  }
};

std::vector<std::string> names(const ClusterResourceList &list) {
  std::vector<std::string> out;
  for (const ClusterResourceEntry &entry : list)
    out.push_back(std::string(entry.name) + "@" + entry.group);
  return out;
}

class ClusterWorld : public kxltest::WorldTest {
protected:
  void SetUp() override {
    WorldTest::SetUp();
    liveHandles().clear();
  }
  void TearDown() override {
    EXPECT_TRUE(liveHandles().empty()) << liveHandles().size() << " cluster handles left open";
    WorldTest::TearDown();
  }
  void installModule(const char *name) { writeFile(std::string("C:\\windows\\system32\\") + name, "MZ"); }
};

// A running node with one group, two resource types and three resources.
class ClusterOps : public ClusterWorld {
protected:
  void SetUp() override {
    ClusterWorld::SetUp();
    installModule("clusapi.dll");
    installModule("resutils.dll");
    setDword(kCluster, "NodeState", 19);
    setDword(kCluster + "\\Groups\\G1", "State", 0);
    setDword(kCluster + "\\Groups\\G2", "State", 0);
    addType("KXL Server");
    addType("Physical Disk");
    addResource("A-inst", "KXL Server", "G2");
    addResource("B-disk", "Physical Disk", "G1");
    addResource("C-inst", "KXL Server", "G1");
    addResource("D-case", "kxl server", "G1");
    ASSERT_EQ(util.Bind(), 0);
  }
  void addType(const std::string &type) {
    setString(kCluster + "\\ResourceTypes\\" + type, "DllName", "x.dll");
  }
  void addResource(const std::string &name, const std::string &type, const std::string &group) {
    setString(kResources + name, "Type", type);
    setString(kResources + name, "Group", group);
  }
  void setDependsOn(const std::string &name, const std::string &multi) {
    setRegValue(kResources + name, "DependsOn", REG_MULTI_SZ, multi.data(), DWORD(multi.size()));
  }
  ClusterResourceList entries(std::initializer_list<const char *> list) {
    ClusterResourceList out;
    for (const char *name : list) {
      ClusterResourceEntry entry;
      std::snprintf(entry.name, sizeof entry.name, "%s", name);
      out.push_back(entry);
    }
    return out;
  }
  // What a listing gave ("name@group" each), or "failed" when it reported a failure.
  std::vector<std::string> ofType(const char *type) {
    ClusterResourceList found;
    return util.GetResourcesOfType(type, found) == 0 ? names(found) : std::vector<std::string>{"failed"};
  }
  std::vector<std::string> dependenciesOf(const char *name) {
    ClusterResourceList found;
    return util.GetResourceDependencies(name, found) == 0 ? names(found) : std::vector<std::string>{"failed"};
  }
  const std::vector<std::string> failed{"failed"};
  const std::vector<std::string> none;

  ProbedMSCSUtil util;
};

using Binding = ClusterWorld;

// Both modules and every entry point, or no binding; the modules are released
// by the destructor. The 20th lookup is OnlineClusterResource (the first 19
// stay bound), the 36th one of the resource utilities; clusapi.dll is not
// loaded without resutils.dll.
TEST_F(Binding, NeedsBothModulesAndEveryEntryPoint) {
  const struct {
    std::vector<const char *> modules;
    const char *fault;
    int32_t rc;
    std::vector<int> loaded; // clusapi.dll, resutils.dll while bound; empty: not looked at
    bool partial;            // bound up to CloseClusterResource and no further
  } rows[] = {{{"clusapi.dll", "resutils.dll"}, nullptr, 0, {1, 1}, false},
              {{"clusapi.dll", "resutils.dll"}, "GetProcAddress:20", -1, {}, true},
              {{"clusapi.dll", "resutils.dll"}, "GetProcAddress:36", -1, {}, false},
              {{"resutils.dll"}, nullptr, -1, {0, 1}, false},
              {{"clusapi.dll"}, nullptr, -1, {0, 0}, false}};
  for (const auto &row : rows) {
    SCOPED_TRACE(std::string(row.modules.back()) + " " + (row.fault != nullptr ? row.fault : ""));
    remove(host("drive_c/windows/system32/clusapi.dll").c_str());
    remove(host("drive_c/windows/system32/resutils.dll").c_str());
    for (const char *module : row.modules)
      installModule(module);
    failCalls(row.fault);
    {
      ProbedMSCSUtil util;
      EXPECT_EQ(util.Bind(), row.rc);
      EXPECT_TRUE(row.loaded.empty() ||
                  row.loaded == std::vector<int>({kxlsim::posix::moduleLoadCount("clusapi.dll"),
                                                  kxlsim::posix::moduleLoadCount("resutils.dll")}));
      EXPECT_TRUE(!row.partial ||
                  (util.BoundThroughCloseClusterResource() && !util.AnyBoundAfterCloseClusterResource()));
    }
    EXPECT_EQ(kxlsim::posix::moduleLoadCount("clusapi.dll"), 0);
    EXPECT_EQ(kxlsim::posix::moduleLoadCount("resutils.dll"), 0);
  }
}

TEST_F(ClusterOps, RegistersATypeOnceAndOnlyOnARunningNode) {
  EXPECT_EQ(util.CreateResourceType(u"New Type", u"New Display", u"new.dll", 5000, 60000), 0);
  EXPECT_EQ(getString(kCluster + "\\ResourceTypes\\New Type", "DllName"), "new.dll");
  EXPECT_EQ(getDword(kCluster + "\\ResourceTypes\\New Type", "IsAlivePollInterval"), 60000u);
  EXPECT_EQ(util.CreateResourceType(u"New Type", u"New Display", u"new.dll", 5000, 60000), 0)
      << "an existing type counts as registered";
}

TEST_F(ClusterOps, ListsAndTestsResourcesOfExactlyTheTypeInEnumerationOrder) {
  ClusterResourceList found;
  ASSERT_EQ(util.GetResourcesOfType("KXL Server", found), 0);
  EXPECT_EQ(names(found), (std::vector<std::string>{"A-inst@G2", "C-inst@G1"}))
      << "a type differing only in case is not listed";
  ASSERT_EQ(found.size(), 2u);
  EXPECT_EQ(std::u16string(found[1].wideName), u"C-inst");
  EXPECT_EQ(std::u16string(found[1].wideGroup), u"G1");
  EXPECT_EQ(ofType("No Type"), none);
  EXPECT_NE(util.IsResourceOfType("C-inst", "KXL Server"), 0);
  EXPECT_EQ(util.IsResourceOfType("B-disk", "KXL Server"), 0);
  EXPECT_EQ(util.IsResourceOfType("Missing", "KXL Server"), 0);
}

TEST_F(ClusterOps, ListsDependenciesWithEmptyGroupsAndLeavesOutOverlongNames) {
  const std::string overlong(70, 'x');
  setDependsOn("C-inst", std::string("B-disk\0", 7) + overlong + std::string("\0A-inst\0\0", 9));
  EXPECT_EQ(dependenciesOf("C-inst"), (std::vector<std::string>{"B-disk@", "A-inst@"}));
  ClusterResourceList dependencies;
  ASSERT_EQ(util.GetResourceDependencies("C-inst", dependencies), 0);
  ASSERT_FALSE(dependencies.empty());
  EXPECT_EQ(dependencies[0].wideGroup[0], 0);
  EXPECT_EQ(dependenciesOf("B-disk"), none);
  EXPECT_EQ(dependenciesOf("Missing"), failed);
}

// A missing resource counts as deleted; a new one runs in its own monitor.
TEST_F(ClusterOps, DeletesAndCreatesResources) {
  EXPECT_EQ(util.DeleteResource("B-disk"), 0);
  EXPECT_FALSE(keyExists(kResources + "B-disk"));
  EXPECT_EQ(util.DeleteResource("B-disk"), 0);
  EXPECT_EQ(util.DeleteResource(std::string(80, 'y').c_str()), 0);

  HRESOURCE created = util.CreateResource("G1", "New-inst", "KXL Server");
  ASSERT_NE(created, nullptr);
  EXPECT_EQ(getString(kResources + "New-inst", "Type"), "KXL Server");
  EXPECT_EQ(getString(kResources + "New-inst", "Group"), "G1");
  EXPECT_EQ(getDword(kResources + "New-inst", "SeparateMonitor"), 1u);
  util.CloseResource(created);

  EXPECT_EQ(util.CreateResource("G1", "New-inst", "KXL Server"), nullptr) << "exists";
  EXPECT_EQ(util.CreateResource("No Group", "Other", "KXL Server"), nullptr);
  EXPECT_EQ(util.CreateResource("G1", "Other", "No Type"), nullptr);
  EXPECT_EQ(util.CreateResource("G1", std::string(65, 'z').c_str(), "KXL Server"), nullptr)
      << "a name that does not fit is refused, not cut";
  EXPECT_FALSE(keyExists(kResources + std::string(64, 'z')));
}

TEST_F(ClusterOps, AddsEachDependencyThatCanBeOpenedAndReportsFailedOnes) {
  EXPECT_EQ(util.AddResourceDependencies("C-inst", {}), 0);
  EXPECT_EQ(util.AddResourceDependencies("C-inst", entries({"B-disk", "Gone", "D-case"})), 0);
  EXPECT_EQ(dependenciesOf("C-inst"), (std::vector<std::string>{"B-disk@", "D-case@"}));
  // C-inst would close a cycle; D-case -> B-disk still goes in.
  EXPECT_EQ(util.AddResourceDependencies("D-case", entries({"C-inst", "B-disk"})), -1);
  EXPECT_EQ(dependenciesOf("D-case"), (std::vector<std::string>{"B-disk@"}));
  EXPECT_EQ(util.AddResourceDependencies("A-inst", entries({"B-disk"})), -1) << "B-disk is in another group";
  EXPECT_EQ(dependenciesOf("A-inst"), none);
  EXPECT_EQ(util.AddResourceDependencies("Missing", entries({"B-disk"})), -1);
  ClusterResourceList dependencies;
  ASSERT_EQ(util.GetResourceDependencies("C-inst", dependencies), 0);
  EXPECT_EQ(util.AddResourceDependencies("C-inst", dependencies), -1) << "each already exists";
}

// No cluster to open (a node whose cluster service is not running, or the
// open failing): every operation fails and changes nothing.
TEST_F(ClusterOps, FailedOpensChangeNothingAndLeaveNoHandleOpen) {
  for (bool stopped : {false, true}) {
    if (stopped)
      setDword(kCluster, "NodeState", 3);
    else
      failCalls("OpenCluster:1,OpenCluster:2,OpenCluster:3,OpenCluster:4,OpenCluster:5,OpenCluster:6,"
                "OpenCluster:7");
    EXPECT_EQ(util.CreateResourceType(u"T", u"T", u"t.dll", 1, 1), -1);
    EXPECT_EQ(ofType("KXL Server"), failed);
    EXPECT_EQ(util.IsResourceOfType("C-inst", "KXL Server"), 0);
    EXPECT_EQ(dependenciesOf("C-inst"), failed);
    EXPECT_EQ(util.DeleteResource("C-inst"), -1);
    EXPECT_EQ(util.CreateResource("G1", "X", "KXL Server"), nullptr);
    EXPECT_EQ(util.AddResourceDependencies("C-inst", entries({"B-disk"})), -1);
    EXPECT_TRUE(keyExists(kResources + "C-inst"));
    EXPECT_FALSE(keyExists(kResources + "X"));
    EXPECT_FALSE(keyExists(kCluster + "\\ResourceTypes\\T"));
    EXPECT_TRUE(liveHandles().empty());
  }
  setDword(kCluster, "NodeState", 19);
  failCalls("ClusterOpenEnum:1,ClusterResourceOpenEnum:1,OpenClusterResource:2,OpenClusterGroup:1");
  EXPECT_EQ(ofType("KXL Server"), failed);
  setDependsOn("C-inst", std::string("B-disk\0\0", 8));
  EXPECT_EQ(dependenciesOf("C-inst"), failed);
  EXPECT_EQ(util.AddResourceDependencies("C-inst", entries({"A-inst"})), -1);
  EXPECT_EQ(util.CreateResource("G1", "X", "KXL Server"), nullptr);
  EXPECT_TRUE(liveHandles().empty());
}

// A failed read is reported, never taken for a value: a listing cut short, a
// type or group that cannot be read, a name that cannot be converted.
TEST_F(ClusterOps, ReadsThatFailAreReported) {
  for (const char *plan : {"ClusterResourceControl:1", "ClusterEnum:2", "GetClusterResourceState:1",
                           "OpenClusterResource:1", "WideCharToMultiByte:1"}) {
    failCalls(plan);
    EXPECT_EQ(ofType("KXL Server"), failed) << plan;
  }
  setDependsOn("C-inst", std::string("B-disk\0\0", 8));
  for (const char *plan : {"ClusterResourceEnum:1", "WideCharToMultiByte:1"}) {
    failCalls(plan);
    EXPECT_EQ(dependenciesOf("C-inst"), failed) << plan;
  }
  ClusterResourceFacts facts;
  for (const char *plan : {"ClusterEnum:1", "ClusterResourceControl:2", "OpenClusterResource:1"}) {
    failCalls(plan);
    EXPECT_EQ(util.ReadResource("C-inst", facts), -1) << plan;
  }
  failCalls("OpenClusterResource:2");
  EXPECT_EQ(util.AddResourceDependencies("D-case", entries({"B-disk"})), -1)
      << "a listed dependency that cannot be opened is not passed over";
}

// The facts the journal keeps: type, group, monitor and dependencies; a
// resource the cluster does not list reads as absent.
TEST_F(ClusterOps, ReadsAResourceWhole) {
  setDependsOn("C-inst", std::string("B-disk\0\0", 8));
  setDword(kResources + "C-inst", "SeparateMonitor", 1);
  ClusterResourceFacts facts;
  ASSERT_EQ(util.ReadResource("c-INST", facts), 0);
  EXPECT_TRUE(facts.exists);
  EXPECT_STREQ(facts.type, "KXL Server");
  EXPECT_STREQ(facts.entry.group, "G1");
  EXPECT_TRUE(facts.separateMonitor);
  EXPECT_EQ(names(facts.dependencies), (std::vector<std::string>{"B-disk@"}));
  ASSERT_EQ(util.ReadResource("Missing", facts), 0);
  EXPECT_FALSE(facts.exists);
  EXPECT_EQ(util.ResourceTypeExists(u"KXL Server"), 1);
  EXPECT_EQ(util.ResourceTypeExists(u"No Type"), 0);
  EXPECT_EQ(util.DeleteResourceType(u"Physical Disk"), -1) << "B-disk is of that type";
  EXPECT_EQ(util.DeleteResourceType(u"No Type"), 0);
}

// The step asked for the old type converts the other way: the instance's
// "KXL Server" resource becomes "KXL" with its dependency; another name stays.
TEST_F(ClusterOps, StepConvertsBackWhenAskedForTheOldType) {
  addType("KXL");
  setDependsOn("C-inst", std::string("B-disk") + '\0');
  IKXLINSTANCE instance("C-INST", nullptr, "C:\\prof\\C-INST");
  UpgradeContext context;
  context.instance = &instance;
  UpgradeOptions options{};
  std::snprintf(options.instanceName, sizeof options.instanceName, "C-INST");
  EXPECT_EQ(upgradeClusterInstance(context, 0, options), 0);
  context.instance = nullptr;
  EXPECT_EQ(getString(kResources + "C-inst", "Type"), "KXL");
  EXPECT_EQ(dependenciesOf("C-inst"), (std::vector<std::string>{"B-disk@"}));
  EXPECT_EQ(getString(kResources + "A-inst", "Type"), "KXL Server");
  EXPECT_TRUE(keyExists(kCluster + "\\ResourceTypes\\KXL Server"));
}

} // namespace
