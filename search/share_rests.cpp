// SPDX-License-Identifier: GPL-2.0-or-later
// Opening a share, what its file system answers, and rests.
#include <algorithm>
#include <utility>

#include "search/log.h"
#include "search/share_contents.h"
#include "state/filesystem.h"
#include "state/layout.h"

namespace fileindexd {

namespace {

using std::chrono::seconds;

constexpr seconds SHORTEST_REST(1);
constexpr seconds LONGEST_REST(60);
// At once: writing down what was found takes its time, in which nobody gives the helpers work.
constexpr size_t MOST_ANSWERS = 4;

}  // namespace

void ShareContents::Open(Time now) {
  if (!HasRoom(now)) {
    return;
  }
  if (!is_asking_root) {
    is_asking_root = true;
    const auto ask = [this, asked = share]() -> Opener::Answer {
      const RootState state = LookAtRoot(asked);
      return [this, state] { root = state; };
    };
    Ask(ask, now);
  }
  if (!root.has_value() || !IsSound(*root, now)) {
    return;
  }
  is_asking_root = false;
  root.reset();

  const IndexError result = writer.Open(share, EXTRACTOR_VERSION);
  if (result == IndexError::PATH_NOT_FOUND) {
    look_at_all = true;
    has_news = writer.AreEntriesBeingRemoved();
    if (has_news) {
      rest_until = now + ContentsWriter::LONGEST_REMOVAL;
    } else {
      is_missing = true;  // until the daemon has made them
    }
    return;
  }
  if (result != IndexError::NONE) {
    Rest(now, IndexErrorText(result));
    return;
  }

  idle_since = now;
  next_take_in = now;
  has_news = true;
  if (next_full_look == Time::max()) {
    next_full_look = now + BETWEEN_FULL_LOOKS;
  }
}

// The entries need what little there is left.
bool ShareContents::HasRoom(Time now) {
  if (!HasSpace(StateRoot(), false)) {
    Rest(now, "little space is left on the disk of the index");
    return false;
  }
  return true;
}

bool ShareContents::IsSound(RootState state, Time now) {
  switch (state) {
    case RootState::SOUND:
      return true;
    case RootState::MISSING:
      Rest(now, "its root is missing");
      return false;
    case RootState::FOREIGN:
      Rest(now, "its root lies on another file system");
      return false;
    case RootState::UNKNOWN:
      Rest(now, "its root does not answer");
      return false;
  }
  return false;
}

void ShareContents::Ask(Opener::Question question, Time now, Opener::Work work) {
  if (!opener.Ask(std::move(question), now, std::move(work))) {
    Rest(now, "no thread can be had");
    return;
  }
  TakeAnswers(now);
}

// Not while another thread has the writer: most answers are for it.
void ShareContents::TakeAnswers(Time now) {
  if (committing.IsRunning()) {
    return;
  }
  answered = now;
  opener.Take(now, MOST_ANSWERS);
  if (now >= opener.Deadline()) {
    Rest(now, "its file system does not answer");
  }
}

void ShareContents::RestForError(Time now) {
  // A database was taken away while it was open: the next opening tells which.
  if (writer.Error() == IndexError::PATH_NOT_FOUND) {
    Forget();
    look_at_all = true;
    has_news = true;
    rest_until = now + SHORTEST_REST;
    return;
  }
  Rest(now, IndexErrorText(writer.Error()));
}

// One line at the beginning of the first rest; the others are the same one that goes on.
void ShareContents::Rest(Time now, const std::string& reason) {
  if (!rest_told) {
    ServiceLog("Share[%s] contents rest, reason=%s", share.name.c_str(), reason.c_str());
    rest_told = true;
  }
  if (writer.HasChanges()) {
    (void)writer.Commit();  // good if it still can be done: it would be read once more
  }
  Forget();
  has_news = true;
  rest = std::clamp(rest * 2, SHORTEST_REST, LONGEST_REST);
  rest_until = now + rest;
}

void ShareContents::GoneOn() {
  rest = seconds(0);
  if (rest_told) {
    ServiceLog("Share[%s] contents go on", share.name.c_str());
    rest_told = false;
  }
}

void ShareContents::DropQuestions() {
  opener.Drop();
  preparer.reset();  // a thread that hangs may come back to it
  is_asking_root = false;
  root.reset();
  opening.reset();
  looking = 0;
  looking_bytes = 0;
}

// What was given out is not waited for any more.
void ShareContents::Forget() {
  writer.Close();
  DropQuestions();
  opened.clear();
  fresh.ready.clear();
  again.ready.clear();
  running.clear();
  patient.clear();
  patience.clear();
  first_change.reset();
  fresh.may_have = again.may_have = false;
  unread_due = INT64_MAX;
  is_sweeping = takes_more = false;
  has_news = false;
  later_look = Time::max();
}

}  // namespace fileindexd
