// SPDX-License-Identifier: GPL-2.0-or-later
// What the notification service tells of its shares, and how it is shown.
#pragma once

#include <json/value.h>

#include <chrono>
#include <cstdint>
#include <map>
#include <optional>
#include <string>
#include <utility>
#include <vector>

namespace fileindexd {

// The last comparison.
struct ComparedReport {
  int64_t ended = 0;  // seconds since the epoch
  uint64_t differences = 0;
  std::optional<std::string> error;
};

// Of one share; see state/notifier.h for what each means.
struct WatchReport {
  bool is_known = false;  // the service told; else all but `problem` is nothing
  std::optional<std::string> watched_by;
  std::string problem;
  std::optional<int64_t> complete_until;
  uint64_t backlog = 0;
  uint64_t changes = 0;
  uint64_t lines = 0;
  uint64_t folded = 0;
  uint64_t overflows = 0;
  std::optional<ComparedReport> compared;
  bool comparing = false;
};

// What the service answered last.
class Watches {
 public:
  using Clock = std::chrono::steady_clock;

  // Asks, for 2 s at most.
  void Ask();
  // When it may be asked again: it is not kept busy with answering, nor a user with waiting for it.
  Clock::time_point NextAsk() const;
  WatchReport Of(const std::string& share) const;

 private:
  std::map<std::string, WatchReport> shares;
  std::string problem;  // why nothing is known
  bool is_silent = false;
  Clock::time_point asked;
};

// Adds the share's keys to its object.
void AddWatch(Json::Value& object, const WatchReport& watch);
// The same for people: labels and values.
std::vector<std::pair<std::string, std::string>> WatchLines(const WatchReport& watch);

}  // namespace fileindexd
