// Several processes over one world: every change is seen by the others at once,
// concurrent writers lose nothing, a writer killed at any moment leaves a whole
// hive behind, and events appended at once never mix.
#include "platform/win32.h"
#include "sim/common/events.h"
#include "sim/posix/regfile.h"
#include "tests/support/world_access.h"

#include <nlohmann/json.hpp>
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

// Runs body(i) in n child processes at once; true when every one returned true.
bool inChildren(int n, const std::function<bool(int)> &body) {
  std::vector<pid_t> children;
  for (int i = 0; i < n; ++i)
    if ((children.emplace_back(fork())) == 0)
      _exit(body(i) ? 0 : 1);
  bool ok = true;
  for (pid_t child : children) {
    int status = 0;
    waitpid(child, &status, 0);
    ok = ok && WIFEXITED(status) && WEXITSTATUS(status) == 0;
  }
  return ok;
}

// Runs `forever` in a child process and kills it 20 to 100 ms later.
void killMidway(std::mt19937 &random, const std::function<void()> &forever) {
  pid_t child = fork();
  if (child == 0) {
    forever();
    _exit(0);
  }
  usleep(20000 + random() % 80000);
  kill(child, SIGKILL);
  waitpid(child, nullptr, 0);
}

const char *const kHive = "HKEY_LOCAL_MACHINE";

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

// The registry as a reader with a cache of its own (another process) finds it: hive and log.
Key loaded(const std::string &hivePath) {
  Key tree;
  std::string error;
  EXPECT_TRUE(posix::hive::loadHive(hivePath, kHive, tree, error)) << error;
  return tree;
}

std::string replayed(const std::string &hivePath) {
  return posix::hive::formatHive(loaded(hivePath), kHive);
}

using SharingTest = kxltest::WorldTest;

TEST_F(SharingTest, AnOpenKeySeesAnotherProcessChanges) {
  HKEY key = createKey("SOFTWARE\\Shared");
  ASSERT_EQ(putDword(key, "Value", 0), ERROR_SUCCESS);
  // Same-sized rewrites in quick succession: each must still be noticed.
  for (DWORD round = 1; round <= 20; ++round) {
    ASSERT_TRUE(inChildren(
        1, [&](int) { return putDword(createKey("SOFTWARE\\SHARED"), "value", round) == ERROR_SUCCESS; }));
    DWORD seen = 0;
    ASSERT_EQ(queryDword(key, "Value", seen), ERROR_SUCCESS);
    ASSERT_EQ(seen, round);
  }
  // A key deleted by another process is gone for this process's handle too.
  ASSERT_TRUE(inChildren(
      1, [](int) { return SHDeleteKeyA(HKEY_LOCAL_MACHINE, "Software\\Shared") == ERROR_SUCCESS; }));
  DWORD seen = 0;
  EXPECT_EQ(queryDword(key, "Value", seen), ERROR_KEY_DELETED);
  EXPECT_EQ(RegCloseKey(key), ERROR_SUCCESS);
}

TEST_F(SharingTest, ConcurrentWritersLoseNothing) {
  constexpr int kWriters = 3, kValues = 40;
  ASSERT_TRUE(inChildren(kWriters, [](int writer) {
    HKEY key = createKey("SOFTWARE\\Busy");
    for (int i = 0; i < kValues; ++i)
      if (putDword(key, ("w" + std::to_string(writer) + "_" + std::to_string(i)).c_str(), i) != ERROR_SUCCESS)
        return false;
    return true;
  }));
  Key tree = loaded(worldRoot() + "/system.reg");
  const Key *busy = posix::hive::findKey(tree, {"SOFTWARE", "Busy"});
  ASSERT_NE(busy, nullptr);
  EXPECT_EQ(busy->values.size(), static_cast<size_t>(kWriters * kValues));
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
    HiveFile file(hivePath, kHive);
    ASSERT_EQ(file.update([&](Key &t, bool &c) { return setGeneration(t, c, 0); }), ERROR_SUCCESS);
  }
  std::mt19937 random(12345);
  for (int round = 0; round < 6; ++round) {
    killMidway(random, [&] {
      HiveFile file(hivePath, kHive);
      for (DWORD generation = 1;; ++generation)
        file.update([&](Key &t, bool &c) { return setGeneration(t, c, generation); });
    });
    Key tree;
    std::string error;
    ASSERT_TRUE(posix::hive::parseHive(readHostFile(hivePath), kHive, tree, error)) << error;
    const Key *load = posix::hive::findKey(tree, {"SOFTWARE", "Load"});
    ASSERT_NE(load, nullptr);
    ASSERT_EQ(load->subkeys.size(), static_cast<size_t>(kKeys));
    const auto &first = load->subkeys.begin()->second.values.at("generation").data;
    for (const auto &[name, key] : load->subkeys)
      ASSERT_EQ(key.values.at("generation").data, first) << name;
  }
  setDword("SOFTWARE\\After", "Fine", 1); // the hive stays writable after the kills
}

