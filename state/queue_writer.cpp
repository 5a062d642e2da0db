// SPDX-License-Identifier: GPL-2.0-or-later
// The queue file changes hands by rename: the daemon locks it, moves it aside and reads the copy.
// Whoever waited for the lock meanwhile then holds a file that nobody will look at again; the inode
// tells, and the writer starts over with the file that has the name now.
#include "state/queue_writer.h"

#include <fcntl.h>
#include <sys/file.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <chrono>
#include <cstring>
#include <thread>

#include "base/scoped_fd.h"
#include "state/json_text.h"
#include "state/layout.h"
#include "state/queue_files.h"

namespace fileindexd {

namespace {

using Clock = std::chrono::steady_clock;

constexpr std::chrono::seconds LOCK_WAIT(5);
constexpr std::chrono::milliseconds FIRST_NAP(1);
constexpr std::chrono::milliseconds LONGEST_NAP(16);
constexpr size_t COUNT_BUFFER = 65536;

std::string Reason(const char* what, const std::string& path) {
  return std::string("cannot ") + what + " " + path + ": " +
         strerror(errno);  // NOLINT: glibc's is safe
}

// O_NONBLOCK: a pipe in its place must not hold the caller up; the look at its type refuses it.
// Read access is for the look at the last byte.
bool OpenQueue(const std::string& path, ScopedFd& queue, std::string& error) {
  constexpr int FLAGS = O_RDWR | O_APPEND | O_CLOEXEC | O_NONBLOCK;
  for (;;) {
    ScopedFd opened(open(path.c_str(), FLAGS));
    if (opened.fd < 0 && errno == ENOENT) {
      ScopedFd created(open(path.c_str(), FLAGS | O_CREAT | O_EXCL, 0600));
      if (created.fd < 0 && errno == EEXIST) {
        continue;
      }
      if (created.fd >= 0 && fchmod(created.fd, 0600) != 0) {
        error = Reason("set the mode of", path);
        return false;
      }
      opened.Swap(created);
    }
    if (opened.fd < 0) {
      error = Reason("open", path);
      return false;
    }
    queue.Swap(opened);
    return true;
  }
}

bool WaitForLock(const ScopedFd& queue, const std::string& path, Clock::time_point deadline,
                 std::string& error) {
  auto nap = FIRST_NAP;
  while (flock(queue.fd, LOCK_EX | LOCK_NB) != 0) {
    if (errno != EWOULDBLOCK && errno != EINTR) {
      error = Reason("lock", path);
      return false;
    }
    if (Clock::now() >= deadline) {
      error = "cannot lock " + path + ": another program holds it";
      return false;
    }
    std::this_thread::sleep_for(nap);
    nap = std::min(nap * 2, LONGEST_NAP);
  }
  return true;
}

// Opens the queue file and takes its lock; `size` is then its length in bytes.
bool LockQueue(const std::string& path, ScopedFd& queue, off_t& size, std::string& error) {
  const Clock::time_point deadline = Clock::now() + LOCK_WAIT;
  for (;;) {
    ScopedFd opened;
    if (!OpenQueue(path, opened, error) || !WaitForLock(opened, path, deadline, error)) {
      return false;
    }
    struct stat held {};
    if (fstat(opened.fd, &held) != 0) {
      error = Reason("look at", path);
      return false;
    }
    if (!S_ISREG(held.st_mode)) {
      error = path + " is no regular file";
      return false;
    }
    struct stat named {};
    if (stat(path.c_str(), &named) == 0 && named.st_dev == held.st_dev &&
        named.st_ino == held.st_ino) {
      size = held.st_size;
      queue.Swap(opened);
      return true;
    }
    if (Clock::now() >= deadline) {
      error = "cannot lock " + path + ": it is moved away again and again";
      return false;
    }
  }
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
  error = Reason("write to", path);
  if (written > 0 && ftruncate(queue.fd, size) != 0) {
    error += "; and it could not be undone";
  }
  return false;
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

uint64_t CountLines(const ScopedFd& file) {
  std::vector<char> buffer(COUNT_BUFFER);
  uint64_t lines = 0;
  char last = '\n';
  for (;;) {
    const ssize_t length = read(file.fd, buffer.data(), buffer.size());
    if (length < 0 && errno == EINTR) {
      continue;
    }
    if (length <= 0) {
      return last == '\n' ? lines : lines + 1;
    }
    lines += static_cast<uint64_t>(std::count(buffer.begin(), buffer.begin() + length, '\n'));
    last = buffer[static_cast<size_t>(length) - 1];
  }
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

namespace {

enum class Durability { NONE, SYNCED };

bool SyncFolder(const std::string& folder, std::string& error) {
  const ScopedFd opened(open(folder.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
  if (opened.fd < 0 || fsync(opened.fd) != 0) {
    error = Reason("sync", folder);
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
  off_t size = 0;
  if (!LockQueue(path, queue, size, error)) {
    return false;
  }
  if (EndsInsideLine(queue, size)) {
    text.insert(text.begin(), '\n');
  }
  if (!WriteWhole(queue, path, text, size, error)) {
    return false;
  }
  if (durability == Durability::SYNCED && fsync(queue.fd) != 0) {
    error = Reason("sync", path);
    return false;
  }

  // The one unlock. Whoever waits for the lock must find the lines written.
  if (close(queue.Release()) != 0 && errno != EINTR) {
    error = Reason("close", path);
    return false;
  }
  return durability == Durability::NONE || SyncFolder(ShareFolder(share_name), error);
}

}  // namespace

bool AppendToQueue(const std::string& share_name, const std::vector<std::string>& lines,
                   std::string& error) {
  return Append(share_name, lines, Durability::NONE, error);
}

bool AppendToQueueDurably(const std::string& share_name, const std::vector<std::string>& lines,
                          std::string& error) {
  return Append(share_name, lines, Durability::SYNCED, error);
}

uint64_t WaitingLines(const std::string& share_name) {
  QueueFiles files;
  OpenQueueFiles(share_name, files);
  const uint64_t queued = files.queue.fd >= 0 ? CountLines(files.queue) : 0;
  return queued + (files.drained.fd >= 0 ? CountLines(files.drained) : 0);
}

}  // namespace fileindexd
