// SPDX-License-Identifier: GPL-2.0-or-later
// The state database's file: its opening and its schema. For the copy beside it see store_copy.h.
//
//   state.db          the database (SQLite, WAL)
//   state.db.copy     as it was after the last change, if it could be left
//   state.db.damaged  what was set aside last
//
// Opening and copying are one program's at a time, under a lock on the state root. Nothing throws.
// Functions that fail set `error` to one line that names the file.
#pragma once

#include <sqlite3.h>

#include <array>
#include <memory>
#include <string>

#include "state/sqlite.h"

namespace fileindexd {

constexpr int STATE_VERSION = 4;  // of the schema

// Part of each change. A database that has counted fewer than its copy has lost some.
constexpr const char* COUNT_CHANGE =
    "INSERT INTO number VALUES('changes', 1) ON CONFLICT DO UPDATE SET value = value + 1";

// Owns a connection. Where the database was set aside, or its log or shared memory removed, closing
// leaves it as it stands: what others have committed since is not known here.
class StateConnection {
 public:
  StateConnection() = default;
  StateConnection(const StateConnection&) = delete;
  StateConnection& operator=(const StateConnection&) = delete;
  ~StateConnection();

  sqlite3* db = nullptr;
  std::string path;
  LogFiles log;  // that it uses
  // Why it is for reading only: the disk is full, and it sees no later change, or it was opened
  // without the lock. Else empty.
  std::string read_only;
  bool without_lock = false;
};

// Opens the database: makes it where there is none, upgrades an older one, refuses a newer one, and
// puts the copy in the place of one that is damaged or lacks changes that the copy has. On a full
// disk, which has no room for the log and the shared memory, the connection may be one for reading
// only; so it may where another program keeps the lock for more than 5 s, or without `wait` at all.
// Null on failure.
std::unique_ptr<StateConnection> OpenStateDatabase(bool wait, std::string& error);

// The second half of that: opens `connection` for reading what was closed properly, on a full disk.
// `error` is what kept it from being opened. In store_unlogged.cpp.
bool OpenFullState(StateConnection& connection, const std::string& error);

// Whether closing writes the log back into the database and removes it. Not where the database is
// not known to be sound: what is set aside must be what was found.
void TidyOnClose(const StateConnection& connection, bool tidy);

// What the head of the log's index says: it differs after each commit of whatever program.
using LogHead = std::array<unsigned char, 96>;

// Reads it from the memory that all users of the database share: no call of the system. The
// connection must have read something before, so that the log is open. False where there is none.
bool ReadLogHead(const StateConnection& connection, LogHead& head);

// True when the open file is no longer the one at its path.
bool IsSetAside(const StateConnection& connection);

// True when the open file or its log is no longer the one at its path: it was set aside or removed.
bool HasStateMoved(const StateConnection& connection);

// That a database is of a version that this program does not know, in one line.
std::string NewerVersion(const std::string& path, int64_t version);

// The connection's last error in one line.
std::string StateError(const StateConnection& connection, const char* what);

}  // namespace fileindexd
