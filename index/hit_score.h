// SPDX-License-Identifier: GPL-2.0-or-later
// How well an entry answers the words of a question.
//
//   1 and more   all words that it answers stand in its name: the whole name above its stem, that
//                above a beginning, that above the rest; then the share of the name that they are
//   0.5 to 1     some stand in its content alone: title above fields above text, short texts above
//                long ones, young ones a little above old ones
//   below 0.5    the same, known from counts alone
//   0            nothing was asked for but attributes
#pragma once

#include <string>
#include <string_view>
#include <vector>

#include "index/name_tokens.h"
#include "index/row_check.h"

namespace fileindexd {

// So many contents are looked at closely, the most promising first.
constexpr uint64_t MOST_FULL_SCORES = 1000;

class HitScore {
 public:
  HitScore(CandidateRows& of_rows, const WordSets& of_sets, RowCheck& of_check,
           const Asked& in_question);

  bool Open();  // false when memory ran out

  // Of an entry that answers. `text` is set where a content counted. SQLite's code.
  int Score(Candidate& candidate, double& score, int64_t& text);

 private:
  struct Found {
    const WordLeaf* leaf;
    bool in_name;
  };

  int Find(Candidate& candidate, std::vector<Found>& found);
  double NameScore(Candidate& candidate, const std::vector<Found>& found);
  double PieceScore(Candidate& candidate, const std::vector<Found>& found);
  int ContentScore(Candidate& candidate, const std::vector<Found>& found, double& score);

  CandidateRows& rows;
  const WordSets& sets;
  RowCheck& check;
  const Asked& asked;
  NameTokenizer tokenizer;
  NameFolder folder;
  std::string places_query;             // of all leaves that are looked for in texts
  std::vector<const WordLeaf*> places;  // in its order
  uint64_t full_scores_left = MOST_FULL_SCORES;
  Statement read_places;
};

}  // namespace fileindexd
