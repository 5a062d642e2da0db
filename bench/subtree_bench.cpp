// SPDX-License-Identifier: GPL-2.0-or-later
// A renamed folder, as the daemon carries it out, and a subtree that is gone, as the writer does:
// each against the bare engine that makes the same changes of rows.
//
// The renamed files exist, and go back and forth between two names. The deleted subtree is made up:
// nothing of it is on the disk, so that each row is looked at and found gone.
#include <sys/stat.h>

#include <algorithm>
#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <fstream>

#include "base/event_codes.h"
#include "bench/bare_index.h"
#include "bench/daemon.h"
#include "bench/measure.h"
#include "bench/scratch.h"
#include "index/reader.h"
#include "index/writer.h"
#include "state/filesystem.h"
#include "state/layout.h"
#include "state/queue_writer.h"
#include "state/store.h"

namespace fileindexd {

namespace {

constexpr uint64_t RENAMED = 10000;
constexpr uint64_t DELETED = 100000;
constexpr double SLICE_LIMIT = 0.5;  // seconds
constexpr int SLICE = 500;           // rows, as the writer takes them

void MakeFiles(const std::string& folder, uint64_t files) {
  std::filesystem::create_directories(folder);
  char name[64];
  for (uint64_t file = 0; file < files; ++file) {
    snprintf(name, sizeof(name), "/quarterly report %06u.odt", static_cast<unsigned>(file));
    std::ofstream(folder + name) << "text\n";
  }
}

// Takes every row below `path` away, and calls `visit` with what it was.
template <typename Visit>
void RemoveRows(BareEngine& engine, const std::string& path, Visit visit) {
  if (sqlite3_get_autocommit(engine.database.db) != 0 && engine.table->Begin() != SQLITE_OK) {
    Fail("cannot begin");
  }
  const PathRange range(path);
  std::string after = range.first;
  std::vector<Entry> rows;
  do {
    if (engine.table->Slice(after, range.end, SLICE, rows) != SQLITE_OK) {
      Fail("cannot read rows");
    }
    for (const Entry& row : rows) {
      if (engine.table->Remove(row) != SQLITE_OK) {
        Fail("cannot remove a row");
      }
      after = row.path;
      visit(row);
    }
  } while (rows.size() == SLICE);
}

Cost DaemonRenameCost(DaemonUnderTest& daemon, const std::string& from, const std::string& to,
                      uint64_t files) {
  std::filesystem::rename(from, to);
  const double processor = daemon.ProcessorTime();
  const double clock = TimeOf([&] {
    std::string error;
    if (!AppendToQueue("rename", {EventLine(QLIB_NOTIFY_RENAME, to, from)}, error)) {
      Fail(error);
    }
    daemon.WaitUntilQuiet("rename");
  });
  const Cost cost = {clock, daemon.ProcessorTime() - processor};

  EntryReader reader;
  uint64_t there = 0;
  const auto count = [&there](const Entry& /*entry*/) {
    ++there;
    return true;
  };
  if (reader.Open("rename") != IndexError::NONE || !reader.ForEach(to, count) ||
      there != files + 1 || !reader.ForEach(from, count) || there != files + 1) {
    daemon.FailWithLog("the renamed folder is not what the index holds");
  }
  return cost;
}

// The rows of `from` go, those of `to` come, each looked at once.
Cost BareRenameCost(BareEngine& engine, const std::string& from, const std::string& to) {
  return CostOf([&] {
    std::vector<std::string> renamed;
    engine.Open();
    RemoveRows(engine, from,
               [&](const Entry& row) { renamed.push_back(to + row.path.substr(from.size())); });
    for (const std::string& path : renamed) {
      engine.Put(EntryAt(path));
      engine.CountChange();
    }
    engine.CommitAndClose();
  });
}

void MeasureRename(const std::string& scratch, uint64_t files) {
  const std::string root = scratch + "/tree";
  const std::string names[] = {root + "/before", root + "/after"};
  MakeFiles(names[0], files);
  DaemonUnderTest daemon(scratch + "/state");
  daemon.IndexShare("rename", root);
  (void)BareIndexOf(root, scratch + "/bare");
  BareEngine bare(scratch + "/bare");
  bare.CommitAndClose();

  std::vector<Cost> ours;
  std::vector<Cost> reference;
  for (size_t round = 0; round < ROUNDS; ++round) {
    const std::string& from = names[round % 2];
    const std::string& to = names[1 - round % 2];
    ours.push_back(DaemonRenameCost(daemon, from, to, files));
    reference.push_back(BareRenameCost(bare, from, to));
  }
  PrintCosts("rename of a folder of " + std::to_string(files) + " files / bare engine",
             MedianCost(ours), MedianCost(reference), 2);
}

struct Deletion {
  Cost cost;
  double longest = 0;  // between two slices
};

Deletion WriterDeletion(StateStore& store, const std::string& gone) {
  Deletion deletion;
  double last = Now();
  const auto between = [&] {
    const double now = Now();
    deletion.longest = std::max(deletion.longest, now - last);
    last = now;
  };
  deletion.cost = CostOf([&] {
    EntryWriter writer("delete", store, between);
    last = Now();
    const bool deleted = writer.Delete(gone, DeleteMode::ENTRY);
    between();
    if (!deleted || !writer.Commit()) {
      Fail("the writer did not delete");
    }
  });
  return deletion;
}

Cost BareDeletion(const std::string& index, const std::string& gone) {
  return CostOf([&] {
    BareEngine engine(index);
    RemoveRows(engine, gone, [](const Entry& /*row*/) {});
    engine.CommitAndClose();
  });
}

void MeasureDeletion(const std::string& scratch, uint64_t rows) {
  const std::string root = scratch + "/share";
  const std::string gone = root + "/gone";
  std::filesystem::create_directories(root);
  std::string error;
  const std::unique_ptr<StateStore> store = StateStore::Open(error);
  const Share share = {"delete", root, FilesystemIdentity(root)};
  if (store == nullptr || !store->AddShare(share) || !store->AddFolder(root, {})) {
    Fail("cannot make a share");
  }

  std::vector<Cost> ours;
  std::vector<double> longest;
  std::vector<Cost> reference;
  for (int round = 0; round < ROUNDS; ++round) {
    std::filesystem::remove_all(IndexPath("delete"));
    std::filesystem::create_directories(ShareFolder("delete"));
    PutMadeUpRows(IndexPath("delete"), gone, rows);
    const Deletion deletion = WriterDeletion(*store, gone);
    ours.push_back(deletion.cost);
    longest.push_back(deletion.longest);

    const std::string bare = scratch + "/bare-" + std::to_string(round);
    PutMadeUpRows(bare, gone, rows);
    reference.push_back(BareDeletion(bare, gone));
    std::filesystem::remove_all(bare);
  }
  const std::string what = "deletion of a subtree of " + std::to_string(rows) + " entries";
  PrintCosts(what + " / bare", MedianCost(ours), MedianCost(reference), 1.5);
  PrintTimes("longest slice of it / 0.5 s", *std::max_element(longest.begin(), longest.end()),
             SLICE_LIMIT, 1);
}

}  // namespace

}  // namespace fileindexd

int main(int argc, char** argv) {
  using namespace fileindexd;  // NOLINT(google-build-using-namespace): the program itself
  const uint64_t divisor = DivisorFrom(argc, argv);
  const ScratchFolder scratch;
  MeasureRename(scratch.path, Scaled(RENAMED, divisor, 10));
  MeasureDeletion(scratch.path, Scaled(DELETED, divisor, 100));
  return 0;
}
