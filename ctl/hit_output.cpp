// SPDX-License-Identifier: GPL-2.0-or-later
#include "ctl/hit_output.h"

#include <algorithm>

#include "base/utf8.h"
#include "ctl/output.h"
#include "ctl/terminal/cells.h"
#include "ctl/terminal/figures.h"

namespace fileindexd {

namespace {

constexpr size_t GAP = 2;
constexpr size_t SIZE_COLUMNS = 6;
constexpr size_t TIME_COLUMNS = 16;  // "2031-01-31 08:15"

// What fits on the screen. A line as wide as the screen would be followed by an empty one on some
// terminals: it stays one column narrower.
struct Layout {
  explicit Layout(size_t screen) {
    constexpr size_t LEAST_PATH = 24;
    line = screen > 1 ? screen - 1 : 1;
    const size_t size = GAP + SIZE_COLUMNS;
    const size_t time = GAP + TIME_COLUMNS;
    has_size = line >= LEAST_PATH + size;
    has_time = line >= LEAST_PATH + size + time;
    path = line - (has_size ? size : 0) - (has_time ? time : 0);
  }

  size_t line;
  size_t path;
  bool has_size;
  bool has_time;
};

Json::Value MarksList(const std::vector<Snippet::Mark>& marks) {
  Json::Value list(Json::arrayValue);
  for (const Snippet::Mark& mark : marks) {
    Json::Value range(Json::arrayValue);
    range.append(static_cast<Json::UInt64>(mark.start));
    range.append(static_cast<Json::UInt64>(mark.end));
    list.append(range);
  }
  return list;
}

std::string Right(const std::string& text, size_t columns) {
  return std::string(text.size() < columns ? columns - text.size() : 0, ' ') +
         text.substr(0, columns);
}

std::string Figures(const Entry& entry, const Layout& layout) {
  const bool is_folder = entry.kind == Kind::FOLDER;
  const std::string gap(GAP, ' ');
  std::string text;
  if (layout.has_size) {
    text += gap + Right(is_folder ? "-" : ShortSize(entry.size), SIZE_COLUMNS);
  }
  if (layout.has_time) {
    text += gap + (is_folder ? "-" : LocalTime(WholeSeconds(entry.mtime)).substr(0, TIME_COLUMNS));
  }
  return text;
}

std::string SnippetLine(const Snippet& snippet, const Layout& layout, bool has_colours) {
  const std::string indent(std::min<size_t>(4, layout.line / 8), ' ');
  const Cells cells = CellsOf(snippet.text, snippet.marks);
  return indent + ShowCells(CutAround(cells, layout.line - indent.size()), has_colours);
}

}  // namespace

Json::Value HitObject(const Hit& hit) {
  Json::Value object(Json::objectValue);
  object["share"] = ToUtf8(hit.share);
  SetPath(object, hit.entry.path);
  object["kind"] = KindText(hit.entry.kind);
  object["size"] = static_cast<Json::Int64>(hit.entry.size);
  object["mtime"] = static_cast<Json::Int64>(WholeSeconds(hit.entry.mtime));
  object["score"] = hit.score;
  object["snippet"] = hit.snippet.text;
  object["marks"] = MarksList(hit.marks);
  object["snippet_marks"] = MarksList(hit.snippet.marks);
  return object;
}

HitFormat::HitFormat(const std::vector<Hit>& hits, const Screen& shown_on) : screen(shown_on) {
  const Layout layout(screen.columns);
  for (auto hit = hits.begin(); hit != hits.end() && widest < layout.path; ++hit) {
    widest =
        std::max(widest, ColumnsOf(CutMiddle(CellsOf(hit->entry.path, hit->marks), layout.path)));
  }
}

std::vector<std::string> HitFormat::Lines(const Hit& hit) const {
  const Layout layout(screen.columns);
  const Cells path = CutMiddle(CellsOf(hit.entry.path, hit.marks), layout.path);
  const std::string figures = Figures(hit.entry, layout);
  const size_t blanks = figures.empty() ? 0 : widest - ColumnsOf(path);
  std::vector<std::string> lines = {ShowCells(path, screen.has_colours) + std::string(blanks, ' ') +
                                    figures};
  if (!hit.snippet.text.empty()) {
    lines.push_back(SnippetLine(hit.snippet, layout, screen.has_colours));
  }
  return lines;
}

}  // namespace fileindexd
