// SPDX-License-Identifier: GPL-2.0-or-later
#include <syslog.h>

#include <climits>
#include <cstdlib>
#include <utility>

#include "state/layout.h"
#include "state/store_copy.h"
#include "state/store_impl.h"

namespace fileindexd {

namespace {

// Links on the way are resolved, so that a share that shows the folder by its real path leaves it
// out. It exists: the database in it is open.
std::string ResolvedStateRoot() {
  const std::string root = StateRoot();
  char resolved[PATH_MAX];
  return realpath(root.c_str(), resolved) != nullptr ? resolved : root;
}

}  // namespace

bool StateStore::Impl::Open(bool wait) {
  cached.reset();
  data_version.reset();
  connection.reset();
  files_failed = false;
  connection = OpenStateDatabase(wait, error);
  if (connection == nullptr) {
    return false;
  }
  const bool read_only = !connection->read_only.empty();
  if (read_only && !read_only_told) {
    const char* why = connection->read_only.c_str();
    if (connection->without_lock) {
      syslog(LOG_ERR, "%s:%d %s: nothing is changed there until it is unlocked", __FILE__, __LINE__,
             why);
    } else {
      syslog(LOG_ERR, "%s:%d %s: nothing is changed there until it has space", __FILE__, __LINE__,
             why);
    }
  }
  read_only_told = read_only;
  data_version.emplace();
  int64_t version = 0;
  if (!Prepare(*data_version, "PRAGMA data_version") || !ReadVersion(version)) {
    data_version.reset();
    connection.reset();
    return false;
  }
  return true;
}

bool StateStore::Impl::ReadVersion(int64_t& version) {
  if (data_version->Step() != SQLITE_ROW) {
    data_version->Reset();
    return FailSql();
  }
  version = data_version->Int(0);
  data_version->Reset();
  return true;
}

// An opening would refuse it; what is open goes on: whoever upgrades a system while it runs starts
// the programs anew.
void StateStore::Impl::LookAtVersion() {
  int64_t version = 0;
  const bool newer = SchemaVersion(connection->db, version) == SQLITE_OK && version > STATE_VERSION;
  if (newer && !newer_told) {
    syslog(LOG_ERR, "%s:%d %s; it is used until it is opened anew", __FILE__, __LINE__,
           NewerVersion(connection->path, version).c_str());
  }
  newer_told = newer;
}

// Several times for each document: where nothing was committed at all, two rounds of file locks are
// spared.
bool StateStore::Impl::IsCacheGood(const std::optional<LogHead>& head) {
  return cached != nullptr && head.has_value() && cached_head == head;
}

bool StateStore::Impl::Ready() {
  // A transaction that is still open here is one whose rollback failed.
  const bool useful = connection != nullptr && connection->read_only.empty() && !files_failed &&
                      sqlite3_get_autocommit(connection->db) != 0;
  if (useful && !HasStateMoved(*connection)) {
    return true;
  }
  // Whoever stands still with the lock has been waited for once.
  return Open(connection == nullptr || !connection->without_lock);
}

// SQLite opens a file that it may not write for reading only, and would stay with that for ever. A
// damaged one is put right by an opening, and by nothing else.
bool StateStore::Impl::FailSql() {
  const int code = sqlite3_errcode(connection->db) & 0xff;
  const bool damaged = IsDamage(code);
  if (damaged) {
    TidyOnClose(*connection, false);
  }
  files_failed = files_failed || damaged || code == SQLITE_IOERR || code == SQLITE_CANTOPEN ||
                 code == SQLITE_READONLY;
  return Fail(StateError(*connection, "cannot use"));
}

bool StateStore::Impl::Change(const std::function<Outcome()>& body) {
  bool is_lost = false;
  bool good = ChangeOnce(body, is_lost);
  if (is_lost) {
    good = ChangeOnce(body, is_lost);
  }
  return is_lost ? Fail(connection->path + " was replaced twice meanwhile") : good;
}

bool StateStore::Impl::ChangeOnce(const std::function<Outcome()>& body, bool& is_lost) {
  is_lost = false;
  if (!Ready()) {
    return false;
  }
  if (!connection->read_only.empty()) {
    return Fail(connection->read_only);
  }
  if (!Exec("BEGIN IMMEDIATE")) {
    return false;
  }
  const Outcome outcome = body();
  const bool committed = outcome == Outcome::CHANGED && Exec(COUNT_CHANGE) && Exec("COMMIT");
  if (!committed) {
    // Without a look at its result: what failed may have undone everything already.
    sqlite3_exec(connection->db, "ROLLBACK", nullptr, nullptr, nullptr);
    return outcome == Outcome::UNCHANGED;
  }

  return LeaveCopy(is_lost);
}

// The change itself is safe, but where another file or log has come in the place of the one that it
// was written to: another program has put it there, or this one does because what it has just read
// is damaged.
bool StateStore::Impl::LeaveCopy(bool& is_lost) {
  const std::string path = connection->path;
  const ino_t written = InodeOf(path);  // looked at first: what is found replaced leaves no copy
  std::string reason;
  const CopyLeft left = LeaveStateCopy(*connection, reason);
  const bool moved = left == CopyLeft::FAILED && HasStateMoved(*connection);
  if (left == CopyLeft::DAMAGED) {
    TidyOnClose(*connection, false);
    if (!Open()) {
      return false;
    }
    is_lost = InodeOf(path) != written;
  } else if (moved) {
    const std::string rows = IsSetAside(*connection) ? std::string() : RowsOf(*connection);
    if (!Open()) {  // leaves the copy
      return false;
    }
    is_lost = rows.empty() || RowsOf(*connection) != rows;
  }
  if (left != CopyLeft::FAILED || moved) {
    copy_failure.clear();
  } else if (std::exchange(copy_failure, reason) != reason) {
    syslog(LOG_ERR, "%s:%d %s", __FILE__, __LINE__, reason.c_str());
  }
  return true;
}

bool StateStore::Impl::ChangeSettings(const std::function<Outcome()>& body) {
  const bool good = Change(body);
  cached.reset();  // also when it failed: a commit whose result is lost may have happened
  return good;
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
  if (!Prepare(shares, "SELECT name, path, filesystem, language FROM share ORDER BY name")) {
    return false;
  }
  int result = SQLITE_OK;
  while ((result = shares.Step()) == SQLITE_ROW) {
    settings.shares.push_back({shares.Bytes(0), shares.Bytes(1), shares.Bytes(2), shares.Bytes(3)});
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
  return result == SQLITE_DONE ? LoadExcludes(settings) : FailSql();
}

// All tables as they were at one moment.
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
  // On a full disk the opening that follows the space's return makes all of it.
  const StateConnection* connection = impl->connection.get();
  const bool full =
      connection != nullptr && !connection->read_only.empty() && !connection->without_lock;
  const bool written = full || impl->Change([] { return Impl::Outcome::CHANGED; });
  bool found = false;
  return written && impl->HasRow("SELECT 1 FROM share WHERE name = ?", {}, found);
}

bool StateStore::GetSettings(std::shared_ptr<const Settings>& settings) {
  const std::lock_guard guard(impl->mutex);
  if (!impl->Ready()) {
    return false;
  }
  // The head and the number first: what is loaded may then be newer than they are, never older.
  LogHead head{};
  const std::optional<LogHead> seen =
      ReadLogHead(*impl->connection, head) ? std::make_optional(head) : std::nullopt;
  if (impl->IsCacheGood(seen)) {
    settings = impl->cached;
    return true;
  }

  int64_t version = 0;
  if (!impl->ReadVersion(version)) {
    return false;
  }
  if (impl->cached == nullptr || version != impl->cached_version) {
    auto loaded = std::make_shared<Settings>();
    if (!impl->Load(*loaded)) {
      return false;
    }
    impl->LookAtVersion();
    impl->cached = loaded;
    impl->cached_version = version;
  }
  impl->cached_head = seen;
  settings = impl->cached;
  return true;
}

bool StateStore::AddShare(const Share& share) {
  const std::lock_guard guard(impl->mutex);
  if (!CanNameNewShare(share.name)) {
    return impl->Fail("not a valid share name: " + share.name);
  }
  if (NormalPath(share.path) != share.path) {
    return impl->Fail("not a plain absolute path: " + share.path);
  }
  return impl->ChangeSettings([&] {
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
    if (!impl->Prepare(insert,
                       "INSERT INTO share(name, path, filesystem, language) VALUES(?, ?, ?, ?)")) {
      return Impl::Outcome::FAILED;
    }
    insert.BindBlob(1, share.name);
    insert.BindBlob(2, share.path);
    insert.BindText(3, share.filesystem);
    insert.BindText(4, share.language);
    return impl->Done(impl->Run(insert));
  });
}

StateStore::Impl::Outcome StateStore::Impl::Remove(const std::string& share_name) {
  for (const char* sql :
       {"DELETE FROM exclude WHERE folder IN (SELECT path FROM folder WHERE share = ?)",
        "DELETE FROM folder WHERE share = ?", "DELETE FROM status WHERE share = ?",
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
  return impl->ChangeSettings([&] { return impl->Remove(name); });
}

StateStore::Impl::Outcome StateStore::Impl::SetOfShare(const char* sql,
                                                       const std::string& share_name,
                                                       const std::string& text) {
  Statement update;
  if (!Prepare(update, sql)) {
    return Outcome::FAILED;
  }
  update.BindText(1, text);
  update.BindBlob(2, share_name);
  return Done(Run(update) &&
              (sqlite3_changes(connection->db) == 1 || Fail("there is no share " + share_name)));
}

bool StateStore::SetShareFilesystem(const std::string& name, const std::string& filesystem) {
  const std::lock_guard guard(impl->mutex);
  return impl->ChangeSettings([&] {
    return impl->SetOfShare("UPDATE share SET filesystem = ? WHERE name = ?", name, filesystem);
  });
}

bool StateStore::SetShareLanguage(const std::string& name, const std::string& language) {
  const std::lock_guard guard(impl->mutex);
  return impl->ChangeSettings([&] {
    return impl->SetOfShare("UPDATE share SET language = ? WHERE name = ?", name, language);
  });
}

}  // namespace fileindexd
