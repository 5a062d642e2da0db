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

// Controls that no text has, more than a stray few. With `may_shift`, a text of a charset that
// shifts out and in.
bool LooksBinary(std::string_view bytes, bool may_shift);
// UTF-16 and UTF-32 of either order where every second byte is mostly nothing, or where the bytes
// are letters of one alphabet that way; else null.
const char* WideCharset(std::string_view bytes);

bool IsAscii(std::string_view bytes);
// Sequences that change the meaning of the seven-bit bytes behind them.
bool HasShifts(std::string_view bytes);
// Nearly all characters beyond ASCII are sequences of UTF-8: a bad byte among many good ones does
// not make it another charset. The last character may be cut.
bool IsMostlyUtf8(std::string_view bytes);
// The last bytes, where they are the only ones beyond ASCII and may begin a character of UTF-8:
// what comes behind them tells. Else empty.
std::string_view UntoldEnd(std::string_view bytes);
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
