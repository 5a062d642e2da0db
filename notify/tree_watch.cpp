// SPDX-License-Identifier: GPL-2.0-or-later
//
// DESIGN. The tree may be ahead of the events: a directory that appears is looked into, and what is
// found there is told of again by events that were on their way. So each event only sees to it that
// its name is covered as the disk has it now; the last event of a name finds the truth.
//
// The two halves of a rename stand in the stream one behind the other, seldom with others between.
// They are joined when the first is met; where the second has not been read yet, the first and all
// behind it wait for one more read.
#include "notify/tree_watch.h"

#include <sys/ioctl.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>
#include <deque>
#include <vector>

#include "notify/tree_watcher.h"

namespace fileindexd {

namespace {

constexpr size_t BUFFER_SIZE = 64 * 1024;

struct Event {
  int wd = -1;
  uint32_t mask = 0;
  uint32_t cookie = 0;
  std::string name;
  bool waited = false;  // for one more read
};

uint32_t HappeningsOf(uint32_t mask) {
  constexpr std::pair<uint32_t, uint32_t> BITS[] = {
      {IN_CREATE, CREATED},      {IN_MODIFY, MODIFIED}, {IN_ATTRIB, ATTRIBUTES},
      {IN_CLOSE_WRITE, WRITTEN}, {IN_DELETE, DELETED},  {IN_MOVED_FROM, MOVED_FROM},
      {IN_MOVED_TO, MOVED_TO}};
  uint32_t what = 0;
  for (const auto& [bit, happening] : BITS) {
    what |= (mask & bit) != 0 ? happening : 0;
  }
  return what;
}

}  // namespace

struct TreeWatch::Impl {
  TreeWatcher watcher;
  std::deque<Event> events;  // read, and not told yet
  bool overflown = false;
  bool failed = false;
  std::vector<uint64_t> buffer = std::vector<uint64_t>(BUFFER_SIZE / sizeof(uint64_t));

