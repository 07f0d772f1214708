#include "engn/sqo/boundedtext.h"

#include <cstring>

void copyTextCut(char *target, std::size_t size, const char *source, std::size_t count) {
  if (target == nullptr || size == 0)
    return;
  std::size_t length = source != nullptr ? strnlen(source, count) : 0;
  if (length > size - 1)
    length = size - 1;
  if (length > 0)
    std::memmove(target, source, length);
  target[length] = '\0';
}

void copyText(char *target, std::size_t size, const char *source) {
  copyTextCut(target, size, source, size);
}

TextBuilder::TextBuilder(char *buffer, std::size_t size) : buffer_(buffer), size_(size) {
  if (size_ > 0)
    buffer_[0] = '\0';
}

void TextBuilder::append(const char *text, std::size_t length) {
  if (text == nullptr)
    return;
  std::size_t room = size_ > 0 ? size_ - 1 - used_ : 0;
  if (length > room) {
    whole_ = false;
    length = room;
  }
  if (size_ == 0)
    return;
  std::memcpy(buffer_ + used_, text, length);
  used_ += length;
  buffer_[used_] = '\0';
}

void TextBuilder::append(const char *text) {
  if (text != nullptr)
    append(text, std::strlen(text));
}

void TextBuilder::append(char c) {
  append(&c, 1);
}
