// The simulator's one comparison of names ignoring case, as Windows compares
// them: ASCII letters fold, every other byte must match. Shared by the Win32
// surface and the product library on both targets.
#pragma once

#include <cstddef>
#include <string_view>

namespace kxlsim {

inline bool equalsIgnoringCase(std::string_view a, std::string_view b) {
  if (a.size() != b.size())
    return false;
  for (size_t i = 0; i < a.size(); ++i) {
    unsigned char x = static_cast<unsigned char>(a[i]);
    unsigned char y = static_cast<unsigned char>(b[i]);
    if (x >= 'A' && x <= 'Z')
      x = static_cast<unsigned char>(x - 'A' + 'a');
    if (y >= 'A' && y <= 'Z')
      y = static_cast<unsigned char>(y - 'A' + 'a');
    if (x != y)
      return false;
  }
  return true;
}

} // namespace kxlsim
