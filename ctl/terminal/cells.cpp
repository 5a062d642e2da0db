// SPDX-License-Identifier: GPL-2.0-or-later
#include "ctl/terminal/cells.h"

#include <utf8proc.h>

#include <algorithm>
#include <cstdint>
#include <cstdio>
#include <optional>

namespace fileindexd {

namespace {

constexpr const char* BRIGHT = "\x1b[1;31m";
constexpr const char* PLAIN = "\x1b[0m";

Cell CutSign() {
  return {"…", 1, false};
}

// Those that turn the direction of what follows: a name could show another ending than it has.
bool TurnsAround(int32_t code) {
  return code == 0x061c || code == 0x200e || code == 0x200f || (code >= 0x202a && code <= 0x202e) ||
         (code >= 0x2066 && code <= 0x2069);
}

bool IsShownInDigits(int32_t code) {
  const utf8proc_category_t category = utf8proc_category(code);
  return category == UTF8PROC_CATEGORY_CC || category == UTF8PROC_CATEGORY_ZL ||
         category == UTF8PROC_CATEGORY_ZP || TurnsAround(code);
}

std::string InDigits(int32_t code, std::string_view bytes) {
  char text[16];
  if (code >= 0x100) {
    (void)snprintf(text, sizeof text, "\\u%04x", static_cast<unsigned>(code));
    return text;
  }
  std::string digits;
  for (const char byte : bytes) {
    (void)snprintf(text, sizeof text, "\\x%02x", static_cast<unsigned char>(byte));
    digits += text;
  }
  return digits;
}

// Terminals may know characters that the library does not. Where pictures and ideographs are added.
bool IsWideOnceAssigned(int32_t code) {
  return (code >= 0x3400 && code <= 0x9fff) || (code >= 0xf900 && code <= 0xfaff) ||
         (code >= 0x1f300 && code <= 0x1faff) || (code >= 0x20000 && code <= 0x3fffd);
}

// As terminals count them, where the library says something else: vowel signs that stand beside
// their letter, Arabic signs that hold a number, and the parts of a Hangul syllable behind its
// first.
size_t ColumnsOfCharacter(int32_t code) {
  const utf8proc_category_t category = utf8proc_category(code);
  if (category == UTF8PROC_CATEGORY_MC ||
      (category == UTF8PROC_CATEGORY_CF && code >= 0x600 && code <= 0x8e2)) {
    return 1;
  }
  if (code >= 0x1160 && code <= 0x11ff) {
    return 0;
  }
  if (category == UTF8PROC_CATEGORY_CN) {
    return IsWideOnceAssigned(code) ? 2 : 1;
  }
  return static_cast<size_t>(std::max(0, utf8proc_charwidth(code)));
}

// The character at the front of the text, and its bytes. None: the first byte is no UTF-8.
std::optional<int32_t> TakeCharacter(std::string_view text, size_t& bytes) {
  int32_t code = 0;
  const auto taken =
      utf8proc_iterate(reinterpret_cast<const utf8proc_uint8_t*>(text.data()),
                       static_cast<utf8proc_ssize_t>(std::min<size_t>(text.size(), 4)), &code);
  bytes = taken > 0 ? static_cast<size_t>(taken) : 1;
  return taken > 0 ? std::optional(code) : std::nullopt;
}

// Index of the first cell behind [first, …) with which at least `columns` are gone.
size_t EndOfColumns(const Cells& cells, size_t first, size_t columns) {
  size_t gone = 0;
  size_t end = first;
  while (end < cells.size() && gone < columns) {
    gone += cells[end].columns;
    ++end;
  }
  return end;
}

// How many cells from `first` on fit.
size_t Fitting(const Cells& cells, size_t first, size_t columns) {
  size_t taken = 0;
  size_t end = first;
  while (end < cells.size() && taken + cells[end].columns <= columns) {
    taken += cells[end].columns;
    ++end;
  }
  return end - first;
}

Cells WithoutRange(const Cells& cells, size_t first, size_t end) {
  Cells kept(cells.begin(), cells.begin() + static_cast<std::ptrdiff_t>(first));
  kept.push_back(CutSign());
  kept.insert(kept.end(), cells.begin() + static_cast<std::ptrdiff_t>(end), cells.end());
  return kept;
}

}  // namespace

Cells CellsOf(std::string_view text, const std::vector<Snippet::Mark>& marks) {
  Cells cells;
  size_t mark = 0;
  for (size_t at = 0, bytes = 0; at < text.size(); at += bytes) {
    while (mark < marks.size() && marks[mark].end <= at) {
      ++mark;
    }
    const bool is_marked = mark < marks.size() && marks[mark].start <= at;
    const std::optional<int32_t> code = TakeCharacter(text.substr(at), bytes);
    const std::string_view taken = text.substr(at, bytes);
    if (!code.has_value() || IsShownInDigits(*code)) {
      const std::string digits = InDigits(code.value_or(0), taken);
      cells.push_back({digits, digits.size(), is_marked});
      continue;
    }
    const size_t columns = ColumnsOfCharacter(*code);
    if (columns == 0 && !cells.empty()) {
      cells.back().text += taken;
    } else {
      cells.push_back({std::string(taken), columns, is_marked});
    }
  }
  return cells;
}

size_t ColumnsOf(const Cells& cells) {
  size_t columns = 0;
  for (const Cell& cell : cells) {
    columns += cell.columns;
  }
  return columns;
}

Cells CutMiddle(const Cells& cells, size_t columns) {
  const size_t all = ColumnsOf(cells);
  if (all <= columns || columns == 0) {
    return all <= columns ? cells : Cells();
  }

  // Every place where the cut may begin is tried: it ends at the first cell that lets the rest fit.
  const size_t usual = (columns - 1) / 3;
  size_t best_first = 0;
  size_t best_end = cells.size();
  size_t best_cost = SIZE_MAX;
  size_t before = 0;
  for (size_t first = 0; first <= cells.size() && before < columns; ++first) {
    const size_t end = EndOfColumns(cells, first, all + 1 - columns);
    size_t gone = 0;
    size_t marked = 0;
    for (size_t i = first; i < end; ++i) {
      gone += cells[i].columns;
      marked += cells[i].is_marked ? 1 : 0;
    }
    const size_t cost = marked * (all + 1) + (before > usual ? before - usual : usual - before);
    if (all - gone + 1 <= columns && cost < best_cost) {
      best_first = first;
      best_end = end;
      best_cost = cost;
    }
    before += first < cells.size() ? cells[first].columns : 0;
  }
  return WithoutRange(cells, best_first, best_end);
}

Cells CutAround(const Cells& cells, size_t columns) {
  if (ColumnsOf(cells) <= columns || columns == 0) {
    return columns == 0 ? Cells() : cells;
  }

  const auto is_marked = [](const Cell& cell) { return cell.is_marked; };
  const auto mark = std::find_if(cells.begin(), cells.end(), is_marked);
  const auto mark_end = std::find_if_not(mark, cells.end(), is_marked);
  size_t first = 0;
  if (mark != cells.end() && ColumnsOf({cells.begin(), mark_end}) + 1 > columns) {
    const size_t lead = columns / 4;
    const size_t in_front = ColumnsOf({cells.begin(), mark});
    first = EndOfColumns(cells, 0, in_front > lead ? in_front - lead : 0);
  }

  Cells shown;
  if (first > 0) {
    shown.push_back(CutSign());
  }
  const Cells rest(cells.begin() + static_cast<std::ptrdiff_t>(first), cells.end());
  const size_t room = columns - ColumnsOf(shown);
  if (ColumnsOf(rest) <= room) {
    shown.insert(shown.end(), rest.begin(), rest.end());
    return shown;
  }
  const size_t kept = room == 0 ? 0 : Fitting(rest, 0, room - 1);
  shown.insert(shown.end(), rest.begin(), rest.begin() + static_cast<std::ptrdiff_t>(kept));
  if (room > 0) {
    shown.push_back(CutSign());
  }
  return shown;
}

std::vector<std::string> WrappedLines(std::string_view text, size_t columns) {
  const size_t room = columns > 1 ? columns - 1 : 1;
  const Cells cells = CellsOf(text);
  std::vector<std::string> lines;
  for (size_t first = 0; first < cells.size();) {
    size_t end = first + std::max<size_t>(Fitting(cells, first, room), 1);
    if (end < cells.size() && cells[end].text != " ") {
      size_t blank = end;
      while (blank > first && cells[blank - 1].text != " ") {
        --blank;
      }
      end = blank > first ? blank : end;
    }
    const auto at = [&cells](size_t i) { return cells.begin() + static_cast<std::ptrdiff_t>(i); };
    std::string line = ShowCells({at(first), at(end)}, false);
    line.erase(line.find_last_not_of(' ') + 1);
    lines.push_back(std::move(line));
    for (first = end; first < cells.size() && cells[first].text == " ";) {
      ++first;
    }
  }
  return lines;
}

std::string ShowCells(const Cells& cells, bool has_colours) {
  std::string shown;
  bool bright = false;
  for (const Cell& cell : cells) {
    if (has_colours && cell.is_marked != bright) {
      bright = cell.is_marked;
      shown += bright ? BRIGHT : PLAIN;
    }
    shown += cell.text;
  }
  return bright ? shown + PLAIN : shown;
}

std::string EscapedJson(std::string_view json) {
  constexpr int32_t REPLACEMENT = 0xfffd;
  std::string escaped;
  for (size_t at = 0, bytes = 0; at < json.size(); at += bytes) {
    const std::optional<int32_t> code = TakeCharacter(json.substr(at), bytes);
    if (code.has_value() && !IsShownInDigits(*code)) {
      escaped += json.substr(at, bytes);
      continue;
    }
    char text[16];  // all of them are below 0x10000
    (void)snprintf(text, sizeof text, "\\u%04x", static_cast<unsigned>(code.value_or(REPLACEMENT)));
    escaped += text;
  }
  return escaped;
}

}  // namespace fileindexd
