// Code-page conversion. The ANSI code page of the simulated machine is
// Latin-1: each byte is the UTF-16 unit of the same value, so any byte string
// survives a round trip. CP_UTF8 is real UTF-8.
#include "platform/win32.h"
#include "sim/common/simfail.h"
#include "sim/posix/win32util.h"

#include <cstring>
#include <string>

using namespace kxlsim::posix;

namespace {

constexpr UINT kCodePageOem = 1;
constexpr UINT kCodePageWindows1252 = 1252;
constexpr UINT kCodePageLatin1 = 28591;
constexpr DWORD kMbErrInvalidChars = 0x00000008;
constexpr DWORD kErrorNoUnicodeTranslation = 1113;
constexpr char16_t kReplacement = 0xFFFD;

bool isSingleByteCodePage(UINT codePage) {
  return codePage == CP_ACP || codePage == kCodePageOem || codePage == kCodePageWindows1252 ||
         codePage == kCodePageLatin1;
}

size_t wideLength(LPCWSTR text) {
  size_t length = 0;
  while (text[length] != 0)
    ++length;
  return length;
}

// Decodes one UTF-8 sequence at `in`; false for a malformed one (one byte is
// then consumed).
bool decodeUtf8(const unsigned char *in, size_t available, char32_t &point, size_t &used) {
  unsigned char lead = in[0];
  size_t length = lead < 0x80           ? 1
                  : (lead >> 5) == 0x6  ? 2
                  : (lead >> 4) == 0xE  ? 3
                  : (lead >> 3) == 0x1E ? 4
                                        : 0;
  used = 1;
  if (length == 0 || length > available)
    return false;
  point = length == 1 ? lead : lead & (0x7F >> length);
  for (size_t i = 1; i < length; ++i) {
    if ((in[i] & 0xC0) != 0x80)
      return false;
    point = (point << 6) | (in[i] & 0x3F);
  }
  static const char32_t smallest[] = {0, 0, 0x80, 0x800, 0x10000};
  if (point < smallest[length] || point > 0x10FFFF || (point >= 0xD800 && point <= 0xDFFF))
    return false;
  used = length;
  return true;
}

bool utf8ToUtf16(const unsigned char *in, size_t length, bool strict, std::u16string &out) {
  for (size_t i = 0; i < length;) {
    char32_t point = 0;
    size_t used = 0;
    if (!decodeUtf8(in + i, length - i, point, used)) {
      if (strict)
        return false;
      point = kReplacement;
    }
    i += used;
    if (point >= 0x10000) {
      out.push_back(static_cast<char16_t>(0xD800 + ((point - 0x10000) >> 10)));
      out.push_back(static_cast<char16_t>(0xDC00 + ((point - 0x10000) & 0x3FF)));
    } else {
      out.push_back(static_cast<char16_t>(point));
    }
  }
  return true;
}

void appendUtf8(char32_t point, std::string &out) {
  if (point < 0x80) {
    out.push_back(static_cast<char>(point));
  } else if (point < 0x800) {
    out.push_back(static_cast<char>(0xC0 | (point >> 6)));
    out.push_back(static_cast<char>(0x80 | (point & 0x3F)));
  } else if (point < 0x10000) {
    out.push_back(static_cast<char>(0xE0 | (point >> 12)));
    out.push_back(static_cast<char>(0x80 | ((point >> 6) & 0x3F)));
    out.push_back(static_cast<char>(0x80 | (point & 0x3F)));
  } else {
    out.push_back(static_cast<char>(0xF0 | (point >> 18)));
    out.push_back(static_cast<char>(0x80 | ((point >> 12) & 0x3F)));
    out.push_back(static_cast<char>(0x80 | ((point >> 6) & 0x3F)));
    out.push_back(static_cast<char>(0x80 | (point & 0x3F)));
  }
}

std::string utf16ToUtf8(LPCWSTR in, size_t length) {
  std::string out;
  for (size_t i = 0; i < length; ++i) {
    char32_t unit = in[i];
    bool high = unit >= 0xD800 && unit <= 0xDBFF;
    if (high && i + 1 < length && in[i + 1] >= 0xDC00 && in[i + 1] <= 0xDFFF) {
      appendUtf8(0x10000 + ((unit - 0xD800) << 10) + (in[++i] - 0xDC00), out);
    } else {
      appendUtf8(unit >= 0xD800 && unit <= 0xDFFF ? kReplacement : unit, out);
    }
  }
  return out;
}

std::string utf16ToSingleByte(LPCWSTR in, size_t length, char defaultChar, bool &usedDefault) {
  std::string out;
  for (size_t i = 0; i < length; ++i) {
    bool fits = in[i] <= 0xFF;
    usedDefault = usedDefault || !fits;
    out.push_back(fits ? static_cast<char>(in[i]) : defaultChar);
  }
  return out;
}

// Copies a converted result by Windows' rules: a zero capacity asks for the
// size; a result that does not fit fails with ERROR_INSUFFICIENT_BUFFER.
template <typename Char> int deliver(const std::basic_string<Char> &result, Char *out, int capacity) {
  if (capacity == 0)
    return static_cast<int>(result.size());
  if (static_cast<size_t>(capacity) < result.size())
    return failWith(ERROR_INSUFFICIENT_BUFFER, 0);
  std::memcpy(out, result.data(), result.size() * sizeof(Char));
  return static_cast<int>(result.size());
}

} // namespace

