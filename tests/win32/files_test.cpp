// Files, folders and the C run time's file helpers, as Windows has them.
#include "conformance.h"

#include <cctype>
#include <cerrno>
#include <cstdlib>
#include <cstring>
#include <set>
#include <string>

namespace kxltest {
namespace {

using std::string;

// Names an enumeration finds, with the last error that ended it.
struct Found {
  std::set<string> names;
  std::set<string> folders;
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

DWORD failureOf(const string &path, DWORD access, DWORD disposition) {
  return errorOf([&] {
    HANDLE h = createWith(path, access, disposition);
    return h != INVALID_HANDLE_VALUE && CloseHandle(h);
  });
}

DWORD attributesError(const string &path) {
  return errorOf([&] { return GetFileAttributesA(path.c_str()) != INVALID_FILE_ATTRIBUTES; });
}

// --- Attributes and folders ----------------------------------------------

TEST_F(FilesTest, AttributesOfAFolderAreExactlyTheDirectoryBit) {
  EXPECT_EQ(static_cast<DWORD>(FILE_ATTRIBUTE_DIRECTORY), GetFileAttributesA(dir_.c_str()));
  EXPECT_EQ(static_cast<DWORD>(FILE_ATTRIBUTE_DIRECTORY), GetFileAttributesA((dir_ + "\\").c_str()));
  // Names are matched ignoring case.
  string upper = dir_;
  for (char &c : upper)
    c = static_cast<char>(std::toupper(static_cast<unsigned char>(c)));
  EXPECT_EQ(static_cast<DWORD>(FILE_ATTRIBUTE_DIRECTORY), GetFileAttributesA(upper.c_str()));
}

TEST_F(FilesTest, AttributesOfANewFileMarkItForArchiving) {
  ASSERT_TRUE(writeFile(at("plain.txt"), "x"));
  DWORD attributes = GetFileAttributesA(at("plain.txt").c_str());
  ASSERT_NE(INVALID_FILE_ATTRIBUTES, attributes);
  EXPECT_EQ(0u, attributes & FILE_ATTRIBUTE_DIRECTORY);
  EXPECT_NE(0u, attributes & FILE_ATTRIBUTE_ARCHIVE);
}

TEST_F(FilesTest, AttributesOfMissingPathsTellFileFromPath) {
  EXPECT_EQ(static_cast<DWORD>(ERROR_FILE_NOT_FOUND), attributesError(at("missing.txt")));
  EXPECT_EQ(static_cast<DWORD>(ERROR_PATH_NOT_FOUND), attributesError(at("nofolder\\missing.txt")));
}

TEST_F(FilesTest, CreateDirectoryFailsOnExistingAndMissingParent) {
  auto mkdir = [](const string &path) {
    return errorOf([&] { return CreateDirectoryA(path.c_str(), nullptr); });
  };
  ASSERT_TRUE(writeFile(at("file"), "x"));
  EXPECT_EQ(static_cast<DWORD>(ERROR_ALREADY_EXISTS), mkdir(dir_));
  EXPECT_EQ(static_cast<DWORD>(ERROR_ALREADY_EXISTS), mkdir(at("file")));
  EXPECT_EQ(static_cast<DWORD>(ERROR_PATH_NOT_FOUND), mkdir(at("missing\\child")));
  EXPECT_TRUE(CreateDirectoryA(at("child").c_str(), nullptr));
}

// --- Finding files -------------------------------------------------------

TEST_F(FilesTest, FindGivesTheStoredNameWhenAskedInAnotherCase) {
  ASSERT_TRUE(writeFile(at("MixedName.Txt"), "12345"));
  WIN32_FIND_DATAA entry;
  HANDLE find = FindFirstFileA(at("MIXEDNAME.TXT").c_str(), &entry);
  ASSERT_NE(INVALID_HANDLE_VALUE, find);
  EXPECT_STREQ("MixedName.Txt", entry.cFileName);
  EXPECT_EQ(5u, entry.nFileSizeLow);
  EXPECT_EQ(0u, entry.dwFileAttributes & FILE_ATTRIBUTE_DIRECTORY);
  EXPECT_EQ(static_cast<DWORD>(ERROR_NO_MORE_FILES), errorOf([&] { return FindNextFileA(find, &entry); }));
  EXPECT_TRUE(FindClose(find));
}

TEST_F(FilesTest, WildcardsMatchIgnoringCaseAndListFolders) {
  for (const char *name : {"a.txt", "b.TXT", "c.log"})
    ASSERT_TRUE(writeFile(at(name), name));
  ASSERT_TRUE(CreateDirectoryA(at("sub").c_str(), nullptr));

  Found texts = findAll(at("*.txt"));
  EXPECT_EQ((std::set<string>{"a.txt", "b.TXT"}), texts.names);
  EXPECT_EQ(static_cast<DWORD>(ERROR_NO_MORE_FILES), texts.end);

  // A folder other than a drive's root lists itself and its parent too.
  Found all = findAll(at("*"));
  EXPECT_EQ((std::set<string>{".", "..", "a.txt", "b.TXT", "c.log", "sub"}), all.names);
  EXPECT_EQ((std::set<string>{".", "..", "sub"}), all.folders);

  // An empty one lists those two as well: finding nothing there is a failure.
  Found empty = findAll(at("sub\\*"));
  EXPECT_EQ((std::set<string>{".", ".."}), empty.names);
  EXPECT_EQ(static_cast<DWORD>(ERROR_NO_MORE_FILES), empty.end);
}

TEST_F(FilesTest, FindWithoutMatchTellsFileFromPath) {
  EXPECT_EQ(static_cast<DWORD>(ERROR_FILE_NOT_FOUND), findAll(at("*.none")).end);
  EXPECT_EQ(static_cast<DWORD>(ERROR_PATH_NOT_FOUND), findAll(at("nofolder\\*")).end);
}

// --- Current and temporary folders ---------------------------------------

// A buffer too small (or none) gets the size needed with the terminator; one that fits gets
// the path and its length without it. Returns the path.
string checkPathBufferRules(DWORD(WINAPI *getPath)(DWORD, LPSTR)) {
  DWORD needed = getPath(0, nullptr);
  EXPECT_GT(needed, 1u);
  char buffer[MAX_PATH];
  if (needed <= 1 || needed > sizeof buffer) {
    ADD_FAILURE() << "needed size " << needed;
    return string();
  }
  EXPECT_EQ(needed - 1, getPath(needed, buffer));
  EXPECT_EQ(needed - 1, std::strlen(buffer));
  char small[MAX_PATH];
  EXPECT_EQ(needed, getPath(needed - 1, small));
  return buffer;
}

TEST_F(FilesTest, CurrentDirectoryReportsTheNeededSizeWhenTooSmall) {
  checkPathBufferRules(GetCurrentDirectoryA);

  char buffer[MAX_PATH];
  ASSERT_TRUE(SetCurrentDirectoryA(dir_.c_str()));
  ASSERT_EQ(dir_.size(), GetCurrentDirectoryA(sizeof buffer, buffer));
  EXPECT_EQ(dir_, string(buffer));
  // Relative names resolve against it.
  ASSERT_TRUE(writeFile("relative.txt", "r"));
  EXPECT_EQ("r", readFile(at("relative.txt")));
}

TEST_F(FilesTest, TempPathEndsWithABackslashAndReportsTheNeededSize) {
  string temp = checkPathBufferRules(GetTempPathA);
  ASSERT_FALSE(temp.empty());
  EXPECT_EQ('\\', temp.back());
  EXPECT_EQ(static_cast<DWORD>(FILE_ATTRIBUTE_DIRECTORY),
            GetFileAttributesA(temp.c_str()) & FILE_ATTRIBUTE_DIRECTORY);
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

TEST_F(FilesTest, AccessTellsExistingFromMissing) {
  ASSERT_TRUE(writeFile(at("present.txt"), "x"));
  EXPECT_EQ(0, _access(at("present.txt").c_str(), 0));
  EXPECT_EQ(0, _access(at("present.txt").c_str(), 2));
  EXPECT_EQ(0, _access(dir_.c_str(), 0));
  errno = 0;
  EXPECT_EQ(-1, _access(at("missing.txt").c_str(), 0));
  EXPECT_EQ(ENOENT, errno);
}

// --- Copying and creating files ------------------------------------------

TEST_F(FilesTest, CopyFileHonoursFailIfExists) {
  ASSERT_TRUE(writeFile(at("source"), "first"));
  ASSERT_TRUE(writeFile(at("target"), "second"));
  auto copy = [this](const char *from, const char *to, BOOL failIfExists) {
    return errorOf([&] { return CopyFileA(at(from).c_str(), at(to).c_str(), failIfExists); });
  };
  EXPECT_EQ(static_cast<DWORD>(ERROR_FILE_EXISTS), copy("source", "target", TRUE));
  EXPECT_EQ("second", readFile(at("target")));
  EXPECT_EQ(static_cast<DWORD>(ERROR_SUCCESS), copy("source", "target", FALSE));
  EXPECT_EQ("first", readFile(at("target")));
  EXPECT_EQ(static_cast<DWORD>(ERROR_SUCCESS), copy("source", "fresh", TRUE));
  EXPECT_EQ("first", readFile(at("fresh")));
  EXPECT_EQ(static_cast<DWORD>(ERROR_FILE_NOT_FOUND), copy("missing", "other", FALSE));
}

TEST_F(FilesTest, CreateFileNewAndOpenExistingFailOnTheWrongState) {
  ASSERT_TRUE(writeFile(at("exists"), "data"));
  EXPECT_EQ(static_cast<DWORD>(ERROR_FILE_EXISTS), failureOf(at("exists"), GENERIC_WRITE, CREATE_NEW));
  EXPECT_EQ(static_cast<DWORD>(ERROR_FILE_NOT_FOUND), failureOf(at("missing"), GENERIC_READ, OPEN_EXISTING));
  EXPECT_EQ(static_cast<DWORD>(ERROR_FILE_NOT_FOUND),
            failureOf(at("missing"), GENERIC_WRITE, TRUNCATE_EXISTING));
  EXPECT_EQ(static_cast<DWORD>(ERROR_PATH_NOT_FOUND),
            failureOf(at("nofolder\\file"), GENERIC_WRITE, CREATE_ALWAYS));
  EXPECT_EQ(INVALID_FILE_ATTRIBUTES, GetFileAttributesA(at("missing").c_str())); // nothing was created
  HANDLE h = createWith(at("new"), GENERIC_WRITE, CREATE_NEW);
  EXPECT_NE(INVALID_HANDLE_VALUE, h);
  CloseHandle(h);
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
      {"kept", TRUNCATE_EXISTING, ERROR_SUCCESS, 0},
  };
  for (const auto &row : rows) {
    SCOPED_TRACE(row.name);
    SetLastError(ERROR_INVALID_PARAMETER);
    HANDLE h = createWith(at(row.name), GENERIC_READ | GENERIC_WRITE, row.disposition);
    ASSERT_NE(INVALID_HANDLE_VALUE, h);
    if (row.disposition != TRUNCATE_EXISTING) {
      EXPECT_EQ(row.lastError, GetLastError());
    }
    EXPECT_EQ(row.size, GetFileSize(h, nullptr));
    DWORD written = 0;
    EXPECT_TRUE(WriteFile(h, "0123456789", 10, &written, nullptr));
    CloseHandle(h);
  }
}

// --- Moving, removing and reading ---------------------------------------

TEST_F(FilesTest, MoveFileReplacesOnlyWhenAsked) {
  ASSERT_TRUE(writeFile(at("from"), "moved"));
  ASSERT_TRUE(writeFile(at("to"), "old"));
  EXPECT_EQ(static_cast<DWORD>(ERROR_ALREADY_EXISTS),
            errorOf([&] { return MoveFileExA(at("from").c_str(), at("to").c_str(), 0); }));
  EXPECT_EQ("old", readFile(at("to")));
  EXPECT_TRUE(MoveFileExA(at("from").c_str(), at("to").c_str(), MOVEFILE_REPLACE_EXISTING));
  EXPECT_EQ("moved", readFile(at("to")));
  EXPECT_EQ(INVALID_FILE_ATTRIBUTES, GetFileAttributesA(at("from").c_str()));
  // A folder moves with its contents.
  ASSERT_TRUE(CreateDirectoryA(at("folder").c_str(), nullptr));
  ASSERT_TRUE(writeFile(at("folder\\inside"), "in"));
  EXPECT_TRUE(MoveFileExA(at("folder").c_str(), at("renamed").c_str(), 0));
  EXPECT_EQ("in", readFile(at("renamed\\inside")));
}

TEST_F(FilesTest, RemovalFailuresTellWhy) {
  ASSERT_TRUE(CreateDirectoryA(at("full").c_str(), nullptr));
  ASSERT_TRUE(writeFile(at("full\\file"), "x"));
  auto rmdir = [this](const char *name) {
    return errorOf([&] { return RemoveDirectoryA(at(name).c_str()); });
  };
  EXPECT_EQ(static_cast<DWORD>(ERROR_DIR_NOT_EMPTY), rmdir("full"));
  EXPECT_EQ(static_cast<DWORD>(ERROR_FILE_NOT_FOUND), rmdir("missing"));
  EXPECT_EQ(static_cast<DWORD>(ERROR_FILE_NOT_FOUND),
            errorOf([this] { return DeleteFileA(at("missing").c_str()); }));
  EXPECT_TRUE(DeleteFileA(at("full\\file").c_str()));
  EXPECT_TRUE(RemoveDirectoryA(at("full").c_str()));
}

TEST_F(FilesTest, ReadingPastTheEndGivesNothingAndSucceeds) {
  ASSERT_TRUE(writeFile(at("short"), "abcdef"));
  HANDLE h = createWith(at("short"), GENERIC_READ, OPEN_EXISTING);
  ASSERT_NE(INVALID_HANDLE_VALUE, h);
  EXPECT_EQ(6u, SetFilePointer(h, 0, nullptr, FILE_END));
  char buffer[8];
  DWORD got = 99;
  EXPECT_TRUE(ReadFile(h, buffer, sizeof buffer, &got, nullptr));
  EXPECT_EQ(0u, got);
  EXPECT_EQ(2u, SetFilePointer(h, 2, nullptr, FILE_BEGIN));
  EXPECT_TRUE(ReadFile(h, buffer, sizeof buffer, &got, nullptr));
  EXPECT_EQ("cdef", std::string(buffer, got));
  CloseHandle(h);
}

} // namespace
} // namespace kxltest
