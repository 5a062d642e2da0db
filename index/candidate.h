// SPDX-License-Identifier: GPL-2.0-or-later
// Entries that may answer a question, and what is known of their content.
#pragma once

#include <cstdint>
#include <optional>
#include <string>

#include "base/content.h"
#include "index/contents_schema.h"
#include "index/entry.h"
#include "index/kept_statements.h"
#include "index/name_text.h"

namespace fileindexd {

// A row of `files` that stands for an entry now.
struct FileFacts {
  int64_t id = 0;
  ContentState state = ContentState::WAITING;
  Kind found_kind = Kind::OTHER;
  int64_t text = 0;  // rowid; 0: there is none
  int64_t length = 0;
  int64_t sample = 0;  // of the bytes that it has now; 0: not known
  int64_t fields = 0;  // bits
  FieldNumbers numbers;

  std::optional<int64_t> Number(ContentField field) const { return numbers[NumberPlace(field)]; }
};

struct Candidate {
  Entry entry;
  bool is_whole = true;            // else: of `entry` only what FindShort reads
  bool is_asked = false;           // whether `facts` have been looked for
  std::optional<FileFacts> facts;  // none: the content is not wanted, or not known yet
  std::string folded;              // the name; empty: not made yet
};

// The rows of one share. Results are SQLite's codes.
class CandidateRows {
 public:
  CandidateRows(KeptStatements& of_share, bool with_contents)
      : statements(of_share), has_contents(with_contents) {}

  int Find(int64_t id, Candidate& candidate, bool& found);
  // The same in half the time, but for id, path, kind and mtime alone. NeedFacts reads the rest.
  int FindShort(int64_t id, Candidate& candidate, bool& found);
  // One after the other: entries whose content is that text, with their facts. `found` is false
  // behind the last, and only then another text may follow.
  int NextOfText(int64_t text, Candidate& candidate, bool& found);
  int NeedFacts(Candidate& candidate);
  // By name, or by what was found inside where the name tells nothing.
  int KindOf(Candidate& candidate, Kind& kind);
  const std::string& FoldedName(Candidate& candidate);
  // Whether another file has the same bytes, as far as is known.
  int HasTwin(const Candidate& candidate, bool& has);

  KeptStatements& statements;
  bool has_contents;

 private:
  using ReadColumns = void(const Statement& row, Entry& entry);

  int FindRow(int64_t id, const char* sql, ReadColumns* read, Statement*& by, Candidate& candidate,
              bool& found);

  NameFolder folder;
  // Null: not asked for yet.
  Statement* by_id = nullptr;
  Statement* short_by_id = nullptr;
  Statement* of_text = nullptr;
  Statement* facts = nullptr;
  Statement* twin = nullptr;
};

}  // namespace fileindexd
