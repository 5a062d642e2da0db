// SPDX-License-Identifier: GPL-2.0-or-later
// Questions to one share's contents.
//
// DESIGN: each word may stand in the name or in the content, so every hit has the rarest word in
// one of both. Where that word stands is walked through; for each other one a bitmap of the texts
// that hold it says the rest, and the name is cut into its words. In what order hits come is told
// in two steps: for all of them by how often the rarest word stands there, which is cheap, and for
// the best few hundred by where each word stands, how long the text is, and how old.
#pragma once

#include <functional>
#include <string>
#include <vector>

#include "index/question_words.h"
#include "index/search.h"
#include "index/text_tokenizer.h"
#include "state/sqlite.h"

namespace fileindexd {

class ContentSearch {
 public:
  // All outlive it. The contents are attached to the entries (see AttachContents).
  ContentSearch(sqlite3* entries, const Question& asked, const QuestionWords& in_words,
                const std::string& in_share);

  // The kind that was found inside for what the name tells nothing of; the entry's own else.
  int FoundKind(const Entry& entry, Kind& kind);

  // Visits each hit whose name does not answer the whole question, in no order, with a score below
  // 1. SQLite's codes.
  using Visit = std::function<void(Hit&& hit)>;
  int Run(const Visit& visit);

  // The full score, between 0.5 and 1, of a hit by content.
  int Rescore(Hit& hit);
  std::string Language();
  int AddSnippet(Hit& hit, TextCutter& cutter);

 private:
  using Bitmap = std::vector<bool>;  // by rowid in `texts`

  int FillBitmaps();
  int ChooseRarest();
  int WalkTexts(const Visit& visit);
  int WalkBest(const Visit& visit);
  int WalkNames(const Visit& visit);
  int VisitText(int64_t text, int64_t count, const Visit& visit);
  bool Answers(const Entry& entry, int64_t text) const;
  bool HoldsAll(int64_t text) const;
  bool Has(size_t word, int64_t text) const;
  std::string Filters() const;
  void BindFilters(Statement& statement) const;

  sqlite3* db;
  const Question& question;
  const QuestionWords& words;
  std::string share;
  std::vector<Bitmap> bitmaps;  // empty for a question of one word
  size_t rarest = 0;
  Statement entries_of, found_kind, places, length;
};

}  // namespace fileindexd
