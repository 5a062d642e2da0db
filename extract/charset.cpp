// SPDX-License-Identifier: GPL-2.0-or-later
#include "extract/charset.h"

#include <iconv.h>
#include <uchardet/uchardet.h>

#include <algorithm>
#include <memory>
#include <utility>

#include "base/utf8.h"
#include "extract/characters.h"
#include "extract/decoder.h"

namespace fileindexd {

namespace {

// What one byte more or less than usual does not make binary.
constexpr size_t STRAY_CONTROLS = 2;
constexpr size_t TEXT_BYTES_OF_A_CONTROL = 50;

// By chance, two bytes of another charset are a sequence of UTF-8 far less often.
constexpr size_t GOOD_OF_A_BAD = 10;

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

bool IsMostlyUtf8(std::string_view bytes) {
  size_t good = 0;
  size_t bad = 0;
  while (!bytes.empty()) {
    const Utf8Character character = FirstCharacter(bytes);
    if (character.is_cut) {
      break;
    }
    const bool is_bad = character.is_wrong;
    bad += is_bad ? 1 : 0;
    good += !is_bad && character.length > 1 ? 1 : 0;
    bytes.remove_prefix(character.length);
  }
  return bad * GOOD_OF_A_BAD <= good;
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

std::string GuessNamesCharset(std::string_view names) {
  std::string guess = MeantCharset(GuessCharset(names));
  // Short names look like anything: letters of the East come in rows, Cyrillic ones as well, those
  // of the West one at a time.
  const std::string text = ToUtf8(names, guess);
  size_t high = 0;
  size_t in_rows = 0;
  bool was_high = false;
  for (std::string_view rest = text; !rest.empty();) {
    const Utf8Character character = FirstCharacter(rest);
    const bool is_high = character.code >= 0x370;
    high += is_high ? 1 : 0;
    in_rows += is_high && was_high ? 1 : 0;
    was_high = is_high;
    rest.remove_prefix(character.length);
  }
  if (in_rows * 2 >= high && in_rows > 0) {
    return guess;
  }
  // DOS has its letters where others have controls and signs, and lines where they have letters.
  const auto count = [names](unsigned char first, unsigned char last) {
    return std::count_if(names.begin(), names.end(), [first, last](char byte) {
      const auto code = static_cast<unsigned char>(byte);
      return code >= first && code <= last;
    });
  };
  return count(0x80, 0xA5) > count(0xB0, 0xFF) ? "CP437" : "CP1252";
}

std::string MeantCharset(std::string_view label) {
  // As the web's standard for encodings maps its labels; but of ASCII, bytes beyond it tell more.
  constexpr std::pair<std::string_view, const char*> MEANT[] = {
      {"ISO-8859-1", "CP1252"},  {"ISO8859-1", "CP1252"},
      {"ISO_8859-1", "CP1252"},  {"LATIN1", "CP1252"},
      {"L1", "CP1252"},          {"CP819", "CP1252"},
      {"US-ASCII", ""},          {"ASCII", ""},
      {"ANSI_X3.4-1968", ""},    {"ISO-8859-9", "CP1254"},
      {"LATIN5", "CP1254"},      {"ISO-8859-11", "CP874"},
      {"TIS-620", "CP874"},      {"GB2312", "GB18030"},
      {"GB_2312-80", "GB18030"}, {"GBK", "GB18030"},
      {"X-GBK", "GB18030"},      {"EUC-CN", "GB18030"},
      {"CP936", "GB18030"},      {"SHIFT_JIS", "CP932"},
      {"SHIFT-JIS", "CP932"},    {"SJIS", "CP932"},
      {"X-SJIS", "CP932"},       {"MS_KANJI", "CP932"},
      {"EUC-KR", "CP949"},       {"KS_C_5601-1987", "CP949"},
      {"KSC5601", "CP949"},      {"KS_C_5601", "CP949"},
      {"UTF8", "UTF-8"},         {"UNICODE-1-1-UTF-8", "UTF-8"}};
  std::string name;
  for (const char letter : label) {
    name += letter >= 'a' && letter <= 'z' ? static_cast<char>(letter - 'a' + 'A') : letter;
  }
  for (const auto& [known, meant] : MEANT) {
    if (name == known) {
      return meant;
    }
  }
  return name;
}

void KeepCommonCharsets() {
  for (const char* charset :
       {"ISO-8859-1", "ISO-8859-2", "ISO-8859-5",  "ISO-8859-7", "ISO-8859-15", "CP1250", "CP1251",
        "CP1252",     "CP1253",     "CP1254",      "CP437",      "CP850",       "KOI8-R", "CP932",
        "SHIFT_JIS",  "EUC-JP",     "ISO-2022-JP", "GB18030",    "CP874",       "BIG5",   "EUC-KR",
        "CP949",      "UTF-7",      "UTF-16",      "UTF-32"}) {
    (void)iconv_open("UTF-8", charset);  // never closed: the table stays as long as it is open
  }
}

}  // namespace fileindexd
