// Files, folders and the C run time's file helpers, as Windows has them.
#include "conformance.h"

#include <cctype>
#include <cerrno>
#include <cstdlib>
#include <cstring>
#include <functional>
#include <set>
#include <string>

namespace kxltest {
namespace {

using std::string;
using Names = std::set<string>;

// Names an enumeration finds, with the last error that ended it.
struct Found {
  Names names;
  Names folders;
  DWORD end = 0;
};

Found findAll(const string &pattern) {
  Found out;
  WIN32_FIND_DATAA entry;
  HANDLE find = FindFirstFileA(pattern.c_str(), &entry);
  if (find == INVALID_HANDLE_VALUE) {
    out.end = GetLastError();
    return out;
  }
  do {
    out.names.insert(entry.cFileName);
    if (entry.dwFileAttributes & FILE_ATTRIBUTE_DIRECTORY)
      out.folders.insert(entry.cFileName);
  } while (FindNextFileA(find, &entry));
  out.end = GetLastError();
  EXPECT_TRUE(FindClose(find));
  return out;
}

HANDLE createWith(const string &path, DWORD access, DWORD disposition) {
  return CreateFileA(path.c_str(), access, FILE_SHARE_READ, nullptr, disposition, FILE_ATTRIBUTE_NORMAL,
                     nullptr);
}

// A folder's attributes are exactly the directory bit, a new file is marked for archiving; a
// missing name tells a missing file from a missing folder. Names are matched ignoring case.
// The run time's _access tells the same for reading (mode 0) and writing (mode 2).
TEST_F(FilesTest, AttributesTellFoldersFilesAndWhatIsMissing) {
  ASSERT_TRUE(writeFile(at("plain.txt"), "x"));
  string upper = dir_;
  for (char &c : upper)
    c = static_cast<char>(std::toupper(static_cast<unsigned char>(c)));
  const struct {
    string path;
    DWORD attributes, error; // the attributes under the mask, or the error
    int access;              // errno of _access, 0 for found
  } rows[] = {
      {dir_, FILE_ATTRIBUTE_DIRECTORY, 0, 0},
      {dir_ + "\\", FILE_ATTRIBUTE_DIRECTORY, 0, 0},
      {upper, FILE_ATTRIBUTE_DIRECTORY, 0, 0},
      {at("plain.txt"), FILE_ATTRIBUTE_ARCHIVE, 0, 0},
      {at("missing.txt"), INVALID_FILE_ATTRIBUTES, ERROR_FILE_NOT_FOUND, ENOENT},
      {at("nofolder\\missing.txt"), INVALID_FILE_ATTRIBUTES, ERROR_PATH_NOT_FOUND, ENOENT},
  };
  for (const auto &row : rows) {
    SetLastError(0);
    DWORD attributes = GetFileAttributesA(row.path.c_str());
    DWORD mask = row.attributes == FILE_ATTRIBUTE_ARCHIVE ? FILE_ATTRIBUTE_ARCHIVE | FILE_ATTRIBUTE_DIRECTORY
                                                          : INVALID_FILE_ATTRIBUTES;
    EXPECT_EQ(row.attributes, attributes & mask) << row.path;
    EXPECT_EQ(row.error, row.error != 0 ? GetLastError() : 0u) << row.path;
    errno = 0;
    int found = _access(row.path.c_str(), 0);
    EXPECT_EQ(row.access, found == 0 ? 0 : found == -1 ? errno : -1) << row.path;
  }
  EXPECT_EQ(0, _access(at("plain.txt").c_str(), 2));
}

TEST_F(FilesTest, FindGivesStoredNamesAndListsFolders) {
  for (const char *name : {"a.txt", "MixedName.TXT", "c.log"})
    ASSERT_TRUE(writeFile(at(name), name));
  ASSERT_TRUE(CreateDirectoryA(at("sub").c_str(), nullptr));

  WIN32_FIND_DATAA entry;
  HANDLE find = FindFirstFileA(at("MIXEDNAME.txt").c_str(), &entry);
  ASSERT_NE(INVALID_HANDLE_VALUE, find);
  EXPECT_STREQ("MixedName.TXT", entry.cFileName);
  EXPECT_EQ(13u, entry.nFileSizeLow);
  EXPECT_EQ(0u, entry.dwFileAttributes & FILE_ATTRIBUTE_DIRECTORY);
  EXPECT_EQ(static_cast<DWORD>(ERROR_NO_MORE_FILES), errorOf([&] { return FindNextFileA(find, &entry); }));
  EXPECT_TRUE(FindClose(find));

  Found texts = findAll(at("*.txt"));
  EXPECT_EQ((Names{"a.txt", "MixedName.TXT"}), texts.names);
  EXPECT_EQ(static_cast<DWORD>(ERROR_NO_MORE_FILES), texts.end);
  // A folder other than a drive's root lists itself and its parent too, even when empty.
  Found all = findAll(at("*"));
  EXPECT_EQ((Names{".", "..", "a.txt", "MixedName.TXT", "c.log", "sub"}), all.names);
  EXPECT_EQ((Names{".", "..", "sub"}), all.folders);
  Found empty = findAll(at("sub\\*"));
  EXPECT_EQ((Names{".", ".."}), empty.names);
  EXPECT_EQ(static_cast<DWORD>(ERROR_NO_MORE_FILES), empty.end);
  EXPECT_EQ(static_cast<DWORD>(ERROR_FILE_NOT_FOUND), findAll(at("*.none")).end);
  EXPECT_EQ(static_cast<DWORD>(ERROR_PATH_NOT_FOUND), findAll(at("nofolder\\*")).end);
}

// A buffer too small (or none) gets the size needed with the terminator; one that fits gets
// the path and its length without it. The temporary folder ends with a backslash.
TEST_F(FilesTest, FolderPathsReportTheNeededSize) {
  for (bool temp : {false, true}) {
    auto getPath = temp ? GetTempPathA : GetCurrentDirectoryA;
    DWORD needed = getPath(0, nullptr);
    char buffer[MAX_PATH], small[MAX_PATH];
    ASSERT_TRUE(needed > 1 && needed <= sizeof buffer) << needed;
    EXPECT_EQ(needed - 1, getPath(needed, buffer));
    EXPECT_EQ(needed - 1, std::strlen(buffer));
    EXPECT_EQ(needed, getPath(needed - 1, small));
    EXPECT_EQ(static_cast<DWORD>(FILE_ATTRIBUTE_DIRECTORY),
              GetFileAttributesA(buffer) & FILE_ATTRIBUTE_DIRECTORY);
    EXPECT_TRUE(!temp || buffer[needed - 2] == '\\') << buffer;
  }
}

// The run time puts names in the folder named by TMP when that is set, so the
// folder asked for here is the temporary folder itself.
TEST_F(FilesTest, TempnamGivesFreshNamesWithThePrefix) {
  char temp[MAX_PATH];
  ASSERT_GT(GetTempPathA(sizeof temp, temp), 0u);
  string folder(temp);
  folder.pop_back(); // the trailing backslash
  char *first = _tempnam(folder.c_str(), "kxl");
  char *second = _tempnam(folder.c_str(), "kxl");
  ASSERT_NE(nullptr, first);
  ASSERT_NE(nullptr, second);
  string a(first), b(second);
  std::free(first);
  std::free(second);
  string expected = folder + "\\kxl";
  EXPECT_TRUE(sameIgnoringCase(expected, a.substr(0, expected.size()))) << a;
  EXPECT_EQ(string::npos, a.find('\\', expected.size())) << a;
  EXPECT_EQ(INVALID_FILE_ATTRIBUTES, GetFileAttributesA(a.c_str()));
  if (runningUnderWine() && a == b)
    GTEST_SKIP() << "Wine derives the name from the clock and frees it at once: two quick calls may match";
  EXPECT_NE(a, b);
}

// CREATE_ALWAYS and OPEN_ALWAYS succeed either way and tell, through the last
// error, whether the file was already there; the size shows whether it was replaced.
TEST_F(FilesTest, CreateFileAlwaysReportsAnExistingFile) {
  ASSERT_TRUE(writeFile(at("kept"), "keep me"));
  const struct {
    const char *name;
    DWORD disposition, lastError, size;
  } rows[] = {
      {"always", CREATE_ALWAYS, ERROR_SUCCESS, 0},    {"always", CREATE_ALWAYS, ERROR_ALREADY_EXISTS, 0},
      {"kept", OPEN_ALWAYS, ERROR_ALREADY_EXISTS, 7}, {"opened", OPEN_ALWAYS, ERROR_SUCCESS, 0},
      {"kept", TRUNCATE_EXISTING, ERROR_SUCCESS, 0},  {"new", CREATE_NEW, ERROR_SUCCESS, 0},
  };
  for (const auto &row : rows) {
    SCOPED_TRACE(row.name);
    SetLastError(ERROR_INVALID_PARAMETER);
    HANDLE h = createWith(at(row.name), GENERIC_READ | GENERIC_WRITE, row.disposition);
    ASSERT_NE(INVALID_HANDLE_VALUE, h);
    if (row.disposition == CREATE_ALWAYS || row.disposition == OPEN_ALWAYS) {
      EXPECT_EQ(row.lastError, GetLastError());
    }
    EXPECT_EQ(row.size, GetFileSize(h, nullptr));
    DWORD written = 0;
    EXPECT_TRUE(WriteFile(h, "0123456789", 10, &written, nullptr));
    CloseHandle(h);
  }
  // Reading past the end gives nothing and succeeds.
  HANDLE h = createWith(at("kept"), GENERIC_READ, OPEN_EXISTING);
  char buffer[16];
  DWORD got = 0;
  EXPECT_TRUE(ReadFile(h, buffer, sizeof buffer, &got, nullptr));
  EXPECT_EQ("0123456789", string(buffer, got));
  EXPECT_TRUE(ReadFile(h, buffer, sizeof buffer, &got, nullptr));
  EXPECT_EQ(0u, got);
  CloseHandle(h);
}

// Each call in order, with what it leaves: a refused copy, move or create changes nothing.
TEST_F(FilesTest, CopyMoveCreateAndRemoveTellWhy) {
  ASSERT_TRUE(writeFile(at("source"), "first"));
  ASSERT_TRUE(writeFile(at("target"), "second"));
  ASSERT_TRUE(CreateDirectoryA(at("full").c_str(), nullptr));
  ASSERT_TRUE(writeFile(at("full\\file"), "x"));
  auto copy = [this](const char *from, const char *to, BOOL failIfExists) {
    return [=, this] { return CopyFileA(at(from).c_str(), at(to).c_str(), failIfExists) != FALSE; };
  };
  auto move = [this](const char *from, const char *to, DWORD flags) {
    return [=, this] { return MoveFileExA(at(from).c_str(), at(to).c_str(), flags) != FALSE; };
  };
  auto open = [this](const char *name, DWORD access, DWORD disposition) {
    return [=, this] {
      HANDLE h = createWith(at(name), access, disposition);
      return h != INVALID_HANDLE_VALUE && CloseHandle(h);
    };
  };
  auto mkdir = [this](const char *name) {
    return [=, this] { return CreateDirectoryA(at(name).c_str(), nullptr); };
  };
  auto rmdir = [this](const char *name) { return [=, this] { return RemoveDirectoryA(at(name).c_str()); }; };
  auto del = [this](const char *name) { return [=, this] { return DeleteFileA(at(name).c_str()); }; };
  const struct {
    const char *call;
    DWORD error;
    std::function<bool()> run;
    const char *file, *content; // what the file holds afterwards
  } rows[] = {
      {"copy onto existing", ERROR_FILE_EXISTS, copy("source", "target", TRUE), "target", "second"},
      {"copy replacing", ERROR_SUCCESS, copy("source", "target", FALSE), "target", "first"},
      {"copy to new", ERROR_SUCCESS, copy("source", "fresh", TRUE), "fresh", "first"},
      {"copy missing", ERROR_FILE_NOT_FOUND, copy("missing", "other", FALSE), "other", "<missing>"},
      {"move onto existing", ERROR_ALREADY_EXISTS, move("full\\file", "target", 0), "target", "first"},
      {"move replacing", ERROR_SUCCESS, move("full\\file", "target", MOVEFILE_REPLACE_EXISTING), "target",
       "x"},
      {"moved away", ERROR_FILE_NOT_FOUND, open("full\\file", GENERIC_READ, OPEN_EXISTING), "full\\file",
       "<missing>"},
      {"fill folder", ERROR_SUCCESS, [this] { return writeFile(at("full\\in"), "in"); }, "full\\in", "in"},
      {"move folder", ERROR_SUCCESS, move("full", "renamed", 0), "renamed\\in", "in"},
      {"create existing", ERROR_FILE_EXISTS, open("target", GENERIC_WRITE, CREATE_NEW), "target", "x"},
      {"truncate missing", ERROR_FILE_NOT_FOUND, open("missing", GENERIC_WRITE, TRUNCATE_EXISTING), "missing",
       "<missing>"},
      {"open missing", ERROR_FILE_NOT_FOUND, open("missing", GENERIC_READ, OPEN_EXISTING), "missing",
       "<missing>"},
      {"no folder", ERROR_PATH_NOT_FOUND, open("nofolder\\file", GENERIC_WRITE, CREATE_ALWAYS),
       "nofolder\\file", "<missing>"},
      {"mkdir existing", ERROR_ALREADY_EXISTS, mkdir("renamed"), "renamed\\in", "in"},
      {"mkdir over file", ERROR_ALREADY_EXISTS, mkdir("target"), "target", "x"},
      {"mkdir no parent", ERROR_PATH_NOT_FOUND, mkdir("missing\\child"), "missing", "<missing>"},
      {"rmdir full", ERROR_DIR_NOT_EMPTY, rmdir("renamed"), "renamed\\in", "in"},
      {"rmdir missing", ERROR_FILE_NOT_FOUND, rmdir("missing"), "missing", "<missing>"},
      {"delete missing", ERROR_FILE_NOT_FOUND, del("missing"), "missing", "<missing>"},
      {"delete", ERROR_SUCCESS, del("renamed\\in"), "renamed\\in", "<missing>"},
      {"rmdir emptied", ERROR_SUCCESS, rmdir("renamed"), "renamed", "<missing>"},
      {"mkdir", ERROR_SUCCESS, mkdir("child"), "child\\x", "<missing>"},
  };
  for (const auto &row : rows) {
    EXPECT_EQ(row.error, errorOf(row.run)) << row.call;
    EXPECT_EQ(row.content, readFile(at(row.file))) << row.call;
  }
  EXPECT_EQ(static_cast<DWORD>(FILE_ATTRIBUTE_DIRECTORY), GetFileAttributesA(at("child").c_str()));
}

} // namespace
} // namespace kxltest
