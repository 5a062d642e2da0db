// SPDX-License-Identifier: GPL-2.0-or-later
// Questions to the indexes.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

#include "index/database.h"
#include "index/entry.h"
#include "index/snippet.h"

namespace fileindexd {

// Each word must match a word of the name or of the content; one that ends with '*' matches words
// that begin with it. Letter case and accents do not count; in contents other forms of the word
// match too.
enum class SortBy : uint8_t { SCORE, NAME, SIZE, MODIFIED };

struct Question {
  std::string text;
  std::optional<Kind> kind;
  std::string under;                // normal path, or empty: everywhere
  std::vector<std::string> shares;  // names to ask
  uint64_t limit = 20;
  uint64_t offset = 0;
  SortBy sort = SortBy::SCORE;  // names by their own order, sizes and times the greatest first
  bool reverse = false;
  bool count_all = true;  // false: of very many hits by content, `total` counts the best alone
};

struct Hit {
  std::string share;
  Entry entry;
  double score = 0;  // greater is better
  int64_t text = 0;  // rowid of its content, if it matches; 0: by its name alone
  Snippet snippet;   // empty where the content shows none of the words
  std::vector<Snippet::Mark> marks;  // bytes of entry.path that answer the question, in order
};

struct Answer {
  std::vector<Hit> hits;              // best first, at most `limit`
  uint64_t total = 0;                 // matching entries, whatever the limit
  std::vector<std::string> failures;  // a line for each share that could not be asked
  std::string suggestion;             // without any hit: the question in words that the index has
};

// False when the question makes no sense (nothing to search for), and `error` then says why.
bool Ask(const Question& question, Answer& answer, std::string& error);

// One part of a question, in its own words, and whether an entry answers it.
struct Reason {
  std::string part;
  bool matches = false;
  std::string where;  // "name", "text", "title", …; of a range: what the entry has
};

// Why the entry at `path` answers the question or not: its parts in order. `matches`: as a whole.
// The question's shares are one, that of the path.
struct Explanation {
  bool matches = false;
  std::vector<Reason> reasons;
};
IndexError Explain(const Question& question, const std::string& path, Explanation& explanation,
                   std::string& error);

}  // namespace fileindexd
