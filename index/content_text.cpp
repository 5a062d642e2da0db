// SPDX-License-Identifier: GPL-2.0-or-later
#include "index/content_text.h"

#include <zstd.h>

#include <algorithm>
#include <charconv>
#include <system_error>
#include <utility>

namespace fileindexd {

namespace {

constexpr int LEVEL = 3;
constexpr size_t MOST_CONTENT = size_t{64} << 20;  // damaged bytes may claim anything
constexpr size_t FIELD_HEAD = 5;

void AddField(std::string& content, const TextField& field) {
  content += static_cast<char>(field.field);
  const auto size = static_cast<uint32_t>(field.text.size());
  for (int shift = 0; shift < 32; shift += 8) {
    content += static_cast<char>(size >> shift & 0xff);
  }
  content += field.text;
}

uint32_t LengthAt(std::string_view content, size_t at) {
  uint32_t length = 0;
  for (int byte = 3; byte >= 0; --byte) {
    length = length << 8 | static_cast<unsigned char>(content[at + static_cast<size_t>(byte)]);
  }
  return length;
}

bool Unpack(std::string_view packed, std::string& content) {
  const unsigned long long size = ZSTD_getFrameContentSize(packed.data(), packed.size());
  if (size == ZSTD_CONTENTSIZE_UNKNOWN || size == ZSTD_CONTENTSIZE_ERROR || size > MOST_CONTENT) {
    return false;
  }
  content.resize(static_cast<size_t>(size));
  const size_t got = ZSTD_decompress(content.data(), content.size(), packed.data(), packed.size());
  return ZSTD_isError(got) == 0 && got == content.size();
}

// Numbers that people look for as words.
bool IsWord(ContentField field) {
  return field == ContentField::YEAR || field == ContentField::TRACK;
}

// Those that are known already, from their columns, stay.
bool AddNumber(ContentField field, const std::string& digits, Content& content) {
  int64_t number = 0;
  const char* end = digits.data() + digits.size();
  const auto [stop, error] = std::from_chars(digits.data(), end, number);
  if (!IsWord(field) || error != std::errc() || stop != end) {
    return false;
  }
  const bool is_known =
      std::any_of(content.numbers.begin(), content.numbers.end(),
                  [field](const NumberField& known) { return known.field == field; });
  if (!is_known) {
    content.numbers.push_back({field, number});
  }
  return true;
}

}  // namespace

size_t ContentWords::Length() const {
  size_t length = text.size();
  for (const std::string_view field : fields) {
    length += field.size();
  }
  return length;
}

ContentWords WordsOf(const Content& content) {
  ContentWords words;
  for (const TextField& field : content.texts) {
    words.fields[static_cast<size_t>(field.field) - 1] = field.text;
  }
  for (const NumberField& number : content.numbers) {
    if (IsWord(number.field)) {
      words.numbers += (words.numbers.empty() ? "" : " ") + std::to_string(number.number);
    }
  }
  words.text = content.text;
  return words;
}

int64_t FieldBits(const Content& content) {
  int64_t bits = content.text.empty() ? NO_TEXT : 0;
  for (const TextField& field : content.texts) {
    bits |= int64_t{1} << static_cast<int>(field.field);
  }
  return bits;
}

std::string PackTexts(const Content& content) {
  std::string unpacked;
  size_t size = content.text.size() + 1;
  for (const TextField& field : content.texts) {
    size += FIELD_HEAD + field.text.size();
  }
  unpacked.reserve(size);
  for (const TextField& field : content.texts) {
    AddField(unpacked, field);
  }
  for (const NumberField& number : content.numbers) {
    if (IsWord(number.field)) {
      AddField(unpacked, {number.field, std::to_string(number.number)});
    }
  }
  unpacked += '\0';
  unpacked += content.text;

  std::string packed(ZSTD_compressBound(unpacked.size()), '\0');
  const size_t used =
      ZSTD_compress(packed.data(), packed.size(), unpacked.data(), unpacked.size(), LEVEL);
  packed.resize(ZSTD_isError(used) != 0 ? 0 : used);
  return packed;
}

bool UnpackTexts(std::string_view packed, Content& content) {
  std::string unpacked;
  if (!Unpack(packed, unpacked)) {
    return false;
  }

  std::vector<TextField> texts;
  size_t at = 0;
  while (at < unpacked.size() && unpacked[at] != '\0') {
    const auto number = static_cast<uint8_t>(unpacked[at]);
    if (unpacked.size() - at < FIELD_HEAD || !IsContentField(number)) {
      return false;
    }
    const size_t length = LengthAt(unpacked, at + 1);
    at += FIELD_HEAD;
    if (unpacked.size() - at < length) {
      return false;
    }
    const auto field = static_cast<ContentField>(number);
    std::string text = unpacked.substr(at, length);
    if (!IsNumberField(field)) {
      texts.push_back({field, std::move(text)});
    } else if (!AddNumber(field, text, content)) {
      return false;
    }
    at += length;
  }
  if (at >= unpacked.size()) {
    return false;
  }
  content.texts = std::move(texts);
  content.text = unpacked.substr(at + 1);
  return true;
}

}  // namespace fileindexd
