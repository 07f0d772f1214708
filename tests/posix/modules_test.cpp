// The run-time modules: loading by the world's files, the cluster API over
// the world's cluster, and the ODBC data source list.
#include "tests/support/world_access.h"

#include "platform/clusapi.h"
#include "platform/odbc.h"
#include "sim/posix/modules.h"

#include <optional>
#include <set>
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

TEST_F(ModulesTest, ModulesLoadOnlyWhenTheWorldHasTheirFiles) {
  EXPECT_EQ(LoadLibraryA("kernel99.dll"), nullptr);
  EXPECT_EQ(GetLastError(), static_cast<DWORD>(ERROR_MOD_NOT_FOUND));
  HMODULE clusapi = LoadLibraryA("CLUSAPI.DLL");
  HMODULE resutils = LoadLibraryA("C:\\Windows\\System32\\resutils");
  ASSERT_NE(clusapi, nullptr);
  ASSERT_NE(resutils, nullptr);
  EXPECT_NE(GetProcAddress(resutils, "ResUtilResourceTypesEqual"), nullptr);
  EXPECT_EQ(GetProcAddress(clusapi, "ResUtilResourceTypesEqual"), nullptr)
      << "exports belong to their module";
  EXPECT_EQ(GetLastError(), static_cast<DWORD>(ERROR_PROC_NOT_FOUND));

  char path[MAX_PATH];
  ASSERT_GT(GetModuleFileNameA(clusapi, path, sizeof path), 0u);
  EXPECT_STREQ(path, "C:\\windows\\system32\\CLUSAPI.DLL");
  EXPECT_EQ(kxlsim::posix::moduleLoadCount("clusapi.dll"), 1);
  EXPECT_TRUE(FreeLibrary(clusapi));
  EXPECT_TRUE(FreeLibrary(resutils));
  EXPECT_EQ(kxlsim::posix::moduleLoadCount("clusapi.dll"), 0);
  EXPECT_FALSE(FreeLibrary(clusapi)) << "a freed module handle is no longer valid";
  EXPECT_EQ(GetProcAddress(clusapi, "OpenCluster"), nullptr);
  ASSERT_TRUE(DeleteFileA("C:\\windows\\system32\\clusapi.dll"));
  EXPECT_EQ(LoadLibraryA("clusapi.dll"), nullptr) << "the world no longer has the module";
  EXPECT_EQ(GetLastError(), static_cast<DWORD>(ERROR_MOD_NOT_FOUND));
}

// The entry points the cluster cases use, bound by name as the command does.
#define KXL_BOUND(module, name) PFN_##name name = entry<PFN_##name>(module, #name)
struct ClusterApi {
  HMODULE clusapi = LoadLibraryA("clusapi.dll"), resutils = LoadLibraryA("resutils.dll");
  KXL_BOUND(clusapi, OpenCluster);
  KXL_BOUND(clusapi, CloseCluster);
  KXL_BOUND(clusapi, OpenClusterGroup);
  KXL_BOUND(clusapi, CloseClusterGroup);
  KXL_BOUND(clusapi, ClusterOpenEnum);
  KXL_BOUND(clusapi, ClusterEnum);
  KXL_BOUND(clusapi, ClusterCloseEnum);
  KXL_BOUND(clusapi, CreateClusterResourceType);
  KXL_BOUND(clusapi, CreateClusterResource);
  KXL_BOUND(clusapi, OpenClusterResource);
  KXL_BOUND(clusapi, CloseClusterResource);
  KXL_BOUND(clusapi, DeleteClusterResource);
  KXL_BOUND(clusapi, AddClusterResourceDependency);
  KXL_BOUND(clusapi, ClusterResourceOpenEnum);
  KXL_BOUND(clusapi, ClusterResourceEnum);
  KXL_BOUND(clusapi, ClusterResourceCloseEnum);
  KXL_BOUND(clusapi, ClusterResourceControl);
  KXL_BOUND(clusapi, GetClusterResourceState);
  KXL_BOUND(clusapi, GetNodeClusterState);
  KXL_BOUND(resutils, ResUtilResourceTypesEqual);
#undef KXL_BOUND

