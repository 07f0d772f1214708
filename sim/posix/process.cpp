// The running process: its module path, environment, computer name, console
// and debug output.
#include "platform/win32.h"
#include "sim/common/simfail.h"
#include "sim/posix/filehandles.h"
#include "sim/posix/modules.h"
#include "sim/posix/reghelp.h"
#include "sim/posix/win32util.h"
#include "sim/posix/world.h"

#include <climits>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <fcntl.h>
#include <string>
#include <termios.h>
#include <unistd.h>
#include <vector>

extern char **environ;

using namespace kxlsim::posix;

namespace {

constexpr const char *kIdentityKey = "SOFTWARE\\ZAV\\KXLSIM\\Identity";
constexpr const char *kDefaultComputerName = "KXLHOST";

constexpr DWORD kConsoleProcessedInput = 0x0001;
constexpr DWORD kConsoleProcessedOutput = 0x0001;
constexpr DWORD kConsoleWrapAtEol = 0x0002;

// The directory the process started in, to resolve a relative argv[0] after
// the process has changed its working directory.
std::string &startDirectory() {
  static std::string directory;
  return directory;
}

__attribute__((constructor)) void rememberStartDirectory() {
  char cwd[PATH_MAX];
  if (getcwd(cwd, sizeof cwd) != nullptr)
    startDirectory() = cwd;
}

std::string firstArgument() {
  FILE *cmdline = std::fopen("/proc/self/cmdline", "rb");
  if (cmdline == nullptr)
    return "";
  std::string argument;
  for (int c = std::fgetc(cmdline); c != EOF && c != '\0' && argument.size() < PATH_MAX;
       c = std::fgetc(cmdline))
    argument.push_back(static_cast<char>(c));
  std::fclose(cmdline);
  return argument;
}

// Removes "." and ".." components without following links.
std::string lexicallyNormal(const std::string &path) {
  std::vector<std::string> parts;
  size_t start = 0;
  while (start <= path.size()) {
    size_t end = path.find('/', start);
    if (end == std::string::npos)
      end = path.size();
    std::string part = path.substr(start, end - start);
    if (part == "..") {
      if (!parts.empty())
        parts.pop_back();
    } else if (!part.empty() && part != ".") {
      parts.push_back(part);
    }
    start = end + 1;
  }
  std::string normal;
  for (const std::string &part : parts)
    normal += "/" + part;
  return normal.empty() ? "/" : normal;
}

std::string resolvedExecutable() {
  char target[PATH_MAX];
  ssize_t length = readlink("/proc/self/exe", target, sizeof target - 1);
  return length <= 0 ? "" : std::string(target, static_cast<size_t>(length));
}

// The host path the program was started by, links left as they are.
std::string startedExecutable() {
  std::string argument = firstArgument();
  if (argument.find('/') == std::string::npos)
    return resolvedExecutable();
  if (argument[0] != '/')
    argument = startDirectory() + "/" + argument;
  return lexicallyNormal(argument);
}

std::string executableWindowsPath() {
  std::string started = startedExecutable();
  std::string mapped = windowsPath(started);
  if (mapped.empty())
    mapped = windowsPath(resolvedExecutable());
  if (mapped.empty()) {
    auto slash = started.rfind('/');
    mapped = "C:\\" + started.substr(slash == std::string::npos ? 0 : slash + 1);
  }
  return mapped;
}

// Windows' module-name rule: a path that does not fit is cut to nSize - 1
// characters and terminated, and the call returns nSize.
DWORD copyTruncating(const std::string &text, LPSTR buffer, DWORD size) {
  if (buffer == nullptr || size == 0)
    return failWith(ERROR_INSUFFICIENT_BUFFER, DWORD{0});
  if (text.size() < size) {
    std::memcpy(buffer, text.c_str(), text.size() + 1);
    SetLastError(ERROR_SUCCESS);
    return static_cast<DWORD>(text.size());
  }
  std::memcpy(buffer, text.data(), size - 1);
  buffer[size - 1] = '\0';
  return failWith(ERROR_INSUFFICIENT_BUFFER, size);
}

// The environment entry whose name equals `name` ignoring case, as Windows
// matches variable names; null when there is none.
const char *findEnvironmentEntry(const char *name, std::string &actualName) {
  size_t length = std::strlen(name);
  for (char **entry = environ; entry != nullptr && *entry != nullptr; ++entry) {
    const char *equals = std::strchr(*entry, '=');
    if (equals == nullptr || static_cast<size_t>(equals - *entry) != length)
      continue;
    if (equalsIgnoringCase(std::string_view(*entry, length), name)) {
      actualName.assign(*entry, length);
      return equals + 1;
    }
  }
  return nullptr;
}

bool validVariableName(LPCSTR name) {
  return name != nullptr && *name != '\0' && std::strchr(name, '=') == nullptr;
}

FileObject *standardStream(DWORD which) {
  static FileObject *streams[3] = {nullptr, nullptr, nullptr};
  int fd = which == STD_INPUT_HANDLE    ? 0
           : which == STD_OUTPUT_HANDLE ? 1
           : which == STD_ERROR_HANDLE  ? 2
                                        : -1;
  if (fd < 0)
    return nullptr;
  if (streams[fd] == nullptr) {
    struct StandardStream : FileObject {
      bool persistent() const override { return true; }
    };
    auto stream = std::make_unique<StandardStream>();
    stream->fd = fd;
    stream->owned = false;
    streams[fd] = stream.get();
    registerHandle(std::move(stream));
  }
  return streams[fd];
}

FileObject *terminalOf(HANDLE handle) {
  auto *file = lookupHandleAs<FileObject>(handle);
  return file != nullptr && isatty(file->fd) ? file : nullptr;
}

} // namespace

