// The product tables: one for current-release copies, one for the version-8
// installation. Rows are in table order; the current-release table lists the
// largest edition first.
#pragma once

#include <cstddef>
#include <cstdint>

struct KxliProductRow {
  const char *key;
  const char *code; // stem of the level marker, lookup key of the row
  const char *productCode;
  const char *displayName; // also the product's registry subkey under the copy
  uint32_t productBit;
  const char *editionName;
  uint32_t category;
  int32_t supportedNodeType; // -1: none (version-8 rows: not carried, 0)
  uint8_t flag;
  uint32_t rankNumber; // current-release rows: the row's number from 1
  uint32_t productMask;
  const char *packageFile; // version-8 rows: null, formed from the display name
  // Current-release rows only; "" where a package has no such code.
  const char *productCode32;
  const char *secondCode;
  const char *secondCode32;
  const char *thirdCode;
  const char *thirdCode32;
};

struct KxliProductTable {
  const KxliProductRow *rows;
  size_t count;
};

KxliProductTable kxliProductTable(bool v8);

// The row whose code equals `code` ignoring case, or null.
const KxliProductRow *kxliFindProductRow(const char *code, bool v8);

// `code` (a braced product code of five groups) with its fourth group raised
// by k, kept to four upper-case hexadecimal digits. False when the code does
// not have that form or the result does not fit in size bytes.
bool kxliDerivedCode(const char *code, uint32_t k, char *out, size_t size);
