// SPDX-License-Identifier: GPL-2.0-or-later
#include "extract/decoder.h"

#include <iconv.h>

#include <algorithm>
#include <cerrno>
#include <utility>
#include <vector>

#include "base/utf8.h"
#include "extract/charset.h"
#include "extract/nested.h"
#include "extract/read_at.h"

namespace fileindexd {

namespace {

constexpr size_t CHUNK = 64 * 1024;

class Iconv {
 public:
  Iconv() = default;
  Iconv(const Iconv&) = delete;
  Iconv& operator=(const Iconv&) = delete;
  ~Iconv() {
    if (IsOpen()) {
      iconv_close(handle);
    }
  }

  bool Open(const std::string& charset) {
    handle = iconv_open("UTF-8", charset.c_str());
    unit = charset.starts_with("UTF-32") ? 4 : charset.starts_with("UTF-16") ? 2 : 1;
    return IsOpen();
  }
  bool IsOpen() const { return handle != NONE; }

  // A character that the bytes end within waits for the next call. What is wrong becomes a blank.
  std::string Convert(std::string_view bytes) {
    std::string input = pending + std::string(bytes);
    char* from = input.data();
    size_t left = input.size();
    std::string text;
    std::vector<char> made(CHUNK);
    while (left > 0) {
      char* to = made.data();
      size_t room = made.size();
      const size_t result = iconv(handle, &from, &left, &to, &room);
      const int failure = result == static_cast<size_t>(-1) ? errno : 0;
      text.append(made.data(), made.size() - room);
      if (failure == EINVAL) {
        break;
      }
      if (failure == EILSEQ) {
        // A whole unit, or every letter behind it would be another one.
        const size_t wrong = std::min(unit, left);
        text += ' ';
        from += wrong;
        left -= wrong;
      }
    }
    pending.assign(from, left);
    return text;
  }

 private:
  inline static const iconv_t NONE = reinterpret_cast<iconv_t>(-1);  // NOLINT: as iconv has it
  iconv_t handle = NONE;
  size_t unit = 1;  // bytes of the smallest piece of a character
  std::string pending;
};

// One file's way to UTF-8. The charset is settled by the first piece that tells.
class Decoding {
 public:
  // False: what follows is no text. `text` lasts as long as `bytes` do, and until the next call.
  bool Decode(std::string_view bytes, const CharsetFinder& declared, std::string_view& text) {
    if (!held.empty()) {
      joined = std::exchange(held, {}) + std::string(bytes);
      bytes = joined;
    }
    if (is_first) {
      is_first = false;
      const ByteOrderMark mark = FindByteOrderMark(bytes);
      bytes.remove_prefix(mark.length);
      Settle(mark.charset != nullptr ? mark.charset : declared ? declared(bytes) : "");
      const char* wide = mark.charset == nullptr ? WideCharset(bytes) : nullptr;
      if (wide != nullptr) {
        Settle(wide);
      }
    }
    may_shift = may_shift || HasShifts(bytes);
    if (!is_wide && LooksBinary(bytes, may_shift)) {
      return false;
    }
    if (!is_settled) {
      held = UntoldEnd(bytes);
      bytes.remove_suffix(held.size());
    }
    if (!is_settled && !IsAscii(bytes)) {
      SettleBy(bytes);
    } else if (!is_settled && HasShifts(bytes)) {
      Settle(GuessCharset(bytes));
    }
    text = Converted(bytes);
    return true;
  }

  // What waited for another piece.
  std::string_view End() {
    if (held.empty()) {
      return {};
    }
    SettleBy(held);
    return Converted(held);
  }

 private:
  void SettleBy(std::string_view bytes) {
    Settle(UntoldEnd(bytes).empty() && IsMostlyUtf8(bytes) ? "UTF-8" : GuessCharset(bytes));
    Settle("WINDOWS-1252");  // where that is one which the C library does not know
  }

  std::string_view Converted(std::string_view bytes) {
    if (!converter.IsOpen()) {
      return bytes;
    }
    converted = converter.Convert(bytes);
    return converted;
  }

  // An unknown name settles nothing: the bytes will tell.
  void Settle(const std::string& charset) {
    if (charset.empty() || is_settled) {
      return;
    }
    const std::string meant = MeantCharset(charset);
    if (meant.empty()) {
      return;
    }
    is_settled = meant == "UTF-8" || converter.Open(meant);
    is_wide = meant.starts_with("UTF-16") || meant.starts_with("UTF-32");
  }

  Iconv converter;
  std::string held;       // the beginning of a character, before anything told the charset
  std::string joined;     // what was held and the piece behind it
  std::string converted;  // the last piece
  bool is_first = true;
  bool is_settled = false;
  bool is_wide = false;
  bool may_shift = false;
};

}  // namespace

bool IsKnownCharset(const std::string& charset) {
  return Iconv().Open(charset);
}

std::string ToUtf8(std::string_view bytes, const std::string& charset) {
  Iconv converter;
  return converter.Open(charset) ? converter.Convert(bytes) : std::string(bytes);
}

bool DecodeText(const Document& document, const CharsetFinder& declared, const TextTaker& take,
                std::string& why) {
  const Allowance allowance;
  Decoding decoding;
  std::vector<char> chunk(CHUNK);
  // A file may be of any length without a word in it: blanks fill no text.
  for (int64_t at = 0; !allowance.IsSpent();) {
    const size_t length = ReadAt(document, at, chunk.data(), chunk.size());
    if (length == 0 && errno != 0) {
      why = "cannot be read";
      return false;
    }
    if (length == 0) {
      take(decoding.End());
      return true;
    }

    std::string_view text;
    if (!decoding.Decode({chunk.data(), length}, declared, text)) {
      why = "not a text";
      return at > 0;
    }
    if (!take(text)) {
      return true;
    }
    at += static_cast<int64_t>(length);
  }
  return true;
}

}  // namespace fileindexd
