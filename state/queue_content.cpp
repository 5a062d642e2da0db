// SPDX-License-Identifier: GPL-2.0-or-later
#include "state/queue_content.h"

#include <json/json.h>

#include <exception>
#include <utility>

#include "base/event_codes.h"
#include "state/layout.h"
#include "state/queue_files.h"
#include "state/queue_folding.h"

namespace fileindexd {

QueueLineReader::QueueLineReader() {
  Json::CharReaderBuilder builder;
  builder["collectComments"] = false;
  reader.reset(builder.newCharReader());
}

QueueLineReader::~QueueLineReader() = default;

bool QueueLineReader::Read(std::string_view text, LineInFile& line) const {
  try {
    Json::Value value;
    if (!reader->parse(text.data(), text.data() + text.size(), &value, nullptr) ||
        !value.isObject() || !value.isMember("event") ||
        !value["event"].isConvertibleTo(Json::uintValue) || !value["path"].isString()) {
      return false;
    }
    const Json::Value old = value.get("path_old", "");
    line = {value["event"].asUInt(), value["path"].asString(),
            old.isString() ? old.asString() : std::string()};
    return true;
  } catch (const std::exception&) {  // nesting beyond the reader's limit: no event of ours
    return false;
  }
}

void WaitingUpdates::Note(uint32_t event, const std::string& path) {
  constexpr uint32_t RENAMES = QLIB_NOTIFY_RENAME | QLIB_NOTIFY_RENAME_FULL;
  if ((event & CUSTOM_EVENT_UPDATE) != 0 && (event & RENAMES) == 0) {
    paths.insert(path);
  }
}

std::string WaitingUpdates::PathInFile(uint32_t event, std::string path) const {
  while (event == CUSTOM_EVENT_REINDEX && paths.contains(path)) {
    path += '/';
  }
  return path;
}

QueueContent ReadQueueContent(const std::string& share_name) {
  QueueFiles files;
  OpenQueueFiles(share_name, files);
  const QueueLineReader reader;
  QueueContent queued;
  std::set<std::string, ByComponents> deletes;
  LineInFile line;
  const auto note_delete = [&] {
    auto path = NormalPath(line.path);
    if ((line.event & QLIB_NOTIFY_DELETE) != 0 && path.has_value()) {
      deletes.insert(std::move(*path));
    }
  };
  ForEachQueueLine(files.drained, [&](std::string_view text) {
    if (reader.Read(text, line)) {
      note_delete();
    }
  });
  ForEachQueueLine(files.queue, [&](std::string_view text) {
    ++queued.lines;
    if (reader.Read(text, line)) {
      queued.updates.Note(line.event, line.path);
      note_delete();
    }
  });
  queued.deletes.assign(deletes.begin(), deletes.end());
  return queued;
}

bool AppendEvent(const std::string& share_name, uint32_t event, const std::string& path,
                 const std::string& data, Durability durability, std::string& error) {
  const auto make = [&] {
    // Only a reindex may be named otherwise.
    const std::string named = event == CUSTOM_EVENT_REINDEX
                                  ? ReadQueueContent(share_name).updates.PathInFile(event, path)
                                  : path;
    return std::vector<std::string>{EventLine(event, named, std::nullopt, data)};
  };
  return AppendToQueue(share_name, make, durability, error);
}

}  // namespace fileindexd
