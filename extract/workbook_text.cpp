// SPDX-License-Identifier: GPL-2.0-or-later
// A workbook since that of 1997. A string that is cut where its record is continued begins anew
// with its flags:
//
//   string: letters u16, flags u8 (1: two bytes a letter, 4: further data, 8: runs),
//           [runs u16], [length of further data u32], letters, runs × 4 bytes, further data
#include <algorithm>
#include <span>
#include <string>

#include "extract/little_endian.h"
#include "extract/office_words.h"
#include "extract/old_office.h"
#include "extract/utf16.h"
#include "extract/workbook_records.h"

namespace fileindexd {

namespace {

constexpr uint16_t RECORD_SST = 0xFC;
constexpr uint16_t RECORD_TXO = 0x1B6;

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

class WorkbookText {
 public:
  WorkbookText(std::string_view workbook, ContentSink& text_sink)
      : records(workbook, text_sink), sink(text_sink) {}

  bool Read(std::string& why) {
    while (records.Next()) {
      if (records.type == RECORD_FILEPASS) {
        why = "encrypted";
        return false;
      }
      TakeRecord();
    }
    return true;
  }

 private:
  void Add(const std::string& text) {
    sink.AddText(text);
    sink.AddText("\n");
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
    const size_t letters = LittleEndian(records.views.front()).Word(10);
    if (records.views.size() > 1 && letters > 0) {
      Pieces pieces(std::span<const std::string_view>(records.views).subspan(1));
      const bool is_wide = (pieces.Byte() & 1) != 0;
      Add(pieces.Letters(letters, is_wide));
    }
  }

  void TakeRecord() {
    const LittleEndian record(records.views.front());
    Pieces pieces(records.views);
    switch (records.type) {
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
        Add(DoubleText(record, 6));
        break;
      case RECORD_FORMULA:
        Add(FormulaText(record, 6));
        break;
      case RECORD_RK:
        Add(RkText(record, 6));
        break;
      case RECORD_MULRK:
        Add(RksText(record));
        break;
      default:
        break;
    }
  }

  WorkbookRecords records;
  ContentSink& sink;
};

}  // namespace

bool AddWorkbookText(std::string_view workbook, ContentSink& sink, std::string& why) {
  constexpr uint16_t FIRST_VERSION = 0x600;
  const LittleEndian bytes(workbook);
  if (bytes.Word(0) != RECORD_BOF || bytes.Word(4) < FIRST_VERSION) {
    return AddOldWorkbookText(workbook, sink, why);
  }
  return WorkbookText(workbook, sink).Read(why);
}

}  // namespace fileindexd
