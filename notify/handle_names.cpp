// SPDX-License-Identifier: GPL-2.0-or-later
#include "notify/handle_names.h"

#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <climits>
#include <cstring>

#include "base/scoped_fd.h"

namespace fileindexd {

namespace {

using Result = HandleNames::Result;
using Name = HandleNames::Name;

bool SameThing(const struct stat& one, const struct stat& other) {
  return one.st_dev == other.st_dev && one.st_ino == other.st_ino;
}

// The kernel's own name of an open directory.
Name PathOf(int mount, int directory) {
  constexpr std::string_view DELETED = " (deleted)";

  char path[PATH_MAX];
  const std::string link = "/proc/self/fd/" + std::to_string(directory);
  const ssize_t length = readlink(link.c_str(), path, sizeof path);
  if (length < 0) {
    return {errno == ENAMETOOLONG ? Result::TOO_LONG : Result::FAILED, {}};
  }
  if (length >= PATH_MAX) {
    return {Result::TOO_LONG, {}};
  }
  std::string name(path, static_cast<size_t>(length));
  if (name.empty() || name[0] != '/') {
    return {Result::GONE, {}};  // it hangs on nothing that a path leads to
  }
  if (name.ends_with(DELETED)) {
    // Said of one that is gone, or a part of its name.
    struct stat named {};
    struct stat opened {};
    if (name.size() == DELETED.size() ||
        fstatat(mount, name.c_str() + 1, &named, AT_SYMLINK_NOFOLLOW) != 0 ||
        fstat(directory, &opened) != 0 || !SameThing(named, opened)) {
      return {Result::GONE, {}};
    }
  }
  return {Result::NAMED, std::move(name)};
}

// Goes up until a path is short enough.
Name NearestName(int mount, int directory) {
  ScopedFd at(openat(directory, "..", O_PATH | O_DIRECTORY | O_CLOEXEC));
  while (at.fd >= 0) {
    Name name = PathOf(mount, at.fd);
    if (name.result != Result::TOO_LONG) {
      name.result = name.result == Result::NAMED ? Result::TOO_LONG : name.result;
      return name;
    }
    ScopedFd above(openat(at.fd, "..", O_PATH | O_DIRECTORY | O_CLOEXEC));
    at.Swap(above);
  }
  return {errno == ENOENT ? Result::GONE : Result::FAILED, {}};
}

}  // namespace

const Name& HandleNames::Find(file_handle& handle) {
  const std::string_view bytes(reinterpret_cast<const char*>(&handle),
                               sizeof handle + handle.handle_bytes);
  const auto known = names.find(bytes);
  if (known != names.end()) {
    return known->second;
  }
  return names.emplace(bytes, Resolve(handle)).first->second;
}

Name HandleNames::Resolve(file_handle& handle) const {
  const ScopedFd directory(open_by_handle_at(mount, &handle, O_PATH | O_CLOEXEC));
  if (directory.fd < 0) {
    return {errno == ESTALE || errno == ENOENT ? Result::GONE : Result::FAILED, {}};
  }
  Name name = PathOf(mount, directory.fd);
  return name.result == Result::TOO_LONG ? NearestName(mount, directory.fd) : name;
}

bool HandleNames::Work(int mount_fd, std::string& error) {
  alignas(file_handle) char space[sizeof(file_handle) + MAX_HANDLE_SZ] = {};
  auto& handle = *reinterpret_cast<file_handle*>(space);
  handle.handle_bytes = MAX_HANDLE_SZ;
  int mount_id = 0;
  // NOLINTBEGIN(concurrency-mt-unsafe): glibc's strerror is safe
  if (name_to_handle_at(mount_fd, "", &handle, &mount_id, AT_EMPTY_PATH) != 0) {
    error = std::string("name_to_handle_at: ") + strerror(errno);
    return false;
  }
  const ScopedFd opened(open_by_handle_at(mount_fd, &handle, O_PATH | O_CLOEXEC));
  if (opened.fd < 0) {
    error = std::string("open_by_handle_at: ") + strerror(errno);
    return false;
  }
  // NOLINTEND(concurrency-mt-unsafe)
  struct stat root {};
  struct stat found {};
  if (fstat(mount_fd, &root) != 0 || fstat(opened.fd, &found) != 0 || !SameThing(root, found) ||
      PathOf(mount_fd, opened.fd).path != "/") {
    error = "open_by_handle_at: a handle leads to another thing";
    return false;
  }
  return true;
}

}  // namespace fileindexd