  // A resource type shown under its own name, with the usual poll intervals.
  DWORD addType(HCLUSTER cluster, const char16_t *name, const char16_t *dll = u"kxl.dll") {
    return CreateClusterResourceType(cluster, name, name, dll, 5000, 60000);
  }

  ~ClusterApi() {
    FreeLibrary(clusapi);
    FreeLibrary(resutils);
  }

  std::vector<std::u16string> dependencies(HRESOURCE resource) {
    std::vector<std::u16string> names;
    HRESENUM listing = ClusterResourceOpenEnum(resource, CLUSTER_RESOURCE_ENUM_DEPENDS);
    WCHAR name[65];
    DWORD type = 0;
    DWORD rc = ERROR_SUCCESS;
    for (DWORD i = 0;; ++i) {
      DWORD size = 65;
      if ((rc = ClusterResourceEnum(listing, i, &type, name, &size)) != ERROR_SUCCESS)
        break;
      names.emplace_back(name);
    }
    EXPECT_EQ(rc, static_cast<DWORD>(ERROR_NO_MORE_ITEMS));
    ClusterResourceCloseEnum(listing);
    return names;
  }
};

class ClusterTest : public ModulesTest {
protected:
  void SetUp() override {
    ModulesTest::SetUp();
    setDword("SOFTWARE\\ZAV\\KXLSIM\\Cluster", "NodeState", ClusterStateRunning);
    setDword("SOFTWARE\\ZAV\\KXLSIM\\Cluster\\Groups\\G1", "State", 0);
    api.emplace();
  }
  std::optional<ClusterApi> api; // bound once the world is entered
};

