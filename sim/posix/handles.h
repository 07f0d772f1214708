// Kernel-object handles of the simulated machine: files, searches, processes
// and the standard streams. A HANDLE is the address of a live object in one
// table, so a stale or foreign handle is recognised instead of dereferenced.
#pragma once

#include "platform/win32.h"

#include <memory>

namespace kxlsim::posix {

struct HandleObject {
  virtual ~HandleObject() = default;
  // False for objects that CloseHandle may not close (searches need FindClose).
  virtual bool closableByCloseHandle() const { return true; }
  // True for objects that live as long as the process (the standard streams):
  // closing them succeeds and changes nothing.
  virtual bool persistent() const { return false; }
};

// Takes ownership and returns the handle naming the object.
HANDLE registerHandle(std::unique_ptr<HandleObject> object);

// The live object behind `handle`, or null when it is not a live handle.
HandleObject *lookupHandle(HANDLE handle);

template <typename T> T *lookupHandleAs(HANDLE handle) {
  return dynamic_cast<T *>(lookupHandle(handle));
}

// Destroys the object; false when `handle` is not live.
bool releaseHandle(HANDLE handle);

} // namespace kxlsim::posix
