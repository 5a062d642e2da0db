// SPDX-License-Identifier: GPL-2.0-or-later
// Many queue lines made few, without losing what any of them asks for.
//
// Collects lines by path. Where there are too many, the fullest directories become one reindex
// each, then the directories above them, in the end the root. A reindex takes in all that stands at
// and below its path. Memory is bounded by the number of lines, never by the number of additions.
// One thread.
#pragma once

#include <cstddef>
#include <cstdint>
#include <functional>
#include <map>
#include <set>
#include <string>
#include <string_view>
#include <unordered_map>
#include <vector>

namespace fileindexd {

// More lines are never in a queue file at once: a batch costs the square of their number.
constexpr size_t QUEUE_LINE_LIMIT = 5000;

struct QueueLine {
  uint32_t event = 0;
  std::string path;           // normal
  std::string data;           // JSON text, or empty
  std::string path_old = {};  // of a rename: the former path, normal
};

// Whether a line of that event has the daemon look at its path, and do no more. What looks at all
// that stands there now, like a reindex above it, does as much.
bool IsLook(uint32_t event);

// Byte order, except that '/' comes before every other byte: what lies below a path follows it at
// once.
struct ByComponents {
  bool operator()(std::string_view a, std::string_view b) const;
};

class QueueFolding {
 public:
  // How many entries the index holds below a directory; beyond `limit` it need not count on.
  using CountBelow = std::function<uint64_t(const std::string& directory, uint64_t limit)>;

  // `fold_root`: normal; the last reindex that everything can become. At most `lines_kept` lines
  // stay after a fold, and twice as many are held until the next.
  QueueFolding(std::string fold_root, CountBelow count_below, size_t lines_kept = QUEUE_LINE_LIMIT);
  QueueFolding(const QueueFolding&) = delete;
  QueueFolding& operator=(const QueueFolding&) = delete;

  // `path` is normal, at or below the root. Of two lines at one path the wider stays: a reindex,
  // then an update of a subtree; else the later one, but that a change of attributes does not
  // displace a write. Two such updates with different data become a reindex, and so do a write and
  // a modify behind it.
  void Add(uint32_t event, const std::string& path, const std::string& data = {});

  // A rename: one line at `path`, normal, with the former path, whatever stands below either. A
  // reindex that takes one of both in leaves a reindex of the other; where it takes in only the
  // former path of a line that stands already, the line may stay. Of a rename and another line at
  // its path the rename stays, unless that is a delete, a modify that came later, an update of a
  // subtree, or a rename from elsewhere; then a reindex of the former path is left.
  void AddRename(const std::string& path, const std::string& path_old);

  // Whether a reindex stands at or above the path.
  bool IsTakenIn(const std::string& path) const;

  // At most `most` lines, or one, sorted: by directory, and a directory's own line before those of
  // what it holds. Where more than 1,000 stand directly in one directory, and the index holds at
  // most ten times as many entries below it, it becomes one reindex.
  std::vector<QueueLine> Lines(size_t most);

  // Does the same for crowded directories alone. Costs a look at each directory that has lines.
  // `spared` is not folded: true if the looks directly in it are a crowd.
  bool FoldCrowded(const std::string& spared = {});

  // Takes out the looks at and below the directory.
  void DropLooks(const std::string& directory);

  // Takes out the first `most` lines in that order, and leaves the rest as it is.
  std::vector<QueueLine> Take(size_t most);

  size_t Size() const { return lines.size(); }
  size_t Bytes() const { return bytes; }  // of paths and data

 private:
  struct Line {
    uint32_t event = 0;
    std::string data;
    std::string path_old;
  };
  using LineMap = std::map<std::string, Line, ByComponents>;
  struct ByDirectory {
    bool operator()(LineMap::const_iterator a, LineMap::const_iterator b) const;
  };

  void Place(const std::string& path, Line line);
  void Erase(LineMap::iterator line);
  void AddAtRename(LineMap::iterator rename, uint32_t event, const std::string& data);
  void FoldUnlessTakenIn(const std::string& directory);
  void FoldIfTooMany();
  bool IsCrowd(const std::string& directory, size_t held) const;
  size_t LooksIn(const std::string& directory) const;
  std::vector<QueueLine> Copy(size_t most) const;
  void FoldInto(const std::string& directory);
  void FoldTo(size_t most);
  bool FoldFullest(size_t most);
  void LiftDeepest();
  bool HoldsDirectOnly(const std::string& directory) const;
  std::string FolderOf(const std::string& path) const;

  const std::string root;
  const CountBelow count;
  const size_t kept;
  LineMap lines;
  std::set<LineMap::iterator, ByDirectory> sorted;  // all lines, in the order of the queue
  std::unordered_map<std::string, size_t> direct;   // lines directly in a directory
  size_t bytes = 0;
};

}  // namespace fileindexd
