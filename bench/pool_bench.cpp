// SPDX-License-Identifier: GPL-2.0-or-later
// Reads and extracts every file below a folder with as many helpers as there are processors, and
// throws away what they found: what the content service cannot be quicker than.
//
//   pool_bench FOLDER HELPER      HELPER: fileindex-extract's path
//
// Prints the seconds it took, and how many files were read. Ends with 1 if one could not be.
#include <fcntl.h>
#include <poll.h>

#include <algorithm>
#include <chrono>
#include <cstdio>
#include <filesystem>
#include <string>
#include <thread>
#include <vector>

#include "bench/measure.h"
#include "extract/pool.h"

namespace fileindexd {

namespace {

std::vector<std::filesystem::path> FilesBelow(const std::string& folder) {
  std::vector<std::filesystem::path> files;
  for (const auto& found : std::filesystem::recursive_directory_iterator(folder)) {
    if (found.is_regular_file()) {
      files.push_back(found.path());
    }
  }
  return files;
}

void Submit(ExtractPool& pool, const std::filesystem::path& path, uint64_t id) {
  constexpr int FLAGS = O_RDONLY | O_CLOEXEC | O_NOFOLLOW | O_NONBLOCK;
  auto file = std::make_shared<ScopedFd>(open(path.c_str(), FLAGS));
  if (file->fd < 0) {
    Fail("cannot open " + path.string());
  }
  ExtractJob job;
  job.id = id;
  job.file = std::move(file);
  job.name = path.filename().string();
  pool.Submit(std::move(job));
}

void Await(const ExtractPool& pool) {
  std::vector<pollfd> polled;
  pool.AddPolled(polled);
  const auto left =
      std::chrono::ceil<std::chrono::milliseconds>(pool.Due() - std::chrono::steady_clock::now());
  const int64_t timeout = std::clamp<int64_t>(left.count(), 0, 60'000);
  (void)poll(polled.data(), polled.size(), static_cast<int>(timeout));  // Work looks anyway
}

void ExtractAll(ExtractPool& pool, const std::vector<std::filesystem::path>& files) {
  size_t given = 0;
  while (given < files.size() || pool.Running() > 0) {
    while (given < files.size() && pool.Room() > 0) {
      Submit(pool, files[given], given);
      ++given;
    }
    Await(pool);
    for (const ExtractOutcome& outcome : pool.Work()) {
      if (outcome.result != ExtractOutcome::Result::DONE) {
        Fail(files[outcome.id].string() + ": " + outcome.reason);
      }
    }
  }
}

}  // namespace

}  // namespace fileindexd

int main(int argc, char** argv) {
  using namespace fileindexd;  // NOLINT(google-build-using-namespace): the program itself
  if (argc != 3) {
    Fail("pool_bench FOLDER HELPER");
  }
  std::string error;
  const std::unique_ptr<ExtractPool> pool = ExtractPool::Open(
      {.helpers = std::max(std::thread::hardware_concurrency(), 1U), .program = argv[2]}, error);
  if (pool == nullptr) {
    Fail(error);
  }

  const double seconds = TimeOf([&] { ExtractAll(*pool, FilesBelow(argv[1])); });
  printf("%f %zu\n", seconds, FilesBelow(argv[1]).size());
  return 0;
}
