// CreateProcessA over fork/exec: programs of the world started with Windows'
// search order and command-line rules, waited for through process handles.
#include "platform/win32.h"
#include "sim/common/simfail.h"
#include "sim/posix/cmdline.h"
#include "sim/posix/filehandles.h"
#include "sim/posix/win32util.h"
#include "sim/posix/world.h"

#include <cerrno>
#include <csignal>
#include <cstdlib>
#include <cstring>
#include <ctime>
#include <fcntl.h>
#include <memory>
#include <mutex>
#include <string>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>
#include <vector>

extern char **environ;

using namespace kxlsim::posix;

namespace {

constexpr DWORD kErrorBadExeFormat = 193;

struct ProcessState {
  pid_t pid = -1;
  bool ended = false;
  DWORD exitCode = 0;
  std::mutex lock;
};

struct ProcessObject : HandleObject {
  std::shared_ptr<ProcessState> state;
};

// The exit code Windows would report: the status a program exits with, or for
// a crash the matching exception code.
DWORD exitCodeOf(int status) {
  if (WIFEXITED(status))
    return static_cast<DWORD>(WEXITSTATUS(status));
  switch (WTERMSIG(status)) {
  case SIGSEGV:
  case SIGBUS:
    return 0xC0000005; // access violation
  case SIGINT:
    return 0xC000013A; // ended by Ctrl+C
  case SIGABRT:
    return 3; // abort()
  default:
    return 1;
  }
}

// Collects the child's status when it has ended; `block` waits for it.
bool pollEnded(ProcessState &state, bool block) {
  std::lock_guard<std::mutex> guard(state.lock);
  if (state.ended)
    return true;
  int status = 0;
  pid_t done;
  do {
    done = waitpid(state.pid, &status, block ? 0 : WNOHANG);
  } while (done < 0 && errno == EINTR);
  if (done == state.pid) {
    state.ended = true;
    state.exitCode = exitCodeOf(status);
  } else if (done < 0) {
    state.ended = true;
    state.exitCode = 1;
  }
  return state.ended;
}

bool isRegularFile(const std::string &host) {
  struct stat info {};
  return stat(host.c_str(), &info) == 0 && S_ISREG(info.st_mode);
}

bool hasSeparator(const std::string &path) {
  return path.find_first_of("\\/:") != std::string::npos;
}

std::string directoryOf(const std::string &windowsFile) {
  auto cut = windowsFile.find_last_of('\\');
  return cut == std::string::npos ? "" : windowsFile.substr(0, cut);
}

// Directories searched for a program named without a path, in order: the
// running program's directory, the current directory, the system directory,
// then each entry of PATH.
std::vector<std::string> searchDirectories() {
  std::vector<std::string> directories;
  char buffer[MAX_PATH + 1];
  DWORD length = GetModuleFileNameA(nullptr, buffer, sizeof buffer);
  if (length > 0 && length < sizeof buffer)
    directories.push_back(directoryOf(buffer));
  directories.push_back(".");
  directories.push_back("C:\\windows\\system32");
  const char *path = std::getenv("PATH");
  std::string entries = path == nullptr ? "" : path;
  for (size_t start = 0; start <= entries.size();) {
    size_t end = entries.find(';', start);
    if (end == std::string::npos)
      end = entries.size();
    if (end > start)
      directories.push_back(entries.substr(start, end - start));
    start = end + 1;
  }
  return directories;
}

// The host file of the program named `name`; sets the Windows error on failure.
bool locateProgram(std::string name, std::string &host) {
  if (name.empty())
    return failWith(ERROR_FILE_NOT_FOUND, false);
  auto lastSeparator = name.find_last_of("\\/");
  if (name.find('.', lastSeparator == std::string::npos ? 0 : lastSeparator) == std::string::npos)
    name += ".exe";
  if (hasSeparator(name)) {
    if (hostPath(name, host) && isRegularFile(host))
      return true;
    return failWith(win32ErrorFromErrno(ENOENT, host), false);
  }
  for (const std::string &directory : searchDirectories()) {
    if (hostPath(directory + "\\" + name, host) && isRegularFile(host))
      return true;
  }
  return failWith(ERROR_FILE_NOT_FOUND, false);
}

std::vector<std::string> environmentFromBlock(const char *block) {
  std::vector<std::string> entries;
  if (block == nullptr) {
    // The fault plan, kill points and call counts are this process's own.
    for (char **entry = environ; entry != nullptr && *entry != nullptr; ++entry) {
      if (!kxlsim::isOwnProcessSetting(*entry))
        entries.emplace_back(*entry);
    }
    return entries;
  }
  for (const char *entry = block; *entry != '\0'; entry += std::strlen(entry) + 1)
    entries.emplace_back(entry);
  return entries;
}

std::vector<char *> pointersTo(std::vector<std::string> &strings) {
  std::vector<char *> pointers;
  for (std::string &text : strings)
    pointers.push_back(text.data());
  pointers.push_back(nullptr);
  return pointers;
}

struct LaunchPlan {
  std::string program;                // host file
  std::string workingDirectory;       // host directory, "" to inherit
  std::vector<std::string> arguments; // argv, argv[0] the host file
  std::vector<std::string> environment;
  int streams[3] = {-1, -1, -1}; // descriptors for 0, 1, 2; -1 to inherit
};

bool planStreams(const STARTUPINFOA *startup, LaunchPlan &plan) {
  if (startup == nullptr || (startup->dwFlags & STARTF_USESTDHANDLES) == 0)
    return true;
  HANDLE handles[3] = {startup->hStdInput, startup->hStdOutput, startup->hStdError};
  for (int i = 0; i < 3; ++i) {
    if (handles[i] == nullptr || handles[i] == INVALID_HANDLE_VALUE)
      continue;
    auto *file = lookupHandleAs<FileObject>(handles[i]);
    if (file == nullptr)
      return failWith(ERROR_INVALID_HANDLE, false);
    plan.streams[i] = file->fd;
  }
  return true;
}

bool planLaunch(LPCSTR application, LPCSTR commandLine, LPVOID environment, LPCSTR currentDirectory,
                const STARTUPINFOA *startup, LaunchPlan &plan) {
  std::string line = commandLine != nullptr ? commandLine : "";
  std::string rest;
  std::string token = programToken(line, rest);
  std::string name = application != nullptr ? std::string(application) : token;
  if (application != nullptr && !hasSeparator(name))
    name = ".\\" + name;
  if (!locateProgram(name, plan.program))
    return false;
  if (currentDirectory != nullptr) {
    struct stat info {};
    if (!hostPath(currentDirectory, plan.workingDirectory) ||
        stat(plan.workingDirectory.c_str(), &info) != 0 || !S_ISDIR(info.st_mode))
      return failWith(kErrorDirectory, false);
  }
  if (access(plan.program.c_str(), X_OK) != 0)
    return failWith(kErrorBadExeFormat, false);
  plan.arguments.push_back(plan.program);
  for (std::string &argument : splitArguments(rest))
    plan.arguments.push_back(std::move(argument));
  plan.environment = environmentFromBlock(static_cast<const char *>(environment));
  return planStreams(startup, plan);
}

[[noreturn]] void runChild(LaunchPlan &plan, int reportFd) {
  for (int i = 0; i < 3; ++i)
    if (plan.streams[i] >= 0 && plan.streams[i] != i)
      dup2(plan.streams[i], i);
  if (!plan.workingDirectory.empty() && chdir(plan.workingDirectory.c_str()) != 0) {
    int err = errno;
    (void)!write(reportFd, &err, sizeof err);
    _exit(127);
  }
  std::vector<char *> argv = pointersTo(plan.arguments);
  std::vector<char *> envp = pointersTo(plan.environment);
  execve(plan.program.c_str(), argv.data(), envp.data());
  int err = errno;
  (void)!write(reportFd, &err, sizeof err);
  _exit(127);
}

// Forks and executes; the child reports a failed exec through a pipe that
// closes on a successful one. Returns the child's pid or -1 (error set).
pid_t launch(LaunchPlan &plan) {
  int report[2];
  if (pipe2(report, O_CLOEXEC) != 0)
    return failWith(ERROR_NOT_ENOUGH_MEMORY, pid_t{-1});
  pid_t child = fork();
  if (child == 0)
    runChild(plan, report[1]);
  close(report[1]);
  int childError = 0;
  ssize_t got;
  do {
    got = read(report[0], &childError, sizeof childError);
  } while (got < 0 && errno == EINTR);
  close(report[0]);
  if (child < 0)
    return failWith(ERROR_NOT_ENOUGH_MEMORY, pid_t{-1});
  if (got > 0) {
    waitpid(child, nullptr, 0);
    return failWith(childError == ENOEXEC ? kErrorBadExeFormat
                                          : win32ErrorFromErrno(childError, plan.program),
                    pid_t{-1});
  }
  return child;
}

ProcessState *processOf(HANDLE handle) {
  auto *process = lookupHandleAs<ProcessObject>(handle);
  return process == nullptr ? nullptr : process->state.get();
}

HANDLE processHandle(const std::shared_ptr<ProcessState> &state) {
  auto object = std::make_unique<ProcessObject>();
  object->state = state;
  return registerHandle(std::move(object));
}

} // namespace

