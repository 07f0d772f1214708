#include "sim/tools/tool_names.h"

#include <cctype>

namespace kxlsim {

std::string toolProgramName(const std::string &startedAs) {
  size_t slash = startedAs.find_last_of("/\\");
  std::string base = slash == std::string::npos ? startedAs : startedAs.substr(slash + 1);
  for (char &c : base)
    c = char(std::tolower(static_cast<unsigned char>(c)));
  const std::string suffix = ".exe";
  if (base.size() > suffix.size() && base.compare(base.size() - suffix.size(), suffix.size(), suffix) == 0)
    base.resize(base.size() - suffix.size());
  return base;
}

bool isToolProgram(const std::string &name) {
  for (const char *program : kToolPrograms)
    if (name == program)
      return true;
  return false;
}

std::string toolProgramList() {
  std::string list;
  for (const char *program : kToolPrograms)
    list += (list.empty() ? "" : ", ") + std::string(program);
  return list;
}

std::string joinArguments(int argc, char **argv) {
  std::string joined;
  for (int i = 1; i < argc; ++i) {
    if (i > 1)
      joined += ' ';
    joined += argv[i];
  }
  return joined;
}

} // namespace kxlsim
