// SPDX-License-Identifier: GPL-2.0-or-later
// Flags of shares, the pause state, markers.
#include "state/store_impl.h"

namespace fileindexd {

namespace {

constexpr const char* PAUSE = "pause";
constexpr int64_t NOT_PAUSED = -1;

ShareStatus ReadStatus(const Statement& row) {
  ShareStatus status;
  status.needs_reindex = row.Int(0) != 0;
  status.reindex_begun = row.Int(1) != 0;
  status.no_space = row.Int(2) != 0;
  status.missing = row.Int(3) != 0;
  status.rebuild_wanted = row.Int(4) != 0;
  status.accept_empty = row.Int(5) != 0;
  status.retry_contents = row.Int(6) != 0;
  return status;
}

bool IsSame(const ShareStatus& a, const ShareStatus& b) {
  return a.needs_reindex == b.needs_reindex && a.reindex_begun == b.reindex_begun &&
         a.no_space == b.no_space && a.missing == b.missing &&
         a.rebuild_wanted == b.rebuild_wanted && a.accept_empty == b.accept_empty &&
         a.retry_contents == b.retry_contents;
}

}  // namespace

// A share without a row has had nothing to remember yet.
bool StateStore::Impl::LoadStatus(const std::string& share, ShareStatus& status) {
  bool known = false;
  if (!HasRow("SELECT 1 FROM share WHERE name = ?", share, known)) {
    return false;
  }
  if (!known) {
    return Fail("there is no share " + share);
  }
  Statement ask;
  if (!Prepare(ask,
               "SELECT needs_reindex, reindex_begun, no_space, missing, rebuild_wanted,"
               " accept_empty, retry_contents FROM status WHERE share = ?")) {
    return false;
  }
  ask.BindBlob(1, share);
  const int result = ask.Step();
  if (result != SQLITE_ROW && result != SQLITE_DONE) {
    return FailSql();
  }
  status = result == SQLITE_ROW ? ReadStatus(ask) : ShareStatus();
  return true;
}

bool StateStore::GetStatus(const std::string& share, ShareStatus& status) {
  const std::lock_guard guard(impl->mutex);
  return impl->Ready() && impl->LoadStatus(share, status);
}

bool StateStore::UpdateStatus(const std::string& share,
                              const std::function<void(ShareStatus&)>& change) {
  const std::lock_guard guard(impl->mutex);
  return impl->Change([&] {
    ShareStatus before;
    if (!impl->LoadStatus(share, before)) {
      return Impl::Outcome::FAILED;
    }
    ShareStatus after = before;
    change(after);
    if (IsSame(before, after)) {
      return Impl::Outcome::UNCHANGED;
    }
    Statement write;
    if (!impl->Prepare(write,
                       "INSERT OR REPLACE INTO status(share, needs_reindex, reindex_begun,"
                       " no_space, missing, rebuild_wanted, accept_empty, retry_contents)"
                       " VALUES(?, ?, ?, ?, ?, ?, ?, ?)")) {
      return Impl::Outcome::FAILED;
    }
    write.BindBlob(1, share);
    write.BindInt(2, after.needs_reindex ? 1 : 0);
    write.BindInt(3, after.reindex_begun ? 1 : 0);
    write.BindInt(4, after.no_space ? 1 : 0);
    write.BindInt(5, after.missing ? 1 : 0);
    write.BindInt(6, after.rebuild_wanted ? 1 : 0);
    write.BindInt(7, after.accept_empty ? 1 : 0);
    write.BindInt(8, after.retry_contents ? 1 : 0);
    return impl->Done(impl->Run(write));
  });
}

bool StateStore::GetPause(int64_t& resume_time) {
  const std::lock_guard guard(impl->mutex);
  Statement ask;
  if (!impl->Ready() || !impl->Prepare(ask, "SELECT value FROM number WHERE name = ?")) {
    return false;
  }
  ask.BindText(1, PAUSE);
  const int result = ask.Step();
  if (result != SQLITE_ROW && result != SQLITE_DONE) {
    return impl->FailSql();
  }
  resume_time = result == SQLITE_ROW ? ask.Int(0) : NOT_PAUSED;
  return true;
}

bool StateStore::SetPause(int64_t resume_time) {
  const std::lock_guard guard(impl->mutex);
  return impl->Change([&] {
    Statement write;
    if (!impl->Prepare(write, "INSERT OR REPLACE INTO number VALUES(?, ?)")) {
      return Impl::Outcome::FAILED;
    }
    write.BindText(1, PAUSE);
    write.BindInt(2, resume_time);
    return impl->Done(impl->Run(write));
  });
}

bool StateStore::ClearPause(int64_t resume_time) {
  const std::lock_guard guard(impl->mutex);
  return impl->Change([&] {
    Statement ask;
    if (!impl->Prepare(ask, "SELECT 1 FROM number WHERE name = ? AND value = ?")) {
      return Impl::Outcome::FAILED;
    }
    ask.BindText(1, PAUSE);
    ask.BindInt(2, resume_time);
    const int result = ask.Step();
    if (result != SQLITE_ROW) {
      return result == SQLITE_DONE ? Impl::Outcome::UNCHANGED : impl->Done(impl->FailSql());
    }

    Statement write;
    if (!impl->Prepare(write, "UPDATE number SET value = ? WHERE name = ?")) {
      return Impl::Outcome::FAILED;
    }
    write.BindInt(1, NOT_PAUSED);
    write.BindText(2, PAUSE);
    return impl->Done(impl->Run(write));
  });
}

bool StateStore::HasMarker(const std::string& marker, bool& has) {
  const std::lock_guard guard(impl->mutex);
  return impl->Ready() && impl->HasRow("SELECT 1 FROM marker WHERE name = ?", marker, has);
}

bool StateStore::SetMarker(const std::string& marker) {
  const std::lock_guard guard(impl->mutex);
  return impl->Change([&] {
    Statement write;
    if (!impl->Prepare(write, "INSERT OR IGNORE INTO marker VALUES(?)")) {
      return Impl::Outcome::FAILED;
    }
    write.BindBlob(1, marker);
    return impl->Done(impl->Run(write));
  });
}

}  // namespace fileindexd
