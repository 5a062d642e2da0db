// SPDX-License-Identifier: GPL-2.0-or-later
// Whether one entry answers a question, part by part.
#pragma once

#include <map>
#include <optional>

#include "index/asked.h"
#include "index/candidate.h"
#include "index/name_pattern.h"
#include "index/word_sets.h"

namespace fileindexd {

class RowCheck {
 public:
  RowCheck(CandidateRows& of_rows, WordSets& of_sets) : rows(of_rows), sets(of_sets) {}

  // SQLite's code. What decides without another look at the tables is asked first.
  int Matches(const QueryNode& node, Candidate& candidate, bool& matches);
  // Of a WORD or a NAME_PATTERN.
  int InName(const QueryNode& word, Candidate& candidate, bool& matches);
  int InText(const QueryNode& word, Candidate& candidate, bool& matches);

 private:
  int MatchesWord(const QueryNode& word, Candidate& candidate, bool& matches);
  int MatchesLeaf(const QueryNode& node, Candidate& candidate, bool& matches);
  int MatchesGroup(const QueryNode& node, Candidate& candidate, bool& matches);
  bool MatchesPath(const QueryNode& node, const Candidate& candidate);
  bool MatchesEnding(const QueryNode& node, Candidate& candidate);
  static bool MatchesProperty(Property property, const Entry& entry);
  static bool MatchesContent(const QueryNode& node, const Candidate& candidate);
  static bool MatchesRange(const QueryNode& node, const Candidate& candidate);

  CandidateRows& rows;
  WordSets& sets;
  NameFolder folder;
  std::map<const QueryNode*, NamePattern> paths;
};

// What a range is of; none: the entry has no such number.
std::optional<int64_t> NumberOf(const QueryNode& range, const Candidate& candidate);
// Metres between where the photo was taken and the middle of the circle.
std::optional<double> DistanceOf(const QueryNode& near, const Candidate& candidate);
// Whether a part asks for a row of contents.
bool NeedsFacts(const QueryNode& node);

}  // namespace fileindexd