extern "C" {

int MultiByteToWideChar(UINT CodePage, DWORD dwFlags, LPCSTR lpMultiByteStr, int cbMultiByte,
                        LPWSTR lpWideCharStr, int cchWideChar) {
  if (kxlsim::shouldFail("MultiByteToWideChar"))
    return failWith(ERROR_INVALID_PARAMETER, 0);
  if (lpMultiByteStr == nullptr || cbMultiByte == 0 || cbMultiByte < -1 || cchWideChar < 0 ||
      (cchWideChar > 0 && lpWideCharStr == nullptr))
    return failWith(ERROR_INVALID_PARAMETER, 0);
  size_t length = cbMultiByte == -1 ? std::strlen(lpMultiByteStr) + 1 : static_cast<size_t>(cbMultiByte);
  const auto *bytes = reinterpret_cast<const unsigned char *>(lpMultiByteStr);
  std::u16string result;
  if (isSingleByteCodePage(CodePage)) {
    result.assign(bytes, bytes + length);
  } else if (CodePage == CP_UTF8) {
    if (!utf8ToUtf16(bytes, length, (dwFlags & kMbErrInvalidChars) != 0, result))
      return failWith(kErrorNoUnicodeTranslation, 0);
  } else {
    return failWith(ERROR_INVALID_PARAMETER, 0);
  }
  return deliver(result, lpWideCharStr, cchWideChar);
}

int WideCharToMultiByte(UINT CodePage, DWORD, LPCWSTR lpWideCharStr, int cchWideChar, LPSTR lpMultiByteStr,
                        int cbMultiByte, LPCSTR lpDefaultChar, LPBOOL lpUsedDefaultChar) {
  if (kxlsim::shouldFail("WideCharToMultiByte"))
    return failWith(ERROR_INVALID_PARAMETER, 0);
  if (lpWideCharStr == nullptr || cchWideChar == 0 || cchWideChar < -1 || cbMultiByte < 0 ||
      (cbMultiByte > 0 && lpMultiByteStr == nullptr))
    return failWith(ERROR_INVALID_PARAMETER, 0);
  size_t length = cchWideChar == -1 ? wideLength(lpWideCharStr) + 1 : static_cast<size_t>(cchWideChar);
  std::string result;
  if (isSingleByteCodePage(CodePage)) {
    bool usedDefault = false;
    result = utf16ToSingleByte(lpWideCharStr, length, lpDefaultChar != nullptr ? *lpDefaultChar : '?',
                               usedDefault);
    if (lpUsedDefaultChar != nullptr)
      *lpUsedDefaultChar = usedDefault ? TRUE : FALSE;
  } else if (CodePage == CP_UTF8) {
    if (lpDefaultChar != nullptr || lpUsedDefaultChar != nullptr)
      return failWith(ERROR_INVALID_PARAMETER, 0);
    result = utf16ToUtf8(lpWideCharStr, length);
  } else {
    return failWith(ERROR_INVALID_PARAMETER, 0);
  }
  return deliver(result, lpMultiByteStr, cbMultiByte);
}

} // extern "C"
