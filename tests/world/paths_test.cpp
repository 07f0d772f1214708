// Windows paths onto the world's folders, and finding the world at all.
#include "platform/win32.h"
#include "world_fixture.h"

#include <fcntl.h>
#include <sys/wait.h>
#include <unistd.h>

#include <climits>
#include <filesystem>
#include <fstream>
#include <vector>

namespace kxlsim::testing {
namespace {

using posix::hostPath;
using posix::windowsPath;

class PathTest : public WorldTest {
protected:
  void SetUp() override {
    WorldTest::SetUp();
    std::filesystem::create_directories(root + "/drive_c/Program Files/KXL/bin");
    std::filesystem::create_directories(root + "/unc/SRV01/Share/dir");
    char buffer[PATH_MAX];
    ASSERT_NE(getcwd(buffer, sizeof buffer), nullptr);
    startDir = buffer;
  }
  void TearDown() override {
    EXPECT_EQ(chdir(startDir.c_str()), 0);
    WorldTest::TearDown();
  }
  std::string mapped(const std::string &windows) {
    std::string out;
    return hostPath(windows, out) ? out : "<refused>";
  }
  std::string startDir;
};

TEST_F(PathTest, DrivesAndSharesMapToTheirFolders) {
  EXPECT_EQ(mapped("C:\\A\\b"), root + "/drive_c/A/b");
  EXPECT_EQ(mapped("c:/A/b"), root + "/drive_c/A/b");
  EXPECT_EQ(mapped("D:\\"), root + "/drive_d");
  EXPECT_EQ(mapped("C:\\dir\\"), root + "/drive_c/dir");
  EXPECT_EQ(mapped("\\\\srv01\\SHARE\\Dir\\new"), root + "/unc/SRV01/Share/dir/new");
  EXPECT_EQ(mapped("//OTHER/s/x"), root + "/unc/OTHER/s/x");
}

TEST_F(PathTest, ExistingNamesWinIgnoringCase) {
  EXPECT_EQ(mapped("C:\\PROGRAM FILES\\kxl\\BIN"), root + "/drive_c/Program Files/KXL/bin");
  // Missing components keep their spelling, and so does everything below them.
  EXPECT_EQ(mapped("C:\\program files\\New\\Bin"), root + "/drive_c/Program Files/New/Bin");
  // Windows drops trailing dots and spaces of a name.
  EXPECT_EQ(mapped("C:\\Program Files.\\kxl  \\bin"), root + "/drive_c/Program Files/KXL/bin");
}

// A folder's listing is kept between lookups: changes by other processes (and
// by hand) are still seen at once, and so are this process's own.
TEST_F(PathTest, KeptListingsFollowEveryChangeOfTheFolder) {
  const std::string bin = root + "/drive_c/Program Files/KXL/bin";
  EXPECT_EQ(mapped("C:\\Program Files\\KXL\\bin\\Tool.exe"), bin + "/Tool.exe") << "listed, not there";
  pid_t child = fork();
  if (child == 0)
    _exit(std::ofstream(bin + "/TOOL.EXE") ? 0 : 1);
  int status = 0;
  ASSERT_EQ(waitpid(child, &status, 0), child);
  EXPECT_EQ(mapped("C:\\Program Files\\KXL\\bin\\Tool.exe"), bin + "/TOOL.EXE") << "another process's file";
  std::filesystem::remove(bin + "/TOOL.EXE");
  EXPECT_EQ(mapped("C:\\Program Files\\KXL\\bin\\tool.exe"), bin + "/tool.exe") << "removed by hand";

  // This process's own changes through the file calls.
  ASSERT_TRUE(CreateDirectoryA("C:\\Program Files\\KXL\\bin\\Sub", nullptr));
  EXPECT_EQ(mapped("C:\\Program Files\\KXL\\BIN\\sub\\x"), bin + "/Sub/x");
  HANDLE file = CreateFileA("C:\\Program Files\\KXL\\bin\\Made.txt", GENERIC_WRITE, 0, nullptr, CREATE_NEW,
                            FILE_ATTRIBUTE_NORMAL, nullptr);
  ASSERT_NE(file, INVALID_HANDLE_VALUE);
  CloseHandle(file);
  EXPECT_EQ(mapped("C:\\Program Files\\KXL\\bin\\MADE.TXT"), bin + "/Made.txt");
  ASSERT_TRUE(
      CopyFileA("C:\\Program Files\\KXL\\bin\\made.txt", "C:\\Program Files\\KXL\\bin\\Copy.txt", TRUE));
  EXPECT_EQ(mapped("C:\\Program Files\\KXL\\bin\\COPY.txt"), bin + "/Copy.txt");
  ASSERT_TRUE(
      MoveFileExA("C:\\Program Files\\KXL\\bin\\copy.txt", "C:\\Program Files\\KXL\\bin\\Moved.txt", 0));
  EXPECT_EQ(mapped("C:\\Program Files\\KXL\\bin\\copy.txt"), bin + "/copy.txt");
  EXPECT_EQ(mapped("C:\\Program Files\\KXL\\bin\\moved.TXT"), bin + "/Moved.txt");
  ASSERT_TRUE(DeleteFileA("C:\\Program Files\\KXL\\bin\\MOVED.txt"));
  EXPECT_EQ(mapped("C:\\Program Files\\KXL\\bin\\moved.txt"), bin + "/moved.txt");
}

TEST_F(PathTest, DotsNeverClimbOutOfTheDriveOrShare) {
  EXPECT_EQ(mapped("C:\\a\\..\\b\\.\\c"), root + "/drive_c/b/c");
  EXPECT_EQ(mapped("C:\\..\\..\\x"), root + "/drive_c/x");
  EXPECT_EQ(mapped("\\\\SRV01\\Share\\..\\..\\x"), root + "/unc/SRV01/Share/x");
}

TEST_F(PathTest, RelativePathsFollowTheCurrentDirectory) {
  ASSERT_EQ(chdir((root + "/drive_c/Program Files/KXL").c_str()), 0);
  EXPECT_EQ(mapped("bin\\f.exe"), root + "/drive_c/Program Files/KXL/bin/f.exe");
  EXPECT_EQ(mapped("..\\y"), root + "/drive_c/Program Files/y");
  EXPECT_EQ(mapped("\\top"), root + "/drive_c/top");
  EXPECT_EQ(mapped("c:BIN"), root + "/drive_c/Program Files/KXL/bin");
  EXPECT_EQ(mapped("D:rel"), root + "/drive_d/rel");

  ASSERT_EQ(chdir((root + "/unc/SRV01/Share/dir").c_str()), 0);
  EXPECT_EQ(mapped("\\x"), root + "/unc/SRV01/Share/x");

  // Outside the world the current directory counts as C:\.
  ASSERT_EQ(chdir("/"), 0);
  EXPECT_EQ(mapped("rel\\x"), root + "/drive_c/rel/x");
}

TEST_F(PathTest, NamesWindowsRefusesDoNotMap) {
  EXPECT_EQ(mapped(""), "<refused>");
  EXPECT_EQ(mapped("\"C:\\Program Files\\KXL\""), "<refused>"); // quotes stay and make no path
  EXPECT_EQ(mapped("C:\\a|b"), "<refused>");
  EXPECT_EQ(mapped("C:\\a\\b:c"), "<refused>");
  EXPECT_EQ(mapped("\\\\server"), "<refused>");
  EXPECT_EQ(mapped("\\\\?\\C:\\x"), "<refused>");
  EXPECT_EQ(mapped(std::string("C:\\a\0b", 6)), "<refused>");
}

TEST_F(PathTest, HostPathsGiveWindowsPathsBack) {
  EXPECT_EQ(windowsPath(root + "/drive_c/Program Files/KXL"), "C:\\Program Files\\KXL");
  EXPECT_EQ(windowsPath(root + "/drive_c"), "C:\\");
  EXPECT_EQ(windowsPath(root + "/drive_d/"), "D:\\");
  EXPECT_EQ(windowsPath(root + "/unc/SRV01/Share/dir"), "\\\\SRV01\\Share\\dir");
  EXPECT_EQ(windowsPath(root + "/unc/SRV01"), "");
  EXPECT_EQ(windowsPath(root + "/system.reg"), "");
  EXPECT_EQ(windowsPath(root + "x/drive_c"), "");
  EXPECT_EQ(windowsPath("/usr/bin"), "");
}

// Started through a link by the tests below: writes the world it finds to the
// file KXL_WORLD_PROBE names.
TEST(WorldProbe, Report) {
  const char *out = std::getenv("KXL_WORLD_PROBE");
  if (out == nullptr)
    GTEST_SKIP() << "only run as a child of the root search tests";
  if (std::getenv("KXL_WORLD_PROBE_REQUIRE") != nullptr)
    posix::requireWorld();
  writeText(out, posix::worldRoot());
}

// Runs this test program through `link` without KXLSIM_ROOT; returns its exit status.
int runProbe(const std::string &link, const std::string &report, bool require, const std::string &errors) {
  char self[PATH_MAX];
  ssize_t n = readlink("/proc/self/exe", self, sizeof self - 1);
  if (n <= 0)
    return -1;
  self[n] = '\0';
  std::filesystem::create_symlink(self, link);
  pid_t pid = fork();
  if (pid == 0) {
    unsetenv("KXLSIM_ROOT");
    setenv("KXL_WORLD_PROBE", report.c_str(), 1);
    if (require)
      setenv("KXL_WORLD_PROBE_REQUIRE", "1", 1);
    int err = open(errors.c_str(), O_WRONLY | O_CREAT | O_TRUNC, 0644);
    int null = open("/dev/null", O_WRONLY);
    dup2(err, 2);
    dup2(null, 1);
    std::string filter = "--gtest_filter=WorldProbe.Report";
    execl(link.c_str(), link.c_str(), filter.c_str(), static_cast<char *>(nullptr));
    _exit(127);
  }
  int status = 0;
  waitpid(pid, &status, 0);
  return WIFEXITED(status) ? WEXITSTATUS(status) : -1;
}

TEST_F(PathTest, WorldIsFoundAboveTheProgramAsStarted) {
  std::string link = root + "/drive_c/Program Files/KXL/bin/probe";
  EXPECT_EQ(runProbe(link, root + "/report", false, root + "/errors"), 0);
  EXPECT_EQ(readText(root + "/report"), root);
}

TEST_F(PathTest, NoWorldStopsWithOneLine) {
  std::string outside = root + "/outside";
  std::filesystem::create_directories(outside);
  std::filesystem::remove(root + "/system.reg"); // nothing above the link holds a hive now
  EXPECT_EQ(runProbe(outside + "/probe", outside + "/report", true, outside + "/errors"), 3);
  EXPECT_EQ(readText(outside + "/errors"),
            "kxlsim: no world found: set KXLSIM_ROOT or run from inside a world\n");
  EXPECT_FALSE(std::filesystem::exists(outside + "/report"));
}

} // namespace
} // namespace kxlsim::testing
