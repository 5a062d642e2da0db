// SPDX-License-Identifier: GPL-2.0-or-later
// Why one entry answers a question, or does not.
#include "index/contents_reader.h"
#include "index/entry_table.h"
#include "index/question_words.h"
#include "index/reader.h"
#include "index/search.h"
#include "state/layout.h"
#include "state/sqlite.h"

namespace fileindexd {

namespace {

// Whether the text that stands for the entry holds the word.
int IsInText(sqlite3* db, const Entry& entry, const std::string& query, bool& is_in) {
  Statement match;
  const int code = match.Prepare(
      db,
      "SELECT 1 FROM contents.words WHERE words MATCH ?1 AND rowid = "
      "(SELECT text FROM contents.files WHERE inode = ?2 AND birth_time = ?3 AND size = ?4 AND "
      "mtime = ?5 AND text <> 0)");
  if (code != SQLITE_OK) {
    return code;
  }
  match.BindText(1, query);
  match.BindInt(2, static_cast<int64_t>(entry.inode));
  match.BindInt(3, entry.birth_time);
  match.BindInt(4, entry.size);
  match.BindInt(5, entry.mtime);
  const int stepped = match.Step();
  is_in = stepped == SQLITE_ROW;
  return stepped == SQLITE_ROW || stepped == SQLITE_DONE ? SQLITE_OK : stepped;
}

}  // namespace

IndexError Explain(const Question& question, const std::string& path, Explanation& explanation,
                   std::string& error) {
  QuestionWords words;
  if (!words.Read(question.text, error)) {
    return IndexError::OTHER;
  }
  EntryReader reader;
  const IndexError opened =
      question.shares.empty() ? IndexError::PATH_NOT_FOUND : reader.Open(question.shares.front());
  Entry entry;
  if (opened != IndexError::NONE || !reader.Find(path, entry)) {
    error = opened != IndexError::NONE ? IndexErrorText(opened) : "not in the index: " + path;
    return opened != IndexError::NONE ? opened : IndexError::PATH_NOT_FOUND;
  }

  const IndexError attached = AttachContents(reader.database, question.shares.front());
  const std::string name = ToUtf8(LastComponent(path));
  const std::vector<bool> in_name = words.InName(name);
  Explanation made;
  made.matches = words.HoldsSigns(name);
  for (size_t word = 0; word < words.Count(); ++word) {
    bool in_text = false;
    if (attached == IndexError::NONE && entry.content_wanted) {
      const int code = IsInText(reader.database.db, entry, words.ContentQuery(word), in_text);
      if (code != SQLITE_OK) {
        error = IndexErrorText(FromSqlite(code));
        return FromSqlite(code);
      }
    }
    const bool matches = in_name[word] || in_text;
    made.reasons.push_back(
        {words.Text(word), matches, in_name[word] ? "name" : in_text ? "text" : ""});
    made.matches = made.matches && matches;
  }
  explanation = std::move(made);
  return IndexError::NONE;
}

}  // namespace fileindexd
