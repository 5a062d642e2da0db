// SPDX-License-Identifier: GPL-2.0-or-later
// The same entries and texts in plain tables of the engine, in one database, and its own queries
// for the rows that a question finds: no ranking, no check, no marks, no snippet.
//
// Every failure ends the program.
#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "base/content.h"
#include "index/database.h"
#include "index/entry.h"
#include "index/name_text.h"
#include "state/sqlite.h"

namespace fileindexd {

// What is looked for: words or phrases in the engine's own language, all of which must match, each
// in a name or in a text; and what else must be true of the entry, in SQL.
struct BareQuestion {
  std::vector<std::string> words;
  std::string condition;
};

class BareWriter {
 public:
  // A new database in that folder, which is made.
  explicit BareWriter(const std::string& in_folder);

  void Put(int64_t id, const Entry& entry, const Content* content);  // null: it has none
  void Commit();                                                     // after the last

 private:
  IndexDatabase database;
  NameFolder folder;
  Statement put_entry, put_name, put_text, put_words;
  uint64_t put = 0;
};

class BareQuestions {
 public:
  explicit BareQuestions(const std::string& in_folder);

  // The rows, and of twenty of them the entry and its text; those with texts before others. How
  // many rows there are.
  uint64_t Ask(const BareQuestion& question);

 private:
  std::vector<int64_t> Matches(const char* table, const BareQuestion& question,
                               const std::string& word);
  void Fetch(int64_t id);

  IndexDatabase database;
  Statement entry_of, text_of;
};

}  // namespace fileindexd
