// SPDX-License-Identifier: GPL-2.0-or-later
// The comparison of an unchanged share with its index, against a bare walk of the same tree; and
// the memory that it takes, whatever the share's size.
//
// The tree and the index are in the page cache: both sides walk them once before.
#include <dirent.h>
#include <fcntl.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cstdio>
#include <cstdlib>
#include <cstring>

#include "base/scoped_fd.h"
#include "base/scoped_stream.h"
#include "bench/bare_index.h"
#include "bench/daemon.h"
#include "bench/measure.h"
#include "bench/scratch.h"
#include "index/compare.h"
#include "state/filesystem.h"
#include "state/layout.h"

namespace fileindexd {

namespace {

constexpr uint64_t FILES = 1000000;
constexpr uint64_t FILES_BESIDE = 100;        // in one folder
constexpr uint64_t FOLDERS_BESIDE = 100;      // in one folder of the upper level
constexpr uint64_t MEMORY_LIMIT = 64 * 1024;  // KiB

void MakeFolder(const std::string& path) {
  if (mkdir(path.c_str(), 0755) != 0) {
    Fail("cannot make " + path);
  }
}

void MakeTree(const std::string& root, uint64_t files) {
  MakeFolder(root);
  std::string upper;
  std::string folder;
  for (uint64_t file = 0; file < files; ++file) {
    if (file % (FILES_BESIDE * FOLDERS_BESIDE) == 0) {
      upper = root + "/department-" + std::to_string(file);
      MakeFolder(upper);
    }
    if (file % FILES_BESIDE == 0) {
      folder = upper + "/project-" + std::to_string(file);
      MakeFolder(folder);
    }
    const std::string path = folder + "/quarterly report " + std::to_string(file) + ".odt";
    if (mknod(path.c_str(), S_IFREG | 0644, 0) != 0) {
      Fail("cannot make " + path);
    }
  }
}

// A share of that name, with its index as it should be.
std::unique_ptr<StateStore> MakeShare(const std::string& name, const std::string& root) {
  std::string error;
  auto store = StateStore::Open(error);
  if (store == nullptr || !MakeShareFolder(name, error) ||
      !store->AddShare({name, root, FilesystemIdentity(root)}) || !store->AddFolder(root, {})) {
    Fail("cannot make the share " + name + ": " + error);
  }
  MakeFolder(IndexPath(name));
  (void)BareIndexOf(root, IndexPath(name));
  return store;
}

uint64_t BareWalk(int folder_fd) {
  uint64_t things = 0;
  const ScopedDir stream(fdopendir(folder_fd));
  if (stream.dir == nullptr) {
    Fail("cannot read a folder");
  }
  while (const dirent* found = readdir(stream.dir)) {  // NOLINT(concurrency-mt-unsafe): one thread
    if (strcmp(found->d_name, ".") == 0 || strcmp(found->d_name, "..") == 0) {
      continue;
    }
    struct stat st {};
    if (fstatat(dirfd(stream.dir), found->d_name, &st, AT_SYMLINK_NOFOLLOW) != 0) {
      Fail("cannot look at a file");
    }
    ++things;
    if (S_ISDIR(st.st_mode)) {
      things += BareWalk(openat(dirfd(stream.dir), found->d_name, O_RDONLY | O_DIRECTORY));
    }
  }
  return things;
}

uint64_t Compare(StateStore& store, const std::string& name) {
  Comparison result;
  std::string error;
  const auto none = [](Difference, const std::string& path) -> bool { Fail(path + " differs"); };
  if (!CompareShare(store, name, none, result, error)) {
    Fail(error);
  }
  return result.seen;
}

double PeakOfVerify(const std::string& name) {
  const Ended ended = RunProgram({OwnFolder() + "/../bin/fileindexctl", "verify", name});
  if (ended.status != 0) {
    Fail("fileindexctl verify found a difference");
  }
  return static_cast<double>(ended.peak_memory);
}

void PrintMemory(const std::string& of, double kib) {
  char text[32];
  snprintf(text, sizeof(text), "%.1f MiB", kib / 1024);
  PrintRow("resident memory of verify, " + of + " / 64 MiB", text, "64 MiB",
           kib / static_cast<double>(MEMORY_LIMIT), 1);
}

}  // namespace

}  // namespace fileindexd

int main(int argc, char** argv) {
  using namespace fileindexd;  // NOLINT(google-build-using-namespace): the program itself
  const uint64_t files = Scaled(FILES, DivisorFrom(argc, argv), 100);
  const ScratchFolder scratch;
  const std::string state = scratch.path + "/state";
  setenv("FILEINDEXD_STATE_DIR", state.c_str(), 1);  // NOLINT(concurrency-mt-unsafe): one thread
  const std::string big = scratch.path + "/big";
  const std::string small = scratch.path + "/small";
  MakeTree(big, files);
  MakeTree(small, files / 10);
  (void)MakeShare("small", small);
  const auto store = MakeShare("big", big);

  std::vector<double> ours;
  std::vector<double> reference;
  for (int round = 0; round <= ROUNDS; ++round) {
    uint64_t seen = 0;
    uint64_t walked = 0;
    const double comparing = TimeOf([&] { seen = Compare(*store, "big"); });
    const double walking = TimeOf(
        [&] { walked = 1 + BareWalk(open(big.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC)); });
    if (seen != walked) {
      Fail("the two sides saw different trees");
    }
    if (round > 0) {
      ours.push_back(comparing);
      reference.push_back(walking);
    }
  }

  const std::string of = std::to_string(files) + " files";
  PrintTimes("comparison of " + of + " / bare walk", Median(ours), Median(reference), 2);
  PrintMemory(of, PeakOfVerify("big"));
  PrintMemory(std::to_string(files / 10) + " files", PeakOfVerify("small"));
  return 0;
}
