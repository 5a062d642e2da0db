// SPDX-License-Identifier: GPL-2.0-or-later
// Texts of contents, and their words.
#include <algorithm>
#include <utility>

#include "index/contents_table.h"

namespace fileindexd {

namespace {

std::string SetContentSql() {
  std::string sql = "UPDATE files SET is_cut = ?2, sample = ?3, fields = ?4, (" +
                    std::string(NUMBER_COLUMNS) + ") = (?5";
  for (size_t i = 1; i < NUMBER_FIELD_COUNT; ++i) {
    sql += ", ?" + std::to_string(i + 5);
  }
  return sql + ") WHERE id = ?1";
}

}  // namespace

int ContentsTable::PrepareTexts() {
  const std::string content_sql = SetContentSql();
  const std::string holds_sql = std::string("SELECT 1 FROM files WHERE id = ?1 AND") +
                                " (text <> 0 OR sample <> 0 OR coalesce(" + NUMBER_COLUMNS +
                                ") IS NOT NULL)";
  const std::pair<Statement*, const char*> statements[] = {
      {&set_content, content_sql.c_str()},
      {&holds_any, holds_sql.c_str()},
      {&insert_text, "INSERT INTO texts(id, packed) VALUES(?1, ?2)"},
      {&read_text, "SELECT packed FROM texts WHERE id = ?1"},
      {&next_texts, "SELECT id, packed FROM texts WHERE id > ?1 AND id <= ?2 ORDER BY id"},
      {&remove_text, "DELETE FROM texts WHERE id = ?1"},
  };
  for (const auto& [statement, sql] : statements) {
    const int code = statement->Prepare(handle, sql);
    if (code != SQLITE_OK) {
      return code;
    }
  }
  return SQLITE_OK;
}

int ContentsTable::SetContent(const ContentFile& before, const PreparedContent& prepared,
                              ContentFile& file) {
  const Content& content = prepared.content;
  int code = Begin();
  if (code == SQLITE_OK && before.text != 0) {
    code = RemoveContent(file);
  }
  if (code != SQLITE_OK) {
    return code;
  }

  file.found_kind = content.kind;
  set_content.BindInts({before.id, content.is_cut ? 1 : 0, static_cast<int64_t>(content.sample),
                        FieldBits(content)});
  for (size_t i = 0; i < NUMBER_FIELD_COUNT; ++i) {
    sqlite3_bind_null(set_content.handle, static_cast<int>(i) + 5);
  }
  for (const NumberField& field : content.numbers) {
    set_content.BindInt(5 + static_cast<int>(NumberPlace(field.field)), field.number);
  }
  code = set_content.Run();
  ContentWords words = WordsOf(content);
  if (code != SQLITE_OK || words.IsEmpty()) {
    return code;
  }

  file.length = static_cast<int64_t>(words.Length());
  pending_bytes += words.Length();
  std::string made;
  if (prepared.packed.empty()) {
    made = PackTexts(content);
  }
  const std::string& packed = prepared.packed.empty() ? made : prepared.packed;
  if (packed.empty()) {
    return SQLITE_NOMEM;
  }
  file.text = ++meta.last_text;
  insert_text.BindInt(1, file.text);
  insert_text.BindBlob(2, packed);
  code = insert_text.Run();
  return code == SQLITE_OK ? AddWords(file.text, words, prepared) : code;
}

int ContentsTable::HoldsAny(int64_t id, bool& holds) {
  holds_any.BindInt(1, id);
  return holds_any.ReadOne(holds, [] {});
}

int ContentsTable::RemoveContent(ContentFile& file) {
  if (file.text != 0) {
    leaving.push_back(file.text);
    pending_bytes += 2 * static_cast<size_t>(file.length);
  }
  file.text = 0;
  file.length = 0;
  return Begin();
}

// An empty column is NULL: the tokenizer is not even called.
int ContentsTable::RunWords(Statement& statement, int64_t text, const ContentWords& words) {
  statement.BindInt(1, text);
  int column = 2;
  const auto bind = [&](std::string_view value) {
    if (value.empty()) {
      sqlite3_bind_null(statement.handle, column++);
    } else {
      statement.BindText(column++, value);
    }
  };
  bind(words.text);
  for (const std::string_view field : words.fields) {
    bind(field);
  }
  bind(words.numbers);
  return statement.Run();
}

// What was cut beforehand is of one language, and both tables may want words.
int ContentsTable::AddWords(int64_t text, ContentWords& words, const PreparedContent& prepared) {
  const std::string_view whole = words.text;
  const auto use = [&](const std::string& language) {
    const bool is_cut = !prepared.cut_text.empty() && prepared.language == language;
    words.text = is_cut ? std::string_view(prepared.cut_text) : whole;
  };
  use(meta.language);
  const int code = RunWords(insert_words, text, words);
  if (code != SQLITE_OK || new_language.empty()) {
    return code;
  }
  use(new_language);
  return RunWords(insert_new_words, text, words);
}

int ContentsTable::RemoveWords() {
  std::sort(leaving.begin(), leaving.end());
  int code = SQLITE_OK;
  for (size_t i = 0; i < leaving.size() && code == SQLITE_OK; ++i) {
    code = RemoveWordsOf(leaving[i]);
  }
  leaving.clear();
  return code;
}

int ContentsTable::RemoveWordsOf(int64_t text) {
  Content content;
  read_text.BindInt(1, text);
  int code = read_text.Step();
  const bool sound = code == SQLITE_ROW && UnpackTexts(read_text.Bytes(0), content);
  read_text.Reset();
  if (!sound) {
    return StepError(code) == SQLITE_OK ? SQLITE_CORRUPT : code;
  }

  const ContentWords words = WordsOf(content);
  code = may_remove ? RunWords(remove_words, text, words) : SQLITE_OK;
  const bool is_made = text <= meta.reworded || text > meta.reword_end;
  if (code == SQLITE_OK && !new_language.empty() && is_made) {
    code = RunWords(remove_new_words, text, words);
  }
  remove_text.BindInt(1, text);
  return code == SQLITE_OK ? remove_text.Run() : code;
}

}  // namespace fileindexd
