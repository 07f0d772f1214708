// Several processes over one world: every change is seen by the others at once,
// concurrent writers lose nothing, and a writer killed at any moment leaves a
// whole hive behind.
#include "platform/win32.h"
#include "sim/posix/regfile.h"
#include "tests/support/world_access.h"

#include <signal.h>
#include <sys/wait.h>
#include <unistd.h>

#include <filesystem>
#include <functional>
#include <random>

namespace kxlsim::testing {
namespace {

using kxltestsupport::readHostFile;
using kxltestsupport::writeHostFile;

using posix::hive::HiveFile;
using posix::hive::Key;

int waitExit(pid_t pid) {
  int status = 0;
  waitpid(pid, &status, 0);
  return WIFEXITED(status) ? WEXITSTATUS(status) : -1;
}

LONG putDword(HKEY key, const char *name, DWORD value) {
  return RegSetValueExA(key, name, 0, REG_DWORD, reinterpret_cast<const BYTE *>(&value), sizeof value);
}

LONG queryDword(HKEY key, const char *name, DWORD &value) {
  DWORD size = sizeof value;
  return RegQueryValueExA(key, name, nullptr, nullptr, reinterpret_cast<BYTE *>(&value), &size);
}

HKEY createKey(const char *path) {
  HKEY key = nullptr;
  EXPECT_EQ(RegCreateKeyExA(HKEY_LOCAL_MACHINE, path, 0, nullptr, 0, KEY_ALL_ACCESS, nullptr, &key, nullptr),
            ERROR_SUCCESS);
  return key;
}

using SharingTest = kxltest::WorldTest;

TEST_F(SharingTest, AnOpenKeySeesAnotherProcessChanges) {
  HKEY key = createKey("SOFTWARE\\Shared");
  ASSERT_EQ(putDword(key, "Value", 0), ERROR_SUCCESS);
  // Same-sized rewrites in quick succession: each must still be noticed.
  for (DWORD round = 1; round <= 20; ++round) {
    pid_t child = fork();
    if (child == 0) {
      HKEY own = createKey("SOFTWARE\\SHARED");
      _exit(putDword(own, "value", round) == ERROR_SUCCESS ? 0 : 1);
    }
    ASSERT_EQ(waitExit(child), 0);
    DWORD seen = 0;
    ASSERT_EQ(queryDword(key, "Value", seen), ERROR_SUCCESS);
    ASSERT_EQ(seen, round);
  }
  // A key deleted by another process is gone for this process's handle too.
  pid_t child = fork();
  if (child == 0)
    _exit(SHDeleteKeyA(HKEY_LOCAL_MACHINE, "Software\\Shared") == ERROR_SUCCESS ? 0 : 1);
  ASSERT_EQ(waitExit(child), 0);
  DWORD seen = 0;
  EXPECT_EQ(queryDword(key, "Value", seen), ERROR_KEY_DELETED);
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
        if (putDword(key, name.c_str(), static_cast<DWORD>(i)) != ERROR_SUCCESS)
          _exit(1);
      }
      _exit(0);
    }
    children.push_back(child);
  }
  for (pid_t child : children)
    ASSERT_EQ(waitExit(child), 0);
  HiveFile file(worldRoot() + "/system.reg", "HKEY_LOCAL_MACHINE");
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
  const std::string hivePath = worldRoot() + "/system.reg";
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
    ASSERT_TRUE(posix::hive::parseHive(readHostFile(hivePath), "HKEY_LOCAL_MACHINE", tree, error)) << error;
    const Key *load = posix::hive::findKey(tree, {"SOFTWARE", "Load"});
    ASSERT_NE(load, nullptr);
    ASSERT_EQ(load->subkeys.size(), static_cast<size_t>(kKeys));
    const auto &first = load->subkeys.begin()->second.values.at("generation").data;
    for (const auto &[name, key] : load->subkeys)
      ASSERT_EQ(key.values.at("generation").data, first) << name;
  }
  // The hive stays writable after the kills.
  HKEY key = createKey("SOFTWARE\\After");
  EXPECT_EQ(putDword(key, "Fine", 1), ERROR_SUCCESS);
  EXPECT_EQ(RegCloseKey(key), ERROR_SUCCESS);
}

