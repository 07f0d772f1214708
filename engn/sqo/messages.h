// The messages the command prints at the end of a run: texts of the product's
// message catalogs, or fixed fallback lines when a text cannot be had.
#pragma once

#include "upgrade/records.h"

#include <cstddef>

// Message |code| of "kxlinst.mo" with its code-specific placeholders filled and
// the record's tokens spliced in; "<prefix>:<text>, RC = <code>" when the
// catalog has no text. `options` may be null.
void printInstanceMessage(const char *prefix, int code, const char *text, const UpgradeOptions *options);

// The "kxlsql.mo" text for the block's SQLCODE, or
// "<prefix>:<text>, SQLCODE=<code>".
void printSqlcaMessage(const char *prefix, const sqlca *status, const char *text);

// Message |code| of "kxlclp.mo" with the prefix as its one token, or
// "<prefix>: processing completed successfully.".
void printSuccessMessage(const char *prefix, int code);

// Replaces the first quoted placeholder ("<...>", quotes included) of
// `message` (capacity `size`) with `value`, provided `placeholder` occurs in
// it, ignoring case. Placeholders are therefore replaced in text order.
void replaceMessageToken(char *message, std::size_t size, const char *placeholder, const char *value);

// `message` with each of the record's tokens, in double quotes, where the
// next quoted placeholder ("<name>") stands, wherever that is in the text;
// the rest of the text stays as written. Tokens beyond the placeholders have
// no place and are left out. The result is cut to `size` - 1 characters.
void spliceRecordTokens(const char *message, const UpgradeOptions &options, char *out, std::size_t size);

// The display word of a node type in message 1231; "" for an unknown type.
const char *instanceTypeWord(uint32_t nodeType);
