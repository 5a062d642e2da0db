// SPDX-License-Identifier: GPL-2.0-or-later
#include "index/text_characters.h"

#include <utf8proc.h>

#include <algorithm>
#include <cstdlib>
#include <memory>

#include "base/utf8.h"

namespace fileindexd {

namespace {

constexpr int32_t TABLE_SIZE = 0x2000;  // alphabets lie below, but for compatibility forms
constexpr int32_t SYLLABLES = 0xac00;   // of Hangul, and their parts
constexpr int32_t FIRST_LEAD = 0x1100;
constexpr int32_t FIRST_VOWEL = 0x1161;
constexpr int32_t FIRST_TAIL = 0x11a7;
constexpr int32_t LEADS = 19;
constexpr int32_t VOWELS = 21;
constexpr int32_t TAILS = 28;
constexpr int32_t VOICED = 0x3099;
constexpr int32_t HALF_VOICED = 0x309a;

struct Range {
  int32_t first;
  int32_t last;
};

constexpr Range PAIRED[] = {
    {0x1100, 0x11ff},   {0x2e80, 0x2fdf},   {0x3005, 0x3007}, {0x3021, 0x3029}, {0x3031, 0x3035},
    {0x3041, 0x3096},   {0x3099, 0x309a},   {0x309d, 0x309f}, {0x30a1, 0x30fa}, {0x30fc, 0x30ff},
    {0x3105, 0x312f},   {0x3131, 0x318e},   {0x31a0, 0x31bf}, {0x31f0, 0x31ff}, {0x3400, 0x4dbf},
    {0x4e00, 0x9fff},   {0xa960, 0xa97f},   {0xac00, 0xd7ff}, {0xf900, 0xfaff}, {0xff66, 0xffdc},
    {0x1b000, 0x1b16f}, {0x20000, 0x3ffff},
};

// Marks that change a letter's meaning little. Those of other scripts are its vowels.
constexpr Range ACCENTS[] = {
    {0x0300, 0x036f}, {0x0483, 0x0489}, {0x0591, 0x05bd}, {0x05bf, 0x05bf}, {0x05c1, 0x05c2},
    {0x05c4, 0x05c5}, {0x05c7, 0x05c7}, {0x0610, 0x061a}, {0x0640, 0x0640}, {0x064b, 0x065f},
    {0x0670, 0x0670}, {0x06d6, 0x06dc}, {0x06df, 0x06e4}, {0x06e7, 0x06e8}, {0x06ea, 0x06ed},
    {0x1ab0, 0x1aff}, {0x1dc0, 0x1dff}, {0x20d0, 0x20ff}, {0xfe00, 0xfe0f}, {0xfe20, 0xfe2f},
};

template <size_t COUNT>
bool IsIn(const Range (&ranges)[COUNT], int32_t code) {
  const auto* range = std::upper_bound(std::begin(ranges), std::end(ranges), code,
                                       [](int32_t c, const Range& r) { return c <= r.last; });
  return range != std::end(ranges) && code >= range->first;
}

std::string Mapped(std::string_view text, int options) {
  utf8proc_uint8_t* mapped = nullptr;
  const auto* bytes = reinterpret_cast<const utf8proc_uint8_t*>(text.data());
  const utf8proc_ssize_t size = utf8proc_map(bytes, static_cast<utf8proc_ssize_t>(text.size()),
                                             &mapped, static_cast<utf8proc_option_t>(options));
  const std::unique_ptr<utf8proc_uint8_t, decltype(&std::free)> owned(mapped, &std::free);
  return size < 0 ? std::string(text)
                  : std::string(reinterpret_cast<const char*>(mapped), static_cast<size_t>(size));
}

std::array<CharacterClass, 128> AsciiClasses() {
  std::array<CharacterClass, 128> classes{};
  for (int byte = 0; byte < 128; ++byte) {
    CharacterClass& type = classes[static_cast<size_t>(byte)];
    if (byte >= 'a' && byte <= 'z') {
      type = CharacterClass::LETTER;
    } else if (byte >= 'A' && byte <= 'Z') {
      type = CharacterClass::UPPER;
    } else if (byte >= '0' && byte <= '9') {
      type = CharacterClass::DIGIT;
    } else if (byte == '_') {
      type = CharacterClass::JOINER;
    }
  }
  return classes;
}

// Whether a kana of the one row has such a voicing. Those of both rows lie 0x60 apart.
int32_t Voiced(int32_t kana, bool half) {
  const int32_t row = kana >= 0x30a0 ? kana - 0x60 : kana;
  if (row >= 0x306f && row <= 0x307d && (row - 0x306f) % 3 == 0) {
    return kana + (half ? 2 : 1);
  }
  if (half) {
    return kana;
  }
  if (row == 0x3046) {
    return kana + 0x4e;
  }
  const bool odd = row >= 0x304b && row <= 0x3061 && row % 2 == 1;
  const bool even = row >= 0x3064 && row <= 0x3068 && row % 2 == 0;
  return odd || even ? kana + 1 : kana;
}

}  // namespace

const std::array<CharacterClass, 128> ASCII_CLASSES = AsciiClasses();

CharacterClass ClassOf(int32_t code) {
  if (IsIn(PAIRED, code)) {
    return CharacterClass::PAIRED;
  }
  if (IsIn(ACCENTS, code)) {
    return CharacterClass::MARK;
  }
  if (code == BREAK_WITHOUT_WIDTH) {
    return CharacterClass::SEPARATOR;
  }
  switch (utf8proc_category(code)) {
    case UTF8PROC_CATEGORY_LU:
    case UTF8PROC_CATEGORY_LT:
      return CharacterClass::UPPER;
    case UTF8PROC_CATEGORY_LL:
    case UTF8PROC_CATEGORY_LM:
    case UTF8PROC_CATEGORY_LO:
    case UTF8PROC_CATEGORY_MN:
    case UTF8PROC_CATEGORY_MC:
    case UTF8PROC_CATEGORY_CO:
      return CharacterClass::LETTER;
    case UTF8PROC_CATEGORY_ND:
    case UTF8PROC_CATEGORY_NL:
    case UTF8PROC_CATEGORY_NO:
      return CharacterClass::DIGIT;
    case UTF8PROC_CATEGORY_CF:
    case UTF8PROC_CATEGORY_ME:
      return CharacterClass::MARK;
    default:
      return CharacterClass::SEPARATOR;
  }
}

bool IsBlankCharacter(int32_t code) {
  switch (utf8proc_category(code)) {
    case UTF8PROC_CATEGORY_CC:
    case UTF8PROC_CATEGORY_ZS:
    case UTF8PROC_CATEGORY_ZL:
    case UTF8PROC_CATEGORY_ZP:
      return true;
    default:
      return false;
  }
}

Character CharacterAt(std::string_view text, size_t at) {
  const auto* bytes = reinterpret_cast<const utf8proc_uint8_t*>(text.data() + at);
  if (*bytes < 0x80) {
    return {*bytes, 1};
  }
  utf8proc_int32_t code = 0;
  const utf8proc_ssize_t size =
      utf8proc_iterate(bytes, static_cast<utf8proc_ssize_t>(text.size() - at), &code);
  return size > 0 ? Character{code, static_cast<size_t>(size)} : Character{0, 1};
}

int32_t Joined(int32_t first, int32_t second) {
  if (second == VOICED || second == HALF_VOICED) {
    const bool kana = first >= 0x3041 && first <= 0x30ff;
    return kana ? Voiced(first, second == HALF_VOICED) : first;
  }
  if (first >= FIRST_LEAD && first < FIRST_LEAD + LEADS && second >= FIRST_VOWEL &&
      second < FIRST_VOWEL + VOWELS) {
    return SYLLABLES + ((first - FIRST_LEAD) * VOWELS + (second - FIRST_VOWEL)) * TAILS;
  }
  const bool open = first >= SYLLABLES && first < SYLLABLES + LEADS * VOWELS * TAILS &&
                    (first - SYLLABLES) % TAILS == 0;
  return open && second > FIRST_TAIL && second < FIRST_TAIL + TAILS ? first + second - FIRST_TAIL
                                                                    : 0;
}

std::string WithoutMarks(std::string_view text) {
  const std::string parted = Mapped(text, UTF8PROC_DECOMPOSE | UTF8PROC_COMPAT | UTF8PROC_CASEFOLD);
  std::string plain;
  for (size_t at = 0; at < parted.size();) {
    const Character character = CharacterAt(parted, at);
    if (character.size == 1 || !IsIn(ACCENTS, character.code)) {
      plain.append(parted, at, character.size);
    }
    at += character.size;
  }
  return plain;
}

std::string LowerComposed(std::string_view text) {
  return Mapped(text, UTF8PROC_COMPOSE | UTF8PROC_COMPAT | UTF8PROC_CASEFOLD);
}

CharacterTable::CharacterTable() : known(MakeZeroed<Entry>(TABLE_SIZE)) {}

const CharacterTable::Entry& CharacterTable::Of(int32_t code) {
  Entry& entry = code < TABLE_SIZE ? known[static_cast<size_t>(code)] : other;
  if (entry.is_known && code < TABLE_SIZE) {
    return entry;
  }

  entry = {ClassOf(code), true, 0, 0, {}};
  if (entry.type == CharacterClass::SEPARATOR || entry.type == CharacterClass::MARK ||
      entry.type == CharacterClass::PAIRED) {
    return entry;
  }
  std::string raw;
  AppendUtf8(static_cast<char32_t>(code), raw);
  std::string exact = LowerComposed(raw);
  std::string folded = WithoutMarks(raw);
  if (exact.size() + folded.size() > entry.bytes.size()) {
    exact.clear();  // a ligature of a whole word: it stands without accents
    folded.resize(std::min(folded.size(), entry.bytes.size()));
  }
  entry.exact_size = static_cast<uint8_t>(exact.size());
  entry.folded_size = static_cast<uint8_t>(folded.size());
  std::copy(exact.begin(), exact.end(), entry.bytes.begin());
  std::copy(folded.begin(), folded.end(), entry.bytes.begin() + entry.exact_size);
  return entry;
}

int32_t CharacterTable::Plain(int32_t code) {
  const bool has_forms = code < 0x3400 || code >= 0xf900;
  if (!has_forms || (code >= 0x3041 && code <= 0x30fe)) {
    return code;
  }
  // A jamo of the compatibility block is one of a syllable's parts, and stays what it is.
  if (code >= 0x1100 && code <= 0x11ff) {
    return code;
  }
  utf8proc_int32_t parted[4] = {};
  int bound = 0;
  const utf8proc_ssize_t count = utf8proc_decompose_char(
      code, parted, 4, static_cast<utf8proc_option_t>(UTF8PROC_DECOMPOSE | UTF8PROC_COMPAT),
      &bound);
  return count >= 1 ? parted[0] : code;
}

}  // namespace fileindexd
