// SPDX-License-Identifier: GPL-2.0-or-later
// Guessing the charset of bytes.
#pragma once

#include <string>
#include <string_view>

namespace fileindexd {

struct ByteOrderMark {
  const char* charset = nullptr;  // null: none
  size_t length = 0;
};
ByteOrderMark FindByteOrderMark(std::string_view bytes);

// Controls that no text has, more than a stray few.
bool LooksBinary(std::string_view bytes);
// "UTF-16LE", "UTF-16BE" where every second byte is mostly nothing; else null.
const char* WideCharset(std::string_view bytes);

bool IsAscii(std::string_view bytes);
// Sequences that change the meaning of the seven-bit bytes behind them.
bool HasShifts(std::string_view bytes);
// Nearly all characters beyond ASCII are sequences of UTF-8: a bad byte among many good ones does
// not make it another charset. The last character may be cut.
bool IsMostlyUtf8(std::string_view bytes);
// Of bytes that are no UTF-8; never empty.
std::string GuessCharset(std::string_view bytes);
// What texts under a charset's name are really written in: often a larger one, and readers of mail
// and pages have always taken it for that. In upper case; empty for ASCII,
// which tells nothing of bytes beyond it.
std::string MeantCharset(std::string_view label);

// Of names of files that are no UTF-8, put one after the other: those of an archive that does not
// tell. Never empty.
std::string GuessNamesCharset(std::string_view names);

// Has the C library hold its tables of the charsets in common use, for when it can open no file any
// more.
void KeepCommonCharsets();

}  // namespace fileindexd
