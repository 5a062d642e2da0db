// SPDX-License-Identifier: GPL-2.0-or-later
// What workbooks of all versions have in common: a chain of records, (type u16, length u16,
// bytes)*, some of which go on in records of the type CONTINUE, and numbers.
#pragma once

#include <cstdint>
#include <string>
#include <string_view>
#include <vector>

#include "extract/format.h"
#include "extract/little_endian.h"
#include "extract/nested.h"

namespace fileindexd {

constexpr uint16_t RECORD_PAGE_HEAD = 0x14;
constexpr uint16_t RECORD_PAGE_FOOT = 0x15;
constexpr uint16_t RECORD_FILEPASS = 0x2F;
constexpr uint16_t RECORD_BOUNDSHEET = 0x85;
constexpr uint16_t RECORD_MULRK = 0xBD;
constexpr uint16_t RECORD_NUMBER = 0x203;
constexpr uint16_t RECORD_LABEL = 0x204;
constexpr uint16_t RECORD_STRING = 0x207;
constexpr uint16_t RECORD_RK = 0x27E;
constexpr uint16_t RECORD_BOF = 0x809;
constexpr uint16_t RECORD_FORMULA = 0x06;

// Goes from record to record, until the sink is full or time is up.
class WorkbookRecords {
 public:
  // Programs fill each one with kilobytes.
  static constexpr size_t MOST_VIEWS = size_t{1} << 16;

  // The bytes and the sink outlive it.
  WorkbookRecords(std::string_view workbook, const ContentSink& text_sink)
      : bytes(workbook), sink(text_sink) {}

  // False behind the last one.
  bool Next();

  uint16_t type = 0;
  // The record's, and of what continues it, but for empty ones; of hostile files not all.
  std::vector<std::string_view> views;

 private:
  std::string_view TakePiece();

  LittleEndian bytes;
  const ContentSink& sink;
  Allowance allowance;
  size_t at = 0;
  unsigned count = 0;
};

// The number at a place of a record; empty where it is none.
std::string DoubleText(const LittleEndian& record, size_t at);
// The value of a formula: of one that is no number, letters stand in a record of their own.
std::string FormulaText(const LittleEndian& record, size_t at);
// "RK": 30 bits of a number, whole or the upper ones of a double, perhaps by a hundred too much.
std::string RkText(const LittleEndian& record, size_t at);
// As many of them as the record holds for cells beside each other, a line for each.
std::string RksText(const LittleEndian& record);

}  // namespace fileindexd
