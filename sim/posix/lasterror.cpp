// The calling thread's last error code, as Windows keeps it per thread.
#include "platform/win32.h"

namespace {
thread_local DWORD lastError = ERROR_SUCCESS;
}

extern "C" DWORD GetLastError(void) {
  return lastError;
}

extern "C" void SetLastError(DWORD dwErrCode) {
  lastError = dwErrCode;
}
