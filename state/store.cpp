// SPDX-License-Identifier: GPL-2.0-or-later
#include "state/store.h"

#include <syslog.h>

#include <climits>
#include <cstdlib>
#include <mutex>
#include <optional>

#include "state/layout.h"
#include "state/sqlite.h"
#include "state/store_database.h"

namespace fileindexd {

namespace {

constexpr const char* PAUSE = "pause";

// Links on the way are resolved, so that a share that shows the folder by its real path leaves it
// out. It exists: the database in it is open.
std::string ResolvedStateRoot() {
  const std::string root = StateRoot();
  char resolved[PATH_MAX];
  return realpath(root.c_str(), resolved) != nullptr ? resolved : root;
}

ShareStatus ReadStatus(const Statement& row) {
  ShareStatus status;
  status.needs_reindex = row.Int(0) != 0;
  status.reindex_begun = row.Int(1) != 0;
  status.no_space = row.Int(2) != 0;
  status.missing = row.Int(3) != 0;
  status.rebuild_wanted = row.Int(4) != 0;
  return status;
}

bool IsSame(const ShareStatus& a, const ShareStatus& b) {
  return a.needs_reindex == b.needs_reindex && a.reindex_begun == b.reindex_begun &&
         a.no_space == b.no_space && a.missing == b.missing && a.rebuild_wanted == b.rebuild_wanted;
}

void BindFlags(Statement& statement, int first, const ContentFlags& wanted) {
  statement.BindInt(first, wanted.document ? 1 : 0);
  statement.BindInt(first + 1, wanted.audio ? 1 : 0);
  statement.BindInt(first + 2, wanted.video ? 1 : 0);
  statement.BindInt(first + 3, wanted.photo ? 1 : 0);
}

}  // namespace

// `mutex` guards everything here, and is held by whoever calls an operation of it.
struct StateStore::Impl {
  bool Fail(const std::string& reason) {
    error = reason;
    return false;
  }
  bool FailSql() { return Fail(StateError(*connection, "cannot use")); }

  bool Open();
  // Opens anew where another program set the file aside: changes to it would be lost.
  bool Ready();
  bool Prepare(Statement& statement, const char* sql) {
    return statement.Prepare(connection->db, sql) == SQLITE_OK || FailSql();
  }
  bool Run(Statement& statement) { return statement.Run() == SQLITE_OK || FailSql(); }
  bool Exec(const char* sql) {
    return sqlite3_exec(connection->db, sql, nullptr, nullptr, nullptr) == SQLITE_OK || FailSql();
  }

  enum class Outcome { CHANGED, UNCHANGED, FAILED };
  // Runs `body` in one transaction that is undone unless it answers CHANGED.
  bool Change(const std::function<Outcome()>& body);
  Outcome Done(bool good) { return good ? Outcome::CHANGED : Outcome::FAILED; }

  // True with `found` when the text that is bound to column 1 has a row.
  bool HasRow(const char* sql, const std::string& key, bool& found);
  bool Load(Settings& settings);
  bool LoadTables(Settings& settings);
  Outcome Remove(const std::string& share_name);
  bool LoadStatus(const std::string& share, ShareStatus& status);

