// SPDX-License-Identifier: GPL-2.0-or-later
#include "state/sqlite.h"

namespace fileindexd {

namespace {

// A null pointer would be bound as NULL, and an empty view may hold one.
const char* BytesOf(std::string_view bytes) {
  return bytes.empty() ? "" : bytes.data();
}

}  // namespace

int Statement::Prepare(sqlite3* db, const char* sql) {
  sqlite3_finalize(handle);
  handle = nullptr;
  return sqlite3_prepare_v3(db, sql, -1, SQLITE_PREPARE_PERSISTENT, &handle, nullptr);
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

}  // namespace fileindexd
