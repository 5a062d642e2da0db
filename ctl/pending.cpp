// SPDX-License-Identifier: GPL-2.0-or-later
#include "ctl/pending.h"

#include <algorithm>
#include <string_view>
#include <utility>

#include "index/reader.h"
#include "state/event_codes.h"
#include "state/layout.h"
#include "state/progress.h"
#include "state/queue_content.h"
#include "state/queue_files.h"
#include "state/queue_writer.h"

namespace fileindexd {

namespace {

enum class Relation { NONE, HERE, ABOVE, BELOW };

Relation RelationOf(const std::string& written, const std::string& path) {
  const auto normal = NormalPath(written);
  if (!normal.has_value()) {
    return Relation::NONE;
  }
  if (*normal == path) {
    return Relation::HERE;
  }
  if (Covers(*normal, path)) {
    return Relation::ABOVE;
  }
  return Covers(path, *normal) ? Relation::BELOW : Relation::NONE;
}

class PendingFinder {
 public:
  PendingFinder(const std::string& of_path, Pending& found) : path(of_path), pending(found) {}

  void Read(std::string_view text, bool begun) {
    LineInFile line;
    if (reader.Read(text, line)) {
      Add({.event = EventNames(line.event),
           .path = std::move(line.path),
           .path_old = std::move(line.path_old),
           .above = false,
           .begun = begun});
    }
  }

 private:
  void Add(PendingEvent&& event) {
    const Relation now = RelationOf(event.path, path);
    const Relation old = RelationOf(event.path_old, path);
    if (now == Relation::HERE || old == Relation::HERE) {
      pending.events.push_back(std::move(event));
    } else if (now == Relation::ABOVE || old == Relation::ABOVE) {
      event.above = true;
      pending.events.push_back(std::move(event));
    } else if (now == Relation::BELOW || old == Relation::BELOW) {
      ++pending.below;
    }
  }

  const std::string& path;
  Pending& pending;
  const QueueLineReader reader;
};

}  // namespace

Pending ReadPending(const std::string& share_name, const std::string& path) {
  QueueFiles files;
  OpenQueueFiles(share_name, files);
  Pending pending;
  PendingFinder finder(path, pending);
  ForEachQueueLine(files.drained, [&](std::string_view line) { finder.Read(line, true); });
  ForEachQueueLine(files.queue, [&](std::string_view line) { finder.Read(line, false); });
  return pending;
}

bool IsIndexExpected(StateStore& store, const Settings& settings, const std::string& share_name) {
  const bool has_folders = std::any_of(
      settings.folders.begin(), settings.folders.end(),
      [&share_name](const IndexedFolder& folder) { return folder.share == share_name; });
  ShareStatus status;
  ProgressRecord work;
  return has_folders && WaitingLines(share_name) == 0 && store.GetStatus(share_name, status) &&
         !status.needs_reindex && !status.reindex_begun &&
         !ReadProgress(WorkerProgressPath(share_name), work);
}

// Looked for first, as it mostly is there, and last: it may just have been made.
bool IsIndexLost(StateStore& store, const Settings& settings, const std::string& share_name) {
  return EntryReader::IsMissing(share_name) && IsIndexExpected(store, settings, share_name) &&
         EntryReader::IsMissing(share_name);
}

}  // namespace fileindexd
