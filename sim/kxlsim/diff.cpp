#include "sim/kxlsim/diff.h"
#include "sim/kxlsim/hostfile.h"

#include "sim/kxlsim/world_writer.h"
#include "sim/posix/regfile.h"

#include <algorithm>
#include <cctype>
#include <cstdio>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <map>
#include <set>
#include <sstream>
#include <vector>

namespace kxlsim {

namespace fs = std::filesystem;
namespace reg = posix::hive;

namespace {

// Key paths by folded path; each keeps its written spelling and values.
struct FlatKey {
  std::string path;
  const reg::Key *key;
};
using FlatHive = std::map<std::string, FlatKey>;

void flatten(const reg::Key &key, const std::string &path, FlatHive &out) {
  out[reg::fold(path)] = {path, &key};
  for (const auto &[folded, sub] : key.subkeys)
    flatten(sub, path + "\\" + sub.name, out);
}

std::string hexBytes(const std::vector<BYTE> &data) {
  std::string text = "hex:";
  char byte[4];
  for (size_t i = 0; i < data.size(); ++i) {
    std::snprintf(byte, sizeof byte, i == 0 ? "%02x" : ",%02x", data[i]);
    text += byte;
  }
  return text;
}

std::string valueText(const reg::Value &value) {
  const std::vector<BYTE> &d = value.data;
  switch (value.type) {
  case REG_SZ:
  case REG_EXPAND_SZ: {
    std::string s(d.begin(), d.end());
    return "\"" + s.substr(0, s.find('\0')) + "\"";
  }
  case REG_DWORD:
    if (d.size() == 4) {
      DWORD v = DWORD(d[0]) | DWORD(d[1]) << 8 | DWORD(d[2]) << 16 | DWORD(d[3]) << 24;
      return "dword:" + std::to_string(v);
    }
    break;
  case REG_MULTI_SZ: {
    std::string items;
    std::string current;
    for (BYTE b : d) {
      if (b != 0) {
        current.push_back(char(b));
        continue;
      }
      if (current.empty())
        break;
      items += (items.empty() ? "\"" : ", \"") + current + "\"";
      current.clear();
    }
    return "multi:[" + items + "]";
  }
  default:
    break;
  }
  return "type " + std::to_string(value.type) + " " + hexBytes(d);
}

std::string valueName(const reg::Value &value) {
  return value.name.empty() ? "@" : "\"" + value.name + "\"";
}

bool sameValue(const reg::Value &a, const reg::Value &b) {
  return a.type == b.type && a.data == b.data;
}

class Report {
public:
  explicit Report(std::ostream &out) : out_(out) {}
  void line(const std::string &text) {
    out_ << text << '\n';
    differs_ = true;
  }
  void detail(const std::string &text) { out_ << text << '\n'; }
  bool differs() const { return differs_; }

private:
  std::ostream &out_;
  bool differs_ = false;
};

void diffValues(const FlatKey &a, const FlatKey &b, Report &report) {
  std::string where = displayKeyPath(b.path);
  for (const auto &[folded, value] : a.key->values) {
    auto other = b.key->values.find(folded);
    if (other == b.key->values.end())
      report.line("registry - " + where + " " + valueName(value) + " = " + valueText(value));
    else if (!sameValue(value, other->second))
      report.line("registry ~ " + where + " " + valueName(value) + ": " + valueText(value) + " -> " +
                  valueText(other->second));
  }
  for (const auto &[folded, value] : b.key->values)
    if (a.key->values.count(folded) == 0)
      report.line("registry + " + where + " " + valueName(value) + " = " + valueText(value));
}

void listKey(const char *sign, const FlatKey &key, Report &report) {
  report.line(std::string("registry ") + sign + " " + displayKeyPath(key.path));
  for (const auto &[folded, value] : key.key->values)
    report.detail(std::string("           ") + sign + " " + valueName(value) + " = " + valueText(value));
}

void diffHives(const FlatHive &a, const FlatHive &b, Report &report) {
  for (const auto &[folded, key] : a) {
    auto other = b.find(folded);
    if (other == b.end())
      listKey("-", key, report);
    else
      diffValues(key, other->second, report);
  }
  for (const auto &[folded, key] : b)
    if (a.count(folded) == 0)
      listKey("+", key, report);
}

bool diffRegistry(const fs::path &a, const fs::path &b, const char *file, const char *rootName,
                  Report &report, std::ostream &out) {
  reg::Key treeA, treeB;
  std::string error;
  // As programs in the worlds see them: each hive with its change log replayed.
  if (!reg::loadHive((a / file).string(), rootName, treeA, error) ||
      !reg::loadHive((b / file).string(), rootName, treeB, error)) {
    out << "kxlsim: " << error << '\n';
    return false;
  }
  FlatHive flatA, flatB;
  for (const auto &[folded, sub] : treeA.subkeys)
    flatten(sub, std::string(rootName) + "\\" + sub.name, flatA);
  for (const auto &[folded, sub] : treeB.subkeys)
    flatten(sub, std::string(rootName) + "\\" + sub.name, flatB);
  diffHives(flatA, flatB, report);
  return true;
}

// ---- files ----

bool isHiveFile(const std::string &relative) {
  return relative.rfind("system.reg", 0) == 0 || relative.rfind("user.reg", 0) == 0;
}

std::map<std::string, fs::path> worldFiles(const fs::path &root) {
  std::map<std::string, fs::path> files;
  std::error_code ec;
  for (auto it = fs::recursive_directory_iterator(root, ec); !ec && it != fs::recursive_directory_iterator();
       it.increment(ec)) {
    if (it->is_directory())
      continue;
    std::string relative = fs::relative(it->path(), root).generic_string();
    if (!isHiveFile(relative))
      files[relative] = it->path();
  }
  return files;
}

// "drive_c/A/b" -> "C:\A\b", "unc/S/H/x" -> "\\S\H\x"; world files stay as they are.
std::string displayFilePath(const std::string &relative) {
  std::string shown = relative;
  if (relative.rfind("drive_", 0) == 0 && relative.size() > 7 && relative[7] == '/')
    shown = std::string(1, char(std::toupper(static_cast<unsigned char>(relative[6])))) + ":" +
            relative.substr(7);
  else if (relative.rfind("unc/", 0) == 0)
    shown = "//" + relative.substr(4);
  else
    return relative;
  for (char &c : shown)
    if (c == '/')
      c = '\\';
  return shown;
}

std::string readAll(const fs::path &path) {
  std::string bytes;
  readHostFile(path, bytes);
  return bytes;
}

// Compares two files of the same size block by block, without holding either.
bool sameBytes(const fs::path &a, const fs::path &b) {
  std::ifstream inA(a, std::ios::binary), inB(b, std::ios::binary);
  if (!inA || !inB)
    return false;
  static char blockA[1 << 16], blockB[1 << 16];
  while (inA && inB) {
    inA.read(blockA, sizeof blockA);
    inB.read(blockB, sizeof blockB);
    if (inA.gcount() != inB.gcount() || std::memcmp(blockA, blockB, static_cast<size_t>(inA.gcount())) != 0)
      return false;
  }
  return inA.eof() && inB.eof();
}

uint64_t fnv1a(const std::string &bytes) {
  uint64_t hash = 0xcbf29ce484222325ull;
  for (unsigned char c : bytes) {
    hash ^= c;
    hash *= 0x100000001b3ull;
  }
  return hash;
}

bool isText(const std::string &bytes) {
  return bytes.find('\0') == std::string::npos;
}

std::string sizeAndHash(const std::string &bytes) {
  char text[64];
  std::snprintf(text, sizeof text, "%zu bytes, fnv %016llx", bytes.size(),
                static_cast<unsigned long long>(fnv1a(bytes)));
  return text;
}

std::vector<std::string> splitLines(const std::string &text) {
  std::vector<std::string> lines;
  std::istringstream in(text);
  std::string line;
  while (std::getline(in, line)) {
    if (!line.empty() && line.back() == '\r')
      line.pop_back();
    lines.push_back(line);
  }
  return lines;
}

constexpr size_t kMaxLineDiffCells = 4000000;

// Line differences by longest common subsequence; false when the files are too
// large to compare line by line.
bool lineDiff(const std::vector<std::string> &a, const std::vector<std::string> &b, Report &report) {
  size_t n = a.size(), m = b.size();
  if ((n + 1) * (m + 1) > kMaxLineDiffCells)
    return false;
  std::vector<std::vector<uint32_t>> common(n + 1, std::vector<uint32_t>(m + 1, 0));
  for (size_t i = n; i-- > 0;)
    for (size_t j = m; j-- > 0;)
      common[i][j] = a[i] == b[j] ? common[i + 1][j + 1] + 1 : std::max(common[i + 1][j], common[i][j + 1]);
  size_t i = 0, j = 0;
  while (i < n || j < m) {
    if (i < n && j < m && a[i] == b[j]) {
      ++i, ++j;
    } else if (j < m && (i == n || common[i][j + 1] >= common[i + 1][j])) {
      report.detail("       + " + b[j++]);
    } else {
      report.detail("       - " + a[i++]);
    }
  }
  return true;
}

void diffFile(const std::string &shown, const fs::path &a, const fs::path &b, Report &report) {
  std::error_code sizeA, sizeB;
  bool sameSize = fs::file_size(a, sizeA) == fs::file_size(b, sizeB) && !sizeA && !sizeB;
  if (sameSize && sameBytes(a, b))
    return;
  std::string bytesA = readAll(a), bytesB = readAll(b);
  if (bytesA == bytesB)
    return;
  if (isText(bytesA) && isText(bytesB)) {
    report.line("file ~ " + shown);
    if (!lineDiff(splitLines(bytesA), splitLines(bytesB), report))
      report.detail("       (" + sizeAndHash(bytesA) + " -> " + sizeAndHash(bytesB) + ")");
    return;
  }
  report.line("file ~ " + shown + " (" + sizeAndHash(bytesA) + " -> " + sizeAndHash(bytesB) + ")");
}

constexpr size_t kMaxAddedLinesShown = 20;

// A new small text file (an event log, a log file) is shown with its lines.
void reportAddedFile(const std::string &shown, const std::string &bytes, Report &report) {
  report.line("file + " + shown + " (" + sizeAndHash(bytes) + ")");
  std::vector<std::string> lines = splitLines(bytes);
  if (!isText(bytes) || lines.size() > kMaxAddedLinesShown)
    return;
  for (const std::string &line : lines)
    report.detail("       + " + line);
}

void diffFiles(const fs::path &a, const fs::path &b, Report &report) {
  std::map<std::string, fs::path> filesA = worldFiles(a), filesB = worldFiles(b);
  for (const auto &[relative, path] : filesA) {
    auto other = filesB.find(relative);
    if (other == filesB.end())
      report.line("file - " + displayFilePath(relative));
    else
      diffFile(displayFilePath(relative), path, other->second, report);
  }
  for (const auto &[relative, path] : filesB)
    if (filesA.count(relative) == 0)
      reportAddedFile(displayFilePath(relative), readAll(path), report);
}

} // namespace

std::string displayKeyPath(const std::string &fullPath) {
  const std::string lm = "HKEY_LOCAL_MACHINE";
  const std::string cu = "HKEY_CURRENT_USER";
  if (reg::fold(fullPath).rfind(reg::fold(cu), 0) == 0)
    return "HKCU" + fullPath.substr(cu.size());
  if (reg::fold(fullPath).rfind(reg::fold(lm), 0) != 0)
    return fullPath;
  std::string rest = fullPath.substr(lm.size());
  std::string machines = std::string("\\") + kMachinesKey + "\\";
  if (reg::fold(rest).rfind(reg::fold(machines), 0) != 0)
    return "HKLM" + rest;
  std::string below = rest.substr(machines.size());
  size_t slash = below.find('\\');
  std::string machine = below.substr(0, slash);
  return "[" + machine + "] HKLM" + (slash == std::string::npos ? "" : below.substr(slash));
}

int diffWorlds(const std::string &hostDirA, const std::string &hostDirB, std::ostream &out) {
  Report report(out);
  fs::path a(hostDirA), b(hostDirB);
  if (!diffRegistry(a, b, "system.reg", "HKEY_LOCAL_MACHINE", report, out) ||
      !diffRegistry(a, b, "user.reg", "HKEY_CURRENT_USER", report, out))
    return 2;
  diffFiles(a, b, report);
  return report.differs() ? 1 : 0;
}

} // namespace kxlsim
