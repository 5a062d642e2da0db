// SPDX-License-Identifier: GPL-2.0-or-later
// The input is a question and, after a NUL, the name of one more entry. Whatever a user asks, the
// full-text tables are not asked what they take for an error.
#include <memory>
#include <string>

#include "fuzz/target.h"
#include "index/database.h"
#include "index/entry_table.h"
#include "index/question_words.h"
#include "index/search.h"
#include "scripted/temp_folder.h"
#include "state/layout.h"

namespace fileindexd::fuzz {

namespace {

// A question as a whole opens the index anew: a hundred times the cost of its parts.
constexpr unsigned EVERY = 64;

Entry EntryAt(const std::string& folder, const std::string& name) {
  Entry entry;
  entry.path = folder + "/" + name;
  entry.thing = Thing::FILE;
  return entry;
}

class Index {
 public:
  Index() {
    setenv("FILEINDEXD_STATE_DIR", folder.path.c_str(), 1);
    std::string error;
    Require(MakeShareFolder("s", error), error.c_str());
    Require(database.OpenForWriting(IndexPath("s"), true) == IndexError::NONE, "an index");
    Require(table.Prepare(database.db) == SQLITE_OK, "its tables");
    Require(table.Begin() == SQLITE_OK, "a transaction");
    for (const char* name :
         {"holiday beach.jpg", "C++ notes.txt", "a \"b\" AND (c) *.md", "--", "x"}) {
      Require(table.Insert(EntryAt("/s", name)) == SQLITE_OK, "an entry");
    }
    Require(table.Commit(1) == SQLITE_OK, "a commit");
    Require(
        names.Prepare(database.db, "SELECT rowid FROM names WHERE names MATCH ?1") == SQLITE_OK &&
            parts.Prepare(database.db, "SELECT rowid FROM parts WHERE parts MATCH ?1") == SQLITE_OK,
        "statements");
  }

  void Ask(const std::string& text, const std::string& name) {
    QuestionWords words;
    std::string error;
    if (!words.Read(text, error)) {
      Require(!error.empty(), "a refusal has a reason");
      return;
    }

    Require(table.Begin() == SQLITE_OK, "a transaction");
    const Entry entry = EntryAt("/s/fuzz", name);
    Require(table.Insert(entry) == SQLITE_OK, "a name of any bytes");
    Match(names, words.NamesQuery());
    Match(parts, words.PartsQuery());
    (void)words.HoldsSigns(ToUtf8(LastComponent(entry.path)));
    const double score = words.Score(entry);
    Require(score >= 0 && score < 10, "a score in its range");
    table.Rollback();
    if (asked++ % EVERY == 0) {
      AskAll(text);
    }
  }

 private:
  static void Match(Statement& statement, const std::string& query) {
    if (query.empty()) {
      return;
    }
    statement.BindText(1, query);
    int code = statement.Step();
    while (code == SQLITE_ROW) {
      code = statement.Step();
    }
    Require(code == SQLITE_DONE, ("no error in: " + query).c_str());
    statement.Reset();
  }

  static void AskAll(const std::string& text) {
    Question question;
    question.text = text;
    question.shares = {"s"};
    Answer answer;
    std::string error;
    Require(fileindexd::Ask(question, answer, error), "what was understood is asked");
    Require(answer.failures.empty(), "no share fails");
    Require(answer.hits.size() <= answer.total, "hits are counted");
  }

  scripted::TempFolder folder;
  IndexDatabase database;
  EntryTable table;
  Statement names, parts;
  unsigned asked = 0;
};

}  // namespace

}  // namespace fileindexd::fuzz

int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  static auto* index = new fileindexd::fuzz::Index;  // lives as long as the process
  const std::string text(reinterpret_cast<const char*>(data), size);
  const size_t nul = text.find('\0');
  index->Ask(text.substr(0, nul), nul == std::string::npos ? "" : text.substr(nul + 1));
  return 0;
}
