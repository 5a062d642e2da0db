// SPDX-License-Identifier: GPL-2.0-or-later
// Changes of one share on their way to lines of its queue.
#pragma once

#include <string>
#include <utility>
#include <vector>

#include "notify/gatherer.h"
#include "state/event_codes.h"
#include "tests/unit/notify/feed_fixture.h"

namespace fileindexd {

using Texts = std::vector<std::string>;

class GathererTest : public FeedTest {
 protected:
  void Add(const Change& change) { gatherer.Add(settings, change, now); }

  // "CREATE a", "RENAME a b": by path, with the indexed folder's own taken off.
  Texts Due(bool everything = false) {
    std::vector<QueueLine> lines;
    gatherer.TakeDue(settings, now, everything, lines);
    Texts texts;
    for (const QueueLine& line : lines) {
      std::string text = EventNames(line.event);
      text = text.substr(text.rfind('_') + 1) + " ";
      text += line.path_old.empty() ? "" : Name(line.path_old) + " ";
      texts.push_back(text + Name(line.path));
    }
    return texts;
  }
  Texts All() { return Due(true); }
  std::string Name(const std::string& path) const {
    return path.starts_with(home + "/") ? path.substr(home.size() + 1) : path.substr(folder.size());
  }

  void MakeBusy() {
    for (int i = 0; i < 20; ++i) {
      Add(File(WRITTEN, "busy" + std::to_string(i)));
    }
    ASSERT_EQ(Due().size(), 20U);
  }

  Gatherer gatherer{"s"};
};

}  // namespace fileindexd
