// The registry store of the simulated machine: one hive per REGEDIT4 text file
// (system.reg, user.reg), read and written whole.
//
// Names of keys and values are case-insensitive and case-preserving; both are
// kept ordered by their case-folded name, which is also the order they are
// written in, so the same content always gives the same file.
#pragma once

#include "platform/win32.h"

#include <functional>
#include <map>
#include <string>
#include <string_view>
#include <vector>

namespace kxlsim::posix::hive {

// ASCII lower case: the order and identity of names.
std::string fold(std::string_view name);

struct Value {
  std::string name; // "" is the default value
  DWORD type = REG_NONE;
  std::vector<BYTE> data;
};

struct Key {
  std::string name;
  std::map<std::string, Value> values; // by folded name
  std::map<std::string, Key> subkeys;  // by folded name
};

using KeyPath = std::vector<std::string>;

// The key at `path` below `root` (names ignoring case), or null.
Key *findKey(Key &root, const KeyPath &path);
const Key *findKey(const Key &root, const KeyPath &path);

// The key at `path`, created with its missing parents as written; `created`
// tells whether the last key was new.
Key &createKey(Key &root, const KeyPath &path, bool &created);

// Copies the values and subkeys of `source` into `target`, keeping existing
// names' spelling and replacing values of the same name.
void mergeKey(Key &target, const Key &source);

// Sets or replaces a value, keeping the spelling of an existing name.
void setValue(Key &key, std::string_view name, DWORD type, std::vector<BYTE> data);

// REGEDIT4 text of the tree whose root key is called `rootName`
// (e.g. "HKEY_LOCAL_MACHINE").
std::string formatHive(const Key &root, const std::string &rootName);

// Parses REGEDIT4 text; false (with a reason) for anything that is not a whole,
// well-formed file of that root.
bool parseHive(std::string_view text, const std::string &rootName, Key &out, std::string &error);

// One hive file shared by every process of the world. Each operation works on
// the current content: reads under a shared lock, re-reading the file only when
// it was replaced since; updates under an exclusive lock, written through at
// once by writing a temporary file and renaming it over the hive, so a process
// killed at any point leaves either the old or the new whole file.
class HiveFile {
public:
  HiveFile(std::string path, std::string rootName);
  ~HiveFile();
  HiveFile(const HiveFile &) = delete;
  HiveFile &operator=(const HiveFile &) = delete;

  // Runs `reader` on the current tree. Returns its result, or ERROR_CANTREAD
  // when the file cannot be read or is not a valid hive.
  LONG read(const std::function<LONG(const Key &)> &reader);

  // Runs `writer` on the current tree; when it returns ERROR_SUCCESS and set
  // `changed`, the tree is written through. ERROR_CANTWRITE when that fails (the
  // file is then unchanged), ERROR_CANTREAD as for read.
  LONG update(const std::function<LONG(Key &, bool &changed)> &writer);

  const std::string &path() const { return path_; }

  // Writes the tree through when a batch deferred changes to it.
  bool flush();

private:
  bool refresh();
  bool writeThrough();
  void forget();

  std::string path_;
  std::string rootName_;
  Key tree_;
  bool loaded_ = false;
  int heldFd_ = -1; // keeps the loaded file's inode from being reused
  long long size_ = -1;
  long long mtimeNs_ = 0;
  bool dirty_ = false; // changed during a batch, not written yet
};

// While a batch is alive in this process, changes are kept in memory and every
// changed hive is written once when the outermost batch ends. Only for building
// a world that no other process uses yet: a batch holds back what other
// processes would see. Batches nest.
class WriteBatch {
public:
  WriteBatch();
  ~WriteBatch();
  WriteBatch(const WriteBatch &) = delete;
  WriteBatch &operator=(const WriteBatch &) = delete;

  // Ends the batch early; false when a hive could not be written.
  bool commit();

private:
  bool open_ = true;
};

} // namespace kxlsim::posix::hive
