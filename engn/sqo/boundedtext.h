// Bounded text helpers of the front end: every copy and append is limited by
// the capacity of its destination and always leaves it terminated.
#pragma once

#include <cstddef>

// Copies at most `count` characters of `source` (fewer when it ends sooner)
// into `target` of `size` bytes, cut to size - 1 and terminated.
void copyTextCut(char *target, std::size_t size, const char *source, std::size_t count);

// Copies `source` whole into `target`, cut to size - 1 and terminated.
void copyText(char *target, std::size_t size, const char *source);

// A text being built in a caller's buffer; characters beyond the capacity are
// dropped, the buffer is always terminated.
class TextBuilder {
public:
  TextBuilder(char *buffer, std::size_t size);
  void append(const char *text, std::size_t length);
  void append(const char *text);
  void append(char c);
  const char *text() const { return buffer_; }
  std::size_t length() const { return used_; }
  // False once any character had to be dropped.
  bool whole() const { return whole_; }

private:
  char *buffer_;
  std::size_t size_;
  std::size_t used_ = 0;
  bool whole_ = true;
};
