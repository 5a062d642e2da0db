// SPDX-License-Identifier: GPL-2.0-or-later
// The files of a share on their way to the helpers and back.
#include <algorithm>
#include <cassert>
#include <memory>
#include <utility>

#include "search/log.h"
#include "search/open_file.h"
#include "search/share_contents.h"
#include "state/filesystem.h"
#include "state/layout.h"

namespace fileindexd {

namespace {

using std::chrono::milliseconds;
using std::chrono::seconds;

// Each batch is put on record by one commit. It grows while files are quick, so that commits are
// rare, and shrinks while they are slow, so that what is newer need not wait behind it.
constexpr milliseconds QUICK_BATCH(250);
constexpr milliseconds SLOW_BATCH(1000);

// Files that were read and are looked at again: what they were found to hold is kept meanwhile.
constexpr size_t MOST_LOOKING = 64;
constexpr size_t MOST_LOOKING_BYTES = size_t{5} << 19;

// Files that are open and on record while what is new goes first.
constexpr size_t MOST_AGAIN = 16;

constexpr seconds FIRST_PATIENCE(2);
constexpr seconds LONGEST_PATIENCE(300);

}  // namespace

// By the first of its names under which it is there. Belongs to the opener's thread until it is
// answered.
struct ShareContents::Batch {
  struct File {
    ContentJob job;
    ScopedFd file;
    std::string path;
    Opening opening = Opening::CHANGED;
    std::string reason;
  };

  void Open() {
    bool is_suspect = false;
    for (File& one : files) {
      Open(one);
      is_suspect = is_suspect || (one.opening != Opening::DONE && one.opening != Opening::REFUSED);
    }
    // Files that are not what the index knows: is it the share at all?
    root = is_suspect ? LookAtRoot(share) : RootState::SOUND;
  }
  void Open(File& one) const {
    for (const std::string& path : one.job.paths) {
      std::string reason;
      const Opening opened = OpenFile(share, path, one.job.identity, one.file, reason);
      if (opened == Opening::DONE) {
        one.opening = opened;
        one.path = path;
        return;
      }
      // Of all its names, the one that promises most.
      if (opened > one.opening) {
        one.opening = opened;
        one.reason = std::move(reason);
      }
    }
  }

