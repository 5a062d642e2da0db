// SPDX-License-Identifier: GPL-2.0-or-later
#include "notify/sent_deletes.h"

#include <json/json.h>

#include <exception>
#include <memory>
#include <string_view>

#include "base/event_codes.h"
#include "notify/change.h"
#include "notify/look_lines.h"
#include "state/belonging.h"
#include "state/layout.h"
#include "state/queue_files.h"

namespace fileindexd {

namespace {

// The path of a delete line; empty for all others.
std::string DeletedPath(Json::CharReader& reader, std::string_view line) {
  constexpr std::string_view SIGN = "\"event\"";
  if (line.find(SIGN) == std::string_view::npos) {
    return {};
  }
  try {
    Json::Value value;
    if (!reader.parse(line.data(), line.data() + line.size(), &value, nullptr) ||
        !value.isObject() || !value["event"].isUInt() || !value["path"].isString() ||
        (value["event"].asUInt() & QLIB_NOTIFY_DELETE) == 0) {
      return {};
    }
    return value["path"].asString();
  } catch (const std::exception&) {  // nesting beyond the reader's limit: no event of ours
    return {};
  }
}

}  // namespace

void SentDeletes::Note(const QueueLine& line) {
  if (line.event == QLIB_NOTIFY_DELETE) {
    paths.insert(line.path);
  } else {
    paths.erase(line.path);
  }
}

std::vector<QueueLine> SentDeletes::LinesBehind(const Settings& settings,
                                                const QueueLine& line) const {
  std::vector<std::string> below;
  if (line.event == CUSTOM_EVENT_REINDEX || line.event == QLIB_NOTIFY_RENAME) {
    auto path = paths.upper_bound(line.path);
    for (; path != paths.end() && Covers(line.path, *path); ++path) {
      below.push_back(*path);
    }
  }
  return LinesOfReturned(settings, below);
}

std::vector<std::string> QueuedDeletes(const std::string& share_name) {
  QueueFiles files;
  OpenQueueFiles(share_name, files);
  Json::CharReaderBuilder builder;
  builder["collectComments"] = false;
  const std::unique_ptr<Json::CharReader> reader(builder.newCharReader());

  std::set<std::string, ByComponents> paths;
  for (const ScopedFd* file : {&files.drained, &files.queue}) {
    ForEachQueueLine(*file, [&](std::string_view line) {
      std::string path = DeletedPath(*reader, line);
      if (!path.empty()) {
        paths.insert(std::move(path));
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
