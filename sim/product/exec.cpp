// Running the product's programs: a Windows command line is built from the
// argument block, the program is started with CreateProcessA and waited for.
#include "platform/kxlsys.h"
#include "sim/common/simfail.h"
#include "sim/product/cmdline.h"
#include "sim/product/winpath.h"

#include <cstring>
#include <string>
#include <vector>

namespace kxlprod {
namespace {

bool isFile(const std::string &path) {
  DWORD attributes = GetFileAttributesA(path.c_str());
  return attributes != INVALID_FILE_ATTRIBUTES && (attributes & FILE_ATTRIBUTE_DIRECTORY) == 0;
}

bool hasDirectory(const std::string &program) {
  return program.find_first_of("\\/:") != std::string::npos;
}

// A name without extension is an ".exe", as Windows assumes.
std::string withExtension(const std::string &program) {
  std::size_t slash = program.find_last_of("\\/:");
  std::size_t dot = program.find('.', slash == std::string::npos ? 0 : slash + 1);
  return dot == std::string::npos ? program + ".exe" : program;
}

// Directories searched for a program given by name alone, in order: the
// current copy's bin, the running program's directory, the current directory.
std::vector<std::string> searchDirectories() {
  std::vector<std::string> dirs;
  std::string install;
  if (currentInstallationPath(install))
    dirs.push_back(joinPath(install, "bin"));
  char buffer[SQLO_PATH_SZ] = {};
  DWORD length = GetModuleFileNameA(nullptr, buffer, sizeof buffer);
  if (length > 0 && length < sizeof buffer)
    dirs.push_back(parentPath(buffer));
  length = GetCurrentDirectoryA(sizeof buffer, buffer);
  if (length > 0 && length < sizeof buffer)
    dirs.push_back(buffer);
  return dirs;
}

// The program's path: as given when it names a directory, else the first
// match in the search directories; "" leaves the search to CreateProcessA.
std::string resolveProgram(const std::string &program) {
  std::string name = withExtension(program);
  if (hasDirectory(program))
    return isFile(program) ? program : name;
  for (const std::string &dir : searchDirectories()) {
    std::string candidate = joinPath(dir, name);
    if (isFile(candidate))
      return candidate;
  }
  return "";
}

// Program and command line of one call.
bool prepareRun(const char *program, const char *argBlock, uint32_t flags, std::string &path,
                std::string &line) {
  std::string name = unquotedPath(program);
  if (argBlock != nullptr && argBlock[0] != '\0') {
    if (!commandLineFromBlock(argBlock, line))
      return false;
  } else if (flags & SQLO_EXEC_BYNAME) {
    std::string rest;
    splitCommandText(program, name, rest);
    line.clear();
    appendArgument(line, name);
    if (!rest.empty())
      line += ' ' + rest;
  } else {
    line.clear();
    appendArgument(line, name);
  }
  path = resolveProgram(name);
  return line.size() <= kMaxCommandLine;
}

// A wait that fails is tried once more: the program is to have ended when the
// call returns, or it would go on changing files while its caller undoes them.
bool waitForEnd(HANDLE process) {
  for (int attempt = 0; attempt < 2; ++attempt)
    if (WaitForSingleObject(process, INFINITE) == WAIT_OBJECT_0)
      return true;
  return false;
}

int32_t waitForProgram(const PROCESS_INFORMATION &process, SQLO_EXEC_RESULT *result) {
  int32_t rc = 0;
  DWORD exitCode = 0;
  if (!waitForEnd(process.hProcess) || !GetExitCodeProcess(process.hProcess, &exitCode)) {
    rc = SQLO_RC_SYSTEM_ERROR;
  }
  if (result != nullptr && rc == 0) {
    result->state = 1;
    result->exitCode = exitCode;
  }
  return rc;
}

} // namespace
} // namespace kxlprod

using namespace kxlprod;

extern "C" int32_t sqloexec2(const char *program, const char *argBlock, uint32_t reserved1, uint32_t flags,
                             uint32_t *processId, SQLO_EXEC_RESULT *result, uint32_t reserved2,
                             uint32_t reserved3) {
  (void)reserved1;
  (void)reserved2;
  (void)reserved3;
  if (result != nullptr)
    std::memset(result, 0, sizeof *result);
  if (processId != nullptr)
    *processId = 0;
  if (kxlsim::shouldFail("sqloexec2"))
    return SQLO_RC_EXEC_FAILED;
  if (program == nullptr || program[0] == '\0')
    return SQLO_RC_INVALID_ARGUMENT;
  std::string path, line;
  if (!prepareRun(program, argBlock, flags, path, line))
    return SQLO_RC_INVALID_ARGUMENT;

  std::vector<char> commandLine(line.begin(), line.end());
  commandLine.push_back('\0');
  STARTUPINFOA startup;
  std::memset(&startup, 0, sizeof startup);
  startup.cb = sizeof startup;
  PROCESS_INFORMATION process;
  std::memset(&process, 0, sizeof process);
  if (!CreateProcessA(path.empty() ? nullptr : path.c_str(), commandLine.data(), nullptr, nullptr, FALSE, 0,
                      nullptr, nullptr, &startup, &process)) {
    return SQLO_RC_EXEC_FAILED;
  }
  if (processId != nullptr)
    *processId = process.dwProcessId;
  if (result != nullptr)
    result->processId = process.dwProcessId;
  // Every run is waited for, with or without SQLO_EXEC_WAIT: the library
  // leaves no program running behind the caller's back.
  int32_t rc = waitForProgram(process, result);
  CloseHandle(process.hThread);
  CloseHandle(process.hProcess);
  return rc;
}
