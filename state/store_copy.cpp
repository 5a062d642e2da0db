// SPDX-License-Identifier: GPL-2.0-or-later
#include "state/store_copy.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>
#include <filesystem>
#include <system_error>
#include <utility>
#include <vector>

#include "state/sqlite.h"
#include "state/state_files.h"

namespace fileindexd {

namespace {

// In the place of what was set aside before, which stays where there is nothing to set aside. A
// rename alone cannot put a file in a folder's place.
bool MoveAside(const std::string& path, const std::string& aside) {
  if (!StateFileExists(path)) {
    return true;
  }
  std::error_code ignored;  // what is in the way still makes the renaming fail
  std::filesystem::remove_all(aside, ignored);
  return rename(path.c_str(), aside.c_str()) == 0 || errno == ENOENT;
}

bool ReadAll(const std::string& path, std::string& bytes) {
  bytes.clear();
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

// One on a bad sector gives the same answer for ever, and is as good as none: nothing is read of
// it.
bool ReadCopy(const std::string& path, std::string& bytes) {
  constexpr int TRIES = 2;
  for (int tries = 0; tries < TRIES; ++tries) {
    if (ReadAll(path, bytes)) {
      return true;
    }
  }
  bytes.clear();
  return errno == ENOENT || errno == EIO || errno == EUCLEAN || errno == EBADMSG;
}

// What a database holds, as it was at one moment.
struct Holding {
  int64_t version = 0;
  int64_t changes = 0;  // that were counted; 0: it is older than the counting
  std::string rows;     // of all tables, whatever pages they are on
};

int ReadRows(sqlite3* db, const std::string& table, std::string& rows) {
  Statement ask;
  const int result = ask.Prepare(db, ("SELECT * FROM " + table).c_str());
  return result != SQLITE_OK ? result : ask.ReadAll([&] {
    for (int column = 0; column < sqlite3_column_count(ask.handle); ++column) {
      const std::string bytes = ask.Bytes(column);
      rows.append(table + " " + std::to_string(bytes.size()) + " ").append(bytes);
    }
  });
}

int ReadHolding(sqlite3* db, Holding& holding) {
  int result = SchemaVersion(db, holding.version);
  Statement count;
  if (result == SQLITE_OK) {
    result = count.Prepare(db, "SELECT value FROM number WHERE name = 'changes'");
  }
  bool found = false;
  if (result == SQLITE_OK) {
    result = count.ReadOne(found, [&] { holding.changes = count.Int(0); });
  }
  std::vector<std::string> tables;
  Statement names;
  if (result == SQLITE_OK) {
    result = names.Prepare(db, "SELECT name FROM sqlite_schema WHERE type = 'table' ORDER BY name");
  }
  if (result == SQLITE_OK) {
    result = names.ReadAll([&] { tables.push_back(names.Bytes(0)); });
  }
  for (const std::string& table : tables) {
    result = result == SQLITE_OK ? ReadRows(db, table, holding.rows) : result;
  }
  return result;
}

// Another program may change the database meanwhile.
int ReadHoldingAtOnce(const StateConnection& connection, Holding& holding) {
  int result = Execute(connection.db, "BEGIN");
  if (result == SQLITE_OK) {
    result = ReadHolding(connection.db, holding);
    (void)Execute(connection.db, "ROLLBACK");  // nothing was written
  }
  return result;
}

// Whether the bytes are a sound database with tables of ours, in the form of a copy, and what it
// holds. SQLITE_OK, or what kept that from being seen.
int LookInto(std::string image, bool& sound, Holding& holding) {
  sound = false;
  StateConnection memory;  // closed before the bytes go
  auto* bytes = reinterpret_cast<unsigned char*>(image.data());
  const auto size = static_cast<sqlite3_int64>(image.size());
  int result = image.empty() ? SQLITE_NOTADB : sqlite3_open(":memory:", &memory.db);
  if (result == SQLITE_OK && sqlite3_deserialize(memory.db, "main", bytes, size, size,
                                                 SQLITE_DESERIALIZE_READONLY) != SQLITE_OK) {
    result = SQLITE_NOMEM;  // the bytes are not looked at yet
  }
  bool ok = false;
  if (result == SQLITE_OK) {
    result = QuickCheck(memory.db, ok);
  }
  if (result == SQLITE_OK && ok) {
    result = ReadHolding(memory.db, holding);
  }
  sound = result == SQLITE_OK && ok && holding.version > 0;
  // One that cannot be opened asks for a log of its own.
  const bool unsound = IsDamage(result) || result == SQLITE_ERROR || result == SQLITE_CANTOPEN;
  return unsound ? SQLITE_OK : result;
}

// The database as it is at one moment, as the bytes of a file that stands alone. By way of the
// memory: a read that fails is told there, while SQLite's own function for this puts zeros in the
// page's place.
int TakeImage(const StateConnection& connection, std::string& image) {
  StateConnection memory;
  const int opened = sqlite3_open(":memory:", &memory.db);
  if (opened != SQLITE_OK) {
    return opened;
  }
  sqlite3_backup* backup = sqlite3_backup_init(memory.db, "main", connection.db, "main");
  if (backup == nullptr) {
    return sqlite3_errcode(memory.db);
  }
  (void)sqlite3_backup_step(backup, -1);  // all pages; the end tells what failed
  const int result = sqlite3_backup_finish(backup);
  if (result != SQLITE_OK) {
    return result;
  }
  sqlite3_int64 size = 0;
  unsigned char* bytes = sqlite3_serialize(memory.db, "main", &size, 0);
  if (bytes == nullptr || size < 100) {
    sqlite3_free(bytes);
    return SQLITE_NOMEM;
  }
  image.assign(reinterpret_cast<char*>(bytes), static_cast<size_t>(size));
  sqlite3_free(bytes);
  // These two bytes of the header say that there is no log beside it.
  image[18] = 1;
  image[19] = 1;
  return SQLITE_OK;
}

// As PATH.new, on the disk.
bool WriteNew(const std::string& path, const std::string& bytes, std::string& error) {
  const std::string temporary = path + ".new";
  std::error_code ignored;
  std::filesystem::remove_all(temporary, ignored);  // left by a program that was killed
  ScopedFd file(open(temporary.c_str(), O_WRONLY | O_CREAT | O_EXCL | O_CLOEXEC, 0600));
  bool good = file.fd >= 0 && fchmod(file.fd, 0600) == 0;
  for (size_t at = 0; good && at < bytes.size();) {
    const ssize_t written = write(file.fd, bytes.data() + at, bytes.size() - at);
    good = written > 0 || (written < 0 && errno == EINTR);
    at += written > 0 ? static_cast<size_t>(written) : 0;
  }
  good = good && fsync(file.fd) == 0;
  if (!good) {
    error = StateFileError("cannot write", path);
    (void)unlink(temporary.c_str());
  }
  return good;
}

bool TakeNew(const std::string& path, std::string& error) {
  const std::string temporary = path + ".new";
  bool taken = rename(temporary.c_str(), path.c_str()) == 0;
  if (!taken && errno == EISDIR) {
    taken = MoveAside(path, path + ".damaged") && rename(temporary.c_str(), path.c_str()) == 0;
  }
  if (!taken) {
    error = StateFileError("cannot write", path);
    (void)unlink(temporary.c_str());
  }
  return taken;
}

// Whatever of the database would be played into the one that comes in its place goes with it.
bool SetStateAside(const std::string& path, std::string& error) {
  const std::string aside = path + ".damaged";
  std::error_code ignored;
  for (const char* ending : {"-wal", "-journal"}) {
    if (StateFileExists(path)) {
      std::filesystem::remove_all(aside + ending, ignored);  // of what was set aside before
    }
  }
  if (!MoveAside(path, aside)) {
    error = StateFileError("cannot set aside", path);
    return false;
  }
  for (const char* ending : {"-wal", "-journal"}) {
    if (!MoveAside(path + ending, aside + ending)) {
      error = StateFileError("cannot set aside", path + ending);
      return false;
    }
  }
  std::filesystem::remove_all(path + "-shm", ignored);  // no use without the log, and made anew
  return true;
}

CopyAge Compare(const Holding& copy, const Holding& database) {
  if (copy.version > STATE_VERSION) {
    return CopyAge::LEVEL;  // of a newer program: it could not be used here
  }
  if (copy.changes > database.changes) {
    return CopyAge::AHEAD;
  }
  if (copy.changes < database.changes || copy.version < database.version) {
    return CopyAge::BEHIND;
  }
  // An older file below a log that has the last change has counted as many. (Programs before the
  // counting may have left no copy of what they changed.)
  return copy.changes > 0 && copy.rows != database.rows ? CopyAge::AHEAD : CopyAge::LEVEL;
}

// What was renamed is to be found under its new name after a power failure.
void SyncFolder(const ScopedFd& folder) {
  (void)fsync(folder.fd);
}

}  // namespace

// The database goes once the other is on the disk: a program that is stopped in between leaves
// none, and the next one finds the copy beside the gap. Its log must not stay: it would be played
// into the copy.
bool PutCopyInPlace(const std::string& path, const ScopedFd& root, std::string& error) {
  std::string image;
  bool sound = false;
  Holding ignored;
  const std::string copy = path + ".copy";
  if (IsFileOrNothing(copy) && !ReadCopy(copy, image)) {
    error += "; and " + StateFileError("cannot read", copy);
    return false;
  }
  const int result = LookInto(image, sound, ignored);
  if (result != SQLITE_OK || !sound) {
    error += result == SQLITE_OK ? "; and there is no sound copy of it"
                                 : "; and " + copy + " cannot be read: " + sqlite3_errstr(result);
    return false;
  }
  std::string reason;
  if (!WriteNew(path, image, reason) || !SetStateAside(path, reason)) {
    error += "; " + reason;
    return false;
  }
  SyncFolder(root);
  if (!TakeNew(path, reason)) {
    error += "; " + reason;
    return false;
  }
  SyncFolder(root);
  return true;
}

int CompareWithCopy(const StateConnection& connection, CopyAge& age, std::string& error) {
  age = CopyAge::BEHIND;
  const std::string path = connection.path + ".copy";
  std::string image;
  if (IsFileOrNothing(path) && !ReadCopy(path, image)) {
    error = StateFileError("cannot read", path);
    return SQLITE_IOERR;
  }
  bool sound = false;
  Holding left;
  int result = LookInto(std::move(image), sound, left);
  if (result != SQLITE_OK) {
    error = "cannot read " + path + ": " + sqlite3_errstr(result);
    return result;
  }
  if (!sound) {
    return SQLITE_OK;
  }
  Holding held;
  result = ReadHoldingAtOnce(connection, held);
  if (result != SQLITE_OK) {
    error = StateError(connection, "cannot read");
    return result;
  }
  age = Compare(left, held);
  return SQLITE_OK;
}

std::string RowsOf(const StateConnection& connection) {
  Holding held;
  return ReadHoldingAtOnce(connection, held) == SQLITE_OK ? held.rows : std::string();
}

// The lock keeps an older copy from replacing a newer one of another program.
CopyLeft LeaveStateCopy(const StateConnection& connection, std::string& error) {
  ScopedFd lock;
  const std::string root = connection.path.substr(0, connection.path.rfind('/'));
  return LockStateRoot(root, true, lock, error) ? LeaveStateCopy(connection, lock, error)
                                                : CopyLeft::FAILED;
}

CopyLeft LeaveStateCopy(const StateConnection& connection, const ScopedFd& root,
                        std::string& error) {
  if (HasStateMoved(connection)) {
    error = connection.path + " or its log was replaced; the copy is that of the other one";
    return CopyLeft::FAILED;
  }
  std::string image;
  int result = TakeImage(connection, image);
  if (result != SQLITE_OK) {
    error = "cannot copy " + connection.path + ": " + sqlite3_errstr(result);
    return IsDamage(result) ? CopyLeft::DAMAGED : CopyLeft::FAILED;
  }
  bool sound = false;
  Holding ignored;
  result = LookInto(image, sound, ignored);
  if (result != SQLITE_OK) {
    error = "cannot check " + connection.path + ": " + sqlite3_errstr(result);
    return CopyLeft::FAILED;
  }
  if (!sound) {
    error = connection.path + " is damaged; the copy beside it is left as it was";
    return CopyLeft::DAMAGED;
  }
  const std::string copy = connection.path + ".copy";
  if (!WriteNew(copy, image, error) || !TakeNew(copy, error)) {
    return CopyLeft::FAILED;
  }
  SyncFolder(root);
  return CopyLeft::GOOD;
}

}  // namespace fileindexd