  bool Fail(const std::string& reason);
  void TakeIn(size_t bytes);
  bool Work(const TellChange& tell, bool last);
  bool Handle(const Event& event, const TellChange& tell);
  bool HandleSelf(const Event& event, const TellChange& tell);
  bool HandleName(WatchNode& folder, const Event& event, const TellChange& tell);
  bool HandleRename(const Event& before, const Event& after, const TellChange& tell);
  std::string PathOf(const WatchNode& folder, const std::string& name) const;
};

bool TreeWatch::Impl::Fail(const std::string& reason) {
  if (watcher.error.empty()) {
    watcher.error = reason;
  }
  failed = true;
  return false;
}

void TreeWatch::Impl::TakeIn(size_t bytes) {
  const char* at = reinterpret_cast<const char*>(buffer.data());
  for (const char* const end = at + bytes; at < end;) {
    const auto* read = reinterpret_cast<const inotify_event*>(at);
    events.push_back({read->wd, read->mask, read->cookie, read->len > 0 ? read->name : "", false});
    at += sizeof *read + read->len;
  }
}

std::string TreeWatch::Impl::PathOf(const WatchNode& folder, const std::string& name) const {
  const std::string path = watcher.nodes.PathOf(folder);
  return path == "/" ? path + name : path + "/" + name;
}

// Handles what was read. With `last`, nothing is left to wait for.
bool TreeWatch::Impl::Work(const TellChange& tell, bool last) {
  while (!events.empty()) {
    const Event event = events.front();
    if ((event.mask & IN_MOVED_FROM) == 0) {
      events.pop_front();
      if (!Handle(event, tell)) {
        return false;
      }
      continue;
    }
    auto other = events.begin() + 1;
    while (other != events.end() &&
           ((other->mask & IN_MOVED_TO) == 0 || other->cookie != event.cookie)) {
      ++other;
    }
    if (other == events.end() && !last && !event.waited) {
      for (Event& waiting : events) {
        waiting.waited = true;
      }
      return true;
    }
    const bool paired = other != events.end();
    const Event after = paired ? *other : Event{};
    if (paired) {
      events.erase(other);
    }
    events.pop_front();
    if (!(paired ? HandleRename(event, after, tell) : Handle(event, tell))) {
      return false;
    }
  }
  return true;
}

bool TreeWatch::Impl::Handle(const Event& event, const TellChange& tell) {
  if ((event.mask & IN_Q_OVERFLOW) != 0) {
    overflown = true;
    watcher.stale = true;
    return true;
  }
  if (watcher.above.contains(event.wd)) {
    return Fail("a directory above " + watcher.share.path + " was moved or removed");
  }
  WatchNode* folder = watcher.nodes.Find(event.wd);
  if (folder == nullptr) {
    return true;  // no longer watched
  }
  return event.name.empty() ? HandleSelf(event, tell) : HandleName(*folder, event, tell);
}

// What a directory tells of itself its parent tells as well, but for the root.
bool TreeWatch::Impl::HandleSelf(const Event& event, const TellChange& tell) {
  WatchNode* folder = watcher.nodes.Find(event.wd);
  const bool is_root = folder->parent == nullptr;
  if (is_root && (event.mask & (IN_DELETE_SELF | IN_MOVE_SELF | IN_UNMOUNT | IN_IGNORED)) != 0) {
    return Fail(watcher.share.path + " was " +
                ((event.mask & IN_MOVE_SELF) != 0 ? "moved"
                 : (event.mask & IN_UNMOUNT) != 0 ? "unmounted"
                                                  : "removed"));
  }
  if (is_root && (event.mask & IN_ATTRIB) != 0) {
    tell({ATTRIBUTES, true, watcher.share.path});
  } else if (folder->parent != nullptr && (event.mask & IN_IGNORED) != 0) {
    watcher.Drop(*folder->parent, std::string(folder->name));
  }
  return true;
}

bool TreeWatch::Impl::HandleName(WatchNode& folder, const Event& event, const TellChange& tell) {
  const Change change{HappeningsOf(event.mask), (event.mask & IN_ISDIR) != 0,
                      PathOf(folder, event.name)};
  if (change.directory && (change.what & (CREATED | MOVED_TO)) != 0 &&
      !watcher.Cover(folder, event.name, false)) {
    return Fail(watcher.error);
  }
  if (change.directory && (change.what & (DELETED | MOVED_FROM)) != 0) {
    watcher.Drop(folder, event.name);
  }
  if (change.what != 0) {
    tell(change);
  }
  return true;
}

bool TreeWatch::Impl::HandleRename(const Event& before, const Event& after,
                                   const TellChange& tell) {
  WatchNode* from = watcher.nodes.Find(before.wd);
  WatchNode* to = watcher.nodes.Find(after.wd);
  if (from == nullptr || to == nullptr) {
    return Handle(before, tell) && Handle(after, tell);
  }
  const bool directory = (after.mask & IN_ISDIR) != 0;
  const std::string old_path = PathOf(*from, before.name);
  const std::string new_path = PathOf(*to, after.name);
  if (directory && !watcher.Move(*from, before.name, *to, after.name)) {
    return Fail(watcher.error);
  }
  tell({MOVED_TO, directory, new_path, old_path});
  return true;
}

std::unique_ptr<TreeWatch> TreeWatch::Open(std::shared_ptr<const Settings> settings,
                                           const Share& share, std::string& error) {
  auto opened = std::make_unique<Impl>();
  opened->watcher.settings = std::move(settings);
  opened->watcher.share = share;
  if (!opened->watcher.Open()) {
    error = opened->watcher.error;
    return nullptr;
  }
  return std::unique_ptr<TreeWatch>(new TreeWatch(std::move(opened)));
}

TreeWatch::TreeWatch(std::unique_ptr<Impl> opened) : impl(std::move(opened)) {}
TreeWatch::~TreeWatch() = default;

TreeWatch::Result TreeWatch::Read(const TellChange& tell) {
  if (impl->failed) {
    return Result::FAILED;
  }
  const ssize_t got = read(impl->watcher.inotify.fd, impl->buffer.data(), BUFFER_SIZE);
  if (got < 0 && errno == EINTR) {
    return Result::MORE;
  }
  if (got < 0 && errno != EAGAIN) {
    impl->Fail(std::string("inotify: ") + strerror(errno));  // NOLINT: glibc's is safe
    return Result::FAILED;
  }

  impl->TakeIn(got > 0 ? static_cast<size_t>(got) : 0);
  if (impl->events.empty()) {
    return Result::EMPTY;
  }
  if (!impl->Work(tell, got <= 0)) {
    return Result::FAILED;
  }
  // All that was on the disk before is compared, and all that comes after is told.
  if (impl->watcher.stale) {
    impl->overflown = true;
    if (!impl->watcher.Rebuild()) {
      impl->Fail(impl->watcher.error);
      return Result::FAILED;
    }
  }
  return Result::MORE;
}

const std::string& TreeWatch::Error() const {
  return impl->watcher.error;
}

bool TreeWatch::TakeOverflow() {
  return std::exchange(impl->overflown, false);
}

size_t TreeWatch::Waiting() const {
  int bytes = 0;
  const bool known = ioctl(impl->watcher.inotify.fd, FIONREAD, &bytes) == 0;
  return (known ? static_cast<size_t>(bytes) : 0) + impl->events.size() * sizeof(inotify_event);
}

size_t TreeWatch::Directories() const {
  return impl->watcher.nodes.Count();
}

int TreeWatch::Descriptor() const {
  return impl->watcher.inotify.fd;
}

}  // namespace fileindexd
