// The world's event log. Each event is one line written by a single append, so
// lines from several processes never mix.
#include "sim/common/events.h"

#include <nlohmann/json.hpp>

#include <cstdlib>

#ifdef _WIN32
#ifndef WIN32_LEAN_AND_MEAN
#define WIN32_LEAN_AND_MEAN
#endif
#include <windows.h>
#else
#include "sim/common/worldroot.h"
#include <fcntl.h>
#include <unistd.h>
#endif

namespace kxlsim {

namespace {

std::string eventLine(const std::string &kind, const EventFields &fields) {
  nlohmann::json event = nlohmann::json::object();
  event["event"] = kind;
  for (const auto &[name, value] : fields)
    event[name] = value;
  // Arguments and paths are not always valid UTF-8: replace, never throw.
  return event.dump(-1, ' ', false, nlohmann::json::error_handler_t::replace) + "\n";
}

#ifdef _WIN32
// Creates every missing folder of a Windows folder path ("C:\\a\\b").
void createFolders(const std::string &folder) {
  for (std::size_t cut = folder.find('\\', 3);; cut = folder.find('\\', cut + 1)) {
    CreateDirectoryA(folder.substr(0, cut).c_str(), nullptr);
    if (cut == std::string::npos)
      return;
  }
}

bool appendLine(const std::string &path, const std::string &line) {
  createFolders(path.substr(0, path.find_last_of('\\')));
  HANDLE file = CreateFileA(path.c_str(), FILE_APPEND_DATA, FILE_SHARE_READ | FILE_SHARE_WRITE, nullptr,
                            OPEN_ALWAYS, FILE_ATTRIBUTE_NORMAL, nullptr);
  if (file == INVALID_HANDLE_VALUE)
    return false;
  DWORD written = 0;
  BOOL ok = WriteFile(file, line.data(), static_cast<DWORD>(line.size()), &written, nullptr);
  CloseHandle(file);
  return ok && written == line.size();
}
#else
bool appendLine(const std::string &path, const std::string &line) {
  int fd = open(path.c_str(), O_WRONLY | O_APPEND | O_CREAT | O_CLOEXEC, 0644);
  if (fd < 0)
    return false;
  ssize_t written = write(fd, line.data(), line.size());
  close(fd);
  return written == static_cast<ssize_t>(line.size());
}
#endif

std::string logFolder() {
#ifdef _WIN32
  // The machine's own data folder; KXLSIM_ROOT (a Windows folder) overrides it.
  const char *root = std::getenv("KXLSIM_ROOT");
  if (root != nullptr && root[0] != '\0')
    return root;
  const char *data = std::getenv("ProgramData");
  return std::string(data != nullptr && data[0] != '\0' ? data : "C:\\ProgramData") + "\\ZAV\\KXLSIM";
#else
  return posix::worldRoot();
#endif
}

} // namespace

std::string eventsPath() {
  std::string folder = logFolder();
#ifdef _WIN32
  return folder + "\\events.jsonl";
#else
  return folder.empty() ? "" : folder + "/events.jsonl";
#endif
}

bool appendLogLine(const std::string &path, const std::string &line) {
  return !path.empty() && appendLine(path, line);
}

bool appendEvent(const std::string &kind, const EventFields &fields) {
  std::string path = eventsPath();
  if (path.empty())
    return false;
  return appendLine(path, eventLine(kind, fields));
}

} // namespace kxlsim
