// SPDX-License-Identifier: GPL-2.0-or-later
// DESIGN: the log and its shared memory stay when a connection is closed, and closing does not copy
// the log back: the daemon opens anew for each commit, and would pay for both each time. The log is
// copied back when it has grown, at the end of a commit, and then cut to its limit.
#include "index/database.h"

#include <fcntl.h>
#include <sys/stat.h>

#include <algorithm>
#include <cerrno>
#include <filesystem>
#include <optional>
#include <utility>

#include "base/scoped_fd.h"
#include "index/database_place.h"
#include "index/last_commit.h"
#include "index/log_check.h"
#include "index/schema.h"
#include "index/set_aside.h"
#include "index/suspicion.h"
#include "state/sqlite.h"

namespace fileindexd {

namespace {

// auto_vacuum counts only before the first table. The tables are made before the log is: so the
// main file's own first page tells from the beginning whose it is.
constexpr const char* PRAGMAS_FOR_CREATING =
    "PRAGMA auto_vacuum = INCREMENTAL; PRAGMA synchronous = FULL";
// The cache's size is in KiB. The log is asked for at every opening: on a full disk the switch to
// it can have failed when the database was made.
constexpr const char* PRAGMAS_FOR_WRITING =
    "PRAGMA synchronous = FULL; PRAGMA cache_size = -8192; PRAGMA temp_store = MEMORY;"
    "PRAGMA journal_mode = WAL";
constexpr const char* PRAGMAS_FOR_READING = "PRAGMA cache_size = -8192; PRAGMA query_only = 1";

void CutLogOf(sqlite3* db, const char* name) {
  sqlite3_busy_timeout(db, 0);
  (void)sqlite3_wal_checkpoint_v2(db, name, SQLITE_CHECKPOINT_TRUNCATE, nullptr, nullptr);
  sqlite3_busy_timeout(db, BUSY_TIMEOUT_MS);
}

bool HasPlenty(sqlite3* db, const char* name) {
  constexpr uintmax_t PLENTY = uintmax_t{1} << 30;
  std::error_code failed;
  const std::filesystem::space_info space =
      std::filesystem::space(sqlite3_db_filename(db, name), failed);
  return !failed && space.available >= PLENTY;
}

// Called at each commit. A log that was only copied back would grow for ever: a connection is
// closed after each commit, and the next one, which reads the whole log, no longer knows what was
// copied. So it is cut. A reader that is in the way is not waited for: the next commit tries again.
int CutLongLog(void* form, sqlite3* db, const char* name, int frames) {
  const int most = static_cast<const DatabaseForm*>(form)->most_log_frames;
  if (frames >= most || (frames >= LEAST_LOG_FRAMES && !HasPlenty(db, name))) {
    CutLogOf(db, name);
  }
  return SQLITE_OK;
}

int ReadNumber(sqlite3* db, const std::string& sql, int64_t& number) {
  Statement statement;
  int code = statement.Prepare(db, sql.c_str());
  if (code != SQLITE_OK) {
    return code;
  }

  code = statement.Step();
  if (code == SQLITE_ROW) {
    number = statement.Int(0);
    return SQLITE_OK;
  }
  return code == SQLITE_DONE ? SQLITE_ERROR : code;
}

int OpenFile(const std::string& file, sqlite3*& db) {
  const int code =
      sqlite3_open_v2(file.c_str(), &db, SQLITE_OPEN_READWRITE | SQLITE_OPEN_NOMUTEX, nullptr);
  if (db == nullptr) {
    return SQLITE_NOMEM;
  }

  sqlite3_extended_result_codes(db, 1);
  sqlite3_busy_timeout(db, BUSY_TIMEOUT_MS);
  sqlite3_db_config(db, SQLITE_DBCONFIG_NO_CKPT_ON_CLOSE, 1, nullptr);
  sqlite3_db_config(db, SQLITE_DBCONFIG_TRUSTED_SCHEMA, 0, nullptr);
  return code;
}

void KeepLog(sqlite3* db, const char* name) {
  int persist = 1;
  sqlite3_file_control(db, name, SQLITE_FCNTL_PERSIST_WAL, &persist);
}

// What a database is that is not ours, or not of this version. One without tables holds nothing.
IndexError JudgeStranger(sqlite3* db, const std::string& name, bool other_program,
                         std::optional<IndexFlaw>& flaw) {
  int64_t tables = 0;
  const int code = ReadNumber(db, "SELECT count(*) FROM " + name + ".sqlite_schema", tables);
  if (code != SQLITE_OK) {
    return code == SQLITE_ERROR ? IndexError::DAMAGED : FromSqlite(code);
  }

  if (tables > 0) {
    flaw = other_program ? IndexFlaw::OTHER_PROGRAM : IndexFlaw::OTHER_VERSION;
  }
  return IndexError::PATH_NOT_FOUND;
}

// Our numbers without our tables: somebody's knife.
IndexError FromTables(int code) {
  return code == SQLITE_ERROR ? IndexError::DAMAGED : FromSqlite(code);
}

std::string Ask(const char* what, const std::string& name, const DatabaseForm& form) {
  return std::string("SELECT ") + what + " FROM " + name + "." + form.probed;
}

// Whether the open database of that name is ours. Cheap: two numbers and the schema's text. `flaw`
// is set for one that counts as none, and yet holds something.
IndexError CheckSchema(sqlite3* db, const std::string& name, const DatabaseForm& form,
                       std::optional<IndexFlaw>& flaw) {
  int64_t application = 0;
  int64_t version = 0;
  int64_t answer = 0;
  int code = ReadNumber(db, "PRAGMA " + name + ".application_id", application);
  if (code == SQLITE_OK) {
    code = ReadNumber(db, "PRAGMA " + name + ".user_version", version);
  }
  if (code != SQLITE_OK) {
    return FromSqlite(code);
  }
  if (application != form.application || version != form.version) {
    return JudgeStranger(db, name, application != form.application, flaw);
  }

  code = ReadNumber(db, Ask(form.probe, name, form), answer);
  return FromTables(code);
}

IndexError OpenExisting(const std::string& index_path, const DatabaseForm& form,
                        const char* pragmas, sqlite3*& db, std::optional<IndexFlaw>& flaw) {
  const std::string file = index_path + "/" + form.file;
  const IndexError found = FindFile(index_path, file);
  if (found == IndexError::PATH_NOT_FOUND && HoldsSomething(index_path, file)) {
    flaw = IndexFlaw::DAMAGED;
  }
  if (found != IndexError::NONE) {
    return found;
  }

  IndexError error = FromSqlite(OpenFile(file, db));
  if (error == IndexError::NONE) {
    KeepLog(db, "main");
    error = CheckSchema(db, "main", form, flaw);
  }
  if (error == IndexError::NONE && form.prepare != nullptr) {
    error = FromSqlite(form.prepare(db));
  }
  if (error == IndexError::NONE) {
    error = FromSqlite(Execute(db, pragmas));
  }
  if (error != IndexError::NONE) {
    sqlite3_close_v2(std::exchange(db, nullptr));
  }
  return error;
}

// Whether what was opened for writing is damaged, or lacks commits.
IndexError CheckSound(sqlite3* db, const std::string& index_path, const DatabaseForm& form) {
  if (HasLostCommits(db)) {
    return IndexError::DAMAGED;
  }
  const IndexError suspected = CheckSuspected(db, index_path);
  if (suspected != IndexError::NONE || form.last_commit == nullptr) {
    return suspected;
  }

  const int64_t noted = NotedCommit(index_path);
  int64_t last = 0;
  const int code = ReadNumber(db, Ask(form.last_commit, "main", form), last);
  if (code != SQLITE_OK) {
    return FromTables(code);
  }
  return noted > last ? IndexError::DAMAGED : IndexError::NONE;
}

IndexError FromErrno() {
  return errno == ENOSPC || errno == EDQUOT ? IndexError::FULL : IndexError::IO;
}

// Made under SQLite's own lock, with the file's mode set first: SQLite gives its log the same.
IndexError CreateDatabase(const std::string& index_path, const DatabaseForm& form) {
  if (!MakeEmptyIndex(index_path)) {
    return FromErrno();
  }

  const std::string file = index_path + "/" + form.file;
  ScopedFd made(open(file.c_str(), O_RDWR | O_CREAT | O_EXCL | O_CLOEXEC, 0600));
  if (made.fd < 0 || fchmod(made.fd, 0600) != 0) {
    return FromErrno();
  }
  made.Close();

  sqlite3* db = nullptr;
  int code = OpenFile(file, db);
  if (code == SQLITE_OK && form.prepare != nullptr) {
    code = form.prepare(db);
  }
  for (const char* sql : {PRAGMAS_FOR_CREATING, "BEGIN EXCLUSIVE", form.schema, "COMMIT",
                          "PRAGMA journal_mode = WAL"}) {
    if (code == SQLITE_OK) {
      code = Execute(db, sql);
    }
  }
  if (code == SQLITE_OK) {
    KeepLog(db, "main");
  }
  sqlite3_close_v2(db);
  return FromSqlite(code);
}

}  // namespace

IndexError FromSqlite(int code) {
  if (code == SQLITE_IOERR_NOMEM) {
    return IndexError::NO_MEMORY;
  }
  switch (code & 0xff) {
    case SQLITE_OK:
    case SQLITE_ROW:
    case SQLITE_DONE:
      return IndexError::NONE;
    case SQLITE_NOMEM:
      return IndexError::NO_MEMORY;
    case SQLITE_BUSY:
    case SQLITE_LOCKED:
      return IndexError::BUSY;
    case SQLITE_IOERR:
    case SQLITE_CANTOPEN:
    case SQLITE_READONLY:
    case SQLITE_PERM:
      return IndexError::IO;
    case SQLITE_FULL:
      return IndexError::FULL;
    case SQLITE_CORRUPT:
    case SQLITE_NOTADB:
      return IndexError::DAMAGED;
    default:
      return IndexError::OTHER;
  }
}

const char* IndexErrorText(IndexError error) {
  switch (error) {
    case IndexError::NONE:
      return "no error";
    case IndexError::NO_MEMORY:
      return "out of memory";
    case IndexError::BUSY:
      return "the index is in use by another program";
    case IndexError::PATH_NOT_FOUND:
      return "there is no index";
    case IndexError::IO:
      return "input or output failed";
    case IndexError::FULL:
      return "the disk is full";
    case IndexError::ROOT:
      return "the share's folder is missing or lies on another file system";
    case IndexError::DAMAGED:
      return "the index is damaged";
    case IndexError::OTHER:
      return "unexpected error";
  }
  return "unexpected error";
}

void LimitCaches(int64_t bytes) {
  (void)sqlite3_soft_heap_limit64(bytes);
}

IndexError IndexDatabase::OpenForWriting(const std::string& index_path, bool create,
                                         const DatabaseForm& form) {
  Close();
  has_set_aside = false;
  std::optional<IndexFlaw> flaw;
  IndexError error = OpenExisting(index_path, form, PRAGMAS_FOR_WRITING, db, flaw);
  if (error == IndexError::NONE) {
    error = CheckSound(db, index_path, form);
    if (error != IndexError::NONE) {
      Close();
    }
  }
  if (error == IndexError::DAMAGED) {
    flaw = IndexFlaw::DAMAGED;
  }
  if (flaw.has_value()) {
    if (!SetAside(index_path, *flaw, "found at opening")) {
      return FromErrno();
    }
    has_set_aside = true;
    error = IndexError::PATH_NOT_FOUND;
  }
  if (error == IndexError::PATH_NOT_FOUND && create) {
    error = CreateDatabase(index_path, form);
    if (error == IndexError::NONE) {
      error = OpenExisting(index_path, form, PRAGMAS_FOR_WRITING, db, flaw);
    }
  }

  if (error == IndexError::NONE) {
    sqlite3_wal_hook(db, CutLongLog, const_cast<DatabaseForm*>(&form));
    Remember("main", index_path + "/" + form.file);
  }
  return error;
}

void IndexDatabase::CutLog() {
  CutLogOf(db, "main");
}

IndexError IndexDatabase::OpenForReading(const std::string& index_path, const DatabaseForm& form) {
  Close();
  std::optional<IndexFlaw> left;  // as it is: readers move nothing
  const IndexError error = OpenExisting(index_path, form, PRAGMAS_FOR_READING, db, left);
  if (error == IndexError::NONE) {
    Remember("main", index_path + "/" + form.file);
  }
  return error;
}

// What is wrong with it is found out by opening it alone, and only then: that costs as much again.
IndexError IndexDatabase::Attach(const std::string& index_path, const char* name,
                                 const DatabaseForm& form) {
  const std::string file = index_path + "/" + form.file;
  IndexError error = FindFile(index_path, file);
  if (error == IndexError::NONE && form.prepare != nullptr) {
    error = FromSqlite(form.prepare(db));
  }
  if (error != IndexError::NONE) {
    return error;
  }

  Statement attach;
  error = FromSqlite(attach.Prepare(db, (std::string("ATTACH ?1 AS ") + name).c_str()));
  if (error == IndexError::NONE) {
    attach.BindText(1, file);
    error = FromSqlite(attach.Run());
  }
  if (error == IndexError::NONE) {
    KeepLog(db, name);
    // A cache's size holds for one file of a connection.
    (void)Execute(db, (std::string("PRAGMA ") + name + ".cache_size = -8192").c_str());
    std::optional<IndexFlaw> left;
    error = CheckSchema(db, name, form, left);
    if (error == IndexError::NONE) {
      Remember(name, file);
      return error;
    }
    (void)Execute(db, (std::string("DETACH ") + name).c_str());  // nothing is under way in it
  }

  IndexDatabase alone;
  const IndexError found = alone.OpenForReading(index_path, form);
  return found == IndexError::NONE ? error : found;
}

void IndexDatabase::Remember(const char* name, const std::string& file) {
  files.push_back({name, file, LogFilesOf(file)});
}

void IndexDatabase::Close() {
  files.clear();
  sqlite3_close_v2(std::exchange(db, nullptr));
}

bool IndexDatabase::HasMoved() const {
  return std::any_of(files.begin(), files.end(), [this](const OpenedFile& opened) {
    int moved = 0;
    const int code = sqlite3_file_control(db, opened.name.c_str(), SQLITE_FCNTL_HAS_MOVED, &moved);
    const LogFiles log = LogFilesOf(opened.file);
    return (code == SQLITE_OK && moved != 0) ||
           (opened.log.log != 0 && log.log != opened.log.log) ||
           (opened.log.memory != 0 && log.memory != opened.log.memory);
  });
}

}  // namespace fileindexd
