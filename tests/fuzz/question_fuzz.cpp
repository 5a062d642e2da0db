// SPDX-License-Identifier: GPL-2.0-or-later
// The input is a question and, after a NUL, the name of one more entry. Whatever a user asks, it is
// understood or refused with a reason, and the full-text tables are not asked what they take for an
// error. Counting finds as many as looking.
#include <memory>
#include <string>
#include <vector>

#include "fuzz/target.h"
#include "index/asked.h"
#include "index/contents_reader.h"
#include "index/contents_writer.h"
#include "index/database.h"
#include "index/entry_table.h"
#include "index/hit_display.h"
#include "index/search.h"
#include "index/share_run.h"
#include "scripted/temp_folder.h"
#include "state/layout.h"

namespace fileindexd::fuzz {

namespace {

// A question as a whole opens the index anew: a hundred times the cost of its parts.
constexpr unsigned EVERY = 64;

Entry EntryAt(const std::string& folder, const std::string& name, uint64_t inode) {
  Entry entry;
  entry.path = folder + "/" + name;
  entry.thing = Thing::FILE;
  entry.content_wanted = true;
  entry.inode = inode;
  entry.size = 4000;
  entry.mtime = 1'704'412'900'000'000'000;
  return entry;
}

// Something in every field.
Content Everything() {
  Content content;
  content.kind = Kind::PHOTO;
  content.text = "a holiday at the beach, v1.2 of foo_bar; \u6771\u4eac and \u00dcbung";
  content.sample = 7;
  for (int field = 1; field <= static_cast<int>(TEXT_FIELD_COUNT); ++field) {
    content.texts.push_back({static_cast<ContentField>(field), "field beach notes"});
  }
  for (auto field = static_cast<int>(FIRST_NUMBER_FIELD);
       IsContentField(static_cast<uint8_t>(field)); ++field) {
    content.numbers.push_back({static_cast<ContentField>(field), 5});
  }
  return content;
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
    uint64_t inode = 0;
    for (const char* name :
         {"holiday beach.jpg", "C++ notes.txt", "a \"b\" AND (c) *.md", "--", "x"}) {
      Require(table.Insert(EntryAt("/s", name, ++inode)) == SQLITE_OK, "an entry");
    }
    Require(table.Commit(1) == SQLITE_OK, "a commit");
    ReadContents();
    Require(AttachContents(database, "s") == IndexError::NONE, "contents");
    Require(marker.Open(), "a tokenizer");
  }

  void Ask(const std::string& text, const std::string& name) {
    Question question;
    question.text = text;
    Asked asked;
    std::string error;
    if (!asked.Read(question, marker, error)) {
      Require(!error.empty() && error.find('\n') == std::string::npos, "a reason in one line");
      return;
    }

    Require(table.Begin() == SQLITE_OK, "a transaction");
    const Entry entry = EntryAt("/s/fuzz", name, 1);  // another name of a file that was read
    Require(table.Insert(entry) == SQLITE_OK, "a name of any bytes");
    Run(question, asked);
    size_t before = 0;
    for (const Snippet::Mark& mark : MarksInPath(asked, entry, marker)) {
      Require(mark.start >= before && mark.start < mark.end && mark.end <= entry.path.size(),
              "marks lie in the path, in order");
      before = mark.end;
    }
    table.Rollback();
    if (asked_before++ % EVERY == 0) {
      AskAll(question);
    }
  }

 private:
  // Of the first two all; the third one failed, and the others wait.
  static void ReadContents() {
    ContentsWriter writer;
    bool more = true;
    std::vector<ContentJob> jobs;
    Require(writer.Open({"s", "/s", "fs"}, 1) == IndexError::NONE, "contents");
    Require(writer.TakeIn(100, more) && writer.NextJobs(100, jobs, more), "files that wait");
    for (const ContentJob& job : jobs) {
      Require(job.identity.inode > 2 || writer.Finish(job.file, Everything()), "a content");
      Require(job.identity.inode != 3 || writer.Fail(job.file, "broken", Content(), false),
              "a failure");
    }
    Require(writer.Commit(), "a commit");
  }

  void Run(const Question& question, const Asked& asked) {
    BestHits best(10, {});
    uint64_t total = 0;
    KeptStatements statements(database.db);
    ShareRun run(statements, true, question, asked, "s", marker);
    Require(run.Run(best, total) == SQLITE_OK, "no error");
    best.Cut();
    Require(best.hits.size() <= total, "hits are counted");
    for (const Hit& hit : best.hits) {
      Require(hit.score >= 0 && hit.score < 10, "a score in its range");
    }

    Question counted = question;
    counted.limit = 0;
    BestHits none(0, {});
    uint64_t again = 0;
    ShareRun count(statements, true, counted, asked, "s", marker);
    Require(count.Run(none, again) == SQLITE_OK, "no error");
    Require(again == total, "counting finds as many as looking");
  }

  static void AskAll(Question question) {
    question.shares = {"s"};
    Answer answer;
    std::string error;
    if (!fileindexd::Ask(question, answer, error)) {
      // What it names may be nowhere.
      Require(
          error.find(": there is no such share (") != std::string::npos ||
              error.find(": the shares that are asked know no such folder (") != std::string::npos,
          "what was understood is asked");
      return;
    }
    Require(answer.failures.empty(), "no share fails");
    Require(answer.hits.size() <= answer.total, "hits are counted");
  }

  scripted::TempFolder folder;
  IndexDatabase database;
  EntryTable table;
  NameMarker marker;
  unsigned asked_before = 0;
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
