// Fault injection counts calls exactly; events are whole JSON lines even when
// several processes append at once.
#include "platform/win32.h"
#include "sim/common/events.h"
#include "tests/support/world_access.h"

#include <nlohmann/json.hpp>
#include <sys/wait.h>
#include <unistd.h>

namespace kxlsim::testing {
namespace {

using kxltestsupport::readHostFile;
using kxltestsupport::writeHostFile;

using FaultTest = kxltest::WorldTest;

// Creates (and closes) a key of HKEY_LOCAL_MACHINE; the result and, if asked, the handle left.
LONG createKey(const char *name, HKEY *left = nullptr) {
  HKEY key = left != nullptr ? *left : nullptr;
  LONG rc = RegCreateKeyExA(HKEY_LOCAL_MACHINE, name, 0, nullptr, 0, KEY_ALL_ACCESS, nullptr, &key, nullptr);
  if (left != nullptr)
    *left = key;
  if (key != nullptr)
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

TEST_F(FaultTest, RegistryCallFailsAsWindowsWouldAndTheNextOneWorks) {
  setenv("KXLSIM_FAIL", "RegCreateKeyExA:2", 1);
  resetFaults();
  EXPECT_EQ(createKey("SOFTWARE\\A"), ERROR_SUCCESS);
  HKEY key = reinterpret_cast<HKEY>(1);
  EXPECT_EQ(createKey("SOFTWARE\\B", &key), ERROR_ACCESS_DENIED);
  EXPECT_EQ(key, nullptr);
  EXPECT_EQ(RegOpenKeyExA(HKEY_LOCAL_MACHINE, "SOFTWARE\\B", 0, KEY_READ, &key), ERROR_FILE_NOT_FOUND);
  EXPECT_EQ(createKey("SOFTWARE\\B"), ERROR_SUCCESS);
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
    RegDeleteKeyA(HKEY_LOCAL_MACHINE, "SOFTWARE\\D");
    for (const char *name : {"SOFTWARE\\A", "SOFTWARE\\B"})
      RegDeleteKeyA(HKEY_LOCAL_MACHINE, name);
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
  struct Row {
    const char *entry;
    bool own;
  } rows[] = {{"KXLSIM_FAIL=Open:1", true},    {"KXLSIM_KILL=trace:3", true}, {"KXLSIM_COUNT=/tmp/c", true},
              {"KXLSIM_CHILD_FAIL=x:1", true}, {"KXLSIM_FAILX=1", false},     {"KXLSIM_ROOT=/w", false},
              {"KXLSIM_FAIL", false}};
  for (const Row &row : rows)
    EXPECT_EQ(isOwnProcessSetting(row.entry), row.own) << row.entry;
  setenv("KXLSIM_CHILD_FAIL", "sqlocopy:2", 1);
  resetFaults();
  EXPECT_STREQ(childFaultPlan(), "sqlocopy:2");
  unsetenv("KXLSIM_CHILD_FAIL");
  resetFaults();
  EXPECT_STREQ(childFaultPlan(), "");
}

using EventTest = kxltest::WorldTest;

std::vector<nlohmann::json> readEvents(const std::string &path) {
  std::vector<nlohmann::json> events;
  std::istringstream lines(readHostFile(path));
  std::string line;
  while (std::getline(lines, line))
    events.push_back(nlohmann::json::parse(line, nullptr, false));
  return events;
}

TEST_F(EventTest, EachEventIsOneJsonLine) {
  ASSERT_EQ(eventsPath(), worldRoot() + "/events.jsonl");
  ASSERT_TRUE(appendEvent("run", {{"program", "kxlset.exe"}, {"args", "-cleanup \"x\"\nsecond line"}}));
  ASSERT_TRUE(appendEvent("audit", {{"path", std::string("C:\\caf\xe9")}})); // not UTF-8
  auto events = readEvents(eventsPath());
  ASSERT_EQ(events.size(), 2u);
  EXPECT_EQ(events[0]["event"], "run");
  EXPECT_EQ(events[0]["args"], "-cleanup \"x\"\nsecond line");
  ASSERT_FALSE(events[1].is_discarded());
  EXPECT_EQ(events[1]["event"], "audit");
  EXPECT_EQ(events[1]["path"].get<std::string>().rfind("C:\\caf", 0), 0u);
}

TEST_F(EventTest, AppendsFromSeveralProcessesNeverMix) {
  constexpr int kWriters = 3, kEvents = 100;
  std::vector<pid_t> children;
  for (int writer = 0; writer < kWriters; ++writer) {
    pid_t child = fork();
    if (child == 0) {
      for (int i = 0; i < kEvents; ++i)
        if (!appendEvent("load", {{"writer", std::to_string(writer)},
                                  {"n", std::to_string(i)},
                                  {"fill", std::string(6000, static_cast<char>('a' + writer))}}))
          _exit(1);
      _exit(0);
    }
    children.push_back(child);
  }
  for (pid_t child : children) {
    int status = 0;
    waitpid(child, &status, 0);
    ASSERT_TRUE(WIFEXITED(status) && WEXITSTATUS(status) == 0);
  }
  auto events = readEvents(eventsPath());
  ASSERT_EQ(events.size(), static_cast<size_t>(kWriters * kEvents));
  std::vector<int> next(kWriters, 0);
  for (const auto &event : events) {
    ASSERT_FALSE(event.is_discarded());
    int writer = std::stoi(event["writer"].get<std::string>());
    EXPECT_EQ(event["n"], std::to_string(next[writer]++)); // each writer's order kept
    EXPECT_EQ(event["fill"], std::string(6000, static_cast<char>('a' + writer)));
  }
}

} // namespace
} // namespace kxlsim::testing
