// SPDX-License-Identifier: GPL-2.0-or-later
//
// DESIGN. A record names a thing by the handle of its directory and its name there; a rename has
// two such pairs. Names of directories are those of the moment at which their handle is first met
// in a buffer, and hold for that buffer. The handle of the thing itself counts where it was
// changed: by then it may have lost that name, and have others. Records of a thing alone, without a
// directory, come for each link that is made or removed, as a change of attributes that no entry
// shows; and where a file server changes a file that it found by its handle.
#include "notify/fan_group.h"

#include <sys/fanotify.h>
#include <sys/ioctl.h>
#include <sys/stat.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <cstring>
#include <vector>

#include "notify/handle_names.h"
#include "notify/private_mount.h"

namespace fileindexd {

namespace {

constexpr size_t BUFFER_SIZE = 256 * 1024;
constexpr unsigned GROUP = FAN_CLASS_NOTIF | FAN_CLOEXEC | FAN_NONBLOCK;
constexpr uint64_t ALWAYS =
    FAN_CREATE | FAN_CLOSE_WRITE | FAN_MODIFY | FAN_ATTRIB | FAN_DELETE | FAN_ONDIR;
// Since Linux 5.17, as the handles of targets; before, the two ends of a rename are told apart.
constexpr uint64_t RENAME = FAN_RENAME;
constexpr uint64_t RENAME_ENDS = FAN_MOVED_FROM | FAN_MOVED_TO;

std::string Reason(const char* call) {
  return std::string(call) + ": " + strerror(errno);  // NOLINT: glibc's is safe
}

uint32_t HappeningsOf(uint64_t mask) {
  constexpr std::pair<uint64_t, uint32_t> BITS[] = {
      {FAN_CREATE, CREATED},      {FAN_MODIFY, MODIFIED}, {FAN_ATTRIB, ATTRIBUTES},
      {FAN_CLOSE_WRITE, WRITTEN}, {FAN_DELETE, DELETED},  {FAN_MOVED_FROM, MOVED_FROM},
      {FAN_MOVED_TO, MOVED_TO}};
  uint32_t what = 0;
  for (const auto& [bit, happening] : BITS) {
    what |= (mask & bit) != 0 ? happening : 0;
  }
  return what;
}

// One record. The names lie in the buffer; null where the record has none.
struct Record {
  struct Place {
    file_handle* directory = nullptr;
    const char* name = nullptr;
  };
  uint64_t mask = 0;
  Place place;
  Place before;  // of a rename
  file_handle* target = nullptr;
};

Record Parsed(const fanotify_event_metadata& metadata, char* at, const char* end) {
  Record record;
  record.mask = metadata.mask;
  while (end - at >=
         static_cast<ptrdiff_t>(sizeof(fanotify_event_info_fid) + sizeof(file_handle))) {
    auto* info = reinterpret_cast<fanotify_event_info_fid*>(at);
    if (info->hdr.len < sizeof *info + sizeof(file_handle) || info->hdr.len > end - at) {
      break;
    }
    auto* handle = reinterpret_cast<file_handle*>(info->handle);
    const Record::Place place{
        handle, reinterpret_cast<const char*>(handle->f_handle) + handle->handle_bytes};
    if (info->hdr.info_type == FAN_EVENT_INFO_TYPE_OLD_DFID_NAME) {
      record.before = place;
    } else if (info->hdr.info_type == FAN_EVENT_INFO_TYPE_DFID_NAME ||
               info->hdr.info_type == FAN_EVENT_INFO_TYPE_NEW_DFID_NAME) {
      record.place = place;
    } else if (info->hdr.info_type == FAN_EVENT_INFO_TYPE_FID) {
      record.target = handle;
    }
    at += info->hdr.len;
  }
  return record;
}

// A function of its own for the thread sanitizer's list of exceptions, and for nothing else.
ssize_t ReadRecords(int group, void* buffer) {
  return read(group, buffer, BUFFER_SIZE);
}

}  // namespace

struct FanGroup::Impl {
  PrivateMount whole;
  ScopedFd group;
  bool overflown = false;
  std::vector<uint64_t> buffer = std::vector<uint64_t>(BUFFER_SIZE / sizeof(uint64_t));
  HandleNames names{-1};
  Change change;  // kept for its memory

