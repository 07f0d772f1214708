#include "sim/posix/handles.h"

#include <map>
#include <mutex>

namespace kxlsim::posix {
namespace {

std::mutex &tableLock() {
  static std::mutex lock;
  return lock;
}

std::map<HANDLE, std::unique_ptr<HandleObject>> &table() {
  static std::map<HANDLE, std::unique_ptr<HandleObject>> live;
  return live;
}

} // namespace

HANDLE registerHandle(std::unique_ptr<HandleObject> object) {
  std::lock_guard<std::mutex> guard(tableLock());
  HANDLE handle = object.get();
  table()[handle] = std::move(object);
  return handle;
}

HandleObject *lookupHandle(HANDLE handle) {
  std::lock_guard<std::mutex> guard(tableLock());
  auto found = table().find(handle);
  return found == table().end() ? nullptr : found->second.get();
}

bool releaseHandle(HANDLE handle) {
  std::unique_ptr<HandleObject> doomed;
  {
    std::lock_guard<std::mutex> guard(tableLock());
    auto found = table().find(handle);
    if (found == table().end())
      return false;
    doomed = std::move(found->second);
    table().erase(found);
  }
  return true;
}

} // namespace kxlsim::posix