// A batch keeps its changes in this process until it ends, then writes each
// changed hive once; other readers see nothing of it before that and all of it
// after.
TEST_F(SharingTest, ABatchIsWrittenOnceWhenItEnds) {
  // What a reader with a cache of its own (as another process) finds.
  auto othersSee = [this](const char *value) {
    Key tree;
    std::string error;
    EXPECT_TRUE(posix::hive::loadHive(worldRoot() + "/system.reg", "HKEY_LOCAL_MACHINE", tree, error))
        << error;
    const Key *batch = posix::hive::findKey(tree, {"SOFTWARE", "Batch"});
    return batch != nullptr && batch->values.count(posix::hive::fold(value)) != 0;
  };
  std::string before = readHostFile(worldRoot() + "/system.reg");
  {
    posix::hive::WriteBatch outer;
    HKEY key = createKey("SOFTWARE\\Batch");
    ASSERT_EQ(putDword(key, "First", 1), ERROR_SUCCESS);
    {
      posix::hive::WriteBatch inner; // nested: only the outermost one writes
      ASSERT_EQ(putDword(key, "Second", 2), ERROR_SUCCESS);
    }
    DWORD seen = 0;
    EXPECT_EQ(queryDword(key, "Second", seen), ERROR_SUCCESS); // this process sees its own changes
    EXPECT_EQ(seen, 2u);
    EXPECT_EQ(readHostFile(worldRoot() + "/system.reg"), before);
    EXPECT_FALSE(othersSee("First"));
    EXPECT_TRUE(outer.commit());
    EXPECT_TRUE(othersSee("First"));
    EXPECT_TRUE(othersSee("Second"));
    EXPECT_EQ(RegCloseKey(key), ERROR_SUCCESS);
  }
  // After the batch, changes reach the others at once again.
  HKEY key = createKey("SOFTWARE\\Batch");
  ASSERT_EQ(putDword(key, "Third", 3), ERROR_SUCCESS);
  EXPECT_TRUE(othersSee("Third"));
  EXPECT_EQ(RegCloseKey(key), ERROR_SUCCESS);
}

// ---- the change log beside the hive

std::string formatted(const Key &tree) {
  return posix::hive::formatHive(tree, "HKEY_LOCAL_MACHINE");
}

// The registry as a reader with a cache of its own finds it: hive and log.
std::string replayed(const std::string &hivePath) {
  Key tree;
  std::string error;
  EXPECT_TRUE(posix::hive::loadHive(hivePath, "HKEY_LOCAL_MACHINE", tree, error)) << error;
  return formatted(tree);
}

bool exists(const std::string &path) {
  return std::filesystem::exists(path);
}

