// SPDX-License-Identifier: GPL-2.0-or-later
#include "state/queue_writer.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <chrono>
#include <utility>

#include "base/scoped_fd.h"
#include "state/json_text.h"
#include "state/layout.h"
#include "state/queue_file.h"
#include "state/queue_files.h"

namespace fileindexd {

namespace {

constexpr std::chrono::seconds LOCK_WAIT(5);

bool SyncFolder(const std::string& folder, std::string& error) {
  const ScopedFd opened(open(folder.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
  if (opened.fd < 0 || fsync(opened.fd) != 0) {
    error = QueueReason("sync", folder);
    return false;
  }
  return true;
}

using MakeText = std::function<bool(std::string& text)>;

bool Append(const std::string& share_name, const MakeText& make, Durability durability,
            std::string& error) {
  if (!MakeShareFolder(share_name, error)) {
    return false;
  }
  const std::string path = QueuePath(share_name);
  ScopedFd queue;
  struct stat held {};
  std::string text;
  if (LockQueue(path, LOCK_WAIT, queue, held, error) != QueueLock::TAKEN || !make(text) ||
      !WriteLines(queue, path, std::move(text), held.st_size, error)) {
    return false;
  }
  if (durability == Durability::SYNCED && fsync(queue.fd) != 0) {
    error = QueueReason("sync", path);
    return false;
  }

  // The one unlock. Whoever waits for the lock must find the lines written.
  if (close(queue.Release()) != 0 && errno != EINTR) {
    error = QueueReason("close", path);
    return false;
  }
  return durability == Durability::NONE || SyncFolder(ShareFolder(share_name), error);
}

}  // namespace

std::string EventLine(uint32_t event, std::string_view path,
                      const std::optional<std::string>& path_old, std::string_view data) {
  std::string line = "{\"event\":" + std::to_string(event) + ",\"path\":" + JsonText(path);
  if (path_old.has_value()) {
    line += ",\"path_old\":" + JsonText(*path_old);
  }
  if (!data.empty()) {
    // Strings of JSON hold no raw line ends, so those that are here are blanks between values.
    std::string one_line(data);
    std::replace(one_line.begin(), one_line.end(), '\n', ' ');
    std::replace(one_line.begin(), one_line.end(), '\r', ' ');
    line += ",\"data\":" + one_line;
  }
  line += '}';
  return line;
}

bool AppendToQueue(const std::string& share_name, const MakeLines& make, Durability durability,
                   std::string& error) {
  const auto join = [&](std::string& text) { return JoinLines(make(), text, error); };
  return Append(share_name, join, durability, error);
}

bool AppendToQueue(const std::string& share_name, const std::vector<std::string>& lines,
                   std::string& error) {
  if (lines.empty()) {
    ScopedFd queue;
    return MakeShareFolder(share_name, error) && OpenQueue(QueuePath(share_name), queue, error);
  }
  std::string joined;
  const auto take = [&joined](std::string& text) {
    text.swap(joined);
    return true;
  };
  return JoinLines(lines, joined, error) && Append(share_name, take, Durability::NONE, error);
}

bool TouchQueue(const std::string& share_name, std::string& error) {
  const std::string path = QueuePath(share_name);
  ScopedFd queue;
  return MakeShareFolder(share_name, error) && OpenQueue(path, queue, error) &&
         TakeQueueLock(queue, path, error) != QueueLock::FAILED;
}

uint64_t WaitingLines(const std::string& share_name) {
  QueueFiles files;
  OpenQueueFiles(share_name, files);
  bool open_end = false;
  const uint64_t queued = files.queue.fd >= 0 ? CountLines(files.queue, 0, open_end) : 0;
  return queued + (files.drained.fd >= 0 ? CountLines(files.drained, 0, open_end) : 0);
}

}  // namespace fileindexd
