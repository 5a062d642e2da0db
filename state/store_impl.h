// SPDX-License-Identifier: GPL-2.0-or-later
// The inside of the store, for its own sources only.
#pragma once

#include <cstdint>
#include <functional>
#include <memory>
#include <mutex>
#include <optional>
#include <string>
#include <vector>

#include "state/settings.h"
#include "state/sqlite.h"
#include "state/store.h"
#include "state/store_database.h"

namespace fileindexd {

// `mutex` guards everything here, and is held by whoever calls an operation of it.
struct StateStore::Impl {
  bool Fail(const std::string& reason) {
    error = reason;
    return false;
  }
  bool FailSql();

  // Without `wait` for another program that opens it, too: for reading only then.
  bool Open(bool wait = true);
  // Opens anew where another program set the file aside or its log or shared memory is gone
  // (changes would be lost), and where the connection is of no use any more, or was for reading
  // only. Waits for a program that keeps the lock only where none was waited for the last time.
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
  bool ChangeOnce(const std::function<Outcome()>& body, bool& is_lost);
  bool LeaveCopy(bool& is_lost);
  // The same for what GetSettings shows.
  bool ChangeSettings(const std::function<Outcome()>& body);
  Outcome Done(bool good) { return good ? Outcome::CHANGED : Outcome::FAILED; }

  bool ReadVersion(int64_t& version);
  // Says it once when another program has made the open database one of a newer version.
  void LookAtVersion();
  bool IsCacheGood(const std::optional<LogHead>& head);

  // True with `found` when the text that is bound to column 1 has a row.
  bool HasRow(const char* sql, const std::string& key, bool& found);
  bool Load(Settings& settings);
  bool LoadTables(Settings& settings);
  bool LoadExcludes(Settings& settings);
  bool CheckExcludes(const std::vector<std::string>& patterns);
  // In the place of those that the folder has.
  bool WriteExcludes(const std::string& folder, const std::vector<std::string>& patterns);
  bool WriteFlags(const std::string& folder, const ContentFlags& wanted);
  Outcome Remove(const std::string& share_name);
  // The statement takes the text and then the name.
  Outcome SetOfShare(const char* sql, const std::string& share_name, const std::string& text);
  bool LoadStatus(const std::string& share, ShareStatus& status);

  std::mutex mutex;
  std::string error;
  std::unique_ptr<StateConnection> connection;
  bool files_failed = false;              // of this connection
  bool read_only_told = false;            // that it is for reading only, since it last was not
  bool newer_told = false;                // of the version, since it last was ours
  std::string copy_failure;               // that was told, since a copy was last left
  std::optional<Statement> data_version;  // goes before the connection
  int64_t cached_version = 0;
  std::optional<LogHead> cached_head;      // of the log, before `cached_version` was asked for
  std::shared_ptr<const Settings> cached;  // null: to be loaded
};

}  // namespace fileindexd
