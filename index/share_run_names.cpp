// SPDX-License-Identifier: GPL-2.0-or-later
// The walk through the entries that answer by their names.
#include <algorithm>
#include <cmath>
#include <utility>

#include "index/share_run.h"
#include "index/text_tokenizer.h"

namespace fileindexd {

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

// Where they are many, those come first that begin with a word, as whole names do. Where these
// alone are many, the youngest of them are compared by how many words they have. The rest is known
// by which of the words it holds.
int ShareRun::NamesByRank(size_t block_size, std::vector<int64_t>& ids, IdSet& rest) {
  rest = upper.names;
  const std::string query = BeginningsQuery();
  if (upper.names.Count() <= block_size || !IsScored() || wanted == 0 || query.empty()) {
    return SQLITE_OK;
  }
  Statement* begins = nullptr;
  int code = rows.statements.Find("SELECT rowid FROM names WHERE names MATCH ?1", begins);
  if (code != SQLITE_OK) {
    return code;
  }
  begins->BindText(1, query);
  IdSet first;
  for (code = begins->Step(); code == SQLITE_ROW && first.Count() <= block_size;
       code = begins->Step()) {
    if (upper.names.Has(begins->Int(0))) {
      first.Add(begins->Int(0));
    }
  }
  if (StepError(code) != SQLITE_OK) {
    return code;
  }
  if (first.Count() > block_size) {
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
    const int64_t id = rank->Int(0);
    if (upper.names.Has(id)) {
      const double rarity = score.Rarity(sets.PromiseOfName(id));
      ranked.emplace_back(-sqlite3_column_double(rank->handle, 1) - rarity, -id);
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
  const size_t block_size = BlockSize(upper.names, NAMES);
  int code = NamesByRank(block_size, ids, rest);
  PromiseOrder others(rest, [this](int64_t id) { return sets.PromiseOfName(id); });
  int64_t last = INT64_MAX;  // that was taken without one: downwards
  Block block;
  for (size_t i = 0; code == SQLITE_OK; ++i) {
    if (i % block_size == 0) {
      if (settled >= wanted && (wanted == 0 || BestComeFirst())) {
        for (; i < ids.size(); ++i) {
          rest.Add(ids[i]);
        }
        return CountNames(rest);
      }
      block.ceiling = i == 0 ? block.ceiling : std::nextafter(block.floor, 1.0);
    }
    last = IsScored() ? last : rest.Previous(last);
    const int64_t id = i < ids.size() ? ids[i] : IsScored() ? others.Next() : last;
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