TEST_F(ClusterTest, ResourcesAreCreatedEnumeratedLinkedAndDeleted) {
  HCLUSTER cluster = api->OpenCluster(nullptr);
  ASSERT_NE(cluster, nullptr);
  EXPECT_EQ(api->addType(cluster, u"KXL Server"), 0u);
  EXPECT_EQ(api->addType(cluster, u"kxl server"), static_cast<DWORD>(ERROR_ALREADY_EXISTS));
  EXPECT_EQ(api->addType(cluster, u"Physical Disk", u"clusres.dll"), 0u);

  EXPECT_EQ(api->OpenClusterGroup(cluster, u"NoGroup"), nullptr);
  EXPECT_EQ(GetLastError(), static_cast<DWORD>(ERROR_GROUP_NOT_FOUND));
  HGROUP group = api->OpenClusterGroup(cluster, u"g1");
  ASSERT_NE(group, nullptr);
  HRESOURCE server =
      api->CreateClusterResource(group, u"INST1", u"KXL Server", CLUSTER_RESOURCE_SEPARATE_MONITOR);
  HRESOURCE disk = api->CreateClusterResource(group, u"Disk1", u"Physical Disk", 0);
  ASSERT_NE(server, nullptr);
  ASSERT_NE(disk, nullptr);
  EXPECT_EQ(api->CreateClusterResource(group, u"inst1", u"KXL Server", 0), nullptr);
  EXPECT_EQ(GetLastError(), static_cast<DWORD>(ERROR_OBJECT_ALREADY_EXISTS));
  EXPECT_EQ(api->CreateClusterResource(group, u"Other", u"No Such Type", 0), nullptr);
  EXPECT_EQ(GetLastError(), static_cast<DWORD>(ERROR_RESOURCE_TYPE_NOT_FOUND));

  EXPECT_EQ(api->AddClusterResourceDependency(server, disk), 0u);
  EXPECT_EQ(api->AddClusterResourceDependency(server, disk),
            static_cast<DWORD>(ERROR_DEPENDENCY_ALREADY_EXISTS));
  EXPECT_EQ(api->AddClusterResourceDependency(disk, server), static_cast<DWORD>(ERROR_CIRCULAR_DEPENDENCY));
  EXPECT_EQ(api->dependencies(server), std::vector<std::u16string>{u"Disk1"});

  BYTE type[130] = {};
  DWORD returned = 0;
  EXPECT_EQ(api->ClusterResourceControl(server, nullptr, CLUSCTL_RESOURCE_GET_RESOURCE_TYPE, nullptr, 0, type,
                                        sizeof type, &returned),
            0u);
  EXPECT_EQ(std::u16string(reinterpret_cast<const char16_t *>(type)), u"KXL Server");
  EXPECT_EQ(returned, 22u);
  EXPECT_EQ(api->ClusterResourceControl(server, nullptr, CLUSCTL_RESOURCE_GET_RESOURCE_TYPE, nullptr, 0, type,
                                        4, &returned),
            static_cast<DWORD>(ERROR_MORE_DATA));
  EXPECT_EQ(returned, 22u);

  WCHAR groupName[65];
  DWORD groupSize = 65;
  EXPECT_EQ(api->GetClusterResourceState(server, nullptr, nullptr, groupName, &groupSize),
            ClusterResourceOffline);
  EXPECT_EQ(std::u16string(groupName), u"G1") << "the group's name as stored";
  EXPECT_TRUE(api->ResUtilResourceTypesEqual(u"kxl server", server));
  EXPECT_FALSE(api->ResUtilResourceTypesEqual(u"KXL", server));

  EXPECT_EQ(api->DeleteClusterResource(disk), static_cast<DWORD>(ERROR_DEPENDENT_RESOURCE_EXISTS));
  EXPECT_EQ(api->dependencies(server), std::vector<std::u16string>{u"Disk1"});
  EXPECT_EQ(api->DeleteClusterResource(server), 0u);
  EXPECT_EQ(api->DeleteClusterResource(disk), 0u);
  EXPECT_EQ(api->OpenClusterResource(cluster, u"Disk1"), nullptr);
  EXPECT_EQ(GetLastError(), static_cast<DWORD>(ERROR_RESOURCE_NOT_FOUND));
  EXPECT_EQ(api->OpenClusterResource(cluster, u"inst1"), nullptr);
  EXPECT_TRUE(api->CloseClusterResource(disk));
  EXPECT_TRUE(api->CloseClusterResource(server));
  EXPECT_FALSE(api->CloseClusterResource(server));
  EXPECT_TRUE(api->CloseClusterGroup(group));
  EXPECT_TRUE(api->CloseCluster(cluster));
}

// An online resource cannot be deleted, dependencies stay within a group, and a resource named
// like a service of the node owning its group is online exactly while that service runs.
TEST_F(ClusterTest, OnlineResourcesStayAndDependenciesStayInTheirGroup) {
  const std::string services = "SOFTWARE\\ZAV\\KXLSIM\\Services\\";
  const std::string remoteServices = "SOFTWARE\\ZAV\\KXLSIM\\Machines\\NODE2\\" + services;
  setDword(services + "INST1", "State", 4);
  setDword(remoteServices + "INST2", "State", 1);
  setString("SOFTWARE\\ZAV\\KXLSIM\\Cluster\\Groups\\G2", "OwnerNode", "NODE2");
  HCLUSTER cluster = api->OpenCluster(nullptr);
  ASSERT_NE(cluster, nullptr);
  api->addType(cluster, u"KXL");
  HGROUP g1 = api->OpenClusterGroup(cluster, u"G1");
  HGROUP g2 = api->OpenClusterGroup(cluster, u"G2");
  HRESOURCE inst1 = api->CreateClusterResource(g1, u"INST1", u"KXL", 0);
  HRESOURCE inst2 = api->CreateClusterResource(g2, u"INST2", u"KXL", 0);
  HRESOURCE disk = api->CreateClusterResource(g1, u"Disk1", u"KXL", 0);
  ASSERT_TRUE(inst1 != nullptr && inst2 != nullptr && disk != nullptr);
  WCHAR group[65];
  DWORD size = 65;
  EXPECT_EQ(api->GetClusterResourceState(inst1, nullptr, nullptr, group, &size), ClusterResourceOnline);
  size = 65;
  EXPECT_EQ(api->GetClusterResourceState(inst2, nullptr, nullptr, group, &size), ClusterResourceOffline);

  EXPECT_EQ(api->AddClusterResourceDependency(inst2, disk), static_cast<DWORD>(ERROR_INVALID_PARAMETER));
  EXPECT_TRUE(api->dependencies(inst2).empty());
  EXPECT_EQ(api->DeleteClusterResource(inst1), static_cast<DWORD>(ERROR_RESOURCE_ONLINE));
  setDword(services + "INST1", "State", 1);
  EXPECT_EQ(api->DeleteClusterResource(inst1), 0u);
  setDword(remoteServices + "INST2", "State", 4);
  EXPECT_EQ(api->DeleteClusterResource(inst2), static_cast<DWORD>(ERROR_RESOURCE_ONLINE))
      << "the service of the owning node counts";
  for (HRESOURCE resource : {inst1, inst2, disk})
    api->CloseClusterResource(resource);
  api->CloseClusterGroup(g1);
  api->CloseClusterGroup(g2);
  api->CloseCluster(cluster);
}