  std::mutex mutex;
  std::string error;
  std::unique_ptr<StateConnection> connection;
  std::optional<Statement> data_version;  // goes before the connection
  int64_t cached_version = 0;
  std::shared_ptr<const Settings> cached;  // null: to be loaded
};

bool StateStore::Impl::Open() {
  cached.reset();
  data_version.reset();
  connection.reset();
  connection = OpenStateDatabase(error);
  if (connection == nullptr) {
    return false;
  }
  data_version.emplace();
  if (!Prepare(*data_version, "PRAGMA data_version")) {
    connection.reset();
    return false;
  }
  return true;
}

bool StateStore::Impl::Ready() {
  return (connection != nullptr && !HasStateMoved(*connection)) || Open();
}

bool StateStore::Impl::Change(const std::function<Outcome()>& body) {
  if (!Ready() || !Exec("BEGIN IMMEDIATE")) {
    return false;
  }
  const Outcome outcome = body();
  const bool committed = outcome == Outcome::CHANGED && Exec("COMMIT");
  if (!committed) {
    // Without a look at its result: what failed may have undone everything already.
    sqlite3_exec(connection->db, "ROLLBACK", nullptr, nullptr, nullptr);
    return outcome == Outcome::UNCHANGED;
  }

  cached.reset();
  std::string reason;
  if (!LeaveStateCopy(*connection, reason)) {
    syslog(LOG_ERR, "%s", reason.c_str());  // the change itself is safe
  }
  return true;
}

bool StateStore::Impl::HasRow(const char* sql, const std::string& key, bool& found) {
  Statement ask;
  if (!Prepare(ask, sql)) {
    return false;
  }
  ask.BindBlob(1, key);
  const int result = ask.Step();
  if (result != SQLITE_ROW && result != SQLITE_DONE) {
    return FailSql();
  }
  found = result == SQLITE_ROW;
  return true;
}

bool StateStore::Impl::LoadTables(Settings& settings) {
  Statement shares;
  if (!Prepare(shares, "SELECT name, path, filesystem FROM share ORDER BY name")) {
    return false;
  }
  int result = SQLITE_OK;
  while ((result = shares.Step()) == SQLITE_ROW) {
    settings.shares.push_back({shares.Bytes(0), shares.Bytes(1), shares.Bytes(2)});
  }
  if (result != SQLITE_DONE) {
    return FailSql();
  }

  Statement folders;
  if (!Prepare(folders,
               "SELECT share, path, document, audio, video, photo FROM folder"
               " ORDER BY path")) {
    return false;
  }
  while ((result = folders.Step()) == SQLITE_ROW) {
    const ContentFlags wanted = {folders.Int(2) != 0, folders.Int(3) != 0, folders.Int(4) != 0,
                                 folders.Int(5) != 0};
    settings.folders.push_back({folders.Bytes(0), folders.Bytes(1), wanted});
  }
  return result == SQLITE_DONE || FailSql();
}

// Both tables as they were at one moment.
bool StateStore::Impl::Load(Settings& settings) {
  const bool own = sqlite3_get_autocommit(connection->db) != 0;
  if (own && !Exec("BEGIN")) {
    return false;
  }
  const bool good = LoadTables(settings);
  if (own) {
    sqlite3_exec(connection->db, "ROLLBACK", nullptr, nullptr, nullptr);  // nothing was written
  }
  settings.state_root = ResolvedStateRoot();
  return good;
}

StateStore::StateStore() : impl(std::make_unique<Impl>()) {}

StateStore::~StateStore() = default;

std::unique_ptr<StateStore> StateStore::Open(std::string& error) {
  std::unique_ptr<StateStore> store(new StateStore);
  if (!store->impl->Open()) {
    error = store->impl->error;
    return nullptr;
  }
  return store;
}

std::string StateStore::Error() {
  const std::lock_guard guard(impl->mutex);
  return impl->error;
}

bool StateStore::Touch() {
  const std::lock_guard guard(impl->mutex);
  const bool written = impl->Change([&] {
    return impl->Done(
        impl->Exec("INSERT INTO number VALUES('touched', 1)"
                   " ON CONFLICT DO UPDATE SET value = value + 1"));
  });
  bool found = false;
  return written && impl->HasRow("SELECT 1 FROM share WHERE name = ?", {}, found);
}

bool StateStore::GetSettings(std::shared_ptr<const Settings>& settings) {
  const std::lock_guard guard(impl->mutex);
  if (!impl->Ready()) {
    return false;
  }
  // The number first: what is loaded may then be newer than it, never older.
  if (impl->data_version->Step() != SQLITE_ROW) {
    impl->data_version->Reset();
    return impl->FailSql();
  }
  const int64_t version = impl->data_version->Int(0);
  impl->data_version->Reset();
  if (impl->cached == nullptr || version != impl->cached_version) {
    auto loaded = std::make_shared<Settings>();
    if (!impl->Load(*loaded)) {
      return false;
    }
    impl->cached = loaded;
    impl->cached_version = version;
  }
  settings = impl->cached;
  return true;
}

bool StateStore::AddShare(const Share& share) {
  const std::lock_guard guard(impl->mutex);
  if (!IsValidShareName(share.name)) {
    return impl->Fail("not a valid share name: " + share.name);
  }
  if (NormalPath(share.path) != share.path) {
    return impl->Fail("not a plain absolute path: " + share.path);
  }
  return impl->Change([&] {
    Settings settings;
    if (!impl->Load(settings)) {
      return Impl::Outcome::FAILED;
    }
    if (settings.ShareByName(share.name) != nullptr) {
      return impl->Done(impl->Fail("there is a share " + share.name + " already"));
    }
    for (const Share& other : settings.shares) {
      if (Covers(other.path, share.path) || Covers(share.path, other.path)) {
        return impl->Done(impl->Fail(share.path + " and " + other.path + " of share " + other.name +
                                     " must not lie one inside the other"));
      }
    }
    Statement insert;
    if (!impl->Prepare(insert, "INSERT INTO share VALUES(?, ?, ?)")) {
      return Impl::Outcome::FAILED;
    }
    insert.BindBlob(1, share.name);
    insert.BindBlob(2, share.path);
    insert.BindText(3, share.filesystem);
    return impl->Done(impl->Run(insert));
  });
}

StateStore::Impl::Outcome StateStore::Impl::Remove(const std::string& share_name) {
  for (const char* sql :
       {"DELETE FROM folder WHERE share = ?", "DELETE FROM status WHERE share = ?",
        "DELETE FROM share WHERE name = ?"}) {
    Statement remove;
    if (!Prepare(remove, sql)) {
      return Outcome::FAILED;
    }
    remove.BindBlob(1, share_name);
    if (!Run(remove)) {
      return Outcome::FAILED;
    }
  }
  return Done(sqlite3_changes(connection->db) == 1 || Fail("there is no share " + share_name));
}

bool StateStore::RemoveShare(const std::string& name) {
  const std::lock_guard guard(impl->mutex);
  return impl->Change([&] { return impl->Remove(name); });
}

bool StateStore::SetShareFilesystem(const std::string& name, const std::string& filesystem) {
  const std::lock_guard guard(impl->mutex);
  return impl->Change([&] {
    Statement update;
    if (!impl->Prepare(update, "UPDATE share SET filesystem = ? WHERE name = ?")) {
      return Impl::Outcome::FAILED;
    }
    update.BindText(1, filesystem);
    update.BindBlob(2, name);
    return impl->Done(impl->Run(update) && (sqlite3_changes(impl->connection->db) == 1 ||
                                            impl->Fail("there is no share " + name)));
  });
}

bool StateStore::AddFolder(const std::string& path, const ContentFlags& wanted) {
  const std::lock_guard guard(impl->mutex);
  if (NormalPath(path) != path) {
    return impl->Fail("not a plain absolute path: " + path);
  }
  return impl->Change([&] {
    Settings settings;
    if (!impl->Load(settings)) {
      return Impl::Outcome::FAILED;
    }
    const Share* share = settings.ShareOfPath(path);
    if (share == nullptr) {
      return impl->Done(impl->Fail(path + " lies in no share"));
    }
    if (settings.FolderAt(path) != nullptr) {
      return impl->Done(impl->Fail(path + " is an indexed folder already"));
    }
    Statement insert;
    if (!impl->Prepare(insert, "INSERT INTO folder VALUES(?, ?, ?, ?, ?, ?)")) {
      return Impl::Outcome::FAILED;
    }
    insert.BindBlob(1, path);
    insert.BindBlob(2, share->name);
    BindFlags(insert, 3, wanted);
    return impl->Done(impl->Run(insert));
  });
}

bool StateStore::SetFolder(const std::string& path, const ContentFlags& wanted) {
  const std::lock_guard guard(impl->mutex);
  return impl->Change([&] {
    Statement update;
    if (!impl->Prepare(update,
                       "UPDATE folder SET document = ?, audio = ?, video = ?, photo = ?"
                       " WHERE path = ?")) {
      return Impl::Outcome::FAILED;
    }
    BindFlags(update, 1, wanted);
    update.BindBlob(5, path);
    return impl->Done(impl->Run(update) && (sqlite3_changes(impl->connection->db) == 1 ||
                                            impl->Fail(path + " is no indexed folder")));
  });
}

bool StateStore::RemoveFolder(const std::string& path) {
  const std::lock_guard guard(impl->mutex);
  return impl->Change([&] {
    Statement remove;
    if (!impl->Prepare(remove, "DELETE FROM folder WHERE path = ?")) {
      return Impl::Outcome::FAILED;
    }
    remove.BindBlob(1, path);
    return impl->Done(impl->Run(remove) && (sqlite3_changes(impl->connection->db) == 1 ||
                                            impl->Fail(path + " is no indexed folder")));
  });
}

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
               "SELECT needs_reindex, reindex_begun, no_space, missing, rebuild_wanted"
               " FROM status WHERE share = ?")) {
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
    if (!impl->Prepare(write, "INSERT OR REPLACE INTO status VALUES(?, ?, ?, ?, ?, ?)")) {
      return Impl::Outcome::FAILED;
    }
    write.BindBlob(1, share);
    write.BindInt(2, after.needs_reindex ? 1 : 0);
    write.BindInt(3, after.reindex_begun ? 1 : 0);
    write.BindInt(4, after.no_space ? 1 : 0);
    write.BindInt(5, after.missing ? 1 : 0);
    write.BindInt(6, after.rebuild_wanted ? 1 : 0);
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
  resume_time = result == SQLITE_ROW ? ask.Int(0) : -1;
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
