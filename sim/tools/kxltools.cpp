// The product's external programs as one multi-call program. The name it is
// started under picks the program: kxlckupgrade, kxlimaudcfg, kxlimsslcfg,
// kxlset or kxlsyscs (".exe" and letter case ignored). Each run records an
// event in the world and ends with the exit code configured for the program
// in HKLM\SOFTWARE\ZAV\KXLSIM\Tools\<program> "ExitCode" (0 when absent).
// A program configured to fail does none of its work (tool_actions.h).
#include "platform/win32.h"
#include "sim/common/events.h"
#include "sim/product/tool_actions.h"
#include "sim/tools/tool_names.h"

#include <cstdio>
#include <cstring>
#include <string>

namespace {

DWORD configuredExitCode(const std::string &program) {
  std::string keyPath = "SOFTWARE\\ZAV\\KXLSIM\\Tools\\" + program;
  HKEY key = nullptr;
  if (RegOpenKeyExA(HKEY_LOCAL_MACHINE, keyPath.c_str(), 0, KEY_QUERY_VALUE, &key) != ERROR_SUCCESS)
    return 0;
  DWORD type = 0;
  DWORD value = 0;
  DWORD size = sizeof value;
  LONG rc = RegQueryValueExA(key, "ExitCode", nullptr, &type, reinterpret_cast<BYTE *>(&value), &size);
  RegCloseKey(key);
  return rc == ERROR_SUCCESS && type == REG_DWORD ? value : 0;
}

std::string environmentValue(const char *name) {
  char buffer[1024];
  DWORD n = GetEnvironmentVariableA(name, buffer, sizeof buffer);
  return n > 0 && n < sizeof buffer ? std::string(buffer, n) : std::string();
}

std::string currentDirectory() {
  char buffer[MAX_PATH + 1];
  DWORD n = GetCurrentDirectoryA(sizeof buffer, buffer);
  return n > 0 && n < sizeof buffer ? std::string(buffer, n) : std::string();
}

// A path argument may arrive wrapped in double quotes.
std::string unquoted(const std::string &text) {
  if (text.size() >= 2 && text.front() == '"' && text.back() == '"')
    return text.substr(1, text.size() - 2);
  return text;
}

bool writeTextFile(const std::string &windowsPath, const std::string &text) {
  HANDLE file = CreateFileA(windowsPath.c_str(), GENERIC_WRITE, 0, nullptr, CREATE_ALWAYS,
                            FILE_ATTRIBUTE_NORMAL, nullptr);
  if (file == INVALID_HANDLE_VALUE)
    return false;
  DWORD written = 0;
  BOOL ok = WriteFile(file, text.data(), DWORD(text.size()), &written, nullptr);
  CloseHandle(file);
  return ok && written == text.size();
}

// The database check tool leaves a short log where "-l" points.
void writeCheckLog(int argc, char **argv, const std::string &instance, DWORD exitCode) {
  for (int i = 1; i + 1 < argc; ++i) {
    if (std::strcmp(argv[i], "-l") != 0)
      continue;
    char line[512];
    std::snprintf(line, sizeof line, "Database check of instance \"%s\" finished.\r\nResult code: %lu\r\n",
                  instance.c_str(), static_cast<unsigned long>(exitCode));
    if (!writeTextFile(unquoted(argv[i + 1]), line))
      std::fprintf(stderr, "kxlckupgrade: cannot write the log file %s\n", argv[i + 1]);
    return;
  }
}

} // namespace

int main(int argc, char **argv) {
  std::string program = kxlsim::toolProgramName(argc > 0 ? argv[0] : "");
  if (!kxlsim::isToolProgram(program)) {
    std::fprintf(stderr, "kxltools: start this program as one of: %s\n", kxlsim::toolProgramList().c_str());
    return 2;
  }
  std::string instance = environmentValue("KXLINSTANCE");
  kxlsim::appendEvent("program", {{"program", program + ".exe"},
                                  {"args", kxlsim::joinArguments(argc, argv)},
                                  {"argc", std::to_string(argc > 0 ? argc - 1 : 0)},
                                  {"KXLINSTANCE", instance},
                                  {"cwd", currentDirectory()}});
  DWORD exitCode = configuredExitCode(program);
  if (program == "kxlckupgrade")
    writeCheckLog(argc, argv, instance, exitCode);
  if (exitCode != 0)
    return int(exitCode);
  int usage = kxlsim::runToolWork(program, argc, argv);
  if (usage != 0)
    std::fprintf(stderr, "%s: usage: %s -c \"CLIENT FILE\" -s \"SERVER FILE\"\n", program.c_str(),
                 program.c_str());
  return usage;
}
