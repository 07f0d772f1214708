// Run-time modules of the simulated machine. Each module is a table of
// exports built into the surface; LoadLibraryA hands it out only when the
// world holds the module's file.
#pragma once

#include "platform/win32.h"

#include <cstddef>
#include <string>

namespace kxlsim::posix {

struct ModuleExport {
  const char *name;
  FARPROC address;
};

struct ModuleDefinition {
  const char *fileName; // "clusapi.dll"
  const ModuleExport *exports;
  size_t exportCount;
};

// The built-in modules (defined in sim/posix/modules/).
const ModuleDefinition &clusapiModule();
const ModuleDefinition &resutilsModule();
const ModuleDefinition &odbc32Module();

// The Windows path of a loaded module's file; false for an unknown handle.
bool moduleWindowsPath(HMODULE module, std::string &out);

// How many LoadLibraryA calls on the module have not been freed yet.
int moduleLoadCount(const char *fileName);

// Exports are stored untyped, as a module's export table is; the caller casts
// back to the entry point's own type. The detour through void(*)() is the
// sanctioned way to change a function pointer's type.
template <typename F> FARPROC exportAddress(F function) {
  return reinterpret_cast<FARPROC>(reinterpret_cast<void (*)()>(function));
}

} // namespace kxlsim::posix
