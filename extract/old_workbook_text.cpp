// SPDX-License-Identifier: GPL-2.0-or-later
// A workbook of a version before that of 1997. What a record is grew with the versions, and its
// type tells of which one it is; up to the fourth, a sheet is a file of its own. Letters are bytes
// in the charset that the record CODEPAGE tells, which comes before them.
//
//   begin:   version u16 (of the type of 1995), what follows u16, …
//   cell:    row u16, column u16, look u16 (the first version: 3 bytes), value
//   string:  length u16 (names, heads, feet and all of the first version: u8), letters
#include <algorithm>
#include <string>

#include "extract/decoder.h"
#include "extract/little_endian.h"
#include "extract/office_words.h"
#include "extract/old_office.h"
#include "extract/workbook_records.h"

namespace fileindexd {

namespace {

// The numbers behind the names are versions of the record.
constexpr uint16_t RECORD_BOF_2 = 0x009;
constexpr uint16_t RECORD_BOF_3 = 0x209;
constexpr uint16_t RECORD_BOF_4 = 0x409;
constexpr uint16_t RECORD_INTEGER_2 = 0x02;
constexpr uint16_t RECORD_NUMBER_2 = 0x03;
constexpr uint16_t RECORD_LABEL_2 = 0x04;
constexpr uint16_t RECORD_STRING_2 = 0x07;
constexpr uint16_t RECORD_FORMULA_3 = 0x206;
constexpr uint16_t RECORD_FORMULA_4 = 0x406;
constexpr uint16_t RECORD_NOTE = 0x1C;
constexpr uint16_t RECORD_CODEPAGE = 0x42;
constexpr uint16_t RECORD_BUNDLEHEADER = 0x8F;  // a sheet in a file of several, fourth version
constexpr uint16_t RECORD_RSTRING = 0xD6;

constexpr size_t CELL_2 = 7;
constexpr size_t CELL = 6;

bool IsBegin(uint16_t type) {
  return type == RECORD_BOF_2 || type == RECORD_BOF_3 || type == RECORD_BOF_4 || type == RECORD_BOF;
}

constexpr const char* WESTERN = "CP1252";

std::string CharsetOf(uint16_t page) {
  constexpr uint16_t APPLE = 0x8000;
  constexpr uint16_t WINDOWS = 0x8001;
  constexpr uint16_t WIDE = 1200;  // of later versions: there are no such letters here
  switch (page) {
    case 0:
    case 367:  // ASCII
    case WIDE:
    case WINDOWS:
      return WESTERN;
    case 10000:
    case APPLE:
      return "MACINTOSH";
    case 10007:
      return "MAC-CYRILLIC";
    case 10029:
      return "MAC-CENTRALEUROPE";
    default:
      return "CP" + std::to_string(page);
  }
}

class OldWorkbookText {
 public:
  OldWorkbookText(std::string_view workbook, ContentSink& text_sink)
      : records(workbook, text_sink), sink(text_sink) {}

  bool Read(std::string& why) {
    if (!records.Next() || !IsBegin(records.type)) {
      why = "damaged";
      return false;
    }
    is_first_version = records.type == RECORD_BOF_2;
    has_long_names = records.type == RECORD_BOF;
    while (records.Next()) {
      if (records.type == RECORD_FILEPASS) {
        why = "encrypted";
        return false;
      }
      TakeRecord(LittleEndian(records.views.front()));
    }
    Flush();
    return true;
  }

 private:
  static constexpr size_t ENOUGH_LETTERS = 4096;

  void TakeRecord(const LittleEndian& record) {
    switch (records.type) {
      case RECORD_CODEPAGE:
        Flush();
        SetPage(record.Word(0));
        break;
      case RECORD_BOUNDSHEET:
        Add(ShortString(record, has_long_names ? 6 : 0));
        break;
      case RECORD_BUNDLEHEADER:
        Add(ShortString(record, 4));
        break;
      case RECORD_PAGE_HEAD:
      case RECORD_PAGE_FOOT:
        Add(WithoutPageMarks(ShortString(record, 0)));
        break;
      case RECORD_LABEL_2:
        Add(ShortString(record, CELL_2));
        break;
      case RECORD_LABEL:
      case RECORD_RSTRING:
        Add(LongString(record, CELL));
        break;
      case RECORD_STRING_2:
        Add(ShortString(record, 0));
        break;
      case RECORD_STRING:
        Add(LongString(record, 0));
        break;
      case RECORD_NOTE:
        Add(LongString(record, 4));
        break;
      default:
        Add(NumberIn(record));
        break;
    }
  }

  // Of a page that nobody knows the Western letters are most likely right, and none is lost.
  // Records of them may be many, and looking for a charset is not free.
  void SetPage(uint16_t number) {
    if (number != page) {
      page = number;
      const std::string told = CharsetOf(number);
      charset = IsKnownCharset(told) ? told : WESTERN;
    }
  }

  std::string NumberIn(const LittleEndian& record) const {
    switch (records.type) {
      case RECORD_INTEGER_2:
        return std::to_string(record.Word(CELL_2));
      case RECORD_NUMBER_2:
        return DoubleText(record, CELL_2);
      case RECORD_NUMBER:
        return DoubleText(record, CELL);
      case RECORD_FORMULA:
      case RECORD_FORMULA_3:
      case RECORD_FORMULA_4:
        return FormulaText(record, is_first_version ? CELL_2 : CELL);
      case RECORD_RK:
        return RkText(record, CELL);
      case RECORD_MULRK:
        return RksText(record);
      default:
        return {};
    }
  }

  static std::string_view ShortString(const LittleEndian& record, size_t at) {
    return record.Part(at + 1, record.Byte(at));
  }
  static std::string_view LongString(const LittleEndian& record, size_t at) {
    return record.Part(at + 2, record.Word(at));
  }

  void Add(std::string_view text) {
    if (!text.empty()) {
      letters += text;
      letters += '\n';
    }
    if (letters.size() >= ENOUGH_LETTERS) {
      Flush();
    }
  }

  // Many strings at once: opening a charset costs more than most of them.
  void Flush() {
    if (!letters.empty()) {
      sink.AddText(ToUtf8(letters, charset));
      letters.clear();
    }
  }

  WorkbookRecords records;
  ContentSink& sink;
  uint16_t page = 0;
  std::string charset = CharsetOf(page);
  std::string letters;  // not yet in the sink; numbers are the same in all charsets
  bool is_first_version = false;
  bool has_long_names = false;  // the names of sheets stand behind their places
};

}  // namespace

bool IsBareWorkbook(std::string_view begin) {
  constexpr uint16_t KINDS[] = {0x05, 0x06, 0x10, 0x20, 0x40, 0x100};
  const LittleEndian bytes(begin);
  const uint16_t length = bytes.Word(2);
  return IsBegin(bytes.Word(0)) && length >= 4 && length <= 16 &&
         std::find(std::begin(KINDS), std::end(KINDS), bytes.Word(6)) != std::end(KINDS);
}

bool AddOldWorkbookText(std::string_view workbook, ContentSink& sink, std::string& why) {
  return OldWorkbookText(workbook, sink).Read(why);
}

}  // namespace fileindexd
