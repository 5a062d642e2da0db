// SPDX-License-Identifier: GPL-2.0-or-later
#include "index/disk_walk.h"

#include <fcntl.h>

#include <algorithm>
#include <cerrno>
#include <utility>

#include "base/scoped_fd.h"
#include "base/scoped_stream.h"
#include "state/filesystem.h"
#include "state/layout.h"

namespace fileindexd {

namespace {

bool IsGone(int reason) {
  return reason == ENOENT || reason == ENOTDIR || reason == ELOOP || reason == ENAMETOOLONG;
}

// True with no names when there is no such directory any more.
bool ReadNames(const std::string& directory, std::vector<std::string>& names) {
  ScopedFd opened(open(directory.c_str(), O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC));
  if (opened.fd < 0) {
    return IsGone(errno);
  }

  ScopedDir stream(fdopendir(opened.fd));
  if (stream.dir == nullptr) {
    return false;
  }
  (void)opened.Release();

  for (;;) {
    errno = 0;
    // NOLINTNEXTLINE(concurrency-mt-unsafe): the stream is this thread's own
    const dirent* found = readdir(stream.dir);
    if (found == nullptr) {
      return errno == 0 || IsGone(errno);
    }
    const std::string_view name = found->d_name;
    if (name != "." && name != "..") {
      // A directory's contents sort as "name/". Whether it is one is known when it is met.
      names.emplace_back(name);
      if (found->d_type == DT_DIR || found->d_type == DT_UNKNOWN) {
        names.emplace_back(name).push_back('/');
      }
    }
  }
}

std::string Join(const std::string& directory, const std::string& name) {
  if (directory.empty()) {
    return name;
  }
  return directory == "/" ? directory + name : directory + "/" + name;
}

}  // namespace

void DiskWalk::StartAtFolders(const Share& share) {
  Level level;
  level.any_mount = true;
  const std::string* last = nullptr;
  for (const IndexedFolder& folder : settings.folders) {
    // Folders come in byte order, where "/s/a!b" may stand between "/s/a" and "/s/a/b": whether
    // another folder covers this one is asked of its parent.
    const size_t slash = folder.path.rfind('/');
    const std::string parent = slash == 0 ? "/" : folder.path.substr(0, slash);
    const bool covered = folder.path != "/" && settings.FolderOfPath(parent) != nullptr;
    if (folder.share != share.name || covered || (last != nullptr && *last == folder.path)) {
      continue;
    }
    last = &folder.path;
    level.items.push_back({folder.path});
    level.items.push_back({folder.path + "/"});
  }
  std::sort(level.items.begin(), level.items.end(),
            [](const Item& a, const Item& b) { return a.key < b.key; });
  levels.clear();
  levels.push_back(std::move(level));
}

void DiskWalk::StartBelow(const std::string& directory) {
  Level level;
  const Look look = LookAt(settings, directory);
  level.any_mount = true;
  level.items.push_back({directory + "/"});
  levels.clear();
  if (look.verdict == Verdict::BELONGS && look.thing == Thing::DIRECTORY) {
    AllowDescent(level, look, directory);
    levels.push_back(std::move(level));
  }
}

DiskWalk::Step DiskWalk::Next(std::string& path, Look& look) {
  while (!levels.empty()) {
    Level& level = levels.back();
    if (level.next == level.items.size()) {
      levels.pop_back();
      continue;
    }

    Item& item = level.items[level.next++];
    path = Join(level.directory, item.key);
    if (item.key.size() > 1 && item.key.back() == '/') {
      path.pop_back();
      if (item.descend && !Enter(path, item.mount_id)) {
        return Step::FAILED;
      }
      continue;
    }

    look = LookAt(settings, path);
    if (look.verdict == Verdict::UNKNOWN) {
      return Step::FAILED;
    }
    if (look.verdict == Verdict::BELONGS) {
      if (look.thing == Thing::DIRECTORY) {
        AllowDescent(level, look, path);
      }
      return Step::FOUND;
    }
    // A folder below it is indexed all the same; this one and what else it holds is not.
    if (look.verdict == Verdict::EXCLUDED && settings.HasFolderBelow(path)) {
      look = LookPastExcludes(settings, path);
      if (look.verdict == Verdict::UNKNOWN) {
        return Step::FAILED;
      }
      if (look.verdict == Verdict::BELONGS && look.thing == Thing::DIRECTORY) {
        AllowDescent(level, look, path);
      }
    }
  }
  return Step::END;
}

// Nothing below a nested mount point belongs, so it is not even read.
void DiskWalk::AllowDescent(Level& level, const Look& look, const std::string& path) {
  const Share* share = settings.ShareOfPath(path);
  const bool nested = level.any_mount
                          ? share != nullptr && path != share->path && IsMountPoint(path) == 1
                          : look.mount_id != level.mount_id;
  if (nested) {
    return;
  }

  const std::string key = (level.directory.empty() ? path : path.substr(path.rfind('/') + 1)) + "/";
  for (size_t i = level.next; i < level.items.size(); ++i) {
    if (level.items[i].key >= key) {
      level.items[i].descend = level.items[i].key == key;
      level.items[i].mount_id = look.mount_id;
      return;
    }
  }
}

bool DiskWalk::Enter(const std::string& directory, uint64_t mount_id) {
  std::vector<std::string> names;
  if (!ReadNames(directory, names)) {
    return false;
  }

  std::sort(names.begin(), names.end());
  Level level;
  level.directory = directory;
  level.mount_id = mount_id;
  level.items.reserve(names.size());
  for (std::string& name : names) {
    level.items.push_back({std::move(name)});
  }
  levels.push_back(std::move(level));
  return true;
}

}  // namespace fileindexd
