// SPDX-License-Identifier: GPL-2.0-or-later
#include "extract/charset.h"

#include <iconv.h>
#include <uchardet/uchardet.h>

#include <algorithm>
#include <memory>

#include "extract/characters.h"

namespace fileindexd {

namespace {

// What one byte more or less than usual does not make binary.
constexpr size_t STRAY_CONTROLS = 2;
constexpr size_t TEXT_BYTES_OF_A_CONTROL = 50;

constexpr const char* LIKELIEST = "WINDOWS-1252";

// Controls of text, of old printers and of terminals: backspace to carriage return, escape.
bool IsForeign(char byte) {
  const auto code = static_cast<unsigned char>(byte);
  return (code < 0x20 && !(code >= 0x08 && code <= 0x0D) && code != 0x1B) || code == 0x7F;
}

}  // namespace

ByteOrderMark FindByteOrderMark(std::string_view bytes) {
  using std::string_view_literals::operator""sv;
  // UTF-32 before UTF-16: its mark begins like the other's.
  if (bytes.starts_with("\xFF\xFE\0\0"sv)) {
    return {"UTF-32LE", 4};
  }
  if (bytes.starts_with("\0\0\xFE\xFF"sv)) {
    return {"UTF-32BE", 4};
  }
  if (bytes.starts_with("\xEF\xBB\xBF"sv)) {
    return {"UTF-8", 3};
  }
  if (bytes.starts_with("\xFF\xFE"sv)) {
    return {"UTF-16LE", 2};
  }
  if (bytes.starts_with("\xFE\xFF"sv)) {
    return {"UTF-16BE", 2};
  }
  return {};
}

bool LooksBinary(std::string_view bytes) {
  const auto foreign = static_cast<size_t>(std::count_if(bytes.begin(), bytes.end(), IsForeign));
  return foreign > STRAY_CONTROLS + bytes.size() / TEXT_BYTES_OF_A_CONTROL;
}

const char* WideCharset(std::string_view bytes) {
  size_t zeros[2] = {0, 0};
  for (size_t at = 0; at < bytes.size(); ++at) {
    zeros[at % 2] += bytes[at] == '\0' ? 1 : 0;
  }

  const size_t most = bytes.size() / 2;
  const auto is_wide = [most](size_t high, size_t low) {
    return most > 0 && high * 2 > most && low * 20 < most;
  };
  if (is_wide(zeros[1], zeros[0])) {
    return "UTF-16LE";
  }
  return is_wide(zeros[0], zeros[1]) ? "UTF-16BE" : nullptr;
}

bool IsAscii(std::string_view bytes) {
  return std::all_of(bytes.begin(), bytes.end(),
                     [](char byte) { return static_cast<unsigned char>(byte) < 0x80; });
}

bool HasShifts(std::string_view bytes) {
  return bytes.find("\x1B$") != std::string_view::npos;
}

bool CouldBeUtf8(std::string_view bytes) {
  while (!bytes.empty()) {
    const Character character = FirstCharacter(bytes);
    if (character.code == 0 && bytes[0] != '\0') {
      return character.is_cut;
    }
    bytes.remove_prefix(character.length);
  }
  return true;
}

std::string GuessCharset(std::string_view bytes) {
  const std::unique_ptr<uchardet, decltype(&uchardet_delete)> detector(uchardet_new(),
                                                                       &uchardet_delete);
  if (uchardet_handle_data(detector.get(), bytes.data(), bytes.size()) != 0) {
    return LIKELIEST;
  }
  uchardet_data_end(detector.get());
  const std::string found = uchardet_get_charset(detector.get());
  return found.empty() || found == "ASCII" || found == "UTF-8" ? LIKELIEST : found;
}

void KeepCommonCharsets() {
  for (const char* charset :
       {"ISO-8859-1", "ISO-8859-2", "ISO-8859-5", "ISO-8859-7", "ISO-8859-15", "CP1250",
        "CP1251",     "CP1252",     "CP1253",     "CP1254",     "CP437",       "CP850",
        "KOI8-R",     "CP932",      "SHIFT_JIS",  "EUC-JP",     "ISO-2022-JP", "GB18030",
        "BIG5",       "EUC-KR",     "CP949",      "UTF-7",      "UTF-16",      "UTF-32"}) {
    (void)iconv_open("UTF-8", charset);  // never closed: the table stays as long as it is open
  }
}

}  // namespace fileindexd
