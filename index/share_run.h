// SPDX-License-Identifier: GPL-2.0-or-later
// One question, put to one share.
//
// DESIGN: the full-text tables give two sets (see WordSets): entries by their names, and texts.
// What may answer is walked through, the rarest part of the question first: entries, then the
// entries of texts; where the tables say nothing, all rows. Each is looked at once, by RowCheck.
// What answers for sure by its name is only counted, and looked at when it can be among the best.
// Which are the best is told in two steps: for all of them by what the tables count on their way,
// and block by block from the top by the full score. No score of a block is above those of the
// blocks before it, so a page shows the same whatever was asked for before. What no word of the
// question speaks for has no place in that, and stands behind all blocks, by its age.
#pragma once

#include <cstdint>
#include <functional>
#include <string>
#include <vector>

#include "index/best_hits.h"
#include "index/hit_display.h"
#include "index/hit_score.h"
#include "index/promise_order.h"

namespace fileindexd {

class ShareRun {
 public:
  // All outlive it.
  ShareRun(KeptStatements& statements, bool with_contents, const Question& in_question,
           const Asked& as_asked, const std::string& in_share, NameMarker& of_names);

  // Adds to `best` and to `total`. SQLite's code.
  int Run(BestHits& best, uint64_t& total);
  // Adds what only hits that are shown need. SQLite's code.
  int Complete(Hit& hit, TextCutter& cutter);
  const WordSets& Sets() const { return sets; }

 private:
  // Scores of names in the block at hand: none above, and the least.
  struct Block {
    double ceiling = 1e9;
    double floor = 1e9;
    bool of_texts = false;
  };

  // How many are looked at before it is asked if that is enough: of no more than `few`, each; of
  // more, blocks. Both are shared out among the shares that are asked, down to `least`.
  struct Sizes {
    size_t few;
    size_t block;
    size_t least;
  };
  static constexpr Sizes NAMES = {.few = 400, .block = 200, .least = 40};
  static constexpr Sizes TEXTS = {.few = 400, .block = 100, .least = 25};
  size_t BlockSize(const IdSet& candidates, const Sizes& sizes) const;

  int WalkNames(BestHits& best);
  int CountNames(IdSet& others);
  int VisitEntriesOf(int64_t text, const std::function<int(Candidate& candidate)>& visit);
  int WalkTexts(BestHits& best);
  int CountTexts(const PromiseOrder& order);
  int WalkRows(BestHits& best);
  int WalkInOrder(SortBy order, BestHits& best, bool& is_enough);
  std::string BeginningsQuery() const;
  int RankByLength(const std::string& query, std::vector<int64_t>& ids, IdSet& rest);
  int NamesByRank(size_t block_size, std::vector<int64_t>& ids, IdSet& rest);
  int Answers(Candidate& candidate, bool& answers);
  int AddHit(Candidate& candidate, BestHits& best, Block& block);
  // Whether of a name only what its score needs is read, until it is known to be among the best.
  bool IsShort(int64_t id) const;
  int ReadWhole(BestHits& best);
  bool IsScored() const { return question.sort == SortBy::SCORE; }
  // Whoever walks by rank may stop once there are enough.
  bool BestComeFirst() const { return IsScored() && !question.reverse; }

  const Question& question;
  const Asked& asked;
  std::string share;
  uint64_t wanted = 0;
  CandidateRows rows;
  WordSets sets;
  RowCheck check;
  NameMarker& names;
  HitScore score;
  WordSet upper;
  IdSet lower;
  uint64_t answered = 0;  // hits so far
  // Of them, those that none of the blocks to come stands above. What is come upon by its name and
  // answers by its content, or by attributes alone, is not among them.
  uint64_t settled = 0;
};

}  // namespace fileindexd
