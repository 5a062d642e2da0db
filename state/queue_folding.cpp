// SPDX-License-Identifier: GPL-2.0-or-later
//
// DESIGN. Lines stand in one ordered map, a directory's own before all that lies below it, so that
// what a reindex takes in is one range of it. A fold works from below: only a directory whose lines
// all stand directly in it is folded, the fullest first. Its reindex is then a line in the
// directory above, which may be folded in turn. Where no directory holds two lines, the deepest
// lines are lifted into reindexes of their directories, until some meet.
// The order of the queue is another one, kept beside: taking the first lines of many, again and
// again, sorts nothing.
#include "state/queue_folding.h"

#include <algorithm>
#include <cstring>
#include <queue>
#include <tuple>
#include <utility>

#include "base/event_codes.h"
#include "state/layout.h"

namespace fileindexd {

namespace {

constexpr size_t CROWD = 1000;        // lines directly in one directory
constexpr uint64_t CROWD_SHARE = 10;  // entries looked at for each line that is saved

// Reindex and update of a subtree say more than any other event.
bool IsReindex(uint32_t event) {
  return (event & CUSTOM_EVENT_REINDEX) != 0 && (event & CUSTOM_EVENT_UPDATE) == 0;
}
// Has the file's content read anew, whatever its attributes tell.
bool IsWrite(uint32_t event) {
  return event == QLIB_NOTIFY_CLOSE_WRITE || event == QLIB_NOTIFY_CREATE;
}
bool IsUpdateOfAll(uint32_t event) {
  return (event & CUSTOM_EVENT_UPDATE) != 0;
}

std::string_view ParentOf(std::string_view path) {
  const size_t slash = path.rfind('/');
  return slash == 0 ? path.substr(0, 1) : path.substr(0, slash);
}

}  // namespace

bool IsLook(uint32_t event) {
  constexpr uint32_t LOOKS =
      QLIB_NOTIFY_MODIFY | QLIB_NOTIFY_ATTRIB | QLIB_NOTIFY_CLOSE_WRITE | QLIB_NOTIFY_CREATE;
  return (event & ~LOOKS) == 0;
}

bool ByComponents::operator()(std::string_view a, std::string_view b) const {
  const size_t shared = std::min(a.size(), b.size());
  const auto [at_a, at_b] = std::mismatch(a.begin(), a.begin() + shared, b.begin());
  if (at_a == a.begin() + shared) {
    return a.size() < b.size();
  }
  if (*at_a == '/' || *at_b == '/') {
    return *at_a == '/';
  }
  return static_cast<unsigned char>(*at_a) < static_cast<unsigned char>(*at_b);
}

// Lines of one directory stand in the order of their paths.
bool QueueFolding::ByDirectory::operator()(LineMap::const_iterator a,
                                           LineMap::const_iterator b) const {
  const std::string_view folder_a = ParentOf(a->first);
  const std::string_view folder_b = ParentOf(b->first);
  return folder_a == folder_b ? ByComponents()(a->first, b->first)
                              : ByComponents()(folder_a, folder_b);
}

QueueFolding::QueueFolding(std::string fold_root, CountBelow count_below, size_t lines_kept)
    : root(std::move(fold_root)), count(std::move(count_below)), kept(lines_kept) {}

// The directory that may be reindexed in place of a line; none for the root's own.
std::string QueueFolding::FolderOf(const std::string& path) const {
  return path == root ? std::string() : std::string(ParentOf(path));
}

bool QueueFolding::IsTakenIn(const std::string& path) const {
  // Nothing stands below a reindex, so the one that takes the path in would be its neighbour.
  auto next = lines.upper_bound(path);
  if (next == lines.begin()) {
    return false;
  }
  --next;
  return IsReindex(next->second.event) && Covers(next->first, path);
}

void QueueFolding::Add(uint32_t event, const std::string& path, const std::string& data) {
  if (IsTakenIn(path)) {
    return;
  }
  const auto at = lines.find(path);
  const uint32_t before = at == lines.end() ? 0 : at->second.event;
  const bool are_two_updates =
      IsUpdateOfAll(before) && IsUpdateOfAll(event) && at->second.data != data;
  // The file is to be read anew if it is there, and it may be gone.
  const bool is_modified_again = IsWrite(before) && event == QLIB_NOTIFY_MODIFY;
  if (IsReindex(event) || are_two_updates || is_modified_again) {
    FoldInto(path);
  } else if (before == QLIB_NOTIFY_RENAME) {
    AddAtRename(at, event, data);
  } else if (!IsUpdateOfAll(before) && !(IsWrite(before) && event == QLIB_NOTIFY_ATTRIB)) {
    Place(path, {event, data, {}});
  }
  FoldIfTooMany();
}

void QueueFolding::AddAtRename(LineMap::iterator rename, uint32_t event, const std::string& data) {
  // The thing is gone again, and the daemon would look only at where it came from.
  if (event == QLIB_NOTIFY_DELETE) {
    const QueueLine was{0, rename->first, {}, rename->second.path_old};
    Place(was.path, {event, data, {}});
    FoldUnlessTakenIn(was.path_old);
  } else if (IsUpdateOfAll(event) || event == QLIB_NOTIFY_MODIFY) {
    // A modify may be about what is gone, as a comparison found it: a rename passes over that.
    FoldInto(std::string(rename->first));
  }
}

void QueueFolding::AddRename(const std::string& path, const std::string& path_old) {
  if (IsTakenIn(path)) {
    FoldUnlessTakenIn(path_old);
  } else if (IsTakenIn(path_old)) {
    FoldInto(path);
  } else {
    const auto at = lines.find(path);
    const Line before = at == lines.end() ? Line{} : at->second;
    if (IsUpdateOfAll(before.event)) {
      FoldInto(path);
      FoldUnlessTakenIn(path_old);
    } else {
      Place(path, {QLIB_NOTIFY_RENAME, {}, path_old});
      if (before.event == QLIB_NOTIFY_RENAME && before.path_old != path_old) {
        FoldUnlessTakenIn(before.path_old);
      }
    }
  }
  FoldIfTooMany();
}

void QueueFolding::FoldIfTooMany() {
  if (lines.size() > 2 * kept) {
    FoldCrowded();
    FoldTo(kept);
  }
}

void QueueFolding::Place(const std::string& path, Line line) {
  const auto [at, is_new] = lines.try_emplace(path);
  if (is_new) {
    ++direct[FolderOf(path)];
    sorted.insert(at);
    bytes += path.size();
  }
  bytes += line.data.size() + line.path_old.size();
  bytes -= at->second.data.size() + at->second.path_old.size();
  at->second = std::move(line);
}

void QueueFolding::Erase(LineMap::iterator line) {
  const auto held = direct.find(FolderOf(line->first));
  if (--held->second == 0) {
    direct.erase(held);
  }
  bytes -= line->first.size() + line->second.data.size() + line->second.path_old.size();
  sorted.erase(line);
  lines.erase(line);
}

void QueueFolding::FoldUnlessTakenIn(const std::string& directory) {
  if (!IsTakenIn(directory)) {
    FoldInto(directory);
  }
}

void QueueFolding::FoldInto(const std::string& directory) {
  // Renames that end here may have begun elsewhere, where others have ended: each is one line less,
  // so this comes to its end.
  std::vector<std::string> left{directory};
  while (!left.empty()) {
    const std::string folded = std::move(left.back());
    left.pop_back();
    if (IsTakenIn(folded)) {
      continue;
    }
    auto line = lines.lower_bound(folded);
    while (line != lines.end() && Covers(folded, line->first)) {
      if (line->second.event == QLIB_NOTIFY_RENAME && !Covers(folded, line->second.path_old)) {
        left.push_back(line->second.path_old);
      }
      Erase(line++);
    }
    Place(folded, {CUSTOM_EVENT_REINDEX, {}, {}});
  }
}

bool QueueFolding::IsCrowd(const std::string& directory, size_t held) const {
  const uint64_t most = CROWD_SHARE * held;
  return held > CROWD && count(directory, most + 1) <= most;
}

size_t QueueFolding::LooksIn(const std::string& directory) const {
  size_t looks = 0;
  auto line = lines.upper_bound(directory);
  for (; line != lines.end() && Covers(directory, line->first); ++line) {
    looks += IsLook(line->second.event) && ParentOf(line->first) == directory ? 1 : 0;
  }
  return looks;
}

bool QueueFolding::FoldCrowded(const std::string& spared) {
  std::vector<std::string> crowded;
  for (const auto& [directory, held] : direct) {
    if (held > CROWD && !directory.empty() && directory != spared) {
      crowded.push_back(directory);
    }
  }
  for (const std::string& directory : crowded) {
    const auto held = direct.find(directory);  // one above may have been folded meanwhile
    if (held != direct.end() && IsCrowd(directory, held->second)) {
      FoldInto(directory);
    }
  }
  return direct.contains(spared) && IsCrowd(spared, LooksIn(spared));
}

void QueueFolding::DropLooks(const std::string& directory) {
  auto line = lines.lower_bound(directory);
  while (line != lines.end() && Covers(directory, line->first)) {
    const auto at = line++;
    if (IsLook(at->second.event)) {
      Erase(at);
    }
  }
}

void QueueFolding::FoldTo(size_t most) {
  while (lines.size() > std::max<size_t>(most, 1)) {
    if (!FoldFullest(most)) {
      LiftDeepest();
    }
  }
}

bool QueueFolding::HoldsDirectOnly(const std::string& directory) const {
  auto line = lines.upper_bound(directory);
  for (; line != lines.end() && Covers(directory, line->first); ++line) {
    if (ParentOf(line->first) != directory) {
      return false;
    }
  }
  return true;
}

// False when it ended with too many lines still.
bool QueueFolding::FoldFullest(size_t most) {
  std::priority_queue<std::pair<size_t, std::string>> fullest;
  for (const auto& [directory, held] : direct) {
    if (held > 1 && !directory.empty()) {
      fullest.emplace(held, directory);
    }
  }

  while (lines.size() > most && !fullest.empty()) {
    const auto [held, directory] = fullest.top();
    fullest.pop();
    const auto now = direct.find(directory);
    if (now == direct.end() || now->second != held || !HoldsDirectOnly(directory)) {
      continue;  // told anew when it changed, or when what lies deeper in it was folded
    }
    FoldInto(directory);
    const std::string above = FolderOf(directory);
    if (!above.empty() && direct[above] > 1) {
      fullest.emplace(direct[above], above);
    }
  }
  return lines.size() <= most;
}

void QueueFolding::LiftDeepest() {
  const auto depth = [](const std::string& path) {
    return std::count(path.begin(), path.end(), '/');
  };
  std::ptrdiff_t deepest = 0;
  for (const auto& [path, line] : lines) {
    deepest = std::max(deepest, depth(path));
  }

  std::vector<std::string> folders;
  for (const auto& [path, line] : lines) {
    const std::string folder = FolderOf(path);
    if (depth(path) == deepest && !folder.empty()) {
      folders.push_back(folder);
    }
  }
  for (const std::string& folder : folders) {
    if (!IsTakenIn(folder)) {
      FoldInto(folder);
    }
  }
}

std::vector<QueueLine> QueueFolding::Lines(size_t most) {
  FoldCrowded();
  FoldTo(most);

  return Copy(lines.size());
}

std::vector<QueueLine> QueueFolding::Copy(size_t most) const {
  std::vector<QueueLine> copied;
  copied.reserve(std::min(most, sorted.size()));
  for (auto line = sorted.begin(); line != sorted.end() && copied.size() < most; ++line) {
    const auto& [path, asked] = **line;
    copied.push_back({asked.event, path, asked.data, asked.path_old});
  }
  return copied;
}

std::vector<QueueLine> QueueFolding::Take(size_t most) {
  std::vector<QueueLine> taken = Copy(most);
  for (size_t i = 0; i < taken.size(); ++i) {
    Erase(*sorted.begin());
  }
  return taken;
}

}  // namespace fileindexd
