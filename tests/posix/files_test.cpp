// The file calls over the world's host files, beyond the Win32 conformance suite: permissions as
// attributes, copies, the temporary folder as a Windows path, injected faults.
#include "tests/support/world_access.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <sys/xattr.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <filesystem>
#include <string>
#include <vector>

namespace {

using kxltestsupport::readHostFile;
using kxltestsupport::writeHostFile;

using FilesTest = kxltest::WorldTest;

TEST_F(FilesTest, AHostFileWithoutWritePermissionIsReadOnly) {
  writeHostFile(host("drive_c/A/ro.txt"), "x");
  chmod(host("drive_c/A/ro.txt").c_str(), 0444);
  EXPECT_EQ(GetFileAttributesA("c:\\a\\RO.TXT"), DWORD(FILE_ATTRIBUTE_ARCHIVE | FILE_ATTRIBUTE_READONLY));
  EXPECT_EQ(_access("C:\\A\\ro.txt", 4), 0);
  errno = 0;
  EXPECT_EQ(_access("C:\\A\\ro.txt", 6), -1);
  EXPECT_EQ(errno, EACCES);
  EXPECT_EQ(_access("C:\\A\\ro.txt", 1), -1);
  EXPECT_EQ(errno, EINVAL);
}

// A copy keeps what cp -a keeps (exact mode whatever the umask, extended attributes where
// supported, times) and the whole content, small or spanning many blocks. CopyFileExA tells its
// routine how far the copy is; a routine that cancels, or a cancel flag that is set, stops it
// without leaving a target.
TEST_F(FilesTest, CopiesKeepContentPermissionsAndTimes) {
  std::string large(3 * 1024 * 1024 + 17, '\0');
  for (size_t i = 0; i < large.size(); ++i)
    large[i] = static_cast<char>(i * 7 + i / 4096);
  struct Heard {
    DWORD answer;
    std::vector<long long> copied;
  };
  LPPROGRESS_ROUTINE routine = [](LARGE_INTEGER total, LARGE_INTEGER copied, LARGE_INTEGER, LARGE_INTEGER,
                                  DWORD, DWORD, HANDLE, HANDLE, LPVOID data) -> DWORD {
    auto *heard = static_cast<Heard *>(data);
    EXPECT_EQ(total.QuadPart, 3 * 1024 * 1024 + 17);
    heard->copied.push_back(copied.QuadPart);
    return heard->answer;
  };
  const struct {
    const char *name;
    std::string content;
    mode_t mode;
  } cases[] = {{"empty", "", 0640}, {"small", "payload", 0755}, {"large", large, 0604}};
  mode_t previous = umask(077);
  Heard going{PROGRESS_CONTINUE, {}};
  for (const auto &c : cases) {
    SCOPED_TRACE(c.name);
    std::string source = host("drive_c/C/") + c.name, copy = source + ".copy";
    writeHostFile(source, c.content);
    ASSERT_EQ(chmod(source.c_str(), c.mode), 0);
    bool tagged = setxattr(source.c_str(), "user.kxl", c.name, std::strlen(c.name), 0) == 0;
    struct timespec times[2] = {{1000000000, 5}, {1200000000, 123456789}};
    ASSERT_EQ(utimensat(AT_FDCWD, source.c_str(), times, 0), 0);
    std::string windows = std::string("C:\\C\\") + c.name;
    ASSERT_TRUE(c.content.size() < large.size()
                    ? CopyFileA(windows.c_str(), (windows + ".copy").c_str(), FALSE)
                    : CopyFileExA(windows.c_str(), (windows + ".copy").c_str(), routine, &going, nullptr, 0));
    struct stat copied {};
    ASSERT_EQ(stat(copy.c_str(), &copied), 0);
    EXPECT_EQ(readHostFile(copy), c.content);
    char tag[32] = {};
    if (tagged) {
      ssize_t got = getxattr(copy.c_str(), "user.kxl", tag, sizeof tag);
      EXPECT_EQ(std::string(tag, static_cast<size_t>(std::max<ssize_t>(0, got))), c.name);
    }
    EXPECT_EQ(copied.st_mode & 07777, c.mode);
    EXPECT_EQ(copied.st_mtim.tv_sec, 1200000000);
    EXPECT_EQ(copied.st_mtim.tv_nsec, 123456789);
  }
  umask(previous);
  ASSERT_GE(going.copied.size(), 2u);
  EXPECT_EQ(going.copied.front(), 0);
  EXPECT_EQ(going.copied.back(), static_cast<long long>(large.size()));
  EXPECT_FALSE(
      CopyFileExA("C:\\C\\large", "C:\\C\\large.copy", routine, &going, nullptr, COPY_FILE_FAIL_IF_EXISTS));
  EXPECT_EQ(GetLastError(), DWORD(ERROR_FILE_EXISTS));
  Heard stopping{PROGRESS_CANCEL, {}};
  BOOL cancel = TRUE;
  for (BOOL *flag : {static_cast<BOOL *>(nullptr), &cancel}) {
    EXPECT_FALSE(CopyFileExA("C:\\C\\large", "C:\\C\\cancelled", flag ? LPPROGRESS_ROUTINE() : routine,
                             &stopping, flag, 0));
    EXPECT_EQ(GetLastError(), DWORD(ERROR_REQUEST_ABORTED));
    EXPECT_FALSE(pathExists("C:\\C\\cancelled"));
  }
}

TEST_F(FilesTest, TempPathIsAFolderOfDriveCOrTheOneTmpNames) {
  char buffer[MAX_PATH];
  DWORD length = GetTempPathA(sizeof buffer, buffer);
  ASSERT_GT(length, 3u);
  EXPECT_EQ(std::string(buffer, 3), "C:\\");
  EXPECT_EQ(GetFileAttributesA(buffer), DWORD(FILE_ATTRIBUTE_DIRECTORY));
  std::filesystem::create_directories(host("drive_c/MyTemp"));
  setenv("TMP", "C:\\MyTemp", 1);
  ASSERT_EQ(GetTempPathA(sizeof buffer, buffer), 10u);
  EXPECT_STREQ(buffer, "C:\\MyTemp\\");
}

TEST_F(FilesTest, InjectedFaultFailsOnlyTheNamedCall) {
  std::filesystem::create_directories(host("drive_c/D"));
  failCalls("GetFileAttributesA:1,CreateDirectoryA:1,RegCreateKeyExA:1");
  EXPECT_EQ(GetFileAttributesA("C:\\D"), INVALID_FILE_ATTRIBUTES);
  EXPECT_NE(GetLastError(), 0u);
  EXPECT_EQ(GetFileAttributesA("C:\\D"), DWORD(FILE_ATTRIBUTE_DIRECTORY)) << "the next call works";
  EXPECT_FALSE(CreateDirectoryA("C:\\D\\E", nullptr));
  EXPECT_FALSE(pathExists("C:\\D\\E")) << "a failed call changes nothing";
  EXPECT_TRUE(CreateDirectoryA("C:\\D\\E", nullptr));
  HKEY key = reinterpret_cast<HKEY>(1); // a failed registry call fails as Windows would and leaves no handle
  EXPECT_EQ(RegCreateKeyExA(HKEY_LOCAL_MACHINE, "SOFTWARE\\B", 0, nullptr, 0, KEY_ALL_ACCESS, nullptr, &key,
                            nullptr),
            ERROR_ACCESS_DENIED);
  EXPECT_EQ(key, nullptr);
  EXPECT_FALSE(keyExists("SOFTWARE\\B"));
  setDword("SOFTWARE\\B", "Rerun", 1);
  // A failed listing is told from its end by its code.
  failCalls("FindNextFileA:1");
  WIN32_FIND_DATAA data;
  HANDLE search = FindFirstFileA("C:\\D\\*", &data);
  ASSERT_NE(search, INVALID_HANDLE_VALUE);
  EXPECT_FALSE(FindNextFileA(search, &data));
  EXPECT_NE(GetLastError(), DWORD(ERROR_NO_MORE_FILES));
  EXPECT_TRUE(FindNextFileA(search, &data));
  FindClose(search);
}

} // namespace
