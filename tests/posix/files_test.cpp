// Files, searches and directories of the world, with Windows' codes.
#include "world_fixture.h"

#include "sim/common/simfail.h"

#include <algorithm>
#include <cerrno>
#include <cstdlib>
#include <cstring>
#include <fcntl.h>
#include <string>
#include <sys/stat.h>
#include <sys/xattr.h>
#include <unistd.h>
#include <vector>

namespace kxlposixtest {
namespace {

using FilesTest = WorldTest;

TEST_F(FilesTest, AttributesTellDirectoriesFilesAndWhichPartIsMissing) {
  makeFile("drive_c/Data/Report.txt", "x");
  EXPECT_EQ(GetFileAttributesA("C:\\Data"), static_cast<DWORD>(FILE_ATTRIBUTE_DIRECTORY));
  EXPECT_EQ(GetFileAttributesA("c:\\DATA\\report.TXT"), static_cast<DWORD>(FILE_ATTRIBUTE_ARCHIVE));
  chmod(host("drive_c/Data/Report.txt").c_str(), 0444);
  EXPECT_EQ(GetFileAttributesA("C:\\Data\\Report.txt"),
            static_cast<DWORD>(FILE_ATTRIBUTE_ARCHIVE | FILE_ATTRIBUTE_READONLY));

  EXPECT_EQ(GetFileAttributesA("C:\\Data\\absent.txt"), INVALID_FILE_ATTRIBUTES);
  EXPECT_EQ(GetLastError(), static_cast<DWORD>(ERROR_FILE_NOT_FOUND));
  EXPECT_EQ(GetFileAttributesA("C:\\Nowhere\\absent.txt"), INVALID_FILE_ATTRIBUTES);
  EXPECT_EQ(GetLastError(), static_cast<DWORD>(ERROR_PATH_NOT_FOUND));
}

// The host file follows a rename that changes only the letter case.
TEST_F(FilesTest, RenameInAnotherLetterCaseRenamesTheHostFile) {
  makeFile("drive_c/M/dst.txt", "old");
  EXPECT_TRUE(MoveFileExA("C:\\M\\dst.txt", "C:\\M\\DST.TXT", 0));
  EXPECT_TRUE(exists("drive_c/M/DST.TXT"));
  EXPECT_FALSE(exists("drive_c/M/dst.txt"));
}

// A copy keeps what cp -a keeps: exact permission bits (whatever the umask),
// extended attributes (where the file system has them) and times; the
// content whole, small or spanning many blocks.
TEST_F(FilesTest, CopiesKeepContentPermissionsAndTimes) {
  std::string large(3 * 1024 * 1024 + 17, '\0');
  for (size_t i = 0; i < large.size(); ++i)
    large[i] = static_cast<char>(i * 7 + i / 4096);
  struct Case {
    const char *name;
    std::string content;
    mode_t mode;
  };
  const std::vector<Case> cases = {{"empty", "", 0640}, {"small", "payload", 0755}, {"large", large, 0604}};
  mode_t previous = umask(077);
  for (const Case &c : cases) {
    std::string source = std::string("drive_c/C/") + c.name;
    makeFile(source, c.content);
    ASSERT_EQ(chmod(host(source).c_str(), c.mode), 0);
    bool tagged = setxattr(host(source).c_str(), "user.kxl", c.name, std::strlen(c.name), 0) == 0;
    struct timespec times[2] = {{1000000000, 5}, {1200000000, 123456789}};
    ASSERT_EQ(utimensat(AT_FDCWD, host(source).c_str(), times, 0), 0);
    std::string target = std::string("C:\\C\\") + c.name + ".copy";
    ASSERT_TRUE(CopyFileA((std::string("C:\\C\\") + c.name).c_str(), target.c_str(), FALSE)) << c.name;
    struct stat copied {};
    ASSERT_EQ(stat(host(source + ".copy").c_str(), &copied), 0);
    EXPECT_EQ(readFile(host(source + ".copy")), c.content) << c.name;
    char tag[32] = {};
    if (tagged) {
      ssize_t got = getxattr(host(source + ".copy").c_str(), "user.kxl", tag, sizeof tag);
      EXPECT_EQ(std::string(tag, static_cast<size_t>(std::max<ssize_t>(0, got))), c.name);
    }
    EXPECT_EQ(copied.st_mode & 07777, c.mode) << c.name;
    EXPECT_EQ(copied.st_mtim.tv_sec, 1200000000) << c.name;
    EXPECT_EQ(copied.st_mtim.tv_nsec, 123456789) << c.name;
  }
  umask(previous);
}

// CopyFileExA tells its routine how far the copy is, and a routine that
// cancels, or a cancel flag that is set, stops it without leaving a target.
TEST_F(FilesTest, CopyProgressIsReportedAndACancelledCopyLeavesNoTarget) {
  std::string content(3 * 1024 * 1024 + 5, 'p');
  makeFile("drive_c/P/big", content);
  struct Heard {
    DWORD answer;
    std::vector<long long> copied;
  };
  auto routine = [](LARGE_INTEGER total, LARGE_INTEGER copied, LARGE_INTEGER, LARGE_INTEGER, DWORD, DWORD,
                    HANDLE, HANDLE, LPVOID data) -> DWORD {
    auto *heard = static_cast<Heard *>(data);
    EXPECT_EQ(total.QuadPart, 3 * 1024 * 1024 + 5);
    heard->copied.push_back(copied.QuadPart);
    return heard->answer;
  };
  Heard going{PROGRESS_CONTINUE, {}};
  ASSERT_TRUE(CopyFileExA("C:\\P\\big", "C:\\P\\copy", routine, &going, nullptr, 0));
  EXPECT_EQ(readFile(host("drive_c/P/copy")), content);
  ASSERT_GE(going.copied.size(), 2u);
  EXPECT_EQ(going.copied.front(), 0);
  EXPECT_EQ(going.copied.back(), static_cast<long long>(content.size()));
  EXPECT_FALSE(CopyFileExA("C:\\P\\big", "C:\\P\\copy", routine, &going, nullptr, COPY_FILE_FAIL_IF_EXISTS));
  EXPECT_EQ(GetLastError(), static_cast<DWORD>(ERROR_FILE_EXISTS));

  Heard stopping{PROGRESS_CANCEL, {}};
  EXPECT_FALSE(CopyFileExA("C:\\P\\big", "C:\\P\\cancelled", routine, &stopping, nullptr, 0));
  EXPECT_EQ(GetLastError(), static_cast<DWORD>(ERROR_REQUEST_ABORTED));
  EXPECT_FALSE(exists("drive_c/P/cancelled"));
  BOOL cancel = TRUE;
  EXPECT_FALSE(CopyFileExA("C:\\P\\big", "C:\\P\\cancelled", nullptr, nullptr, &cancel, 0));
  EXPECT_EQ(GetLastError(), static_cast<DWORD>(ERROR_REQUEST_ABORTED));
  EXPECT_FALSE(exists("drive_c/P/cancelled"));
}

TEST_F(FilesTest, AccessFollowsTheReadOnlyAttribute) {
  makeFile("drive_c/A/ro.txt");
  chmod(host("drive_c/A/ro.txt").c_str(), 0444);
  EXPECT_EQ(_access("C:\\A\\RO.TXT", 0), 0);
  EXPECT_EQ(_access("C:\\A\\ro.txt", 4), 0);
  errno = 0;
  EXPECT_EQ(_access("C:\\A\\ro.txt", 6), -1);
  EXPECT_EQ(errno, EACCES);
  EXPECT_EQ(_access("C:\\A\\ro.txt", 1), -1);
  EXPECT_EQ(errno, EINVAL);
  EXPECT_EQ(_access("C:\\A\\none.txt", 0), -1);
  EXPECT_EQ(errno, ENOENT);
}

TEST_F(FilesTest, CurrentDirectoryIsAWindowsPathWithWindowsBufferRules) {
  makeDir("drive_c/Work/Sub");
  ASSERT_TRUE(SetCurrentDirectoryA("c:\\work\\sub"));
  char buffer[MAX_PATH];
  EXPECT_EQ(GetCurrentDirectoryA(sizeof buffer, buffer), 11u);
  EXPECT_STREQ(buffer, "C:\\Work\\Sub");
  char small[4] = "abc";
  EXPECT_EQ(GetCurrentDirectoryA(sizeof small, small), 12u) << "size needed, terminator included";
  EXPECT_STREQ(small, "abc");

  makeFile("drive_c/Work/file.txt");
  EXPECT_FALSE(SetCurrentDirectoryA("C:\\Work\\file.txt"));
  EXPECT_EQ(GetLastError(), 267u);
  EXPECT_FALSE(SetCurrentDirectoryA("C:\\Work\\none"));
  EXPECT_EQ(GetLastError(), static_cast<DWORD>(ERROR_FILE_NOT_FOUND));

  ASSERT_EQ(chdir("/"), 0);
  EXPECT_EQ(GetCurrentDirectoryA(sizeof buffer, buffer), 3u);
  EXPECT_STREQ(buffer, "C:\\") << "outside the world";
}

TEST_F(FilesTest, TempPathIsAnExistingFolderOfDriveC) {
  char buffer[MAX_PATH];
  DWORD length = GetTempPathA(sizeof buffer, buffer);
  ASSERT_GT(length, 3u);
  EXPECT_EQ(std::string(buffer, 3), "C:\\");
  EXPECT_EQ(buffer[length - 1], '\\');
  EXPECT_EQ(GetFileAttributesA(buffer), static_cast<DWORD>(FILE_ATTRIBUTE_DIRECTORY));
  char small[2];
  EXPECT_EQ(GetTempPathA(sizeof small, small), length + 1);

  makeDir("drive_c/MyTemp");
  setenv("TMP", "C:\\MyTemp", 1);
  ASSERT_EQ(GetTempPathA(sizeof buffer, buffer), 10u);
  EXPECT_STREQ(buffer, "C:\\MyTemp\\");
}

TEST_F(FilesTest, InjectedFaultFailsOnlyTheNamedCall) {
  makeDir("drive_c/D");
  setenv("KXLSIM_FAIL", "GetFileAttributesA:2,CreateDirectoryA:1", 1);
  kxlsim::resetFaults();
  EXPECT_EQ(GetFileAttributesA("C:\\D"), static_cast<DWORD>(FILE_ATTRIBUTE_DIRECTORY));
  EXPECT_EQ(GetFileAttributesA("C:\\D"), INVALID_FILE_ATTRIBUTES);
  EXPECT_NE(GetLastError(), 0u);
  EXPECT_EQ(GetFileAttributesA("C:\\D"), static_cast<DWORD>(FILE_ATTRIBUTE_DIRECTORY));
  EXPECT_FALSE(CreateDirectoryA("C:\\D\\E", nullptr));
  EXPECT_FALSE(exists("drive_c/D/E")) << "a failed call changes nothing";
  EXPECT_TRUE(CreateDirectoryA("C:\\D\\E", nullptr));

  // A failed listing is told from its end by its code.
  setenv("KXLSIM_FAIL", "FindNextFileA:1", 1);
  kxlsim::resetFaults();
  WIN32_FIND_DATAA data;
  HANDLE search = FindFirstFileA("C:\\D\\*", &data);
  ASSERT_NE(search, INVALID_HANDLE_VALUE);
  EXPECT_FALSE(FindNextFileA(search, &data));
  EXPECT_NE(GetLastError(), static_cast<DWORD>(ERROR_NO_MORE_FILES));
  EXPECT_TRUE(FindNextFileA(search, &data));
  FindClose(search);
  unsetenv("KXLSIM_FAIL");
  kxlsim::resetFaults();
}

} // namespace
} // namespace kxlposixtest