extern "C" {

BOOL CreateProcessA(LPCSTR lpApplicationName, LPSTR lpCommandLine, LPSECURITY_ATTRIBUTES,
                    LPSECURITY_ATTRIBUTES, BOOL, DWORD, LPVOID lpEnvironment, LPCSTR lpCurrentDirectory,
                    LPSTARTUPINFOA lpStartupInfo, LPPROCESS_INFORMATION lpProcessInformation) {
  if (kxlsim::shouldFail("CreateProcessA"))
    return failWith(ERROR_FILE_NOT_FOUND, FALSE);
  if ((lpApplicationName == nullptr && lpCommandLine == nullptr) || lpProcessInformation == nullptr)
    return failWith(ERROR_INVALID_PARAMETER, FALSE);
  requireWorld();
  LaunchPlan plan;
  if (!planLaunch(lpApplicationName, lpCommandLine, lpEnvironment, lpCurrentDirectory, lpStartupInfo, plan))
    return FALSE;
  pid_t child = launch(plan);
  if (child < 0)
    return FALSE;
  auto state = std::make_shared<ProcessState>();
  state->pid = child;
  lpProcessInformation->hProcess = processHandle(state);
  lpProcessInformation->hThread = processHandle(state);
  lpProcessInformation->dwProcessId = static_cast<DWORD>(child);
  lpProcessInformation->dwThreadId = static_cast<DWORD>(child);
  return TRUE;
}

// Every wait lasts until the program ends: the command never waits with a limit.
DWORD WaitForSingleObject(HANDLE hHandle, DWORD) {
  if (kxlsim::shouldFail("WaitForSingleObject"))
    return failWith(ERROR_INVALID_HANDLE, WAIT_FAILED);
  ProcessState *state = processOf(hHandle);
  if (state == nullptr)
    return failWith(ERROR_INVALID_HANDLE, WAIT_FAILED);
  return pollEnded(*state, true) ? WAIT_OBJECT_0 : WAIT_FAILED;
}

BOOL GetExitCodeProcess(HANDLE hProcess, LPDWORD lpExitCode) {
  if (kxlsim::shouldFail("GetExitCodeProcess"))
    return failWith(ERROR_INVALID_HANDLE, FALSE);
  ProcessState *state = processOf(hProcess);
  if (state == nullptr || lpExitCode == nullptr)
    return failWith(ERROR_INVALID_HANDLE, FALSE);
  *lpExitCode = pollEnded(*state, false) ? state->exitCode : STILL_ACTIVE;
  return TRUE;
}

} // extern "C"
