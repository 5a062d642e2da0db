// SPDX-License-Identifier: GPL-2.0-or-later
#include "index/share_run.h"

#include <algorithm>
#include <cmath>
#include <utility>

#include "index/entry_table.h"
#include "index/promise_order.h"
#include "index/row_sql.h"
#include "index/schema.h"

namespace fileindexd {

namespace {

constexpr uint64_t FEW = 2000;           // are looked at rather than searched for in order
constexpr uint64_t MOST_WALKED = 50000;  // rows in order, before the rest is asked otherwise

uint64_t WantedOf(const Question& question) {
  constexpr uint64_t MOST = UINT64_MAX / 4;
  return question.limit == 0 ? 0 : std::min(question.offset, MOST) + std::min(question.limit, MOST);
}

bool HasPositiveLeaf(const Asked& asked) {
  return std::any_of(asked.leaves.begin(), asked.leaves.end(),
                     [](const WordLeaf& leaf) { return leaf.is_positive; });
}

}  // namespace

ShareRun::ShareRun(KeptStatements& statements, bool with_contents, const Question& in_question,
                   const Asked& as_asked, const std::string& in_share, NameMarker& of_names)
    : question(in_question),
      asked(as_asked),
      share(in_share),
      wanted(WantedOf(in_question)),
      rows(statements, with_contents),
      sets(statements, with_contents, as_asked, in_share),
      check(rows, sets),
      names(of_names),
      score(rows, sets, check, as_asked, of_names) {}

int ShareRun::Run(BestHits& best, uint64_t& total) {
  if (!names.Open()) {
    return SQLITE_NOMEM;
  }
  int code = sets.Read();
  if (code != SQLITE_OK) {
    return code;
  }
  upper = sets.Upper(asked.tree);
  lower = sets.Lower(asked.tree);

  bool is_enough = false;
  const bool all_alike = IsScored() && !HasPositiveLeaf(asked);
  if (!question.count_all && !question.reverse && wanted > 0 &&
      (upper.everything || upper.Count() > FEW)) {
    code = WalkInOrder(all_alike ? SortBy::MODIFIED : question.sort, best, is_enough);
  }
  if (code == SQLITE_OK && !is_enough) {
    answered = 0;
    settled = 0;
    code = upper.everything ? WalkRows(best) : WalkNames(best);
    const bool needs_texts = question.count_all || !BestComeFirst() || settled < wanted;
    if (code == SQLITE_OK && !upper.everything && needs_texts) {
      code = WalkTexts(best);
    }
    code = code == SQLITE_OK ? ReadWhole(best) : code;
  }
  total += answered;
  return code;
}

size_t ShareRun::BlockSize(const IdSet& candidates, const Sizes& sizes) const {
  const size_t shares = std::max<size_t>(1, asked.shares.size());
  const size_t few = std::max(sizes.few / shares, 2 * sizes.least);
  return candidates.Count() <= few ? few : std::max(sizes.block / shares, sizes.least);
}

int ShareRun::Answers(Candidate& candidate, bool& answers) {
  answers = lower.Has(candidate.entry.id);
  return answers ? SQLITE_OK : check.Matches(asked.tree, candidate, answers);
}

int ShareRun::AddHit(Candidate& candidate, BestHits& best, Block& block) {
  ++answered;
  if (wanted == 0) {
    return SQLITE_OK;
  }
  Hit hit;
  const int code =
      IsScored() ? score.Score(candidate, block.of_texts, hit.score, hit.text) : SQLITE_OK;
  if (hit.score >= 1 || (block.of_texts && hit.score > 0)) {
    hit.score = std::min(hit.score, block.ceiling);
    block.floor = std::min(block.floor, hit.score);
    ++settled;
  }
  hit.share = share;
  hit.entry = std::move(candidate.entry);
  best.Add(std::move(hit));
  return code;
}

int ShareRun::Complete(Hit& hit, TextCutter& cutter) {
  Candidate candidate;
  candidate.entry = hit.entry;
  int code = IsScored() ? SQLITE_OK : score.Score(candidate, false, hit.score, hit.text);
  code = code == SQLITE_OK ? rows.KindOf(candidate, hit.entry.kind) : code;
  hit.marks = MarksInPath(asked, hit.entry, names);
  return code == SQLITE_OK ? AddSnippet(rows, asked, candidate, cutter, hit.snippet) : code;
}

int ShareRun::ReadWhole(BestHits& best) {
  best.Cut();
  int code = SQLITE_OK;
  for (size_t i = 0; i < best.hits.size() && code == SQLITE_OK; ++i) {
    Entry& entry = best.hits[i].entry;
    Candidate candidate;
    bool found = false;
    if (IsShort(entry.id)) {
      code = rows.Find(entry.id, candidate, found);
      if (found) {
        entry = std::move(candidate.entry);
      }
    }
  }
  return code;
}

// What answers through that text. By their names alone they were visited before.
int ShareRun::VisitEntriesOf(int64_t text, const std::function<int(Candidate& candidate)>& visit) {
  Candidate candidate;
  bool found = false;
  int code = rows.NextOfText(text, candidate, found);
  for (; code == SQLITE_OK && found; code = rows.NextOfText(text, candidate, found)) {
    bool answers = false;
    if (!upper.names.Has(candidate.entry.id)) {
      code = check.Matches(asked.tree, candidate, answers);
    }
    if (code == SQLITE_OK && answers) {
      code = visit(candidate);
    }
    if (code != SQLITE_OK) {
      break;
    }
  }
  return code;
}

int ShareRun::WalkTexts(BestHits& best) {
  Block block;
  block.of_texts = true;
  const auto add = [&](Candidate& candidate) { return AddHit(candidate, best, block); };
  int code = SQLITE_OK;
  if (!IsScored() && wanted > 0) {  // all are looked at, in whatever order
    for (int64_t text = upper.texts.Next(-1); text >= 0 && code == SQLITE_OK;
         text = upper.texts.Next(text)) {
      code = VisitEntriesOf(text, add);
    }
    return code;
  }
  const size_t block_size = BlockSize(upper.texts, TEXTS);
  PromiseOrder order(upper.texts, [this](int64_t text) { return sets.PromiseOfText(text); });
  for (size_t i = 0; code == SQLITE_OK; ++i) {
    // Only whole blocks, none above the one before: further pages change nothing in those before.
    if (i % block_size == 0) {
      if (settled >= wanted && (wanted == 0 || BestComeFirst())) {
        return question.count_all ? CountTexts(order) : SQLITE_OK;
      }
      block.ceiling = i == 0 ? block.ceiling : std::nextafter(block.floor, 0.0);
    }
    const int64_t text = order.Next();
    if (text < 0) {
      break;
    }
    code = VisitEntriesOf(text, add);
  }
  return code;
}

int ShareRun::CountTexts(const PromiseOrder& order) {
  int code = SQLITE_OK;
  for (int64_t text = upper.texts.Next(-1); text >= 0 && code == SQLITE_OK;
       text = upper.texts.Next(text)) {
    if (!order.WasGiven(text)) {
      code = VisitEntriesOf(text, [this](Candidate&) {
        ++answered;
        return SQLITE_OK;
      });
    }
  }
  return code;
}

// All rows that the attributes leave.
int ShareRun::WalkRows(BestHits& best) {
  Statement read;
  int code = read.Prepare(rows.statements.db, RowsSql(asked.tree, rows.has_contents).c_str());
  if (code != SQLITE_OK) {
    return code;
  }
  Block block;
  for (code = read.Step(); code == SQLITE_ROW; code = read.Step()) {
    Candidate candidate;
    ReadEntry(read, candidate.entry);
    bool answers = false;
    int checked = check.Matches(asked.tree, candidate, answers);
    if (checked == SQLITE_OK && answers) {
      checked = AddHit(candidate, best, block);
    }
    if (checked != SQLITE_OK) {
      return checked;
    }
  }
  return StepError(code);
}

// From the top, until there is enough and what comes next stands lower. Rows of one key come in no
// order: of a week that many thousands were written in, most are older than enough others, and are
// not even read.
int ShareRun::WalkInOrder(SortBy order, BestHits& best, bool& is_enough) {
  const std::string sql = OrderedSql(order);
  if (sql.empty()) {
    return SQLITE_OK;
  }
  Statement* read = nullptr;
  int code = rows.statements.Find(sql, read);
  if (code != SQLITE_OK) {
    return code;
  }
  BestHits found(wanted, best.order);
  Block block;
  int64_t last_key = 0;
  uint64_t walked = 0;
  for (code = read->Step(); code == SQLITE_ROW && walked < MOST_WALKED; code = read->Step()) {
    const int64_t key = read->Int(ENTRY_COLUMN_COUNT);
    if (answered >= wanted && key != last_key) {
      is_enough = true;
      break;
    }
    last_key = key;
    ++walked;
    if (order == SortBy::MODIFIED && found.AreYounger(read->Int(ENTRY_COLUMN_MTIME))) {
      continue;
    }
    Candidate candidate;
    ReadEntry(*read, candidate.entry);
    bool answers = false;
    int checked = Answers(candidate, answers);
    if (checked == SQLITE_OK && answers) {
      checked = AddHit(candidate, found, block);
    }
    if (checked != SQLITE_OK) {
      return checked;
    }
  }
  for (size_t i = 0; i < found.hits.size() && is_enough; ++i) {
    best.Add(std::move(found.hits[i]));
  }
  return StepError(code);
}

}  // namespace fileindexd
