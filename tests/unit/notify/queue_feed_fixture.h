// SPDX-License-Identifier: GPL-2.0-or-later
// A feed of the share "s", and the queue file that it writes.
#pragma once

#include <cstdio>
#include <string>
#include <vector>

#include "notify/share_feed.h"
#include "state/layout.h"
#include "state/queue_writer.h"
#include "tests/unit/notify/feed_fixture.h"

namespace fileindexd {

class QueueFeedTest : public FeedTest {
 protected:
  using Texts = std::vector<std::string>;

  QueueFeedTest() : queue(QueuePath("s")) {}

  void Add(const Change& change) { feed.Add(settings, change, now); }
  void Work(bool everything = false) { feed.Work(settings, now, everything); }
  // As when the daemon takes it.
  void TakeQueue() const { ASSERT_EQ(rename(queue.c_str(), DrainedPath("s").c_str()), 0); }

  Texts Queue() const { return ReadLines(queue); }
  std::string Line(uint32_t event, const std::string& name) const {
    return EventLine(event, Path(name));
  }

  const std::string queue;
  ShareFeed feed{"s"};
};

}  // namespace fileindexd
