// SPDX-License-Identifier: GPL-2.0-or-later
// A workbook is a chain of records, (type u16, length u16, bytes)*. One that is too long goes on in
// records of the type CONTINUE; a string that is cut there begins anew with its flags:
//
//   string: letters u16, flags u8 (1: two bytes a letter, 4: further data, 8: runs),
//           [runs u16], [length of further data u32], letters, runs × 4 bytes, further data
#include <algorithm>
#include <charconv>
#include <cmath>
#include <cstring>
#include <span>
#include <string>
#include <vector>

#include "extract/little_endian.h"
#include "extract/nested.h"
#include "extract/office_words.h"
#include "extract/old_office.h"
#include "extract/utf16.h"

namespace fileindexd {

namespace {

enum RecordType : uint16_t {
  RECORD_PAGE_HEAD = 0x14,
  RECORD_PAGE_FOOT = 0x15,
  RECORD_FILEPASS = 0x2F,
  RECORD_CONTINUE = 0x3C,
  RECORD_BOUNDSHEET = 0x85,
  RECORD_MULRK = 0xBD,
  RECORD_SST = 0xFC,
  RECORD_TXO = 0x1B6,
  RECORD_NUMBER = 0x203,
  RECORD_LABEL = 0x204,
  RECORD_STRING = 0x207,
  RECORD_RK = 0x27E,
  RECORD_BOF = 0x809,
  RECORD_FORMULA = 0x06,
};

// The bytes of a record and of what continues it.
class Pieces {
 public:
  // The views outlive it.
  explicit Pieces(std::span<const std::string_view> views) : pieces(views) {}

  bool IsAtEnd() { return !Settle(); }

  uint8_t Byte() {
    if (!Settle()) {
      return 0;
    }
    return static_cast<uint8_t>(pieces[index][at++]);
  }
  uint16_t Word() {
    const uint8_t low = Byte();
    return static_cast<uint16_t>(low | Byte() << 8);
  }
  uint32_t Long() {
    const uint16_t low = Word();
    return low | uint32_t{Word()} << 16;
  }
  void Skip(size_t count) {
    while (count > 0 && Settle()) {
      const size_t step = std::min(count, pieces[index].size() - at);
      at += step;
      count -= step;
    }
  }

  // One string's letters, across the pieces.
  std::string Letters(size_t count, bool is_wide) {
    std::string text;
    Utf16Joiner joiner;
    while (count > 0 && index < pieces.size()) {
      if (at >= pieces[index].size()) {
        if (++index == pieces.size()) {
          break;
        }
        at = 0;
        is_wide = (Byte() & 1) != 0;
        continue;
      }
      const uint8_t low = Byte();
      // A letter that is cut in two by damage takes its half from the next piece: no harm.
      joiner.Add(is_wide ? static_cast<uint16_t>(low | Byte() << 8) : low, text);
      --count;
    }
    return text;
  }

 private:
  // Goes to the next piece where one is at its end. False behind the last.
  bool Settle() {
    while (index < pieces.size() && at >= pieces[index].size()) {
      ++index;
      at = 0;
    }
    return index < pieces.size();
  }

  std::span<const std::string_view> pieces;
  size_t index = 0;
  size_t at = 0;
};

std::string ReadString(Pieces& pieces, size_t letters) {
  constexpr uint8_t WIDE = 1;
  constexpr uint8_t FURTHER = 4;
  constexpr uint8_t RUNS = 8;
  const uint8_t flags = pieces.Byte();
  const size_t runs = (flags & RUNS) != 0 ? pieces.Word() : 0;
  const size_t further = (flags & FURTHER) != 0 ? pieces.Long() : 0;
  std::string text = pieces.Letters(letters, (flags & WIDE) != 0);
  pieces.Skip(4 * runs + further);
  return text;
}

// "RK": 30 bits of a number, whole or the upper ones of a double, perhaps by a hundred too much.
double FromRk(uint32_t packed) {
  double number = 0;
  if ((packed & 2) != 0) {
    number = static_cast<double>(static_cast<int32_t>(packed) >> 2);
  } else {
    const uint64_t bits = uint64_t{packed & ~3U} << 32;
    memcpy(&number, &bits, sizeof(number));
  }
  return (packed & 1) != 0 ? number / 100 : number;
}

class WorkbookText {
 public:
  WorkbookText(std::string_view workbook, ContentSink& text_sink)
      : bytes(workbook), sink(text_sink) {}

