// Several processes over one world: every change is seen by the others at once,
// concurrent writers lose nothing, and a writer killed at any moment leaves a
// whole hive behind.
#include "platform/win32.h"
#include "sim/posix/regfile.h"
#include "world_fixture.h"

#include <signal.h>
#include <sys/wait.h>
#include <unistd.h>

#include <random>

namespace kxlsim::testing {
namespace {

using posix::hive::HiveFile;
using posix::hive::Key;

int waitExit(pid_t pid) {
  int status = 0;
  waitpid(pid, &status, 0);
  return WIFEXITED(status) ? WEXITSTATUS(status) : -1;
}

LONG setDword(HKEY key, const char *name, DWORD value) {
  return RegSetValueExA(key, name, 0, REG_DWORD, reinterpret_cast<const BYTE *>(&value), sizeof value);
}

LONG getDword(HKEY key, const char *name, DWORD &value) {
  DWORD size = sizeof value;
  return RegQueryValueExA(key, name, nullptr, nullptr, reinterpret_cast<BYTE *>(&value), &size);
}

HKEY createKey(const char *path) {
  HKEY key = nullptr;
  EXPECT_EQ(RegCreateKeyExA(HKEY_LOCAL_MACHINE, path, 0, nullptr, 0, KEY_ALL_ACCESS, nullptr, &key, nullptr),
            ERROR_SUCCESS);
  return key;
}

using SharingTest = WorldTest;

TEST_F(SharingTest, AnOpenKeySeesAnotherProcessChanges) {
  HKEY key = createKey("SOFTWARE\\Shared");
  ASSERT_EQ(setDword(key, "Value", 0), ERROR_SUCCESS);
  // Same-sized rewrites in quick succession: each must still be noticed.
  for (DWORD round = 1; round <= 20; ++round) {
    pid_t child = fork();
    if (child == 0) {
      HKEY own = createKey("SOFTWARE\\SHARED");
      _exit(setDword(own, "value", round) == ERROR_SUCCESS ? 0 : 1);
    }
    ASSERT_EQ(waitExit(child), 0);
    DWORD seen = 0;
    ASSERT_EQ(getDword(key, "Value", seen), ERROR_SUCCESS);
    ASSERT_EQ(seen, round);
  }
  // A key deleted by another process is gone for this process's handle too.
  pid_t child = fork();
  if (child == 0)
    _exit(SHDeleteKeyA(HKEY_LOCAL_MACHINE, "Software\\Shared") == ERROR_SUCCESS ? 0 : 1);
  ASSERT_EQ(waitExit(child), 0);
  DWORD seen = 0;
  EXPECT_EQ(getDword(key, "Value", seen), ERROR_KEY_DELETED);
  EXPECT_EQ(RegCloseKey(key), ERROR_SUCCESS);
}

TEST_F(SharingTest, ConcurrentWritersLoseNothing) {
  constexpr int kWriters = 3, kValues = 40;
  std::vector<pid_t> children;
  for (int writer = 0; writer < kWriters; ++writer) {
    pid_t child = fork();
    if (child == 0) {
      HKEY key = createKey("SOFTWARE\\Busy");
      for (int i = 0; i < kValues; ++i) {
        std::string name = "w" + std::to_string(writer) + "_" + std::to_string(i);
        if (setDword(key, name.c_str(), static_cast<DWORD>(i)) != ERROR_SUCCESS)
          _exit(1);
      }
      _exit(0);
    }
    children.push_back(child);
  }
  for (pid_t child : children)
    ASSERT_EQ(waitExit(child), 0);
  HiveFile file(root + "/system.reg", "HKEY_LOCAL_MACHINE");
  ASSERT_EQ(file.read([](const Key &tree) -> LONG {
    const Key *busy = posix::hive::findKey(tree, {"SOFTWARE", "Busy"});
    EXPECT_NE(busy, nullptr);
    EXPECT_EQ(busy == nullptr ? 0u : busy->values.size(), static_cast<size_t>(kWriters * kValues));
    return ERROR_SUCCESS;
  }),
            ERROR_SUCCESS);
}

// Every key of a large hive carries the same generation number; a writer bumps
// them all in one update, again and again, and is killed at random moments.
TEST_F(SharingTest, KilledWriterLeavesAWholeHive) {
  constexpr int kKeys = 1500;
  const std::string hivePath = root + "/system.reg";
  auto setGeneration = [&](Key &tree, bool &changed, DWORD generation) -> LONG {
    for (int i = 0; i < kKeys; ++i) {
      bool created = false;
      Key &key = posix::hive::createKey(tree, {"SOFTWARE", "Load", "Key" + std::to_string(i)}, created);
      posix::hive::setValue(key, "Generation", REG_DWORD,
                            {static_cast<BYTE>(generation), static_cast<BYTE>(generation >> 8), 0, 0});
      posix::hive::setValue(key, "Padding", REG_SZ, std::vector<BYTE>(64, 'p'));
    }
    changed = true;
    return ERROR_SUCCESS;
  };
  {
    HiveFile file(hivePath, "HKEY_LOCAL_MACHINE");
    ASSERT_EQ(file.update([&](Key &t, bool &c) { return setGeneration(t, c, 0); }), ERROR_SUCCESS);
  }
  std::mt19937 random(12345);
  for (int round = 0; round < 6; ++round) {
    pid_t child = fork();
    if (child == 0) {
      HiveFile file(hivePath, "HKEY_LOCAL_MACHINE");
      for (DWORD generation = 1;; ++generation)
        file.update([&](Key &t, bool &c) { return setGeneration(t, c, generation); });
    }
    usleep(20000 + random() % 80000);
    kill(child, SIGKILL);
    waitpid(child, nullptr, 0);

    Key tree;
    std::string error;
    ASSERT_TRUE(posix::hive::parseHive(readText(hivePath), "HKEY_LOCAL_MACHINE", tree, error)) << error;
    const Key *load = posix::hive::findKey(tree, {"SOFTWARE", "Load"});
    ASSERT_NE(load, nullptr);
    ASSERT_EQ(load->subkeys.size(), static_cast<size_t>(kKeys));
    const auto &first = load->subkeys.begin()->second.values.at("generation").data;
    for (const auto &[name, key] : load->subkeys)
      ASSERT_EQ(key.values.at("generation").data, first) << name;
  }
  // The hive stays writable after the kills.
  HKEY key = createKey("SOFTWARE\\After");
  EXPECT_EQ(setDword(key, "Fine", 1), ERROR_SUCCESS);
  EXPECT_EQ(RegCloseKey(key), ERROR_SUCCESS);
}

// A batch keeps its changes in this process until it ends, then writes each
// changed hive once; the file (what other processes read) shows nothing of it
// before that and all of it after.
TEST_F(SharingTest, ABatchIsWrittenOnceWhenItEnds) {
  auto fileHas = [this](const char *text) {
    return readText(root + "/system.reg").find(text) != std::string::npos;
  };
  std::string before = readText(root + "/system.reg");
  {
    posix::hive::WriteBatch outer;
    HKEY key = createKey("SOFTWARE\\Batch");
    ASSERT_EQ(setDword(key, "First", 1), ERROR_SUCCESS);
    {
      posix::hive::WriteBatch inner; // nested: only the outermost one writes
      ASSERT_EQ(setDword(key, "Second", 2), ERROR_SUCCESS);
    }
    DWORD seen = 0;
    EXPECT_EQ(getDword(key, "Second", seen), ERROR_SUCCESS); // this process sees its own changes
    EXPECT_EQ(seen, 2u);
    EXPECT_EQ(readText(root + "/system.reg"), before);
    EXPECT_TRUE(outer.commit());
    EXPECT_TRUE(fileHas("\"First\"=dword:00000001"));
    EXPECT_TRUE(fileHas("\"Second\"=dword:00000002"));
    EXPECT_EQ(RegCloseKey(key), ERROR_SUCCESS);
  }
  // After the batch, changes are written through at once again.
  HKEY key = createKey("SOFTWARE\\Batch");
  ASSERT_EQ(setDword(key, "Third", 3), ERROR_SUCCESS);
  EXPECT_TRUE(fileHas("\"Third\"=dword:00000003"));
  EXPECT_EQ(RegCloseKey(key), ERROR_SUCCESS);
}

} // namespace
} // namespace kxlsim::testing
