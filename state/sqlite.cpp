// SPDX-License-Identifier: GPL-2.0-or-later
#include "state/sqlite.h"

#include <sys/stat.h>

namespace fileindexd {

namespace {

// A null pointer would be bound as NULL, and an empty view may hold one.
const char* BytesOf(std::string_view bytes) {
  return bytes.empty() ? "" : bytes.data();
}

int Check(sqlite3* db, const char* pragma, bool& ok) {
  Statement check;
  int result = check.Prepare(db, pragma);
  if (result != SQLITE_OK) {
    return result;
  }
  result = check.Step();
  if (result != SQLITE_ROW) {
    return result == SQLITE_DONE ? SQLITE_CORRUPT : result;
  }
  ok = check.Bytes(0) == "ok";
  return SQLITE_OK;
}

}  // namespace

int Execute(sqlite3* db, const char* sql) {
  return sqlite3_exec(db, sql, nullptr, nullptr, nullptr);
}

int Statement::Prepare(sqlite3* db, const char* sql) {
  sqlite3_finalize(handle);
  handle = nullptr;
  return sqlite3_prepare_v3(db, sql, -1, SQLITE_PREPARE_PERSISTENT, &handle, nullptr);
}

void Statement::BindInts(std::initializer_list<int64_t> values) {
  int column = 1;
  for (const int64_t value : values) {
    BindInt(column++, value);
  }
}

void Statement::BindText(int column, std::string_view text) {
  sqlite3_bind_text64(handle, column, BytesOf(text), text.size(), SQLITE_STATIC, SQLITE_UTF8);
}

void Statement::BindBlob(int column, std::string_view bytes) {
  sqlite3_bind_blob64(handle, column, BytesOf(bytes), bytes.size(), SQLITE_STATIC);
}

int Statement::Run() {
  const int result = Step();
  Reset();
  return result == SQLITE_DONE ? SQLITE_OK : result;
}

std::string Statement::Bytes(int column) const {
  // The bytes first, then their number: that order keeps the pointer valid.
  const void* bytes = sqlite3_column_blob(handle, column);
  const int size = sqlite3_column_bytes(handle, column);
  if (bytes == nullptr || size <= 0) {
    return {};
  }
  return {static_cast<const char*>(bytes), static_cast<size_t>(size)};
}

bool IsFileOrNothing(const std::string& path) {
  struct stat st {};
  return lstat(path.c_str(), &st) != 0 || S_ISREG(st.st_mode);
}

ino_t InodeOf(const std::string& path) {
  struct stat st {};
  return lstat(path.c_str(), &st) == 0 ? st.st_ino : 0;
}

LogFiles LogFilesOf(const std::string& database) {
  return {LogInode(database), InodeOf(database + "-shm")};
}

int QuickCheck(sqlite3* db, bool& ok) {
  return Check(db, "PRAGMA quick_check(1)", ok);
}

int FullCheck(sqlite3* db, bool& ok) {
  return Check(db, "PRAGMA integrity_check(1)", ok);
}

int SchemaVersion(sqlite3* db, int64_t& version) {
  Statement ask;
  int result = ask.Prepare(db, "PRAGMA user_version");
  if (result == SQLITE_OK) {
    result = ask.Step();
    version = result == SQLITE_ROW ? ask.Int(0) : 0;
  }
  return result == SQLITE_ROW ? SQLITE_OK : result;
}

}  // namespace fileindexd
