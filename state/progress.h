// SPDX-License-Identifier: GPL-2.0-or-later
// How far long work is, for people: one small file for each share and writer. What goes wrong with
// it is ignored, and nothing may depend on it.
//
//   file   {"what":TEXT,"done":N,"total":N|null,"began":MS,"updated":MS,"pid":N,"start":N} blanks
//   \n
//
// always LINE_SIZE bytes, written in place by one call. MS are milliseconds since the epoch;
// `start` is the kernel's start time of process `pid`, so that a file that outlived its writer is
// no work.
#pragma once

#include <cstdint>
#include <optional>
#include <string>

namespace fileindexd {

enum class Work { FIRST_INDEX, REINDEX, UPDATE, COMPARISON };
// "first index", "reindex", "update", "comparison".
const char* WorkText(Work work);

struct ProgressRecord {
  Work what = Work::UPDATE;
  uint64_t done = 0;
  std::optional<uint64_t> total;  // an estimate; none: nobody knows
  int64_t began = 0;              // milliseconds since the epoch
  int64_t updated = 0;            // the same
};

// The share's files: one of its Worker, one of whoever compares it.
std::string WorkerProgressPath(const std::string& share_name);
std::string ComparisonProgressPath(const std::string& share_name);

// One thread at a time. Between Begin and End it counts; the file is written at most about once a
// second, for the first time a second after Begin unless Write is called before. Where another
// living process holds the file, this one keeps silent. Counting costs an addition and a
// comparison, and every 256 a look at a clock.
class ProgressWriter {
 public:
  explicit ProgressWriter(std::string file_path) : path(std::move(file_path)) {}
  ~ProgressWriter() { End(); }
  ProgressWriter(const ProgressWriter&) = delete;
  ProgressWriter& operator=(const ProgressWriter&) = delete;

  void Begin(Work what, std::optional<uint64_t> total);
  bool IsRunning() const { return record.began != 0; }
  void Count(uint64_t count = 1) {
    if (CountAndLook(count)) {
      Write();
    }
  }
  // Counts without writing; true when it is time to write.
  bool CountAndLook(uint64_t count) {
    record.done += count;
    not_looked += count;
    return not_looked >= LOOK_INTERVAL && IsDue();
  }
  bool IsDue();
  void Write();
  void End();  // removes the file

  ProgressRecord record;  // of the work that runs; `what` and `total` may be changed

 private:
  static constexpr uint64_t LOOK_INTERVAL = 256;

  bool Claim();

  const std::string path;
  bool claimed = false;  // the file is this writer's
  uint64_t not_looked = 0;
  int64_t next_write = 0;  // monotonic milliseconds
};

// False when there is no such work: no file, a torn one, or its writer no longer lives.
bool ReadProgress(const std::string& path, ProgressRecord& record);

}  // namespace fileindexd
