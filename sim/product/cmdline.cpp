#include "sim/product/cmdline.h"

#include <cstring>

namespace kxlprod {
namespace {

bool needsQuotes(std::string_view argument) {
  return argument.empty() || argument.find_first_of(" \t\n\v\"") != std::string_view::npos;
}

bool isPreQuoted(std::string_view argument) {
  return argument.size() >= 2 && argument.front() == '"' && argument.back() == '"' &&
         argument.substr(1, argument.size() - 2).find('"') == std::string_view::npos;
}

// Writes `text` inside double quotes; backslashes are doubled where they
// stand before a quote (one of the text's or the closing one).
void appendQuoted(std::string &line, std::string_view text) {
  line += '"';
  std::size_t backslashes = 0;
  for (char c : text) {
    if (c == '\\') {
      ++backslashes;
      continue;
    }
    if (c == '"') {
      line.append(backslashes * 2 + 1, '\\');
    } else {
      line.append(backslashes, '\\');
    }
    backslashes = 0;
    line += c;
  }
  line.append(backslashes * 2, '\\');
  line += '"';
}

} // namespace

void appendArgument(std::string &line, std::string_view argument) {
  if (!line.empty())
    line += ' ';
  if (isPreQuoted(argument)) {
    appendQuoted(line, argument.substr(1, argument.size() - 2));
  } else if (needsQuotes(argument)) {
    appendQuoted(line, argument);
  } else {
    line.append(argument);
  }
}

bool commandLineFromBlock(const char *block, std::string &line) {
  line.clear();
  std::size_t offset = 0;
  while (offset < kMaxCommandLine) {
    const char *argument = block + offset;
    std::size_t length = strnlen(argument, kMaxCommandLine - offset);
    if (length == 0)
      return true;
    appendArgument(line, std::string_view(argument, length));
    if (line.size() > kMaxCommandLine)
      return false;
    offset += length + 1;
  }
  return false;
}

void splitCommandText(std::string_view text, std::string &program, std::string &rest) {
  std::size_t at = text.find_first_not_of(" \t");
  if (at == std::string_view::npos)
    at = text.size();
  std::size_t end;
  if (at < text.size() && text[at] == '"') {
    end = text.find('"', at + 1);
    if (end == std::string_view::npos)
      end = text.size();
    program.assign(text.substr(at + 1, end - at - 1));
    if (end < text.size())
      ++end;
  } else {
    end = text.find_first_of(" \t", at);
    if (end == std::string_view::npos)
      end = text.size();
    program.assign(text.substr(at, end - at));
  }
  std::size_t restAt = text.find_first_not_of(" \t", end);
  rest.assign(restAt == std::string_view::npos ? std::string_view() : text.substr(restAt));
}

} // namespace kxlprod
