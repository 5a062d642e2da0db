// SPDX-License-Identifier: GPL-2.0-or-later
// The insides of EntryWriter.
//
// DESIGN: SQLite undoes a failed statement alone, but a full disk takes the whole transaction
// along, and the next commit then finds nothing to do. So every operation since the last good
// commit is on a list, whether it was carried out or failed for want of space, for the disk or for
// the lock. (One that changed nothing may have found its work done by another, which does not do it
// again: by then the disk shows that one something else.) When the transaction is lost, the list is
// carried out again in a new one before anything else; each operation then writes what the disk
// shows at that time. What looks failed on its own (a thing that cannot be looked at) is passed
// over, so that it holds nothing else up, and stays on the list.
//
// One transaction lasts from the first operation after a commit to the next commit. An operation
// that fails half done takes it along.
#pragma once

#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "index/converger.h"
#include "index/writer.h"

namespace fileindexd {

struct EntryOperation {
  std::string path;  // normal
  bool removal = false;
  DeleteMode mode = DeleteMode::ENTRY;
  ContentFlags wanted;
  ContentFlags decide;
  Below below = Below::KEPT;
  bool added = false;
  bool applied = false;      // in the transaction that runs
  bool passed_over = false;  // in the replay that runs
};

struct EntryWriter::Impl {
  Impl(std::string name, StateStore& state_store, std::function<void()> between_slices)
      : share_name(std::move(name)), store(state_store), between(std::move(between_slices)) {}

  // writer_open.cpp
  IndexError OpenFirst();
  IndexError EnsureOpen(bool at_once);
  IndexError Reopen();
  void CloseAll();
  void CloseDamaged();
  void WantReindex();
  bool PayReindex();

  // writer.cpp
  IndexError Guarded(const std::function<IndexError()>& step);
  IndexError Do(const std::string& path, EntryOperation&& operation, const Seen* seen);
  IndexError Commit();
  IndexError EnsureApplied(bool at_once);
  IndexError Replay();
  IndexError ReplayOnce(bool& again);
  IndexError Apply(const EntryOperation& operation, const Seen* seen);
  IndexError Fail(IndexError error);
  IndexError FailSql(IndexError error);
  IndexError CommitTransaction();
  IndexError GiveRoomBack();
  void Remember(EntryOperation&& operation);

  std::string share_name;
  StateStore& store;
  std::function<void()> between;

  IndexDatabase database;
  std::optional<EntryTable> table;  // while open; gone before the database is closed
  std::optional<Converger> converger;

  std::vector<EntryOperation> list;
  bool replay_needed = false;  // something on the list is not applied, for no fault of its own
  uint64_t changes_begun = 0;  // table->changes when the transaction began
  int64_t to_note = 0;         // the last commit, until it is noted; 0: it is
  int64_t next_open = 0;       // monotonic milliseconds
  int64_t next_replay = 0;     // the same
  IndexError open_error = IndexError::NONE;
  IndexError replay_error = IndexError::NONE;  // while `replay_needed`: why it still is
  IndexError passed_error = IndexError::IO;    // of the operation that was last passed over
  bool reindex_owed = false;                   // the share's flag could not be set yet
  bool loss_told = false;                      // the system log says why the database is gone

 private:
  IndexError TryOpen(bool create);
  IndexError Prepare();
};

int64_t MonotonicMs();

}  // namespace fileindexd
