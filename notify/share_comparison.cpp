// SPDX-License-Identifier: GPL-2.0-or-later
#include "notify/share_comparison.h"

#include <algorithm>
#include <ctime>

#include "notify/log.h"
#include "notify/sent_lines.h"
#include "state/queue_content.h"
#include "state/queue_writer.h"

namespace fileindexd {

namespace {

using Clock = std::chrono::steady_clock;

constexpr size_t LINES_KEPT = 20000;
// How many paths a tenth of a second is good for depends on the disk, and on what is cached.
constexpr std::chrono::milliseconds PIECE_TIME(100);
constexpr uint64_t FIRST_PIECE = 500;
constexpr uint64_t LONGEST_PIECE = 5000;
constexpr uint64_t SHORTEST_PIECE = 20;
constexpr std::chrono::milliseconds WRITER_TIME(100);  // before the next one is given its turn

}  // namespace

ShareComparison::ShareComparison(StateStore& state, const std::string& share_name,
                                 std::chrono::milliseconds patience)
    : store(state),
      writer_patience(patience),
      comparer(state, share_name),
      progress(ComparisonProgressPath(share_name)),
      piece(FIRST_PIECE) {
  healing.share = share_name;
  healing.began = std::time(nullptr);
}

bool ShareComparison::Fail(const std::string& why) {
  healing.error = why;
  Finish();
  return false;
}

void ShareComparison::Finish() {
  progress.End();
  healing.counts = comparer.counts;
  healing.ended = std::time(nullptr);
}

// A transaction that has not ended may take away what was gone for a moment before anybody watched:
// the comparison would still find it in the index, and in order.
bool ShareComparison::HasWriterEnded() {
  const bool is_open = reader.database.IsOpen() && !reader.database.HasMoved();
  return (!is_open && reader.Open(healing.share) != IndexError::NONE) ||
         reader.HasWriterEnded(static_cast<int>(WRITER_TIME.count()));
}

// A writer may be stopped for long: other shares wait behind this one.
bool ShareComparison::MayBegin() {
  if (HasWriterEnded()) {
    return true;
  }
  healing.early = writer_patience <= WRITER_TIME;
  writer_patience -= WRITER_TIME;
  return healing.early;
}

bool ShareComparison::Begin() {
  // Deletes that wait may be executed behind the comparison's back, on what it finds in order.
  deletes = ReadQueueContent(healing.share).deletes;
  // Whose first lines wait has its index soon; where none wait nobody else would have it made.
  comparer.missing_is_empty = WaitingLines(healing.share) == 0;
  if (!comparer.Start()) {
    return Fail(comparer.Error());
  }
  if (!store.GetSettings(settings)) {
    return Fail(store.Error());
  }
  const Share* share = settings->ShareByName(healing.share);
  if (share == nullptr) {
    return Fail("no such share: " + healing.share);
  }

  (void)reader.Open(healing.share);  // an index that is not there has nothing to count
  repair = std::make_unique<Repair>(*settings, *share, reader, LINES_KEPT);
  progress.Begin(Work::COMPARISON, comparer.Estimate());
  progress.Write();  // at once: it may stand still in a pause, or behind an urgent one
  return true;
}

bool ShareComparison::GoOn() {
  if (repair == nullptr && !MayBegin()) {
    return true;
  }
  if (repair == nullptr && !Begin()) {
    return false;
  }

  const uint64_t before = comparer.counts.compared;
  const Clock::time_point began = Clock::now();
  const Comparer::Result result = comparer.Run(
      [this](const Found& found) {
        mended = repair->Add(found) && mended;
        return true;
      },
      piece);
  healing.worked += std::chrono::duration_cast<std::chrono::milliseconds>(Clock::now() - began);
  if (result == Comparer::Result::FAILED) {
    return Fail(comparer.Error());
  }
  if (result == Comparer::Result::STOPPED) {
    const Clock::duration took = Clock::now() - began;
    if (took > PIECE_TIME * 2) {
      piece = std::max(piece / 2, SHORTEST_PIECE);
    } else if (took < PIECE_TIME / 2) {
      piece = std::min(piece * 2, LONGEST_PIECE);
    }
    progress.record.total = comparer.Estimate();
    progress.Count(comparer.counts.compared - before);
    return true;
  }

  if (!mended) {
    LogError("share %s: the index holds entries from outside the share", healing.share.c_str());
  }
  healing.lines = repair->Lines(LINES_KEPT);
  for (QueueLine& line : LinesOfReturned(*settings, deletes)) {
    healing.lines.push_back(std::move(line));
  }
  if (comparer.counts.unreadable > 0) {
    LogError("share %s: %llu paths cannot be looked at, the first is %s: %s", healing.share.c_str(),
             static_cast<unsigned long long>(comparer.counts.unreadable),
             comparer.counts.first_unreadable.c_str(), comparer.counts.unreadable_reason.c_str());
  }
  healing.done = true;
  Finish();
  return false;
}

}  // namespace fileindexd
