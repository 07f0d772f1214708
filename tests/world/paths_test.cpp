// Windows paths onto the world's folders, and finding the world at all.
#include "platform/win32.h"
#include "tests/support/world_access.h"

#include <sys/wait.h>
#include <unistd.h>

#include <filesystem>
#include <fstream>
#include <functional>
#include <vector>

namespace kxlsim::testing {
namespace {

using kxltestsupport::readHostFile;
using posix::hostPath;
using posix::windowsPath;

class PathTest : public kxltest::WorldTest {
protected:
  void SetUp() override {
    WorldTest::SetUp();
    std::filesystem::create_directories(host("drive_c/Program Files/KXL/bin"));
    std::filesystem::create_directories(host("unc/SRV01/Share/dir"));
  }
  std::string mapped(const std::string &windows) {
    std::string out;
    return hostPath(windows, out) ? out : "<refused>";
  }
  // Each Windows path maps to the host path below the world ("" for refused).
  void expectMapped(const std::vector<std::pair<std::string, std::string>> &rows) {
    for (const auto &[windows, relative] : rows)
      EXPECT_EQ(mapped(windows), relative.empty() ? "<refused>" : host(relative)) << windows;
  }
};

TEST_F(PathTest, WindowsPathsMapIgnoringCaseAndNeverLeaveTheirDriveOrShare) {
  expectMapped({
      {"C:\\A\\b", "drive_c/A/b"},
      {"c:/A/b", "drive_c/A/b"},
      {"D:\\", "drive_d"},
      {"C:\\dir\\", "drive_c/dir"},
      {"\\\\srv01\\SHARE\\Dir\\new", "unc/SRV01/Share/dir/new"},
      {"//OTHER/s/x", "unc/OTHER/s/x"},
      // Existing names win ignoring case; missing ones and all below them keep their spelling.
      {"C:\\PROGRAM FILES\\kxl\\BIN", "drive_c/Program Files/KXL/bin"},
      {"C:\\program files\\New\\Bin", "drive_c/Program Files/New/Bin"},
      // Windows drops trailing dots and spaces of a name.
      {"C:\\Program Files.\\kxl  \\bin", "drive_c/Program Files/KXL/bin"},
      {"C:\\a\\..\\b\\.\\c", "drive_c/b/c"},
      {"C:\\..\\..\\x", "drive_c/x"},
      {"\\\\SRV01\\Share\\..\\..\\x", "unc/SRV01/Share/x"},
      // Names Windows refuses.
      {"", ""},
      {"\"C:\\Program Files\\KXL\"", ""}, // quotes stay and make no path
      {"C:\\a|b", ""},
      {"C:\\a\\b:c", ""},
      {"\\\\server", ""},
      {"\\\\?\\C:\\x", ""},
      {std::string("C:\\a\0b", 6), ""},
  });
}

// A folder's listing is kept between lookups: changes by other processes (and
// by hand) are still seen at once, and so are this process's own.
TEST_F(PathTest, KeptListingsFollowEveryChangeOfTheFolder) {
  const std::string bin = host("drive_c/Program Files/KXL/bin"), windowsBin = "C:\\Program Files\\KXL\\bin\\";
  auto made = [](HANDLE file) { return file != INVALID_HANDLE_VALUE && CloseHandle(file); };
  const struct {
    const char *change;
    std::function<bool()> run;
    const char *windows, *found;
  } steps[] = {
      {"listed, not there", [] { return true; }, "Tool.exe", "Tool.exe"},
      {"made by another process", [&] { return std::ofstream(bin + "/TOOL.EXE").good(); }, "Tool.exe",
       "TOOL.EXE"},
      {"removed by hand", [&] { return std::filesystem::remove(bin + "/TOOL.EXE"); }, "tool.exe", "tool.exe"},
      {"folder", [&] { return CreateDirectoryA((windowsBin + "Sub").c_str(), nullptr); }, "SUB\\x", "Sub/x"},
      {"file",
       [&] {
         return made(CreateFileA((windowsBin + "Made.txt").c_str(), GENERIC_WRITE, 0, nullptr, CREATE_NEW,
                                 FILE_ATTRIBUTE_NORMAL, nullptr));
       },
       "MADE.TXT", "Made.txt"},
      {"renamed in another case",
       [&] { return MoveFileExA((windowsBin + "Made.txt").c_str(), (windowsBin + "MADE.TXT").c_str(), 0); },
       "made.txt", "MADE.TXT"},
      {"copy",
       [&] { return CopyFileA((windowsBin + "made.txt").c_str(), (windowsBin + "Copy.txt").c_str(), 1); },
       "COPY.txt", "Copy.txt"},
      {"move",
       [&] { return MoveFileExA((windowsBin + "copy.txt").c_str(), (windowsBin + "Moved.txt").c_str(), 0); },
       "copy.txt", "copy.txt"},
      {"moved", [] { return true; }, "moved.TXT", "Moved.txt"},
      {"delete", [&] { return DeleteFileA((windowsBin + "MOVED.txt").c_str()); }, "moved.txt", "moved.txt"},
  };
  for (const auto &step : steps) {
    ASSERT_TRUE(step.run()) << step.change;
    EXPECT_EQ(mapped(windowsBin + step.windows), bin + "/" + step.found) << step.change;
  }
}

// The current directory is the working one as a Windows path, C:\ outside the world.
TEST_F(PathTest, RelativePathsFollowTheCurrentDirectory) {
  char current[MAX_PATH];
  ASSERT_EQ(chdir(host("drive_c/Program Files/KXL").c_str()), 0);
  EXPECT_EQ(GetCurrentDirectoryA(sizeof current, current), 20u);
  EXPECT_STREQ(current, "C:\\Program Files\\KXL");
  expectMapped({{"bin\\f.exe", "drive_c/Program Files/KXL/bin/f.exe"},
                {"..\\y", "drive_c/Program Files/y"},
                {"\\top", "drive_c/top"},
                {"c:BIN", "drive_c/Program Files/KXL/bin"},
                {"D:rel", "drive_d/rel"}});
  ASSERT_EQ(chdir(host("unc/SRV01/Share/dir").c_str()), 0);
  EXPECT_EQ(mapped("\\x"), host("unc/SRV01/Share/x"));
  ASSERT_EQ(chdir("/"), 0);
  EXPECT_EQ(mapped("rel\\x"), host("drive_c/rel/x"));
  EXPECT_EQ(GetCurrentDirectoryA(sizeof current, current), 3u);
  EXPECT_STREQ(current, "C:\\");
}

TEST_F(PathTest, HostPathsGiveWindowsPathsBack) {
  const std::pair<std::string, std::string> rows[] = {
      {host("drive_c/Program Files/KXL"), "C:\\Program Files\\KXL"},
      {host("drive_c"), "C:\\"},
      {host("drive_d/"), "D:\\"},
      {host("unc/SRV01/Share/dir"), "\\\\SRV01\\Share\\dir"},
      {host("unc/SRV01"), ""},
      {host("system.reg"), ""},
      {worldRoot() + "x/drive_c", ""},
      {"/usr/bin", ""}};
  for (const auto &[hostFile, windows] : rows)
    EXPECT_EQ(windowsPath(hostFile), windows) << hostFile;
}

// Run through a link by the tests below: writes the world it finds to the file KXL_WORLD_PROBE names.
TEST(WorldProbe, Report) {
  const char *out = std::getenv("KXL_WORLD_PROBE");
  if (out == nullptr)
    GTEST_SKIP() << "only run as a child of the root search tests";
  if (std::getenv("KXL_WORLD_PROBE_REQUIRE") != nullptr)
    posix::requireWorld();
  kxltestsupport::writeHostFile(out, posix::worldRoot());
}

// Runs this test program through `link` without KXLSIM_ROOT; returns its exit status.
int runProbe(const std::string &link, const std::string &report, bool require, const std::string &errors) {
  std::filesystem::create_symlink(std::filesystem::read_symlink("/proc/self/exe"), link);
  std::string command = "env -u KXLSIM_ROOT KXL_WORLD_PROBE='" + report + "'" +
                        (require ? " KXL_WORLD_PROBE_REQUIRE=1 '" : " '") + link +
                        "' --gtest_filter=WorldProbe.Report >/dev/null 2>'" + errors + "'";
  int status = std::system(command.c_str());
  return WIFEXITED(status) ? WEXITSTATUS(status) : -1;
}

// The world is found above the program as started; without one the program stops with one line.
TEST_F(PathTest, WorldIsFoundAboveTheProgramAsStarted) {
  EXPECT_EQ(runProbe(host("drive_c/Program Files/KXL/bin/probe"), host("report"), false, host("errors")), 0);
  EXPECT_EQ(readHostFile(host("report")), worldRoot());
  std::string outside = world_.scratch("outside");
  std::filesystem::create_directories(outside);
  EXPECT_EQ(runProbe(outside + "/probe", outside + "/report", true, outside + "/errors"), 3);
  EXPECT_EQ(readHostFile(outside + "/errors"),
            "kxlsim: no world found: set KXLSIM_ROOT or run from inside a world\n");
  EXPECT_FALSE(std::filesystem::exists(outside + "/report"));
}

} // namespace
} // namespace kxlsim::testing
