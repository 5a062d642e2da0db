// SPDX-License-Identifier: GPL-2.0-or-later
#include "notify/sent_lines.h"

#include "base/event_codes.h"
#include "notify/change.h"
#include "notify/look_lines.h"
#include "state/belonging.h"
#include "state/layout.h"

namespace fileindexd {

namespace {

QueueLine ReindexOf(const std::string& path) {
  return {CUSTOM_EVENT_REINDEX, path, {}, {}};
}

}  // namespace

void SentLines::Forget() {
  deleted.clear();
  renamed.clear();
  written.clear();
  updates.Forget();
}

void SentLines::Note(const LineInFile& line) {
  updates.Note(line.event, line.path);
  const auto path = NormalPath(line.path);
  if (!path.has_value()) {
    return;
  }
  deleted.erase(*path);
  // What a look of others has displaced is still to be asked for.
  if (!IsLook(line.event)) {
    renamed.erase(*path);
    written.erase(*path);
  }
  if ((line.event & QLIB_NOTIFY_RENAME) != 0) {
    renamed.insert(*path);
  } else if ((line.event & QLIB_NOTIFY_DELETE) != 0) {
    deleted.insert(*path);
  } else if ((line.event & (QLIB_NOTIFY_CLOSE_WRITE | QLIB_NOTIFY_CREATE)) != 0) {
    written.insert(*path);
  }
}

// Also where an update waits at a rename's former path: the reindex of that, by its plain name,
// takes one along that was queued behind the update.
std::vector<QueueLine> SentLines::InPlaceOf(const QueueLine& line) const {
  if (line.event == QLIB_NOTIFY_RENAME &&
      (updates.Holds(line.path) || updates.Holds(line.path_old))) {
    return {ReindexOf(line.path), ReindexOf(line.path_old)};
  }
  if (line.event != QLIB_NOTIFY_MODIFY && line.event != QLIB_NOTIFY_ATTRIB) {
    return {line};
  }
  if (renamed.contains(line.path)) {
    return {ReindexOf(line.path)};
  }
  if (!written.contains(line.path)) {
    return {line};
  }
  // A modify may be about what is gone, which a close passes over.
  const bool is_there = line.event == QLIB_NOTIFY_ATTRIB;
  return {is_there ? QueueLine{QLIB_NOTIFY_CLOSE_WRITE, line.path, {}, {}} : ReindexOf(line.path)};
}

std::vector<QueueLine> SentLines::LinesBehind(const Settings& settings,
                                              const QueueLine& line) const {
  std::vector<std::string> below;
  if (line.event == CUSTOM_EVENT_REINDEX || line.event == QLIB_NOTIFY_RENAME) {
    auto path = deleted.upper_bound(line.path);
    for (; path != deleted.end() && Covers(line.path, *path); ++path) {
      below.push_back(*path);
    }
  }
  return LinesOfReturned(settings, below);
}

std::string SentLines::PathInFile(const QueueLine& line) const {
  return updates.PathInFile(line.event, line.path);
}

std::vector<QueueLine> LinesOfReturned(const Settings& settings,
                                       const std::vector<std::string>& paths) {
  std::vector<QueueLine> lines;
  FolderView folder;
  for (const std::string& path : paths) {
    const size_t before = lines.size();
    (void)LinesOfLook(settings, path, DELETED, {}, folder, lines);
    if (lines.size() > before && lines.back().event == QLIB_NOTIFY_DELETE) {
      lines.pop_back();
    }
  }
  return lines;
}

}  // namespace fileindexd
