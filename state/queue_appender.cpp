// SPDX-License-Identifier: GPL-2.0-or-later
#include "state/queue_appender.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <sys/sysmacros.h>
#include <unistd.h>

#include <cerrno>
#include <chrono>
#include <utility>

#include "state/layout.h"
#include "state/queue_file.h"
#include "state/queue_files.h"
#include "state/queue_folding.h"
#include "state/statx_look.h"

namespace fileindexd {

namespace {

constexpr std::chrono::milliseconds NO_WAIT(0);

}  // namespace

bool QueueAppender::Identify(int directory, const char* path, int flags, Counted& file) {
  struct statx seen {};
  if (statx(directory, path, flags | AT_SYMLINK_NOFOLLOW,
            STATX_TYPE | STATX_INO | STATX_SIZE | STATX_BTIME, &seen) != 0) {
    return false;
  }
  file.device = makedev(seen.stx_dev_major, seen.stx_dev_minor);
  file.inode = seen.stx_ino;
  file.size = static_cast<off_t>(seen.stx_size);
  if ((seen.stx_mask & STATX_BTIME) != 0) {
    file.birth_time = Nanoseconds(seen.stx_btime);
  }
  return true;
}

bool QueueAppender::IsSameFile(const Counted& file) const {
  return file.device == counted.device && file.inode == counted.inode &&
         file.birth_time == counted.birth_time && file.size >= counted.size;
}

bool QueueAppender::IsWaiting() const {
  Counted file;
  return Identify(AT_FDCWD, QueuePath(share_name).c_str(), 0, file) && IsSameFile(file);
}

bool QueueAppender::Count(const ScopedFd& locked, std::string& error) {
  Counted file;
  if (!Identify(locked.fd, "", AT_EMPTY_PATH, file)) {
    error = QueueReason("look at", QueuePath(share_name));
    return false;
  }

  const bool known = IsSameFile(file);
  file_number += known ? 0 : 1;
  const off_t offset = known ? counted.size : 0;
  file.met = known ? counted.met : 0;
  file.lines = known ? counted.lines : 0;
  file.open_end = known && counted.open_end;
  if (file.size > offset) {
    // What follows an open end goes on with the same line.
    file.lines -= file.open_end ? 1 : 0;
    file.lines += CountLines(locked, offset, file.open_end);
  }
  counted = file;
  return true;
}

Appended QueueAppender::Append(const Give& give, std::string& error) {
  if (counted.lines >= QUEUE_LINE_LIMIT && IsWaiting()) {
    return Appended::FULL;
  }
  if (!MakeShareFolder(share_name, error)) {
    return Appended::FAILED;
  }

  const std::string path = QueuePath(share_name);
  ScopedFd queue;
  queue.Swap(waiting);
  struct stat held {};
  const QueueLock lock = LockQueue(path, NO_WAIT, queue, held, error);
  if (lock == QueueLock::HELD) {
    waiting.Swap(queue);
    return Appended::LOCKED;
  }
  if (lock == QueueLock::FAILED || !Count(queue, error)) {
    return Appended::FAILED;
  }
  if (counted.lines >= QUEUE_LINE_LIMIT) {
    return Appended::FULL;
  }

  if (meet && counted.met < counted.size) {
    counted.met = ForEachQueueLine(queue, meet, counted.met);
  }
  const std::vector<std::string> lines = give(QUEUE_LINE_LIMIT - counted.lines);
  if (lines.empty()) {
    return Appended::FULL;
  }
  std::string text;
  if (!JoinLines(lines, text, error) ||
      !WriteLines(queue, path, std::move(text), held.st_size, error)) {
    return Appended::FAILED;
  }
  // While the lock is held no other's line can be among what is new. Where the size cannot be told,
  // the lines are counted the next time.
  struct stat written {};
  if (fstat(queue.fd, &written) == 0) {
    const bool all_met = !meet || counted.met == counted.size;
    counted.met = all_met ? written.st_size : counted.met;
    counted.size = written.st_size;
    counted.lines += lines.size();
    counted.open_end = false;
  }
  return Appended::DONE;
}

}  // namespace fileindexd
