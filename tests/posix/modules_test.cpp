// The run-time modules: the cluster API over the world's cluster and the ODBC data source
// list. Loading and binding them is stated by the cluster step's cases (tests/cluster).
#include "tests/support/world_access.h"

#include "platform/clusapi.h"
#include "platform/odbc.h"

#include <string>
#include <vector>

namespace {

template <typename F> F entry(HMODULE module, const char *name) {
  FARPROC address = GetProcAddress(module, name);
  EXPECT_NE(address, nullptr) << name;
  return reinterpret_cast<F>(reinterpret_cast<void (*)()>(address));
}

class ModulesTest : public kxltest::WorldTest {
protected:
  ModulesTest() : WorldTest(kxltestsupport::Machine::kModules) {}
};

// The entry points the cluster case uses, bound by name as the command does.
#define KXL_BOUND(module, name) PFN_##name name = entry<PFN_##name>(module, #name)
struct ClusterApi {
  HMODULE clusapi = LoadLibraryA("clusapi.dll"), resutils = LoadLibraryA("resutils.dll");
  KXL_BOUND(clusapi, OpenCluster);
  KXL_BOUND(clusapi, OpenClusterGroup);
  KXL_BOUND(clusapi, CreateClusterResourceType);
  KXL_BOUND(clusapi, CreateClusterResource);
  KXL_BOUND(clusapi, CloseClusterResource);
  KXL_BOUND(clusapi, DeleteClusterResource);
  KXL_BOUND(clusapi, AddClusterResourceDependency);
  KXL_BOUND(clusapi, GetClusterResourceState);
  KXL_BOUND(resutils, ResUtilResourceTypesEqual);
#undef KXL_BOUND
  ~ClusterApi() {
    FreeLibrary(clusapi);
    FreeLibrary(resutils);
  }
};

// What the cluster cases of the command do not tell apart (each refusal there is a failure):
// a resource named like a service of the node owning its group is online exactly while that
// service runs, and neither an online resource nor one another depends on can be deleted.
TEST_F(ModulesTest, ClusterResourcesFollowTheirServicesAndDependencies) {
  const std::string cluster = "SOFTWARE\\ZAV\\KXLSIM\\Cluster",
                    services = "SOFTWARE\\ZAV\\KXLSIM\\Services\\";
  const std::string remoteServices = "SOFTWARE\\ZAV\\KXLSIM\\Machines\\NODE2\\" + services;
  setDword(cluster, "NodeState", ClusterStateRunning);
  setDword(cluster + "\\Groups\\G1", "State", 0);
  setString(cluster + "\\Groups\\G2", "OwnerNode", "NODE2");
  setDword(services + "INST1", "State", 4);
  setDword(remoteServices + "INST2", "State", 1);
  ClusterApi api;
  HCLUSTER handle = api.OpenCluster(nullptr);
  ASSERT_NE(handle, nullptr);
  EXPECT_EQ(api.CreateClusterResourceType(handle, u"KXL Server", u"KXL Server", u"kxl.dll", 5000, 60000), 0u);
  HGROUP g1 = api.OpenClusterGroup(handle, u"g1"), g2 = api.OpenClusterGroup(handle, u"G2");
  HRESOURCE inst1 = api.CreateClusterResource(g1, u"INST1", u"KXL Server", 0);
  HRESOURCE inst2 = api.CreateClusterResource(g2, u"INST2", u"KXL Server", 0);
  HRESOURCE disk = api.CreateClusterResource(g1, u"Disk1", u"KXL Server", 0);
  ASSERT_TRUE(inst1 != nullptr && inst2 != nullptr && disk != nullptr);
  WCHAR group[65];
  DWORD size = 65;
  EXPECT_EQ(api.GetClusterResourceState(inst1, nullptr, nullptr, group, &size), ClusterResourceOnline);
  EXPECT_EQ(std::u16string(group), u"G1") << "the group's name as stored";
  size = 65;
  EXPECT_EQ(api.GetClusterResourceState(inst2, nullptr, nullptr, group, &size), ClusterResourceOffline);
  EXPECT_TRUE(api.ResUtilResourceTypesEqual(u"kxl server", inst1));
  EXPECT_FALSE(api.ResUtilResourceTypesEqual(u"KXL", inst1));

  EXPECT_EQ(api.AddClusterResourceDependency(inst1, disk), 0u);
  EXPECT_EQ(api.DeleteClusterResource(disk), DWORD(ERROR_DEPENDENT_RESOURCE_EXISTS));
  EXPECT_EQ(api.DeleteClusterResource(inst1), DWORD(ERROR_RESOURCE_ONLINE));
  setDword(services + "INST1", "State", 1);
  EXPECT_EQ(api.DeleteClusterResource(inst1), 0u);
  setDword(remoteServices + "INST2", "State", 4);
  EXPECT_EQ(api.DeleteClusterResource(inst2), DWORD(ERROR_RESOURCE_ONLINE))
      << "the service of its owner node";
  EXPECT_EQ(api.DeleteClusterResource(disk), 0u) << "no longer depended on";
  for (HRESOURCE resource : {inst1, inst2, disk})
    EXPECT_TRUE(api.CloseClusterResource(resource));
}

// Machine sources, then the user's, then SQL_NO_DATA; a first fetch starts over. Long texts are
// cut with their full lengths reported.
TEST_F(ModulesTest, OdbcListsMachineThenUserSources) {
  const char *sources = "SOFTWARE\\ODBC\\ODBC.INI\\ODBC Data Sources";
  setString(sources, "SystemSource", "ZAV KXL ODBC DRIVER - COPY1");
  HKEY user = nullptr;
  ASSERT_EQ(
      RegCreateKeyExA(HKEY_CURRENT_USER, sources, 0, nullptr, 0, KEY_ALL_ACCESS, nullptr, &user, nullptr),
      ERROR_SUCCESS);
  ASSERT_EQ(RegSetValueExA(user, "UserSource", 0, REG_SZ, reinterpret_cast<const BYTE *>("Other"), 6),
            ERROR_SUCCESS);
  RegCloseKey(user);
  HMODULE odbc = LoadLibraryA("odbc32.dll");
  ASSERT_NE(odbc, nullptr);
  auto dataSources = entry<PFN_SQLDataSources>(odbc, "SQLDataSources");
  SQLHENV env = nullptr;
  ASSERT_EQ(entry<PFN_SQLAllocEnv>(odbc, "SQLAllocEnv")(&env), SQL_SUCCESS);
  const struct {
    SQLHENV env;
    SQLUSMALLINT direction;
    SQLSMALLINT nameSize;
    SQLRETURN rc;
    std::string name, driver;
    SQLSMALLINT nameLength;
  } rows[] = {
      {env, SQL_FETCH_FIRST, 256, SQL_SUCCESS, "SystemSource", "ZAV KXL ODBC DRIVER - COPY1", 12},
      {env, SQL_FETCH_NEXT, 256, SQL_SUCCESS, "UserSource", "Other", 10},
      {env, SQL_FETCH_NEXT, 256, SQL_NO_DATA, "", "", 0},
      {env, SQL_FETCH_FIRST, 7, SQL_SUCCESS_WITH_INFO, "System", "ZAV KXL ODBC DRIVER - COPY1", 12},
      {env, 77, 256, SQL_ERROR, "", "", 0},
      {&user, SQL_FETCH_FIRST, 256, SQL_INVALID_HANDLE, "", "", 0},
  };
  for (const auto &row : rows) {
    SQLCHAR name[256] = {}, driver[256] = {};
    SQLSMALLINT nameLength = 0, driverLength = 0;
    EXPECT_EQ(
        dataSources(row.env, row.direction, name, row.nameSize, &nameLength, driver, 256, &driverLength),
        row.rc);
    EXPECT_EQ(reinterpret_cast<char *>(name), row.name);
    EXPECT_EQ(reinterpret_cast<char *>(driver), row.driver);
    EXPECT_EQ(nameLength, row.nameLength);
  }
  FreeLibrary(odbc);
}

} // namespace
