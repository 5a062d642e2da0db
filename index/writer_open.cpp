// SPDX-License-Identifier: GPL-2.0-or-later
// Opening the writer's database, and what is recorded about it.
#include <syslog.h>

#include <ctime>
#include <utility>

#include "index/set_aside.h"
#include "index/writer_impl.h"
#include "state/layout.h"
#include "state/queue_writer.h"

namespace fileindexd {

namespace {

constexpr int64_t OPEN_INTERVAL_MS = 1000;

}  // namespace

int64_t MonotonicMs() {
  timespec now{};
  clock_gettime(CLOCK_MONOTONIC, &now);
  return static_cast<int64_t>(now.tv_sec) * 1000 + now.tv_nsec / 1'000'000;
}

IndexError EntryWriter::Impl::Prepare() {
  table.emplace();
  const int code = table->Prepare(database.db);
  if (code != SQLITE_OK) {
    // SQLITE_ERROR: our numbers in the header without our tables.
    const IndexError error = code == SQLITE_ERROR ? IndexError::DAMAGED : FromSqlite(code);
    CloseAll();
    return error;
  }
  converger.emplace(*table, between);
  return IndexError::NONE;
}

IndexError EntryWriter::Impl::TryOpen(bool create) {
  const std::string path = IndexPath(share_name);
  if (create) {
    std::string ignored;  // the opening that follows tells
    (void)MakeShareFolder(share_name, ignored);
  }

  IndexError error = database.OpenForWriting(path, create);
  loss_told = loss_told || database.has_set_aside;
  if (error == IndexError::NONE) {
    error = Prepare();
  }
  if (error == IndexError::DAMAGED) {
    if (!SetAside(path, IndexFlaw::DAMAGED, "its tables are not whole")) {
      return IndexError::IO;
    }
    loss_told = true;
    error = create ? database.OpenForWriting(path, true) : IndexError::PATH_NOT_FOUND;
    if (error == IndexError::NONE) {
      error = Prepare();
    }
  }

  // Best effort: a status that cannot be written is written by the next opening.
  if (error == IndexError::NONE) {
    (void)store.UpdateStatus(share_name, [](ShareStatus& status) {
      status.missing = false;
      status.rebuild_wanted = false;
    });
  } else if (error == IndexError::PATH_NOT_FOUND) {
    (void)store.UpdateStatus(share_name, [](ShareStatus& status) { status.missing = true; });
  }
  open_error = error;
  next_open = MonotonicMs() + OPEN_INTERVAL_MS;
  return error;
}

IndexError EntryWriter::Impl::OpenFirst() {
  ShareStatus status;
  const bool create = store.GetStatus(share_name, status) && status.rebuild_wanted;
  const IndexError error = TryOpen(create);
  if (error == IndexError::NONE) {
    loss_told = false;  // what was lost earlier is made good
  } else if (error == IndexError::PATH_NOT_FOUND) {
    next_open = 0;  // told once: the first operation may make it anew
  }
  return error;
}

IndexError EntryWriter::Impl::EnsureOpen(bool at_once) {
  if (database.IsOpen()) {
    // Looked at before each transaction. A commit opens the folder that the database was opened in,
    // and would wait for ever in a pipe that stands there now.
    const bool between_transactions = sqlite3_get_autocommit(database.db) != 0;
    return between_transactions && database.HasMoved() ? Reopen() : IndexError::NONE;
  }
  if (!at_once && MonotonicMs() < next_open) {
    return open_error;
  }

  const IndexError error = TryOpen(false);
  loss_told = loss_told && error != IndexError::NONE;
  return error == IndexError::PATH_NOT_FOUND ? Reopen() : error;
}

// In place of a database that is gone. What it held comes back by a reindex; what is on the list,
// at once. The flag goes first: a process that ends in between would leave a database that is new,
// empty and opens well. The wake-up goes last: while the disk stays full, it would wake for
// nothing, again and again.
IndexError EntryWriter::Impl::Reopen() {
  CloseAll();
  bool stood = false;
  if (!store.UpdateStatus(share_name, [&stood](ShareStatus& status) {
        stood = status.needs_reindex;
        status.needs_reindex = true;
      })) {
    next_open = MonotonicMs() + OPEN_INTERVAL_MS;
    return IndexError::IO;
  }

  const IndexError error = TryOpen(true);
  if (error == IndexError::NONE) {
    if (!std::exchange(loss_told, false)) {
      syslog(LOG_ERR, "%s:%d index missing and made anew, path=%s", __FILE__, __LINE__,
             IndexPath(share_name).c_str());
    }
    std::string ignored;  // the flag stands, and whoever touches stale queues helps
    (void)AppendToQueue(share_name, {}, ignored);
  } else if (!stood) {
    // None was made. If this fails, the share is looked at once more than it needs.
    (void)store.UpdateStatus(share_name, [](ShareStatus& status) { status.needs_reindex = false; });
  }
  return error;
}

void EntryWriter::Impl::CloseAll() {
  converger.reset();
  table.reset();
  database.Close();
  for (EntryOperation& operation : list) {
    operation.applied = false;
  }
  replay_needed = !list.empty();
  to_note = 0;
}

// Set aside now, so that whoever opens next finds that there is none.
void EntryWriter::Impl::CloseDamaged() {
  CloseAll();
  loss_told = SetAside(IndexPath(share_name), IndexFlaw::DAMAGED, "found at work");
  open_error = IndexError::DAMAGED;
  next_open = MonotonicMs() + OPEN_INTERVAL_MS;
}

// For operations that are on no list any more. They may be those of a reindex that is under way: it
// is put on record even then, but wakes nobody, as that reindex may go on failing.
void EntryWriter::Impl::WantReindex() {
  reindex_owed = true;
  (void)PayReindex();  // if it fails, the next commit tries again and fails until it is done
}

bool EntryWriter::Impl::PayReindex() {
  if (!reindex_owed) {
    return true;
  }

  bool wake = false;
  const bool updated = store.UpdateStatus(share_name, [&wake](ShareStatus& status) {
    wake = !status.needs_reindex && !status.reindex_begun;
    status.needs_reindex = true;
  });
  if (!updated) {
    return false;
  }

  // The flag stands, and whoever touches stale queues helps where this touch fails.
  std::string ignored;
  if (wake) {
    (void)AppendToQueue(share_name, {}, ignored);
  }
  reindex_owed = false;
  return true;
}

}  // namespace fileindexd
