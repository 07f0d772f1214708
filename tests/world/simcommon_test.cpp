// Fault injection counts calls exactly, and a kill at a registry write leaves the registry whole.
#include "platform/win32.h"
#include "tests/support/world_access.h"

#include <unistd.h>

namespace kxlsim::testing {
namespace {

using kxltestsupport::readHostFile;

using FaultTest = kxltest::WorldTest;

// Creates (and closes) a key of HKEY_LOCAL_MACHINE; the result.
LONG createKey(const char *name) {
  HKEY key = nullptr;
  LONG rc = RegCreateKeyExA(HKEY_LOCAL_MACHINE, name, 0, nullptr, 0, KEY_ALL_ACCESS, nullptr, &key, nullptr);
  if (rc == ERROR_SUCCESS)
    RegCloseKey(key);
  return rc;
}

TEST_F(FaultTest, ExactlyTheNamedCallsFail) {
  setenv("KXLSIM_FAIL", "Open:3,Other:1,Open:5,broken,Open:0,:2,Open:x", 1);
  resetFaults();
  std::vector<int> failed;
  for (int call = 1; call <= 6; ++call)
    if (shouldFail("Open"))
      failed.push_back(call);
  EXPECT_EQ(failed, (std::vector<int>{3, 5}));
  EXPECT_FALSE(shouldFail("open")); // names are case-sensitive
  EXPECT_TRUE(shouldFail("Other"));
  EXPECT_FALSE(shouldFail("Other"));

  resetFaults(); // counting starts again
  EXPECT_FALSE(shouldFail("Open"));
  EXPECT_FALSE(shouldFail("Open"));
  EXPECT_TRUE(shouldFail("Open"));

  unsetenv("KXLSIM_FAIL");
  resetFaults();
  for (int call = 1; call <= 6; ++call)
    EXPECT_FALSE(shouldFail("Open"));
}

// A kill mid-write (half a change record, or a new hive not yet in place) leaves the registry
// as before that write; the next writer goes on from it.
TEST_F(FaultTest, KillAtARegistryWriteLeavesTheRegistryWhole) {
  for (int write = 1; write <= 3; ++write) {
    SCOPED_TRACE(write);
    std::string kill = "hivewrite:" + std::to_string(write);
    EXPECT_EXIT(
        {
          setenv("KXLSIM_KILL", kill.c_str(), 1);
          resetFaults();
          for (const char *name : {"SOFTWARE\\A", "SOFTWARE\\B", "SOFTWARE\\C"})
            createKey(name);
          std::exit(0);
        },
        ::testing::ExitedWithCode(kKilledExitCode), "");
    posix::resetWorldRoot();
    EXPECT_EQ(keyExists("SOFTWARE\\A"), write > 1);
    EXPECT_EQ(keyExists("SOFTWARE\\B"), write > 2);
    EXPECT_FALSE(keyExists("SOFTWARE\\C"));
    EXPECT_EQ(createKey("SOFTWARE\\D"), ERROR_SUCCESS);
    EXPECT_TRUE(keyExists("SOFTWARE\\D"));
    EXPECT_EQ(SHDeleteKeyA(HKEY_LOCAL_MACHINE, "SOFTWARE"), ERROR_SUCCESS);
  }
}

TEST_F(FaultTest, CallsAreCountedIntoTheCountFileAtExit) {
  std::string counts = worldRoot() + "/counts";
  EXPECT_EXIT(
      {
        setenv("KXLSIM_COUNT", counts.c_str(), 1);
        resetFaults();
        for (int call = 0; call < 3; ++call)
          shouldFail("Open");
        killPoint("trace");
        std::exit(0);
      },
      ::testing::ExitedWithCode(0), "");
  EXPECT_EQ(readHostFile(counts), "Open 3\ntrace 1\n");
}

TEST_F(FaultTest, StartedProgramsDoNotInheritThePlan) {
  const std::pair<const char *, bool> rows[] = {{"KXLSIM_FAIL=Open:1", true},  {"KXLSIM_KILL=trace:3", true},
                                                {"KXLSIM_COUNT=/tmp/c", true}, {"KXLSIM_FAILX=1", false},
                                                {"KXLSIM_ROOT=/w", false},     {"KXLSIM_FAIL", false}};
  for (const auto &[entry, own] : rows)
    EXPECT_EQ(isOwnProcessSetting(entry), own) << entry;
}

} // namespace
} // namespace kxlsim::testing
