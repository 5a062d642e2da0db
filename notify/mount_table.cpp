// SPDX-License-Identifier: GPL-2.0-or-later
//
//   line = id " " parent " " device " " root " " point " " options { " " tag } " - "
//          type " " source " " options
//
// Blanks, tabs, newlines and backslashes in a field are written as "\" and three octal digits. A
// field may be empty.
#include "notify/mount_table.h"

#include <fcntl.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <charconv>
#include <iterator>
#include <optional>
#include <unordered_set>

#include "base/scoped_fd.h"
#include "state/layout.h"

namespace fileindexd {

namespace {

bool ReadAll(const char* path, std::string& text) {
  const ScopedFd file(open(path, O_RDONLY | O_CLOEXEC));
  if (file.fd < 0) {
    return false;
  }
  std::string all;
  std::vector<char> buffer(65536);
  for (;;) {
    const ssize_t got = read(file.fd, buffer.data(), buffer.size());
    if (got < 0 && errno != EINTR) {
      return false;
    }
    if (got == 0) {
      text.swap(all);
      return true;
    }
    if (got > 0) {
      all.append(buffer.data(), static_cast<size_t>(got));
    }
  }
}

bool IsOctal(char digit) {
  return digit >= '0' && digit <= '7';
}

std::string Unescaped(std::string_view field) {
  std::string plain;
  plain.reserve(field.size());
  for (size_t i = 0; i < field.size(); ++i) {
    if (field[i] == '\\' && i + 3 < field.size() && IsOctal(field[i + 1]) &&
        IsOctal(field[i + 2]) && IsOctal(field[i + 3])) {
      plain += static_cast<char>((field[i + 1] - '0') * 64 + (field[i + 2] - '0') * 8 +
                                 (field[i + 3] - '0'));
      i += 3;
    } else {
      plain += field[i];
    }
  }
  return plain;
}

std::string_view TakeUntil(std::string_view& rest, char end) {
  const size_t length = rest.find(end);
  const std::string_view taken = rest.substr(0, length);
  rest.remove_prefix(length == std::string_view::npos ? rest.size() : length + 1);
  return taken;
}

bool ToNumber(std::string_view digits, uint64_t& number) {
  const auto [end, failure] = std::from_chars(digits.data(), digits.data() + digits.size(), number);
  return failure == std::errc() && end == digits.data() + digits.size();
}

std::optional<Mount> Parsed(std::string_view line) {
  constexpr std::string_view SEPARATOR = " - ";
  const size_t middle = line.find(SEPARATOR);
  if (middle == std::string_view::npos) {
    return std::nullopt;
  }
  std::string_view front = line.substr(0, middle);
  std::string_view back = line.substr(middle + SEPARATOR.size());

  Mount mount;
  if (!ToNumber(TakeUntil(front, ' '), mount.id) ||
      !ToNumber(TakeUntil(front, ' '), mount.parent)) {
    return std::nullopt;
  }
  mount.device = TakeUntil(front, ' ');
  mount.root = Unescaped(TakeUntil(front, ' '));
  mount.point = Unescaped(TakeUntil(front, ' '));
  mount.type = Unescaped(TakeUntil(back, ' '));
  mount.source = Unescaped(TakeUntil(back, ' '));
  return mount;
}

}  // namespace

bool MountTable::Read() {
  std::string text;
  if (!ReadAll("/proc/self/mountinfo", text)) {
    return false;
  }

  std::vector<Mount> read;
  std::string_view rest = text;
  while (!rest.empty()) {
    auto mount = Parsed(TakeUntil(rest, '\n'));
    if (mount.has_value()) {
      read.push_back(std::move(*mount));
    }
  }
  mounts.swap(read);
  return true;
}

// Goes down as the kernel does when it walks the path: from each mount to the first mount on the
// way. A mount below that point hangs on a mount that is hidden, and is not met.
const Mount* MountTable::MountOf(std::string_view path) const {
  std::unordered_set<uint64_t> known;
  for (const Mount& mount : mounts) {
    known.insert(mount.id);
  }

  const Mount* at = nullptr;
  // Each step goes to another mount; the bound is for a table that is not a tree.
  for (size_t steps = 0; steps <= mounts.size(); ++steps) {
    const Mount* next = nullptr;
    for (const Mount& mount : mounts) {
      // In a changed root the topmost mounts hang on some that are not in the table.
      const bool topmost = mount.parent == mount.id || !known.contains(mount.parent);
      const bool hangs_here = at == nullptr ? topmost : !topmost && mount.parent == at->id;
      if (hangs_here && Covers(mount.point, path) &&
          (next == nullptr || mount.point.size() <= next->point.size())) {
        next = &mount;
      }
    }
    if (next == nullptr) {
      break;
    }
    at = next;
  }
  return at;
}

std::string MountTable::PathWithin(const Mount& mount, std::string_view path) {
  std::string_view below = path;
  below.remove_prefix(mount.point == "/" ? 0 : std::min(mount.point.size(), path.size()));
  if (below.empty() || below == "/") {
    return mount.root;
  }
  return mount.root == "/" ? std::string(below) : mount.root + std::string(below);
}

std::vector<std::string> MountTable::PointsBelow(std::string_view path) const {
  std::vector<std::string> points;
  for (const Mount& mount : mounts) {
    if (Covers(path, mount.point)) {
      points.push_back(mount.point);
    }
  }
  std::sort(points.begin(), points.end());
  points.erase(std::unique(points.begin(), points.end()), points.end());
  return points;
}

bool IsChangedElsewhere(std::string_view type) {
  constexpr std::string_view SHARED[] = {
      "9p",     "afs",   "beegfs", "ceph", "cifs",  "coda",     "fuse", "gfs2",   "gpfs",
      "lustre", "ncpfs", "nfs",    "nfs4", "ocfs2", "orangefs", "smb3", "vboxsf", "virtiofs"};
  return std::find(std::begin(SHARED), std::end(SHARED), type) != std::end(SHARED) ||
         type.starts_with("fuse.");
}

std::string PathBelow(const std::string& root, std::string_view below) {
  if (below.empty()) {
    return root;
  }
  return (root == "/" ? root : root + '/') + std::string(below);
}

}  // namespace fileindexd
