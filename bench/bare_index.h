// SPDX-License-Identifier: GPL-2.0-or-later
// The index's engine with nothing around it: the same schema, pragmas and statements, without a
// queue, a tree of operations, settings, or any question whether a path belongs.
#pragma once

#include <cstdint>
#include <memory>
#include <string>

#include "index/database.h"
#include "index/entry.h"
#include "index/entry_table.h"

namespace fileindexd {

// Changes for each commit; after each commit the connection is opened anew, as the daemon does.
constexpr uint64_t BARE_COMMIT_LIMIT = 2000;

// A folder of rows. Every failure ends the program.
class BareEngine {
 public:
  // Opens the database in `index_path`, making it where it is missing.
  explicit BareEngine(const std::string& index_path);

  void Open();
  void Put(const Entry& entry);
  void CommitAndClose();

  // A change as the daemon counts it: after so many, a commit and a new connection.
  void CountChange();

  std::string path;
  uint64_t changes = 0;  // since the last commit
  IndexDatabase database;
  std::unique_ptr<EntryTable> table;  // statements of the open connection
};

// Walks `root` and puts a row for each thing in it, itself included, into a new database. Tells how
// many. One call for attributes for each thing. The daemon counts a directory twice, once for its
// row and once for its walk, and so does this.
uint64_t BareIndexOf(const std::string& root, const std::string& index_path);

// Puts `rows` rows of things that need not exist below normal path `under`.
void PutMadeUpRows(const std::string& index_path, const std::string& under, uint64_t rows);

// The entry of an existing thing.
Entry EntryAt(const std::string& path);

}  // namespace fileindexd
