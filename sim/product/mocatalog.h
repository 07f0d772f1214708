// Reading compiled message catalogs (the GNU MO format) and filling their
// placeholders. Internal to the product library; the tests use it directly.
#pragma once

#include <cstddef>
#include <cstdint>
#include <string_view>
#include <vector>

namespace kxlprod {

// One MO image held in memory. Every offset read from the image is checked
// against its size, so a truncated or corrupt file is refused or yields no
// text, never a read outside the image.
class MoCatalog {
public:
  // Takes the file's bytes. Returns false (and keeps nothing) when the header
  // is not that of an MO file of either byte order or its tables do not fit.
  bool load(std::vector<unsigned char> bytes);

  // The translation of `key`, or false when the catalog lacks it. For a plural
  // entry the first form is given. The view lives as long as the catalog.
  bool find(std::string_view key, std::string_view &text) const;

  std::size_t size() const { return count_; }

private:
  bool readWord(std::size_t offset, std::uint32_t &value) const;
  bool stringAt(std::size_t tableOffset, std::size_t index, std::string_view &text) const;

  std::vector<unsigned char> image_;
  bool bigEndian_ = false;
  std::size_t count_ = 0;
  std::size_t originals_ = 0;
  std::size_t translations_ = 0;
};

// Largest catalog file the library reads.
constexpr std::size_t kMaxCatalogBytes = 4u * 1024u * 1024u;

// Reads a catalog file given by its Windows path into `catalog`.
bool loadCatalogFile(const char *windowsPath, MoCatalog &catalog);

// Number of placeholders "<name>" (letters, digits, '-', '_') in the text.
std::size_t countPlaceholders(std::string_view text);

// Copies `text` into out (capacity `size`) with the n-th placeholder
// "<name>" (letters, digits, '-', '_') replaced by tokens[n]; characters around
// a placeholder stay. Placeholders beyond the tokens stay as written. The text
// always ends with one line feed (added when missing). The output is cut at
// size - 1 characters and terminated. Returns the length written.
std::size_t fillPlaceholders(std::string_view text, const std::vector<std::string_view> &tokens, char *out,
                             std::size_t size);

} // namespace kxlprod
