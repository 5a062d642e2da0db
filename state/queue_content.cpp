// SPDX-License-Identifier: GPL-2.0-or-later
#include "state/queue_content.h"

#include <json/json.h>

#include <algorithm>
#include <exception>
#include <iterator>
#include <utility>

#include "base/event_codes.h"
#include "state/belonging.h"
#include "state/layout.h"
#include "state/queue_files.h"

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

std::string QueueContent::TextOf(const QueueLine& line) const {
  return EventLine(line.event, updates.PathInFile(line.event, line.path), std::nullopt, line.data);
}

// A reindex removes what is gone by then, which an add passes over. Of what nobody can look at the
// daemon shall keep the entry.
std::vector<QueueLine> LinesOfReturned(const Settings& settings,
                                       const std::vector<std::string>& deletes) {
  std::vector<QueueLine> lines;
  FolderView folder;
  for (const std::string& path : deletes) {
    const Verdict verdict = LookNear(settings, path, folder).verdict;
    if (verdict == Verdict::BELONGS) {
      lines.push_back({CUSTOM_EVENT_REINDEX, path, {}, {}});
    } else if (verdict == Verdict::UNKNOWN) {
      lines.push_back({QLIB_NOTIFY_MODIFY, path, {}, {}});
    }
  }
  return lines;
}

bool AppendEvent(const Settings& settings, const std::string& share_name, uint32_t event,
                 const std::string& path, const std::string& data, Durability durability,
                 std::string& error) {
  const auto make = [&] {
    // Of no other event the content of the queue matters.
    const QueueContent queued =
        event == CUSTOM_EVENT_REINDEX ? ReadQueueContent(share_name) : QueueContent{};
    const std::string directory = NormalPath(path).value_or(path);
    std::vector<std::string> below;
    std::ranges::copy_if(queued.deletes, std::back_inserter(below), [&](const auto& deleted) {
      return deleted != directory && Covers(directory, deleted);
    });
    std::vector<std::string> lines = {queued.TextOf({event, path, data, {}})};
    for (const QueueLine& line : LinesOfReturned(settings, below)) {
      lines.push_back(queued.TextOf(line));
    }
    return lines;
  };
  return AppendToQueue(share_name, make, durability, error);
}

}  // namespace fileindexd
