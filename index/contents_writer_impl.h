// SPDX-License-Identifier: GPL-2.0-or-later
// The insides of ContentsWriter.
//
// DESIGN: entries are followed by their `written`, which grows with each write of a row: `seen` in
// `meta` is how far, and commits with what was taken in. A removed entry leaves no trace there. So
// a second, slower pass looks at everything again when it is asked to: first at every entry, for
// what is missing, then (in Sweep) at every file, for what no entry refers to.
//
// What is handed out is known in memory, by row. A row that changes meanwhile keeps what it waits
// for: the outcome of the old bytes is thrown away.
#pragma once

#include <ctime>
#include <functional>
#include <map>
#include <memory>
#include <optional>
#include <set>
#include <string>
#include <vector>

#include "index/contents_table.h"
#include "index/contents_writer.h"
#include "index/entry_follower.h"

namespace fileindexd {

// Between two tries to have a file's bytes from the disk, in seconds.
constexpr int64_t SHORTEST_PAUSE = 2;
constexpr int64_t LONGEST_PAUSE = 60 * 60;

// Seconds since the epoch.
inline int64_t Now() {
  return static_cast<int64_t>(time(nullptr));
}

// Begins to wait, as if nothing had been tried.
inline void WaitAnew(ContentFile& file) {
  file.state = ContentState::WAITING;
  file.tries = 0;
  file.unended = 0;
}

inline Content OfKind(Kind kind) {
  Content content;
  content.kind = kind;
  return content;
}

struct ContentsWriter::Impl {
  // What is with helpers, and what is about to be. A suspect is alone.
  struct Company {
    bool any = false;
    bool suspect = false;
  };
  // One look for files to hand out.
  struct Round {
    size_t limit = 0;
    int64_t most = 0;  // rows that are looked at: some are handed out
    Company company;
    bool dropped = false;  // rows that are not looked at again: others may come behind them
    bool held = false;     // a suspect that has to be alone
  };

  // contents_writer_open.cpp
  IndexError Open(const Share& share, int64_t extractor_version);
  IndexError TryOpen();
  IndexError SetUp();
  int Own();
  int JudgeLeftBegun();
  int RetryAll();
  void CloseDatabase();
  void CloseAll();

  // contents_intake.cpp
  bool TakeIn(size_t limit, bool& more);
  int TakeInEntry(const FollowedEntry& entry);
  int TakeInKnown(const FollowedEntry& entry, const ContentFile& file);
  int TakeInChanged(const FollowedEntry& entry, const ContentFile& file);
  void RegainEntry(const ContentFile& file, ContentFile& now);
  int JudgeFound(const ContentFile& file, ContentFile& now, bool& again);
  int IsKept(const ContentFile& file, Kind found, bool& is_kept);
  int DropUnwanted(const ContentFile& file);
  int TakeInAfter(int64_t& done, int64_t& left, bool& more);
  bool Sweep(int64_t now, size_t limit, bool& more);
  int SweepFile(const ContentFile& file, int64_t now);

  // contents_jobs.cpp
  bool NextJobs(size_t limit, std::vector<ContentJob>& jobs, bool& more);
  bool NextAgain(int64_t now, size_t limit, std::vector<ContentJob>& jobs, bool& more);
  Round BeginRound(size_t limit) const;
  int OfferUnread(int64_t now, Round& round, std::vector<ContentJob>& jobs);
  int FollowUnread();
  int OfferSome(std::vector<ContentFile>& rows, Round& round, std::vector<ContentJob>& jobs);
  int Renew(int64_t now, bool& more);
  int RenewFile(const ContentFile& file, int64_t now);
  int Offer(const ContentFile& file, std::vector<ContentJob>& jobs, bool& dropped);
  int PutAside(const ContentFile& file);
  bool BeginTries(const std::vector<int64_t>& files);
  int MarkBegun(int64_t id, int64_t begun);
  int Remove(const ContentFile& file);
  // The row of a file that was handed out. `current`: its bytes are still those that are wanted.
  int TakeBack(int64_t id, ContentFile& file, bool& found, bool& current);

  // contents_writer.cpp
  using Ending = std::function<int(const ContentFile& file, ContentFile& ended)>;
  bool End(int64_t file, const Ending& put_down);
  bool Finish(int64_t file, const PreparedContent& content);
  int Keep(const ContentFile& file, const PreparedContent& content, ContentFile& ended);
  int KeepOfFailure(const ContentFile& file, const Content& content, ContentFile& ended);
  static void SettleKeptOut(ContentFile& file);
  bool Fail(int64_t file, const std::string& reason, const Content& found, bool killed);
  bool Unread(int64_t file, const std::string& reason, int64_t now);
  bool Release(int64_t file);
  void LookAtAll();
  void Rollback();
  bool Commit();
  Company Begun() const;

  // Runs one operation. Memory that runs out undoes what a failure undoes.
  bool Guarded(const std::function<bool()>& step);
  bool Ready();  // sets the error where nothing is open
  IndexError FollowEntries();
  bool ReadyToFollow();
  bool Done(int code);
  bool WasReadByOlder(const ContentFile& file) const {
    return file.extractor != KEPT_OUT && file.extractor < extractor;
  }
  // Read by older readers, or what those failed at.
  bool IsAged(const ContentFile& file) const {
    const bool has_failed =
        file.state == ContentState::FAILED || file.state == ContentState::QUARANTINED;
    return (file.state == ContentState::DONE && WasReadByOlder(file)) ||
           (has_failed && file.extractor < extractor);
  }
  bool IsFull() const { return table->pending_bytes >= ENOUGH_PENDING; }

  struct HandedOut {
    FileIdentity identity;
    bool is_stale = false;  // it has to be read once more
    bool is_begun = false;
    bool is_suspect = false;
  };

  Share share;
  int64_t extractor = 0;
  IndexDatabase database;
  std::optional<ContentsTable> table;
  EntryFollower entries;
  std::shared_ptr<const Settings> settings;  // null: all kinds are wanted
  IndexError error = IndexError::PATH_NOT_FOUND;
  std::map<int64_t, HandedOut> out;
  std::set<int64_t> released;  // those are offered last
  int64_t unread_due = INT64_MAX;
  bool is_suspect_held = false;  // one waits to be alone: nothing else is begun before
  bool has_judged = false;       // what an earlier service left in flight
  int64_t alone = 0;             // the one that was begun without another; 0: none
  bool is_looking = false;       // at every entry
  int64_t looked = 0;            // up to this `written`
  bool is_sweeping = false;      // over every file
  int64_t swept = 0;             // up to this row
  int64_t renewed = 0;           // the same, of what older readers read
  bool has_passed = false;       // one of these changed what is not committed
};

}  // namespace fileindexd
