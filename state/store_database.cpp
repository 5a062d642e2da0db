// SPDX-License-Identifier: GPL-2.0-or-later
#include "state/store_database.h"

#include <fcntl.h>
#include <sys/file.h>
#include <sys/stat.h>
#include <syslog.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <chrono>
#include <cstring>
#include <filesystem>
#include <system_error>
#include <thread>

#include "base/scoped_fd.h"
#include "state/layout.h"

namespace fileindexd {

namespace {

constexpr int BUSY_WAIT_MS = 5000;
constexpr std::chrono::milliseconds LOCK_WAIT(BUSY_WAIT_MS);
constexpr std::chrono::milliseconds LOCK_NAP(5);

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

std::string Reason(const std::string& what, const std::string& path) {
  return what + " " + path + ": " + strerror(errno);  // NOLINT: glibc's is safe
}

bool IsDamage(int result) {
  return (result & 0xff) == SQLITE_CORRUPT || (result & 0xff) == SQLITE_NOTADB;
}

// The lock on the state root, waited for 5 s at most.
bool LockRoot(const std::string& root, ScopedFd& lock, std::string& error) {
  ScopedFd folder(open(root.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
  if (folder.fd < 0) {
    error = Reason("cannot open", root);
    return false;
  }
  const auto deadline = std::chrono::steady_clock::now() + LOCK_WAIT;
  while (flock(folder.fd, LOCK_EX | LOCK_NB) != 0) {
    if ((errno != EWOULDBLOCK && errno != EINTR) || std::chrono::steady_clock::now() >= deadline) {
      error = Reason("cannot lock", root);
      return false;
    }
    std::this_thread::sleep_for(LOCK_NAP);
  }
  lock.Swap(folder);
  return true;
}

bool Exists(const std::string& path) {
  struct stat st {};
  return lstat(path.c_str(), &st) == 0;
}

// SQLite would wait for ever in a pipe.
bool IsFileOrNothing(const std::string& path) {
  struct stat st {};
  return lstat(path.c_str(), &st) != 0 || S_ISREG(st.st_mode);
}

// In the place of what was set aside before, which stays where there is nothing to set aside. A
// rename alone cannot put a file in a folder's place.
bool MoveAside(const std::string& path, const std::string& aside) {
  if (!Exists(path)) {
    return true;
  }
  std::error_code ignored;  // what is in the way still makes the renaming fail
  std::filesystem::remove_all(aside, ignored);
  return rename(path.c_str(), aside.c_str()) == 0 || errno == ENOENT;
}

// SQLite would make the file with the mode that the umask leaves. Its log and its shared memory
// take the mode of the database.
bool MakeFile(const std::string& path, std::string& error) {
  const ScopedFd file(open(path.c_str(), O_RDWR | O_CREAT | O_EXCL | O_CLOEXEC, 0600));
  if (file.fd < 0) {
    if (errno == EEXIST) {
      return true;
    }
    error = Reason("cannot create", path);
    return false;
  }
  if (fchmod(file.fd, 0600) != 0) {
    error = Reason("cannot set the mode of", path);
    return false;
  }
  return true;
}

int Exec(const StateConnection& connection, const char* sql) {
  return sqlite3_exec(connection.db, sql, nullptr, nullptr, nullptr);
}

Opened Failed(const StateConnection& connection, const char* what, int result, std::string& error) {
  error = StateError(connection, what);
  return IsDamage(result) ? Opened::DAMAGED : Opened::FAILED;
}

Opened Upgrade(const StateConnection& connection, int64_t version, std::string& error) {
  int result = Exec(connection, "BEGIN IMMEDIATE");
  for (int64_t at = version; result == SQLITE_OK && at < STATE_VERSION; ++at) {
    result = Exec(connection, UPGRADES[at]);
  }
  if (result == SQLITE_OK) {
    const std::string mark = "PRAGMA user_version=" + std::to_string(STATE_VERSION);
    result = Exec(connection, mark.c_str());
  }
  if (result == SQLITE_OK) {
    result = Exec(connection, "COMMIT");
  }
  if (result == SQLITE_OK) {
    if (version > 0) {
      syslog(LOG_ERR, "%s:%d %s is upgraded from version %d to %d", __FILE__, __LINE__,
             connection.path.c_str(), static_cast<int>(version), STATE_VERSION);
    }
    return Opened::GOOD;
  }
  const Opened outcome = Failed(connection, "cannot upgrade", result, error);
  (void)Exec(connection, "ROLLBACK");  // the failure may have done it already
  return outcome;
}

// The version is looked at before anything else is believed: a newer one may hold anything.
Opened CheckAndUpgrade(const StateConnection& connection, bool has_copy, std::string& error) {
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
  return version < STATE_VERSION ? Upgrade(connection, version, error) : Opened::GOOD;
}

Opened OpenFile(StateConnection& connection, bool has_copy, std::string& error) {
  // No mutex of SQLite's own: the store serialises its users.
  constexpr int FLAGS = SQLITE_OPEN_READWRITE | SQLITE_OPEN_NOMUTEX;
  int result = sqlite3_open_v2(connection.path.c_str(), &connection.db, FLAGS, nullptr);
  if (result != SQLITE_OK) {
    return Failed(connection, "cannot open", result, error);
  }
  sqlite3_extended_result_codes(connection.db, 1);
  sqlite3_busy_timeout(connection.db, BUSY_WAIT_MS);
  TidyOnClose(connection, false);
  const Opened outcome = CheckAndUpgrade(connection, has_copy, error);
  if (outcome != Opened::GOOD) {
    return outcome;
  }
  result = Exec(connection, "PRAGMA journal_mode=WAL; PRAGMA synchronous=FULL");
  if (result != SQLITE_OK) {
    return Failed(connection, "cannot set up", result, error);
  }
  TidyOnClose(connection, true);
  return Opened::GOOD;
}

bool ReadAll(const std::string& path, std::string& bytes) {
  const ScopedFd file(open(path.c_str(), O_RDONLY | O_CLOEXEC | O_NONBLOCK));
  char buffer[16384];
  for (;;) {
    const ssize_t length = file.fd < 0 ? -1 : read(file.fd, buffer, sizeof buffer);
    if (length <= 0) {
      return length == 0;
    }
    bytes.append(buffer, static_cast<size_t>(length));
  }
}

// Whether the bytes are a sound database with tables of ours, in the form of a copy.
bool IsSoundImage(std::string image) {
  StateConnection memory;
  auto* bytes = reinterpret_cast<unsigned char*>(image.data());
  const auto size = static_cast<sqlite3_int64>(image.size());
  if (image.empty() || sqlite3_open(":memory:", &memory.db) != SQLITE_OK ||
      sqlite3_deserialize(memory.db, "main", bytes, size, size, SQLITE_DESERIALIZE_READONLY) !=
          SQLITE_OK) {
    return false;
  }
  int64_t version = 0;
  bool ok = false;
  const bool sound = SchemaVersion(memory.db, version) == SQLITE_OK && version > 0 &&
                     QuickCheck(memory.db, ok) == SQLITE_OK && ok;
  sqlite3_close(memory.db);  // before the bytes go
  memory.db = nullptr;
  return sound;
}

bool WriteSafely(const std::string& path, const std::string& bytes, std::string& error) {
  const std::string temporary = path + ".new";
  (void)unlink(temporary.c_str());  // left by a program that was killed
  ScopedFd file(open(temporary.c_str(), O_WRONLY | O_CREAT | O_EXCL | O_CLOEXEC, 0600));
  bool good = file.fd >= 0 && fchmod(file.fd, 0600) == 0;
  for (size_t at = 0; good && at < bytes.size();) {
    const ssize_t written = write(file.fd, bytes.data() + at, bytes.size() - at);
    good = written > 0 || (written < 0 && errno == EINTR);
    at += written > 0 ? static_cast<size_t>(written) : 0;
  }
  good = good && fsync(file.fd) == 0 && rename(temporary.c_str(), path.c_str()) == 0;
  if (!good) {
    error = Reason("cannot write", path);
    (void)unlink(temporary.c_str());
  }
  return good;
}

// What was renamed is to be found under its new name after a power failure.
void SyncFolder(const ScopedFd& folder) {
  (void)fsync(folder.fd);
}

// Sets the database aside and puts the copy in its place. The database goes first: a program that
// is stopped in between leaves none, and the next one finds the copy beside the gap. Its log must
// not stay: it would be played into the copy.
bool PutCopyInPlace(const std::string& path, const ScopedFd& root, std::string& error) {
  std::string image;
  if (!ReadAll(path + ".copy", image) || !IsSoundImage(image)) {
    error += "; and there is no sound copy of it";
    return false;
  }
  const std::string aside = path + ".damaged";
  std::error_code ignored;
  if (Exists(path)) {
    std::filesystem::remove_all(aside + "-wal", ignored);  // of what was set aside before
  }
  if (!MoveAside(path, aside)) {
    error += "; " + Reason("cannot set aside", path);
    return false;
  }
  if (!MoveAside(path + "-wal", aside + "-wal")) {
    error += "; " + Reason("cannot set aside the log of", path);
    return false;
  }
  std::filesystem::remove_all(path + "-shm", ignored);  // no use without the log, and made anew
  if (!WriteSafely(path, image, error)) {
    return false;
  }
  SyncFolder(root);
  return true;
}

}  // namespace

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

bool HasStateMoved(const StateConnection& connection) {
  int moved = 0;
  const int result = sqlite3_file_control(connection.db, "main", SQLITE_FCNTL_HAS_MOVED, &moved);
  return result == SQLITE_OK && moved != 0;
}

std::unique_ptr<StateConnection> OpenStateDatabase(std::string& error) {
  ScopedFd lock;
  if (!MakeStateRoot(error) || !LockRoot(StateRoot(), lock, error)) {
    return nullptr;
  }
  const std::string path = StateDatabasePath();
  const bool has_copy = Exists(path + ".copy");
  bool recovered = false;
  for (;;) {
    auto connection = std::make_unique<StateConnection>();
    connection->path = path;
    Opened outcome = Opened::DAMAGED;
    if (has_copy && !Exists(path)) {
      error = path + " is missing";
    } else if (!IsFileOrNothing(path) || !IsFileOrNothing(path + "-wal") ||
               !IsFileOrNothing(path + "-shm")) {
      error = path + " or its log is no regular file";
    } else if (!MakeFile(path, error)) {
      return nullptr;
    } else {
      outcome = OpenFile(*connection, has_copy, error);
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
    const std::string kept = Exists(path) ? ", and it is kept as " + path + ".damaged" : "";
    if (!PutCopyInPlace(path, lock, error)) {
      return nullptr;
    }
    syslog(LOG_ERR, "%s:%d %s; its last copy is used instead%s", __FILE__, __LINE__, found.c_str(),
           kept.c_str());
    recovered = true;
  }
}

bool LeaveStateCopy(const StateConnection& connection, std::string& error) {
  // The lock keeps an older copy from replacing a newer one of another program.
  ScopedFd lock;
  const std::string root = connection.path.substr(0, connection.path.rfind('/'));
  if (!LockRoot(root, lock, error)) {
    return false;
  }
  sqlite3_int64 size = 0;
  unsigned char* bytes = sqlite3_serialize(connection.db, "main", &size, 0);
  if (bytes == nullptr || size < 100) {
    sqlite3_free(bytes);
    error = StateError(connection, "cannot copy");
    return false;
  }
  std::string image(reinterpret_cast<char*>(bytes), static_cast<size_t>(size));
  sqlite3_free(bytes);

  // A copy stands alone: these two bytes of the header say that there is no log beside it.
  image[18] = 1;
  image[19] = 1;
  if (!IsSoundImage(image)) {
    error = connection.path + " is damaged; the copy beside it is left as it was";
    return false;
  }
  if (!WriteSafely(connection.path + ".copy", image, error)) {
    return false;
  }
  SyncFolder(lock);
  return true;
}

}  // namespace fileindexd
