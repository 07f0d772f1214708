#include "sim/posix/reghelp.h"

namespace kxlsim::posix::reg {

Key::~Key() {
  if (key_ != nullptr)
    RegCloseKey(key_);
}

LONG Key::open(HKEY root, const std::string &path, REGSAM access) {
  return RegOpenKeyExA(root, path.c_str(), 0, access, &key_);
}

LONG Key::create(HKEY root, const std::string &path, REGSAM access) {
  return RegCreateKeyExA(root, path.c_str(), 0, nullptr, REG_OPTION_NON_VOLATILE, access, nullptr, &key_,
                         nullptr);
}

namespace {

constexpr DWORD kMaxQueriedBytes = 4096;

// The raw data of a value and its type; false when it is missing.
bool readRaw(HKEY root, const std::string &path, const char *value, DWORD &type, std::string &data) {
  Key key;
  if (key.open(root, path) != ERROR_SUCCESS)
    return false;
  DWORD size = 0;
  if (RegQueryValueExA(key.get(), value, nullptr, &type, nullptr, &size) != ERROR_SUCCESS)
    return false;
  data.assign(size, '\0');
  if (size == 0)
    return true;
  if (RegQueryValueExA(key.get(), value, nullptr, &type, reinterpret_cast<LPBYTE>(data.data()), &size) !=
      ERROR_SUCCESS)
    return false;
  data.resize(size);
  return true;
}

LONG writeRaw(HKEY root, const std::string &path, const char *value, DWORD type, const std::string &data) {
  Key key;
  LONG rc = key.create(root, path, KEY_SET_VALUE);
  if (rc != ERROR_SUCCESS)
    return rc;
  return RegSetValueExA(key.get(), value, 0, type, reinterpret_cast<const BYTE *>(data.data()),
                        static_cast<DWORD>(data.size()));
}

std::string untilNul(const std::string &data) {
  return data.substr(0, data.find('\0'));
}

} // namespace

LONG keyOpens(HKEY root, const std::string &path) {
  Key key;
  return key.open(root, path, KEY_QUERY_VALUE);
}

bool keyExists(HKEY root, const std::string &path) {
  return keyOpens(root, path) == ERROR_SUCCESS;
}

bool readString(HKEY root, const std::string &path, const char *value, std::string &out) {
  DWORD type = REG_NONE;
  std::string data;
  if (!readRaw(root, path, value, type, data) || (type != REG_SZ && type != REG_EXPAND_SZ))
    return false;
  out = untilNul(data);
  return true;
}

LONG queryString(HKEY root, const std::string &path, const char *value, std::string &out) {
  Key key;
  LONG rc = key.open(root, path, KEY_QUERY_VALUE);
  if (rc != ERROR_SUCCESS)
    return rc;
  std::vector<char> data(kMaxQueriedBytes + 1, '\0');
  DWORD size = kMaxQueriedBytes;
  DWORD type = REG_NONE;
  rc = RegQueryValueExA(key.get(), value, nullptr, &type, reinterpret_cast<BYTE *>(data.data()), &size);
  if (rc != ERROR_SUCCESS)
    return rc;
  if (type != REG_SZ && type != REG_EXPAND_SZ)
    return ERROR_BAD_FORMAT;
  data[size < kMaxQueriedBytes ? size : kMaxQueriedBytes] = '\0';
  out.assign(data.data());
  return ERROR_SUCCESS;
}

bool readDword(HKEY root, const std::string &path, const char *value, DWORD &out) {
  DWORD type = REG_NONE;
  std::string data;
  if (!readRaw(root, path, value, type, data) || type != REG_DWORD || data.size() != sizeof(DWORD))
    return false;
  const auto *bytes = reinterpret_cast<const unsigned char *>(data.data());
  out = static_cast<DWORD>(bytes[0]) | static_cast<DWORD>(bytes[1]) << 8 |
        static_cast<DWORD>(bytes[2]) << 16 | static_cast<DWORD>(bytes[3]) << 24;
  return true;
}

bool readMultiString(HKEY root, const std::string &path, const char *value, std::vector<std::string> &out) {
  DWORD type = REG_NONE;
  std::string data;
  if (!readRaw(root, path, value, type, data) || type != REG_MULTI_SZ)
    return false;
  out.clear();
  size_t start = 0;
  while (start < data.size()) {
    size_t end = data.find('\0', start);
    if (end == std::string::npos)
      end = data.size();
    if (end == start)
      break;
    out.push_back(data.substr(start, end - start));
    start = end + 1;
  }
  return true;
}

KeyValue stringValue(const char *name, const std::string &data) {
  return {name, REG_SZ, data + '\0'};
}

KeyValue dwordValue(const char *name, DWORD data) {
  std::string bytes(4, '\0');
  for (int i = 0; i < 4; ++i)
    bytes[static_cast<size_t>(i)] = static_cast<char>((data >> (8 * i)) & 0xFF);
  return {name, REG_DWORD, bytes};
}

KeyValue multiStringValue(const char *name, const std::vector<std::string> &data) {
  std::string bytes;
  for (const std::string &item : data)
    bytes += item + '\0';
  bytes += '\0';
  return {name, REG_MULTI_SZ, bytes};
}

LONG writeString(HKEY root, const std::string &path, const char *value, const std::string &data) {
  KeyValue v = stringValue(value, data);
  return writeRaw(root, path, value, v.type, v.data);
}

LONG writeDword(HKEY root, const std::string &path, const char *value, DWORD data) {
  KeyValue v = dwordValue(value, data);
  return writeRaw(root, path, value, v.type, v.data);
}

LONG writeMultiString(HKEY root, const std::string &path, const char *value,
                      const std::vector<std::string> &data) {
  KeyValue v = multiStringValue(value, data);
  return writeRaw(root, path, value, v.type, v.data);
}

LONG deleteValue(HKEY root, const std::string &path, const char *value) {
  Key key;
  LONG rc = key.open(root, path, KEY_SET_VALUE);
  if (rc != ERROR_SUCCESS)
    return rc;
  return RegDeleteValueA(key.get(), value);
}

#ifdef _WIN32
LONG writeKey(HKEY root, const std::string &path, const std::vector<KeyValue> &values) {
  for (const KeyValue &value : values)
    if (LONG rc = writeRaw(root, path, value.name.c_str(), value.type, value.data); rc != ERROR_SUCCESS)
      return rc;
  return ERROR_SUCCESS;
}
#endif

LONG listSubkeys(HKEY root, const std::string &path, std::vector<std::string> &names) {
  names.clear();
  Key key;
  LONG rc = key.open(root, path, KEY_ENUMERATE_SUB_KEYS | KEY_QUERY_VALUE);
  if (rc == ERROR_FILE_NOT_FOUND)
    return ERROR_SUCCESS;
  if (rc != ERROR_SUCCESS)
    return rc;
  for (DWORD index = 0;; ++index) {
    char name[256];
    DWORD size = sizeof name;
    rc = RegEnumKeyExA(key.get(), index, name, &size, nullptr, nullptr, nullptr, nullptr);
    if (rc == ERROR_NO_MORE_ITEMS)
      return ERROR_SUCCESS;
    if (rc != ERROR_SUCCESS)
      return rc;
    names.emplace_back(name, size < sizeof name ? size : sizeof name - 1);
  }
}

std::vector<std::string> subkeys(HKEY root, const std::string &path) {
  std::vector<std::string> names;
  listSubkeys(root, path, names);
  return names;
}

std::vector<std::pair<std::string, std::string>> stringValues(HKEY root, const std::string &path) {
  std::vector<std::pair<std::string, std::string>> values;
  Key key;
  if (key.open(root, path) != ERROR_SUCCESS)
    return values;
  char name[16384];
  std::string data(4096, '\0');
  for (DWORD index = 0;; ++index) {
    DWORD nameLength = sizeof name;
    DWORD type = REG_NONE;
    DWORD size = static_cast<DWORD>(data.size());
    LONG rc = RegEnumValueA(key.get(), index, name, &nameLength, nullptr, &type,
                            reinterpret_cast<LPBYTE>(data.data()), &size);
    if (rc == ERROR_MORE_DATA && size > data.size()) {
      data.assign(size, '\0');
      --index;
      continue;
    }
    if (rc != ERROR_SUCCESS)
      break;
    if (type == REG_SZ || type == REG_EXPAND_SZ)
      values.emplace_back(std::string(name, nameLength), untilNul(data.substr(0, size)));
  }
  return values;
}

LONG deleteTree(HKEY root, const std::string &path) {
  return SHDeleteKeyA(root, path.c_str());
}

} // namespace kxlsim::posix::reg
