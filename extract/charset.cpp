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

// What a guess at a charset of the East or of a rare one has to rest on.
constexpr size_t FEW_ACCENTS = 3;
constexpr size_t LETTERS_OF_AN_ACCENT = 100;

// Controls of text, of old printers and of terminals: backspace to carriage return, escape.
bool IsForeign(char byte) {
  const auto code = static_cast<unsigned char>(byte);
  return (code < 0x20 && !(code >= 0x08 && code <= 0x0D) && code != 0x1B) || code == 0x7F;
}

// Alphabets of which a text mostly has one beside ASCII.
enum class Block { NONE, CONTROL, ASCII, SIGN, GREEK, CYRILLIC, HEBREW, ARABIC, EAST, COUNT };

Block BlockOf(char32_t code) {
  constexpr struct {
    char32_t first;
    char32_t last;
    Block block;
  } BLOCKS[] = {{'\t', '\r', Block::ASCII},      {0, 0x1F, Block::CONTROL},
                {0x20, 0x7E, Block::ASCII},      {0x7F, 0x9F, Block::CONTROL},
                {0xA0, 0x17F, Block::SIGN},      {0x2010, 0x2122, Block::SIGN},
                {0x370, 0x3FF, Block::GREEK},    {0x1F00, 0x1FFF, Block::GREEK},
                {0x400, 0x52F, Block::CYRILLIC}, {0x590, 0x5FF, Block::HEBREW},
                {0x600, 0x6FF, Block::ARABIC},   {0x3000, 0x30FF, Block::EAST},
                {0x4E00, 0x9FFF, Block::EAST},   {0xAC00, 0xD7A3, Block::EAST},
                {0xFF00, 0xFFEF, Block::EAST}};
  for (const auto& [first, last, block] : BLOCKS) {
    if (code >= first && code <= last) {
      return block;
    }
  }
  return Block::NONE;
}

struct WideForm {
  const char* charset;
  size_t unit;
  bool is_little;
};

// Two letters each of a text with a stray zero would be Chinese.
bool IsPlainText(std::string_view bytes) {
  const auto plain = std::count_if(bytes.begin(), bytes.end(),
                                   [](char byte) { return byte >= 0x20 && byte < 0x7F; });
  return static_cast<size_t>(plain) * 4 > bytes.size() * 3;
}

