// SPDX-License-Identifier: GPL-2.0-or-later
// The walk through the entries that answer by their names.
#include <algorithm>
#include <cmath>
#include <utility>

#include "index/share_run.h"
#include "index/text_tokenizer.h"

namespace fileindexd {

namespace {

constexpr size_t BLOCK = 300;  // names that are looked at before it is asked if that is enough

}  // namespace

// Names that begin with one of the words, in the full-text table's language.
std::string ShareRun::BeginningsQuery() const {
  std::string query;
  for (const WordLeaf& leaf : asked.leaves) {
    if (leaf.is_positive && !leaf.tokens.empty()) {
      query += (query.empty() ? "^ " : " OR ^ ") + leaf.names_query;
    }
  }
  return query;
}

// Where the words stand in many more rows than there are names that can answer, looking at those is
// less than reading which of all names begin so.
bool ShareRun::AreAllLookedAt() const {
  constexpr uint64_t MOST = 2000;      // of a word that is common in texts alone
  constexpr double NAMES_OF_ONE = 64;  // are read while one row is looked at
  if (upper.names.Count() > MOST) {
    return false;
  }
  double held = 0;
  for (const WordLeaf& leaf : asked.leaves) {
    held += leaf.is_positive ? sets.CountOf(leaf) : 0;
  }
  return static_cast<double>(upper.names.Count()) * NAMES_OF_ONE < held;
}

// The best come first: those that begin with a word, as whole names do. Where they alone are many,
// the youngest of them are compared by how many words they have; the rest comes as it is, the
// youngest rows first.
int ShareRun::NamesByRank(std::vector<int64_t>& ids, IdSet& rest) {
  rest = upper.names;
  const std::string query = BeginningsQuery();
  if (upper.names.Count() <= BLOCK || AreAllLookedAt() || !IsScored() || wanted == 0 ||
      query.empty()) {
    return SQLITE_OK;
  }
  Statement* begins = nullptr;
  int code = rows.statements.Find("SELECT rowid FROM names WHERE names MATCH ?1", begins);
  if (code != SQLITE_OK) {
    return code;
  }
  begins->BindText(1, query);
  IdSet first;
  for (code = begins->Step(); code == SQLITE_ROW && first.Count() <= BLOCK; code = begins->Step()) {
    if (upper.names.Has(begins->Int(0))) {
      first.Add(begins->Int(0));
    }
  }
  if (StepError(code) != SQLITE_OK) {
    return code;
  }
  if (first.Count() > BLOCK) {
    return RankByLength("(" + query + ") AND " + Quoted(NAME_END), ids, rest);
  }
  ids = first.Ids();
  std::reverse(ids.begin(), ids.end());
  rest.Subtract(first);
  return SQLITE_OK;
}

int ShareRun::RankByLength(const std::string& query, std::vector<int64_t>& ids, IdSet& rest) {
  Statement* rank = nullptr;
  int code = rows.statements.Find(
      "SELECT rowid, name_rank(names) FROM names WHERE names MATCH ?1 "
      "ORDER BY rowid DESC LIMIT 100000",
      rank);
  if (code != SQLITE_OK) {
    return code;
  }
  rank->BindText(1, query);
  std::vector<std::pair<double, int64_t>> ranked;
  for (code = rank->Step(); code == SQLITE_ROW; code = rank->Step()) {
    if (upper.names.Has(rank->Int(0))) {
      ranked.emplace_back(-sqlite3_column_double(rank->handle, 1), -rank->Int(0));
    }
  }
  if (code != SQLITE_DONE) {
    return code;
  }
  std::sort(ranked.begin(), ranked.end());
  IdSet chosen;
  for (const auto& [below, id] : ranked) {
    ids.push_back(-id);
    chosen.Add(-id);
  }
  rest.Subtract(chosen);
  return SQLITE_OK;
}

// Of names that answer for sure and are many more than are wanted, the score needs little.
bool ShareRun::IsShort(int64_t id) const {
  return IsScored() && upper.names.Count() / 2 > wanted && lower.Has(id);
}

int ShareRun::WalkNames(BestHits& best) {
  std::vector<int64_t> ids;
  IdSet rest;
  const size_t block_size = AreAllLookedAt() ? SIZE_MAX : BLOCK;
  int code = NamesByRank(ids, rest);
  Block block;
  int64_t last = INT64_MAX;  // that was taken of the rest: downwards, the youngest rows first
  for (size_t i = 0; code == SQLITE_OK; ++i) {
    if (i % block_size == 0) {
      if (answered_by_name >= wanted && (wanted == 0 || BestComeFirst())) {
        for (; i < ids.size(); ++i) {
          rest.Add(ids[i]);
        }
        return CountNames(rest);
      }
      block.ceiling = i == 0 ? block.ceiling : std::nextafter(block.floor, 1.0);
    }
    const bool is_ranked = i < ids.size();
    last = is_ranked ? last : rest.Previous(last);
    const int64_t id = is_ranked ? ids[i] : last;
    if (id < 0) {
      break;
    }
    rest.Remove(id);
    Candidate candidate;
    bool found = false;
    bool answers = false;
    code = IsShort(id) ? rows.FindShort(id, candidate, found) : rows.Find(id, candidate, found);
    if (code == SQLITE_OK && found) {
      code = Answers(candidate, answers);
    }
    if (code == SQLITE_OK && answers) {
      code = AddHit(candidate, best, block);
    }
  }
  return code;
}

// None of them is among the best.
int ShareRun::CountNames(IdSet& others) {
  IdSet sure = others;
  sure.Intersect(lower);
  answered += sure.Count();
  if (!question.count_all) {
    return SQLITE_OK;
  }
  others.Subtract(sure);
  int code = SQLITE_OK;
  for (int64_t id = others.Next(-1); id >= 0 && code == SQLITE_OK; id = others.Next(id)) {
    Candidate candidate;
    bool found = false;
    bool answers = false;
    code = rows.Find(id, candidate, found);
    if (code == SQLITE_OK && found) {
      code = check.Matches(asked.tree, candidate, answers);
    }
    answered += answers ? 1 : 0;
  }
  return code;
}

}  // namespace fileindexd
