// SPDX-License-Identifier: GPL-2.0-or-later
// The first index of a large tree: by the daemon, by the bare engine, and by another indexer of
// files that is told to take names only (recollindex, left out where it is not installed).
//
// The tree is in the page cache for all of them: it has just been made.
#include <sys/stat.h>
#include <unistd.h>

#include <cstdio>
#include <filesystem>
#include <fstream>

#include "bench/bare_index.h"
#include "bench/daemon.h"
#include "bench/measure.h"
#include "bench/scratch.h"
#include "index/reader.h"
#include "state/layout.h"

namespace fileindexd {

namespace {

constexpr uint64_t FILES = 200000;
constexpr uint64_t FOLDERS = 10000;
constexpr uint64_t FOLDERS_BESIDE = 100;      // in one folder of the upper level
constexpr uint64_t MEMORY_LIMIT = 64 * 1024;  // KiB
constexpr const char* ENDINGS[] = {"txt", "odt", "pdf", "jpg", "mp3"};

struct Measured {
  std::vector<Cost> costs;
  std::vector<double> memory;  // KiB
  std::vector<double> size;    // KiB on the disk
};

void MakeFolder(const std::string& path) {
  if (mkdir(path.c_str(), 0755) != 0) {
    Fail("cannot make " + path);
  }
}

// Two levels of folders; files of a few hundred bytes. Tells how many entries that makes, `root`
// included.
uint64_t MakeTree(const std::string& root, uint64_t files, uint64_t folders) {
  MakeFolder(root);
  uint64_t entries = 1;
  char name[64];
  std::string upper;
  for (uint64_t folder = 0; folder < folders; ++folder) {
    if (folder % FOLDERS_BESIDE == 0) {
      snprintf(name, sizeof(name), "/department-%03u",
               static_cast<unsigned>(folder / FOLDERS_BESIDE));
      upper = root + name;
      MakeFolder(upper);
      ++entries;
    }
    snprintf(name, sizeof(name), "/project-%05u", static_cast<unsigned>(folder));
    const std::string path = upper + name;
    MakeFolder(path);
    ++entries;
    for (uint64_t file = 0; file < files / folders; ++file) {
      snprintf(name, sizeof(name), "/quarterly report %06u.%s",
               static_cast<unsigned>(folder * (files / folders) + file), ENDINGS[file % 5]);
      std::ofstream(path + name) << std::string(100 + file * 10, 'x') << '\n';
      ++entries;
    }
  }
  return entries;
}

// What an earlier measurement wrote does not go to the disk within the next one.
void Settle() {
  sync();
}

// What all files below `folder` take.
double SizeOf(const std::string& folder) {
  uint64_t bytes = 0;
  for (const auto& found : std::filesystem::recursive_directory_iterator(folder)) {
    if (found.is_regular_file()) {
      bytes += found.file_size();
    }
  }
  return static_cast<double>(bytes) / 1024;
}

void MeasureDaemon(const std::string& folder, const std::string& tree, uint64_t entries,
                   Measured& measured) {
  Settle();
  DaemonUnderTest daemon(folder);
  daemon.Control({"share", "add", "tree", tree});
  const double processor = daemon.ProcessorTime();
  const double clock = TimeOf([&] {
    daemon.Control({"folder", "add", tree});
    daemon.WaitUntilQuiet("tree");
  });
  measured.costs.push_back({clock, daemon.ProcessorTime() - processor});
  measured.memory.push_back(static_cast<double>(daemon.PeakMemory()));

  // With its log and the log's index.
  measured.size.push_back(SizeOf(IndexPath("tree")));
  EntryReader reader;
  EntryReader::Summary summary;
  if (reader.Open("tree") != IndexError::NONE || !reader.Summarise(summary) ||
      summary.entries != entries) {
    daemon.FailWithLog("the index holds " + std::to_string(summary.entries) + " entries, not " +
                       std::to_string(entries));
  }
}

void MeasureBare(const std::string& folder, const std::string& tree, uint64_t entries,
                 Measured& measured) {
  Settle();
  MakeFolder(folder);
  uint64_t put = 0;
  measured.costs.push_back(CostOf([&] { put = BareIndexOf(tree, folder); }));
  if (put != entries) {
    Fail("the bare engine saw another tree");
  }
}

// noContentSuffixes: for names that end so, neither type nor content is looked at, only the name is
// indexed. All endings of the tree are in the list; nothing else differs from its defaults.
void MeasureOther(const std::string& folder, const std::string& tree, Measured& measured) {
  Settle();
  MakeFolder(folder);
  std::ofstream config(folder + "/recoll.conf");
  config << "topdirs = " << tree << "\nindexallfilenames = 1\nnoContentSuffixes =";
  for (const char* ending : ENDINGS) {
    config << " ." << ending;
  }
  config << "\nloglevel = 2\n";
  config.close();

  Ended ended;
  const double clock = TimeOf([&] {
    ended = RunProgram({"recollindex", "-c", folder}, folder + "/output");
  });
  measured.costs.push_back({clock, ended.processor_time});
  if (ended.status != 0) {
    Fail("recollindex failed, see " + folder + "/output");
  }
  measured.memory.push_back(static_cast<double>(ended.peak_memory));
  measured.size.push_back(SizeOf(folder + "/xapiandb"));
}

std::string MemoryText(double kib) {
  char text[32];
  snprintf(text, sizeof(text), "%.1f MiB", kib / 1024);
  return text;
}

void Print(const Measured& ours, const Measured& bare, const Measured& other, uint64_t files) {
  const std::string what = "first index of " + std::to_string(files) + " files";
  PrintCosts(what + " / bare engine", MedianCost(ours.costs), MedianCost(bare.costs), 1.5);

  const double memory = Median(ours.memory);
  PrintRow("resident memory meanwhile / 64 MiB", MemoryText(memory), MemoryText(MEMORY_LIMIT),
           memory / static_cast<double>(MEMORY_LIMIT), 1);

  if (other.costs.empty()) {
    printf("recollindex is not installed: no comparison with it\n");
    return;
  }
  PrintCosts(what + " / recollindex", MedianCost(ours.costs), MedianCost(other.costs), 1.0 / 8);
  PrintRow("resident memory / recollindex", MemoryText(memory), MemoryText(Median(other.memory)),
           memory / Median(other.memory), 1);
  PrintRow("size of the index / recollindex", MemoryText(Median(ours.size)),
           MemoryText(Median(other.size)), Median(ours.size) / Median(other.size), 0.5);
}

bool IsInstalled(const char* program) {
  return RunProgram({"sh", "-c", std::string("command -v ") + program}, "/dev/null").status == 0;
}

}  // namespace

}  // namespace fileindexd

int main(int argc, char** argv) {
  using namespace fileindexd;  // NOLINT(google-build-using-namespace): the program itself
  const uint64_t divisor = DivisorFrom(argc, argv);
  const uint64_t files = Scaled(FILES, divisor, 40);
  const ScratchFolder scratch;
  const std::string tree = scratch.path + "/tree";
  const uint64_t entries = MakeTree(tree, files, Scaled(FOLDERS, divisor, 2));
  const bool has_other = IsInstalled("recollindex");

  Measured ours;
  Measured bare;
  Measured other;
  for (int round = 0; round < ROUNDS; ++round) {
    const std::string folder = scratch.path + "/" + std::to_string(round);
    MakeFolder(folder);
    MeasureDaemon(folder + "/state", tree, entries, ours);
    MeasureBare(folder + "/bare", tree, entries, bare);
    if (has_other) {
      MeasureOther(folder + "/other", tree, other);
    }
    std::filesystem::remove_all(folder);
  }

  Print(ours, bare, other, files);
  return 0;
}
