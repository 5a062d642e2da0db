// SPDX-License-Identifier: GPL-2.0-or-later
#include "index/hit_score.h"

#include <algorithm>
#include <cmath>
#include <ctime>

#include "base/utf8.h"
#include "index/entry_table.h"

namespace fileindexd {

namespace {

constexpr double FIRST_NAME_SCORE = 1;
// Ranks of a name; what is covered of it, and how rare the words are, add less than one together.
constexpr double RARITY = 0.39;
constexpr double WHOLE_NAME = 3;
constexpr double WHOLE_STEM = 2;  // but for the ending
constexpr double AT_START = 1;

struct Token {
  std::string_view text;
  bool is_beginning;

  bool Fits(const std::string& word) const {
    return is_beginning ? word.starts_with(text) : word == text;
  }
};

std::string_view StemOf(std::string_view name) {
  const size_t dot = name.rfind('.');
  return dot == std::string_view::npos || dot == 0 ? name : name.substr(0, dot);
}

double Covered(const std::vector<std::string>& name, const std::vector<Token>& tokens) {
  size_t covered = 0;
  size_t all = 0;
  for (const std::string& word : name) {
    size_t best = 0;
    for (const Token& token : tokens) {
      best = token.Fits(word) ? std::max(best, token.text.size()) : best;
    }
    covered += best;
    all += word.size();
  }
  return all == 0 ? 0 : NAME_COVER * static_cast<double>(covered) / static_cast<double>(all + 1);
}

bool IsSame(const std::vector<std::string>& name, const std::vector<Token>& tokens) {
  return std::equal(name.begin(), name.end(), tokens.begin(), tokens.end(),
                    [](const std::string& word, const Token& token) { return word == token.text; });
}

// Scores of one day are the same: a page goes on where the one before ended, though time passes.
double EndOfDay(time_t moment) {
  constexpr time_t DAY = 86400;
  const time_t end = (moment / DAY + 1) * DAY;
  return static_cast<double>(end);
}

double Youth(const Entry& entry, double now) {
  const double years =
      std::max(0.0, (now - static_cast<double>(entry.mtime) / 1e9) / (365.0 * 86400));
  return 0.98 + 0.02 / (1 + years);
}

}  // namespace

HitScore::HitScore(CandidateRows& of_rows, const WordSets& of_sets, RowCheck& of_check,
                   const Asked& in_question, NameMarker& of_names)
    : rows(of_rows),
      sets(of_sets),
      check(of_check),
      asked(in_question),
      names(of_names),
      now(EndOfDay(time(nullptr))) {}

double HitScore::AllWeights() {
  if (all_weights == 0) {
    for (const WordLeaf& leaf : asked.leaves) {
      all_weights += leaf.is_positive ? sets.WeightOf(leaf) : 0;
    }
  }
  return all_weights;
}

double HitScore::Rarity(double weights) {
  return RARITY * weights / AllWeights();
}

// The parts that say what to find, as far as this entry has them.
int HitScore::Find(Candidate& candidate, std::vector<Found>& found) {
  for (const WordLeaf& leaf : asked.leaves) {
    if (!leaf.is_positive) {
      continue;
    }
    bool matches = false;
    bool in_name = false;
    int code =
        leaf.node->part == Part::WORD ? check.InName(*leaf.node, candidate, in_name) : SQLITE_OK;
    code = code == SQLITE_OK && !in_name ? check.Matches(*leaf.node, candidate, matches) : code;
    if (code != SQLITE_OK) {
      return code;
    }
    if (in_name || matches) {
      found.push_back({&leaf, in_name || leaf.node->part != Part::WORD});
    }
  }
  return SQLITE_OK;
}

// Whether the entry would answer if its content held none of the words. It answers as a whole.
bool HitScore::NameAnswers(const QueryNode& node, const std::vector<Found>& found) const {
  const auto answers = [&](const QueryNode& below) { return NameAnswers(below, found); };
  switch (node.part) {
    case Part::AND:
      return std::all_of(node.below.begin(), node.below.end(), answers);
    case Part::OR:
      return std::any_of(node.below.begin(), node.below.end(), answers);
    case Part::WORD:
      return std::any_of(found.begin(), found.end(), [&node](const Found& part) {
        return part.in_name && part.leaf->node == &node;
      });
    default:
      return true;
  }
}

int HitScore::Score(Candidate& candidate, bool by_text, double& score, int64_t& text) {
  std::vector<Found> found;
  const int code = Find(candidate, found);
  score = 0;
  text = 0;
  if (code != SQLITE_OK || found.empty()) {
    return code;
  }
  const auto in_name = [](const Found& part) { return part.in_name; };
  if (!by_text && std::any_of(found.begin(), found.end(), in_name) &&
      NameAnswers(asked.tree, found)) {
    double weight = 0;
    for (const Found& part : found) {
      weight += sets.WeightOf(*part.leaf);
    }
    found.erase(std::stable_partition(found.begin(), found.end(), in_name), found.end());
    score = FIRST_NAME_SCORE + NameScore(candidate, found) + Rarity(weight);
    return SQLITE_OK;
  }
  text = candidate.facts->text;
  score = ContentScore(candidate, found);
  return SQLITE_OK;
}

// Of pieces of names alone.
double HitScore::PieceScore(Candidate& candidate, const std::vector<Found>& found) {
  const std::string& name = rows.FoldedName(candidate);
  size_t covered = 0;
  double rank = 0;
  for (const Found& part : found) {
    if (part.leaf->node->part == Part::EXACT_NAME) {
      return WHOLE_NAME;
    }
    for (const std::string& piece : part.leaf->node->pieces) {
      const std::string folded = names.folder.Parts(piece);
      covered += folded.size();
      rank = std::max(rank, name == folded ? WHOLE_NAME : name.starts_with(folded) ? AT_START : 0);
    }
  }
  return rank +
         static_cast<double>(std::min(covered, name.size())) / static_cast<double>(name.size() + 1);
}

double HitScore::NameScore(Candidate& candidate, const std::vector<Found>& found) {
  std::vector<Token> tokens;
  for (const Found& part : found) {
    for (const std::string& token : part.leaf->tokens) {
      tokens.push_back({token, false});
    }
    if (!part.leaf->tokens.empty()) {
      tokens.back().is_beginning = part.leaf->node->is_beginning;
    }
  }
  if (tokens.empty()) {
    return PieceScore(candidate, found);
  }

  const std::string name = names.folder.Words(ToUtf8(LastComponent(candidate.entry.path)));
  const std::vector<std::string> words = names.tokenizer.Tokens(name);
  const double covered = Covered(words, tokens);
  if (IsSame(words, tokens)) {
    return WHOLE_NAME + covered;
  }
  const bool at_start =
      words.size() >= tokens.size() &&
      std::equal(tokens.begin(), tokens.end(), words.begin(),
                 [](const Token& token, const std::string& word) { return token.Fits(word); });
  if (!at_start) {
    return covered;
  }
  const bool has_stem = candidate.entry.kind != Kind::FOLDER;
  const bool is_stem = has_stem && IsSame(names.tokenizer.Tokens(StemOf(name)), tokens);
  return (is_stem ? WHOLE_STEM : AT_START) + covered;
}

double HitScore::ContentScore(const Candidate& candidate, const std::vector<Found>& found) {
  const FileFacts& facts = *candidate.facts;
  double sum = 0;
  for (const Found& part : found) {
    sum += sets.WeightOf(*part.leaf) * (part.in_name
                                            ? 1
                                            : TextMark::Score(sets.MarkOf(*part.leaf, facts.text),
                                                              static_cast<double>(facts.length)));
  }
  return 0.5 + 0.5 * (sum / AllWeights()) * Youth(candidate.entry, now);
}

}  // namespace fileindexd
