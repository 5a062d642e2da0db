// SPDX-License-Identifier: GPL-2.0-or-later
// The input is what the tables of shares and folders hold, whoever wrote it: lines of cells. Then
// the settings are read, and paths are judged by them.
//
//   line = kind cell*        kind: 's' share, 'f' folder, 't' status, 'p' a path to judge
//   cell = '\t' type text    type: 'i' integer, 'n' nothing, 'b' blob, else text
#include <cstring>
#include <filesystem>
#include <memory>
#include <sstream>
#include <string>
#include <string_view>
#include <vector>

#include "fuzz/target.h"
#include "scripted/temp_folder.h"
#include "state/belonging.h"
#include "state/layout.h"
#include "state/sqlite.h"
#include "state/store.h"

namespace fileindexd::fuzz {

namespace {

class Tables {
 public:
  Tables() {
    setenv("FILEINDEXD_STATE_DIR", folder.path.c_str(), 1);
    std::string error;
    store = StateStore::Open(error);
    Require(store != nullptr, error.c_str());
    Require(sqlite3_open(StateDatabasePath().c_str(), &db) == SQLITE_OK, "a second connection");
    // One transaction, undone by the next input's: the log does not grow.
    Execute("PRAGMA synchronous = OFF; PRAGMA wal_autocheckpoint = 100");
  }
  Tables(const Tables&) = delete;
  Tables& operator=(const Tables&) = delete;
  ~Tables() { sqlite3_close(db); }

  void Try(const std::string& text) {
    std::vector<std::string> paths;
    Execute("BEGIN; DELETE FROM share; DELETE FROM folder; DELETE FROM status");
    std::istringstream stream(text);
    for (std::string line; std::getline(stream, line);) {
      Put(line, paths);
    }
    Execute("COMMIT");
    Judge(paths);
  }

 private:
  void Execute(const char* sql) {
    Require(sqlite3_exec(db, sql, nullptr, nullptr, nullptr) == SQLITE_OK, sql);
  }

  static std::vector<std::string_view> Cells(std::string_view line) {
    std::vector<std::string_view> cells;
    for (size_t at = line.find('\t'); at != std::string_view::npos;) {
      const size_t end = line.find('\t', at + 1);
      cells.push_back(line.substr(at + 1, end - at - 1));
      at = end;
    }
    return cells;
  }

  static void Bind(Statement& statement, int column, std::string_view cell) {
    const std::string_view value = cell.empty() ? cell : cell.substr(1);
    switch (cell.empty() ? 'n' : cell.front()) {
      case 'i':
        return statement.BindInt(column, atoll(std::string(value).c_str()));
      case 'n':
        return;
      case 'b':
        return statement.BindBlob(column, value);
      default:
        return statement.BindText(column, value);
    }
  }

  void Put(const std::string& line, std::vector<std::string>& paths) {
    const char kind = line.empty() ? ' ' : line.front();
    if (kind == 'p') {
      paths.push_back(line.substr(1));
      return;
    }
    const char* sql =
        kind == 's'   ? "INSERT OR IGNORE INTO share VALUES(?1, ?2, ?3, COALESCE(?4, 'english'))"
        : kind == 'f' ? "INSERT OR IGNORE INTO folder VALUES(?1, ?2, ?3, ?4, ?5, ?6)"
        : kind == 't' ? "INSERT OR IGNORE INTO status VALUES(?1, ?2, ?3, ?4, ?5, ?6, 0, 0)"
                      : nullptr;
    if (sql == nullptr) {
      return;
    }
    Statement statement;
    Require(statement.Prepare(db, sql) == SQLITE_OK, sql);
    const std::vector<std::string_view> cells = Cells(line);
    const int columns = sqlite3_bind_parameter_count(statement.handle);
    for (int i = 0; i < columns && i < static_cast<int>(cells.size()); ++i) {
      Bind(statement, i + 1, cells[static_cast<size_t>(i)]);
    }
    (void)statement.Run();  // what a constraint refuses is not there
  }

  void Judge(const std::vector<std::string>& paths) {
    std::shared_ptr<const Settings> settings;
    if (!store->GetSettings(settings)) {
      Require(!store->Error().empty(), "a failure has a reason");
      return;
    }
    for (const Share& share : settings->shares) {
      ShareStatus status;
      (void)store->GetStatus(share.name, status);
      (void)settings->ShareByName(share.name);
    }
    for (const std::string& path : paths) {
      const Verdict verdict = JudgeName(*settings, path);
      Require(VerdictText(verdict) != nullptr, "a verdict that exists");
      const auto normal = NormalPath(path);
      if (normal.has_value()) {
        const IndexedFolder* covering = settings->FolderOfPath(*normal);
        Require(covering == nullptr || Covers(covering->path, *normal), "the folder covers it");
        const Share* share = settings->ShareOfPath(*normal);
        Require(share == nullptr || Covers(share->path, *normal), "the share covers it");
        Require(verdict != Verdict::BELONGS || (share != nullptr && covering != nullptr),
                "what belongs is covered");
      }
    }
  }

  scripted::TempFolder folder;
  std::unique_ptr<StateStore> store;
  sqlite3* db = nullptr;
};

}  // namespace

}  // namespace fileindexd::fuzz

int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  static fileindexd::fuzz::Tables tables;
  tables.Try(std::string(reinterpret_cast<const char*>(data), size));
  return 0;
}
