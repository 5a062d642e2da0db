// SPDX-License-Identifier: GPL-2.0-or-later
// One share's contents, as the service works on them: takes in what the daemon committed, gives out
// the files to read, writes down what was found.
//
// Everything is done in slices of some milliseconds, so that many shares can be worked on in turn.
// A share whose databases or whose root fail rests, for longer each time, and nobody else is held
// up by it. What is given out is opened, looked at and on record before. The share's own file
// system is asked by way of an Opener alone: while there is no answer, this share waits, and then
// rests. While there is more to read, commits are made by a thread of their own: files are given
// out and taken back meanwhile, and what was found in them waits.
//
// One thread, but for these two. Times are passed in.
#pragma once

#include <poll.h>

#include <chrono>
#include <cstdint>
#include <deque>
#include <functional>
#include <map>
#include <memory>
#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "base/scoped_fd.h"
#include "extract/pool.h"
#include "index/contents_writer.h"
#include "search/open_file.h"
#include "search/opener.h"
#include "search/side_work.h"
#include "state/belonging.h"
#include "state/settings.h"
#include "state/store.h"

namespace fileindexd {

using Clock = std::chrono::steady_clock;
using Time = Clock::time_point;

class ShareContents {
 public:
  explicit ShareContents(Share followed);

  // Settings in force: which kinds are wanted where; from the next slice on. Folders that changed
  // want LookAtAll.
  void Use(std::shared_ptr<const Settings> settings) { in_force = std::move(settings); }
  // What is known of the share from outside, as it is now.
  void Set(const Share& current, const ShareStatus& status);
  void EntriesChanged();
  // Whoever wrote to them is done with it: what EntriesChanged told of can be seen now.
  void EntriesClosed();
  // All entries are looked at again.
  void LookAtAll();
  // The databases' files came or went: what is open may be of no use.
  void FilesChanged();

  // One slice of all but reading: opening, taking in, sweeping, committing. `wall`: seconds since
  // the epoch.
  void Work(Time now, int64_t wall);
  // What is new goes before what is read again, over all shares.
  enum class Turn { NEW, AGAIN };
  // The next file to read. False when there is none now; MayHaveJobs tells whether to ask again.
  bool Next(Turn turn, Time now, uint64_t id, ExtractJob& job);
  bool MayHaveJobs(Turn turn, Time now) const;
  // Whether something new waits, or may, be it that it cannot be given out at this moment.
  bool IsNewWaiting(Time now) const;
  // Whether it holds open files or words that are not written down, or may soon: all that do share
  // the room there is for them.
  bool TakesRoom(Time now) const;
  // What came of a file that was given out under that id; of one that was taken back: nothing.
  void End(ExtractOutcome&& outcome, Time now);
  // Takes back what was given out, and closes. For pauses: it goes on as it was. `cuts_log`: the
  // log is emptied too, as nobody may have the database open for long.
  void Halt(bool cuts_log = false);

  // What tells that an answer of the file system is there: Work wants to be called.
  void AddPolled(std::vector<pollfd>& polled) const;
  // When Work wants to be called; max() if nothing is to be done.
  Time Due() const;
  // True once after all that failed was made to wait again, and that is on disk.
  bool TakeRetried() { return std::exchange(retried, false); }

  Share share;
  size_t largest_batch = LARGEST_BATCH;  // of files; two are held open to be given out next
  bool may_read_again = true;            // nothing new waits anywhere
  // Bytes of a transaction: words are collected in memory until its end.
  size_t enough_pending = ContentsWriter::ENOUGH_PENDING;

  static constexpr size_t SMALLEST_BATCH = 4;
  static constexpr size_t LARGEST_BATCH = 64;

 private:
  static constexpr std::chrono::hours BETWEEN_FULL_LOOKS{24};
  static constexpr size_t MOST_PATIENT = 4096;
  struct Ready {
    ContentJob job;
    std::shared_ptr<ScopedFd> file;  // this, and all that are open: kept by the opener
    std::string name;
  };
  struct Running {
    int64_t file = 0;
    FileIdentity identity;
    Time since;
    std::shared_ptr<ScopedFd> open;  // the same as the job's, to be looked at afterwards
  };
  // What waits for one of the turns.
  struct Line {
    bool may_have = false;
    std::deque<Ready> ready;
  };
  // Files that are being opened.
  struct Batch;
  // One that was read, and is being looked at.
  struct Ended;
  // Of a file that was not what the index knows: it is looked at again later.
  struct Patience {
    std::chrono::seconds rest{0};
    Time until;
  };

