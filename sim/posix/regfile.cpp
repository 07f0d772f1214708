// REGEDIT4 hive files: text form, parsing, locking and atomic write-through.
#include "sim/posix/regfile.h"

#include "sim/common/simfail.h"

#include <algorithm>
#include <atomic>

#include <fcntl.h>
#include <sys/file.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>
#include <utility>

namespace kxlsim::posix::hive {

std::string fold(std::string_view name) {
  std::string folded(name);
  for (char &c : folded)
    if (c >= 'A' && c <= 'Z')
      c = static_cast<char>(c - 'A' + 'a');
  return folded;
}

Key *findKey(Key &root, const KeyPath &path) {
  Key *key = &root;
  for (const std::string &name : path) {
    auto it = key->subkeys.find(fold(name));
    if (it == key->subkeys.end())
      return nullptr;
    key = &it->second;
  }
  return key;
}

const Key *findKey(const Key &root, const KeyPath &path) {
  return findKey(const_cast<Key &>(root), path);
}

Key &createKey(Key &root, const KeyPath &path, bool &created) {
  Key *key = &root;
  created = false;
  for (const std::string &name : path) {
    auto [it, inserted] = key->subkeys.try_emplace(fold(name));
    if (inserted)
      it->second.name = name;
    created = inserted;
    key = &it->second;
  }
  return *key;
}

void setValue(Key &key, std::string_view name, DWORD type, std::vector<BYTE> data) {
  auto [it, inserted] = key.values.try_emplace(fold(name));
  if (inserted)
    it->second.name = std::string(name);
  it->second.type = type;
  it->second.data = std::move(data);
}

void mergeKey(Key &target, const Key &source) {
  for (const auto &[folded, value] : source.values)
    setValue(target, value.name, value.type, value.data);
  for (const auto &[folded, child] : source.subkeys) {
    auto [it, inserted] = target.subkeys.try_emplace(folded);
    if (inserted)
      it->second.name = child.name;
    mergeKey(it->second, child);
  }
}

// ---------------------------------------------------------------- writing

namespace {

constexpr size_t kHexWrapColumn = 76;

std::string quoted(std::string_view text) {
  std::string out = "\"";
  for (char c : text) {
    if (c == '\\' || c == '"')
      out += '\\';
    out += c;
  }
  return out + "\"";
}

// A REG_SZ is written as text only when reading it back gives the same bytes:
// one terminating NUL, no other NUL and no line breaks.
bool isPlainText(const Value &value) {
  const auto &d = value.data;
  if (value.type != REG_SZ || d.empty() || d.back() != 0)
    return false;
  for (size_t i = 0; i + 1 < d.size(); ++i)
    if (d[i] == 0 || d[i] == '\n' || d[i] == '\r')
      return false;
  return true;
}

std::string hexData(const std::string &prefix, DWORD type, const std::vector<BYTE> &data) {
  char dataText[24];
  if (type == REG_BINARY)
    std::snprintf(dataText, sizeof dataText, "hex:");
  else
    std::snprintf(dataText, sizeof dataText, "hex(%x):", static_cast<unsigned>(type));
  std::string out = dataText;
  size_t column = prefix.size() + out.size();
  for (size_t i = 0; i < data.size(); ++i) {
    if (i > 0) {
      out += ',';
      ++column;
      if (column >= kHexWrapColumn) {
        out += "\\\n  ";
        column = 2;
      }
    }
    char byte[4];
    std::snprintf(byte, sizeof byte, "%02x", data[i]);
    out += byte;
    column += 2;
  }
  return out;
}

std::string valueLine(const Value &value) {
  std::string line = value.name.empty() ? "@=" : quoted(value.name) + "=";
  if (isPlainText(value)) {
    const char *text = reinterpret_cast<const char *>(value.data.data());
    return line + quoted(std::string_view(text, value.data.size() - 1));
  }
  if (value.type == REG_DWORD && value.data.size() == 4) {
    const auto &d = value.data;
    unsigned number = d[0] | (d[1] << 8) | (d[2] << 16) | (static_cast<unsigned>(d[3]) << 24);
    char text[24];
    std::snprintf(text, sizeof text, "dword:%08x", number);
    return line + text;
  }
  return line + hexData(line, value.type, value.data);
}

void formatKey(const Key &key, const std::string &path, bool isRoot, std::string &out) {
  if (!isRoot || !key.values.empty()) {
    out += "[" + path + "]\n";
    for (const auto &[folded, value] : key.values)
      out += valueLine(value) + "\n";
    out += "\n";
  }
  for (const auto &[folded, child] : key.subkeys)
    formatKey(child, path + "\\" + child.name, false, out);
}

} // namespace

std::string formatHive(const Key &root, const std::string &rootName) {
  std::string out = "REGEDIT4\n\n";
  formatKey(root, rootName, true, out);
  return out;
}

// ---------------------------------------------------------------- parsing

namespace {

std::string_view trimmed(std::string_view s) {
  size_t b = s.find_first_not_of(" \t");
  if (b == std::string_view::npos)
    return {};
  size_t e = s.find_last_not_of(" \t");
  return s.substr(b, e - b + 1);
}

class LineReader {
public:
  explicit LineReader(std::string_view text) : text_(text) {}
  bool next(std::string_view &line) {
    if (pos_ >= text_.size())
      return false;
    size_t end = text_.find('\n', pos_);
    if (end == std::string_view::npos)
      end = text_.size();
    line = text_.substr(pos_, end - pos_);
    if (!line.empty() && line.back() == '\r')
      line.remove_suffix(1);
    pos_ = end + 1;
    ++number_;
    return true;
  }
  size_t number() const { return number_; }

private:
  std::string_view text_;
  size_t pos_ = 0;
  size_t number_ = 0;
};

// Reads a quoted string starting at text[pos] == '"'; returns the position
// after the closing quote, or npos when it is not closed.
size_t readQuoted(std::string_view text, size_t pos, std::string &out) {
  out.clear();
  for (size_t i = pos + 1; i < text.size(); ++i) {
    char c = text[i];
    if (c == '"')
      return i + 1;
    if (c == '\\' && i + 1 < text.size() && (text[i + 1] == '\\' || text[i + 1] == '"'))
      c = text[++i];
    out += c;
  }
  return std::string_view::npos;
}

int hexDigit(char c) {
  if (c >= '0' && c <= '9')
    return c - '0';
  if (c >= 'a' && c <= 'f')
    return c - 'a' + 10;
  if (c >= 'A' && c <= 'F')
    return c - 'A' + 10;
  return -1;
}

bool parseHexNumber(std::string_view text, size_t maxDigits, unsigned long &out) {
  if (text.empty() || text.size() > maxDigits)
    return false;
  out = 0;
  for (char c : text) {
    int d = hexDigit(c);
    if (d < 0)
      return false;
    out = out * 16 + static_cast<unsigned long>(d);
  }
  return true;
}

bool parseHexBytes(std::string_view list, std::vector<BYTE> &out) {
  list = trimmed(list);
  while (!list.empty()) {
    size_t comma = list.find(',');
    std::string_view item = trimmed(list.substr(0, comma));
    unsigned long byte = 0;
    if (!parseHexNumber(item, 2, byte))
      return false;
    out.push_back(static_cast<BYTE>(byte));
    if (comma == std::string_view::npos)
      break;
    list = list.substr(comma + 1);
    if (trimmed(list).empty())
      return false;
  }
  return true;
}

// `dataText` is what follows "=" on a value line (continuations already joined).
bool parseData(std::string_view dataText, Value &value) {
  if (!dataText.empty() && dataText[0] == '"') {
    std::string text;
    size_t end = readQuoted(dataText, 0, text);
    if (end == std::string_view::npos || !trimmed(dataText.substr(end)).empty())
      return false;
    value.type = REG_SZ;
    value.data.assign(text.begin(), text.end());
    value.data.push_back(0);
    return true;
  }
  if (dataText.substr(0, 6) == "dword:") {
    unsigned long number = 0;
    if (!parseHexNumber(trimmed(dataText.substr(6)), 8, number))
      return false;
    value.type = REG_DWORD;
    value.data = {static_cast<BYTE>(number), static_cast<BYTE>(number >> 8), static_cast<BYTE>(number >> 16),
                  static_cast<BYTE>(number >> 24)};
    return true;
  }
  size_t colon = dataText.find(':');
  if (colon == std::string_view::npos)
    return false;
  std::string_view kind = dataText.substr(0, colon);
  unsigned long type = REG_BINARY;
  if (kind != "hex") {
    if (kind.size() < 6 || kind.substr(0, 4) != "hex(" || kind.back() != ')' ||
        !parseHexNumber(kind.substr(4, kind.size() - 5), 8, type))
      return false;
  }
  value.type = static_cast<DWORD>(type);
  return parseHexBytes(dataText.substr(colon + 1), value.data);
}

// Joins the continuation lines of a hex value ("...,\" then "  ...").
bool joinContinuations(LineReader &lines, std::string &logical) {
  while (true) {
    std::string_view end = trimmed(logical);
    if (end.empty() || end.back() != '\\')
      return true;
    logical.resize(static_cast<size_t>(end.data() - logical.data()) + end.size() - 1);
    std::string_view next;
    if (!lines.next(next))
      return false;
    logical += trimmed(next);
  }
}

// A value line; with `changes`, "=-" removes the value.
bool parseValueLine(std::string_view line, LineReader &lines, Key &key, bool changes) {
  Value value;
  size_t pos = 0;
  if (line[0] == '@') {
    pos = 1;
  } else {
    pos = readQuoted(line, 0, value.name);
    if (pos == std::string_view::npos)
      return false;
  }
  if (pos >= line.size() || line[pos] != '=')
    return false;
  std::string dataText(trimmed(line.substr(pos + 1)));
  if (changes && dataText == "-") {
    key.values.erase(fold(value.name));
    return true;
  }
  if (dataText.compare(0, 3, "hex") == 0 && !joinContinuations(lines, dataText))
    return false;
  if (!parseData(dataText, value))
    return false;
  setValue(key, value.name, value.type, std::move(value.data));
  return true;
}

// "ROOT\a\b" as the key path below the root; false for another root or an empty name.
bool parseKeyName(std::string_view path, const std::string &rootName, KeyPath &names) {
  names.clear();
  size_t start = 0;
  while (start <= path.size()) {
    size_t sep = path.find('\\', start);
    if (sep == std::string_view::npos)
      sep = path.size();
    names.emplace_back(path.substr(start, sep - start));
    if (names.back().empty())
      return false;
    start = sep + 1;
  }
  if (fold(names.front()) != fold(rootName))
    return false;
  names.erase(names.begin());
  return true;
}

// A section line; with `changes`, "[-KEY]" removes the key and its subtree
// (values may not follow it).
bool parseSection(std::string_view line, const std::string &rootName, Key &root, Key *&current,
                  bool changes) {
  bool removal = line.size() >= 2 && line[1] == '-';
  if (line.size() < 3 || line.back() != ']' || (removal && !changes))
    return false;
  KeyPath names;
  if (!parseKeyName(line.substr(removal ? 2 : 1, line.size() - (removal ? 3 : 2)), rootName, names))
    return false;
  if (removal) {
    if (names.empty())
      return false; // the root itself is never removed
    current = nullptr;
    Key *parent = findKey(root, KeyPath(names.begin(), names.end() - 1));
    if (parent != nullptr)
      parent->subkeys.erase(fold(names.back()));
    return true;
  }
  bool created = false;
  current = &createKey(root, names, created);
  return true;
}

// Reads REGEDIT4 text into `tree` (which keeps what it holds); `changes`
// allows the removal forms of change text.
bool parseInto(std::string_view text, const std::string &rootName, Key &tree, bool changes,
               std::string &error) {
  LineReader lines(text);
  std::string_view line;
  bool header = changes; // change text has no header of its own
  Key *current = nullptr;
  while (lines.next(line)) {
    line = trimmed(line);
    if (line.empty() || line[0] == ';')
      continue;
    bool ok = false;
    if (!header)
      ok = header = line == "REGEDIT4";
    else if (line[0] == '[')
      ok = parseSection(line, rootName, tree, current, changes);
    else if (current != nullptr && (line[0] == '"' || line[0] == '@'))
      ok = parseValueLine(line, lines, *current, changes);
    if (!ok) {
      error = "line " + std::to_string(lines.number()) + ": " + std::string(line.substr(0, 80));
      return false;
    }
  }
  if (!header && !text.empty()) {
    error = "no REGEDIT4 header";
    return false;
  }
  return true;
}

} // namespace

bool parseHive(std::string_view text, const std::string &rootName, Key &out, std::string &error) {
  out = Key{};
  return parseInto(text, rootName, out, false, error);
}

bool applyChange(std::string_view text, const std::string &rootName, Key &tree) {
  std::string error;
  return parseInto(text, rootName, tree, true, error);
}

// ---------------------------------------------------------------- changes

std::string Change::keyName(const KeyPath &path) const {
  std::string name = rootName_;
  for (const std::string &part : path)
    name += "\\" + part;
  return name;
}

void Change::createKey(const KeyPath &path) {
  text_ += "[" + keyName(path) + "]\n";
}

void Change::setValue(const KeyPath &path, const Value &value) {
  text_ += "[" + keyName(path) + "]\n" + valueLine(value) + "\n";
}

void Change::deleteValue(const KeyPath &path, const std::string &name) {
  text_ += "[" + keyName(path) + "]\n" + (name.empty() ? std::string("@") : quoted(name)) + "=-\n";
}

void Change::deleteKey(const KeyPath &path) {
  text_ += "[-" + keyName(path) + "]\n";
}

void Change::mergeKey(const KeyPath &path, const Key &source) {
  formatKey(source, keyName(path), false, text_);
}

// ---------------------------------------------------------------- the file

namespace {

// The change log starts with this word and the hash of the hive text it
// applies to; then one record per change: "@<length> <hash>\n" and the text.
constexpr char kLogMagic[] = "KXLSIM-REGLOG";
// A log longer than the hive (and than this) is folded into the hive.
constexpr long long kMinFoldBytes = 64 * 1024;

// flock on the folder holding the hives: one lock serves both hives of a world
// and leaves no lock file behind in it.
class FolderLock {
public:
  FolderLock(const std::string &file, int operation) {
    size_t slash = file.find_last_of('/');
    std::string dir = slash == std::string::npos ? "." : (slash == 0 ? "/" : file.substr(0, slash));
    fd_ = open(dir.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC);
    if (fd_ < 0)
      return;
    int rc;
    do
      rc = flock(fd_, operation);
    while (rc != 0 && errno == EINTR);
    if (rc != 0) {
      close(fd_);
      fd_ = -1;
    }
  }
  ~FolderLock() {
    if (fd_ >= 0)
      close(fd_); // releases the lock
  }
  FolderLock(const FolderLock &) = delete;
  FolderLock &operator=(const FolderLock &) = delete;
  bool held() const { return fd_ >= 0; }

private:
  int fd_ = -1;
};

HiveFile::Seen seenOf(const struct stat &st) {
  return {static_cast<unsigned long long>(st.st_dev), static_cast<unsigned long long>(st.st_ino),
          static_cast<long long>(st.st_size),
          static_cast<long long>(st.st_mtim.tv_sec) * 1000000000LL + st.st_mtim.tv_nsec};
}

bool operator==(const HiveFile::Seen &a, const HiveFile::Seen &b) {
  return a.dev == b.dev && a.ino == b.ino && a.size == b.size && a.mtimeNs == b.mtimeNs;
}

// What is at `path` now (ino 0 when nothing is); false when it cannot be told.
bool look(const std::string &path, HiveFile::Seen &out) {
  struct stat st {};
  out = HiveFile::Seen{};
  if (stat(path.c_str(), &st) == 0) {
    out = seenOf(st);
    return true;
  }
  return errno == ENOENT;
}

// Reads from `offset` to the end of the file.
bool readFrom(int fd, off_t offset, std::string &out) {
  out.clear();
  char buffer[65536];
  while (true) {
    ssize_t n = ::pread(fd, buffer, sizeof buffer, offset);
    if (n < 0 && errno == EINTR)
      continue;
    if (n < 0)
      return false;
    if (n == 0)
      return true;
    out.append(buffer, static_cast<size_t>(n));
    offset += n;
  }
}

bool writeAll(int fd, const std::string &text) {
  size_t done = 0;
  while (done < text.size()) {
    ssize_t n = ::write(fd, text.data() + done, text.size() - done);
    if (n < 0 && errno == EINTR)
      continue;
    if (n <= 0)
      return false;
    done += static_cast<size_t>(n);
  }
  return true;
}

unsigned long long fnv1a(std::string_view text) {
  unsigned long long hash = 14695981039346656037ULL;
  for (unsigned char c : text) {
    hash ^= c;
    hash *= 1099511628211ULL;
  }
  return hash;
}

std::string logHeader(unsigned long long hiveHash) {
  char text[64];
  std::snprintf(text, sizeof text, "%s %016llx\n", kLogMagic, hiveHash);
  return text;
}

std::string logRecord(const std::string &change) {
  char head[64];
  std::snprintf(head, sizeof head, "@%zu %016llx\n", change.size(), fnv1a(change));
  return head + change;
}

// Applies the whole records of `log` from `pos` on and returns where the last
// one ends: a record cut short or damaged (a killed writer's) ends the replay.
size_t replayRecords(std::string_view log, size_t pos, const std::string &rootName, Key &tree) {
  while (pos < log.size() && log[pos] == '@') {
    size_t eol = log.find('\n', pos);
    if (eol == std::string_view::npos || eol - pos > 40)
      break;
    std::string head(log.substr(pos + 1, eol - pos - 1));
    unsigned long long length = 0, hash = 0;
    int used = 0;
    if (std::sscanf(head.c_str(), "%llu %llx%n", &length, &hash, &used) != 2 ||
        static_cast<size_t>(used) != head.size() || length > log.size() - (eol + 1))
      break;
    std::string_view change = log.substr(eol + 1, length);
    if (fnv1a(change) != hash || !applyChange(change, rootName, tree))
      break;
    pos = eol + 1 + length;
  }
  return pos;
}

int batchDepth = 0;
// Never destroyed: hives held in other static objects unregister themselves
// during exit, in whatever order those are destroyed.
std::vector<HiveFile *> &liveHives() {
  static auto *hives = new std::vector<HiveFile *>;
  return *hives;
}

} // namespace

bool loadHive(const std::string &path, const std::string &rootName, Key &out, std::string &error) {
  HiveFile file(path, rootName);
  LONG rc = file.read([&](const Key &tree) -> LONG {
    out = tree;
    return ERROR_SUCCESS;
  });
  if (rc == ERROR_SUCCESS)
    return true;
  // Say why: the hive's own text is what can be wrong.
  std::string text;
  int fd = open(path.c_str(), O_RDONLY | O_CLOEXEC);
  error = "cannot read " + path;
  if (fd >= 0 && readFrom(fd, 0, text) && !parseHive(text, rootName, out, error))
    error = path + ": " + error;
  if (fd >= 0)
    close(fd);
  return false;
}

namespace {
std::atomic<unsigned long long> editCount{0};
} // namespace

unsigned long long treeEdits() {
  return editCount.load();
}

HiveFile::HiveFile(std::string path, std::string rootName)
    : path_(std::move(path)), logPath_(path_ + ".log"), rootName_(std::move(rootName)) {
  ++editCount;
  liveHives().push_back(this);
}

HiveFile::~HiveFile() {
  flush();
  foldAtEnd();
  std::vector<HiveFile *> &hives = liveHives();
  hives.erase(std::remove(hives.begin(), hives.end(), this), hives.end());
  forget();
  ++editCount;
}

void HiveFile::forgetLog() {
  if (logFd_ >= 0)
    close(logFd_);
  logFd_ = -1;
  log_ = Seen{};
  logGood_ = 0;
  logStale_ = false;
}

void HiveFile::forget() {
  ++editCount;
  if (heldFd_ >= 0)
    close(heldFd_);
  heldFd_ = -1;
  loaded_ = false;
  tree_ = Key{};
  hive_ = Seen{};
  hiveHash_ = 0;
  forgetLog();
}

// True when neither the hive nor its log changed since they were read. The
// files read are held open, so a replaced file never shows the same inode.
bool HiveFile::current() const {
  Seen hive, log;
  return loaded_ && look(path_, hive) && hive == hive_ && look(logPath_, log) && log == log_;
}

// Brings tree_ up to the hive and its log (caller holds the lock).
bool HiveFile::refresh() {
  ++editCount;
  for (int attempt = 0; attempt < 2; ++attempt) {
    if (current())
      return true;
    Seen hive;
    if (!look(path_, hive))
      return false;
    if ((!loaded_ || !(hive == hive_)) && !loadHiveFile())
      return false;
    if (replayLog())
      return true;
    forget(); // not the log replayed so far: start again from the hive
  }
  return false;
}

bool HiveFile::loadHiveFile() {
  forget();
  int fd = open(path_.c_str(), O_RDONLY | O_CLOEXEC);
  if (fd < 0) {
    if (errno != ENOENT)
      return false;
    hiveHash_ = fnv1a(""); // no file yet: an empty hive
    loaded_ = true;
    return true;
  }
  struct stat st {};
  std::string text, error;
  Key tree;
  if (fstat(fd, &st) != 0 || !readFrom(fd, 0, text) || !parseHive(text, rootName_, tree, error)) {
    close(fd);
    return false;
  }
  tree_ = std::move(tree);
  heldFd_ = fd;
  hive_ = seenOf(st);
  hiveHash_ = fnv1a(text);
  loaded_ = true;
  return true;
}

// Replays what is new in the log (caller holds the lock). False when the log
// is not the one replayed so far, or cannot be read.
bool HiveFile::replayLog() {
  Seen now;
  if (!look(logPath_, now))
    return false;
  if (now.ino == 0) {
    // A log is removed only after its hive was replaced, and that was checked first.
    bool replayedOne = log_.ino != 0 && !logStale_;
    forgetLog();
    return !replayedOne;
  }
  if (log_.ino != 0 && (now.dev != log_.dev || now.ino != log_.ino || now.size < log_.size))
    return false;
  if (log_.ino == 0) {
    int fd = open(logPath_.c_str(), O_RDONLY | O_CLOEXEC);
    struct stat st {};
    std::string text;
    if (fd < 0 || fstat(fd, &st) != 0 || !readFrom(fd, 0, text)) {
      if (fd >= 0)
        close(fd);
      return false;
    }
    logFd_ = fd;
    log_ = seenOf(st);
    log_.size = static_cast<long long>(text.size());
    std::string header = logHeader(hiveHash_);
    logStale_ = text.compare(0, header.size(), header) != 0;
    logGood_ =
        logStale_ ? log_.size : static_cast<long long>(replayRecords(text, header.size(), rootName_, tree_));
    return true;
  }
  std::string text;
  if (!readFrom(logFd_, log_.size, text))
    return false;
  const long long end = log_.size + static_cast<long long>(text.size());
  // Nothing is ever appended after a cut-off record (writers fold instead), nor to a stale log.
  if (!logStale_ && logGood_ == log_.size)
    logGood_ += static_cast<long long>(replayRecords(text, 0, rootName_, tree_));
  log_ = now;
  log_.size = end;
  return true;
}

// Appends one change to the log (caller holds the exclusive lock; tree_ holds
// the change already). A log ending in a cut-off record, or grown past the
// hive, is folded into the hive instead.
bool HiveFile::appendToLog(const std::string &change) {
  bool fresh = log_.ino == 0 || logStale_;
  if (!fresh && (logGood_ != log_.size || log_.size > std::max(kMinFoldBytes, hive_.size)))
    return writeThrough();
  std::string bytes = (fresh ? logHeader(hiveHash_) : std::string()) + logRecord(change);
  int fd = -1;
  if (fresh) {
    unlink(logPath_.c_str()); // a stale log, left by a killed fold
    fd = open(logPath_.c_str(), O_RDWR | O_CREAT | O_EXCL | O_APPEND | O_CLOEXEC, 0644);
  } else {
    fd = open(logPath_.c_str(), O_WRONLY | O_APPEND | O_CLOEXEC);
  }
  // A kill here leaves half a record at the log's end, which readers ignore.
  if (fd >= 0 && kxlsim::killDue("hivewrite")) {
    (void)writeAll(fd, bytes.substr(0, bytes.size() / 2));
    kxlsim::killNow();
  }
  struct stat st {};
  bool ok = fd >= 0 && writeAll(fd, bytes) && fstat(fd, &st) == 0;
  if (fresh && ok) {
    forgetLog();
    logFd_ = fd; // held like the hive
  } else if (fd >= 0) {
    ok = close(fd) == 0 && ok;
  }
  if (!ok)
    return false;
  log_ = seenOf(st);
  logGood_ = log_.size;
  appended_ = true;
  return true;
}

// Writes tree_ through whole (caller holds the exclusive lock) and removes the
// log it now holds. A leftover temporary file of a killed writer is simply
// overwritten by the next one; a log left by a writer killed between the
// rename and the removal names the old hive, so readers ignore it.
bool HiveFile::writeThrough() {
  std::string temporary = path_ + ".tmp";
  std::string text = formatHive(tree_, rootName_);
  int fd = open(temporary.c_str(), O_WRONLY | O_CREAT | O_TRUNC | O_CLOEXEC, 0644);
  if (fd < 0)
    return false;
  bool ok = writeAll(fd, text);
  ok = close(fd) == 0 && ok;
  if (ok)
    kxlsim::killPoint("hivewrite"); // a kill here leaves the old hive whole beside a stray temporary file
  if (!ok || rename(temporary.c_str(), path_.c_str()) != 0) {
    unlink(temporary.c_str());
    return false;
  }
  unlink(logPath_.c_str());
  forgetLog();
  appended_ = false;
  // Hold the new file so the next operation sees it as current without re-reading it.
  int held = open(path_.c_str(), O_RDONLY | O_CLOEXEC);
  struct stat st {};
  if (held < 0 || fstat(held, &st) != 0) {
    if (held >= 0)
      close(held);
    forget();
    return true; // written; the next operation reads it back
  }
  if (heldFd_ >= 0)
    close(heldFd_);
  heldFd_ = held;
  hive_ = seenOf(st);
  hiveHash_ = fnv1a(text);
  return true;
}

// A process that changed the hive through the log leaves it folded, so a
// world at rest is its hive files alone.
void HiveFile::foldAtEnd() {
  if (!appended_)
    return;
  appended_ = false;
  FolderLock lock(path_, LOCK_EX);
  if (lock.held() && refresh() && log_.ino != 0 && !logStale_)
    writeThrough();
}

LONG HiveFile::read(const std::function<LONG(const Key &)> &reader) {
  if (dirty_ || current())
    return reader(tree_); // a batch's own changes are the current content
  FolderLock lock(path_, LOCK_SH);
  if (!lock.held() || !refresh())
    return ERROR_CANTREAD;
  return reader(tree_);
}

LONG HiveFile::update(const std::function<LONG(Key &, bool &changed)> &writer) {
  ++editCount;
  if (batchDepth > 0) {
    if (!dirty_) {
      FolderLock lock(path_, LOCK_SH);
      if (!lock.held() || !refresh())
        return ERROR_CANTREAD;
    }
    bool changed = false;
    LONG rc = writer(tree_, changed);
    dirty_ = dirty_ || changed;
    return rc;
  }
  FolderLock lock(path_, LOCK_EX);
  if (!lock.held() || !refresh())
    return ERROR_CANTREAD;
  bool changed = false;
  LONG rc = writer(tree_, changed);
  if (!changed)
    return rc;
  if (rc != ERROR_SUCCESS || !writeThrough()) {
    forget(); // the tree no longer matches the file: re-read next time
    return rc != ERROR_SUCCESS ? rc : ERROR_CANTWRITE;
  }
  return ERROR_SUCCESS;
}

LONG HiveFile::change(const std::function<LONG(const Key &, Change &)> &writer) {
  ++editCount;
  Change change(rootName_);
  if (batchDepth > 0) {
    return update([&](Key &tree, bool &changed) -> LONG {
      LONG rc = writer(tree, change);
      changed = rc == ERROR_SUCCESS && !change.empty();
      return changed && !applyChange(change.text(), rootName_, tree) ? ERROR_CANTWRITE : rc;
    });
  }
  FolderLock lock(path_, LOCK_EX);
  if (!lock.held() || !refresh())
    return ERROR_CANTREAD;
  LONG rc = writer(tree_, change);
  if (rc != ERROR_SUCCESS || change.empty())
    return rc;
  if (!applyChange(change.text(), rootName_, tree_) || !appendToLog(change.text())) {
    forget(); // the tree no longer matches the files: re-read next time
    return ERROR_CANTWRITE;
  }
  return ERROR_SUCCESS;
}

bool HiveFile::flush() {
  if (!dirty_)
    return true;
  dirty_ = false;
  FolderLock lock(path_, LOCK_EX);
  if (lock.held() && writeThrough())
    return true;
  forget();
  return false;
}

WriteBatch::WriteBatch() {
  ++batchDepth;
}

WriteBatch::~WriteBatch() {
  commit();
}

bool WriteBatch::commit() {
  if (!open_)
    return true;
  open_ = false;
  if (--batchDepth > 0)
    return true;
  bool ok = true;
  for (HiveFile *hive : liveHives())
    ok = hive->flush() && ok;
  return ok;
}

} // namespace kxlsim::posix::hive
