// SPDX-License-Identifier: GPL-2.0-or-later
#include "state/queue_files.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>

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

off_t ForEachQueueLine(const ScopedFd& file, const std::function<void(std::string_view)>& visit,
                       off_t offset) {
  constexpr size_t BUFFER = 65536;
  std::string text;
  std::string buffer(BUFFER, '\0');
  while (file.fd >= 0) {
    const ssize_t length = pread(file.fd, buffer.data(), buffer.size(), offset);
    if (length < 0 && errno == EINTR) {
      continue;
    }
    if (length <= 0) {
      break;
    }
    text.append(buffer, 0, static_cast<size_t>(length));
    offset += length;
    size_t begin = 0;
    for (size_t end = text.find('\n'); end != std::string::npos; end = text.find('\n', begin)) {
      visit(std::string_view(text).substr(begin, end - begin));
      begin = end + 1;
    }
    text.erase(0, begin);
  }
  if (!text.empty()) {
    visit(text);
  }
  return offset - static_cast<off_t>(text.size());
}

}  // namespace fileindexd