// Each kind of change, with names and data the text form must escape: what
// another reader replays from the log is exactly the writer's tree, and once
// the writer ends the hive file is that tree written whole, with no log left.
TEST_F(SharingTest, EveryKindOfChangeReplaysToTheWritersTree) {
  const std::string hivePath = worldRoot() + "/system.reg";
  using posix::hive::Value;
  enum Kind { kCreate, kSet, kDeleteValue, kDeleteKey, kMerge };
  const struct {
    Kind kind;
    posix::hive::KeyPath path;
    Value value; // for kDeleteValue only its name
  } changes[] = {
      {kCreate, {"SOFTWARE", "Kinds", "Empty"}, {}},
      {kSet, {"SOFTWARE", "Kinds"}, {"Quote\"and\\slash", REG_SZ, {'a', '"', 0}}},
      {kSet, {"SOFTWARE", "Kinds"}, {"", REG_BINARY, {0, 1, 0xfe, '"', '\\', '\n'}}},
      {kSet, {"SOFTWARE", "Kinds"}, {"Lines", REG_SZ, {'a', '\r', '\n', 'b', 0}}},
      {kSet, {"SOFTWARE", "Kinds"}, {"Number", REG_DWORD, {1, 2, 3, 4}}},
      {kSet, {"SOFTWARE", "Kinds", "Gone"}, {"X", REG_MULTI_SZ, {'x', 0, 0}}},
      {kSet, {"SOFTWARE", "Kinds"}, {"Dropped", REG_NONE, {}}},
      {kDeleteValue, {"SOFTWARE", "Kinds"}, {"DROPPED", REG_NONE, {}}},
      {kDeleteValue, {"SOFTWARE", "Kinds"}, {"", REG_NONE, {}}},
      {kSet, {"SOFTWARE", "Kinds"}, {"", REG_SZ, {'d', 0}}},
      {kMerge, {"SOFTWARE", "Copied"}, {"V", REG_EXPAND_SZ, {'%', 'p', '%', 0}}}, // as Deep\Er\V
      {kDeleteKey, {"software", "KINDS", "gone"}, {}},
      {kSet, {"software", "kinds"}, {"number", REG_DWORD, {9, 9, 9, 9}}},
  };
  auto apply = [](const auto &row, posix::hive::Change &c) {
    Key source;
    bool created = false;
    switch (row.kind) {
    case kCreate:
      return c.createKey(row.path);
    case kSet:
      return c.setValue(row.path, row.value);
    case kDeleteValue:
      return c.deleteValue(row.path, row.value.name);
    case kDeleteKey:
      return c.deleteKey(row.path);
    case kMerge:
      posix::hive::setValue(posix::hive::createKey(source, {"Deep", "Er"}, created), row.value.name,
                            row.value.type, row.value.data);
      return c.mergeKey(row.path, source);
    }
  };
  std::string writerTree;
  {
    HiveFile file(hivePath, "HKEY_LOCAL_MACHINE");
    for (const auto &row : changes) {
      ASSERT_EQ(file.change([&](const Key &, posix::hive::Change &c) -> LONG {
        apply(row, c);
        return ERROR_SUCCESS;
      }),
                ERROR_SUCCESS);
      ASSERT_EQ(file.read([&](const Key &tree) -> LONG {
        writerTree = formatted(tree);
        return ERROR_SUCCESS;
      }),
                ERROR_SUCCESS);
      ASSERT_EQ(replayed(hivePath), writerTree);
    }
    EXPECT_TRUE(exists(hivePath + ".log"));
    EXPECT_EQ(writerTree.find("Gone"), std::string::npos);
    EXPECT_NE(writerTree.find("\"Number\"=dword:09090909"), std::string::npos) << "first spelling kept";
  }
  EXPECT_EQ(readHostFile(hivePath), writerTree);
  EXPECT_FALSE(exists(hivePath + ".log"));
}

// A writer killed in the middle of a record leaves it cut off: readers take
// the records before it and nothing of it; the next writer writes the hive
// whole instead of appending after it.
TEST_F(SharingTest, ACutOffRecordIsIgnoredAndTheNextChangeFoldsTheLog) {
  const std::string hivePath = worldRoot() + "/system.reg";
  pid_t child = fork();
  if (child == 0) {
    HKEY key = createKey("SOFTWARE\\Cut");
    _exit(putDword(key, "Whole", 1) == ERROR_SUCCESS ? 0 : 1); // no clean-up: the log stays
  }
  ASSERT_EQ(waitExit(child), 0);
  const std::string whole = replayed(hivePath);
  ASSERT_NE(whole.find("\"Whole\"=dword:00000001"), std::string::npos);
  const std::string record = "[HKEY_LOCAL_MACHINE\\SOFTWARE\\Cut]\n\"Torn\"=dword:00000002\n";
  for (const std::string &cut : {std::string("@"), std::string("@57 00000000"),
                                 "@" + std::to_string(record.size()) + " 0000000000000000\n" + record,
                                 "@" + std::to_string(record.size() + 9) + " 0000000000000000\n" + record}) {
    std::string log = readHostFile(hivePath + ".log");
    writeHostFile(hivePath + ".log", log + cut);
    EXPECT_EQ(replayed(hivePath), whole) << cut;
    writeHostFile(hivePath + ".log", log);
  }
  writeHostFile(hivePath + ".log", readHostFile(hivePath + ".log") + record.substr(0, 20));
  HKEY key = createKey("SOFTWARE\\Cut");
  ASSERT_EQ(putDword(key, "After", 3), ERROR_SUCCESS);
  EXPECT_FALSE(exists(hivePath + ".log")) << "folded";
  std::string text = readHostFile(hivePath);
  EXPECT_NE(text.find("\"Whole\"=dword:00000001"), std::string::npos);
  EXPECT_NE(text.find("\"After\"=dword:00000003"), std::string::npos);
  EXPECT_EQ(text.find("Torn"), std::string::npos);
  EXPECT_EQ(RegCloseKey(key), ERROR_SUCCESS);
}

