// Programs of the world started through CreateProcessA, the module path, the
// computer name and the code page.
#include "tests/support/world_access.h"

#include <cstdlib>
#include <filesystem>
#include <sstream>
#include <string>
#include <unistd.h>
#include <vector>

namespace {

using kxltestsupport::readHostFile;

class ProcessTest : public kxltest::WorldTest {
protected:
  void SetUp() override {
    WorldTest::SetUp();
    std::filesystem::create_directories(host("drive_c/KXL/my bin"));
    ASSERT_EQ(symlink(KXL_POSIX_CHILD, host("drive_c/KXL/my bin/child.exe").c_str()), 0);
    setenv("KXL_CHILD_REPORT", host("report.txt").c_str(), 1);
  }
  void TearDown() override {
    for (const char *name : {"KXL_CHILD_REPORT", "KXL_CHILD_EXIT", "KXL_CHILD_VALUE"})
      unsetenv(name);
    WorldTest::TearDown();
  }

  // Runs `commandLine` to its end; returns its exit code (or -1 when it did not start).
  long long run(const char *application, std::string commandLine, const char *directory = nullptr) {
    STARTUPINFOA startup{};
    startup.cb = sizeof startup;
    PROCESS_INFORMATION info{};
    if (!CreateProcessA(application, commandLine.empty() ? nullptr : commandLine.data(), nullptr, nullptr,
                        FALSE, 0, nullptr, directory, &startup, &info))
      return -1;
    EXPECT_EQ(WaitForSingleObject(info.hProcess, INFINITE), static_cast<DWORD>(WAIT_OBJECT_0));
    DWORD code = 0;
    EXPECT_TRUE(GetExitCodeProcess(info.hProcess, &code));
    EXPECT_TRUE(CloseHandle(info.hThread));
    EXPECT_TRUE(CloseHandle(info.hProcess));
    return code;
  }

  std::vector<std::string> reportLines(const std::string &prefix) const {
    std::vector<std::string> lines;
    std::istringstream text(readHostFile(host("report.txt")));
    for (std::string line; std::getline(text, line);)
      if (line.rfind(prefix, 0) == 0)
        lines.push_back(line.substr(prefix.size()));
    return lines;
  }
};

TEST_F(ProcessTest, ChildGetsQuotedArgumentsEnvironmentAndDirectoryAndReturnsItsExitCode) {
  std::filesystem::create_directories(host("drive_c/Work"));
  ASSERT_TRUE(SetEnvironmentVariableA("KXL_CHILD_VALUE", "inherited"));
  ASSERT_TRUE(SetEnvironmentVariableA("KXL_CHILD_EXIT", "200"));
  EXPECT_EQ(
      run(nullptr,
          R"( "C:\KXL\my bin\child.exe"  plain  "with space" a\\\"b "" a\\b a\\\\"b c" "a""b" x"y z"w tail\)",
          "c:\\work"),
      200);
  EXPECT_EQ(reportLines("arg="), (std::vector<std::string>{"plain", "with space", "a\\\"b", "", "a\\\\b",
                                                           "a\\\\b c", "a\"b", "xy zw", "tail\\"}));
  EXPECT_EQ(reportLines("value="), std::vector<std::string>{"inherited"});
  EXPECT_EQ(reportLines("cwd="), std::vector<std::string>{host("drive_c/Work")});
  EXPECT_EQ(reportLines("module="), std::vector<std::string>{"C:\\KXL\\my bin\\child.exe"})
      << "a program started through a link reports the link's location";
}

TEST_F(ProcessTest, ProgramsNamedWithoutPathAreSearchedInSystemDirectoryAndPath) {
  std::filesystem::create_directories(host("drive_c/windows/system32"));
  ASSERT_EQ(symlink(KXL_POSIX_CHILD, host("drive_c/windows/system32/sysprog.exe").c_str()), 0);
  EXPECT_EQ(run(nullptr, "sysprog first"), 0);
  EXPECT_EQ(reportLines("module="), std::vector<std::string>{"C:\\windows\\system32\\sysprog.exe"});

  std::filesystem::create_directories(host("drive_c/Tools"));
  ASSERT_EQ(symlink(KXL_POSIX_CHILD, host("drive_c/Tools/pathprog.exe").c_str()), 0);
  std::string savedPath = std::getenv("PATH") != nullptr ? std::getenv("PATH") : "";
  setenv("PATH", "C:\\Nope;C:\\Tools", 1);
  EXPECT_EQ(run(nullptr, "pathprog.exe"), 0);
  setenv("PATH", savedPath.c_str(), 1);
  EXPECT_EQ(reportLines("module="), std::vector<std::string>{"C:\\Tools\\pathprog.exe"});

  EXPECT_EQ(run(nullptr, "noprog.exe"), -1);
  EXPECT_EQ(GetLastError(), static_cast<DWORD>(ERROR_FILE_NOT_FOUND));
  EXPECT_EQ(run("C:\\KXL\\my bin\\child.exe", "", "C:\\NoSuchDir"), -1);
  EXPECT_EQ(GetLastError(), 267u);
}

TEST_F(ProcessTest, ModuleFileNameIsCutToTheBufferAsWindowsDoes) {
  char full[MAX_PATH];
  DWORD length = GetModuleFileNameA(nullptr, full, sizeof full);
  ASSERT_GT(length, 4u);
  EXPECT_EQ(full[1], ':');
  char cut[5];
  EXPECT_EQ(GetModuleFileNameA(nullptr, cut, sizeof cut), 5u);
  EXPECT_EQ(GetLastError(), static_cast<DWORD>(ERROR_INSUFFICIENT_BUFFER));
  EXPECT_EQ(std::string(cut), std::string(full, 4));
}

// The default name, then the one the world's identity names; a short buffer is told the size needed.
TEST_F(ProcessTest, ComputerNameComesFromTheWorldsIdentity) {
  char buffer[32];
  DWORD size = sizeof buffer;
  ASSERT_TRUE(GetComputerNameA(buffer, &size));
  EXPECT_EQ(std::make_pair(std::string(buffer), size), std::make_pair(std::string("KXLHOST"), DWORD(7)));
  setString("SOFTWARE\\ZAV\\KXLSIM\\Identity", "ComputerName", "NODE7");
  size = 3;
  EXPECT_FALSE(GetComputerNameA(buffer, &size));
  EXPECT_EQ(std::make_pair(GetLastError(), size), std::make_pair(DWORD(111), DWORD(6)));
  size = sizeof buffer;
  ASSERT_TRUE(GetComputerNameA(buffer, &size));
  EXPECT_STREQ(buffer, "NODE7");
}

// The machine's ANSI code page is Latin-1: one byte to one unit, and what it cannot hold is marked.
TEST(CodePages, AnsiIsOneByteToOneUnitAndMarksWhatItCannotHold) {
  const char latin[] = "caf\xE9";
  WCHAR wide[8];
  ASSERT_EQ(MultiByteToWideChar(CP_ACP, 0, latin, -1, wide, 8), 5);
  EXPECT_EQ(wide[3], 0x00E9);
  char back[8];
  ASSERT_EQ(WideCharToMultiByte(CP_ACP, 0, wide, -1, back, sizeof back, nullptr, nullptr), 5);
  EXPECT_STREQ(back, latin);
  const WCHAR foreign[] = {u'a', 0x20AC, 0};
  BOOL usedDefault = FALSE;
  ASSERT_EQ(WideCharToMultiByte(CP_ACP, 0, foreign, -1, back, sizeof back, nullptr, &usedDefault), 3);
  EXPECT_STREQ(back, "a?");
  EXPECT_TRUE(usedDefault);
}

} // namespace
