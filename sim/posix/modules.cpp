// LoadLibraryA, GetProcAddress and FreeLibrary over the built-in modules.
#include "sim/posix/modules.h"

#include "sim/common/simfail.h"
#include "sim/posix/win32util.h"
#include "sim/posix/world.h"

#include <cstdint>
#include <mutex>
#include <string>
#include <sys/stat.h>

using namespace kxlsim::posix;

namespace {

constexpr const char *kSystemDirectory = "C:\\windows\\system32\\";

struct LoadedModule {
  const ModuleDefinition *definition;
  int references = 0;
  std::string windowsFile;
};

std::mutex &modulesLock() {
  static std::mutex lock;
  return lock;
}

LoadedModule *modules() {
  static LoadedModule table[] = {
      {&clusapiModule(), 0, ""}, {&resutilsModule(), 0, ""}, {&odbc32Module(), 0, ""}};
  return table;
}

constexpr size_t kModuleCount = 3;

LoadedModule *moduleNamed(const std::string &fileName) {
  for (size_t i = 0; i < kModuleCount; ++i)
    if (equalsIgnoringCase(modules()[i].definition->fileName, fileName))
      return &modules()[i];
  return nullptr;
}

LoadedModule *moduleOf(HMODULE handle) {
  for (size_t i = 0; i < kModuleCount; ++i)
    if (reinterpret_cast<HMODULE>(&modules()[i]) == handle && modules()[i].references > 0)
      return &modules()[i];
  return nullptr;
}

// The module's file as Windows would look for it: the path given, else the
// system directory; ".dll" is added to a name without an extension.
std::string moduleFile(const std::string &requested, std::string &baseName) {
  auto cut = requested.find_last_of("\\/");
  baseName = cut == std::string::npos ? requested : requested.substr(cut + 1);
  std::string file = requested;
  if (baseName.find('.') == std::string::npos) {
    baseName += ".dll";
    file += ".dll";
  }
  return cut == std::string::npos ? kSystemDirectory + baseName : file;
}

bool isFile(const std::string &windowsFile) {
  std::string host;
  struct stat info {};
  return hostPath(windowsFile, host) && stat(host.c_str(), &info) == 0 && S_ISREG(info.st_mode);
}

} // namespace

namespace kxlsim::posix {

bool moduleWindowsPath(HMODULE module, std::string &out) {
  std::lock_guard<std::mutex> guard(modulesLock());
  LoadedModule *loaded = moduleOf(module);
  if (loaded == nullptr)
    return false;
  out = loaded->windowsFile;
  return true;
}

int moduleLoadCount(const char *fileName) {
  std::lock_guard<std::mutex> guard(modulesLock());
  LoadedModule *loaded = moduleNamed(fileName);
  return loaded == nullptr ? 0 : loaded->references;
}

} // namespace kxlsim::posix

extern "C" {

HMODULE LoadLibraryA(LPCSTR lpLibFileName) {
  if (kxlsim::shouldFail("LoadLibraryA"))
    return failWith(ERROR_MOD_NOT_FOUND, HMODULE{nullptr});
  if (lpLibFileName == nullptr || *lpLibFileName == '\0')
    return failWith(ERROR_INVALID_PARAMETER, HMODULE{nullptr});
  requireWorld();
  std::string baseName;
  std::string file = moduleFile(lpLibFileName, baseName);
  std::lock_guard<std::mutex> guard(modulesLock());
  LoadedModule *module = moduleNamed(baseName);
  if (module == nullptr || !isFile(file))
    return failWith(ERROR_MOD_NOT_FOUND, HMODULE{nullptr});
  if (module->references++ == 0)
    module->windowsFile = file;
  return reinterpret_cast<HMODULE>(module);
}

FARPROC GetProcAddress(HMODULE hModule, LPCSTR lpProcName) {
  if (kxlsim::shouldFail("GetProcAddress"))
    return failWith(ERROR_PROC_NOT_FOUND, FARPROC{nullptr});
  std::lock_guard<std::mutex> guard(modulesLock());
  LoadedModule *module = moduleOf(hModule);
  if (module == nullptr)
    return failWith(ERROR_MOD_NOT_FOUND, FARPROC{nullptr});
  // Lookups by ordinal (a pointer value below 0x10000) have no table here.
  if (reinterpret_cast<uintptr_t>(lpProcName) < 0x10000)
    return failWith(ERROR_PROC_NOT_FOUND, FARPROC{nullptr});
  const ModuleDefinition &definition = *module->definition;
  for (size_t i = 0; i < definition.exportCount; ++i)
    if (std::string(definition.exports[i].name) == lpProcName)
      return definition.exports[i].address;
  return failWith(ERROR_PROC_NOT_FOUND, FARPROC{nullptr});
}

BOOL FreeLibrary(HMODULE hLibModule) {
  if (kxlsim::shouldFail("FreeLibrary"))
    return failWith(ERROR_INVALID_HANDLE, FALSE);
  std::lock_guard<std::mutex> guard(modulesLock());
  LoadedModule *module = moduleOf(hLibModule);
  if (module == nullptr)
    return failWith(ERROR_MOD_NOT_FOUND, FALSE);
  --module->references;
  return TRUE;
}

} // extern "C"
