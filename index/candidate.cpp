// SPDX-License-Identifier: GPL-2.0-or-later
#include "index/candidate.h"

#include "base/utf8.h"
#include "index/entry_table.h"
#include "index/schema.h"

namespace fileindexd {

namespace {

constexpr int FIRST_NUMBER = 7;  // of the columns of FactsColumns

std::string FactsColumns() {
  return "files.id, files.state, files.found_kind, files.text, files.length, "
         "iif(files.extractor <> 0, files.sample, 0), "
         "files.fields, " +
         std::string(NUMBER_COLUMNS);
}

void ReadShort(const Statement& row, Entry& entry) {
  entry.id = row.Int(0);
  entry.path = row.Bytes(1);
  entry.kind = static_cast<Kind>(row.Int(2));
  entry.mtime = row.Int(3);
}

FileFacts ReadFacts(const Statement& row, int first) {
  FileFacts facts;
  facts.id = row.Int(first);
  facts.state = static_cast<ContentState>(row.Int(first + 1));
  facts.found_kind = static_cast<Kind>(row.Int(first + 2));
  facts.text = row.Int(first + 3);
  facts.length = row.Int(first + 4);
  facts.sample = row.Int(first + 5);
  facts.fields = row.Int(first + 6);
  facts.numbers = ReadNumbers(row, first + FIRST_NUMBER);
  return facts;
}

}  // namespace

int CandidateRows::FindRow(int64_t id, const char* sql, ReadColumns* read, Statement*& by,
                           Candidate& candidate, bool& found) {
  int code = by == nullptr ? statements.Find(sql, by) : SQLITE_OK;
  if (code != SQLITE_OK) {
    return code;
  }
  by->BindInt(1, id);
  return by->ReadOne(found, [&] {
    candidate = Candidate();
    read(*by, candidate.entry);
  });
}

int CandidateRows::Find(int64_t id, Candidate& candidate, bool& found) {
  return FindRow(id, "SELECT " FILEINDEX_ENTRY_COLUMNS " FROM entries WHERE id = ?1", ReadEntry,
                 by_id, candidate, found);
}

int CandidateRows::FindShort(int64_t id, Candidate& candidate, bool& found) {
  const int code = FindRow(id, "SELECT id, path, kind, mtime FROM entries WHERE id = ?1", ReadShort,
                           short_by_id, candidate, found);
  if (found) {
    candidate.is_whole = false;
  }
  return code;
}

int CandidateRows::NextOfText(int64_t text, Candidate& candidate, bool& found) {
  int code = SQLITE_OK;
  if (of_text == nullptr) {
    const std::string sql = "SELECT " FILEINDEX_ENTRY_COLUMNS ", " + FactsColumns() +
                            " FROM contents.files AS files CROSS JOIN entries "
                            "ON " FILEINDEX_WANTED_FILE
                            " WHERE files.text = ?1 AND files.text <> 0";
    code = statements.Find(sql, of_text);
  }
  if (code != SQLITE_OK) {
    return code;
  }
  if (sqlite3_stmt_busy(of_text->handle) == 0) {
    of_text->BindInt(1, text);
  }
  code = of_text->Step();
  found = code == SQLITE_ROW;
  if (found) {
    candidate = Candidate();
    ReadEntry(*of_text, candidate.entry);
    candidate.facts = ReadFacts(*of_text, ENTRY_COLUMN_COUNT);
    candidate.is_asked = true;
    return SQLITE_OK;
  }
  of_text->Reset();
  return StepError(code);
}

int CandidateRows::NeedFacts(Candidate& candidate) {
  if (!candidate.is_whole) {
    bool found = false;
    const int code = Find(candidate.entry.id, candidate, found);
    if (code != SQLITE_OK || !found) {
      return code == SQLITE_OK ? SQLITE_CORRUPT : code;
    }
  }
  if (candidate.is_asked || !has_contents || !candidate.entry.content_wanted) {
    candidate.is_asked = true;
    return SQLITE_OK;
  }
  int code = SQLITE_OK;
  if (facts == nullptr) {
    const std::string sql =
        "SELECT " + FactsColumns() + " FROM contents.files AS files WHERE " FILEINDEX_THAT_FILE;
    code = statements.Find(sql, facts);
  }
  if (code != SQLITE_OK) {
    return code;
  }
  BindIdentity(*facts, IdentityOf(candidate.entry));
  candidate.is_asked = true;
  bool found = false;
  return facts->ReadOne(found, [&] { candidate.facts = ReadFacts(*facts, 0); });
}

int CandidateRows::KindOf(Candidate& candidate, Kind& kind) {
  kind = candidate.entry.kind;
  if (kind != Kind::OTHER) {
    return SQLITE_OK;
  }
  const int code = NeedFacts(candidate);
  if (candidate.facts.has_value()) {
    kind = candidate.facts->found_kind;
  }
  return code;
}

const std::string& CandidateRows::FoldedName(Candidate& candidate) {
  if (candidate.folded.empty()) {
    candidate.folded = folder.Parts(ToUtf8(LastComponent(candidate.entry.path)));
  }
  return candidate.folded;
}

int CandidateRows::HasTwin(const Candidate& candidate, bool& has) {
  has = false;
  if (!candidate.facts.has_value() || candidate.facts->sample == 0 || candidate.entry.size == 0) {
    return SQLITE_OK;
  }
  int code = SQLITE_OK;
  if (twin == nullptr) {
    code = statements.Find(
        "SELECT 1 FROM contents.files AS files CROSS JOIN entries "
        "ON " FILEINDEX_WANTED_FILE
        " WHERE files.sample = ?1 AND files.sample <> 0 AND files.size = ?2 "
        "AND files.id <> ?3 AND files.extractor <> 0 LIMIT 1",
        twin);
  }
  if (code != SQLITE_OK) {
    return code;
  }
  twin->BindInt(1, candidate.facts->sample);
  twin->BindInt(2, candidate.entry.size);
  twin->BindInt(3, candidate.facts->id);
  return twin->ReadOne(has, [] {});
}

}  // namespace fileindexd
