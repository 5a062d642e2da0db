// SPDX-License-Identifier: GPL-2.0-or-later
// verify: an index against the disk, and the events that mend it.
#include <algorithm>
#include <iterator>
#include <optional>

#include "base/event_codes.h"
#include "ctl/commands.h"
#include "ctl/output.h"
#include "ctl/places.h"
#include "index/compare.h"
#include "index/repair.h"
#include "state/belonging.h"
#include "state/layout.h"
#include "state/progress.h"
#include "state/queue_content.h"
#include "state/queue_writer.h"

namespace fileindexd {

namespace {

constexpr uint64_t PIECE = 1000;       // paths
constexpr uint64_t PIECES_SHOWN = 20;  // after which a terminal is told how far it is

bool PutDifference(Difference difference, const std::string& path, const Arguments& arguments) {
  if (!arguments.json) {
    return PutLine(std::string(DifferenceText(difference)) + "\t" + ShownName(path));
  }

  Json::Value object(Json::objectValue);
  SetPath(object, path);
  object["difference"] = DifferenceText(difference);
  return PutJson(object);
}

// What is there again though a delete waits for it: see QueueContent::TextsOf.
using Returned = std::vector<std::string>;

// Of at most `most` lines, or one.
std::vector<std::string> TextsOf(const QueueContent& queued, Repair& repair,
                                 const Returned& returned, size_t most) {
  std::vector<std::string> texts;
  for (const QueueLine& line : repair.Lines(most)) {
    std::ranges::move(queued.TextsOf(line, returned), std::back_inserter(texts));
  }
  return texts;
}

int QueueRepair(const std::string& share_name, Repair& repair, const Returned& returned) {
  if (repair.IsEmpty()) {
    return EXIT_DONE;
  }
  (void)repair.Lines(QUEUE_LINE_LIMIT);  // counts in the index, before others wait for the lock
  const auto make = [&] {
    const QueueContent queued = ReadQueueContent(share_name);
    const size_t room = QUEUE_LINE_LIMIT - std::min(queued.lines, QUEUE_LINE_LIMIT);
    for (const std::string& path : returned) {
      if (const std::string above = queued.ReindexedAbove(path); above != path) {
        (void)repair.Add({Difference::MISSING, above, Thing::NONE, Thing::DIRECTORY});
      }
    }
    std::vector<std::string> texts = TextsOf(queued, repair, returned, room);
    // A line has up to three texts. A queue that is full is given one line's.
    return texts.size() <= room ? texts : TextsOf(queued, repair, returned, room / 3);
  };
  std::string error;
  return AppendToQueue(share_name, make, Durability::NONE, error)
             ? EXIT_DONE
             : Fail(EXIT_FAILED, "%s", error.c_str());
}

// Compares to the end, or until `report` wants no more, and says meanwhile how far it is.
Comparer::Result CompareAll(Comparer& comparer, const std::string& share_name,
                            const std::function<bool(const Found&)>& report) {
  const std::string what = "comparing " + share_name + " with its files";
  std::optional<Progress> shown(what);
  ProgressWriter progress(ComparisonProgressPath(share_name));
  progress.Begin(Work::COMPARISON, comparer.Estimate());
  bool going = true;
  for (uint64_t piece = 1;; ++piece) {
    const uint64_t before = comparer.counts.compared;
    const Comparer::Result result = comparer.Run(
        [&](const Found& found) {
          going = report(found);
          return going;
        },
        PIECE);
    if (result != Comparer::Result::STOPPED || !going) {
      return result;
    }

    progress.record.total = comparer.Estimate();
    progress.Count(comparer.counts.compared - before);
    if (piece % PIECES_SHOWN == 0) {
      shown.reset();
      shown.emplace(what + ": " + std::to_string(comparer.counts.compared) + " of about " +
                    std::to_string(comparer.Estimate()));
    }
  }
}

// Of what could not be read nobody can say that it is clean.
int TellUnreadable(const Comparison& counts) {
  std::string text = "cannot look at " + counts.first_unreadable + ": " + counts.unreadable_reason;
  if (counts.unreadable > 1) {
    text += "; nor at " + std::to_string(counts.unreadable - 1) + " more";
  }
  return Fail(EXIT_FAILED, "%s", text.c_str());
}

// Deletes that wait take away what is there again, whatever the index holds by now.
Returned AddReturned(const Settings& settings, const std::vector<std::string>& deletes,
                     Repair& repair) {
  Returned returned;
  for (const std::string& path : deletes) {
    const Look look = LookAt(settings, path);
    const bool may_be_directory = look.verdict == Verdict::UNKNOWN;
    if (look.verdict == Verdict::BELONGS || may_be_directory) {
      const Thing seen = may_be_directory ? Thing::DIRECTORY : look.thing;
      (void)repair.Add({Difference::MISSING, path, Thing::NONE, seen});
      returned.push_back(path);
    }
  }
  return returned;
}

// For an index that is to be made: what is missing comes with its folder.
void ReindexFolders(const Settings& settings, const Share& share, Repair& repair) {
  for (const IndexedFolder& folder : settings.folders) {
    if (folder.share == share.name && !IsDirectoryGone(folder.path)) {
      (void)repair.Add({Difference::MISSING, folder.path, Thing::NONE, Thing::DIRECTORY});
    }
  }
}

}  // namespace

int Verify(const Arguments& arguments) {
  Session session;
  if (!(arguments.repair ? session.Open() : session.OpenToAsk())) {
    return EXIT_FAILED;
  }
  const Share* share = session.FindShare(arguments.share);
  if (share == nullptr) {
    return EXIT_FAILED;
  }

  // Read before the comparison, which may find in order what they then take away.
  std::vector<std::string> deletes;
  if (arguments.repair) {
    deletes = ReadQueueContent(share->name).deletes;
  }
  Comparer comparer(*session.store, share->name);
  EntryReader reader;  // counts for the repair, beside the comparison's own
  comparer.missing_is_empty = true;
  if (!comparer.Start()) {
    return Fail(EXIT_FAILED, "%s", comparer.Error().c_str());
  }
  (void)reader.Open(share->name);  // an index that is not there has nothing to count
  Repair repair(*session.settings, *share, reader);
  const bool mends_each = arguments.repair && comparer.has_index;
  if (arguments.repair && !comparer.has_index) {
    ReindexFolders(*session.settings, *share, repair);
  }

  bool mended = true;
  bool written = true;
  const Comparer::Result result = CompareAll(comparer, share->name, [&](const Found& found) {
    written = PutDifference(found.difference, found.path, arguments);
    mended = (!mends_each || repair.Add(found)) && mended;
    return written || arguments.repair;  // a mending goes on though nobody listens
  });
  if (result == Comparer::Result::FAILED) {
    return Fail(EXIT_FAILED, "%s", comparer.Error().c_str());
  }
  const bool is_read = comparer.counts.unreadable == 0;
  if (!arguments.repair) {
    const int code = comparer.counts.differences == 0 ? EXIT_DONE : EXIT_FAILED;
    return is_read ? code : TellUnreadable(comparer.counts);
  }

  const Returned returned = AddReturned(*session.settings, deletes, repair);
  const int queued = QueueRepair(share->name, repair, returned);
  if (queued == EXIT_DONE && !mended) {
    return Fail(EXIT_FAILED, "%s: the index holds entries from outside the share",
                share->name.c_str());
  }
  return queued == EXIT_DONE && !is_read ? TellUnreadable(comparer.counts) : queued;
}

}  // namespace fileindexd
