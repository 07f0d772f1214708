#include "sim/posix/cmdline.h"

namespace kxlsim::posix {

namespace {

bool isBlank(char c) {
  return c == ' ' || c == '\t';
}

} // namespace

std::string programToken(const std::string &commandLine, std::string &rest) {
  size_t start = 0;
  while (start < commandLine.size() && isBlank(commandLine[start]))
    ++start;
  std::string token;
  size_t end = start;
  if (start < commandLine.size() && commandLine[start] == '"') {
    end = commandLine.find('"', start + 1);
    token = commandLine.substr(start + 1, end == std::string::npos ? std::string::npos : end - start - 1);
    end = end == std::string::npos ? commandLine.size() : end + 1;
  } else {
    while (end < commandLine.size() && !isBlank(commandLine[end]))
      ++end;
    token = commandLine.substr(start, end - start);
  }
  rest = commandLine.substr(end);
  return token;
}

std::vector<std::string> splitArguments(const std::string &arguments) {
  std::vector<std::string> result;
  size_t i = 0;
  const size_t n = arguments.size();
  while (true) {
    while (i < n && isBlank(arguments[i]))
      ++i;
    if (i >= n)
      break;
    std::string argument;
    bool quoted = false;
    while (i < n && (quoted || !isBlank(arguments[i]))) {
      size_t slashes = 0;
      while (i < n && arguments[i] == '\\') {
        ++slashes;
        ++i;
      }
      if (i < n && arguments[i] == '"') {
        argument.append(slashes / 2, '\\');
        if (slashes % 2 == 1) {
          argument.push_back('"');
          ++i;
        } else if (quoted && i + 1 < n && arguments[i + 1] == '"') {
          argument.push_back('"');
          i += 2;
        } else {
          quoted = !quoted;
          ++i;
        }
      } else {
        argument.append(slashes, '\\');
        if (i < n && (quoted || !isBlank(arguments[i])))
          argument.push_back(arguments[i++]);
      }
    }
    result.push_back(argument);
  }
  return result;
}

} // namespace kxlsim::posix
