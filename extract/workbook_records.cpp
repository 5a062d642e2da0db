// SPDX-License-Identifier: GPL-2.0-or-later
#include "extract/workbook_records.h"

#include <charconv>
#include <cmath>
#include <cstring>
#include <iterator>

namespace fileindexd {

namespace {

constexpr uint16_t RECORD_CONTINUE = 0x3C;

double FromBits(uint64_t bits) {
  double number = 0;
  memcpy(&number, &bits, sizeof(number));
  return number;
}

double FromRk(uint32_t packed) {
  const double number = (packed & 2) != 0 ? static_cast<double>(static_cast<int32_t>(packed) >> 2)
                                          : FromBits(uint64_t{packed & ~3U} << 32);
  return (packed & 1) != 0 ? number / 100 : number;
}

std::string NumberText(double number) {
  char text[32];
  const auto end = std::to_chars(std::begin(text), std::end(text), number).ptr;
  return std::isfinite(number) ? std::string(text, end) : std::string();
}

}  // namespace

bool WorkbookRecords::Next() {
  // A record is four bytes at least: a look at the clock costs more than most of them.
  constexpr unsigned RECORDS_PER_LOOK = 1000;
  if (at + 4 > bytes.Size() || sink.IsFull() ||
      (count++ % RECORDS_PER_LOOK == 0 && allowance.IsSpent())) {
    return false;
  }
  type = bytes.Word(at);
  views.assign(1, TakePiece());
  while (type != RECORD_CONTINUE && bytes.Word(at) == RECORD_CONTINUE) {
    const std::string_view piece = TakePiece();
    if (!piece.empty() && views.size() < MOST_VIEWS) {
      views.push_back(piece);
    }
  }
  return true;
}

std::string_view WorkbookRecords::TakePiece() {
  const std::string_view view = bytes.Part(at + 4, bytes.Word(at + 2));
  at += 4 + size_t{bytes.Word(at + 2)};
  return view;
}

std::string DoubleText(const LittleEndian& record, size_t at) {
  return NumberText(FromBits(record.Long(at) | uint64_t{record.Long(at + 4)} << 32));
}

std::string FormulaText(const LittleEndian& record, size_t at) {
  constexpr uint16_t NO_NUMBER = 0xFFFF;
  return record.Word(at + 6) != NO_NUMBER ? DoubleText(record, at) : std::string();
}

std::string RkText(const LittleEndian& record, size_t at) {
  return NumberText(FromRk(record.Long(at)));
}

std::string RksText(const LittleEndian& record) {
  std::string text;
  for (size_t at = 6; at + 6 <= record.Size(); at += 6) {
    text += RkText(record, at) + '\n';
  }
  return text;
}

}  // namespace fileindexd
