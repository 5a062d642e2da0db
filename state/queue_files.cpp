// SPDX-License-Identifier: GPL-2.0-or-later
#include "state/queue_files.h"

#include <fcntl.h>
#include <sys/stat.h>

#include "state/layout.h"

namespace fileindexd {

namespace {

// O_NONBLOCK: a pipe in its place must not hold the caller up.
bool OpenFile(const std::string& path, ScopedFd& file, struct stat& status) {
  ScopedFd opened(open(path.c_str(), O_RDONLY | O_CLOEXEC | O_NONBLOCK));
  if (opened.fd < 0 || fstat(opened.fd, &status) != 0 || !S_ISREG(status.st_mode)) {
    return false;
  }
  file.Swap(opened);
  return true;
}

}  // namespace

void OpenQueueFiles(const std::string& share_name, QueueFiles& files) {
  struct stat queue {};
  struct stat drained {};
  // The queue first: when it is moved aside between the two, it is met twice and not never, and the
  // inode tells.
  const bool has_queue = OpenFile(QueuePath(share_name), files.queue, queue);
  const bool has_drained = OpenFile(DrainedPath(share_name), files.drained, drained);
  if (has_queue && has_drained && queue.st_dev == drained.st_dev &&
      queue.st_ino == drained.st_ino) {
    ScopedFd none;
    files.queue.Swap(none);
  }
}

}  // namespace fileindexd