  Share share;
  std::deque<File> files;
  RootState root = RootState::SOUND;
};

bool ShareContents::MayHaveJobs(Turn turn, Time now) const {
  const Line& line = LineOf(turn);
  return IsOpen() && CanWork(now) && looking < MOST_LOOKING && looking_bytes < MOST_LOOKING_BYTES &&
         (!line.ready.empty() || MayOpen(line));
}

bool ShareContents::IsNewWaiting(Time now) const {
  return IsOpen() && CanWork(now) &&
         ((fresh.may_have && patient.size() < MOST_PATIENT) || !fresh.ready.empty() ||
          opening == Turn::NEW || (!opened.empty() && opened_for == Turn::NEW));
}

bool ShareContents::TakesRoom(Time now) const {
  return IsOpen() && CanWork(now) &&
         (WantsMore() || opening || !fresh.ready.empty() || !again.ready.empty() ||
          !running.empty() || HasChanges());
}

bool ShareContents::Next(Turn turn, Time now, uint64_t id, ExtractJob& job) {
  Line& line = LineOf(turn);
  if (!MayHaveJobs(turn, now)) {
    return false;
  }
  // What is new is read while as much again is opened and put on record.
  const size_t ahead = turn == Turn::NEW ? batch : 0;
  if (line.ready.size() <= ahead && MayOpen(line)) {
    Refill(turn, now);
  }
  if (line.ready.empty()) {
    return false;
  }

  Ready& next = line.ready.front();
  Running& begun = running[id];
  begun.file = next.job.file;
  begun.identity = next.job.identity;
  begun.since = now;
  begun.open = next.file;

  job.id = id;
  job.file = std::move(next.file);
  job.name = std::move(next.name);
  line.ready.pop_front();
  return true;
}

// What comes of it is ready now, or later.
void ShareContents::Refill(Turn turn, Time now) {
  if (!HasRoom(now)) {
    return;
  }
  Line& line = LineOf(turn);
  std::vector<ContentJob> jobs;
  bool good = false;
  if (turn == Turn::NEW) {
    AdaptBatch(now);
    good = writer.NextJobs(batch, jobs, line.may_have);
  } else {
    const size_t most = std::max(std::min(largest_batch, MOST_AGAIN), SMALLEST_BATCH);
    good = writer.NextAgain(wall_time, most, jobs, line.may_have);
  }
  if (!good) {
    RestForError(now);
    return;
  }

  auto asked = std::make_shared<Batch>();
  asked->share = share;
  for (ContentJob& job : jobs) {
    const auto known = patience.find(job.file);
    if (known != patience.end() && now < known->second.until) {
      patient.emplace(known->second.until, job.file);
    } else {
      asked->files.emplace_back().job = std::move(job);
    }
  }
  if (!asked->files.empty()) {
    opening = turn;
    auto open = [this, asked = std::move(asked)]() -> Opener::Answer {
      asked->Open();
      return [this, asked] { TakeBatch(*asked); };
    };
    Ask(std::move(open), now);
    BeginTries(now);
  }
}

void ShareContents::TakeBatch(Batch& batch_of_files) {
  const Time now = answered;
  assert(opening);  // who does not wait for it any more drops the question
  opened_for = *std::exchange(opening, std::nullopt);
  // First: what is open is not left to the batch, which would close it here. Closing is asking,
  // too.
  for (Batch::File& one : batch_of_files.files) {
    if (one.opening == Opening::DONE) {
      Ready& next = opened.emplace_back();
      next.file = opener.Keep(one.file);
      next.name = one.path.substr(one.path.rfind('/') + 1);
      next.job = std::move(one.job);
    }
  }
  if (!IsSound(batch_of_files.root, now)) {
    return;
  }
  for (const Batch::File& one : batch_of_files.files) {
    if (one.opening != Opening::DONE && !TakeUnopened(one.job.file, one.opening, one.reason, now)) {
      RestForError(now);
      return;
    }
  }
}

// False when that could not be written down.
bool ShareContents::TakeUnopened(int64_t file, Opening result, const std::string& reason,
                                 Time now) {
  switch (result) {
    case Opening::REFUSED:
      return writer.Fail(file, reason, {}, false);
    case Opening::UNREAD:
      return writer.Unread(file, reason, wall_time);
    case Opening::LATER:
      ServiceDebug("Share[%s] a file waits, reason=%s", share.name.c_str(), reason.c_str());
      break;
    default:
      break;
  }
  BePatient(file, now);
  patient.emplace(patience[file].until, file);
  return true;
}

void ShareContents::AdaptBatch(Time now) {
  const auto took = now - refilled;
  if (took > SLOW_BATCH) {
    batch /= 2;
  } else if (took < QUICK_BATCH) {
    batch *= 2;
  }
  batch = std::clamp(batch, SMALLEST_BATCH, std::max(largest_batch, SMALLEST_BATCH));
  refilled = now;
}

void ShareContents::BePatient(int64_t file, Time now) {
  if (patience.size() >= MOST_PATIENT) {
    std::erase_if(patience, [now](const auto& one) { return one.second.until <= now; });
  }
  Patience& patient_with = patience[file];
  patient_with.rest = std::clamp(patient_with.rest * 2, FIRST_PATIENCE, LONGEST_PATIENCE);
  patient_with.until = now + patient_with.rest;
}

// Belongs to the opener's thread until it is answered.
struct ShareContents::Ended {
  ExtractOutcome outcome;
  std::shared_ptr<ScopedFd> file;
  size_t bytes = 0;  // of its text
  bool is_still = false;
  PreparedContent found;
};

// Another look at the file tells whether it is still what was to be read. What takes no database is
// done along with it.
void ShareContents::End(ExtractOutcome&& outcome, Time now) {
  const auto found = running.find(outcome.id);
  if (found == running.end()) {
    return;
  }
  last_end = now;
  // Of many shares at work, texts and what is made of them would add up.
  const bool is_alone = enough_pending >= ContentsWriter::ENOUGH_PENDING;
  if (!is_alone) {
    preparer.reset();
  } else if (preparer == nullptr) {
    preparer = std::make_shared<ContentPreparer>(share.language);
  }

  const uint64_t id = outcome.id;
  const auto ended = std::make_shared<Ended>();
  ended->bytes = outcome.content.text.size();
  ended->outcome = std::move(outcome);
  ended->file = std::move(found->second.open);
  ++looking;
  looking_bytes += ended->bytes;
  const auto look = [this, id, ended, identity = found->second.identity]() -> Opener::Answer {
    ended->is_still = IsStill(ended->file->fd, identity);
    ended->file.reset();
    return [this, id, ended] { TakeLook(id, *ended); };
  };
  const auto prepare = [ended, with = preparer] {
    if (ended->is_still && ended->outcome.result == ExtractOutcome::Result::DONE) {
      ended->found.content = std::move(ended->outcome.content);
      if (with != nullptr) {
        with->Prepare(ended->found);
      }
    }
  };
  Ask(look, now, prepare);
}

void ShareContents::TakeLook(uint64_t id, const Ended& ended) {
  const auto found = running.find(id);
  assert(found != running.end());  // who takes back what runs drops the questions about it
  const Time now = answered;
  --looking;
  looking_bytes -= ended.bytes;
  const int64_t file = found->second.file;
  const ExtractOutcome& outcome = ended.outcome;
  running.erase(found);

  bool good = false;
  if (outcome.result == ExtractOutcome::Result::LOST || !ended.is_still) {
    BePatient(file, now);
    good = writer.Release(file);
  } else if (outcome.result == ExtractOutcome::Result::UNREAD) {
    good = writer.Unread(file, outcome.reason, wall_time);
  } else {
    patience.erase(file);
    switch (outcome.result) {
      case ExtractOutcome::Result::DONE:
        good = writer.Finish(file, ended.found);
        break;
      case ExtractOutcome::Result::FAILED:
        good = writer.Fail(file, outcome.reason, outcome.content, false);
        break;
      default:
        good = writer.Fail(file, outcome.reason, {}, true);
        break;
    }
  }
  if (!good) {
    RestForError(now);
    return;
  }
  first_change = first_change.value_or(now);
  if (!HasMore()) {
    CommitIfDue(now);  // before it is asked whether there are others
  }
  MayHaveMore();  // it may wait again, or another have waited for its end
  may_merge = true;
}

}  // namespace fileindexd
