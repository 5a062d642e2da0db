// SPDX-License-Identifier: GPL-2.0-or-later
#include "index/asked_share.h"

#include <exception>
#include <new>
#include <thread>
#include <utility>

#include "index/content_functions.h"
#include "index/contents_reader.h"
#include "index/suspicion.h"
#include "index/text_tokenizer.h"

namespace fileindexd {

namespace {

constexpr int TRIES = 6;
constexpr int MOST_CONTENTS_TRIES = 2;
constexpr int STEPS_BETWEEN_LOOKS = 20000;  // of SQLite's machine, at the clock

constexpr std::chrono::milliseconds REPLACING_PAUSE{10};

int IsTooLate(void* deadline) {
  const auto& end = *static_cast<const std::chrono::steady_clock::time_point*>(deadline);
  return std::chrono::steady_clock::now() > end ? 1 : 0;
}

// What it reads, if anything, does not count.
int Execute(KeptStatements& statements, const char* sql) {
  Statement* statement = nullptr;
  int code = statements.Find(sql, statement);
  code = code == SQLITE_OK ? statement->Run() : code;
  return code == SQLITE_ROW ? SQLITE_OK : code;
}

}  // namespace

void AskedShare::Fail(const std::string& what) {
  failures.push_back("share " + name + ": " + what);
}

// A database that was made anew, or contents that have come since, are opened.
bool AskedShare::IsInPlace() const {
  return reader.database.IsOpen() && has_contents && !reader.database.HasMoved();
}

void AskedShare::Release() {
  run.reset();
  hits.clear();
  failures.clear();
  total = 0;
  if (reader.database.IsOpen() && sqlite3_get_autocommit(reader.database.db) == 0) {
    statements.Reset();
    (void)Execute(statements, "ROLLBACK");  // only read
  }
}

IndexError AskedShare::Open(bool with_contents) {
  run.reset();
  if (with_contents && IsInPlace() && sqlite3_get_autocommit(reader.database.db) != 0 &&
      Begin() == SQLITE_OK) {
    return IndexError::NONE;
  }
  return OpenAnew(with_contents);
}

IndexError AskedShare::OpenAnew(bool with_contents) {
  has_contents = false;
  statements.Use(nullptr);
  const IndexError error = reader.OpenOnceMade(name);
  if (error != IndexError::NONE) {
    return error;
  }
  contents_error = with_contents ? AttachContents(reader.database, name) : contents_error;
  has_contents = with_contents && contents_error == IndexError::NONE;
  if (!has_contents) {
    const int registered = RegisterQuestionFunctions(reader.database.db);
    if (registered != SQLITE_OK) {
      return FromSqlite(registered);
    }
  }
  sqlite3_progress_handler(reader.database.db, STEPS_BETWEEN_LOOKS, IsTooLate, &deadline);
  statements.Use(reader.database.db);
  return FromSqlite(Begin());
}

// The first read of each database decides which state of it is seen.
int AskedShare::Begin() {
  int code = Execute(statements, "BEGIN");
  code =
      code == SQLITE_OK ? Execute(statements, "SELECT entries FROM main.meta WHERE id = 1") : code;
  Statement* meta = nullptr;
  code = code == SQLITE_OK && has_contents
             ? statements.Find("SELECT language, last_text FROM contents.meta WHERE id = 1", meta)
             : code;
  if (code != SQLITE_OK || meta == nullptr) {
    return code;
  }
  bool found = false;
  return meta->ReadOne(found, [&] { words = {meta->Bytes(0), meta->Int(1) != 0}; });
}

int AskedShare::RunOnce(const Question& question, const Asked& asked, const HitOrder& order,
                        uint64_t wanted) {
  BestHits best(wanted, order);
  total = 0;
  run = std::make_unique<ShareRun>(statements, has_contents, question, asked, name, names);
  const int code = run->Run(best, total);
  best.Cut();
  hits = std::move(best.hits);
  return code;
}

void AskedShare::Ask(const Question& question, const Asked& asked, const HitOrder& order,
                     uint64_t wanted) {
  try {
    AskTries(question, asked, order, wanted);
  } catch (const std::bad_alloc&) {
    Fail(IndexErrorText(IndexError::NO_MEMORY));
  } catch (const std::exception& failure) {
    Fail(failure.what());
  }
}

// What fails twice with contents is tried without them: what is wrong with them does not hide what
// the names answer.
void AskedShare::AskTries(const Question& question, const Asked& asked, const HitOrder& order,
                          uint64_t wanted) {
  deadline = std::chrono::steady_clock::now() + question.patience;
  has_index = !EntryReader::IsMissing(name);
  if (!has_index) {
    // One that is to be made yet holds nothing to find: that is no failure.
    if (std::find(question.lost.begin(), question.lost.end(), name) != question.lost.end()) {
      Fail(IndexErrorText(IndexError::PATH_NOT_FOUND));
    }
    return;
  }
  IndexError of_contents = IndexError::NONE;
  int failed_with_contents = 0;
  bool was_there = false;
  for (int tries = 1;; ++tries) {
    const bool with_contents = failed_with_contents < MOST_CONTENTS_TRIES;
    IndexError error = Open(with_contents);
    was_there = was_there || error == IndexError::NONE;
    const int code =
        error == IndexError::NONE ? RunOnce(question, asked, order, wanted) : SQLITE_OK;
    if (error == IndexError::NONE && code == SQLITE_OK) {
      of_contents = with_contents ? contents_error : of_contents;
      TellContentsWriter(name, of_contents);
      if (of_contents != IndexError::NONE && of_contents != IndexError::PATH_NOT_FOUND) {
        Fail(std::string("contents: ") + IndexErrorText(of_contents));
      }
      return;
    }

    hits.clear();
    total = 0;
    run.reset();
    error = error == IndexError::NONE ? FromSqlite(code) : error;
    // Somebody may hold its databases: waiting for them counts as well.
    if ((code & 0xff) == SQLITE_INTERRUPT ||
        (error == IndexError::BUSY && IsTooLate(&deadline) != 0)) {
      Fail("no answer within " + std::to_string(question.patience.count()) + " seconds");
      return;
    }
    if (error == IndexError::PATH_NOT_FOUND && was_there) {
      return;  // the share was removed meanwhile: it holds nothing to find
    }
    if (has_contents) {
      ++failed_with_contents;
      of_contents = error;
    }
    if (tries == TRIES || error == IndexError::PATH_NOT_FOUND) {
      TellWriter(name, error);
      Fail(IndexErrorText(error));
      return;
    }
    std::this_thread::sleep_for(REPLACING_PAUSE);  // whoever replaces it is not done yet
  }
}

void AskedShare::Complete(std::vector<Hit>& shown, CutterPool& cutters) {
  if (run == nullptr) {
    return;
  }
  try {
    const std::string known = has_contents ? LanguageName(words.language) : "";
    const std::string language = known.empty() ? NO_LANGUAGE : known;
    std::unique_ptr<TextCutter> cutter = cutters.Lend(language);
    for (Hit& hit : shown) {
      if (hit.share == name) {
        TellContentsWriter(name, FromSqlite(run->Complete(hit, *cutter)));
      }
    }
    cutters.TakeBack(language, std::move(cutter));
  } catch (const std::exception&) {
    // No memory: the rest is shown without.
  }
}

}  // namespace fileindexd
