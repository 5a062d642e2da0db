// SPDX-License-Identifier: GPL-2.0-or-later
// The queue file changes hands by rename: the daemon locks it, moves it aside and reads the copy.
// Whoever waited for the lock meanwhile then holds a file that nobody will look at again; the inode
// tells, and the writer starts over with the file that has the name now.
#include "state/queue_file.h"

#include <fcntl.h>
#include <sys/file.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <string_view>
#include <thread>
#include <utility>

namespace fileindexd {

namespace {

using Clock = std::chrono::steady_clock;

constexpr std::chrono::milliseconds FIRST_NAP(1);
constexpr std::chrono::milliseconds LONGEST_NAP(16);
constexpr int MOVES_BORNE = 16;  // by a caller that does not wait
constexpr size_t COUNT_BUFFER = 65536;

QueueLock WaitForLock(const ScopedFd& queue, const std::string& path, Clock::time_point deadline,
                      std::string& error) {
  auto nap = FIRST_NAP;
  for (;;) {
    const QueueLock lock = TakeQueueLock(queue, path, error);
    if (lock != QueueLock::HELD) {
      return lock;
    }
    if (Clock::now() >= deadline) {
      error = "cannot lock " + path + ": another program holds it";
      return QueueLock::HELD;
    }
    std::this_thread::sleep_for(nap);
    nap = std::min(nap * 2, LONGEST_NAP);
  }
}

bool HasName(const std::string& path, const struct stat& held) {
  struct stat named {};
  return stat(path.c_str(), &named) == 0 && named.st_dev == held.st_dev &&
         named.st_ino == held.st_ino;
}

// A writer that was killed between a short write and its repair leaves half a line. It is ended, so
// that it costs one line and not two.
bool EndsInsideLine(const ScopedFd& queue, off_t size) {
  char last = '\n';
  return size > 0 && pread(queue.fd, &last, 1, size - 1) == 1 && last != '\n';
}

bool WriteWhole(const ScopedFd& queue, const std::string& path, const std::string& text, off_t size,
                std::string& error) {
  ssize_t written = -1;
  do {
    written = write(queue.fd, text.data(), text.size());
  } while (written < 0 && errno == EINTR);
  if (written == static_cast<ssize_t>(text.size())) {
    return true;
  }

  if (written >= 0) {
    errno = ENOSPC;  // what a short write to a file means
  }
  error = QueueReason("write to", path);
  if (written > 0 && ftruncate(queue.fd, size) != 0) {
    error += "; and it could not be undone";
  }
  return false;
}

}  // namespace

std::string QueueReason(const char* what, const std::string& path) {
  return std::string("cannot ") + what + " " + path + ": " +
         strerror(errno);  // NOLINT: glibc's is safe
}

// O_NONBLOCK: a pipe in its place must not hold the caller up; the look at its type refuses it.
// Read access is for the look at the last byte.
bool OpenQueue(const std::string& path, ScopedFd& queue, std::string& error) {
  constexpr int FLAGS = O_RDWR | O_APPEND | O_CLOEXEC | O_NONBLOCK | O_NOFOLLOW;
  for (;;) {
    ScopedFd opened(open(path.c_str(), FLAGS));
    if (opened.fd < 0 && errno == ENOENT) {
      ScopedFd created(open(path.c_str(), FLAGS | O_CREAT | O_EXCL, 0600));
      if (created.fd < 0 && errno == EEXIST) {
        continue;
      }
      if (created.fd >= 0 && fchmod(created.fd, 0600) != 0) {
        error = QueueReason("set the mode of", path);
        return false;
      }
      opened.Swap(created);
    }
    if (opened.fd < 0) {
      error = QueueReason("open", path);
      return false;
    }
    queue.Swap(opened);
    return true;
  }
}

QueueLock TakeQueueLock(const ScopedFd& queue, const std::string& path, std::string& error) {
  while (flock(queue.fd, LOCK_EX | LOCK_NB) != 0) {
    if (errno == EWOULDBLOCK) {
      return QueueLock::HELD;
    }
    if (errno != EINTR) {
      error = QueueReason("lock", path);
      return QueueLock::FAILED;
    }
  }
  return QueueLock::TAKEN;
}

QueueLock LockQueue(const std::string& path, std::chrono::milliseconds wait, ScopedFd& queue,
                    struct stat& held, std::string& error) {
  const Clock::time_point deadline = Clock::now() + wait;
  for (int moves = 0;; ++moves) {
    if (queue.fd < 0 && !OpenQueue(path, queue, error)) {
      return QueueLock::FAILED;
    }
    const QueueLock lock = WaitForLock(queue, path, deadline, error);
    if (lock != QueueLock::TAKEN) {
      return lock;
    }
    struct stat locked {};
    if (fstat(queue.fd, &locked) != 0) {
      error = QueueReason("look at", path);
      return QueueLock::FAILED;
    }
    if (!S_ISREG(locked.st_mode)) {
      error = path + " is no regular file";
      return QueueLock::FAILED;
    }
    if (HasName(path, locked)) {
      held = locked;
      return QueueLock::TAKEN;
    }

    queue.Close();
    if (moves >= MOVES_BORNE && Clock::now() >= deadline) {
      error = "cannot lock " + path + ": it is moved away again and again";
      return QueueLock::HELD;
    }
  }
}

bool JoinLines(const std::vector<std::string>& lines, std::string& text, std::string& error) {
  size_t length = 1;
  for (const std::string& line : lines) {
    if (line.find_first_of(std::string_view("\n\0", 2)) != std::string::npos) {
      error = "a queue line must not hold a newline or a NUL";
      return false;
    }
    length += line.size() + 1;
  }
  text.reserve(length);
  for (const std::string& line : lines) {
    text += line;
    text += '\n';
  }
  return true;
}

bool WriteLines(const ScopedFd& queue, const std::string& path, std::string text, off_t size,
                std::string& error) {
  if (EndsInsideLine(queue, size)) {
    text.insert(text.begin(), '\n');
  }
  return WriteWhole(queue, path, text, size, error);
}

uint64_t CountLines(const ScopedFd& file, off_t offset, bool& open_end) {
  std::vector<char> buffer(COUNT_BUFFER);
  uint64_t lines = 0;
  char last = '\n';
  for (;;) {
    const ssize_t length = pread(file.fd, buffer.data(), buffer.size(), offset);
    if (length < 0 && errno == EINTR) {
      continue;
    }
    if (length <= 0) {
      open_end = last != '\n';
      return open_end ? lines + 1 : lines;
    }
    lines += static_cast<uint64_t>(std::count(buffer.begin(), buffer.begin() + length, '\n'));
    last = buffer[static_cast<size_t>(length) - 1];
    offset += length;
  }
}

}  // namespace fileindexd