TEST_F(ClusterTest, EnumerationReportsLengthsAndEndsWithNoMoreItems) {
  HCLUSTER cluster = api->OpenCluster(nullptr);
  ASSERT_NE(cluster, nullptr);
  api->addType(cluster, u"KXL");
  HGROUP group = api->OpenClusterGroup(cluster, u"G1");
  for (const char16_t *name : {u"A-resource", u"B"})
    api->CloseClusterResource(api->CreateClusterResource(group, name, u"KXL", 0));
  api->CloseClusterGroup(group);

  HCLUSENUM listing = api->ClusterOpenEnum(cluster, CLUSTER_ENUM_RESOURCE);
  ASSERT_NE(listing, nullptr);
  std::set<std::u16string> names;
  WCHAR name[65];
  DWORD type = 0;
  DWORD size = 3;
  EXPECT_EQ(api->ClusterEnum(listing, 0, &type, name, &size), static_cast<DWORD>(ERROR_MORE_DATA));
  DWORD needed = size;
  for (DWORD i = 0;; ++i) {
    size = 65;
    DWORD rc = api->ClusterEnum(listing, i, &type, name, &size);
    if (rc == static_cast<DWORD>(ERROR_NO_MORE_ITEMS))
      break;
    ASSERT_EQ(rc, 0u);
    EXPECT_EQ(type, static_cast<DWORD>(CLUSTER_ENUM_RESOURCE));
    EXPECT_EQ(size, std::u16string(name).size());
    if (i == 0) {
      EXPECT_EQ(needed, size) << "the length needed excludes the terminator";
    }
    names.insert(name);
  }
  EXPECT_EQ(names, (std::set<std::u16string>{u"A-resource", u"B"}));
  EXPECT_EQ(api->ClusterCloseEnum(listing), 0u);
  EXPECT_EQ(api->ClusterCloseEnum(listing), static_cast<DWORD>(ERROR_INVALID_HANDLE));
  api->CloseCluster(cluster);
}

TEST_F(ClusterTest, ANodeWhoseServiceIsStoppedHasNoCluster) {
  DWORD state = 0;
  EXPECT_EQ(api->GetNodeClusterState(nullptr, &state), 0u);
  EXPECT_EQ(state, static_cast<DWORD>(ClusterStateRunning));
  setDword("SOFTWARE\\ZAV\\KXLSIM\\Cluster", "NodeState", ClusterStateNotRunning);
  EXPECT_EQ(api->GetNodeClusterState(nullptr, &state), 0u);
  EXPECT_EQ(state, static_cast<DWORD>(ClusterStateNotRunning));
  EXPECT_EQ(api->OpenCluster(nullptr), nullptr);
  EXPECT_EQ(GetLastError(), static_cast<DWORD>(RPC_S_SERVER_UNAVAILABLE));
}

