// SPDX-License-Identifier: GPL-2.0-or-later
#include "state/store_database.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <syslog.h>

#include <algorithm>
#include <cerrno>

#include "base/scoped_fd.h"
#include "state/layout.h"
#include "state/state_files.h"
#include "state/store_copy.h"

namespace fileindexd {

namespace {

constexpr int BUSY_WAIT_MS = 5000;

// UPGRADES[n] leads from version n to n + 1. Paths and names are bytes, hence BLOB.
constexpr const char* UPGRADES[STATE_VERSION] = {
    "CREATE TABLE share(name BLOB PRIMARY KEY, path BLOB NOT NULL UNIQUE,"
    " filesystem TEXT NOT NULL) WITHOUT ROWID;"
    "CREATE TABLE folder(path BLOB PRIMARY KEY, share BLOB NOT NULL, document INT NOT NULL,"
    " audio INT NOT NULL, video INT NOT NULL, photo INT NOT NULL) WITHOUT ROWID;"
    "CREATE TABLE status(share BLOB PRIMARY KEY, needs_reindex INT NOT NULL,"
    " reindex_begun INT NOT NULL, no_space INT NOT NULL, missing INT NOT NULL,"
    " rebuild_wanted INT NOT NULL) WITHOUT ROWID;"
    "CREATE TABLE number(name TEXT PRIMARY KEY, value INT NOT NULL) WITHOUT ROWID;"
    "CREATE TABLE marker(name BLOB PRIMARY KEY) WITHOUT ROWID;",
    "CREATE TABLE exclude(folder BLOB NOT NULL, place INT NOT NULL, pattern BLOB NOT NULL,"
    " PRIMARY KEY(folder, place)) WITHOUT ROWID;"
    "ALTER TABLE status ADD COLUMN accept_empty INT NOT NULL DEFAULT 0;",
    "ALTER TABLE share ADD COLUMN language TEXT NOT NULL DEFAULT 'english';",
    "ALTER TABLE status ADD COLUMN retry_contents INT NOT NULL DEFAULT 0;",
};

enum class Opened { GOOD, DAMAGED, FAILED };

// SQLite would make the file with the mode that the umask leaves. Its log and its shared memory
// take the mode of the database.
bool MakeFile(const std::string& path, std::string& error) {
  const ScopedFd file(open(path.c_str(), O_RDWR | O_CREAT | O_EXCL | O_CLOEXEC, 0600));
  if (file.fd < 0) {
    if (errno == EEXIST) {
      return true;
    }
    error = StateFileError("cannot create", path);
    return false;
  }
  if (fchmod(file.fd, 0600) != 0) {
    error = StateFileError("cannot set the mode of", path);
    return false;
  }
  return true;
}

Opened Failed(const StateConnection& connection, const char* what, int result, std::string& error) {
  error = StateError(connection, what);
  return IsDamage(result) ? Opened::DAMAGED : Opened::FAILED;
}

// Tables that are not those of their version are damage, too.
Opened FailedAtTables(int result) {
  return IsDamage(result) || (result & 0xff) == SQLITE_ERROR ? Opened::DAMAGED : Opened::FAILED;
}

Opened Upgrade(const StateConnection& connection, int64_t version, std::string& error) {
  int result = Execute(connection.db, "BEGIN IMMEDIATE");
  for (int64_t at = version; result == SQLITE_OK && at < STATE_VERSION; ++at) {
    result = Execute(connection.db, UPGRADES[at]);
  }
  if (result == SQLITE_OK) {
    const std::string mark = "PRAGMA user_version=" + std::to_string(STATE_VERSION);
    result = Execute(connection.db, mark.c_str());
  }
  if (result == SQLITE_OK) {
    result = Execute(connection.db, "COMMIT");
  }
  if (result == SQLITE_OK) {
    if (version > 0) {
      syslog(LOG_ERR, "%s:%d %s is upgraded from version %d to %d", __FILE__, __LINE__,
             connection.path.c_str(), static_cast<int>(version), STATE_VERSION);
    }
    return Opened::GOOD;
  }
  error = StateError(connection, "cannot upgrade");
  (void)Execute(connection.db, "ROLLBACK");  // the failure may have done it already
  return FailedAtTables(result);
}

// The version is looked at before anything else is believed: a newer one may hold anything.
Opened CheckAndUpgrade(const StateConnection& connection, bool has_copy, CopyAge& age,
                       std::string& error) {
  int64_t version = 0;
  int result = SchemaVersion(connection.db, version);
  if (result != SQLITE_OK) {
    return Failed(connection, "cannot read", result, error);
  }
  if (version > STATE_VERSION) {
    error = NewerVersion(connection.path, version);
    return Opened::FAILED;
  }
  // A copy exists only beside a database that had its tables: an empty one has lost them.
  if (version < 0 || (version == 0 && has_copy)) {
    error = connection.path + " has lost its contents";
    return Opened::DAMAGED;
  }
  bool ok = false;
  result = QuickCheck(connection.db, ok);
  if (result != SQLITE_OK) {
    return Failed(connection, "cannot check", result, error);
  }
  if (!ok) {
    error = connection.path + " is damaged";
    return Opened::DAMAGED;
  }
  result = CompareWithCopy(connection, age, error);
  if (result != SQLITE_OK) {
    return FailedAtTables(result);
  }
  if (age == CopyAge::AHEAD) {
    error = connection.path + " has lost changes";
    return Opened::DAMAGED;
  }
  return version < STATE_VERSION ? Upgrade(connection, version, error) : Opened::GOOD;
}

Opened OpenFile(StateConnection& connection, bool has_copy, CopyAge& age, std::string& error) {
  // No mutex of SQLite's own: the store serialises its users.
  constexpr int FLAGS = SQLITE_OPEN_READWRITE | SQLITE_OPEN_NOMUTEX;
  int result = sqlite3_open_v2(connection.path.c_str(), &connection.db, FLAGS, nullptr);
  if (result != SQLITE_OK) {
    return Failed(connection, "cannot open", result, error);
  }
  sqlite3_extended_result_codes(connection.db, 1);
  sqlite3_busy_timeout(connection.db, BUSY_WAIT_MS);
  TidyOnClose(connection, false);
  const Opened outcome = CheckAndUpgrade(connection, has_copy, age, error);
  if (outcome != Opened::GOOD) {
    return outcome;
  }
  // The log is opened by the first that reads.
  result = Execute(connection.db,
                   "PRAGMA journal_mode=WAL; PRAGMA synchronous=FULL;"
                   "SELECT 1 FROM sqlite_schema LIMIT 1");
  if (result != SQLITE_OK) {
    return Failed(connection, "cannot set up", result, error);
  }
  TidyOnClose(connection, true);
  connection.log = LogFilesOf(connection.path);
  return Opened::GOOD;
}

// What is no regular file is damage: SQLite would wait for ever in a pipe.
bool AreFilesOrNothing(const std::string& path) {
  return IsFileOrNothing(path) && IsFileOrNothing(path + "-wal") &&
         IsFileOrNothing(path + "-shm") && IsFileOrNothing(path + "-journal");
}

// To SQLite an empty file has no log: it would remove one that is there. A log that a program of
// ours begins stands beside a file with tables.
bool IsEmptyBesideLog(const std::string& path) {
  constexpr off_t LOG_HEADER = 32;  // a log of this size holds nothing
  struct stat file {};
  struct stat log {};
  return lstat(path.c_str(), &file) == 0 && file.st_size == 0 &&
         lstat((path + "-wal").c_str(), &log) == 0 && log.st_size > LOG_HEADER;
}

// A disk that fails for a moment looks like damage: it is looked at twice, from the beginning.
Opened OpenTwice(std::unique_ptr<StateConnection>& connection, bool has_copy, const ScopedFd& root,
                 std::string& error) {
  const std::string path = connection->path;
  CopyAge age = CopyAge::LEVEL;
  Opened outcome = OpenFile(*connection, has_copy, age, error);
  if (outcome == Opened::DAMAGED) {
    connection = std::make_unique<StateConnection>();
    connection->path = path;
    outcome = OpenFile(*connection, has_copy, age, error);
  }
  // Left by a program that was killed, or met a full disk. Where it still cannot be, the next
  // change says so.
  if (outcome == Opened::GOOD && age == CopyAge::BEHIND) {
    std::string ignored;
    (void)LeaveStateCopy(*connection, root, ignored);
  }
  return outcome;
}

// Whoever has the lock may stand still, and is not to keep out who only wants to read. What is
// there is taken as it is: sound and of our version, or not at all.
bool OpenWithoutLock(StateConnection& connection, const std::string& error) {
  const std::string& path = connection.path;
  if (!StateFileExists(path) || !AreFilesOrNothing(path) || IsEmptyBesideLog(path)) {
    return false;
  }
  constexpr int FLAGS = SQLITE_OPEN_READONLY | SQLITE_OPEN_NOMUTEX;
  if (sqlite3_open_v2(path.c_str(), &connection.db, FLAGS, nullptr) != SQLITE_OK) {
    return false;
  }
  sqlite3_busy_timeout(connection.db, BUSY_WAIT_MS);
  TidyOnClose(connection, false);
  int64_t version = 0;
  bool ok = false;
  connection.read_only = error;
  connection.without_lock = true;
  return SchemaVersion(connection.db, version) == SQLITE_OK && version == STATE_VERSION &&
         QuickCheck(connection.db, ok) == SQLITE_OK && ok;
}

}  // namespace

StateConnection::~StateConnection() {
  if (db != nullptr && HasStateMoved(*this)) {
    TidyOnClose(*this, false);
  }
  sqlite3_close_v2(db);
}

void TidyOnClose(const StateConnection& connection, bool tidy) {
  int keep_log = tidy ? 0 : 1;
  sqlite3_db_config(connection.db, SQLITE_DBCONFIG_NO_CKPT_ON_CLOSE, keep_log, nullptr);
  sqlite3_file_control(connection.db, "main", SQLITE_FCNTL_PERSIST_WAL, &keep_log);
}

std::string NewerVersion(const std::string& path, int64_t version) {
  return path + " has version " + std::to_string(version) +
         ", made by a newer program; this one knows " + std::to_string(STATE_VERSION);
}

std::string StateError(const StateConnection& connection, const char* what) {
  return std::string(what) + " " + connection.path + ": " + sqlite3_errmsg(connection.db);
}

bool ReadLogHead(const StateConnection& connection, LogHead& head) {
  constexpr int REGION = 32 * 1024;  // SQLite's own size: the mapping is the one that it uses
  sqlite3_file* file = nullptr;
  if (sqlite3_file_control(connection.db, "main", SQLITE_FCNTL_FILE_POINTER, &file) != SQLITE_OK ||
      file->pMethods == nullptr || file->pMethods->iVersion < 2 ||
      file->pMethods->xShmMap == nullptr) {
    return false;
  }
  volatile void* shared = nullptr;
  if (file->pMethods->xShmMap(file, 0, REGION, 0, &shared) != SQLITE_OK || shared == nullptr) {
    return false;
  }
  // What was committed before a queue was read is seen by whoever looks here after that.
  file->pMethods->xShmBarrier(file);
  const auto* bytes = static_cast<const volatile unsigned char*>(shared);
  std::copy_n(bytes, head.size(), head.begin());
  return true;
}

bool IsSetAside(const StateConnection& connection) {
  int moved = 0;
  const int result = sqlite3_file_control(connection.db, "main", SQLITE_FCNTL_HAS_MOVED, &moved);
  return result == SQLITE_OK && moved != 0;
}

bool HasStateMoved(const StateConnection& connection) {
  return IsSetAside(connection) || LogFilesOf(connection.path) != connection.log;
}

std::unique_ptr<StateConnection> OpenStateDatabase(bool wait, std::string& error) {
  ScopedFd lock;
  if (!MakeStateRoot(error)) {
    return nullptr;
  }
  const std::string path = StateDatabasePath();
  if (!LockStateRoot(StateRoot(), wait, lock, error)) {
    auto connection = std::make_unique<StateConnection>();
    connection->path = path;
    return OpenWithoutLock(*connection, error) ? std::move(connection) : nullptr;
  }
  const bool has_copy = StateFileExists(path + ".copy");
  bool recovered = false;
  for (;;) {
    auto connection = std::make_unique<StateConnection>();
    connection->path = path;
    Opened outcome = Opened::DAMAGED;
    if (has_copy && !StateFileExists(path)) {
      error = path + " is missing";
    } else if (!AreFilesOrNothing(path)) {
      error = path + " or its log is no regular file";
    } else if (IsEmptyBesideLog(path)) {
      error = path + " is empty beside its log";
    } else if (!MakeFile(path, error)) {
      return nullptr;
    } else {
      outcome = OpenTwice(connection, has_copy, lock, error);
    }
    if (outcome == Opened::GOOD) {
      return connection;
    }
    if (outcome == Opened::FAILED) {
      connection = std::make_unique<StateConnection>();
      connection->path = path;
      return OpenFullState(*connection, error) ? std::move(connection) : nullptr;
    }
    if (recovered) {
      return nullptr;
    }

    connection.reset();  // or its closing would write to what is put in place
    const std::string found = error;
    const std::string kept =
        StateFileExists(path) ? ", and it is kept as " + path + ".damaged" : "";
    if (!PutCopyInPlace(path, lock, error)) {
      return nullptr;
    }
    syslog(LOG_ERR, "%s:%d %s; its last copy is used instead%s", __FILE__, __LINE__, found.c_str(),
           kept.c_str());
    recovered = true;
  }
}

}  // namespace fileindexd