// Read that way, it is ASCII and letters of one alphabet: blanks or ends of lines are in all texts.
bool IsTextOf(const WideForm& form, std::string_view bytes) {
  constexpr size_t LEAST = 8;  // of two bytes each, fewer tell nothing
  constexpr size_t UNITS_OF_A_STRANGER = 20;
  size_t counts[static_cast<size_t>(Block::COUNT)] = {};
  const size_t units = bytes.size() / form.unit;
  for (size_t at = 0; at < units; ++at) {
    char32_t code = 0;
    for (size_t byte = 0; byte < form.unit; ++byte) {
      const size_t place = form.is_little ? form.unit - 1 - byte : byte;
      code = code << 8 | static_cast<unsigned char>(bytes[at * form.unit + place]);
    }
    const Block block = BlockOf(code);
    if (block == Block::CONTROL || code > 0x10FFFF) {
      return false;
    }
    ++counts[static_cast<size_t>(block)];
  }
  const auto count = [&counts](Block block) { return counts[static_cast<size_t>(block)]; };
  const size_t most = *std::max_element(counts + static_cast<size_t>(Block::GREEK),
                                        counts + static_cast<size_t>(Block::COUNT));
  const size_t known = count(Block::ASCII) + count(Block::SIGN) + most;
  return units >= (form.unit == 2 ? LEAST : 2) && count(Block::ASCII) > 0 &&
         (form.unit == 4 || most > 0) && (units - known) * UNITS_OF_A_STRANGER <= units;
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

bool LooksBinary(std::string_view bytes, bool may_shift) {
  const auto foreign =
      static_cast<size_t>(std::count_if(bytes.begin(), bytes.end(), [may_shift](char byte) {
        return IsForeign(byte) && !(may_shift && (byte == '\x0E' || byte == '\x0F'));
      }));
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
  if (is_wide(zeros[0], zeros[1])) {
    return "UTF-16BE";
  }
  if (zeros[0] + zeros[1] == 0 || IsPlainText(bytes)) {
    return nullptr;
  }
  constexpr WideForm FORMS[] = {
      {"UTF-32LE", 4, true}, {"UTF-32BE", 4, false}, {"UTF-16LE", 2, true}, {"UTF-16BE", 2, false}};
  for (const WideForm& form : FORMS) {
    if (IsTextOf(form, bytes)) {
      return form.charset;
    }
  }
  return nullptr;
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

std::string_view UntoldEnd(std::string_view bytes) {
  const auto odd = std::find_if(bytes.begin(), bytes.end(),
                                [](char byte) { return static_cast<unsigned char>(byte) >= 0x80; });
  bytes.remove_prefix(static_cast<size_t>(odd - bytes.begin()));
  return !bytes.empty() && FirstCharacter(bytes).is_cut ? bytes : std::string_view();
}

namespace {

// A name or two with accents in a text without any, for which the detector has a different guess
// with each name.
bool HasFewAccents(std::string_view bytes) {
  using std::string_view_literals::operator""sv;
  // Lead bytes of Japanese, and nothing or a rare sign to the West.
  constexpr std::string_view FOREIGN = "\x81\x83\x86\x87\x88\x8D\x8F\x90\x98\x9D"sv;
  size_t high = 0;
  size_t plain = 0;
  bool was_high = false;
  for (const char byte : bytes) {
    const auto code = static_cast<unsigned char>(byte);
    const bool is_high = code >= 0x80;
    if (is_high && (was_high || FOREIGN.find(byte) != std::string_view::npos)) {
      return false;
    }
    high += is_high ? 1 : 0;
    plain += (code | 0x20) >= 'a' && (code | 0x20) <= 'z' ? 1 : 0;
    was_high = is_high;
  }
  return high <= FEW_ACCENTS || high * LETTERS_OF_AN_ACCENT < plain;
}

}  // namespace

std::string GuessCharset(std::string_view bytes) {
  const std::unique_ptr<uchardet, decltype(&uchardet_delete)> detector(uchardet_new(),
                                                                       &uchardet_delete);
  if ((!IsAscii(bytes) && HasFewAccents(bytes)) ||
      uchardet_handle_data(detector.get(), bytes.data(), bytes.size()) != 0) {
    return LIKELIEST;
  }
  uchardet_data_end(detector.get());
  std::string found = uchardet_get_charset(detector.get());
  // Controls to the standard, letters in the charset that came of it.
  const bool has_c1 =
      std::any_of(bytes.begin(), bytes.end(), [](char byte) { return (byte & 0xE0) == 0x80; });
  if (has_c1 && found == "ISO-8859-2") {
    found = "WINDOWS-1250";
  } else if (has_c1 && found == "ISO-8859-15") {
    found = LIKELIEST;
  } else if (has_c1 && found == "ISO-8859-7") {
    found = "WINDOWS-1253";
  }
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
  constexpr std::pair<std::string_view, const char*> MEANT[] = {{"ISO-8859-1", "CP1252"},
                                                                {"ISO8859-1", "CP1252"},
                                                                {"ISO_8859-1", "CP1252"},
                                                                {"LATIN1", "CP1252"},
                                                                {"L1", "CP1252"},
                                                                {"CP819", "CP1252"},
                                                                {"US-ASCII", ""},
                                                                {"ASCII", ""},
                                                                {"ANSI_X3.4-1968", ""},
                                                                {"ISO-8859-9", "CP1254"},
                                                                {"LATIN5", "CP1254"},
                                                                {"ISO-8859-11", "CP874"},
                                                                {"TIS-620", "CP874"},
                                                                {"GB2312", "GB18030"},
                                                                {"GB_2312-80", "GB18030"},
                                                                {"GBK", "GB18030"},
                                                                {"X-GBK", "GB18030"},
                                                                {"EUC-CN", "GB18030"},
                                                                {"CP936", "GB18030"},
                                                                {"SHIFT_JIS", "CP932"},
                                                                {"SHIFT-JIS", "CP932"},
                                                                {"SJIS", "CP932"},
                                                                {"X-SJIS", "CP932"},
                                                                {"MS_KANJI", "CP932"},
                                                                {"EUC-KR", "CP949"},
                                                                {"KS_C_5601-1987", "CP949"},
                                                                {"KSC5601", "CP949"},
                                                                {"KS_C_5601", "CP949"},
                                                                {"KOI8-R", "KOI8-U"},
                                                                {"UTF8", "UTF-8"},
                                                                {"UNICODE-1-1-UTF-8", "UTF-8"}};
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
        "CP1252",     "CP1253",     "CP1254",      "CP437",      "CP850",       "KOI8-U", "CP932",
        "SHIFT_JIS",  "EUC-JP",     "ISO-2022-JP", "GB18030",    "CP874",       "BIG5",   "EUC-KR",
        "CP949",      "UTF-7",      "UTF-16",      "UTF-32"}) {
    (void)iconv_open("UTF-8", charset);  // never closed: the table stays as long as it is open
  }
}

}  // namespace fileindexd