class OdbcTest : public ModulesTest {
protected:
  void SetUp() override {
    ModulesTest::SetUp();
    setString(kSources, "SystemSource", "ZAV KXL ODBC DRIVER - COPY1");
    HKEY user = nullptr;
    ASSERT_EQ(
        RegCreateKeyExA(HKEY_CURRENT_USER, kSources, 0, nullptr, 0, KEY_ALL_ACCESS, nullptr, &user, nullptr),
        ERROR_SUCCESS);
    const char driver[] = "Other Driver";
    ASSERT_EQ(
        RegSetValueExA(user, "UserSource", 0, REG_SZ, reinterpret_cast<const BYTE *>(driver), sizeof driver),
        ERROR_SUCCESS);
    RegCloseKey(user);
    odbc = LoadLibraryA("odbc32.dll");
    ASSERT_NE(odbc, nullptr);
    allocEnv = entry<PFN_SQLAllocEnv>(odbc, "SQLAllocEnv");
    dataSources = entry<PFN_SQLDataSources>(odbc, "SQLDataSources");
    ASSERT_EQ(allocEnv(&env), SQL_SUCCESS);
  }
  void TearDown() override {
    FreeLibrary(odbc);
    ModulesTest::TearDown();
  }

  // One fetch into 256-byte buffers: the result, then name and description.
  SQLRETURN fetch(SQLUSMALLINT direction, std::string &name, std::string &driver) {
    SQLCHAR nameBuffer[256] = {}, driverBuffer[256] = {};
    SQLSMALLINT nameLength = 0, driverLength = 0;
    SQLRETURN rc =
        dataSources(env, direction, nameBuffer, 256, &nameLength, driverBuffer, 256, &driverLength);
    name = reinterpret_cast<char *>(nameBuffer);
    driver = reinterpret_cast<char *>(driverBuffer);
    return rc;
  }

  static constexpr const char *kSources = "SOFTWARE\\ODBC\\ODBC.INI\\ODBC Data Sources";
  HMODULE odbc = nullptr;
  PFN_SQLAllocEnv allocEnv = nullptr;
  PFN_SQLDataSources dataSources = nullptr;
  SQLHENV env = nullptr;
};

TEST_F(OdbcTest, ListsMachineThenUserSourcesAndEndsWithNoData) {
  std::string name, driver;
  ASSERT_EQ(fetch(SQL_FETCH_FIRST, name, driver), SQL_SUCCESS);
  EXPECT_EQ(name, "SystemSource");
  EXPECT_EQ(driver, "ZAV KXL ODBC DRIVER - COPY1");
  ASSERT_EQ(fetch(SQL_FETCH_NEXT, name, driver), SQL_SUCCESS);
  EXPECT_EQ(name, "UserSource");
  EXPECT_EQ(driver, "Other Driver");
  EXPECT_EQ(fetch(SQL_FETCH_NEXT, name, driver), SQL_NO_DATA);
  ASSERT_EQ(fetch(SQL_FETCH_FIRST, name, driver), SQL_SUCCESS) << "first starts over";
  EXPECT_EQ(name, "SystemSource");
}

TEST_F(OdbcTest, CutsLongTextsAndRefusesBadHandles) {
  SQLCHAR name[7], driver[256];
  SQLSMALLINT nameLength = 0, driverLength = 0;
  EXPECT_EQ(dataSources(env, SQL_FETCH_FIRST, name, sizeof name, &nameLength, driver, 256, &driverLength),
            SQL_SUCCESS_WITH_INFO);
  EXPECT_STREQ(reinterpret_cast<char *>(name), "System");
  EXPECT_EQ(nameLength, 12);
  EXPECT_EQ(driverLength, 27);
  int notAnEnvironment = 0;
  EXPECT_EQ(dataSources(&notAnEnvironment, SQL_FETCH_FIRST, name, sizeof name, &nameLength, driver, 256,
                        &driverLength),
            SQL_INVALID_HANDLE);
  EXPECT_EQ(dataSources(env, 77, name, sizeof name, &nameLength, driver, 256, &driverLength), SQL_ERROR);
}

} // namespace