extern "C" {

DWORD GetModuleFileNameA(HMODULE hModule, LPSTR lpFilename, DWORD nSize) {
  if (kxlsim::shouldFail("GetModuleFileNameA"))
    return failWith(ERROR_INSUFFICIENT_BUFFER, DWORD{0});
  requireWorld();
  std::string path;
  if (hModule == nullptr)
    path = executableWindowsPath();
  else if (!moduleWindowsPath(hModule, path))
    return failWith(ERROR_MOD_NOT_FOUND, DWORD{0});
  return copyTruncating(path, lpFilename, nSize);
}

DWORD GetEnvironmentVariableA(LPCSTR lpName, LPSTR lpBuffer, DWORD nSize) {
  if (kxlsim::shouldFail("GetEnvironmentVariableA"))
    return failWith(ERROR_ENVVAR_NOT_FOUND, DWORD{0});
  std::string actualName;
  const char *value = lpName == nullptr ? nullptr : findEnvironmentEntry(lpName, actualName);
  if (value == nullptr)
    return failWith(ERROR_ENVVAR_NOT_FOUND, DWORD{0});
  SetLastError(ERROR_SUCCESS);
  return copyStringOut(value, lpBuffer, nSize);
}

BOOL SetEnvironmentVariableA(LPCSTR lpName, LPCSTR lpValue) {
  if (kxlsim::shouldFail("SetEnvironmentVariableA"))
    return failWith(ERROR_NOT_ENOUGH_MEMORY, FALSE);
  if (!validVariableName(lpName))
    return failWith(ERROR_INVALID_PARAMETER, FALSE);
  std::string actualName;
  const char *existing = findEnvironmentEntry(lpName, actualName);
  std::string name = existing != nullptr ? actualName : std::string(lpName);
  int rc = lpValue == nullptr ? unsetenv(name.c_str()) : setenv(name.c_str(), lpValue, 1);
  if (rc != 0)
    return failWith(ERROR_NOT_ENOUGH_MEMORY, FALSE);
  return TRUE;
}

BOOL GetComputerNameA(LPSTR lpBuffer, LPDWORD nSize) {
  if (kxlsim::shouldFail("GetComputerNameA"))
    return failWith(ERROR_ACCESS_DENIED, FALSE);
  if (nSize == nullptr)
    return failWith(ERROR_INVALID_PARAMETER, FALSE);
  requireWorld();
  std::string name;
  if (!reg::readString(HKEY_LOCAL_MACHINE, kIdentityKey, "ComputerName", name) || name.empty())
    name = kDefaultComputerName;
  if (lpBuffer == nullptr || *nSize <= name.size()) {
    *nSize = static_cast<DWORD>(name.size() + 1);
    return failWith(kErrorBufferOverflow, FALSE);
  }
  *nSize = copyStringOut(name, lpBuffer, *nSize);
  return TRUE;
}

HANDLE GetStdHandle(DWORD nStdHandle) {
  if (kxlsim::shouldFail("GetStdHandle"))
    return failWith(ERROR_INVALID_HANDLE, INVALID_HANDLE_VALUE);
  FileObject *stream = standardStream(nStdHandle);
  return stream == nullptr ? failWith(ERROR_INVALID_PARAMETER, INVALID_HANDLE_VALUE)
                           : static_cast<HANDLE>(stream);
}

BOOL GetConsoleMode(HANDLE hConsoleHandle, LPDWORD lpMode) {
  if (kxlsim::shouldFail("GetConsoleMode"))
    return failWith(ERROR_INVALID_HANDLE, FALSE);
  FileObject *terminal = terminalOf(hConsoleHandle);
  struct termios settings {};
  if (terminal == nullptr || lpMode == nullptr || tcgetattr(terminal->fd, &settings) != 0)
    return failWith(ERROR_INVALID_HANDLE, FALSE);
  if (terminal->fd != 0) {
    *lpMode = kConsoleProcessedOutput | kConsoleWrapAtEol;
    return TRUE;
  }
  *lpMode = kConsoleProcessedInput;
  if ((settings.c_lflag & ECHO) != 0)
    *lpMode |= ENABLE_ECHO_INPUT;
  if ((settings.c_lflag & ICANON) != 0)
    *lpMode |= ENABLE_LINE_INPUT;
  return TRUE;
}

BOOL SetConsoleMode(HANDLE hConsoleHandle, DWORD dwMode) {
  if (kxlsim::shouldFail("SetConsoleMode"))
    return failWith(ERROR_INVALID_HANDLE, FALSE);
  FileObject *terminal = terminalOf(hConsoleHandle);
  struct termios settings {};
  if (terminal == nullptr || tcgetattr(terminal->fd, &settings) != 0)
    return failWith(ERROR_INVALID_HANDLE, FALSE);
  if (terminal->fd != 0)
    return TRUE;
  settings.c_lflag =
      (dwMode & ENABLE_ECHO_INPUT) != 0 ? (settings.c_lflag | ECHO) : (settings.c_lflag & ~ECHO);
  settings.c_lflag =
      (dwMode & ENABLE_LINE_INPUT) != 0 ? (settings.c_lflag | ICANON) : (settings.c_lflag & ~ICANON);
  if (tcsetattr(terminal->fd, TCSANOW, &settings) != 0)
    return failWith(ERROR_INVALID_HANDLE, FALSE);
  return TRUE;
}

// Without a debugger attached the text goes nowhere; with KXLSIM_DEBUG set it
// is written to standard error, one line per call.
void OutputDebugStringA(LPCSTR lpOutputString) {
  if (kxlsim::shouldFail("OutputDebugStringA") || lpOutputString == nullptr)
    return;
  const char *debug = std::getenv("KXLSIM_DEBUG");
  if (debug == nullptr || *debug == '\0')
    return;
  size_t length = std::strlen(lpOutputString);
  bool endsLine = length > 0 && lpOutputString[length - 1] == '\n';
  std::fprintf(stderr, "%s%s", lpOutputString, endsLine ? "" : "\n");
}

} // extern "C"
