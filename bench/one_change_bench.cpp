// SPDX-License-Identifier: GPL-2.0-or-later
// One changed file: from the closing of the queue file to the entry being found by a reader.
//
// Against the bare engine's own open, change, commit and close; and in a large index against a
// small one. The rows that make an index large are made up: a single change looks at its own path
// alone. The reader asks without a pause, in this process.
#include <sys/stat.h>

#include <cstdio>
#include <fstream>
#include <optional>

#include "base/event_codes.h"
#include "bench/bare_index.h"
#include "bench/daemon.h"
#include "bench/measure.h"
#include "bench/scratch.h"
#include "index/database.h"
#include "index/reader.h"
#include "state/layout.h"
#include "state/queue_writer.h"

namespace fileindexd {

namespace {

constexpr uint64_t SMALL_INDEX = 10000;
constexpr uint64_t LARGE_INDEX = 1000000;
constexpr uint64_t CHANGES = 40;  // for each round
constexpr double LIMIT = 600;     // seconds for one change

// A share whose index holds so many entries.
class FilledShare {
 public:
  FilledShare(DaemonUnderTest& under_test, const std::string& share_name,
              const std::string& share_root, uint64_t rows)
      : daemon(under_test), name(share_name), root(share_root) {
    if (mkdir(root.c_str(), 0755) != 0) {
      Fail("cannot make " + root);
    }
    daemon.IndexShare(name, root);
    PutMadeUpRows(IndexPath(name), root, rows);
    if (reader.Open(name) != IndexError::NONE) {
      Fail("cannot read the index of " + name);
    }
  }

  // Makes one file and tells how long its entry took.
  double ChangeTime() {
    const std::string path = root + "/minutes of meeting " + std::to_string(++made) + ".txt";
    std::ofstream(path) << "text\n";

    std::string error;
    if (!AppendToQueue(name, {EventLine(QLIB_NOTIFY_CLOSE_WRITE, path)}, error)) {
      Fail(error);
    }
    const double closed = Now();
    std::optional<Entry> entry;
    while (reader.Find(path, entry) != IndexError::NONE || !entry.has_value()) {
      if (Now() - closed > LIMIT) {
        daemon.FailWithLog("no entry for " + path);
      }
    }
    const double seconds = Now() - closed;

    daemon.WaitUntilQuiet(name);
    return seconds;
  }

 private:
  DaemonUnderTest& daemon;
  std::string name;
  std::string root;
  EntryReader reader;
  uint64_t made = 0;
};

double BareChangeTime(BareEngine& engine, Entry& entry, uint64_t number) {
  entry.path = engine.path + "/minutes of meeting " + std::to_string(number) + ".txt";
  entry.inode = number + 1;
  return TimeOf([&] {
    engine.Open();
    engine.Put(entry);
    engine.CommitAndClose();
  });
}

double MedianOf(const std::vector<std::vector<double>>& rounds) {
  std::vector<double> medians;
  for (const std::vector<double>& round : rounds) {
    medians.push_back(Median(round));
  }
  return Median(medians);
}

}  // namespace

}  // namespace fileindexd

int main(int argc, char** argv) {
  using namespace fileindexd;  // NOLINT(google-build-using-namespace): the program itself
  const uint64_t divisor = DivisorFrom(argc, argv);
  const uint64_t few = Scaled(SMALL_INDEX, divisor, 10);
  const uint64_t many = Scaled(LARGE_INDEX, divisor, 100);
  const uint64_t changes = Scaled(CHANGES, divisor, 20);
  const ScratchFolder scratch;

  DaemonUnderTest daemon(scratch.path + "/state");
  FilledShare small(daemon, "small", scratch.path + "/small", few);
  FilledShare large(daemon, "large", scratch.path + "/large", many);
  const std::string bare_path = scratch.path + "/bare";
  PutMadeUpRows(bare_path, bare_path, few);
  BareEngine bare(bare_path);
  bare.CommitAndClose();
  // The share has a reader, and so has this: it spares each opening the reading of the whole log.
  IndexDatabase bare_reader;
  if (bare_reader.OpenForReading(bare_path) != IndexError::NONE) {
    Fail("cannot read " + bare_path);
  }
  Entry entry = EntryAt(bare_path);
  entry.thing = Thing::FILE;
  entry.kind = Kind::DOCUMENT;

  std::vector<std::vector<double>> in_small(ROUNDS);
  std::vector<std::vector<double>> in_large(ROUNDS);
  std::vector<std::vector<double>> in_bare(ROUNDS);
  for (size_t round = 0; round < ROUNDS; ++round) {
    for (uint64_t change = 0; change < changes; ++change) {
      in_small[round].push_back(small.ChangeTime());
      in_bare[round].push_back(BareChangeTime(bare, entry, round * changes + change));
      in_large[round].push_back(large.ChangeTime());
    }
  }

  const double ours = MedianOf(in_small);
  PrintTimes("one change among " + std::to_string(few) + " entries / bare engine", ours,
             MedianOf(in_bare), 4);
  PrintTimes("one change among " + std::to_string(many) + " / " + std::to_string(few) + " entries",
             MedianOf(in_large), ours, 1.5);
  return 0;
}
