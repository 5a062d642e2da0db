// SPDX-License-Identifier: GPL-2.0-or-later
#include "index/disk_walk.h"

#include <dirent.h>

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <utility>

#include "state/filesystem.h"
#include "state/layout.h"

namespace fileindexd {

namespace {

constexpr size_t LOOKS_AHEAD = 64;
constexpr size_t READ_BUFFER = 32768;

bool IsDots(const char* name) {
  return strcmp(name, ".") == 0 || strcmp(name, "..") == 0;
}

std::string ParentOf(const std::string& path) {
  const size_t slash = path.rfind('/');
  return slash == 0 ? "/" : path.substr(0, slash);
}

}  // namespace

void DiskWalk::AddItem(Level& level, std::string_view name, bool below) {
  const auto offset = static_cast<uint32_t>(level.names.size());
  const auto length = static_cast<uint16_t>(name.size());
  level.names.append(name).push_back('\0');
  level.items.push_back({offset, length, false, false});
  if (below) {
    level.items.push_back({offset, length, true, false});
  }
}

void DiskWalk::Sort(Level& level) {
  const char* names = level.names.data();
  // Behind each name stands a NUL, which no name holds; what it holds has a '/' there.
  std::sort(level.items.begin(), level.items.end(), [names](const Item& a, const Item& b) {
    const size_t shared = std::min(a.length, b.length);
    const int order = memcmp(names + a.offset, names + b.offset, shared);
    if (order != 0) {
      return order < 0;
    }
    const auto after = [&](const Item& item) {
      const char next = names[item.offset + shared];
      return static_cast<unsigned char>(item.length == shared && item.below ? '/' : next);
    };
    return after(a) < after(b) || (after(a) == after(b) && a.length < b.length);
  });
}

std::string_view DiskWalk::NameOf(const Level& level, const Item& item) {
  return {level.names.data() + item.offset, item.length};
}

void DiskWalk::SetPath(const Level& level, const Item& item, std::string& path) {
  path = level.directory;
  if (!path.empty() && path.back() != '/') {
    path += '/';
  }
  path += NameOf(level, item);
}

void DiskWalk::StartAtFolders(const Share& share, std::string passed) {
  Level level;
  for (const IndexedFolder& of_share : settings.folders) {
    // Folders come in byte order, where "/s/a!b" may stand between "/s/a" and "/s/a/b": whether
    // another folder covers this one is asked of its parent.
    const std::string& path = of_share.path;
    const bool covered = path != "/" && settings.FolderOfPath(ParentOf(path)) != nullptr;
    if (of_share.share == share.name && !covered) {
      AddItem(level, path, true);
    }
  }
  Sort(level);
  levels.clear();
  levels.push_back(std::move(level));
  passed_path = std::move(passed);
}

void DiskWalk::StartBelow(const std::string& directory) {
  levels.clear();
  passed_path.clear();
  const Look look = LookAt(settings, directory);
  if (look.verdict == Verdict::BELONGS && look.thing == Thing::DIRECTORY) {
    Level level;
    AddItem(level, directory, true);
    Sort(level);
    level.next = 1;  // the directory itself is not among what it holds
    AllowDescent(level, look, directory);
    levels.push_back(std::move(level));
  }
}

// Whether nothing at or below the path comes after the passed one.
bool DiskWalk::IsPassed(const std::string& path) const {
  return path <= passed_path && !MayHoldUnpassed(path);
}

bool DiskWalk::MayHoldUnpassed(const std::string& path) const {
  return passed_path.starts_with(path) &&
         (passed_path.size() == path.size() ||
          static_cast<unsigned char>(passed_path[path.size()]) <= '/');
}

DiskWalk::Step DiskWalk::Next(std::string& path, Look& look) {
  while (!levels.empty()) {
    Level& level = levels.back();
    if (level.next == level.items.size()) {
      levels.pop_back();
      continue;
    }

    const Item item = level.items[level.next++];
    SetPath(level, item, path);
    if (item.below) {
      if (item.descend && !(!passed_path.empty() && IsPassed(path)) && !Enter(path)) {
        return Step::FAILED;
      }
      continue;
    }
    const bool passed = !passed_path.empty() && path <= passed_path;
    if (passed && !MayHoldUnpassed(path)) {
      continue;
    }

    const Step step = TakeName(level, path, look);
    if (step == Step::FAILED) {
      return step;
    }
    if (step == Step::END) {
      continue;
    }
    // A folder below it is indexed all the same; this one and what else it holds is not.
    const bool only_passage = look.verdict == Verdict::EXCLUDED && settings.HasFolderBelow(path);
    if (only_passage) {
      look = LookPastExcludes(settings, path);
      if (look.verdict == Verdict::UNKNOWN) {
        return Step::FAILED;
      }
    }
    if (look.verdict != Verdict::BELONGS) {
      continue;
    }
    if (look.thing == Thing::DIRECTORY) {
      AllowDescent(level, look, path);
    }
    if (!passed && !only_passage) {
      passed_path.clear();
      folder = settings.FolderAt(path);
      folder = folder != nullptr ? folder : level.folder;
      return Step::FOUND;
    }
  }
  return Step::END;
}

// END: its directory is gone, with all that was to come from it.
DiskWalk::Step DiskWalk::TakeName(Level& level, std::string& path, Look& look) {
  if (level.directory.empty() || !passed_path.empty()) {
    look = LookAt(settings, path);
    return look.verdict == Verdict::UNKNOWN ? Step::FAILED : Step::FOUND;
  }

  if (level.next_look == level.looks.size()) {
    --level.next;
    const Reading reading = LookAheadAgain(level);
    if (reading != Reading::DONE) {
      level.next = level.items.size();
      path = level.directory;
      return reading == Reading::FAILED ? Step::FAILED : Step::END;
    }
    ++level.next;
  }
  look = level.looks[level.next_look++];
  if (look.verdict == Verdict::UNKNOWN) {
    look = LookAt(settings, path);  // with the errno of now
  }
  return look.verdict == Verdict::UNKNOWN ? Step::FAILED : Step::FOUND;
}

DiskWalk::Reading DiskWalk::LookAheadAgain(Level& level) {
  JudgedDirectory directory;
  const Verdict verdict = OpenJudged(settings, level.directory, mount_id, directory);
  if (verdict != Verdict::BELONGS) {
    return verdict == Verdict::UNKNOWN ? Reading::FAILED : Reading::NOTHING;
  }
  return LookAhead(level, directory);
}

DiskWalk::Reading DiskWalk::LookAhead(Level& level, const JudgedDirectory& directory) {
  level.looks.clear();
  level.next_look = 0;
  for (size_t i = level.next; i < level.items.size() && level.looks.size() < LOOKS_AHEAD; ++i) {
    if (level.items[i].below) {
      continue;
    }
    SetPath(level, level.items[i], name_path);
    level.looks.push_back(LookAtIn(settings, directory, name_path, NameOf(level, level.items[i])));
  }
  return Reading::DONE;
}

// Nothing below a nested mount point belongs, so it is not even read.
void DiskWalk::AllowDescent(Level& level, const Look& look, const std::string& path) {
  if (level.directory.empty()) {
    const Share* share = settings.ShareOfPath(path);
    if (share != nullptr && path != share->path && IsMountPoint(path) == 1) {
      return;
    }
    mount_id = look.mount_id;
  } else if (look.mount_id != mount_id) {
    return;
  }

  // It stands behind its own name, and names that sort before '/' may stand between.
  const std::string_view name =
      level.directory.empty() ? std::string_view(path) : NameOf(level, level.items[level.next - 1]);
  for (size_t i = level.next; i < level.items.size(); ++i) {
    if (level.items[i].below && NameOf(level, level.items[i]) == name) {
      level.items[i].descend = true;
      return;
    }
    if (!NameOf(level, level.items[i]).starts_with(name)) {
      return;  // read as no directory, and become one since
    }
  }
}

bool DiskWalk::Enter(const std::string& directory) {
  JudgedDirectory judged;
  const Verdict verdict = OpenJudged(settings, directory, mount_id, judged);
  if (verdict != Verdict::BELONGS) {
    return verdict != Verdict::UNKNOWN;
  }
  Level level;
  level.directory = directory;
  level.folder = settings.FolderOfPath(directory);
  const Reading reading = ReadNames(judged, level);
  if (reading != Reading::DONE) {
    return reading == Reading::NOTHING;
  }
  Sort(level);
  if (passed_path.empty()) {
    (void)LookAhead(level, judged);  // what could not be looked at is met in its turn
  }
  levels.push_back(std::move(level));
  return true;
}

DiskWalk::Reading DiskWalk::ReadNames(const JudgedDirectory& directory, Level& level) {
  buffer.resize(READ_BUFFER);
  for (;;) {
    const ssize_t length = getdents64(directory.fd.fd, buffer.data(), buffer.size());
    if (length < 0) {
      return errno == ENOENT || errno == ENOTDIR ? Reading::NOTHING : Reading::FAILED;
    }
    if (length == 0) {
      return Reading::DONE;
    }
    for (ssize_t at = 0; at < length;) {
      const auto* found = reinterpret_cast<const dirent64*>(buffer.data() + at);
      at += found->d_reclen;
      if (!IsDots(found->d_name)) {
        // Whether it is a directory is known when it is met.
        AddItem(level, found->d_name, found->d_type == DT_DIR || found->d_type == DT_UNKNOWN);
      }
    }
  }
}

}  // namespace fileindexd
