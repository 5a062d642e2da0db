// SPDX-License-Identifier: GPL-2.0-or-later
// stats: numbers and bytes, from the index alone.
#include <chrono>
#include <optional>
#include <string>
#include <vector>

#include "ctl/commands.h"
#include "ctl/output.h"
#include "ctl/pending.h"
#include "ctl/places.h"
#include "ctl/stats_output.h"
#include "ctl/values.h"
#include "index/database.h"

namespace fileindexd {

namespace {

int64_t Now() {
  using std::chrono::nanoseconds;
  using std::chrono::system_clock;
  return std::chrono::duration_cast<nanoseconds>(system_clock::now().time_since_epoch()).count();
}

// EXIT_USAGE, with its line written, for values that make no sense.
int ReadWish(const Arguments& arguments, StatisticsWish& wish) {
  constexpr int64_t SECOND = 1'000'000'000;
  wish.now = Now();
  wish.duplicates = arguments.duplicates;
  if (arguments.by) {
    wish.by = GroupByFromText(*arguments.by);
  }
  if (arguments.largest) {
    const std::optional<uint64_t> number = ParseCount(*arguments.largest);
    if (!number || *number == 0 || *number > MOST_LARGEST) {
      return Fail(EXIT_USAGE, "stats: --largest: not a number from 1 to %llu: %s",
                  static_cast<unsigned long long>(MOST_LARGEST), arguments.largest->c_str());
    }
    wish.largest = *number;
  }
  if (arguments.growth) {
    const std::optional<int64_t> seconds = ParseDuration(*arguments.growth);
    if (!seconds) {
      return Fail(EXIT_USAGE, "stats: --growth: not a duration such as 15m, 1h30m, 7d, 2w: %s",
                  arguments.growth->c_str());
    }
    wish.born_since = wish.now - *seconds * SECOND;
  }
  wish.totals = !wish.by && wish.largest == 0 && !wish.duplicates && !wish.born_since;
  return EXIT_DONE;
}

}  // namespace

int Stats(const Arguments& arguments) {
  StatisticsWish wish;
  const int code = ReadWish(arguments, wish);
  if (code != EXIT_DONE) {
    return code;
  }
  Session session;
  if (!session.OpenToAsk()) {
    return EXIT_FAILED;
  }
  if (arguments.in_share && session.FindShare(*arguments.in_share) == nullptr) {
    return EXIT_FAILED;
  }
  std::vector<std::string> failures;
  for (const Share& share : session.settings->shares) {
    if (arguments.in_share && share.name != *arguments.in_share) {
      continue;
    }
    if (IsIndexLost(*session.store, *session.settings, share.name)) {
      failures.push_back("share " + share.name + ": " + IndexErrorText(IndexError::PATH_NOT_FOUND));
    } else {
      wish.shares.push_back(share);
    }
  }

  Statistics statistics;
  {
    const Progress progress("counting");
    Gather(wish, statistics);
  }
  failures.insert(failures.end(), statistics.failures.begin(), statistics.failures.end());
  const bool is_answered = failures.empty() || statistics.answered > 0;
  if (is_answered && arguments.json) {
    (void)PutJson(StatisticsObject(wish, statistics));
  } else if (is_answered) {
    for (const std::string& line : StatisticsLines(wish, statistics, FindScreen())) {
      (void)PutLine(line);
    }
  }
  return FailAll(failures);
}

}  // namespace fileindexd