  bool Read(std::string& why) {
    const Allowance allowance;
    if (bytes.Word(0) != RECORD_BOF) {
      why = "damaged";
      return false;
    }
    // A record is four bytes at least: a look at the clock costs more than most of them.
    constexpr unsigned RECORDS_PER_LOOK = 1000;
    size_t at = 0;
    for (unsigned record = 0; at + 4 <= bytes.Size() && !sink.IsFull(); ++record) {
      if (record % RECORDS_PER_LOOK == 0 && allowance.IsSpent()) {
        break;
      }
      const uint16_t type = bytes.Word(at);
      views.assign(1, TakePiece(at));
      while (type != RECORD_CONTINUE && bytes.Word(at) == RECORD_CONTINUE) {
        views.push_back(TakePiece(at));
      }
      if (type == RECORD_FILEPASS) {
        why = "encrypted";
        return false;
      }
      TakeRecord(type);
    }
    return true;
  }

 private:
  std::string_view TakePiece(size_t& at) const {
    const std::string_view view = bytes.Part(at + 4, bytes.Word(at + 2));
    at += 4 + size_t{bytes.Word(at + 2)};
    return view;
  }

  void Add(const std::string& text) {
    sink.AddText(text);
    sink.AddText("\n");
  }

  void AddNumber(double number) {
    char text[32];
    const auto end = std::to_chars(std::begin(text), std::end(text), number).ptr;
    if (std::isfinite(number)) {
      Add(std::string(text, end));
    }
  }

  void AddDouble(const LittleEndian& record, size_t at) {
    const uint64_t bits = record.Long(at) | uint64_t{record.Long(at + 4)} << 32;
    double number = 0;
    memcpy(&number, &bits, sizeof(number));
    AddNumber(number);
  }

  void AddShared(Pieces pieces) {
    pieces.Skip(8);
    while (!pieces.IsAtEnd() && !sink.IsFull()) {
      const uint16_t letters = pieces.Word();
      Add(ReadString(pieces, letters));
    }
  }

  // A box of text or a note: its letters stand in the record's continuation.
  void AddBox() {
    const size_t letters = LittleEndian(views.front()).Word(10);
    if (views.size() > 1 && letters > 0) {
      Pieces pieces(std::span<const std::string_view>(views).subspan(1));
      const bool is_wide = (pieces.Byte() & 1) != 0;
      Add(pieces.Letters(letters, is_wide));
    }
  }

  void TakeRecord(uint16_t type) {
    const LittleEndian record(views.front());
    Pieces pieces(views);
    switch (type) {
      case RECORD_SST:
        AddShared(pieces);
        break;
      case RECORD_TXO:
        AddBox();
        break;
      case RECORD_BOUNDSHEET:
        pieces.Skip(6);
        Add(ReadString(pieces, pieces.Byte()));
        break;
      case RECORD_LABEL:
        pieces.Skip(6);
        Add(ReadString(pieces, pieces.Word()));
        break;
      case RECORD_PAGE_HEAD:
      case RECORD_PAGE_FOOT:
        Add(WithoutPageMarks(ReadString(pieces, pieces.Word())));
        break;
      case RECORD_STRING:
        Add(ReadString(pieces, pieces.Word()));
        break;
      case RECORD_NUMBER:
        AddDouble(record, 6);
        break;
      case RECORD_FORMULA:
        if (record.Word(12) != 0xFFFF) {  // else its value is no number
          AddDouble(record, 6);
        }
        break;
      case RECORD_RK:
        AddNumber(FromRk(record.Long(6)));
        break;
      case RECORD_MULRK:
        for (size_t at = 6; at + 6 <= record.Size(); at += 6) {
          AddNumber(FromRk(record.Long(at)));
        }
        break;
      default:
        break;
    }
  }

  LittleEndian bytes;
  ContentSink& sink;
  std::vector<std::string_view> views;  // the record's, and of what continues it
};

}  // namespace

bool AddWorkbookText(std::string_view workbook, ContentSink& sink, std::string& why) {
  return WorkbookText(workbook, sink).Read(why);
}

}  // namespace fileindexd
