// Files, directories and programs: open flags, copies and their failure
// codes, whole trees, path tests, quoted paths; the command line a program
// receives, its exit code, and the failure codes when it cannot start. Runs by
// name, argument blocks and injected failures are driven by the command
// (the end-to-end upgrade's program events, tests/driver).
#include "sim/product/cmdline.h"
#include "tests/support/product_world.h"

#include <gtest/gtest.h>

#include <cstdio>
#include <cstring>
#include <fcntl.h>
#include <filesystem>
#include <pty.h>
#include <unistd.h>

namespace {

class Files : public kxltest::ProductWorld {
protected:
  void SetUp() override {
    ProductWorld::SetUp();
    useCopy("KXL101", "C:\\KXL101");
  }
  static uint32_t pathTest(const char *path) {
    OSSPathParam param{OSS_PATH_PARAM_VERSION, path, 1, 0};
    return ossPathTest(&param);
  }
  static uint32_t createDirectory(const char *path, uint64_t mode) {
    OSSPathParam param{OSS_PATH_PARAM_VERSION, path, 0, mode};
    return ossDirectoryCreate(&param);
  }
  // A small instance-like tree under `root`.
  static void makeTree(const std::string &root) {
    writeFile(root + "\\kxlsystm", std::string("\x01\x02\0\x03", 4));
    writeFile(root + "\\cfg\\kxldj.ini", "dj");
    writeFile(root + "\\security\\audit\\kxlaudit.cfg", "audit");
    makeDirectories(root + "\\empty");
  }
};

TEST_F(Files, OpenFlagsSelectReadingCreatingAndReplacing) {
  SQLO_FHANDLE handle = nullptr;
  EXPECT_EQ(SQLO_RC_FILE_NOT_FOUND, sqloopenp("C:\\KXL101\\none", 0x314, 0x750, &handle, 0));
  EXPECT_EQ(nullptr, handle);
  EXPECT_EQ(SQLO_RC_PATH_NOT_FOUND, sqloopenp("C:\\nodir\\none", 0x314, 0x750, &handle, 0));

  // Create and write (the flags the partition files are written with).
  ASSERT_EQ(0, sqloopenp("C:\\KXL101\\new.cfg", 842, 1604, &handle, 0));
  uint32_t done = 0;
  EXPECT_EQ(0, sqlowrite(handle, "first line\r\n", 12, &done));
  EXPECT_EQ(12u, done);
  EXPECT_EQ(0, sqloclose(handle));

  // The same flags on an existing file replace its content and say so.
  ASSERT_EQ(SQLO_RC_FILE_EXISTED, sqloopenp("C:\\KXL101\\new.cfg", 843, 1604, &handle, 0));
  EXPECT_EQ(0, sqlowrite(handle, "two", 3, &done));
  EXPECT_EQ(0, sqloclose(handle));
  EXPECT_EQ("two", readText("C:\\KXL101\\new.cfg"));

  // Open existing for reading, read to the end.
  ASSERT_EQ(0, sqloopenp("C:\\KXL101\\new.cfg", 0x314, 0x750, &handle, 0));
  char buffer[16] = {};
  EXPECT_EQ(0, sqloread(handle, buffer, sizeof buffer, &done));
  EXPECT_EQ(3u, done);
  EXPECT_EQ(0, sqloread(handle, buffer, sizeof buffer, &done));
  EXPECT_EQ(0u, done);
  EXPECT_EQ(0, sqloclose(handle));

  EXPECT_EQ(SQLO_RC_ACCESS_DENIED, sqloopenp("C:\\KXL101", 0x314, 0x750, &handle, 0));
}

TEST_F(Files, CopyReplacesTheTargetAndNamesWhatIsMissing) {
  writeFile("C:\\src\\a.txt", "new");
  writeFile("C:\\dst\\a.txt", "old and longer");
  EXPECT_EQ(0, sqlocopy("C:\\src\\a.txt", "C:\\dst\\a.txt", 0));
  EXPECT_EQ("new", readText("C:\\dst\\a.txt"));

  EXPECT_EQ(int32_t(0x870F000Au), sqlocopy("C:\\src\\missing.txt", "C:\\dst\\b.txt", 0));
  EXPECT_EQ(int32_t(0x870F0011u), sqlocopy("C:\\src\\cfg\\missing.txt", "C:\\dst\\b.txt", 0));
  EXPECT_FALSE(pathExists("C:\\dst\\b.txt"));

  // A file carried into a folder the target lacks gets that folder.
  EXPECT_EQ(0, sqlocopy("C:\\src\\a.txt", "C:\\dst\\bin\\a.txt", 0));
  EXPECT_EQ("new", readText("C:\\dst\\bin\\a.txt"));

  // Quoted paths, as directories with blanks are passed, work as well.
  writeFile("C:\\with blank\\q.txt", "quoted");
  EXPECT_EQ(0, sqlocopy("\"C:\\with blank\\q.txt\"", "\"C:\\with blank\\r.txt\"", 0));
  EXPECT_EQ("quoted", readText("C:\\with blank\\r.txt"));
}

TEST_F(Files, DirectoryTreesAreCopiedWholeAndDeletedWhole) {
  makeTree("C:\\inst\\INST1");
  // Into an existing, non-empty target: files merge, same names are replaced.
  writeFile("C:\\backup\\kxlsystm", "stale");
  writeFile("C:\\backup\\keep.txt", "kept");
  ASSERT_EQ(0, sqlocopydir("C:\\backup", "C:\\inst\\INST1", 0));
  EXPECT_EQ(std::string("\x01\x02\0\x03", 4), readText("C:\\backup\\kxlsystm"));
  EXPECT_EQ("dj", readText("C:\\backup\\cfg\\kxldj.ini"));
  EXPECT_EQ("audit", readText("C:\\backup\\security\\audit\\kxlaudit.cfg"));
  EXPECT_TRUE(ossIsDirectory("C:\\backup\\empty"));
  EXPECT_EQ("kept", readText("C:\\backup\\keep.txt"));

  // A missing target is created with its parents.
  ASSERT_EQ(0, sqlocopydir("C:\\new\\profile\\INST1", "C:\\inst\\INST1", 0));
  EXPECT_EQ("dj", readText("C:\\new\\profile\\INST1\\cfg\\kxldj.ini"));

  EXPECT_EQ(SQLO_RC_PATH_NOT_FOUND, sqlocopydir("C:\\x", "C:\\inst\\none", 0));
  EXPECT_EQ(SQLO_RC_INVALID_ARGUMENT, sqlocopydir("C:\\inst\\INST1\\cfg\\inner", "C:\\inst\\INST1", 0))
      << "a tree is never copied into itself";
  EXPECT_FALSE(pathExists("C:\\inst\\INST1\\cfg\\inner"));

  ASSERT_EQ(0, sqlodeletedir("C:\\backup"));
  EXPECT_FALSE(pathExists("C:\\backup"));
  EXPECT_TRUE(pathExists("C:\\inst\\INST1\\kxlsystm"));
  EXPECT_EQ(SQLO_RC_PATH_NOT_FOUND, sqlodeletedir("C:\\backup"));
  EXPECT_EQ(SQLO_RC_INVALID_ARGUMENT, sqlodeletedir("C:\\"));
  EXPECT_EQ(SQLO_RC_INVALID_ARGUMENT, sqlodeletedir("C:"));
  EXPECT_TRUE(pathExists("C:\\inst"));
}

// Room on the target's drive is checked before anything is written (an unreadable free space
// is no room); what the target holds already counts, since its files are replaced.
TEST_F(Files, TreeCopiesNeedRoomForTheTreeBeforeWritingAnything) {
  makeTree("C:\\inst\\INST1"); // three files, five folders: 8 blocks of 4 KiB
  const std::string drive = "SOFTWARE\\ZAV\\KXLSIM\\Drives\\C";
  struct Case {
    const char *freeBytes;
    const char *fault;
    int32_t rc;
  } cases[] = {{"32767", nullptr, SQLO_RC_DISK_FULL},
               {"32768", nullptr, 0},
               {"1000000", "GetDiskFreeSpaceExA:1", SQLO_RC_IO_ERROR}};
  for (const Case &c : cases) {
    SCOPED_TRACE(c.freeBytes);
    setString(drive, "FreeBytes", c.freeBytes);
    failCalls(c.fault);
    EXPECT_EQ(c.rc, sqlocopydir("C:\\copy", "C:\\inst\\INST1", 0));
    EXPECT_EQ(c.rc == 0, pathExists("C:\\copy")) << "nothing written when it fails";
    failCalls(nullptr);
    sqlodeletedir("C:\\copy");
  }
  // Copied back over itself (a restore) it needs no room beyond what is there.
  ASSERT_EQ(0, sqlocopydir("C:\\copy", "C:\\inst\\INST1", 0));
  setString(drive, "FreeBytes", "0");
  EXPECT_EQ(0, sqlocopydir("C:\\copy", "C:\\inst\\INST1", 0));
  EXPECT_EQ(SQLO_RC_DISK_FULL, sqlocopydir("C:\\other", "C:\\inst\\INST1", 0));
}

// A copy's progress goes to standard error only when that is a console, as one
// line rewritten in place and ended when the copy ends; nothing without the flag.
TEST_F(Files, TreeCopyShowsItsProgressOnAConsoleOnly) {
  makeTree("C:\\inst\\INST1");
  setenv("KXLSIM_PROGRESS_AFTER_MS", "0", 1);
  auto copyWithErrorTo = [](int fd, uint32_t flags) {
    std::fflush(stderr);
    int saved = dup(2);
    dup2(fd, 2);
    int32_t rc = sqlocopydir("C:\\copy", "C:\\inst\\INST1", flags);
    std::fflush(stderr);
    dup2(saved, 2);
    close(saved);
    sqlodeletedir("C:\\copy");
    return rc;
  };
  auto shown = [](int fd) {
    std::string text;
    char buffer[512];
    for (ssize_t n; (n = read(fd, buffer, sizeof buffer)) > 0;)
      text.append(buffer, static_cast<size_t>(n));
    return text;
  };
  int console = -1, terminal = -1;
  ASSERT_EQ(0, openpty(&console, &terminal, nullptr, nullptr, nullptr));
  fcntl(console, F_SETFL, O_NONBLOCK);
  EXPECT_EQ(0, copyWithErrorTo(terminal, 0));
  EXPECT_EQ(shown(console), "");
  EXPECT_EQ(0, copyWithErrorTo(terminal, SQLO_COPYDIR_SHOW_PROGRESS));
  std::string line = shown(console);
  EXPECT_EQ(line.rfind("\rcopying to C:\\copy: 0 of 0 MiB (", 0), 0u) << line;
  EXPECT_NE(line.find("(100%)\r\n"), std::string::npos) << line; // the terminal turns \n into \r\n
  close(terminal);
  close(console);
  FILE *file = std::tmpfile();
  ASSERT_NE(file, nullptr);
  EXPECT_EQ(0, copyWithErrorTo(fileno(file), SQLO_COPYDIR_SHOW_PROGRESS));
  EXPECT_EQ(std::ftell(file), 0L) << "not a console: nothing shown";
  std::fclose(file);
  unsetenv("KXLSIM_PROGRESS_AFTER_MS");
}

TEST_F(Files, DeletionPathTestsAndDirectoryCreation) {
  writeFile("C:\\d\\f.txt", "x");
  EXPECT_EQ(SQLO_RC_ACCESS_DENIED, sqlodelete("C:\\d", 0));
  EXPECT_EQ(0, sqlodelete("C:\\d\\f.txt", 0));
  EXPECT_EQ(SQLO_RC_FILE_NOT_FOUND, sqlodelete("C:\\d\\f.txt", 0));
  writeFile("C:\\p\\file.txt", "x");
  EXPECT_EQ(0u, pathTest("C:\\p\\file.txt"));
  EXPECT_EQ(0u, pathTest("C:\\p"));
  EXPECT_EQ(0u, pathTest("\"C:\\p\""));
  EXPECT_EQ(0x9000001Au, pathTest("C:\\p\\none"));
  EXPECT_EQ(0x9000001Au, pathTest("C:\\none\\deeper"));

  EXPECT_TRUE(ossPathExists("C:\\p\\file.txt"));
  EXPECT_FALSE(ossIsDirectory("C:\\p\\file.txt"));
  EXPECT_TRUE(ossIsDirectory("C:\\p"));
  EXPECT_FALSE(ossPathExists("C:\\p\\none"));

  EXPECT_EQ(0u, createDirectory("C:\\a\\b\\c", 2)) << "mode 2 creates the parents";
  EXPECT_TRUE(ossIsDirectory("C:\\a\\b\\c"));
  EXPECT_EQ(0u, createDirectory("C:\\a\\b\\c", 2)) << "an existing directory is fine";
  EXPECT_EQ(0x9000001Au, createDirectory("C:\\x\\y", 0));
  EXPECT_FALSE(pathExists("C:\\x"));
  EXPECT_NE(0u, createDirectory("C:\\p\\file.txt", 2));
}

// A file whose attributes cannot be read is never taken for a missing one:
// callers tolerate "missing" and would go on without the file.
TEST_F(Files, UnreadableAttributesAreNotAMissingFile) {
  writeFile("C:\\src\\a.txt", "new");
  SQLO_FHANDLE handle = nullptr;
  const struct {
    const char *what;
    int32_t (*call)(SQLO_FHANDLE &);
  } calls[] = {
      {"copy", [](SQLO_FHANDLE &) { return sqlocopy("C:\\src\\a.txt", "C:\\dst\\c.txt", 0); }},
      {"delete", [](SQLO_FHANDLE &) { return sqlodelete("C:\\src\\a.txt", 0); }},
      {"open", [](SQLO_FHANDLE &h) { return sqloopenp("C:\\src\\a.txt", SQLO_READONLY, 0, &h, 0); }},
  };
  for (const auto &c : calls) {
    SCOPED_TRACE(c.what);
    failCalls("GetFileAttributesA:1");
    int32_t rc = c.call(handle);
    EXPECT_EQ(int32_t(0x870F0003u), rc); // access denied
    EXPECT_NE(SQLO_RC_FILE_NOT_FOUND_W, rc);
    EXPECT_EQ(nullptr, handle);
  }
  failCalls("GetFileAttributesA:1");
  EXPECT_EQ(OSS_RC_FAILED, pathTest("C:\\src\\missing.txt"));
  failCalls(nullptr);
  EXPECT_EQ(OSS_RC_PATH_NOT_FOUND, pathTest("C:\\src\\missing.txt"));
  EXPECT_TRUE(pathExists("C:\\src\\a.txt"));
  EXPECT_FALSE(pathExists("C:\\dst\\c.txt"));
}

std::string lineFor(std::initializer_list<const char *> arguments) {
  std::string line;
  for (const char *argument : arguments)
    kxlprod::appendArgument(line, argument);
  return line;
}

TEST(CommandLine, ArgumentsAreQuotedForTheRunTimeParser) {
  EXPECT_EQ("prog -h plain", lineFor({"prog", "-h", "plain"}));
  EXPECT_EQ("\"C:\\Program Files\\x.exe\" \"\"", lineFor({"C:\\Program Files\\x.exe", ""}));
  EXPECT_EQ("\"say \\\"hi\\\"\"", lineFor({"say \"hi\""}));
  // Backslashes are doubled only before a quote, including the closing one.
  EXPECT_EQ("\"a b\\\\\" c\\d", lineFor({"a b\\", "c\\d"}));
  EXPECT_EQ("\"x\\\\\\\"y z\"", lineFor({"x\\\"y z"}));
  // An argument already wrapped in quotes keeps being one argument.
  EXPECT_EQ("\"C:\\my dir\\upgrade.log\"", lineFor({"\"C:\\my dir\\upgrade.log\""}));
  EXPECT_EQ("\"C:\\dir\\\\\"", lineFor({"\"C:\\dir\\\""}));
  EXPECT_EQ("\"C:\"", lineFor({"\"C:\""}));
}

class Programs : public kxltest::ProductWorld {
protected:
  void SetUp() override {
    ProductWorld::SetUp();
    useCopy("KXL101", "C:\\KXL101");
    makeDirectories("C:\\KXL101\\bin");
    std::filesystem::copy_file(KXL_ARGDUMP, host("drive_c/KXL101/bin/argdump.exe"));
    dumpPath_ = host("args.txt");
    kxltest::setProcessVariable("KXLTEST_ARGDUMP", dumpPath_.c_str());
  }
  void TearDown() override {
    kxltest::setProcessVariable("KXLTEST_ARGDUMP", nullptr);
    ProductWorld::TearDown();
  }
  std::string dumpPath_;
};

TEST_F(Programs, ArgumentsArriveUnchangedAndTheExitCodeIsReported) {
  const char block[] = "C:\\KXL101\\bin\\argdump.exe\0-l\0\"C:\\my dir\\upgrade.log\"\0two words\0"
                       "say \"hi\"\0back\\slash\\\0\0";
  uint32_t pid = 0;
  SQLO_EXEC_RESULT result{};
  ASSERT_EQ(0, sqloexec2("C:\\KXL101\\bin\\argdump.exe", block, 0, 0x40, &pid, &result, 0, 0));
  EXPECT_EQ(1u, result.state);
  EXPECT_EQ(7u, result.exitCode);
  EXPECT_NE(0u, pid);
  EXPECT_EQ("-l\nC:\\my dir\\upgrade.log\ntwo words\nsay \"hi\"\nback\\slash\\\n",
            kxltestsupport::readHostFile(dumpPath_));
}

TEST_F(Programs, AProgramThatCannotStartIsAnError) {
  SQLO_EXEC_RESULT result{};
  EXPECT_EQ(SQLO_RC_EXEC_FAILED,
            sqloexec2("C:\\KXL101\\bin\\none.exe", nullptr, 0, 0x40, nullptr, &result, 0, 0));
  EXPECT_EQ(SQLO_RC_EXEC_FAILED, sqloexec2("nothere.exe", nullptr, 0, 0xC0, nullptr, &result, 0, 0));
  EXPECT_EQ(0u, result.state);
}

// The call returns only once the program has ended, so it never changes files its caller undoes.
TEST_F(Programs, AFailedWaitIsTriedAgain) {
  SQLO_EXEC_RESULT result{};
  failCalls("WaitForSingleObject:1");
  EXPECT_EQ(0, sqloexec2("argdump.exe -x", nullptr, 0, 0xC0, nullptr, &result, 0, 0));
  EXPECT_EQ(7u, result.exitCode);
  EXPECT_EQ("-x\n", kxltestsupport::readHostFile(dumpPath_));
  failCalls("WaitForSingleObject:1,WaitForSingleObject:2");
  EXPECT_NE(0, sqloexec2("argdump.exe", nullptr, 0, 0xC0, nullptr, &result, 0, 0));
  failCalls(nullptr);
}

} // namespace
