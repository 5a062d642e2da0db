// SPDX-License-Identifier: GPL-2.0-or-later
#include "search/share_contents.h"

#include <algorithm>
#include <utility>

#include "search/log.h"
#include "state/filesystem.h"
#include "state/layout.h"

namespace fileindexd {

namespace {

using std::chrono::milliseconds;
using std::chrono::seconds;

// Rows of one slice: some milliseconds.
constexpr size_t TAKE_IN_ROWS = 1000;
constexpr size_t SWEEP_ROWS = 500;
// A busy daemon commits many times a second, and some of its commits take long: looks become rarer,
// from one to the next, until it closes the entries.
constexpr milliseconds SHORTEST_BETWEEN_LOOKS(2);
constexpr milliseconds LONGEST_BETWEEN_LOOKS(100);
// What is written into a database's log is told of at once, and counts only when the disk has it.
// A slow disk may take its time.
constexpr milliseconds LATER_LOOKS[] = {milliseconds(200), milliseconds(1000), milliseconds(5000),
                                        milliseconds(30000), milliseconds(120000)};
// Its page cache is of no use any more.
constexpr seconds CLOSE_AFTER(10);

}  // namespace

ShareContents::ShareContents(Share followed) : share(std::move(followed)) {}

void ShareContents::Set(const Share& current, const ShareStatus& status) {
  const bool is_other = current.path != share.path || current.filesystem != share.filesystem ||
                        current.language != share.language;
  if (is_other) {
    FilesChanged();
    rest_until = Time();
  }
  share = current;
  retry_wanted = status.retry_contents;
  is_reindexing = status.needs_reindex || status.reindex_begun;

  if (status.no_space != no_space) {
    ServiceLog(status.no_space ? "Share[%s] low on space, no contents are read"
                               : "Share[%s] has space again",
               share.name.c_str());
    no_space = status.no_space;
    if (no_space) {
      Halt();
    }
  }
}

void ShareContents::EntriesChanged() {
  has_news = true;
  later_looks = 0;
  is_missing = false;
}

// Nothing is opened for it, or our own closing would keep us awake for ever.
void ShareContents::EntriesClosed() {
  if (IsOpen()) {
    has_news = true;
    between_looks = milliseconds(0);
    next_take_in = std::min(next_take_in, taken_in + SHORTEST_BETWEEN_LOOKS);
  }
}

void ShareContents::LookAtAll() {
  look_at_all = true;
  is_missing = false;
}

void ShareContents::FilesChanged() {
  Halt();
  LookAtAll();
}

bool ShareContents::CanWork(Time now) const {
  return !no_space && !IsResting(now);
}

bool ShareContents::IsIdle() const {
  return !has_news && !look_at_all && !Sweeps() && !WantsMore() && fresh.ready.empty() &&
         again.ready.empty() && running.empty() && !opener.IsWaiting() && !retry_wanted &&
         !HasChanges();
}

// When the disk is asked again for what it did not give. The writer may be closed meanwhile.
void ShareContents::FollowUnread(Time now, int64_t wall) {
  constexpr int64_t LONGEST = 3600;  // seconds: the clock may be set back meanwhile
  wall_time = wall;
  const auto arm = [&](int64_t least) {
    next_unread = unread_due == INT64_MAX
                      ? Time::max()
                      : now + seconds(std::clamp(unread_due - wall, least, LONGEST));
  };
  if (writer.IsOpen() && writer.UnreadDue() != unread_due) {
    unread_due = writer.UnreadDue();
    arm(0);
  }
  if (now >= next_unread) {
    again.may_have = true;
    arm(1);  // those of one moment are more than are given out at once
  }
}

void ShareContents::Work(Time now, int64_t wall) {
  if (!TakeCommit(now)) {
    return;
  }
  if (in_force != nullptr) {
    writer.UseSettings(std::exchange(in_force, nullptr));
  }
  if (CanWork(now)) {
    TakeAnswers(now);
    BeginTries(now);
  }
  if (!CanWork(now) || committing.IsRunning()) {
    return;
  }
  if (now >= next_full_look) {
    look_at_all = true;
    next_full_look = now + BETWEEN_FULL_LOOKS;
  }
  FollowUnread(now, wall);
  if (now >= later_look) {
    has_news = true;
    later_look = Time::max();
  }
  if (!writer.IsOpen()) {
    if (is_missing || IsIdle()) {
      return;
    }
    Open(now);
    return;
  }

  // What more there is to take in may be the words of all texts.
  if (takes_more && !HasRoom(now)) {
    return;
  }
  if (!Retry() || !TakeIn(now) || !Sweep(wall) || !ReleasePatient(now)) {
    RestForError(now);
    return;
  }
  CommitIfDue(now);
  if (!Merge()) {
    RestForError(now);
    return;
  }
  CloseIfIdle(now);
}

bool ShareContents::Retry() {
  if (!retry_wanted) {
    return true;
  }
  if (!writer.RetryFailed() || !Commit()) {
    return false;
  }
  retry_wanted = false;
  retried = true;
  MayHaveMore();
  return true;
}

bool ShareContents::TakeIn(Time now) {
  if (look_at_all) {
    writer.LookAtAll();
    look_at_all = false;
    has_news = true;
    next_take_in = now;
  }
  if (!has_news || now < next_take_in) {
    return true;
  }

  bool more = false;
  if (!writer.TakeIn(TAKE_IN_ROWS, more)) {
    return false;
  }
  MayHaveMore();
  has_news = takes_more = more;
  if (!more) {
    is_sweeping = true;
    taken_in = now;
    between_looks = std::clamp(2 * between_looks, SHORTEST_BETWEEN_LOOKS, LONGEST_BETWEEN_LOOKS);
    next_take_in = now + between_looks;
    LookLater(now);
  }
  return true;
}

void ShareContents::LookLater(Time now) {
  later_look = Time::max();
  if (later_looks < std::size(LATER_LOOKS)) {
    later_look = now + LATER_LOOKS[later_looks++];
  }
}

bool ShareContents::Sweep(int64_t wall) {
  return !Sweeps() || writer.Sweep(wall, SWEEP_ROWS, is_sweeping);
}

bool ShareContents::ReleasePatient(Time now) {
  while (!patient.empty() && patient.begin()->first <= now) {
    if (!writer.Release(patient.begin()->second)) {
      return false;
    }
    patient.erase(patient.begin());
    MayHaveMore();
  }
  return true;
}

// Only when there is nothing else to do, and not where the entries need the last room: then it
// waits for the next texts.
bool ShareContents::Merge() {
  if (!may_merge || !IsIdle()) {
    return true;
  }
  if (!HasSpace(StateRoot(), false)) {
    may_merge = false;
    return true;
  }
  return writer.Merge(may_merge) && Commit();
}

void ShareContents::CloseIfIdle(Time now) {
  const bool is_short = later_look != Time::max() && later_look - now < CLOSE_AFTER;
  if (!IsIdle() || may_merge || !patient.empty() || is_short) {
    idle_since = now;
  } else if (now - idle_since >= CLOSE_AFTER) {
    const Time look = later_look;
    const bool sweep = is_sweeping;
    const bool reads_again = again.may_have;
    GoneOn();
    writer.CutLog();
    Forget();
    later_look = look;
    is_sweeping = sweep;
    again.may_have = reads_again;
  }
}

void ShareContents::Halt(bool cuts_log) {
  // A writer that has just closed for a commit that failed still knows what it had given out.
  const bool is_good = AwaitCommit();
  if (is_good && !writer.IsOpen()) {
    DropQuestions();
    return;
  }

  // A failure here costs no more than a try on record of files that were not to blame.
  bool good = is_good;
  for (const auto& [id, one] : running) {
    good = good && writer.Release(one.file);
  }
  for (const Line* line : {&fresh, &again}) {
    for (const Ready& one : line->ready) {
      good = good && writer.Release(one.job.file);
    }
  }
  for (const Ready& one : opened) {
    good = good && writer.Release(one.job.file);
  }
  if (!good || (writer.HasChanges() && !writer.Commit())) {
    ServiceDebug("Share[%s] stopped in the middle, reason=%s", share.name.c_str(),
                 IndexErrorText(writer.Error()));
  }
  if (cuts_log && writer.IsOpen()) {
    writer.CutLog();
  }
  Forget();
  has_news = true;
}

void ShareContents::AddPolled(std::vector<pollfd>& polled) const {
  if (committing.IsRunning()) {
    committing.AddPolled(polled);  // answers are taken behind it
  } else {
    opener.AddPolled(polled);
  }
}

Time ShareContents::Due() const {
  if (no_space || committing.IsRunning()) {
    return Time::max();
  }
  if (is_asking_root && !root.has_value()) {
    return opener.Deadline();
  }
  Time due = std::min(next_full_look, next_unread);
  const bool has_work =
      Sweeps() || look_at_all || retry_wanted || !opened.empty() || (may_merge && IsIdle());
  if (!writer.IsOpen()) {
    due = is_missing                            ? due
          : has_news || has_work || WantsMore() ? Time()
                                                : std::min(due, later_look);
    return std::max(due, rest_until);
  }

  if (has_work) {
    return Time();
  }
  if (has_news) {
    due = std::min(due, next_take_in);
  }
  due = std::min({due, later_look, opener.Deadline()});
  if (!patient.empty()) {
    due = std::min(due, patient.begin()->first);
  }
  if (writer.HasChanges()) {
    due = std::min(due, CommitDue());
  }
  return std::min(due, IsIdle() ? idle_since + CLOSE_AFTER : Time::max());
}

}  // namespace fileindexd
