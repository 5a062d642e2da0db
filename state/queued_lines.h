// SPDX-License-Identifier: GPL-2.0-or-later
// What stands in a share's queue file and its drained copy, whoever wrote it, for whoever adds to
// it. Nobody is kept from writing meanwhile.
#pragma once

#include <cstdint>
#include <memory>
#include <set>
#include <string>
#include <string_view>
#include <vector>

namespace Json {
class CharReader;
}

namespace fileindexd {

// The paths as they stand in the line.
struct QueuedLine {
  uint32_t event = 0;
  std::string path;
  std::string path_old;  // empty: none
};

// One thread.
class QueuedLineReader {
 public:
  QueuedLineReader();
  ~QueuedLineReader();
  QueuedLineReader(const QueuedLineReader&) = delete;
  QueuedLineReader& operator=(const QueuedLineReader&) = delete;

  // False for what is no event.
  bool Read(std::string_view text, QueuedLine& line) const;

 private:
  std::unique_ptr<::Json::CharReader> reader;
};

// Updates of subtrees in one queue file. Such an update swallows a reindex of its path in the same
// batch, and does less: it neither drops what is gone below nor goes into a folder of its own.
class QueuedUpdates {
 public:
  void Forget() { paths.clear(); }
  void Note(uint32_t event, const std::string& path);
  bool Holds(const std::string& path) const { return paths.contains(path); }

  // How a reindex has to name the path. With a slash behind it the path names the same directory,
  // and the reindex is carried out after the update.
  std::string ReindexPath(std::string path) const;

 private:
  std::set<std::string> paths;  // as they stand in the file
};

struct Queued {
  size_t lines = 0;                  // of the queue file
  QueuedUpdates updates;             // of the queue file; its drained copy is a batch of its own
  std::vector<std::string> deletes;  // normal paths of delete lines in both, sorted
};
Queued ReadQueued(const std::string& share_name);

// Of a reindex line that is about to be appended to the share's queue file.
std::string ReindexPath(const std::string& share_name, const std::string& path);

}  // namespace fileindexd
