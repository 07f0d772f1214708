// The registry store of the simulated machine: one hive per REGEDIT4 text file
// (system.reg, user.reg), and beside each hive a change log (system.reg.log)
// that holds the changes made since the hive was last written whole.
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

// One change to a hive, as the REGEDIT4 text that makes it: "[KEY]" creates a
// key, "[-KEY]" removes it with its subtree, "\"name\"=data" sets a value and
// "\"name\"=-" removes one. The same text is applied here and replayed from the
// change log by every other process, so both get the same tree.
class Change {
public:
  explicit Change(std::string rootName) : rootName_(std::move(rootName)) {}
  void createKey(const KeyPath &path);
  void setValue(const KeyPath &path, const Value &value);
  void deleteValue(const KeyPath &path, const std::string &name);
  void deleteKey(const KeyPath &path);
  // The values and subkeys of `source` merged into the key at `path`.
  void mergeKey(const KeyPath &path, const Key &source);

  bool empty() const { return text_.empty(); }
  const std::string &text() const { return text_; }

private:
  std::string keyName(const KeyPath &path) const;

  std::string rootName_;
  std::string text_;
};

// Applies change text to `tree`; false when it is not well-formed (the tree
// may then hold part of it).
bool applyChange(std::string_view text, const std::string &rootName, Key &tree);

// The registry of a hive file as every process sees it: the hive with its
// change log replayed. False with a reason when the hive is not valid.
bool loadHive(const std::string &path, const std::string &rootName, Key &out, std::string &error);

// Counts the times any tree this process keeps may have changed (read anew,
// changed, made or dropped): what was found in a tree stays valid while the
// count stands.
unsigned long long treeEdits();

// One hive file shared by every process of the world. Each operation works on
// the current content. A process keeps the tree it read; before each operation
// it compares the hive and its change log with what it read (two stat calls,
// no lock) and reads, under a shared lock, only what is new: the change log's
// new records, or the whole hive when it was replaced. A change is made under
// an exclusive lock and appended to the change log in one write. The hive is
// written whole (a temporary file renamed over it, so a killed process leaves
// the old or the new whole file, and the log removed after it) when the log
// has grown past the hive's size, when it ends in a record a killed writer
// left unfinished, and when a process that changed the hive ends.
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
  // `changed`, the whole tree is written through. ERROR_CANTWRITE when that
  // fails (the file is then unchanged), ERROR_CANTREAD as for read.
  LONG update(const std::function<LONG(Key &, bool &changed)> &writer);

  // Runs `writer` on the current tree; the change it describes (when it
  // returns ERROR_SUCCESS) is applied and logged. Errors as for update.
  LONG change(const std::function<LONG(const Key &, Change &)> &writer);

  const std::string &path() const { return path_; }

  // Writes the tree through when a batch deferred changes to it.
  bool flush();

  // The identity and length of a file as last seen; ino 0 for none.
  struct Seen {
    unsigned long long dev = 0, ino = 0;
    long long size = 0, mtimeNs = 0;
  };

private:
  bool current() const;
  bool refresh();
  bool loadHiveFile();
  bool replayLog();
  bool appendToLog(const std::string &text);
  bool writeThrough();
  void forget();
  void forgetLog();
  void foldAtEnd();

  std::string path_;
  std::string logPath_;
  std::string rootName_;
  Key tree_;
  bool loaded_ = false;
  int heldFd_ = -1; // keeps the loaded file's inode from being reused
  Seen hive_;
  unsigned long long hiveHash_ = 0; // of the loaded hive's text: the base a log must name
  int logFd_ = -1;                  // the replayed log, held for the same reason
  Seen log_;
  long long logGood_ = 0; // bytes of the log up to the end of its last whole record
  bool logStale_ = false; // names another hive: left by a killed fold, ignored
  bool appended_ = false; // this process changed the hive through the log
  bool dirty_ = false;    // changed during a batch, not written yet
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
