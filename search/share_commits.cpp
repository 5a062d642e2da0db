// SPDX-License-Identifier: GPL-2.0-or-later
// When what was found goes on record, and what is about to be tried; in a thread of its own while
// there is more to read.
#include <algorithm>
#include <iterator>
#include <utility>

#include "search/share_contents.h"

namespace fileindexd {

namespace {

using std::chrono::milliseconds;

constexpr milliseconds COMMIT_AGE(400);
// What is still being read after that time is slow, and what was read beside it does not wait.
constexpr milliseconds LULL(20);

}  // namespace

// With nothing more to come, at once: somebody may be waiting for it. What is being read for longer
// than a lull is slow, and is not waited for.
Time ShareContents::CommitDue() const {
  if (!first_change || writer.PendingBytes() >= enough_pending) {
    return Time();
  }
  const Time latest = *first_change + COMMIT_AGE;
  if (has_news || Sweeps() || WantsMore() || opening || !fresh.ready.empty() ||
      (may_read_again && !again.ready.empty())) {
    return latest;
  }
  Time newest;
  for (const auto& [id, one] : running) {
    newest = std::max(newest, one.since);
  }
  return running.empty() ? Time() : std::min({latest, last_end + LULL, newest + LULL});
}

void ShareContents::CommitIfDue(Time now) {
  if (!opened.empty()) {
    return;  // all goes on record along with their tries
  }
  if (!writer.HasChanges()) {
    first_change.reset();
    return;
  }

  first_change = first_change.value_or(now);
  if (now >= CommitDue()) {
    CommitBeside([this] { return writer.Commit(); }, now);
  }
}

// With nothing to do meanwhile, it is done here: what is new is found sooner.
void ShareContents::CommitBeside(std::function<bool()> commit, Time now) {
  const auto work = [this, commit = std::move(commit)] { committed = commit(); };
  if (!HasMore() || !committing.Begin(work)) {
    work();
    EndCommit(now);
  } else {
    (void)TakeCommit(now);
  }
}

// False while the writer is committing.
bool ShareContents::TakeCommit(Time now) {
  if (!committing.IsRunning()) {
    return true;
  }
  if (!committing.HasEnded()) {
    return false;
  }
  (void)AwaitCommit();
  EndCommit(now);
  return true;
}

// False when one was under way and failed: its writer has closed.
bool ShareContents::AwaitCommit() {
  const bool is_running = committing.IsRunning();
  committing.Await();
  return !is_running || committed;
}

void ShareContents::EndCommit(Time now) {
  if (!committed) {
    RestForError(now);
    return;
  }
  first_change.reset();
  std::deque<Ready>& ready = LineOf(opened_for).ready;
  std::move(opened.begin(), opened.end(), std::back_inserter(ready));
  opened.clear();
  GoneOn();
}

bool ShareContents::Commit() {
  if (!writer.Commit()) {
    return false;
  }
  first_change.reset();
  GoneOn();
  return true;
}

// What is open goes to the helpers once it is on record.
void ShareContents::BeginTries(Time now) {
  if (opened.empty() || committing.IsRunning()) {
    return;
  }
  std::vector<int64_t> files;
  files.reserve(opened.size());
  for (const Ready& one : opened) {
    files.push_back(one.job.file);
  }
  CommitBeside([this, files = std::move(files)] { return writer.BeginTries(files); }, now);
}

}  // namespace fileindexd
