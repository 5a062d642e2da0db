// SPDX-License-Identifier: GPL-2.0-or-later
#include "ctl/pending.h"

#include <json/reader.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <exception>
#include <memory>
#include <string_view>

#include "base/scoped_fd.h"
#include "state/event_codes.h"
#include "state/layout.h"
#include "state/progress.h"
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

class LineReader {
 public:
  LineReader(const std::string& of_path, Pending& found) : path(of_path), pending(found) {
    Json::CharReaderBuilder builder;
    builder["collectComments"] = false;
    reader.reset(builder.newCharReader());
  }

  void Read(std::string_view line, bool begun) {
    try {
      Json::Value value;
      if (!reader->parse(line.data(), line.data() + line.size(), &value, nullptr) ||
          !value.isObject() || !value["event"].isUInt() || !value["path"].isString()) {
        return;
      }
      const Json::Value old = value.get("path_old", "");
      Add({.event = EventNames(value["event"].asUInt()),
           .path = value["path"].asString(),
           .path_old = old.isString() ? old.asString() : "",
           .above = false,
           .begun = begun});
    } catch (const std::exception&) {  // nesting beyond the reader's limit: no event of ours
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
  std::unique_ptr<Json::CharReader> reader;
};

}  // namespace

Pending ReadPending(const std::string& share_name, const std::string& path) {
  QueueFiles files;
  OpenQueueFiles(share_name, files);
  Pending pending;
  LineReader reader(path, pending);
  ForEachQueueLine(files.drained, [&](std::string_view line) { reader.Read(line, true); });
  ForEachQueueLine(files.queue, [&](std::string_view line) { reader.Read(line, false); });
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

}  // namespace fileindexd
