// Code-page conversion. The ANSI code page of the simulated machine is
// Latin-1: each byte is the UTF-16 unit of the same value, so any byte string
// survives a round trip. Other code pages are refused.
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

int MultiByteToWideChar(UINT CodePage, DWORD, LPCSTR lpMultiByteStr, int cbMultiByte,
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
  } else {
    return failWith(ERROR_INVALID_PARAMETER, 0);
  }
  return deliver(result, lpMultiByteStr, cbMultiByte);
}

} // extern "C"