  bool Open(const Mount& mount_of_it, std::string& error);
  void Tell(const Record& record, const TellChange& tell);
  HandleNames::Result PathOf(const Record::Place& place, std::string& path);
  void TellOf(uint32_t what, const TellChange& tell);
  void TellNameless(const Record& record, uint32_t what, const TellChange& tell);
  bool LookAtTarget(const std::string& target, Target& thing) const;
};

bool FanGroup::Impl::Open(const Mount& mount_of_it, std::string& error) {
  if (IsChangedElsewhere(mount_of_it.type)) {
    error = "fanotify_mark: " + mount_of_it.type + " does not tell of changes made elsewhere";
    return false;
  }
  ScopedFd opened(fanotify_init(GROUP | FAN_REPORT_DFID_NAME_TARGET, O_RDONLY | O_CLOEXEC));
  if (opened.fd < 0 && errno == EINVAL) {
    ScopedFd without(fanotify_init(GROUP | FAN_REPORT_DFID_NAME, O_RDONLY | O_CLOEXEC));
    opened.Swap(without);
  }
  if (opened.fd < 0) {
    error = Reason("fanotify_init");
    return false;
  }
  if (!MakePrivateMount(mount_of_it, whole, error) || !HandleNames::Work(whole.root.fd, error)) {
    return false;
  }
  constexpr unsigned MARK = FAN_MARK_ADD | FAN_MARK_FILESYSTEM;
  if (fanotify_mark(opened.fd, MARK, ALWAYS | RENAME, whole.root.fd, ".") != 0 &&
      (errno != EINVAL ||
       fanotify_mark(opened.fd, MARK, ALWAYS | RENAME_ENDS, whole.root.fd, ".") != 0)) {
    error = Reason("fanotify_mark");
    return false;
  }
  group.Swap(opened);
  names = HandleNames(whole.root.fd);
  return true;
}

// The path of a record's thing. TOO_LONG: `path` is that of a directory above it.
HandleNames::Result FanGroup::Impl::PathOf(const Record::Place& place, std::string& path) {
  path.clear();
  if (place.directory == nullptr) {
    return HandleNames::Result::GONE;
  }
  const HandleNames::Name& directory = names.Find(*place.directory);
  if (directory.result == HandleNames::Result::FAILED) {
    overflown = true;  // something has changed, and nobody can say where
    return directory.result;
  }
  path = directory.path;
  if (directory.result != HandleNames::Result::NAMED) {
    return directory.result;
  }
  const std::string_view name(place.name);
  if (name != ".") {  // which is the directory itself
    if (path != "/") {
      path += '/';
    }
    path += name;
  }
  return directory.result;
}

void FanGroup::Impl::TellOf(uint32_t what, const TellChange& tell) {
  change.what = what;
  tell(change);
}

void FanGroup::Impl::TellNameless(const Record& record, uint32_t what, const TellChange& tell) {
  const uint32_t changed = what & CHANGES_THING;
  const bool is_link_count = record.place.directory == nullptr && changed == ATTRIBUTES;
  Target thing;
  if (!change.target.empty() && !is_link_count && LookAtTarget(change.target, thing) &&
      thing.links > 0) {
    std::string path;
    change.path.swap(path);
    TellOf(changed, tell);
    change.path.swap(path);
  }
  change.target.clear();
}

bool FanGroup::Impl::LookAtTarget(const std::string& target, Target& thing) const {
  alignas(file_handle) char space[sizeof(file_handle) + MAX_HANDLE_SZ];
  if (target.size() < sizeof(file_handle) || target.size() > sizeof space) {
    return false;
  }
  std::copy(target.begin(), target.end(), space);
  auto* handle = reinterpret_cast<file_handle*>(space);
  if (handle->handle_bytes != target.size() - sizeof(file_handle)) {
    return false;
  }

  thing = {};
  const ScopedFd opened(open_by_handle_at(whole.root.fd, handle, O_PATH | O_NOFOLLOW | O_CLOEXEC));
  if (opened.fd < 0) {
    return errno == ESTALE || errno == ENOENT;
  }
  struct stat found {};
  if (fstat(opened.fd, &found) != 0) {
    return false;
  }
  thing = {found.st_ino, found.st_nlink, found.st_dev};
  return true;
}

void FanGroup::Impl::Tell(const Record& record, const TellChange& tell) {
  using Result = HandleNames::Result;
  if ((record.mask & FAN_Q_OVERFLOW) != 0) {
    overflown = true;
    return;
  }

  change.directory = (record.mask & FAN_ONDIR) != 0;
  change.from.clear();
  const uint32_t more = HappeningsOf(record.mask);
  change.target.clear();
  if (record.target != nullptr && !change.directory && (more & CHANGES_THING) != 0) {
    change.target.assign(reinterpret_cast<const char*>(record.target),
                         sizeof(file_handle) + record.target->handle_bytes);
  }
  const bool renamed = (record.mask & RENAME) != 0;
  const Result former = renamed ? PathOf(record.before, change.from) : Result::GONE;
  const Result result = PathOf(record.place, change.path);
  if (result == Result::NAMED && (!renamed || former == Result::NAMED || former == Result::GONE)) {
    TellOf(more | (renamed ? MOVED_TO : 0U), tell);
    return;
  }
  TellNameless(record, more, tell);

  // One end cannot be named exactly. What is below a name that is too long has no name either: a
  // directory above it is told as one that has just come, which has all in it looked at.
  const std::string from = change.from;
  const std::string to = change.path;
  change.from.clear();
  if (result == Result::NAMED) {
    TellOf(more | MOVED_TO, tell);
  } else if (former == Result::NAMED) {
    change.path = from;
    TellOf(MOVED_FROM, tell);
  }
  change.directory = true;
  for (const auto& [end, path] : {std::pair(former, from), std::pair(result, to)}) {
    if (end == Result::TOO_LONG) {
      change.path = path;
      TellOf(CREATED, tell);
    }
  }
}

std::unique_ptr<FanGroup> FanGroup::Open(const Mount& mount, std::string& error) {
  auto opened = std::make_unique<Impl>();
  if (!opened->Open(mount, error)) {
    return nullptr;
  }
  return std::unique_ptr<FanGroup>(new FanGroup(std::move(opened)));
}

FanGroup::FanGroup(std::unique_ptr<Impl> opened) : impl(std::move(opened)) {}
FanGroup::~FanGroup() = default;

FanGroup::Result FanGroup::Read(const TellChange& tell) {
  const ssize_t got = ReadRecords(impl->group.fd, impl->buffer.data());
  if (got < 0) {
    return errno == EAGAIN ? Result::EMPTY : errno == EINTR ? Result::MORE : Result::FAILED;
  }

  impl->names.Forget();
  char* at = reinterpret_cast<char*>(impl->buffer.data());
  const char* const end = at + got;
  // Records begin at multiples of four, and this head asks for eight: hence the copy.
  fanotify_event_metadata head{};
  for (; end - at >= static_cast<ptrdiff_t>(sizeof head); at += head.event_len) {
    memcpy(&head, at, sizeof head);
    if (head.vers != FANOTIFY_METADATA_VERSION || head.event_len < sizeof head ||
        head.event_len > end - at) {
      errno = EPROTO;
      return Result::FAILED;
    }
    impl->Tell(Parsed(head, at + head.metadata_len, at + head.event_len), tell);
  }
  return Result::MORE;
}

bool FanGroup::LookAtTarget(const std::string& target, Target& thing) const {
  if (impl->LookAtTarget(target, thing)) {
    return true;
  }
  // Of a host in want, not of the file: something has changed, and nobody can say where.
  if (errno == EMFILE || errno == ENFILE || errno == ENOMEM || errno == EIO) {
    impl->overflown = true;
  }
  return false;
}

bool FanGroup::IsAt(const std::string& path, const Target& thing) const {
  struct stat found {};
  return path.size() > 1 &&
         fstatat(impl->whole.root.fd, path.c_str() + 1, &found, AT_SYMLINK_NOFOLLOW) == 0 &&
         found.st_ino == thing.inode && found.st_dev == thing.device;
}

bool FanGroup::TakeOverflow() {
  return std::exchange(impl->overflown, false);
}

size_t FanGroup::Waiting() const {
  int bytes = 0;
  return ioctl(impl->group.fd, FIONREAD, &bytes) == 0 ? static_cast<size_t>(bytes) : 0;
}

int FanGroup::Descriptor() const {
  return impl->group.fd;
}

}  // namespace fileindexd
