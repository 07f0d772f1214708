#include "sim/kxlsim/world_reader.h"

namespace kxlsim {

namespace {

class OpenKey {
public:
  OpenKey(const RegTarget &target, const std::string &key) {
    std::string path = target.prefix + key;
    if (RegOpenKeyExA(target.root, path.c_str(), 0, KEY_READ, &handle_) != ERROR_SUCCESS)
      handle_ = nullptr;
  }
  ~OpenKey() {
    if (handle_ != nullptr)
      RegCloseKey(handle_);
  }
  OpenKey(const OpenKey &) = delete;
  OpenKey &operator=(const OpenKey &) = delete;
  HKEY get() const { return handle_; }

private:
  HKEY handle_ = nullptr;
};

} // namespace

std::vector<std::string> subkeys(const RegTarget &target, const std::string &key) {
  std::vector<std::string> names;
  OpenKey k(target, key);
  if (k.get() == nullptr)
    return names;
  for (DWORD index = 0;; ++index) {
    char name[256];
    DWORD size = sizeof name;
    if (RegEnumKeyExA(k.get(), index, name, &size, nullptr, nullptr, nullptr, nullptr) != ERROR_SUCCESS)
      break;
    names.emplace_back(name, size);
  }
  return names;
}

bool keyExists(const RegTarget &target, const std::string &key) {
  return OpenKey(target, key).get() != nullptr;
}

std::string stringValue(const RegTarget &target, const std::string &key, const std::string &name) {
  OpenKey k(target, key);
  char data[1024];
  DWORD size = sizeof data - 1;
  DWORD type = 0;
  if (k.get() == nullptr ||
      RegQueryValueExA(k.get(), name.c_str(), nullptr, &type, reinterpret_cast<BYTE *>(data), &size) !=
          ERROR_SUCCESS ||
      (type != REG_SZ && type != REG_EXPAND_SZ))
    return "";
  data[size < sizeof data ? size : sizeof data - 1] = '\0';
  return data;
}

DWORD dwordValue(const RegTarget &target, const std::string &key, const std::string &name, DWORD fallback) {
  OpenKey k(target, key);
  DWORD value = 0;
  DWORD size = sizeof value;
  DWORD type = 0;
  if (k.get() == nullptr ||
      RegQueryValueExA(k.get(), name.c_str(), nullptr, &type, reinterpret_cast<BYTE *>(&value), &size) !=
          ERROR_SUCCESS ||
      type != REG_DWORD)
    return fallback;
  return value;
}

bool readFileHead(const std::string &windowsPath, size_t limit, std::vector<uint8_t> &out) {
  HANDLE file = CreateFileA(windowsPath.c_str(), GENERIC_READ, FILE_SHARE_READ, nullptr, OPEN_EXISTING,
                            FILE_ATTRIBUTE_NORMAL, nullptr);
  if (file == INVALID_HANDLE_VALUE)
    return false;
  out.assign(limit, 0);
  DWORD got = 0;
  BOOL ok = ReadFile(file, out.data(), DWORD(limit), &got, nullptr);
  CloseHandle(file);
  out.resize(ok ? got : 0);
  return ok != FALSE;
}

} // namespace kxlsim
