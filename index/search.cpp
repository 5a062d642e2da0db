// SPDX-License-Identifier: GPL-2.0-or-later
#include "index/search.h"

#include <algorithm>
#include <deque>
#include <functional>
#include <limits>
#include <optional>
#include <set>
#include <utility>

#include "index/content_search.h"
#include "index/contents_reader.h"
#include "index/entry_table.h"
#include "index/question_words.h"
#include "index/reader.h"
#include "index/schema.h"
#include "state/layout.h"
#include "state/sqlite.h"

namespace fileindexd {

namespace {

constexpr uint64_t MOST_HITS = std::numeric_limits<uint64_t>::max() / 4;
constexpr uint64_t FULLY_SCORED = 300;
constexpr double FIRST_NAME_SCORE = 1;  // above all by content

struct AskedShare {
  explicit AskedShare(std::string share_name) : name(std::move(share_name)) {}

  std::string name;
  EntryReader reader;
  std::optional<ContentSearch> contents;  // goes before the connection
};

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
    // What the name tells nothing of may have been found to be of that kind.
    sql += " AND (entries.kind = ?2 OR entries.kind = 0)";
  }
  if (!question.under.empty()) {
    sql += " AND (entries.path = ?3 OR (entries.path > ?4 AND entries.path < ?5))";
  }
  return sql;
}

// Hits by their names alone.
int AskNames(sqlite3* db, const Question& question, const QuestionWords& words,
             const std::string& share, const std::function<int(Hit&& hit)>& visit) {
  const std::string names = words.NamesQuery();
  const std::string query = names.empty() ? words.PartsQuery() : names;
  const std::string table = !names.empty() ? "names" : query.empty() ? "" : "parts";
  const PathRange range(question.under);
  Statement statement;
  int code = statement.Prepare(db, SqlFor(table, question).c_str());
  if (code != SQLITE_OK) {
    return code;
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
    Hit hit;
    hit.share = share;
    ReadEntry(statement, hit.entry);
    if (words.HoldsSigns(ToUtf8(LastComponent(hit.entry.path)))) {
      hit.score = FIRST_NAME_SCORE + words.Score(hit.entry);
      const int visited = visit(std::move(hit));
      if (visited != SQLITE_OK) {
        return visited;
      }
    }
  }
  return code == SQLITE_DONE ? SQLITE_OK : code;
}

// Hits by content: the best few hundred of a share get their full score, and stand above the rest.
int AskContents(ContentSearch& contents, const Question& question, BestHits& best,
                uint64_t& total) {
  const uint64_t wanted =
      std::min(question.offset, MOST_HITS) + std::min(question.limit, MOST_HITS);
  BestHits found(question.limit == 0 ? 0 : std::max(wanted, FULLY_SCORED));
  int code = contents.Run([&](Hit&& hit) {
    ++total;
    found.Add(std::move(hit));
  });
  found.Cut();
  for (size_t i = 0; i < found.hits.size() && code == SQLITE_OK; ++i) {
    code = i < FULLY_SCORED ? contents.Rescore(found.hits[i]) : SQLITE_OK;
    best.Add(std::move(found.hits[i]));
  }
  return code;
}

// What cannot be asked of the contents does not hide what the names answer.
void AskShare(const Question& question, const QuestionWords& words, AskedShare& share,
              BestHits& best, Answer& answer) {
  const auto fail = [&](const char* what, IndexError error) {
    answer.failures.push_back("share " + share.name + ": " + what + IndexErrorText(error));
  };
  const IndexError error = share.reader.Open(share.name);
  if (error != IndexError::NONE) {
    fail("", error);
    return;
  }
  const IndexError attached = AttachContents(share.reader.database, share.name);
  if (attached == IndexError::NONE) {
    share.contents.emplace(share.reader.database.db, question, words, share.name);
  } else if (attached != IndexError::PATH_NOT_FOUND) {
    fail("contents: ", attached);
  }

  int contents_code = SQLITE_OK;
  const int code = AskNames(share.reader.database.db, question, words, share.name, [&](Hit&& hit) {
    if (share.contents.has_value() && contents_code == SQLITE_OK) {
      contents_code = share.contents->FoundKind(hit.entry, hit.entry.kind);
    }
    if (!question.kind.has_value() || hit.entry.kind == *question.kind) {
      ++answer.total;
      best.Add(std::move(hit));
    }
    return SQLITE_OK;
  });
  if (code != SQLITE_OK) {
    fail("", FromSqlite(code));
    return;
  }
  if (share.contents.has_value() && contents_code == SQLITE_OK && words.Count() > 0) {
    contents_code = AskContents(*share.contents, question, best, answer.total);
  }
  if (contents_code != SQLITE_OK) {
    share.contents.reset();
    fail("contents: ", FromSqlite(contents_code));
  }
}

// For hits that are shown. A snippet that cannot be made is left out: the hit is one all the same.
void AddSnippets(std::vector<Hit>& hits, std::deque<AskedShare>& shares) {
  for (AskedShare& share : shares) {
    std::optional<TextCutter> cutter;
    for (Hit& hit : hits) {
      if (hit.share != share.name || !share.contents.has_value() || !hit.entry.content_wanted) {
        continue;
      }
      if (!cutter.has_value()) {
        cutter.emplace(share.contents->Language());
      }
      (void)share.contents->FoundKind(hit.entry, hit.entry.kind);
      (void)share.contents->AddSnippet(hit, *cutter);
    }
  }
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

  const uint64_t offset = std::min(question.offset, MOST_HITS);
  const uint64_t limit = std::min(question.limit, MOST_HITS);
  BestHits best(limit == 0 ? 0 : offset + limit);
  Answer made;
  std::deque<AskedShare> shares;
  for (const std::string& share :
       std::set<std::string>(question.shares.begin(), question.shares.end())) {
    AskShare(question, words, shares.emplace_back(share), best, made);
  }

  best.Cut();
  const auto skipped = static_cast<std::ptrdiff_t>(std::min<uint64_t>(offset, best.hits.size()));
  made.hits.assign(std::make_move_iterator(best.hits.begin() + skipped),
                   std::make_move_iterator(best.hits.end()));
  AddSnippets(made.hits, shares);
  answer = std::move(made);
  return true;
}

}  // namespace fileindexd