  bool IsResting(Time now) const { return now < rest_until; }
  bool CanWork(Time now) const;
  bool IsIdle() const;
  bool Sweeps() const { return is_sweeping && !is_reindexing; }
  Time CommitDue() const;
  void Open(Time now);
  bool TakeIn(Time now);
  void LookLater(Time now);
  bool Sweep(int64_t wall);
  bool Retry();
  bool Merge();
  bool ReleasePatient(Time now);
  void CommitIfDue(Time now);
  bool Commit();
  bool IsOpen() const { return committing.IsRunning() || writer.IsOpen(); }
  bool HasChanges() const { return committing.IsRunning() || writer.HasChanges(); }
  bool HasMore() const { return !running.empty() || !fresh.ready.empty() || !again.ready.empty(); }
  void CommitBeside(std::function<bool()> commit, Time now);
  bool TakeCommit(Time now);
  bool AwaitCommit();
  void EndCommit(Time now);
  void BeginTries(Time now);
  void CloseIfIdle(Time now);

  bool MayOpen(const Line& line) const {
    return line.may_have && !opening && opened.empty() && !committing.IsRunning() &&
           patient.size() < MOST_PATIENT;
  }
  Line& LineOf(Turn turn) { return turn == Turn::NEW ? fresh : again; }
  const Line& LineOf(Turn turn) const { return turn == Turn::NEW ? fresh : again; }
  bool WantsMore() const { return fresh.may_have || (again.may_have && may_read_again); }
  void MayHaveMore() { fresh.may_have = again.may_have = true; }
  void FollowUnread(Time now, int64_t wall);
  void Refill(Turn turn, Time now);
  bool TakeUnopened(int64_t file, Opening opening, const std::string& reason, Time now);
  void TakeBatch(Batch& batch_of_files);
  void TakeLook(uint64_t id, const Ended& ended);
  void BePatient(int64_t file, Time now);
  void AdaptBatch(Time now);

  bool HasRoom(Time now);                   // rests if not
  bool IsSound(RootState state, Time now);  // rests if not
  void Ask(Opener::Question question, Time now, Opener::Work work = nullptr);
  void TakeAnswers(Time now);
  void DropQuestions();
  void Rest(Time now, const std::string& reason);
  void RestForError(Time now);
  void GoneOn();
  void Forget();

  ContentsWriter writer;  // the other thread's while it is committing, as is `committed`
  std::shared_ptr<const Settings> in_force;   // null: the writer has them
  std::shared_ptr<ContentPreparer> preparer;  // null until it is needed
  Opener opener;
  bool is_asking_root = false;
  std::optional<RootState> root;  // the answer, until it is used
  std::optional<Turn> opening;    // a batch for that turn
  std::vector<Ready> opened;      // the last one, for `opened_for`: about to be put on record
  size_t looking = 0;             // at files that were read
  size_t looking_bytes = 0;       // of their texts
  Time answered;                  // the time, for answers
  Turn opened_for = Turn::NEW;
  bool committed = false;  // whether the last commit beside was good
  bool has_news = true;
  bool takes_more = false;  // the last look at news did not see all
  bool look_at_all = true;
  bool is_missing = false;  // there were no entries at the last opening
  bool is_sweeping = false;
  bool no_space = false;
  bool is_reindexing = false;  // what has no entry may be about to get one
  bool retry_wanted = false;
  bool retried = false;
  bool may_merge = true;  // words that are new since they were merged
  Time next_take_in;
  Time taken_in;                               // the last time
  std::chrono::milliseconds between_looks{0};  // that find nothing
  Time later_look = Time::max();               // for what was told of before it could be seen
  size_t later_looks = 0;                      // since the last news
  Time next_full_look = Time::max();
  Time idle_since;
  std::optional<Time> first_change;  // that is not committed
  Time last_end;                     // of a file that was given out

  Time rest_until;
  std::chrono::seconds rest{0};  // the last one; 0: all was well since
  bool rest_told = false;

  size_t batch = 0;
  Time refilled;
  Line fresh;
  Line again;
  int64_t wall_time = 0;                 // at the last slice
  int64_t unread_due = INT64_MAX;        // by that clock, as the writer said
  Time next_unread = Time::max();        // the same, until it has come
  std::map<uint64_t, Running> running;   // by the id of the job
  std::map<int64_t, Patience> patience;  // by file
  std::multimap<Time, int64_t> patient;  // files that the writer has given out and that wait here
  SideWork committing;                   // last: it goes before all that its thread works on
};

}  // namespace fileindexd
