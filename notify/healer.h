// SPDX-License-Identifier: GPL-2.0-or-later
// Compares shares with their indexes, one after the other, on threads of its own.
#pragma once

#include <chrono>
#include <cstdint>
#include <memory>
#include <string>
#include <vector>

#include "index/compare.h"
#include "notify/pressure.h"
#include "state/queue_folding.h"

namespace fileindexd {

enum class Urgency {
  NOW,    // the index may differ
  IDLE,   // it should not: at idle priority, and only while nothing urgent waits
  APART,  // as NOW, of a file system that may hang: it keeps none of the others waiting
};

// What came of one comparison.
struct Healing {
  std::string share;
  bool done = false;  // false: `error` says why it could not be made
  std::string error;
  bool early = false;  // it did not await the end of what was being written, and may have missed it
  Comparison counts;
  std::vector<QueueLine> lines;         // that mend what was found, sorted
  int64_t began = 0;                    // seconds since the epoch
  int64_t ended = 0;                    // the same
  std::chrono::milliseconds worked{0};  // without all waiting
};

// Used by one thread; what it starts is its own.
class Healer {
 public:
  // False, with errno, when it cannot be started.
  bool Start();
  // Ends what runs within a second. The destructor does the same.
  void Stop();
  explicit Healer(std::string pressure_folder = PRESSURE_FOLDER);
  ~Healer();
  Healer(const Healer&) = delete;
  Healer& operator=(const Healer&) = delete;

  // Has the share compared from its beginning, after what waits already. One that runs for it now
  // is not enough: it is followed by another. A request for what waits changes nothing, or makes it
  // urgent.
  void Request(const std::string& share, Urgency urgency);
  // Ends and drops what is asked for the share.
  void Forget(const std::string& share);
  // Whether a comparison of the share waits, runs, or has ended and was not taken.
  bool IsPending(const std::string& share) const;

  // What has ended since the last call. The descriptor is readable while there is something.
  std::vector<Healing> Take();
  int Descriptor() const;

 private:
  struct Impl;
  std::unique_ptr<Impl> impl;
};

}  // namespace fileindexd
