// SPDX-License-Identifier: GPL-2.0-or-later
// From the changes of one share to the lines of its queue.
//
//   change -> gathered by path -> due: looked at, one line -> backlog, folded -> queue file
//
// A create of a file waits for its close, 50 ms at most. A modify waits for the close as well, and
// is due after a second, and then once a minute. All else is due at once, or, after 20 lines in the
// last 50 ms, 50 ms later or when 1 MiB of lines are gathered. Nothing here waits: a locked queue
// and a full one (5,000 lines) are tried again later, and meanwhile the backlog folds.
//
// A reindex of the share's root stands alone in its queue file, and of the backlog it takes in only
// what asks for a look. In one batch the daemon drops what lies below a reindex, and a root that is
// empty where it was not takes nothing out of the index: of what is deleted, each line counts.
#pragma once

#include <chrono>
#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "notify/change.h"
#include "notify/gatherer.h"
#include "state/queue_folding.h"
#include "state/settings.h"

namespace fileindexd {

struct FeedCounts {
  uint64_t changes = 0;  // taken in, of paths that may belong
  uint64_t lines = 0;    // written
  uint64_t folded = 0;   // changes that needed no line of their own
};

// One thread.
class ShareFeed {
 public:
  using Clock = std::chrono::steady_clock;

  explicit ShareFeed(std::string name_of_share);
  ~ShareFeed();
  ShareFeed(const ShareFeed&) = delete;
  ShareFeed& operator=(const ShareFeed&) = delete;

  // Takes in a change. `path` or `from`, or both, lie in the share or are a directory above it;
  // what does not belong by its letters alone leaves no trace: false.
  bool Add(const Settings& settings, const Change& change, Clock::time_point now);

  // Lines that need no look: what a comparison found, a reindex of a path that was mounted.
  void AddLines(const Settings& settings, const std::vector<QueueLine>& lines);

  // Looks at what is due, and writes as many lines as the queue takes. With `everything`, all that
  // is gathered is due; what is not looked at by the deadline stays.
  void Work(const Settings& settings, Clock::time_point now, bool everything = false,
            Clock::time_point deadline = Clock::time_point::max());

  // Files that were changed, and may have other names, since this was asked last.
  std::vector<ChangedFile> TakeChanged();

  // When Work has something to do; none: not before something is added. What waits for the daemon
  // to take the queue is due when that happens: call Work then.
  std::optional<Clock::time_point> NextDue() const;

  size_t Gathered() const;  // changes that are not looked at yet
  size_t Backlog() const;   // lines that are not in the queue yet
  bool IsWrittenOut() const { return Gathered() == 0 && Backlog() == 0; }

  // True once after more came than is kept, and all was dropped: the share is to be compared.
  bool TakeLoss();
  // Forgets everything: the share is gone, or is about to be compared anyway.
  void Clear();

  // Why lines could not be written last, in one line; empty when they could.
  const std::string& Error() const;

  FeedCounts counts;

 private:
  struct Impl;
  std::unique_ptr<Impl> impl;
};

}  // namespace fileindexd
