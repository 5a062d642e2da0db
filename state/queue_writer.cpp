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

namespace fileindexd {

namespace {

constexpr std::chrono::seconds LOCK_WAIT(5);

enum class Durability { NONE, SYNCED };

bool SyncFolder(const std::string& folder, std::string& error) {
  const ScopedFd opened(open(folder.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
  if (opened.fd < 0 || fsync(opened.fd) != 0) {
    error = QueueReason("sync", folder);
    return false;
  }
  return true;
}

bool Append(const std::string& share_name, const std::vector<std::string>& lines,
            Durability durability, std::string& error) {
  std::string text;
  if (!JoinLines(lines, text, error) || !MakeShareFolder(share_name, error)) {
    return false;
  }

  const std::string path = QueuePath(share_name);
  ScopedFd queue;
  if (lines.empty()) {
    return OpenQueue(path, queue, error);
  }
  struct stat held {};
  if (LockQueue(path, LOCK_WAIT, queue, held, error) != QueueLock::TAKEN ||
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

bool AppendToQueue(const std::string& share_name, const std::vector<std::string>& lines,
                   std::string& error) {
  return Append(share_name, lines, Durability::NONE, error);
}

bool AppendToQueueDurably(const std::string& share_name, const std::vector<std::string>& lines,
                          std::string& error) {
  return Append(share_name, lines, Durability::SYNCED, error);
}

bool TouchQueue(const std::string& share_name, std::string& error) {
  const std::string path = QueuePath(share_name);
  ScopedFd queue;
  return MakeShareFolder(share_name, error) && OpenQueue(path, queue, error) &&
         TakeQueueLock(queue, path, error) != QueueLock::FAILED;
}

uint64_t WaitingLines(const std::string& share_name) {
  constexpr int FLAGS = O_RDONLY | O_CLOEXEC | O_NONBLOCK;
  // The queue first: when it is moved aside between the two, it is met twice and not never.
  ScopedFd queue(open(QueuePath(share_name).c_str(), FLAGS));
  ScopedFd drained(open(DrainedPath(share_name).c_str(), FLAGS));
  struct stat queue_stat {};
  struct stat drained_stat {};
  const bool has_queue =
      queue.fd >= 0 && fstat(queue.fd, &queue_stat) == 0 && S_ISREG(queue_stat.st_mode);
  const bool has_drained =
      drained.fd >= 0 && fstat(drained.fd, &drained_stat) == 0 && S_ISREG(drained_stat.st_mode);
  const bool same = has_queue && has_drained && queue_stat.st_dev == drained_stat.st_dev &&
                    queue_stat.st_ino == drained_stat.st_ino;

  bool open_end = false;
  uint64_t lines = has_queue ? CountLines(queue, 0, open_end) : 0;
  if (has_drained && !same) {
    lines += CountLines(drained, 0, open_end);
  }
  return lines;
}

}  // namespace fileindexd
