// SPDX-License-Identifier: GPL-2.0-or-later
// A flood of events, written as whoever hears of changes has to: sorted by folder, each folder's
// own line before those of its files (without it, all files would be siblings in the daemon's tree,
// each compared with each), at most so many lines in a queue file, the next ones when the daemon
// has taken those. Against the same rows put into the bare engine, and for linearity against a
// tenth of the flood.
//
// Each event tells of a file that exists and is not in the index yet; its folder is.
#include <algorithm>
#include <cstdio>
#include <filesystem>
#include <fstream>

#include "base/event_codes.h"
#include "bench/bare_index.h"
#include "bench/daemon.h"
#include "bench/measure.h"
#include "bench/scratch.h"
#include "index/reader.h"
#include "state/layout.h"
#include "state/queue_writer.h"

namespace fileindexd {

namespace {

constexpr uint64_t EVENTS = 1000000;
constexpr uint64_t IN_A_FOLDER = 100;
constexpr size_t LINES = 5000;  // in one queue file

std::string FolderName(const std::string& root, uint64_t folder) {
  char name[64];
  snprintf(name, sizeof(name), "/project-%06u", static_cast<unsigned>(folder));
  return root + name;
}

void MakeFolders(const std::string& root, uint64_t events) {
  for (uint64_t folder = 0; folder < events / IN_A_FOLDER; ++folder) {
    std::filesystem::create_directories(FolderName(root, folder));
  }
}

// In the order in which the events are written; a folder counts as one of its events.
std::vector<std::string> MakeFiles(const std::string& root, uint64_t events) {
  std::vector<std::string> paths;
  char name[64];
  for (uint64_t folder = 0; folder < events / IN_A_FOLDER; ++folder) {
    const std::string path = FolderName(root, folder);
    paths.push_back(path);
    for (uint64_t file = 1; file < IN_A_FOLDER; ++file) {
      snprintf(name, sizeof(name), "/minutes %03u.odt", static_cast<unsigned>(file));
      paths.push_back(path + name);
      std::ofstream(paths.back()) << "text\n";
    }
  }
  return paths;
}

double DaemonTime(DaemonUnderTest& daemon, const std::string& share,
                  const std::vector<std::string>& paths) {
  return TimeOf([&] {
    for (size_t begin = 0; begin < paths.size(); begin += LINES) {
      std::vector<std::string> lines;
      for (size_t i = begin; i < std::min(paths.size(), begin + LINES); ++i) {
        // A folder is told by its name: those of files have an ending.
        const uint32_t event =
            paths[i].ends_with(".odt") ? QLIB_NOTIFY_CLOSE_WRITE : QLIB_NOTIFY_ATTRIB;
        lines.push_back(EventLine(event, paths[i]));
      }
      std::string error;
      if (!AppendToQueue(share, lines, error)) {
        Fail(error);
      }
      daemon.WaitUntilQuiet(share);
    }
  });
}

double BareTime(const std::string& index, const std::vector<std::string>& paths) {
  return TimeOf([&] {
    BareEngine engine(index);
    for (const std::string& path : paths) {
      const Entry entry = EntryAt(path);
      if (entry.thing != Thing::DIRECTORY) {
        engine.Put(entry);  // a folder is there already
      }
      engine.CountChange();
    }
    engine.CommitAndClose();
  });
}

struct Flood {
  double ours = 0;
  double bare = 0;
};

Flood MeasureFlood(DaemonUnderTest& daemon, const std::string& scratch, const std::string& share,
                   uint64_t events) {
  const std::string root = scratch + "/" + share;
  const std::string bare = scratch + "/bare-" + share;
  MakeFolders(root, events);
  daemon.IndexShare(share, root);
  (void)BareIndexOf(root, bare);
  const std::vector<std::string> paths = MakeFiles(root, events);

  Flood flood;
  flood.ours = DaemonTime(daemon, share, paths);
  flood.bare = BareTime(bare, paths);

  EntryReader reader;
  EntryReader::Summary summary;
  if (reader.Open(share) != IndexError::NONE || !reader.Summarise(summary) ||
      summary.entries != events + 1) {
    daemon.FailWithLog("the index does not hold what the events told of");
  }
  std::filesystem::remove_all(root);
  std::filesystem::remove_all(bare);
  return flood;
}

}  // namespace

}  // namespace fileindexd

int main(int argc, char** argv) {
  using namespace fileindexd;  // NOLINT(google-build-using-namespace): the program itself
  const uint64_t divisor = DivisorFrom(argc, argv);
  const uint64_t events = Scaled(EVENTS / IN_A_FOLDER, divisor, 10) * IN_A_FOLDER;
  const uint64_t few = std::max(events / 10, IN_A_FOLDER);
  const ScratchFolder scratch;
  DaemonUnderTest daemon(scratch.path + "/state");

  std::vector<double> ours;
  std::vector<double> bare;
  std::vector<double> ours_of_few;
  for (int flood = 0; flood < ROUNDS; ++flood) {
    const std::string number = std::to_string(flood);
    ours_of_few.push_back(MeasureFlood(daemon, scratch.path, "few-" + number, few).ours);
    const Flood measured = MeasureFlood(daemon, scratch.path, "many-" + number, events);
    ours.push_back(measured.ours);
    bare.push_back(measured.bare);
  }

  PrintTimes(std::to_string(events) + " events / bare engine", Median(ours), Median(bare), 3);
  PrintTimes("one of them / one of " + std::to_string(few),
             Median(ours) / static_cast<double>(events),
             Median(ours_of_few) / static_cast<double>(few), 1.3);
  return 0;
}
