// SPDX-License-Identifier: GPL-2.0-or-later
// The text of a document lies in pieces of the stream "WordDocument"; the table stream says which:
//
//   header:  magic u16 @0, version u16 @2, flags u16 @10, piece table's offset u32 @0x1A2, its
//            length u32 @0x1A6
//   pieces:  (1, length u16, length bytes)*  2, length u32, position u32 × (n+1), piece × n
//   piece:   u16, offset u32 (bit 30: one byte a letter, offset doubled), u16
#include <algorithm>
#include <string>

#include "extract/little_endian.h"
#include "extract/nested.h"
#include "extract/old_office.h"
#include "extract/utf16.h"

namespace fileindexd {

namespace {

constexpr uint16_t MAGIC = 0xA5EC;
constexpr uint16_t FIRST_VERSION = 0xC1;  // with a piece table, and letters of two bytes
constexpr uint16_t FLAG_ENCRYPTED = 0x0100;
constexpr uint16_t FLAG_SECOND_TABLE = 0x0200;
constexpr uint32_t ONE_BYTE = 0x40000000;

class WordText {
 public:
  explicit WordText(ContentSink& text_sink) : sink(text_sink) {}
  ~WordText() { Flush(); }
  WordText(const WordText&) = delete;
  WordText& operator=(const WordText&) = delete;

  void Add(uint16_t letter) {
    constexpr uint16_t FIELD_BEGIN = 0x13;
    constexpr uint16_t FIELD_RESULT = 0x14;
    constexpr uint16_t FIELD_END = 0x15;
    if (letter == FIELD_BEGIN) {
      fields.push_back('c');
      fields.resize(std::min(fields.size(), MAX_FIELDS));
    } else if (letter == FIELD_RESULT && !fields.empty()) {
      fields.back() = 'r';
    } else if (letter == FIELD_END && !fields.empty()) {
      fields.pop_back();
    } else if (letter == '\r') {
      // Codes end within their paragraph: one without an end does not hide the rest.
      fields.assign(fields.size(), 'r');
      AddLetter('\n');
    } else if (fields.find('c') == std::string::npos) {
      AddLetter(letter);
    }
  }

  void Flush() {
    sink.AddText(text);
    text.clear();
  }

 private:
  static constexpr size_t MAX_FIELDS = 64;  // within each other

  void AddLetter(uint16_t letter) {
    constexpr uint16_t HARD_HYPHEN = 0x1E;
    constexpr uint16_t SOFT_HYPHEN = 0x1F;
    constexpr uint16_t NOTE = 0x05;
    if (letter == HARD_HYPHEN) {
      letter = '-';
    }
    // A note's mark, a picture or a soft hyphen ends no word.
    if (letter == SOFT_HYPHEN || letter <= NOTE || letter == 0x08) {
      return;
    }
    joiner.Add(letter, text);
    if (text.size() >= 4096) {
      Flush();
    }
  }

  ContentSink& sink;
  Utf16Joiner joiner;
  std::string fields;  // 'c' within a field's code, 'r' within its result, one for each level
  std::string text;
};

// Where the pieces' own list begins in the table; its length is set.
size_t FindPieces(const LittleEndian& table, size_t begin, size_t length, size_t& pieces_length) {
  size_t at = begin;
  const size_t end = std::min(table.Size(), begin + length);
  while (at < end && table.Byte(at) == 1) {
    at += 3 + size_t{table.Word(at + 1)};
  }
  if (at >= end || table.Byte(at) != 2) {
    return 0;
  }
  pieces_length = std::min<size_t>(table.Long(at + 1), end - std::min(end, at + 5));
  return at + 5;
}

void AddPiece(const LittleEndian& document, uint32_t offset, size_t letters, ContentSink& sink,
              WordText& text) {
  const bool is_short = (offset & ONE_BYTE) != 0;
  const size_t begin = is_short ? (offset & ~ONE_BYTE) / 2 : offset;
  const std::string_view bytes = document.Part(begin, is_short ? letters : 2 * letters);
  const LittleEndian piece(bytes);
  const size_t step = is_short ? 1 : 2;
  for (size_t at = 0; at + step <= bytes.size() && !sink.IsFull(); at += step) {
    text.Add(is_short ? FromWestern(piece.Byte(at)) : piece.Word(at));
  }
}

}  // namespace

bool AddWordText(std::string_view document_bytes, std::string_view table0, std::string_view table1,
                 ContentSink& sink, std::string& why) {
  const LittleEndian document(document_bytes);
  const uint16_t flags = document.Word(10);
  if (document.Word(0) != MAGIC || document.Word(2) < FIRST_VERSION) {
    sink.converter = "catdoc";
    return true;
  }
  if ((flags & FLAG_ENCRYPTED) != 0) {
    why = "encrypted";
    return false;
  }

  const LittleEndian table((flags & FLAG_SECOND_TABLE) != 0 ? table1 : table0);
  size_t length = 0;
  const size_t pieces = FindPieces(table, document.Long(0x1A2), document.Long(0x1A6), length);
  const size_t count = length < 4 ? 0 : (length - 4) / 12;
  if (pieces == 0 || count == 0) {
    why = "damaged";
    return false;
  }

  WordText text(sink);
  const Allowance allowance;
  for (size_t i = 0; i < count && !sink.IsFull() && !allowance.IsSpent(); ++i) {
    const uint32_t first = table.Long(pieces + 4 * i);
    const uint32_t end = table.Long(pieces + 4 * (i + 1));
    const uint32_t offset = table.Long(pieces + 4 * (count + 1) + 8 * i + 2);
    if (end > first) {
      AddPiece(document, offset, end - first, sink, text);
    }
  }
  return true;
}

}  // namespace fileindexd
