// SPDX-License-Identifier: GPL-2.0-or-later
// Entries of a file that was changed through another of its names, one that told this share
// nothing: it lies in another share or in none, or is gone by now.
//
//   inode -> asked at once -> next batch -> the queue files of then are gone -> asked again
//
// Asking looks the inode up in the share's index, and has those of its entries looked at that
// differ from the disk. Once is not enough: the daemon may be working on such an entry, and have
// looked at the disk before the change. What it works on is in the index when the drained copy is
// gone. A batch begins once a second, so that a file that is written to all the time costs no more
// than that.
#pragma once

#include <chrono>
#include <cstddef>
#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <unordered_map>
#include <unordered_set>
#include <utility>
#include <vector>

#include "index/reader.h"
#include "state/belonging.h"
#include "state/queue_files.h"
#include "state/queue_folding.h"
#include "state/settings.h"

namespace fileindexd {

// Of one share. One thread. Costs nothing while there is nothing to search for.
class Twins {
 public:
  using Clock = std::chrono::steady_clock;

  explicit Twins(std::string name_of_share) : share(std::move(name_of_share)) {}
  Twins(const Twins&) = delete;
  Twins& operator=(const Twins&) = delete;

  enum class Asking {
    TWICE,
    LATER,  // the second time alone: a line that the share has anyway is to do the work
  };
  void Add(uint64_t inode, Asking asking);

  // Asks what can be asked now, a bounded part of it, and adds the lines. To be called each round,
  // at least when a queue file or a drained copy has gone. `hurry`: somebody waits for it, and the
  // next batch does not. `is_indexed_anew`: whether a walk that no queue file tells of is going on;
  // called only when that matters.
  void Pump(const Settings& settings, Clock::time_point now, bool hurry,
            const std::function<bool()>& is_indexed_anew, std::vector<QueueLine>& lines);

  // When Pump has something to do although no file went; none: not before.
  std::optional<Clock::time_point> NextDue() const { return due; }
  bool IsIdle() const { return Size() == 0; }

  // What is added all the time must not keep those waiting who asked before: all that was added
  // until a ticket was drawn is done once IsDone says so of it.
  uint64_t DrawTicket() const { return added; }
  bool IsDone(uint64_t ticket) const { return IsIdle() || done_ticket >= ticket; }

  // True once after more came than is kept, or the index could not be asked, and all was dropped:
  // the share is to be compared.
  bool TakeLoss() { return std::exchange(lost, false); }
  void Clear();

 private:
  size_t Size() const { return fresh.size() + next.size() + batch.size(); }
  void AskFresh(const Settings& settings, size_t& allowed, std::vector<QueueLine>& lines);
  void AskBatch(const Settings& settings, size_t& allowed, std::vector<QueueLine>& lines);
  void BeginBatch(Clock::time_point now);
  bool AreFilesGone();
  void Ask(const Settings& settings, uint64_t inode, std::vector<QueueLine>& lines);
  bool IsReaderOpen();
  void Lose();

  uint64_t added = 0;  // calls of Add
  uint64_t batch_ticket = 0;
  uint64_t done_ticket = 0;
  const std::string share;
  std::unordered_map<uint64_t, Asking> fresh;  // not asked yet
  std::unordered_set<uint64_t> next;           // to be asked again, with the next batch
  std::vector<uint64_t> batch;                 // to be asked again when `files` are gone
  QueueFiles files;                            // as they stood when the batch began; -1: gone
  std::unique_ptr<EntryReader> reader;         // null: not open, or there is no index
  FolderView folder;
  Clock::time_point next_batch;  // not before
  std::optional<Clock::time_point> due;
  bool lost = false;
};

}  // namespace fileindexd
