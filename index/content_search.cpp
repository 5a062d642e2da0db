// SPDX-License-Identifier: GPL-2.0-or-later
#include "index/content_search.h"

#include <algorithm>
#include <cmath>
#include <ctime>
#include <queue>
#include <utility>

#include "index/content_functions.h"
#include "index/content_text.h"
#include "index/entry_table.h"
#include "index/schema.h"
#include "state/layout.h"

namespace fileindexd {

namespace {

constexpr uint64_t BEST_SLACK = 1000;  // entries may have gone since

#define SAME_FILE                                                              \
  "entries.inode = files.inode AND entries.birth_time = files.birth_time AND " \
  "entries.size = files.size AND entries.mtime = files.mtime AND entries.content_wanted = 1"

// Below one half, whatever the count.
double ScoreOfCount(int64_t count) {
  const auto hits = static_cast<double>(count);
  return 0.5 * hits / (hits + 1);
}

// A long text holds a word more often by chance.
double ScoreOfPlaces(const WordPlaces& places, double length) {
  constexpr double USUAL_LENGTH = 8192;
  const double hits = 4.0 * places.title + 2.0 * places.fields + places.text;
  return hits / (hits + 1.2 * (0.25 + 0.75 * std::min(length / USUAL_LENGTH, 8.0)));
}

}  // namespace

ContentSearch::ContentSearch(sqlite3* entries, const Question& asked, const QuestionWords& in_words,
                             const std::string& in_share)
    : db(entries), question(asked), words(in_words), share(in_share) {}

std::string ContentSearch::Filters() const {
  std::string sql;
  if (question.kind.has_value()) {
    sql += " AND (CASE entries.kind WHEN 0 THEN files.found_kind ELSE entries.kind END) = ?2";
  }
  if (!question.under.empty()) {
    sql += " AND (entries.path = ?3 OR (entries.path > ?4 AND entries.path < ?5))";
  }
  return sql;
}

void ContentSearch::BindFilters(Statement& statement) const {
  if (question.kind.has_value()) {
    statement.BindInt(2, static_cast<int64_t>(*question.kind));
  }
  if (!question.under.empty()) {
    const PathRange range(question.under);
    const auto bind = [&statement](int column, const std::string& path) {
      sqlite3_bind_blob64(statement.handle, column, path.data(), path.size(), SQLITE_TRANSIENT);
    };
    bind(3, question.under);
    bind(4, range.first);
    bind(5, range.end);
  }
}

int ContentSearch::FoundKind(const Entry& entry, Kind& kind) {
  kind = entry.kind;
  if (entry.kind != Kind::OTHER || !entry.content_wanted) {
    return SQLITE_OK;
  }
  if (found_kind.handle == nullptr) {
    const int code = found_kind.Prepare(db,
                                        "SELECT found_kind FROM contents.files WHERE inode = ?1 "
                                        "AND birth_time = ?2 AND size = ?3 AND mtime = ?4");
    if (code != SQLITE_OK) {
      return code;
    }
  }
  found_kind.BindInt(1, static_cast<int64_t>(entry.inode));
  found_kind.BindInt(2, entry.birth_time);
  found_kind.BindInt(3, entry.size);
  found_kind.BindInt(4, entry.mtime);
  const int code = found_kind.Step();
  if (code == SQLITE_ROW) {
    kind = static_cast<Kind>(found_kind.Int(0));
  }
  found_kind.Reset();
  return code == SQLITE_ROW || code == SQLITE_DONE ? SQLITE_OK : code;
}

bool ContentSearch::Has(size_t word, int64_t text) const {
  const auto at = static_cast<size_t>(text);
  return bitmaps.empty() || (at < bitmaps[word].size() && bitmaps[word][at]);
}

bool ContentSearch::HoldsAll(int64_t text) const {
  for (size_t word = 0; word < bitmaps.size(); ++word) {
    if (!Has(word, text)) {
      return false;
    }
  }
  return true;
}

// Whether name and content together hold all words, and the name alone does not: those are found
// already.
bool ContentSearch::Answers(const Entry& entry, int64_t text) const {
  const std::string name = ToUtf8(LastComponent(entry.path));
  const std::vector<bool> in_name = words.InName(name);
  bool by_name = true;
  for (size_t word = 0; word < in_name.size(); ++word) {
    if (!in_name[word] && !Has(word, text)) {
      return false;
    }
    by_name = by_name && in_name[word];
  }
  return !by_name && words.HoldsSigns(name);
}

int ContentSearch::FillBitmaps() {
  Statement last;
  Statement match;
  int code = last.Prepare(db, "SELECT last_text FROM contents.meta WHERE id = 1");
  code = code == SQLITE_OK ? last.Step() : code;
  if (code != SQLITE_ROW) {
    return code == SQLITE_DONE ? SQLITE_CORRUPT : code;
  }
  const auto size = static_cast<size_t>(last.Int(0)) + 1;
  code = match.Prepare(db, "SELECT rowid FROM contents.words WHERE words MATCH ?1");
  for (size_t word = 0; word < words.Count() && code == SQLITE_OK; ++word) {
    Bitmap& bitmap = bitmaps.emplace_back(size);
    const std::string query = words.ContentQuery(word);
    match.BindText(1, query);
    for (code = match.Step(); code == SQLITE_ROW; code = match.Step()) {
      const auto text = static_cast<size_t>(match.Int(0));
      if (text < size) {
        bitmap[text] = true;
      }
    }
    match.Reset();
    code = code == SQLITE_DONE ? SQLITE_OK : code;
  }
  return code;
}

int ContentSearch::ChooseRarest() {
  Statement count;
  int code = count.Prepare(db, "SELECT count(*) FROM names WHERE names MATCH ?1");
  int64_t fewest = 0;
  for (size_t word = 0; word < words.Count() && code == SQLITE_OK; ++word) {
    const std::string query = words.NameQuery(word);
    count.BindText(1, query);
    code = count.Step();
    if (code == SQLITE_ROW) {
      const int64_t held =
          count.Int(0) + std::count(bitmaps[word].begin(), bitmaps[word].end(), true);
      if (word == 0 || held < fewest) {
        fewest = held;
        rarest = word;
      }
      code = SQLITE_OK;
    }
    count.Reset();
  }
  return code;
}

int ContentSearch::Run(const Visit& visit) {
  const std::string sql = "SELECT " FILEINDEX_ENTRY_COLUMNS
                          " FROM contents.files AS files CROSS JOIN entries ON " SAME_FILE
                          " WHERE files.text = ?1 AND files.text <> 0" +
                          Filters();
  int code = entries_of.Prepare(db, sql.c_str());
  if (code == SQLITE_OK && words.Count() > 1) {
    code = FillBitmaps();
    code = code == SQLITE_OK ? ChooseRarest() : code;
  }
  if (code != SQLITE_OK) {
    return code;
  }

  BindFilters(entries_of);
  const bool is_plain = !question.kind.has_value() && question.under.empty();
  if (words.Count() == 1) {
    return is_plain && !question.count_all ? WalkBest(visit) : WalkTexts(visit);
  }
  code = WalkTexts(visit);
  return code == SQLITE_OK ? WalkNames(visit) : code;
}

int ContentSearch::VisitText(int64_t text, int64_t count, const Visit& visit) {
  entries_of.BindInt(1, text);
  int code = entries_of.Step();
  for (; code == SQLITE_ROW; code = entries_of.Step()) {
    Hit hit;
    ReadEntry(entries_of, hit.entry);
    if (Answers(hit.entry, text)) {
      hit.share = share;
      hit.text = text;
      hit.score = ScoreOfCount(count);
      visit(std::move(hit));
    }
  }
  entries_of.Reset();
  return code == SQLITE_DONE ? SQLITE_OK : code;
}

int ContentSearch::WalkTexts(const Visit& visit) {
  Statement match;
  const std::string query = words.ContentQuery(rarest);
  int code =
      match.Prepare(db, "SELECT rowid, word_hits(words) FROM contents.words WHERE words MATCH ?1");
  if (code != SQLITE_OK) {
    return code;
  }
  match.BindText(1, query);
  for (code = match.Step(); code == SQLITE_ROW; code = match.Step()) {
    const int visited = VisitText(match.Int(0), match.Int(1), visit);
    if (visited != SQLITE_OK) {
      return visited;
    }
  }
  return code == SQLITE_DONE ? SQLITE_OK : code;
}

// Of a word that stands nearly everywhere, only the best texts are looked up.
int ContentSearch::WalkBest(const Visit& visit) {
  using Counted = std::pair<int64_t, int64_t>;  // how often, and the text
  std::priority_queue<Counted, std::vector<Counted>, std::greater<>> best;
  const uint64_t room = std::min(question.offset, uint64_t{1} << 32) +
                        std::min(question.limit, uint64_t{1} << 32) + BEST_SLACK;
  Statement match;
  const std::string query = words.ContentQuery(rarest);
  int code =
      match.Prepare(db, "SELECT rowid, word_hits(words) FROM contents.words WHERE words MATCH ?1");
  match.BindText(1, query);
  for (code = code == SQLITE_OK ? match.Step() : code; code == SQLITE_ROW; code = match.Step()) {
    best.emplace(match.Int(1), match.Int(0));
    if (best.size() > room) {
      best.pop();
    }
  }
  for (code = code == SQLITE_DONE ? SQLITE_OK : code; code == SQLITE_OK && !best.empty();
       best.pop()) {
    code = VisitText(best.top().second, best.top().first, visit);
  }
  return code;
}

// What has the rarest word in its name alone. Where its content has it too, it was visited.
int ContentSearch::WalkNames(const Visit& visit) {
  Statement match;
  const std::string query = words.NameQuery(rarest);
  const std::string sql = "SELECT " FILEINDEX_ENTRY_COLUMNS
                          ", files.text FROM names CROSS JOIN entries ON entries.id = names.rowid "
                          "CROSS JOIN contents.files AS files ON " SAME_FILE
                          " WHERE names MATCH ?1 AND files.text <> 0" +
                          Filters();
  int code = match.Prepare(db, sql.c_str());
  if (code != SQLITE_OK) {
    return code;
  }
  match.BindText(1, query);
  BindFilters(match);
  for (code = match.Step(); code == SQLITE_ROW; code = match.Step()) {
    Hit hit;
    ReadEntry(match, hit.entry);
    hit.text = match.Int(ENTRY_COLUMN_COUNT);
    if (!Has(rarest, hit.text) && Answers(hit.entry, hit.text)) {
      hit.share = share;
      hit.score = ScoreOfCount(1);
      visit(std::move(hit));
    }
  }
  return code == SQLITE_DONE ? SQLITE_OK : code;
}

int ContentSearch::Rescore(Hit& hit) {
  std::string query;
  for (size_t word = 0; word < words.Count(); ++word) {
    query += (word == 0 ? "" : " OR ") + words.ContentQuery(word);
  }
  int code = SQLITE_OK;
  if (places.handle == nullptr) {
    code = places.Prepare(db,
                          "SELECT word_places(words) FROM contents.words WHERE words MATCH ?1 "
                          "AND rowid = ?2");
    code =
        code == SQLITE_OK
            ? length.Prepare(db, "SELECT length FROM contents.files WHERE text = ?1 AND text <> 0")
            : code;
  }
  if (code != SQLITE_OK) {
    return code;
  }
  places.BindText(1, query);
  places.BindInt(2, hit.text);
  length.BindInt(1, hit.text);
  code = places.Step();
  const std::vector<WordPlaces> found = ReadWordPlaces(places.Bytes(0), words.Count());
  const double bytes = length.Step() == SQLITE_ROW ? static_cast<double>(length.Int(0)) : 0;
  places.Reset();
  length.Reset();
  if (code != SQLITE_ROW) {
    return code == SQLITE_DONE ? SQLITE_OK : code;
  }

  const std::vector<bool> in_name = words.InName(ToUtf8(LastComponent(hit.entry.path)));
  double sum = 0;
  for (size_t word = 0; word < found.size(); ++word) {
    sum += in_name[word] ? 1 : ScoreOfPlaces(found[word], bytes);
  }
  const double years = std::max(
      0.0, (static_cast<double>(time(nullptr)) - static_cast<double>(hit.entry.mtime) / 1e9) /
               (365.0 * 86400));
  hit.score = 0.5 + 0.5 * (sum / static_cast<double>(words.Count())) * (0.9 + 0.1 / (1 + years));
  return SQLITE_OK;
}

std::string ContentSearch::Language() {
  Statement read;
  const bool found =
      read.Prepare(db, "SELECT language FROM contents.meta WHERE id = 1") == SQLITE_OK &&
      read.Step() == SQLITE_ROW;
  const std::string name = found ? LanguageName(read.Bytes(0)) : "";
  return name.empty() ? NO_LANGUAGE : name;
}

int ContentSearch::AddSnippet(Hit& hit, TextCutter& cutter) {
  Statement read;
  int code = read.Prepare(db,
                          "SELECT packed FROM contents.files AS files JOIN contents.texts AS texts "
                          "ON texts.id = files.text WHERE files.inode = ?1 AND "
                          "files.birth_time = ?2 AND files.size = ?3 AND files.mtime = ?4");
  if (code != SQLITE_OK) {
    return code;
  }
  read.BindInt(1, static_cast<int64_t>(hit.entry.inode));
  read.BindInt(2, hit.entry.birth_time);
  read.BindInt(3, hit.entry.size);
  read.BindInt(4, hit.entry.mtime);
  code = read.Step();
  Content content;
  if (code == SQLITE_ROW) {
    if (!UnpackTexts(read.Bytes(0), content)) {
      return SQLITE_CORRUPT;
    }
    hit.snippet = MakeSnippet(content, words, cutter);
  }
  return code == SQLITE_ROW || code == SQLITE_DONE ? SQLITE_OK : code;
}

}  // namespace fileindexd
