// SPDX-License-Identifier: GPL-2.0-or-later
#include "notify/sent_lines.h"

#include <exception>
#include <utility>

#include "base/event_codes.h"
#include "notify/change.h"
#include "notify/look_lines.h"
#include "state/belonging.h"
#include "state/layout.h"
#include "state/queue_files.h"

namespace fileindexd {

LineReader::LineReader() {
  Json::CharReaderBuilder builder;
  builder["collectComments"] = false;
  reader.reset(builder.newCharReader());
}

bool LineReader::Read(std::string_view text, QueueLine& line) const {
  try {
    Json::Value value;
    if (!reader->parse(text.data(), text.data() + text.size(), &value, nullptr) ||
        !value.isObject() || !value.isMember("event") ||
        !value["event"].isConvertibleTo(Json::uintValue) || !value["path"].isString()) {
      return false;
    }
    auto path = NormalPath(value["path"].asString());
    if (!path.has_value()) {
      return false;
    }
    line = {value["event"].asUInt(), std::move(*path), {}, {}};
    return true;
  } catch (const std::exception&) {  // nesting beyond the reader's limit: no event of ours
    return false;
  }
}

void SentLines::Forget() {
  deleted.clear();
  renamed.clear();
}

void SentLines::Note(const QueueLine& line) {
  deleted.erase(line.path);
  if (!IsLook(line.event)) {
    renamed.erase(line.path);
  }
  if ((line.event & QLIB_NOTIFY_RENAME) != 0) {
    renamed.insert(line.path);
  } else if ((line.event & QLIB_NOTIFY_DELETE) != 0) {
    deleted.insert(line.path);
  }
}

QueueLine SentLines::WithDisplaced(const QueueLine& line) const {
  const bool is_update = line.event == QLIB_NOTIFY_MODIFY || line.event == QLIB_NOTIFY_ATTRIB;
  return is_update && renamed.contains(line.path)
             ? QueueLine{CUSTOM_EVENT_REINDEX, line.path, {}, {}}
             : line;
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

std::vector<std::string> QueuedDeletes(const std::string& share_name) {
  QueueFiles files;
  OpenQueueFiles(share_name, files);
  const LineReader reader;
  std::set<std::string, ByComponents> paths;
  for (const ScopedFd* file : {&files.drained, &files.queue}) {
    ForEachQueueLine(*file, [&](std::string_view text) {
      QueueLine line;
      if (reader.Read(text, line) && (line.event & QLIB_NOTIFY_DELETE) != 0) {
        paths.insert(std::move(line.path));
      }
    });
  }
  return {paths.begin(), paths.end()};
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
