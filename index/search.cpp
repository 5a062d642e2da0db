// SPDX-License-Identifier: GPL-2.0-or-later
#include "index/search.h"

#include <algorithm>
#include <limits>
#include <set>

#include "index/entry_table.h"
#include "index/question_words.h"
#include "index/reader.h"
#include "index/schema.h"
#include "state/layout.h"
#include "state/sqlite.h"

namespace fileindexd {

namespace {

// Best first. Two hits are never equal: a path stands in one share once.
bool IsBetter(const Hit& a, const Hit& b) {
  if (a.score != b.score) {
    return a.score > b.score;
  }
  if (a.entry.mtime != b.entry.mtime) {
    return a.entry.mtime > b.entry.mtime;
  }
  return a.entry.path != b.entry.path ? a.entry.path < b.entry.path : a.share < b.share;
}

// The best hits so far, a bounded number of them however many there are.
class BestHits {
 public:
  explicit BestHits(uint64_t wanted_hits) : wanted(wanted_hits) {}

  void Add(Hit&& hit) {
    constexpr uint64_t SLACK = 1024;
    if (wanted == 0) {
      return;
    }
    hits.push_back(std::move(hit));
    if (hits.size() - std::min<uint64_t>(wanted, hits.size()) > wanted + SLACK) {
      Cut();
    }
  }

  void Cut() {
    const auto kept = static_cast<std::ptrdiff_t>(std::min<uint64_t>(wanted, hits.size()));
    std::partial_sort(hits.begin(), hits.begin() + kept, hits.end(), IsBetter);
    hits.erase(hits.begin() + kept, hits.end());
  }

  std::vector<Hit> hits;

 private:
  uint64_t wanted;
};

// The full-text table goes first, then a look at each match's row: never the other way round.
std::string SqlFor(const std::string& table, const Question& question) {
  std::string sql = "SELECT " FILEINDEX_ENTRY_COLUMNS " FROM ";
  sql += table.empty() ? "entries WHERE ?1 = ''"
                       : table + " CROSS JOIN entries ON entries.id = " + table + ".rowid WHERE " +
                             table + " MATCH ?1";
  if (question.kind.has_value()) {
    sql += " AND entries.kind = ?2";
  }
  if (!question.under.empty()) {
    sql += " AND (entries.path = ?3 OR (entries.path > ?4 AND entries.path < ?5))";
  }
  return sql;
}

IndexError AskShare(const Question& question, const QuestionWords& words, const std::string& share,
                    BestHits& best, uint64_t& total) {
  EntryReader reader;
  const IndexError error = reader.Open(share);
  if (error != IndexError::NONE) {
    return error;
  }

  const std::string names = words.NamesQuery();
  const std::string query = names.empty() ? words.PartsQuery() : names;
  const std::string table = !names.empty() ? "names" : query.empty() ? "" : "parts";
  const PathRange range(question.under);
  Statement statement;
  int code = statement.Prepare(reader.database.db, SqlFor(table, question).c_str());
  if (code != SQLITE_OK) {
    return FromSqlite(code);
  }
  statement.BindText(1, query);
  if (question.kind.has_value()) {
    statement.BindInt(2, static_cast<int64_t>(*question.kind));
  }
  if (!question.under.empty()) {
    statement.BindBlob(3, question.under);
    statement.BindBlob(4, range.first);
    statement.BindBlob(5, range.end);
  }

  for (code = statement.Step(); code == SQLITE_ROW; code = statement.Step()) {
    Hit hit{share, {}, 0};
    ReadEntry(statement, hit.entry);
    if (words.HoldsSigns(ToUtf8(LastComponent(hit.entry.path)))) {
      ++total;
      hit.score = words.Score(hit.entry);
      best.Add(std::move(hit));
    }
  }
  return FromSqlite(code);
}

}  // namespace

bool Ask(const Question& question, Answer& answer, std::string& error) {
  if (!question.under.empty() && NormalPath(question.under) != question.under) {
    error = "not a plain absolute path: " + question.under;
    return false;
  }
  QuestionWords words;
  if (!words.Read(question.text, error)) {
    return false;
  }

  constexpr uint64_t MOST = std::numeric_limits<uint64_t>::max() / 4;
  const uint64_t offset = std::min(question.offset, MOST);
  const uint64_t limit = std::min(question.limit, MOST);
  BestHits best(limit == 0 ? 0 : offset + limit);
  Answer made;
  for (const std::string& share :
       std::set<std::string>(question.shares.begin(), question.shares.end())) {
    const IndexError failure = AskShare(question, words, share, best, made.total);
    if (failure != IndexError::NONE) {
      made.failures.push_back("share " + share + ": " + IndexErrorText(failure));
    }
  }

  best.Cut();
  const auto skipped = static_cast<std::ptrdiff_t>(std::min<uint64_t>(offset, best.hits.size()));
  made.hits.assign(std::make_move_iterator(best.hits.begin() + skipped),
                   std::make_move_iterator(best.hits.end()));
  answer = std::move(made);
  return true;
}

}  // namespace fileindexd
