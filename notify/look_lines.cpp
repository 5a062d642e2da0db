// SPDX-License-Identifier: GPL-2.0-or-later
#include "notify/look_lines.h"

#include "base/event_codes.h"

namespace fileindexd {

namespace {

// Another thing may stand at the path, or none, than the one that the index knows.
constexpr uint32_t REPLACED = DELETED | MOVED_FROM | MOVED_TO;

// A directory may have been filled before anybody looked.
uint32_t EventOfDirectory(uint32_t what) {
  return (what & (REPLACED | CREATED)) != 0 ? CUSTOM_EVENT_REINDEX : QLIB_NOTIFY_ATTRIB;
}

uint32_t EventOfFile(uint32_t what) {
  if ((what & WRITTEN) != 0) {
    return QLIB_NOTIFY_CLOSE_WRITE;
  }
  if ((what & (REPLACED | CREATED)) != 0) {
    return QLIB_NOTIFY_CREATE;
  }
  return (what & MODIFIED) != 0 ? QLIB_NOTIFY_MODIFY : QLIB_NOTIFY_ATTRIB;
}

// 0: no line.
uint32_t EventOf(const Look& look, uint32_t what) {
  switch (look.verdict) {
    case Verdict::GONE:
      // Also of what was made and removed unseen: a walk may have met it in between.
      return QLIB_NOTIFY_DELETE;
    case Verdict::BELONGS:
      return look.thing == Thing::DIRECTORY ? EventOfDirectory(what) : EventOfFile(what);
    case Verdict::UNKNOWN:
      // The daemon looks itself. What has come there may be a directory.
      return (what & (REPLACED | CREATED)) != 0 ? CUSTOM_EVENT_REINDEX : QLIB_NOTIFY_MODIFY;
    default:
      return (what & REPLACED) != 0 ? QLIB_NOTIFY_DELETE : 0;
  }
}

}  // namespace

Look LinesOfLook(const Settings& settings, const std::string& path, uint32_t what,
                 const std::string& from, FolderView& folder, std::vector<QueueLine>& lines) {
  const Look look = LookNear(settings, path, folder);
  const bool may_be_there = look.verdict == Verdict::BELONGS || look.verdict == Verdict::UNKNOWN;
  if (!from.empty() && may_be_there) {
    lines.push_back({QLIB_NOTIFY_RENAME, path, {}, from});
    return look;
  }

  const uint32_t event = EventOf(look, what);
  if (event != 0) {
    lines.push_back({event, path, {}, {}});
  }
  if (!from.empty()) {
    (void)LinesOfLook(settings, from, MOVED_FROM, {}, folder, lines);
  }
  return look;
}

}  // namespace fileindexd
