// Starting a program of the world the way a test needs it: its own
// environment without the test's settings of the simulation, its output and
// errors in files, its working directory set. And the small file helpers
// such tests share.
#pragma once

#include "tests/support/temp_world.h"

#include <string>
#include <vector>

namespace kxltestsupport {

struct CommandRun {
  std::string program;               // host path of the executable
  std::vector<std::string> args;     // arguments after the program name
  std::vector<std::string> settings; // NAME=value added to the scrubbed environment
  std::string cwd;                   // host directory to start in ("" keeps the test's)
  std::string outFile, errFile;      // where standard output and error go
  int timeoutSeconds = 0;            // 0: wait as long as it takes
};

inline constexpr int kRunNotExited = -1; // not started, or ended by a signal
inline constexpr int kRunTimedOut = -2;  // still running after timeoutSeconds; killed

// Runs the program and waits for it: its exit code (the low 8 bits), or one
// of the two codes above.
int runCommand(const CommandRun &run);

// The test's environment without the variables the simulation or the command
// reads (KXLSIM_ROOT, KXLTRACE, KXLSIM_FAIL and the other fault settings,
// KXLINSTANCE, KXLTEST_DRIVER, TMP, TEMP), followed by `settings`.
std::vector<std::string> scrubbedEnvironment(const std::vector<std::string> &settings);

// Host path below `worldRoot` of a Windows path on drive C: ("C:\a\b" ->
// "<worldRoot>/drive_c/a/b"), without a trailing "/".
std::string drivePath(const std::string &worldRoot, const std::string &windowsPath);

} // namespace kxltestsupport
