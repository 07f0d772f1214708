// File handles: a HANDLE over a host file descriptor.
#pragma once

#include "sim/posix/handles.h"

namespace kxlsim::posix {

struct FileObject : HandleObject {
  int fd = -1;
  bool owned = true; // false for the standard streams, which stay open
  ~FileObject() override;
};

} // namespace kxlsim::posix
