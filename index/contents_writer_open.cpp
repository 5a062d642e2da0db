// SPDX-License-Identifier: GPL-2.0-or-later
// Opening the contents, and what is put right before the first job.
#include "index/contents_writer_impl.h"
#include "index/set_aside.h"
#include "index/text_tokenizer.h"
#include "index/words_version.h"
#include "state/layout.h"

namespace fileindexd {

namespace {

constexpr int64_t SLICE = 1000;
// Somebody who kills services means no file, and may well do so twice.
constexpr int64_t MOST_DEATHS = 5;

}  // namespace

IndexError ContentsWriter::Impl::Open(const Share& of_share, int64_t extractor_version) {
  CloseAll();
  share = of_share;
  extractor = extractor_version;
  error = FollowEntries();
  if (error != IndexError::NONE) {
    return error;
  }

  error = TryOpen();
  if (error == IndexError::DAMAGED) {
    CloseAll();
    error = SetAside(ContentsPath(share.name), IndexFlaw::DAMAGED, "its tables are not whole")
                ? TryOpen()
                : IndexError::IO;
  }
  if (error != IndexError::NONE) {
    CloseAll();
  }
  return error;
}

IndexError ContentsWriter::Impl::TryOpen() {
  const std::string path = ContentsPath(share.name);
  IndexError opened = database.OpenForWriting(path, true, CONTENTS_FORM);
  if (opened == IndexError::NONE) {
    opened = SetUp();
  }
  // Of another file system: its inodes say nothing here.
  if (opened == IndexError::NONE && !table->meta.filesystem.empty() &&
      table->meta.filesystem != share.filesystem) {
    CloseDatabase();
    if (!MakeEmptyIndex(path)) {
      return IndexError::IO;
    }
    opened = database.OpenForWriting(path, true, CONTENTS_FORM);
    opened = opened == IndexError::NONE ? SetUp() : opened;
  }
  if (opened != IndexError::NONE) {
    return opened;
  }
  const int code = Own();
  return code == SQLITE_ERROR ? IndexError::DAMAGED : FromSqlite(code);
}

IndexError ContentsWriter::Impl::SetUp() {
  table.emplace();
  const int code = table->Prepare(database.db);
  // SQLITE_ERROR: our numbers in the header without our tables.
  return code == SQLITE_ERROR ? IndexError::DAMAGED : FromSqlite(code);
}

// Makes it this share's, this language's and these readers' database.
int ContentsWriter::Impl::Own() {
  const std::string language = LanguageOfWords(share.language);
  const std::string version = WordsVersion(language);
  int code = SQLITE_OK;
  if (table->meta.filesystem != share.filesystem) {
    code = table->Begin();
    table->meta.filesystem = share.filesystem;
  }
  code = code == SQLITE_OK ? table->UseWords(language, version) : code;
  code = code == SQLITE_OK ? JudgeLeftBegun() : code;
  code = code == SQLITE_OK ? table->LimitDue(Now() + LONGEST_PAUSE) : code;
  code = code == SQLITE_OK ? FollowUnread() : code;
  return code == SQLITE_OK ? table->Commit(Now()) : code;
}

// What a service that died left in flight. One of many is most likely innocent; one that was alone
// as often did it. What this writer itself left in flight, when its database failed, is forgiven.
int ContentsWriter::Impl::JudgeLeftBegun() {
  std::vector<ContentFile> left;
  int code = SQLITE_OK;
  do {
    code = table->LeftBegun(SLICE + static_cast<int64_t>(out.size()), left);
    std::erase_if(left, [this](const ContentFile& file) { return out.contains(file.id); });
    for (size_t i = 0; i < left.size() && code == SQLITE_OK; ++i) {
      ContentFile file = left[i];
      const bool was_alone = file.begun == 1;
      file.begun = 0;
      file.unended += has_judged ? 0 : 1;
      const bool was_tried =
          file.state == ContentState::WAITING || file.state == ContentState::UNREAD;
      if (was_alone && file.unended >= MOST_DEATHS && was_tried) {
        file.state = ContentState::QUARANTINED;
        file.tries = file.unended;
        file.extractor = extractor;
        code = table->SetReason(file.id, "the content service ended over it again and again");
      }
      code = code == SQLITE_OK ? table->Update(left[i], file) : code;
    }
  } while (code == SQLITE_OK && !left.empty());
  has_judged = has_judged || code == SQLITE_OK;
  return code;
}

int ContentsWriter::Impl::RetryAll() {
  std::vector<ContentFile> failed;
  int64_t after = 0;
  int code = SQLITE_OK;
  do {
    code = table->Failed(after, SLICE, failed);
    for (size_t i = 0; i < failed.size() && code == SQLITE_OK; ++i) {
      ContentFile file = failed[i];
      after = file.id;
      WaitAnew(file);
      code = table->Update(failed[i], file);
    }
  } while (code == SQLITE_OK && !failed.empty());
  return code;
}

// What is in flight goes on: its outcome comes to whatever is opened next.
void ContentsWriter::Impl::CloseDatabase() {
  if (table.has_value()) {
    Rollback();
  }
  table.reset();
  database.Close();
}

void ContentsWriter::Impl::CloseAll() {
  CloseDatabase();
  entries.Close();
}

}  // namespace fileindexd
