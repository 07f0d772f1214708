#include "tests/support/command_run.h"

#include <fcntl.h>
#include <spawn.h>
#include <sys/wait.h>

#include <algorithm>
#include <chrono>
#include <csignal>
#include <cstdlib>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <thread>

extern char **environ;

namespace kxltestsupport {

namespace {

// Variables of the test's own environment that the command must not inherit.
constexpr const char *kScrubbed[] = {"KXLSIM_ROOT",    "KXLTRACE",     "KXLSIM_FAIL",
                                     "KXLSIM_KILL",    "KXLSIM_COUNT", "KXLINSTANCE",
                                     "KXLTEST_DRIVER", "TMP",          "TEMP"};

bool scrubbed(const char *entry) {
  return std::any_of(std::begin(kScrubbed), std::end(kScrubbed), [entry](const char *name) {
    std::size_t length = std::strlen(name);
    return std::strncmp(entry, name, length) == 0 && entry[length] == '=';
  });
}

std::vector<char *> pointersTo(std::vector<std::string> &texts) {
  std::vector<char *> pointers;
  for (std::string &text : texts)
    pointers.push_back(text.data());
  pointers.push_back(nullptr);
  return pointers;
}

// Waits for the child; false (and the child killed) when it is still running
// after `seconds` (0: no limit).
bool waitWithin(pid_t child, int seconds, int &status) {
  if (seconds <= 0) {
    if (waitpid(child, &status, 0) != child)
      status = -1; // reads as not exited
    return true;
  }
  auto deadline = std::chrono::steady_clock::now() + std::chrono::seconds(seconds);
  auto pause = std::chrono::microseconds(500);
  while (waitpid(child, &status, WNOHANG) == 0) {
    if (std::chrono::steady_clock::now() >= deadline) {
      kill(child, SIGKILL);
      waitpid(child, &status, 0);
      return false;
    }
    std::this_thread::sleep_for(pause);
    pause = std::min(pause * 2, std::chrono::microseconds(20000));
  }
  return true;
}

} // namespace

std::vector<std::string> scrubbedEnvironment(const std::vector<std::string> &settings) {
  std::vector<std::string> entries;
  for (char **entry = environ; *entry != nullptr; ++entry)
    if (!scrubbed(*entry))
      entries.emplace_back(*entry);
  entries.insert(entries.end(), settings.begin(), settings.end());
  return entries;
}

int runCommand(const CommandRun &run) {
  std::vector<std::string> argv = {run.program};
  argv.insert(argv.end(), run.args.begin(), run.args.end());
  std::vector<std::string> environment = scrubbedEnvironment(run.settings);
  posix_spawn_file_actions_t actions;
  posix_spawn_file_actions_init(&actions);
  posix_spawn_file_actions_addopen(&actions, 1, run.outFile.c_str(), O_WRONLY | O_CREAT | O_TRUNC, 0644);
  posix_spawn_file_actions_addopen(&actions, 2, run.errFile.c_str(), O_WRONLY | O_CREAT | O_TRUNC, 0644);
  if (!run.cwd.empty())
    posix_spawn_file_actions_addchdir_np(&actions, run.cwd.c_str());
  std::vector<char *> args = pointersTo(argv);
  std::vector<char *> env = pointersTo(environment);
  pid_t child = 0;
  int started = posix_spawn(&child, args[0], &actions, nullptr, args.data(), env.data());
  posix_spawn_file_actions_destroy(&actions);
  if (started != 0)
    return kRunNotExited;
  int status = 0;
  if (!waitWithin(child, run.timeoutSeconds, status))
    return kRunTimedOut;
  return WIFEXITED(status) ? WEXITSTATUS(status) : kRunNotExited;
}

std::string drivePath(const std::string &worldRoot, const std::string &windowsPath) {
  std::string path =
      worldRoot + "/drive_c/" + windowsPath.substr(std::min<std::size_t>(3, windowsPath.size()));
  std::replace(path.begin(), path.end(), '\\', '/');
  while (!path.empty() && path.back() == '/')
    path.pop_back();
  return path;
}

} // namespace kxltestsupport
