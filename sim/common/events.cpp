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
#include "sim/posix/world.h"
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
bool appendLine(const std::string &path, const std::string &line) {
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

} // namespace

std::string eventsPath() {
#ifdef _WIN32
  const char *root = std::getenv("KXLSIM_ROOT");
  if (root != nullptr && root[0] != '\0')
    return std::string(root) + "\\events.jsonl";
  return "C:\\kxlsim\\events.jsonl";
#else
  const std::string &root = posix::worldRoot();
  return root.empty() ? "" : root + "/events.jsonl";
#endif
}

bool appendEvent(const std::string &kind, const EventFields &fields) {
  std::string path = eventsPath();
  if (path.empty())
    return false;
  return appendLine(path, eventLine(kind, fields));
}

} // namespace kxlsim
