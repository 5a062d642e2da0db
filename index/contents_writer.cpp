// SPDX-License-Identifier: GPL-2.0-or-later
#include "index/contents_writer.h"

#include <algorithm>
#include <exception>
#include <utility>

#include "index/contents_writer_impl.h"
#include "index/set_aside.h"
#include "index/suspicion.h"
#include "state/layout.h"

namespace fileindexd {

namespace {

constexpr int64_t MOST_TRIES = 2;

int64_t PauseAfter(int64_t tries) {
  int64_t pause = SHORTEST_PAUSE;
  for (int64_t one = 1; one < tries && pause < LONGEST_PAUSE; ++one) {
    pause *= 2;
  }
  return std::min(pause, LONGEST_PAUSE);
}

}  // namespace

bool ContentsWriter::Impl::Guarded(const std::function<bool()>& step) {
  try {
    return step();
  } catch (const std::exception&) {
    CloseAll();
    error = IndexError::NO_MEMORY;
    return false;
  }
}

bool ContentsWriter::Impl::Ready() {
  if (!table.has_value() && error == IndexError::NONE) {
    error = IndexError::OTHER;
  }
  return table.has_value();
}

// Of what is gone or cannot be opened nothing is told: somebody may be removing it.
IndexError ContentsWriter::Impl::FollowEntries() {
  const IndexError opened = entries.EnsureOpen(share.name);
  if (opened == IndexError::DAMAGED) {
    TellWriter(share.name, opened);
  }
  return opened;
}

// The entries database may have been made anew; it is then looked at from its beginning.
bool ContentsWriter::Impl::ReadyToFollow() {
  error = FollowEntries();
  if (error != IndexError::NONE) {
    return false;
  }
  if (entries.made != table->meta.entries_made) {
    table->meta.entries_made = entries.made;
    table->meta.seen = 0;
    is_looking = false;
    is_sweeping = true;
    swept = 0;
  }
  return true;
}

// What fails in the entries takes nothing from the contents. There, `files` has its rows unique: a
// violation comes of damage.
bool ContentsWriter::Impl::Done(int code) {
  if (code == SQLITE_OK) {
    return true;
  }
  error = FromSqlite(code);
  if (std::exchange(entries.failed, false)) {
    TellWriter(share.name, error);
    CloseAll();
    return false;
  }
  error = (code & 0xff) == SQLITE_CONSTRAINT ? IndexError::DAMAGED : error;
  CloseDatabase();
  if (error == IndexError::DAMAGED) {
    (void)SetAside(ContentsPath(share.name), IndexFlaw::DAMAGED, "found at work");
  }
  return false;
}

// What was given out is taken back; of what is still the same file, it is put down what came of it.
bool ContentsWriter::Impl::End(int64_t id, const Ending& put_down) {
  ContentFile file;
  bool found = false;
  bool current = false;
  if (!Ready()) {
    return false;
  }
  int code = TakeBack(id, file, found, current);
  if (code != SQLITE_OK || !found) {
    return Done(code);
  }

  ContentFile ended = file;
  ended.begun = 0;
  ended.unended = 0;
  code = current ? put_down(file, ended) : SQLITE_OK;
  return Done(code == SQLITE_OK ? table->Update(file, ended) : code);
}

bool ContentsWriter::Impl::Finish(int64_t id, const PreparedContent& content) {
  return End(id, [&](const ContentFile& file, ContentFile& ended) {
    ended.state = ContentState::DONE;
    ended.tries = 0;
    int code = Keep(file, content, ended);
    code = code == SQLITE_OK ? table->SetReason(id, "") : code;
    table->done_now += IsNotKept(ended) ? 0 : 1;
    return code;
  });
}

// What was found, if it turned out to be of a kind that is wanted.
int ContentsWriter::Impl::Keep(const ContentFile& file, const PreparedContent& content,
                               ContentFile& ended) {
  const Kind kind = content.content.kind;
  bool is_kept = true;
  const int code = IsKept(file, kind, is_kept);
  ended.extractor = is_kept ? extractor : KEPT_OUT;
  if (code != SQLITE_OK) {
    return code;
  }
  return is_kept ? table->SetContent(file, content, ended)
                 : table->SetContent(file, OfKind(kind), ended);
}

// What was found before in the same bytes, by older readers or in another try, stays. Who does not
// even tell the kind has nothing to put in its place.
int ContentsWriter::Impl::KeepOfFailure(const ContentFile& file, const Content& content,
                                        ContentFile& ended) {
  const bool is_same = file.extractor != KEPT_OUT;
  bool is_known = is_same && content.kind == Kind::OTHER;
  int code = SQLITE_OK;
  if (is_same && !is_known) {
    code = table->HoldsAny(file.id, is_known);
  }
  if (code != SQLITE_OK || !is_known) {
    return code == SQLITE_OK ? Keep(file, content, ended) : code;
  }
  ended.extractor = extractor;
  return SQLITE_OK;
}

// What is of no kind that is wanted has not failed: nobody wants to know what is in it.
void ContentsWriter::Impl::SettleKeptOut(ContentFile& file) {
  if (file.extractor == KEPT_OUT && file.state == ContentState::FAILED) {
    file.state = ContentState::DONE;
    file.tries = 0;
  }
}

bool ContentsWriter::Impl::Fail(int64_t id, const std::string& reason, const Content& content,
                                bool killed) {
  return End(id, [&](const ContentFile& file, ContentFile& ended) {
    int code = SQLITE_OK;
    ended.tries = file.state == ContentState::UNREAD ? 1 : file.tries + 1;
    ended.state = ContentState::WAITING;
    if (!killed || ended.tries >= MOST_TRIES) {
      ended.state = killed ? ContentState::QUARANTINED : ContentState::FAILED;
      code = KeepOfFailure(file, content, ended);
      SettleKeptOut(ended);
    }
    const bool is_failure = ended.state != ContentState::DONE;
    return code == SQLITE_OK ? table->SetReason(id, is_failure ? reason : "") : code;
  });
}

// Deaths that were on record before are forgotten: there is one number for both.
bool ContentsWriter::Impl::Unread(int64_t id, const std::string& reason, int64_t now) {
  return End(id, [&](const ContentFile& file, ContentFile& ended) {
    int code = SQLITE_OK;
    ended.tries = file.state == ContentState::UNREAD ? file.tries + 1 : 1;
    ended.state = ContentState::UNREAD;
    // These readers tried it; what stands there of others keeps their version. What may be of other
    // bytes goes, unless there is a text to be found.
    if (file.text == 0 && file.extractor == KEPT_OUT) {
      ended.extractor = extractor;
      code = table->SetContent(file, OfKind(file.found_kind), ended);
    }
    code = code == SQLITE_OK ? table->SetReason(id, reason) : code;
    code = code == SQLITE_OK ? table->SetDue(id, now + PauseAfter(ended.tries)) : code;
    return code == SQLITE_OK ? FollowUnread() : code;
  });
}

bool ContentsWriter::Impl::Release(int64_t id) {
  ContentFile file;
  bool found = false;
  bool current = false;
  if (!Ready()) {
    return false;
  }
  int code = TakeBack(id, file, found, current);
  code = code == SQLITE_OK ? FollowUnread() : code;
  if (code != SQLITE_OK || !found) {
    return Done(code);
  }
  released.insert(id);
  if (file.begun == 0) {
    return true;
  }
  ContentFile ended = file;
  ended.begun = 0;
  return Done(table->Update(file, ended));
}

void ContentsWriter::Impl::LookAtAll() {
  is_looking = true;
  looked = 0;
  is_sweeping = true;
  swept = 0;
}

// How far the passes have come is no part of the transaction: they begin anew.
void ContentsWriter::Impl::Rollback() {
  table->Rollback();
  renewed = 0;
  if (std::exchange(has_passed, false)) {
    LookAtAll();
  }
}

// A database that was removed is written into nowhere without an error, so the file is asked for
// after the commit.
bool ContentsWriter::Impl::Commit() {
  if (!Ready()) {
    return false;
  }
  if (!Done(table->Commit(Now()))) {
    return false;
  }
  has_passed = false;
  if (database.HasMoved()) {
    error = IndexError::PATH_NOT_FOUND;
    CloseDatabase();
    return false;
  }
  return true;
}

ContentsWriter::ContentsWriter() : impl(std::make_unique<Impl>()) {}

ContentsWriter::~ContentsWriter() {
  impl->CloseAll();
}

IndexError ContentsWriter::Open(const Share& share, int64_t extractor_version) {
  return impl->Guarded([&] { return impl->Open(share, extractor_version) == IndexError::NONE; })
             ? IndexError::NONE
             : impl->error;
}

// What was handed out is taken back: nobody will tell how it ended.
void ContentsWriter::Close() {
  if (IsOpen()) {
    impl->Rollback();
    (void)impl->Done(impl->table->ReadMeta());
  }
  while (IsOpen() && !impl->out.empty() && Release(impl->out.begin()->first)) {
  }
  if (IsOpen()) {
    (void)Commit();
  }
  impl->out.clear();
  impl->released.clear();
  impl->alone = 0;
  impl->CloseAll();
}

bool ContentsWriter::IsOpen() const {
  return impl->table.has_value();
}

void ContentsWriter::UseSettings(std::shared_ptr<const Settings> in_force) {
  impl->settings = std::move(in_force);
}

bool ContentsWriter::TakeIn(size_t limit, bool& more) {
  return impl->Guarded([&] { return impl->TakeIn(limit, more); });
}

void ContentsWriter::LookAtAll() {
  impl->LookAtAll();
}

bool ContentsWriter::NextJobs(size_t limit, std::vector<ContentJob>& jobs, bool& more) {
  return impl->Guarded([&] { return impl->NextJobs(limit, jobs, more); });
}

bool ContentsWriter::NextAgain(int64_t now, size_t limit, std::vector<ContentJob>& jobs,
                               bool& more) {
  return impl->Guarded([&] { return impl->NextAgain(now, limit, jobs, more); });
}

int64_t ContentsWriter::UnreadDue() const {
  return IsOpen() ? impl->unread_due : INT64_MAX;
}

bool ContentsWriter::BeginTries(const std::vector<int64_t>& files) {
  return impl->Guarded([&] { return impl->BeginTries(files); });
}

bool ContentsWriter::Finish(int64_t file, const PreparedContent& found) {
  return impl->Guarded([&] { return impl->Finish(file, found); });
}

bool ContentsWriter::Fail(int64_t file, const std::string& reason, const Content& found,
                          bool killed) {
  return impl->Guarded([&] { return impl->Fail(file, reason, found, killed); });
}

bool ContentsWriter::Unread(int64_t file, const std::string& reason, int64_t now) {
  return impl->Guarded([&] { return impl->Unread(file, reason, now); });
}

bool ContentsWriter::Release(int64_t file) {
  return impl->Guarded([&] { return impl->Release(file); });
}

bool ContentsWriter::RetryFailed() {
  return impl->Guarded([&] { return impl->Ready() && impl->Done(impl->RetryAll()); });
}

bool ContentsWriter::Sweep(int64_t now, size_t limit, bool& more) {
  return impl->Guarded([&] { return impl->Sweep(now, limit, more); });
}

bool ContentsWriter::Merge(bool& more) {
  return impl->Guarded([&] { return impl->Ready() && impl->Done(impl->table->MergeWords(more)); });
}

void ContentsWriter::CutLog() {
  impl->database.CutLog();
}

bool ContentsWriter::AreEntriesBeingRemoved() const {
  return impl->entries.is_going;
}

bool ContentsWriter::HasChanges() const {
  return IsOpen() && impl->table->changed;
}

size_t ContentsWriter::PendingBytes() const {
  return IsOpen() ? impl->table->pending_bytes : 0;
}

bool ContentsWriter::Commit() {
  return impl->Guarded([&] { return impl->Commit(); });
}

IndexError ContentsWriter::Error() const {
  return impl->error;
}

}  // namespace fileindexd
