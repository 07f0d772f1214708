#include "sim/product/mocatalog.h"

#include "platform/win32.h"

#include <cstring>
#include <utility>

namespace kxlprod {
namespace {

constexpr std::uint32_t kMagic = 0x950412DEu;
constexpr std::uint32_t kMagicSwapped = 0xDE120495u;
constexpr std::size_t kHeaderBytes = 28;
constexpr std::size_t kEntryBytes = 8;

bool isNameChar(char c) {
  return (c >= 'A' && c <= 'Z') || (c >= 'a' && c <= 'z') || (c >= '0' && c <= '9') || c == '-' || c == '_';
}

// Length of a placeholder "<name>" starting at text[at], 0 when there is none.
std::size_t placeholderLength(std::string_view text, std::size_t at) {
  if (text[at] != '<')
    return 0;
  std::size_t end = at + 1;
  while (end < text.size() && isNameChar(text[end]))
    ++end;
  if (end == at + 1 || end >= text.size() || text[end] != '>')
    return 0;
  return end - at + 1;
}

// Appends a piece to a bounded output; `used` never passes size - 1.
void appendBounded(char *out, std::size_t size, std::size_t &used, std::string_view piece) {
  std::size_t room = size - 1 - used;
  std::size_t n = piece.size() < room ? piece.size() : room;
  std::memcpy(out + used, piece.data(), n);
  used += n;
}

} // namespace

bool MoCatalog::readWord(std::size_t offset, std::uint32_t &value) const {
  if (offset > image_.size() || image_.size() - offset < 4)
    return false;
  const unsigned char *p = image_.data() + offset;
  if (bigEndian_) {
    value = (std::uint32_t(p[0]) << 24) | (std::uint32_t(p[1]) << 16) | (std::uint32_t(p[2]) << 8) | p[3];
  } else {
    value = (std::uint32_t(p[3]) << 24) | (std::uint32_t(p[2]) << 16) | (std::uint32_t(p[1]) << 8) | p[0];
  }
  return true;
}

bool MoCatalog::load(std::vector<unsigned char> bytes) {
  image_ = std::move(bytes);
  count_ = 0;
  bigEndian_ = false;
  std::uint32_t magic = 0, revision = 0, count = 0, originals = 0, translations = 0;
  bool ok = image_.size() >= kHeaderBytes && readWord(0, magic);
  if (ok && magic == kMagicSwapped) {
    bigEndian_ = true;
    readWord(0, magic);
  }
  ok = ok && magic == kMagic && readWord(4, revision) && readWord(8, count) && readWord(12, originals) &&
       readWord(16, translations);
  // Major revisions 0 and 1 share the tables read here.
  ok = ok && (revision >> 16) <= 1;
  std::uint64_t tableBytes = std::uint64_t(count) * kEntryBytes;
  ok = ok && originals <= image_.size() && tableBytes <= image_.size() - originals &&
       translations <= image_.size() && tableBytes <= image_.size() - translations;
  if (!ok) {
    image_.clear();
    return false;
  }
  count_ = count;
  originals_ = originals;
  translations_ = translations;
  return true;
}

bool MoCatalog::stringAt(std::size_t tableOffset, std::size_t index, std::string_view &text) const {
  std::uint32_t length = 0, offset = 0;
  std::size_t entry = tableOffset + index * kEntryBytes;
  if (!readWord(entry, length) || !readWord(entry + 4, offset))
    return false;
  if (offset > image_.size() || length > image_.size() - offset)
    return false;
  text = std::string_view(reinterpret_cast<const char *>(image_.data()) + offset, length);
  // A plural entry holds its forms separated by NUL; the first one counts.
  std::size_t nul = text.find('\0');
  if (nul != std::string_view::npos)
    text = text.substr(0, nul);
  return true;
}

bool MoCatalog::find(std::string_view key, std::string_view &text) const {
  // A linear walk: catalogs are small, and it does not depend on the table
  // being sorted as a binary search would.
  for (std::size_t i = 0; i < count_; ++i) {
    std::string_view original;
    if (!stringAt(originals_, i, original) || original != key)
      continue;
    return stringAt(translations_, i, text);
  }
  return false;
}

bool loadCatalogFile(const char *windowsPath, MoCatalog &catalog) {
  HANDLE file = CreateFileA(windowsPath, GENERIC_READ, FILE_SHARE_READ, nullptr, OPEN_EXISTING,
                            FILE_ATTRIBUTE_NORMAL, nullptr);
  if (file == INVALID_HANDLE_VALUE)
    return false;
  DWORD high = 0;
  DWORD low = GetFileSize(file, &high);
  bool ok = low != INVALID_FILE_SIZE && high == 0 && low <= kMaxCatalogBytes;
  std::vector<unsigned char> bytes;
  if (ok) {
    bytes.resize(low);
    DWORD got = 0;
    ok = low == 0 || (ReadFile(file, bytes.data(), low, &got, nullptr) && got == low);
  }
  CloseHandle(file);
  return ok && catalog.load(std::move(bytes));
}

std::size_t countPlaceholders(std::string_view text) {
  std::size_t count = 0;
  for (std::size_t at = 0; at < text.size(); ++at) {
    std::size_t length = placeholderLength(text, at);
    if (length == 0)
      continue;
    ++count;
    at += length - 1;
  }
  return count;
}

std::size_t fillPlaceholders(std::string_view text, const std::vector<std::string_view> &tokens, char *out,
                             std::size_t size) {
  if (out == nullptr || size == 0)
    return 0;
  std::size_t used = 0, next = 0, start = 0;
  for (std::size_t at = 0; at < text.size() && next < tokens.size(); ++at) {
    std::size_t length = placeholderLength(text, at);
    if (length == 0)
      continue;
    appendBounded(out, size, used, text.substr(start, at - start));
    appendBounded(out, size, used, tokens[next++]);
    start = at + length;
    at = start - 1;
  }
  appendBounded(out, size, used, text.substr(start));
  if (text.empty() || text.back() != '\n')
    appendBounded(out, size, used, "\n");
  out[used] = '\0';
  return used;
}

} // namespace kxlprod
