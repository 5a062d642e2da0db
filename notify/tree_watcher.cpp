// SPDX-License-Identifier: GPL-2.0-or-later
#include "notify/tree_watcher.h"

#include <dirent.h>
#include <fcntl.h>
#include <sys/stat.h>
#include <sys/sysmacros.h>

#include <cerrno>
#include <cstring>
#include <fstream>

#include "base/scoped_stream.h"
#include "notify/readiness.h"
#include "state/belonging.h"
#include "state/open_path.h"
#include "state/statx_look.h"

namespace fileindexd {

namespace {

constexpr uint32_t OF_ITSELF = IN_DELETE_SELF | IN_MOVE_SELF;
constexpr size_t BETWEEN_SIGNS = 1000;  // of life, directories

constexpr uint32_t OF_NAMES =
    IN_CREATE | IN_CLOSE_WRITE | IN_MODIFY | IN_ATTRIB | IN_DELETE | IN_MOVED_FROM | IN_MOVED_TO;

std::string LinkTo(int fd) {
  return "/proc/self/fd/" + std::to_string(fd);
}

// " (fs.inotify.NAME is 8192)"
std::string Limit(const std::string& name) {
  std::ifstream file("/proc/sys/fs/inotify/" + name);
  std::string number = "unknown";
  file >> number;
  return " (fs.inotify." + name + " is " + number + ")";
}

// A path that is too long belongs nowhere, as if it were gone.
bool IsGone(int reason) {
  return reason == ENOENT || reason == ENOTDIR || reason == ELOOP || reason == ESTALE ||
         reason == ENAMETOOLONG;
}

std::string Joined(const std::string& folder, const std::string& name) {
  return folder == "/" ? "/" + name : folder + "/" + name;
}

}  // namespace

bool TreeWatcher::Failed(const std::string& path) {
  const int reason = errno;
  error = "cannot watch " + path + ": " + strerror(reason);  // NOLINT: glibc's is safe
  if (reason == ENOSPC) {
    error = "cannot watch " + path + ": no watches are left" + Limit("max_user_watches");
  }
  return false;
}

bool TreeWatcher::Open() {
  ScopedFd opened(inotify_init1(IN_NONBLOCK | IN_CLOEXEC));
  if (opened.fd < 0) {
    const bool full = errno == EMFILE;
    error = std::string("inotify_init1: ") + strerror(errno);  // NOLINT: glibc's is safe
    error += full ? Limit("max_user_instances") : "";
    return false;
  }
  inotify.Swap(opened);
  std::vector<Todo> todos;
  return AddAbove() && StartAtRoot(todos) && CoverAll(std::move(todos));
}

// A directory above that is moved takes the share's root from its path without telling it.
bool TreeWatcher::AddAbove() {
  for (size_t slash = share.path.rfind('/'); slash != std::string::npos && slash > 0;
       slash = share.path.rfind('/', slash - 1)) {
    const std::string path = share.path.substr(0, slash);
    const int wd = inotify_add_watch(inotify.fd, path.c_str(), OF_ITSELF | IN_ONLYDIR);
    if (wd >= 0) {
      above.insert(wd);
    } else if (errno == ENOSPC) {
      return Failed(path);
    }
  }
  return true;
}

bool TreeWatcher::StartAtRoot(std::vector<Todo>& todos) {
  ScopedFd root(OpenInShare(share.path, share.path));
  struct statx st {};
  if (root.fd < 0 || statx(root.fd, "", AT_EMPTY_PATH, WANTED, &st) != 0) {
    return Failed(share.path);
  }
  mount_id = HasMountId(st) ? st.stx_mnt_id : 0;
  device = makedev(st.stx_dev_major, st.stx_dev_minor);
  const int wd = inotify_add_watch(inotify.fd, LinkTo(root.fd).c_str(),
                                   OF_NAMES | OF_ITSELF | IN_EXCL_UNLINK | IN_ONLYDIR);
  if (wd < 0) {
    return Failed(share.path);
  }
  nodes.SetRoot(share.path, wd);
  return List(root, wd, false, todos);
}

// The directories that belong, and those on the way to an indexed folder.
bool TreeWatcher::IsWanted(const std::string& path) const {
  const Share* owner = settings->ShareOfPath(path);
  if (owner == nullptr || owner->name != share.name) {
    return false;
  }
  switch (JudgeName(*settings, path)) {
    case Verdict::BELONGS:
      return FindExclusion(*settings, path, Leaf::DIRECTORY).folder == nullptr ||
             settings->HasFolderBelow(path);
    case Verdict::NOT_COVERED:
    case Verdict::EXCLUDED:
      return settings->HasFolderBelow(path);
    default:
      return false;
  }
}

// Whether what lies below is wanted by the same rule under both names.
bool TreeWatcher::IsJudgedAlike(const std::string& from, const std::string& to) const {
  const IndexedFolder* folder = settings->FolderOfPath(from);
  return folder != nullptr && folder == settings->FolderOfPath(to) &&
         folder->excludes.patterns.empty() && !settings->HasFolderBelow(from) &&
         !settings->HasFolderBelow(to);
}

TreeWatcher::Added TreeWatcher::Add(const std::string& path, ScopedFd& directory, int& wd) {
  ScopedFd opened(OpenInShare(share.path, path));
  struct statx st {};
  if (opened.fd < 0 || statx(opened.fd, "", AT_EMPTY_PATH, WANTED, &st) != 0) {
    return IsGone(errno) ? Added::GONE : (Failed(path), Added::FAILED);
  }
  if (!S_ISDIR(st.stx_mode)) {
    return Added::GONE;
  }
  const bool own = mount_id != 0 ? st.stx_mnt_id == mount_id
                                 : makedev(st.stx_dev_major, st.stx_dev_minor) == device;
  if (!own) {
    return Added::FOREIGN;
  }
  wd = inotify_add_watch(inotify.fd, LinkTo(opened.fd).c_str(),
                         OF_NAMES | IN_EXCL_UNLINK | IN_ONLYDIR);
  if (wd < 0) {
    return IsGone(errno) ? Added::GONE : (Failed(path), Added::FAILED);
  }
  directory.Swap(opened);
  return Added::WATCHED;
}

bool TreeWatcher::List(const ScopedFd& directory, int wd, bool again, std::vector<Todo>& todos) {
  const std::string path = nodes.PathOf(*nodes.Find(wd));
  ScopedFd opened(open(LinkTo(directory.fd).c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
  const ScopedDir stream(opened.fd < 0 ? nullptr : fdopendir(opened.fd));
  if (stream.dir == nullptr) {
    return IsGone(errno) || Failed(path);
  }
  (void)opened.Release();  // it is the stream's now
  errno = 0;
  // NOLINTNEXTLINE(concurrency-mt-unsafe): the stream is this thread's own
  while (const dirent* entry = readdir(stream.dir)) {
    const std::string_view name(entry->d_name);
    if ((entry->d_type == DT_DIR || entry->d_type == DT_UNKNOWN) && name != "." && name != "..") {
      todos.push_back({wd, std::string(name), again});
    }
    errno = 0;
  }
  return errno == 0 || IsGone(errno) || Failed(path);
}

bool TreeWatcher::CoverOne(const Todo& todo, std::vector<Todo>& todos) {
  WatchNode* parent = nodes.Find(todo.parent_wd);
  if (parent == nullptr) {
    return true;
  }
  const std::string path = Joined(nodes.PathOf(*parent), todo.name);
  if (!IsWanted(path)) {
    Drop(*parent, todo.name);
    return true;
  }
  ScopedFd directory;
  int wd = -1;
  switch (Add(path, directory, wd)) {
    case Added::FAILED:
      return false;
    case Added::GONE:
      return true;  // what stands here stays: it has moved on, and the events to come say where
    case Added::FOREIGN:
      Drop(*parent, todo.name);
      return true;
    case Added::WATCHED:
      break;
  }
  const bool is_new = nodes.Find(wd) == nullptr;
  std::unique_ptr<WatchNode> replaced;
  if (nodes.Put(*parent, todo.name, wd, replaced) == nullptr) {
    stale = true;
    return true;
  }
  DropNodes(std::move(replaced));
  return (!is_new && !todo.again) || List(directory, wd, todo.again, todos);
}

bool TreeWatcher::CoverAll(std::vector<Todo> todos) {
  for (size_t covered = 0; !todos.empty(); ++covered) {
    if (covered % BETWEEN_SIGNS == 0) {
      TellBusy();  // the disk may be slow, and the tree large
    }
    const Todo todo = std::move(todos.back());
    todos.pop_back();
    if (!CoverOne(todo, todos)) {
      return false;
    }
  }
  return true;
}

bool TreeWatcher::Cover(WatchNode& parent, const std::string& name, bool again) {
  return CoverAll({{parent.wd, name, again}});
}

bool TreeWatcher::Move(WatchNode& from, const std::string& name, WatchNode& to,
                       const std::string& new_name) {
  const bool alike =
      IsJudgedAlike(Joined(nodes.PathOf(from), name), Joined(nodes.PathOf(to), new_name));
  const auto child = from.children.find(name);
  if (child != from.children.end()) {
    std::unique_ptr<WatchNode> replaced;
    if (nodes.Put(to, new_name, child->second->wd, replaced) == nullptr) {
      stale = true;
      return true;
    }
    DropNodes(std::move(replaced));
  }
  return Cover(to, new_name, !alike);
}

void TreeWatcher::Drop(WatchNode& parent, const std::string& name) {
  DropNodes(WatchNodes::Take(parent, name));
}

void TreeWatcher::DropNodes(std::unique_ptr<WatchNode> top) {
  std::vector<std::unique_ptr<WatchNode>> dropped;
  dropped.push_back(std::move(top));
  while (!dropped.empty()) {
    const std::unique_ptr<WatchNode> node = std::move(dropped.back());
    dropped.pop_back();
    if (node == nullptr) {
      continue;
    }
    (void)inotify_rm_watch(inotify.fd, node->wd);  // a directory that is gone has taken it along
    nodes.Forget(node->wd);
    for (auto& [name, child] : node->children) {
      dropped.push_back(std::move(child));
    }
  }
}

bool TreeWatcher::Rebuild() {
  std::set<int> former;
  for (const auto& [wd, node] : nodes.by_wd) {
    former.insert(wd);
  }
  std::vector<Todo> todos;
  if (!StartAtRoot(todos) || !CoverAll(std::move(todos))) {
    return false;
  }
  for (const int wd : former) {
    if (nodes.Find(wd) == nullptr) {
      (void)inotify_rm_watch(inotify.fd, wd);
    }
  }
  stale = false;
  return true;
}

}  // namespace fileindexd
