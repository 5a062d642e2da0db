// SPDX-License-Identifier: GPL-2.0-or-later
#include "state/queue_content.h"

#include <json/json.h>
#include <sys/stat.h>

#include <algorithm>
#include <cerrno>
#include <exception>
#include <iterator>
#include <utility>

#include "base/event_codes.h"
#include "state/layout.h"
#include "state/queue_files.h"

namespace fileindexd {

namespace {

// What a line has the daemon reindex, or empty. Of a rename it is the former path.
std::string ReindexedBy(const LineInFile& line) {
  if ((line.event & QLIB_NOTIFY_RENAME) != 0) {
    return line.path_old;
  }
  constexpr uint32_t DECISIVE =
      QLIB_NOTIFY_RENAME_FULL | CUSTOM_EVENT_REINDEX | CUSTOM_EVENT_UPDATE;
  return (line.event & DECISIVE) == CUSTOM_EVENT_REINDEX ? line.path : std::string();
}

// Whether one of the paths, sorted by components, lies at or below the directory.
bool IsOneBelow(const std::vector<std::string>& paths, const std::string& directory) {
  const auto first = std::ranges::lower_bound(paths, directory, ByComponents());
  return first != paths.end() && Covers(directory, *first);
}

// What may be there again at or below the directory though it is deleted by what waits.
std::vector<std::string> ReturnedBelow(const std::string& directory,
                                       const std::string& share_name) {
  const std::string normal = NormalPath(directory).value_or(directory);
  std::vector<std::string> deletes = ReadQueueContent(share_name).deletes;
  std::erase_if(deletes, [&normal](const std::string& path) {
    struct stat status {};
    return !Covers(normal, path) ||
           (lstat(path.c_str(), &status) != 0 && (errno == ENOENT || errno == ENOTDIR));
  });
  return deletes;
}

}  // namespace

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
  const auto note = [&] {
    auto path = NormalPath(line.path);
    if (path.has_value() && (line.event & QLIB_NOTIFY_DELETE) != 0) {
      deletes.insert(std::move(*path));
    } else if (path.has_value()) {
      deletes.erase(*path);
    }
  };
  ForEachQueueLine(files.drained, [&](std::string_view text) {
    if (reader.Read(text, line)) {
      note();
    }
  });
  ForEachQueueLine(files.queue, [&](std::string_view text) {
    ++queued.lines;
    if (reader.Read(text, line)) {
      queued.updates.Note(line.event, line.path);
      if (std::string path = ReindexedBy(line); !path.empty()) {
        queued.reindexed.insert(std::move(path));
      }
      note();
    }
  });
  queued.deletes.assign(deletes.begin(), deletes.end());
  return queued;
}

std::string QueueContent::ReindexedAbove(const std::string& path) const {
  for (size_t end = path.find('/', 1); end != std::string::npos; end = path.find('/', end + 1)) {
    std::string above = path.substr(0, end);
    if (reindexed.contains(above)) {
      return above;
    }
  }
  return path;
}

std::vector<std::string> QueueContent::TextsOf(const QueueLine& line,
                                               const std::vector<std::string>& returned) const {
  std::vector<std::string> texts;
  const auto put = [&](const std::string& path) {
    texts.push_back(EventLine(line.event, path, std::nullopt, line.data));
  };
  if (line.event != CUSTOM_EVENT_REINDEX ||
      !IsOneBelow(returned, NormalPath(line.path).value_or(line.path))) {
    put(updates.PathInFile(line.event, line.path));
    return texts;
  }

  const std::string path = ReindexedAbove(line.path);
  const std::string in_file = updates.PathInFile(line.event, path);
  put(path);
  if (in_file != path) {
    // A later line may have dropped the update: then the first is new, and keeps what lies below.
    put(path);
  }
  put(in_file);
  return texts;
}

bool AppendEvent(const std::string& share_name, uint32_t event, const std::string& path,
                 const std::string& data, Durability durability, std::string& error) {
  // Of no other event the content of the queue matters. The disk, which may be slow, is looked at
  // before others have to wait for the lock.
  const bool is_walk = event == CUSTOM_EVENT_REINDEX || event == CUSTOM_EVENT_UPDATE;
  const std::vector<std::string> returned =
      is_walk ? ReturnedBelow(path, share_name) : std::vector<std::string>{};
  const auto make = [&] {
    const bool is_reindex = event == CUSTOM_EVENT_REINDEX;
    std::vector<std::string> texts;
    if (!is_reindex) {
      texts.push_back(EventLine(event, path, std::nullopt, data));
    }
    if (is_reindex || !returned.empty()) {
      QueueContent queued = ReadQueueContent(share_name);
      queued.updates.Note(event, path);
      std::ranges::move(
          queued.TextsOf({CUSTOM_EVENT_REINDEX, path, is_reindex ? data : "", {}}, returned),
          std::back_inserter(texts));
    }
    return texts;
  };
  return AppendToQueue(share_name, make, durability, error);
}

}  // namespace fileindexd
