// SPDX-License-Identifier: GPL-2.0-or-later
// What stands in a share's queue file and its drained copy, whoever wrote it. Only who holds the
// queue's lock keeps others from adding to it meanwhile.
#pragma once

#include <cstdint>
#include <memory>
#include <set>
#include <string>
#include <string_view>
#include <vector>

#include "state/queue_folding.h"
#include "state/queue_writer.h"

namespace Json {
class CharReader;
}

namespace fileindexd {

// The paths as they stand in the line.
struct LineInFile {
  uint32_t event = 0;
  std::string path;
  std::string path_old;  // empty: none
};

// One thread.
class QueueLineReader {
 public:
  QueueLineReader();
  ~QueueLineReader();
  QueueLineReader(const QueueLineReader&) = delete;
  QueueLineReader& operator=(const QueueLineReader&) = delete;

  // False for what is no event.
  bool Read(std::string_view text, LineInFile& line) const;

 private:
  std::unique_ptr<::Json::CharReader> reader;
};

// Updates of subtrees in one queue file. Such an update swallows a reindex of its path in the same
// batch, and does less: it goes into no folder with settings of its own.
class WaitingUpdates {
 public:
  void Forget() { paths.clear(); }
  void Note(uint32_t event, const std::string& path);
  bool Holds(const std::string& path) const { return paths.contains(path); }

  // How a line of that event has to name the path: for a reindex, with a slash behind it where an
  // update waits. So it names the same directory, and is carried out after the update, unless a
  // delete or a reindex of the plain path follows in the file.
  std::string PathInFile(uint32_t event, std::string path) const;

 private:
  std::set<std::string> paths;  // as they stand in the file
};

struct QueueContent {
  size_t lines = 0;  // of the queue file
  // Of the queue file alone: its drained copy is a batch of its own.
  WaitingUpdates updates;
  std::set<std::string> reindexed;  // paths as they stand in the file
  // Of both: normal paths, sorted, whose last line is a delete.
  std::vector<std::string> deletes;

  // The uppermost directory at or above the path for which a reindex waits, or else the path.
  std::string ReindexedAbove(const std::string& path) const;

  // The texts of a line that is no rename. A reindex is named by what waits.
  //
  // A delete takes the entry away whatever the disk holds by then, and the daemon executes a batch
  // from the top of its tree downwards: a delete that was queued before the reindex of a directory
  // above it may be executed after it, and takes away what came back with that directory. A second
  // reindex of the same path drops all that was queued below it by names as they are usually
  // spelled. So there are two where one of `returned`, the normal paths of such deletes, sorted by
  // components, lies at or below the path.
  //
  // Where a reindex waits above, it holds those deletes, and passes over a reindex further down:
  // so it is the one that is queued again.
  std::vector<std::string> TextsOf(const QueueLine& line,
                                   const std::vector<std::string>& returned) const;
};
// Reads all of both: some 20 ms for as many lines as are queued at most.
QueueContent ReadQueueContent(const std::string& share_name);

// Appends the line of one event, as AppendToQueue; a reindex is named by what waits at that moment.
// A reindex, or an update of a subtree, comes with the lines that keep a delete from undoing it.
bool AppendEvent(const std::string& share_name, uint32_t event, const std::string& path,
                 const std::string& data, Durability durability, std::string& error);

}  // namespace fileindexd
