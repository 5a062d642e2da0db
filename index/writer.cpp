// SPDX-License-Identifier: GPL-2.0-or-later
#include "index/writer.h"

#include <algorithm>
#include <ctime>
#include <exception>
#include <utility>

#include "index/emptied.h"
#include "index/last_commit.h"
#include "index/shrink.h"
#include "index/writer_impl.h"
#include "state/belonging.h"
#include "state/layout.h"
#include "state/queue_writer.h"

namespace fileindexd {

namespace {

constexpr size_t LIST_LIMIT = 100000;
// A longer list is carried out again at most once a second: on a disk that stays full, each
// operation would otherwise repeat all that came before it.
constexpr size_t SHORT_LIST = 500;
constexpr int64_t REPLAY_INTERVAL_MS = 1000;
constexpr ContentFlags EVERY_KIND = {true, true, true, true};

}  // namespace

EntryWriter::EntryWriter(std::string share_name, StateStore& store,
                         std::function<void()> between_slices)
    : impl(std::make_unique<Impl>(std::move(share_name), store, std::move(between_slices))) {
  last_error = impl->OpenFirst();
}

EntryWriter::~EntryWriter() {
  impl->CloseAll();
}

bool EntryWriter::IsOpen() const {
  return impl->database.IsOpen();
}

bool EntryWriter::Refresh(const std::string& path, const ContentFlags& wanted,
                          const ContentFlags& decide, const Seen* seen, Below below) {
  EntryOperation operation;
  operation.below = below;
  operation.wanted = wanted;
  operation.decide = decide;
  last_error = impl->Guarded([&] { return impl->Do(path, std::move(operation), seen); });
  return last_error == IndexError::NONE;
}

bool EntryWriter::Add(const std::string& path, const ContentFlags& wanted, const Seen* seen,
                      Below below) {
  EntryOperation operation;
  operation.below = below;
  operation.wanted = wanted;
  operation.decide = EVERY_KIND;
  operation.added = true;
  last_error = impl->Guarded([&] { return impl->Do(path, std::move(operation), seen); });
  return last_error == IndexError::NONE;
}

bool EntryWriter::Delete(const std::string& path, DeleteMode mode) {
  EntryOperation operation;
  operation.removal = true;
  operation.mode = mode;
  last_error = impl->Guarded([&] { return impl->Do(path, std::move(operation), nullptr); });
  return last_error == IndexError::NONE;
}

bool EntryWriter::Commit() {
  last_error = impl->Guarded([this] { return impl->Commit(); });
  const bool good = last_error == IndexError::NONE;
  if (good) {
    (void)impl->Guarded([this] { return impl->GiveRoomBack(); });
  }
  return good;
}

// By type: a cancellation that comes out of `between_slices` passes.
IndexError EntryWriter::Impl::Guarded(const std::function<IndexError()>& step) {
  try {
    return step();
  } catch (const std::exception&) {
    // Memory ran out, and the operation may be half done and on no list.
    CloseAll();
    WantReindex();
    return IndexError::NO_MEMORY;
  }
}

IndexError EntryWriter::Impl::Do(const std::string& path, EntryOperation&& operation,
                                 const Seen* seen) {
  auto normal = NormalPath(path);
  if (!normal.has_value()) {
    return IndexError::NONE;  // belongs nowhere, and is held nowhere
  }
  operation.path = std::move(*normal);

  // A comparison awaits the end of what is being written. One that begins between the look and the
  // transaction awaits nobody, and misses what is gone by then.
  if (!database.IsOpen() || sqlite3_get_autocommit(database.db) != 0) {
    seen = nullptr;
  }
  IndexError error = EnsureOpen(false);
  if (error == IndexError::NONE) {
    error = EnsureApplied(false);
  }
  if (error != IndexError::NONE) {
    Remember(std::move(operation));
    return error;
  }

  const uint64_t before = table->changes;
  error = Apply(operation, seen);
  if (error == IndexError::NONE) {
    operation.applied = true;
    Remember(std::move(operation));
    return error;
  }

  if (converger->sql_failed) {
    (void)FailSql(error);
  } else if (table->changes != before) {
    (void)Fail(error);
  }
  // A root that is missing refuses the operation for good: when it is back, it is compared.
  if (error != IndexError::ROOT) {
    Remember(std::move(operation));
  }
  return error;
}

void EntryWriter::Impl::Remember(EntryOperation&& operation) {
  replay_needed = replay_needed || !operation.applied;
  list.push_back(std::move(operation));
  if (list.size() > LIST_LIMIT) {
    list.clear();
    list.shrink_to_fit();
    replay_needed = false;
    WantReindex();
  }
}

// Carries the operation out in the transaction that runs, beginning one where there is none.
IndexError EntryWriter::Impl::Apply(const EntryOperation& operation, const Seen* seen) {
  std::shared_ptr<const Settings> settings;
  converger->sql_failed = false;
  if (seen != nullptr) {
    settings = seen->settings;
  } else if (!store.GetSettings(settings)) {
    return IndexError::IO;
  }
  const Share* share = settings->ShareOfPath(operation.path);
  if (share == nullptr || share->name != share_name) {
    return IndexError::NONE;
  }

  if (sqlite3_get_autocommit(database.db) != 0) {
    const int code = table->Begin();
    if (code != SQLITE_OK) {
      converger->sql_failed = true;
      return FromSqlite(code);
    }
    changes_begun = table->changes;
  }
  // Single deletions are told of one by one, and believed. A refresh is refused as well: where
  // another folder stands in the root's place, it would look at all that was below.
  const bool is_single = operation.removal && operation.mode != DeleteMode::STALE;
  if (!is_single && operation.path == share->path &&
      IsEmptied(store, *settings, *share, static_cast<uint64_t>(table->entries))) {
    return IndexError::ROOT;
  }
  return operation.removal
             ? converger->Delete(*settings, *share, operation.path, operation.mode)
             : converger->Refresh(*settings, *share, operation.path, operation.wanted,
                                  operation.decide, seen != nullptr ? &seen->look : nullptr,
                                  operation.added, operation.below);
}

// Gives the transaction up: whatever failed in it left it half done.
IndexError EntryWriter::Impl::Fail(IndexError error) {
  table->Rollback();
  for (EntryOperation& operation : list) {
    operation.applied = false;
  }
  replay_needed = !list.empty();
  replay_error = error;
  if (error == IndexError::DAMAGED) {
    CloseDamaged();
  } else if (error == IndexError::OTHER || sqlite3_get_autocommit(database.db) == 0) {
    // Somebody has changed the tables, and an opening sees it; or the rollback failed too, for want
    // of memory, and closing undoes what was half done.
    CloseAll();
    next_open = 0;
  }
  return error;
}

// The same after a failure of the database itself. One whose files failed is opened anew: SQLite
// opens a file that it may not write for reading only, and would stay with that for ever.
IndexError EntryWriter::Impl::FailSql(IndexError error) {
  (void)Fail(error);
  if (error == IndexError::IO) {
    CloseAll();
    next_open = 0;
  }
  return error;
}

IndexError EntryWriter::Impl::EnsureApplied(bool at_once) {
  if (!replay_needed) {
    return IndexError::NONE;
  }
  if (!at_once && list.size() > SHORT_LIST && MonotonicMs() < next_replay) {
    return replay_error;
  }

  replay_error = Replay();
  next_replay = MonotonicMs() + REPLAY_INTERVAL_MS;
  return replay_error;
}

// NONE when all that the database itself could take is in.
IndexError EntryWriter::Impl::Replay() {
  IndexError error = IndexError::NONE;
  for (bool again = true; again;) {
    again = false;
    error = ReplayOnce(again);
  }

  for (EntryOperation& operation : list) {
    operation.passed_over = false;
  }
  if (error == IndexError::NONE) {
    replay_needed = false;
  }
  return error;
}

IndexError EntryWriter::Impl::ReplayOnce(bool& again) {
  for (EntryOperation& operation : list) {
    if (operation.applied || operation.passed_over) {
      continue;
    }

    const uint64_t before = table->changes;
    const IndexError error = Apply(operation, nullptr);
    operation.applied = error == IndexError::NONE;
    if (operation.applied) {
      continue;
    }
    if (converger->sql_failed) {
      return FailSql(error);
    }
    operation.passed_over = true;
    passed_error = error;
    if (table->changes != before) {
      (void)Fail(error);
      again = database.IsOpen();
      return again ? IndexError::NONE : error;
    }
  }
  return IndexError::NONE;
}

IndexError EntryWriter::Impl::CommitTransaction() {
  if (sqlite3_get_autocommit(database.db) != 0) {
    return IndexError::NONE;
  }
  if (table->changes == changes_begun) {
    table->Rollback();
    return IndexError::NONE;
  }

  const int code = table->Commit(static_cast<int64_t>(time(nullptr)));
  to_note = code == SQLITE_OK ? table->last_written : 0;
  return code == SQLITE_OK ? IndexError::NONE : FailSql(FromSqlite(code));
}

IndexError EntryWriter::Impl::Commit() {
  IndexError error = EnsureOpen(true);
  // Twice at most: a database that was removed is written into nowhere without an error. So the
  // file is asked for after the commit, while the list still holds all that was in it.
  for (int round = 0; error == IndexError::NONE && round < 2; ++round) {
    replay_needed =
        replay_needed || std::any_of(list.begin(), list.end(),
                                     [](const auto& operation) { return !operation.applied; });
    error = EnsureApplied(true);
    to_note = 0;
    if (error == IndexError::NONE) {
      error = CommitTransaction();
    }
    if (error != IndexError::NONE || !database.HasMoved()) {
      break;
    }
    error = Reopen();
  }
  if (error != IndexError::NONE) {
    return error;
  }
  if (to_note != 0) {
    NoteLastCommit(IndexPath(share_name), std::exchange(to_note, 0));
  }

  std::erase_if(list, [](const EntryOperation& operation) { return operation.applied; });
  if (!list.empty()) {
    return passed_error;
  }
  return PayReindex() ? IndexError::NONE : IndexError::IO;
}

// What is committed is durable: the result says nothing about it, and a failure waits for the next
// commit. The share's queue file calls for a commit where there is more to do, as no event may
// come: and between two passes a Worker can be stopped or paused.
IndexError EntryWriter::Impl::GiveRoomBack() {
  if (database.IsOpen() && ShrinkDatabase(database.db, between) == Shrinking::UNFINISHED) {
    std::string ignored;
    (void)AppendToQueue(share_name, {}, ignored);
  }
  return IndexError::NONE;
}

}  // namespace fileindexd
