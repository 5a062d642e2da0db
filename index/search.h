// SPDX-License-Identifier: GPL-2.0-or-later
// Questions to the indexes.
#pragma once

#include <chrono>
#include <cstdint>
#include <map>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "index/database.h"
#include "index/entry.h"
#include "index/snippet.h"

namespace fileindexd {

// The language of `text` is written down above the parser, query_parse.cpp. Letter case, accents
// and compatibility forms do not count; in contents other forms of a word match too.
enum class SortBy : uint8_t { SCORE, NAME, SIZE, MODIFIED };

struct Question {
  std::string text;
  std::optional<Kind> kind;
  std::string under;                // normal path, or empty: everywhere
  std::vector<std::string> shares;  // names to ask; one without an index folder yet holds nothing
  // Of those, the ones whose index would have to be there: without it they fail.
  std::vector<std::string> lost;
  // Their folders, by name: a folder there may be asked for, though no index knows it yet.
  std::map<std::string, std::string> roots;
  std::vector<std::string> known;  // names that the text may say as well, though they are not asked
  uint64_t limit = 20;
  uint64_t offset = 0;
  // Names by their bytes, sizes and times the greatest first; equal scores the youngest first.
  // What is equal in that comes by path, and by share.
  SortBy sort = SortBy::SCORE;
  bool reverse = false;
  bool count_all = true;  // false: of very many hits `total` may count only those looked at
  bool suggests = true;   // without any hit, a suggestion is looked for
  std::chrono::seconds patience{30};  // a share that has not answered by then is given up
  bool shows = true;  // false: of hits only share, path and what their order needs are told
};

struct Hit {
  std::string share;
  Entry entry;
  double score = 0;                  // greater is better
  int64_t text = 0;                  // rowid of its content, if it matches; 0: by its name alone
  Snippet snippet;                   // empty where the content shows none of the words
  std::vector<Snippet::Mark> marks;  // bytes of entry.path that answer the question, in order
};

// The words of a share's contents that were asked. Others may be in the making, or wanted.
struct AskedWords {
  std::string language;
  bool has_texts = false;
};

struct Answer {
  std::vector<Hit> hits;                    // best first, at most `limit`
  uint64_t total = 0;                       // matching entries, whatever the limit
  std::vector<std::string> failures;        // a line for each share that could not be asked
  std::map<std::string, AskedWords> words;  // by share; none of those without contents
  std::string suggestion;       // without any hit: the question in words that the index has
  std::string word_like_field;  // without either: the first word like "type:pdf"
  std::string small_operator;   // without any hit: the first "or", "and" or "not" between words
  bool knows_under = true;      // false: no share knows the question's `under`, and so no hit
};

// False when the question makes no sense as far as its text tells, and `error` then says why and
// where, in one line. No share is asked. `reached`: those of the question's that it does not rule
// out.
bool Understand(const Question& question, std::vector<std::string>& reached, std::string& error);

// False when the question makes no sense, and `error` then says why. The shares that it reaches
// are asked side by side, each in one state of it; one that does not answer in time is among the
// failures.
bool Ask(const Question& question, Answer& answer, std::string& error);

// The same, and the shares of the last question stay open for the next. One thread.
class Asker {
 public:
  Asker();
  ~Asker();
  Asker(const Asker&) = delete;
  Asker& operator=(const Asker&) = delete;

  bool Ask(const Question& question, Answer& answer, std::string& error);

 private:
  struct Impl;
  std::unique_ptr<Impl> impl;
};

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
