// Where the world lives and how Windows paths map onto it.
#include "sim/posix/world.h"

#include "sim/common/worldroot.h"

#include <dirent.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <climits>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <fstream>
#include <mutex>
#include <unordered_map>
#include <vector>

namespace kxlsim::posix {

namespace {

bool isSep(char c) {
  return c == '\\' || c == '/';
}

bool isDirectory(const std::string &path) {
  struct stat st {};
  return stat(path.c_str(), &st) == 0 && S_ISDIR(st.st_mode);
}

// Characters Windows refuses in a file name (the drive colon is handled apart).
bool isInvalidNameChar(unsigned char c) {
  return c < 32 || c == '"' || c == '<' || c == '>' || c == '|' || c == ':';
}

// Windows drops trailing dots and spaces from a name ("a." is "a").
std::string trimNameEnd(std::string name) {
  if (name == "." || name == "..")
    return name;
  while (!name.empty() && (name.back() == '.' || name.back() == ' '))
    name.pop_back();
  return name;
}

// An absolute Windows path taken apart: "X:" or "\\SERVER\SHARE" and the rest.
struct SplitPath {
  char drive = 0; // 0 for a UNC path
  std::vector<std::string> parts;
};

// Appends the components of `text`, applying "." and ".." but never climbing
// above the first `floor` components (the server and share of a UNC path).
bool appendComponents(std::string_view text, size_t floor, SplitPath &out) {
  size_t i = 0;
  while (i <= text.size()) {
    size_t end = i;
    while (end < text.size() && !isSep(text[end]))
      ++end;
    std::string name = trimNameEnd(std::string(text.substr(i, end - i)));
    if (name == "..") {
      if (out.parts.size() > floor)
        out.parts.pop_back();
    } else if (!name.empty() && name != ".") {
      for (unsigned char c : name)
        if (isInvalidNameChar(c))
          return false;
      out.parts.push_back(std::move(name));
    }
    i = end + 1;
  }
  return true;
}

bool hasDrive(std::string_view p) {
  return p.size() >= 2 && p[1] == ':' && ((p[0] >= 'A' && p[0] <= 'Z') || (p[0] >= 'a' && p[0] <= 'z'));
}

char upperDrive(char c) {
  return c >= 'a' && c <= 'z' ? static_cast<char>(c - 'a' + 'A') : c;
}

// The current directory as a Windows path: "C:\" when it lies outside the world.
std::string currentWindowsDirectory() {
  std::string current = windowsPath(currentHostDirectory());
  return current.empty() ? "C:\\" : current;
}

// Turns any accepted form into an absolute Windows path.
std::string absoluteWindowsPath(std::string_view p) {
  if (p.size() >= 2 && isSep(p[0]) && isSep(p[1]))
    return std::string(p);
  if (hasDrive(p) && p.size() > 2 && isSep(p[2]))
    return std::string(p); // absolute already: the current directory is not needed
  std::string current = currentWindowsDirectory();
  if (hasDrive(p)) {
    // "X:name" is relative to the current directory when that is on drive X.
    if (upperDrive(p[0]) == upperDrive(current[0]) && current[1] == ':')
      return current + "\\" + std::string(p.substr(2));
    return std::string(1, p[0]) + ":\\" + std::string(p.substr(2));
  }
  if (!p.empty() && isSep(p[0])) {
    if (current[1] == ':')
      return current.substr(0, 2) + std::string(p);
    // Current directory on a share: the root is the share itself.
    SplitPath share;
    appendComponents(std::string_view(current).substr(2), 2, share);
    if (share.parts.size() < 2)
      return "";
    return "\\\\" + share.parts[0] + "\\" + share.parts[1] + std::string(p);
  }
  return current + "\\" + std::string(p);
}

bool splitWindowsPath(std::string_view absolute, SplitPath &out) {
  if (hasDrive(absolute)) {
    out.drive = upperDrive(absolute[0]);
    return appendComponents(absolute.substr(2), 0, out);
  }
  if (!appendComponents(absolute.substr(2), 2, out) || out.parts.size() < 2)
    return false;
  // Device and long-path prefixes ("\\?\", "\\.\") do not name a share.
  return out.parts[0] != "?" && out.parts[0] != ".";
}

// A folder's names by their ASCII-lower-cased spelling (the smallest spelling
// of each), from one listing, kept while the folder's change times stay as they
// were when it was listed, or changed only by this process's own entries.
struct Listing {
  struct timespec mtime {
  }, ctime{};
  dev_t dev = 0;
  ino_t ino = 0;
  std::unordered_map<std::string, std::string> names;
};

constexpr size_t kMaxListings = 64;
// Never destroyed: registry files written while the process exits still
// report the entries they add.
struct ListingCache {
  std::mutex mutex;
  std::unordered_map<std::string, Listing> byFolder; // by host folder
};

ListingCache &listingCache() {
  static ListingCache *cache = new ListingCache;
  return *cache;
}

bool sameTime(const struct timespec &a, const struct timespec &b) {
  return a.tv_sec == b.tv_sec && a.tv_nsec == b.tv_nsec;
}

bool listingCurrent(const Listing &listing, const struct stat &st) {
  return listing.dev == st.st_dev && listing.ino == st.st_ino && sameTime(listing.mtime, st.st_mtim) &&
         sameTime(listing.ctime, st.st_ctim);
}

void stampListing(Listing &listing, const struct stat &st) {
  listing.dev = st.st_dev;
  listing.ino = st.st_ino;
  listing.mtime = st.st_mtim;
  listing.ctime = st.st_ctim;
}

std::string folded(std::string name) {
  for (char &c : name)
    if (c >= 'A' && c <= 'Z')
      c = static_cast<char>(c - 'A' + 'a');
  return name;
}

void addName(Listing &listing, const std::string &name) {
  auto [it, inserted] = listing.names.try_emplace(folded(name), name);
  if (!inserted && name < it->second)
    it->second = name;
}

// The listing of `dir` as it is now: the kept one, or a new one. Null when the
// folder cannot be read. The caller holds the cache's mutex.
const Listing *currentListing(const std::string &dir) {
  struct stat st {};
  if (stat(dir.c_str(), &st) != 0)
    return nullptr;
  auto kept = listingCache().byFolder.find(dir);
  if (kept != listingCache().byFolder.end() && listingCurrent(kept->second, st))
    return &kept->second;
  // The times are taken before the listing: a change made while it is read
  // gives the folder later times, so the listing is not kept past it.
  Listing fresh;
  stampListing(fresh, st);
  DIR *d = opendir(dir.c_str());
  if (d == nullptr)
    return nullptr;
  while (const dirent *entry = readdir(d))
    addName(fresh, entry->d_name);
  closedir(d);
  if (listingCache().byFolder.size() >= kMaxListings)
    listingCache().byFolder.clear();
  return &(listingCache().byFolder[dir] = std::move(fresh));
}

// What lies at `path` (following links): 1 a folder, 0 something else, -1 nothing.
int entryKind(const std::string &path) {
  struct stat st {};
  if (stat(path.c_str(), &st) == 0)
    return S_ISDIR(st.st_mode) ? 1 : 0;
  return lstat(path.c_str(), &st) == 0 ? 0 : -1; // a dangling link is an entry too
}

// How `dir`'s listing answers for `name`, which is not there as written: 1 an
// entry of another letter case (into `found`), 0 none, -1 `dir` cannot be listed.
int matchInListing(const std::string &dir, const std::string &name, std::string &found) {
  std::lock_guard<std::mutex> lock(listingCache().mutex);
  const Listing *listing = currentListing(dir);
  if (listing == nullptr)
    return -1;
  auto it = listing->names.find(folded(name));
  if (it == listing->names.end())
    return 0;
  found = it->second;
  return 1;
}

// The existing entry of `dir` that equals `name` ignoring case; the exact name
// wins, then the smallest one so the choice does not depend on listing order.
bool matchEntry(const std::string &dir, const std::string &name, std::string &found, int &kind) {
  kind = entryKind(dir + "/" + name);
  if (kind >= 0) {
    found = name;
    return true;
  }
  if (matchInListing(dir, name, found) <= 0)
    return false;
  kind = entryKind(dir + "/" + found);
  return true;
}

// The mapping when the path exists as written above its last name, which is
// the common case (a file being read, or made in a folder that exists): the
// exact name wins at every level, so one lookup of the whole path replaces a
// lookup per level. False when the walk level by level is needed.
bool joinExact(const std::string &base, const std::vector<std::string> &parts, std::string &out) {
  std::string parent = base;
  for (size_t i = 0; i + 1 < parts.size(); ++i)
    parent += "/" + parts[i];
  std::string whole = parts.empty() ? parent : parent + "/" + parts.back();
  struct stat st {};
  if (lstat(whole.c_str(), &st) == 0) {
    out = std::move(whole);
    return true;
  }
  if (parts.empty() || errno != ENOENT)
    return false;
  std::string found;
  int match = matchInListing(parent, parts.back(), found);
  if (match < 0)
    return false; // no folder of that exact path: walk level by level
  out = match > 0 ? parent + "/" + found : std::move(whole);
  return true;
}

std::string joinMatched(std::string base, const std::vector<std::string> &parts) {
  std::string exact;
  if (joinExact(base, parts, exact))
    return exact;
  bool matching = isDirectory(base);
  for (const std::string &part : parts) {
    std::string found;
    int kind = -1;
    if (matching && matchEntry(base, part, found, kind)) {
      base += "/" + found;
      matching = kind == 1;
    } else {
      base += "/" + part;
      matching = false;
    }
  }
  return base;
}

// Strips `root` + "/" from the front of `host`; false when `host` is not below it.
bool relativeTo(const std::string &root, const std::string &host, std::string &rest) {
  if (root.empty() || host.size() <= root.size() || host.compare(0, root.size(), root) != 0 ||
      host[root.size()] != '/')
    return false;
  rest = host.substr(root.size() + 1);
  return true;
}

std::string canonicalRoot() {
  char buffer[PATH_MAX];
  if (realpath(worldRoot().c_str(), buffer) == nullptr)
    return worldRoot();
  return buffer;
}

std::string backslashed(std::string text) {
  for (char &c : text)
    if (c == '/')
      c = '\\';
  return text;
}

} // namespace

void requireWorld() {
  if (!worldRoot().empty())
    return;
  std::fputs("kxlsim: no world found: set KXLSIM_ROOT or run from inside a world\n", stderr);
  std::exit(3);
}

bool hostPath(std::string_view windowsPathText, std::string &out) {
  if (windowsPathText.empty() || worldRoot().empty() || windowsPathText.find('\0') != std::string_view::npos)
    return false;
  std::string absolute = absoluteWindowsPath(windowsPathText);
  SplitPath split;
  if (absolute.empty() || !splitWindowsPath(absolute, split))
    return false;
  std::string base = worldRoot();
  if (split.drive != 0)
    base += std::string("/drive_") + static_cast<char>(split.drive - 'A' + 'a');
  else
    base += "/unc";
  out = joinMatched(base, split.parts);
  return true;
}

void noteEntryAdded(const std::string &hostPathText) {
  std::string dir = parentDirectory(hostPathText);
  std::lock_guard<std::mutex> lock(listingCache().mutex);
  auto kept = listingCache().byFolder.find(dir);
  if (kept == listingCache().byFolder.end())
    return;
  struct stat st {};
  if (stat(dir.c_str(), &st) != 0) {
    listingCache().byFolder.erase(kept);
    return;
  }
  addName(kept->second, hostPathText.substr(dir.size() + 1));
  stampListing(kept->second, st);
}

void noteEntryRemoved(const std::string &hostPathText) {
  std::lock_guard<std::mutex> lock(listingCache().mutex);
  listingCache().byFolder.erase(parentDirectory(hostPathText));
}

std::string windowsPath(std::string_view hostPathText) {
  std::string host = stripTrailingSlashes(std::string(hostPathText));
  std::string rest;
  if (!relativeTo(worldRoot(), host, rest) && !relativeTo(canonicalRoot(), host, rest))
    return "";
  if (rest.size() >= 7 && rest.compare(0, 6, "drive_") == 0 && (rest.size() == 7 || rest[7] == '/')) {
    char letter = rest[6];
    if (letter < 'a' || letter > 'z')
      return "";
    std::string tail = rest.size() > 8 ? rest.substr(8) : "";
    return std::string(1, upperDrive(letter)) + ":\\" + backslashed(tail);
  }
  if (rest.compare(0, 4, "unc/") == 0) {
    std::string tail = rest.substr(4);
    size_t slash = tail.find('/');
    if (slash == std::string::npos || slash == 0 || slash + 1 >= tail.size())
      return "";
    return "\\\\" + backslashed(tail);
  }
  return "";
}

} // namespace kxlsim::posix