// A writer killed after writing the hive whole but before removing the log
// leaves a log of changes the hive already holds. Replayed again they would
// bring back what was changed after them, so readers ignore that log, and the
// next change starts a new one.
TEST_F(SharingTest, ALogLeftBesideTheHiveItWasFoldedIntoIsIgnored) {
  const std::string hivePath = worldRoot() + "/system.reg";
  std::string oldLog;
  pid_t child = fork();
  if (child == 0) {
    HKEY key = createKey("SOFTWARE\\Stale");
    bool ok = putDword(key, "Value", 1) == ERROR_SUCCESS;
    oldLog = readHostFile(hivePath + ".log");
    ok = ok && RegDeleteValueA(key, "Value") == ERROR_SUCCESS;
    writeHostFile(worldRoot() + "/old.log", oldLog);
    _exit(ok ? 0 : 1);
  }
  ASSERT_EQ(waitExit(child), 0);
  {
    HiveFile fold(hivePath, "HKEY_LOCAL_MACHINE"); // folds when it ends, as a process does
    ASSERT_EQ(fold.change([](const Key &, posix::hive::Change &c) -> LONG {
      c.createKey({"SOFTWARE", "Stale", "Folded"});
      return ERROR_SUCCESS;
    }),
              ERROR_SUCCESS);
  }
  ASSERT_FALSE(exists(hivePath + ".log"));
  std::filesystem::rename(worldRoot() + "/old.log", hivePath + ".log");
  const std::string folded = replayed(hivePath);
  EXPECT_EQ(folded, readHostFile(hivePath));
  EXPECT_EQ(folded.find("\"Value\""), std::string::npos);
  HKEY key = createKey("SOFTWARE\\Stale");
  ASSERT_EQ(putDword(key, "Next", 2), ERROR_SUCCESS);
  const std::string next = replayed(hivePath);
  EXPECT_EQ(next.find("\"Value\""), std::string::npos);
  EXPECT_NE(next.find("\"Next\"=dword:00000002"), std::string::npos);
  EXPECT_EQ(RegCloseKey(key), ERROR_SUCCESS);
}

// A writer appending to the log, killed at random moments: what is left reads
// as a prefix of its changes, none lost before the last one seen, and the
// next process goes on from there.
TEST_F(SharingTest, KilledLogWriterLeavesAPrefixOfItsChanges) {
  const std::string hivePath = worldRoot() + "/system.reg";
  std::mt19937 random(777);
  DWORD highest = 0;
  for (int round = 0; round < 6; ++round) {
    pid_t child = fork();
    if (child == 0) {
      HKEY key = createKey("SOFTWARE\\Prefix");
      for (DWORD n = highest + 1;; ++n) {
        std::string name = "V" + std::to_string(n);
        putDword(key, name.c_str(), n);
      }
    }
    usleep(20000 + random() % 60000);
    kill(child, SIGKILL);
    waitpid(child, nullptr, 0);
    Key tree;
    std::string error;
    ASSERT_TRUE(posix::hive::loadHive(hivePath, "HKEY_LOCAL_MACHINE", tree, error)) << error;
    ASSERT_TRUE(posix::hive::parseHive(readHostFile(hivePath), "HKEY_LOCAL_MACHINE", tree, error)) << error;
    ASSERT_TRUE(posix::hive::loadHive(hivePath, "HKEY_LOCAL_MACHINE", tree, error)) << error;
    const Key *prefix = posix::hive::findKey(tree, {"SOFTWARE", "Prefix"});
    size_t count = prefix == nullptr ? 0 : prefix->values.size();
    ASSERT_GE(count, highest);
    for (DWORD n = 1; n <= count; ++n)
      ASSERT_EQ(prefix->values.count("v" + std::to_string(n)), 1u) << "V" << n << " of " << count;
    highest = static_cast<DWORD>(count);
  }
  EXPECT_GT(highest, 0u);
}

} // namespace
} // namespace kxlsim::testing