// A batch writes each changed hive once when it ends; others see none of it before, all after.
TEST_F(SharingTest, ABatchIsWrittenOnceWhenItEnds) {
  auto othersSee = [this](const char *value) {
    Key tree = loaded(worldRoot() + "/system.reg");
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
    writeHostFile(worldRoot() + "/system.reg", before + "; changed by another process\n");
    EXPECT_EQ(queryDword(key, "Second", seen), ERROR_SUCCESS) << "the batch's own changes stay its content";
    EXPECT_TRUE(outer.commit());
    EXPECT_TRUE(othersSee("First"));
    EXPECT_TRUE(othersSee("Second"));
    EXPECT_EQ(RegCloseKey(key), ERROR_SUCCESS);
  }
  // After the batch, changes reach the others at once again.
  setDword("SOFTWARE\\Batch", "Third", 3);
  EXPECT_TRUE(othersSee("Third"));
}

// Each kind of change, with names the text form must escape: the log replays to the writer's
// exact tree, and when the writer ends the hive is that tree written whole, with no log left.
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
    HiveFile file(hivePath, kHive);
    for (const auto &row : changes) {
      ASSERT_EQ(file.change([&](const Key &, posix::hive::Change &c) -> LONG {
        apply(row, c);
        return ERROR_SUCCESS;
      }),
                ERROR_SUCCESS);
      ASSERT_EQ(file.read([&](const Key &tree) -> LONG {
        writerTree = posix::hive::formatHive(tree, kHive);
        return ERROR_SUCCESS;
      }),
                ERROR_SUCCESS);
      ASSERT_EQ(replayed(hivePath), writerTree);
    }
    EXPECT_TRUE(std::filesystem::exists(hivePath + ".log"));
    EXPECT_EQ(writerTree.find("Gone"), std::string::npos);
    EXPECT_NE(writerTree.find("\"Number\"=dword:09090909"), std::string::npos) << "first spelling kept";
  }
  EXPECT_EQ(readHostFile(hivePath), writerTree);
  EXPECT_FALSE(std::filesystem::exists(hivePath + ".log"));
}

// A record cut off by a kill is ignored; the next writer writes the hive whole instead of appending.
TEST_F(SharingTest, ACutOffRecordIsIgnoredAndTheNextChangeFoldsTheLog) {
  const std::string hivePath = worldRoot() + "/system.reg";
  // No clean-up in the child: the log stays.
  ASSERT_TRUE(
      inChildren(1, [](int) { return putDword(createKey("SOFTWARE\\Cut"), "Whole", 1) == ERROR_SUCCESS; }));
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
  setDword("SOFTWARE\\Cut", "After", 3);
  EXPECT_FALSE(std::filesystem::exists(hivePath + ".log")) << "folded";
  std::string text = readHostFile(hivePath);
  EXPECT_NE(text.find("\"Whole\"=dword:00000001"), std::string::npos);
  EXPECT_NE(text.find("\"After\"=dword:00000003"), std::string::npos);
  EXPECT_EQ(text.find("Torn"), std::string::npos);
}

// A log left beside the hive it was folded into would bring back later-changed
// values if replayed: readers ignore it and the next change starts a new one.
TEST_F(SharingTest, ALogLeftBesideTheHiveItWasFoldedIntoIsIgnored) {
  const std::string hivePath = worldRoot() + "/system.reg";
  ASSERT_TRUE(inChildren(1, [&](int) {
    HKEY key = createKey("SOFTWARE\\Stale");
    bool ok = putDword(key, "Value", 1) == ERROR_SUCCESS;
    std::string oldLog = readHostFile(hivePath + ".log");
    ok = ok && RegDeleteValueA(key, "Value") == ERROR_SUCCESS;
    return writeHostFile(worldRoot() + "/old.log", oldLog) && ok;
  }));
  {
    HiveFile fold(hivePath, kHive); // folds when it ends, as a process does
    ASSERT_EQ(fold.change([](const Key &, posix::hive::Change &c) -> LONG {
      c.createKey({"SOFTWARE", "Stale", "Folded"});
      return ERROR_SUCCESS;
    }),
              ERROR_SUCCESS);
  }
  ASSERT_FALSE(std::filesystem::exists(hivePath + ".log"));
  std::filesystem::rename(worldRoot() + "/old.log", hivePath + ".log");
  const std::string folded = replayed(hivePath);
  EXPECT_EQ(folded, readHostFile(hivePath));
  EXPECT_EQ(folded.find("\"Value\""), std::string::npos);
  setDword("SOFTWARE\\Stale", "Next", 2);
  const std::string next = replayed(hivePath);
  EXPECT_EQ(next.find("\"Value\""), std::string::npos);
  EXPECT_NE(next.find("\"Next\"=dword:00000002"), std::string::npos);
}

// Events are whole JSON lines, also when several processes append at once.
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
  ASSERT_TRUE(inChildren(kWriters, [](int writer) {
    for (int i = 0; i < kEvents; ++i)
      if (!appendEvent("load", {{"writer", std::to_string(writer)},
                                {"n", std::to_string(i)},
                                {"fill", std::string(6000, static_cast<char>('a' + writer))}}))
        return false;
    return true;
  }));
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
