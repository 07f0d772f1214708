#include "sim/kxlsim/world_writer.h"
#include "sim/kxlsim/hostfile.h"

#include "sim/posix/world.h"

#include <sys/stat.h>

#include <cctype>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <iterator>

namespace kxlsim {

namespace fs = std::filesystem;

RegTarget localMachine() {
  return {HKEY_LOCAL_MACHINE, ""};
}
RegTarget currentUser() {
  return {HKEY_CURRENT_USER, ""};
}
RegTarget remoteMachine(const std::string &computerName) {
  return {HKEY_LOCAL_MACHINE, std::string(kMachinesKey) + "\\" + computerName + "\\"};
}

namespace {

bool writeHostText(const fs::path &path, const std::string &text) {
  std::ofstream out(path, std::ios::binary | std::ios::trunc);
  out << text;
  return bool(out);
}

} // namespace

bool selectWorld(const std::string &hostDir, std::string &error) {
  std::error_code ec;
  fs::path absolute = fs::absolute(hostDir, ec);
  if (ec || !fs::is_regular_file(absolute / "system.reg")) {
    error = hostDir + " holds no world (no system.reg)";
    return false;
  }
  setenv("KXLSIM_ROOT", absolute.lexically_normal().string().c_str(), 1);
  posix::resetWorldRoot();
  return true;
}

bool initWorld(const std::string &hostDir, std::string &error) {
  std::error_code ec;
  fs::path root = fs::absolute(hostDir, ec);
  if (!ec && fs::exists(root / "system.reg")) {
    error = hostDir + " holds a world already";
    return false;
  }
  fs::create_directories(root / "drive_c", ec);
  if (ec) {
    error = "cannot create " + hostDir + ": " + ec.message();
    return false;
  }
  if (!writeHostText(root / "system.reg", "REGEDIT4\n\n") ||
      !writeHostText(root / "user.reg", "REGEDIT4\n\n")) {
    error = "cannot write the registry files of " + hostDir;
    return false;
  }
  return selectWorld(hostDir, error);
}

void WorldWriter::addDrive(char letter) {
  std::error_code ec;
  std::string folder =
      std::string("drive_") + static_cast<char>(std::tolower(static_cast<unsigned char>(letter)));
  fs::create_directories(fs::path(kxlsim::posix::worldRoot()) / folder, ec);
  if (ec)
    note("cannot create drive " + std::string(1, letter) + ": " + ec.message());
}

std::string windowsParent(const std::string &windowsPath) {
  size_t slash = windowsPath.find_last_of('\\');
  if (slash == std::string::npos || slash <= 2)
    return "";
  return windowsPath.substr(0, slash);
}

bool WorldWriter::openKey(const RegTarget &target, const std::string &key, HKEY &out) {
  std::string path = target.prefix + key;
  DWORD disposition = 0;
  LONG rc = RegCreateKeyExA(target.root, path.c_str(), 0, nullptr, REG_OPTION_NON_VOLATILE, KEY_ALL_ACCESS,
                            nullptr, &out, &disposition);
  if (rc != ERROR_SUCCESS) {
    note("cannot create registry key " + path + " (error " + std::to_string(rc) + ")");
    return false;
  }
  return true;
}

void WorldWriter::createKey(const RegTarget &target, const std::string &key) {
  HKEY handle = nullptr;
  if (openKey(target, key, handle))
    RegCloseKey(handle);
}

void WorldWriter::setValue(const RegTarget &target, const std::string &key, const std::string &name,
                           DWORD type, const void *data, DWORD size) {
  HKEY handle = nullptr;
  if (!openKey(target, key, handle))
    return;
  LONG rc = RegSetValueExA(handle, name.c_str(), 0, type, static_cast<const BYTE *>(data), size);
  if (rc != ERROR_SUCCESS)
    note("cannot set " + target.prefix + key + " \"" + name + "\" (error " + std::to_string(rc) + ")");
  RegCloseKey(handle);
}

void WorldWriter::setString(const RegTarget &target, const std::string &key, const std::string &name,
                            const std::string &value) {
  setValue(target, key, name, REG_SZ, value.c_str(), DWORD(value.size() + 1));
}

void WorldWriter::setDword(const RegTarget &target, const std::string &key, const std::string &name,
                           DWORD value) {
  setValue(target, key, name, REG_DWORD, &value, sizeof value);
}

void WorldWriter::setMultiString(const RegTarget &target, const std::string &key, const std::string &name,
                                 const std::vector<std::string> &items) {
  std::string data;
  for (const std::string &item : items)
    data.append(item).push_back('\0');
  data.push_back('\0');
  setValue(target, key, name, REG_MULTI_SZ, data.data(), DWORD(data.size()));
}

void WorldWriter::makeDirectory(const std::string &windowsPath) {
  if (windowsPath.empty() || GetFileAttributesA(windowsPath.c_str()) != INVALID_FILE_ATTRIBUTES)
    return;
  makeDirectory(windowsParent(windowsPath));
  if (!CreateDirectoryA(windowsPath.c_str(), nullptr) && GetLastError() != ERROR_ALREADY_EXISTS)
    note("cannot create directory " + windowsPath + " (error " + std::to_string(GetLastError()) + ")");
}

void WorldWriter::writeFile(const std::string &windowsPath, const std::vector<uint8_t> &bytes) {
  makeDirectory(windowsParent(windowsPath));
  HANDLE file = CreateFileA(windowsPath.c_str(), GENERIC_WRITE, 0, nullptr, CREATE_ALWAYS,
                            FILE_ATTRIBUTE_NORMAL, nullptr);
  if (file == INVALID_HANDLE_VALUE) {
    note("cannot create file " + windowsPath + " (error " + std::to_string(GetLastError()) + ")");
    return;
  }
  DWORD written = 0;
  if (!WriteFile(file, bytes.data(), DWORD(bytes.size()), &written, nullptr) || written != bytes.size())
    note("cannot write file " + windowsPath);
  CloseHandle(file);
}

void WorldWriter::writeText(const std::string &windowsPath, const std::string &text) {
  writeFile(windowsPath, std::vector<uint8_t>(text.begin(), text.end()));
}

void WorldWriter::installHostFile(const std::string &hostPath, const std::string &windowsPath,
                                  bool executable) {
  std::string bytes;
  if (!readHostFile(hostPath, bytes)) {
    note("cannot read " + hostPath);
    return;
  }
  writeFile(windowsPath, std::vector<uint8_t>(bytes.begin(), bytes.end()));
  std::string inWorld;
  // Windows has no execute permission; the host needs it to start the program.
  if (executable && posix::hostPath(windowsPath, inWorld))
    chmod(inWorld.c_str(), 0755);
}

} // namespace kxlsim
