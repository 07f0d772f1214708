// Helpers shared by the installation registry classes: bounded text, registry
// reads that always close their key, and the kxlsystm snapshot.
#pragma once

#include "install/ilist.h"
#include "platform/win32.h"

#include <cstddef>
#include <cstdint>

// Room for a directory of up to 260 characters and a file name joined to it.
inline constexpr size_t KXLI_PATH_BUFFER_SZ = 272;

// Copies a NUL-terminated field out: 0, KXLI_RC_NULL_ARGUMENT for a null
// buffer, KXLI_RC_BUFFER_TOO_SMALL when size < length + 1 (buffer untouched).
uint32_t kxliGetString(const char *field, char *buffer, uint32_t size);

// Copies text into a field, cut to the field; null counts as "".
void kxliSetString(char *field, size_t fieldSize, const char *text);

// Reads a string value of root\key opened with `access` into buffer (always
// terminated; a value that does not fit fails with ERROR_MORE_DATA). The key is
// closed on every path. Returns the Windows code.
LONG kxliReadRegString(HKEY root, const char *key, REGSAM access, const char *valueName, char *buffer,
                       DWORD size);

// Reads a string value of an open key the same way.
LONG kxliQueryString(HKEY key, const char *valueName, char *buffer, DWORD size);

// A key, value or file that is not there, as against one that could not be
// read (which is never taken for a missing one).
inline bool kxliIsMissing(LONG rc) {
  return rc == ERROR_FILE_NOT_FOUND || rc == ERROR_PATH_NOT_FOUND;
}

// Whether root\key opens with `access`.
bool kxliKeyOpens(HKEY root, const char *key, REGSAM access);

// Appends a copy of every value name of root\key (names up to 254 characters)
// to names; stops at the first result other than success. A key that does not
// open adds nothing.
void kxliReadValueNames(HKEY root, const char *key, REGSAM access, ILIST<char> &names);

// Reads up to `size` bytes of `directory`\kxlsystm, opened for binary update,
// into image (cleared first). False when the file cannot be opened; image is
// then untouched.
bool kxliReadDbmCfg(const char *directory, unsigned char *image, uint32_t size);
