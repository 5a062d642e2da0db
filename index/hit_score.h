// SPDX-License-Identifier: GPL-2.0-or-later
// How well an entry answers the words of a question.
//
//   1 and more   its name alone answers the words: the whole name above its stem, that
//                above a beginning, that above the rest; then the share of the name that they are,
//                and how many and how rare they are of those that were asked for
//   0.5 to 1     some stand in its content alone: title above other fields above text, rare words
//                above common ones, short texts above long ones, young ones a little above old ones
//   0            nothing was asked for but attributes
#pragma once

#include <string>
#include <string_view>
#include <vector>

#include "index/name_marker.h"
#include "index/row_check.h"

namespace fileindexd {

// What is covered of a name by the words, at most.
constexpr double NAME_COVER = 0.6;

class HitScore {
 public:
  HitScore(CandidateRows& of_rows, const WordSets& of_sets, RowCheck& of_check,
           const Asked& in_question, NameMarker& of_names);

  // Of an entry that answers. `by_text`: it was come upon through its content, so its name alone
  // does not answer. `text` is set where a content counted. SQLite's code.
  int Score(Candidate& candidate, bool by_text, double& score, int64_t& text);
  // What a name gains by words whose weights are that together.
  double Rarity(double weights);

 private:
  struct Found {
    const WordLeaf* leaf;
    bool in_name;
  };

  double AllWeights();
  bool NameAnswers(const QueryNode& node, const std::vector<Found>& found) const;
  int Find(Candidate& candidate, std::vector<Found>& found);
  double NameScore(Candidate& candidate, const std::vector<Found>& found);
  double PieceScore(Candidate& candidate, const std::vector<Found>& found);
  double ContentScore(const Candidate& candidate, const std::vector<Found>& found);

  CandidateRows& rows;
  const WordSets& sets;
  RowCheck& check;
  const Asked& asked;
  NameMarker& names;
  const double now;        // one moment for all, in seconds since the epoch
  double all_weights = 0;  // of those that say what to find; 0: not added up yet
};

}  // namespace fileindexd
