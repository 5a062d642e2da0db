// SPDX-License-Identifier: GPL-2.0-or-later
//
// DESIGN. One drain:
//
//   queue file --(flock, rename)--> drained copy --(read)--> OpTree --(Worker)--> copy removed
//
// A copy that is still there, because the Worker was stopped or the daemon killed, is read again by
// the next drain, without the lock: nobody writes to it.
#include "optree/queue.h"

#include <fcntl.h>
#include <sys/file.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>
#include <cstdlib>
#include <exception>
#include <memory>
#include <new>

#include "base/scoped_fd.h"
#include "base/scoped_stream.h"
#include "optree/event.h"
#include "platform/log.h"
#include "platform/share.h"

namespace fileindexd {

namespace {

constexpr int LOCK_TRIES = 16;
constexpr int RENAME_TRIES = 16;
constexpr useconds_t BACK_OFF_US = 10000;  // times 0 to 9
// Of a pipe, neither the opening nor the reading may wait. Of a file nothing ever does.
constexpr int READING = O_RDONLY | O_CLOEXEC | O_NONBLOCK;

// The queue file's descriptor while it is locked. Its number is released twice, see Unlock; the
// destructor stands behind the steps for a thread that is cancelled.
class QueueLock {
 public:
  // False when the drain ends here.
  bool Take(const std::string& queue_path);
  void MoveAside(const std::string& queue_path, const std::string& drained_path) const;
  void Unlock() const;
  void ReleaseAgain();

 private:
  ScopedFd queue;
};

bool QueueLock::Take(const std::string& queue_path) {
  int error = 0;
  for (int tries = 0; tries < LOCK_TRIES; ++tries) {
    ScopedFd opened(OpenDescriptor(queue_path.c_str(), READING));
    if (opened.fd < 0) {
      return false;  // no queue, nothing to do
    }

    if (flock(opened.fd, LOCK_EX | LOCK_NB) == 0) {
      queue.Swap(opened);
      return true;
    }
    if (errno != EAGAIN && errno != EINTR) {
      FI_DEBUG("flock fail, path=%s, reason=%m", queue_path.c_str());
      flock(opened.fd, LOCK_UN);
      opened.Close();
      return false;
    }

    error = errno;
    opened.Close();
    // The standard generator, seeded once at start-up, locks within itself.
    usleep(static_cast<useconds_t>(rand() % 10) * BACK_OFF_US);  // NOLINT(concurrency-mt-unsafe)
  }

  errno = error;
  FI_LOG("try lock too many times, path=%s, reason=%m", queue_path.c_str());
  return false;
}

void QueueLock::MoveAside(const std::string& queue_path, const std::string& drained_path) const {
  for (int tries = 0; tries < RENAME_TRIES; ++tries) {
    if (rename(queue_path.c_str(), drained_path.c_str()) == 0) {
      return;
    }
    sleep(1);  // NOLINT(concurrency-mt-unsafe): leaves signals alone here
  }
  // Wanted: passed over in silence. Opening the drained copy will fail, and say so.
}

// The drain releases this number a second time at its end. Were it free in between, another thread
// could have been given it. So the file is closed by putting a harmless descriptor, the daemon's
// standard input, in its place. Where that cannot be, the unlocked file itself keeps the place.
void QueueLock::Unlock() const {
  flock(queue.fd, LOCK_UN);
  dup3(STDIN_FILENO, queue.fd, O_CLOEXEC);
}

void QueueLock::ReleaseAgain() {
  if (queue.fd >= 0) {
    flock(queue.fd, LOCK_UN);
    queue.Close();
  }
}

struct LineBuffer {
  ~LineBuffer() { free(text); }

  char* text = nullptr;
  size_t capacity = 0;
};

// 0, or why not all lines were read and inserted, bad ones aside.
int InsertLines(OpTree& tree, FILE* stream) {
  LineBuffer buffer;
  std::string line;
  int lost = 0;
  for (;;) {
    errno = 0;
    const ssize_t length = getline(&buffer.text, &buffer.capacity, stream);
    if (length < 0) {
      const bool is_end = feof(stream) != 0 && ferror(stream) == 0;
      return is_end ? lost : errno != 0 ? errno : EIO;
    }

    line.assign(buffer.text, static_cast<size_t>(length));
    if (line.ends_with('\n')) {
      line.pop_back();
    }

    bool inserted = false;
    try {
      inserted = AddEvent(tree, line);
    } catch (const std::bad_alloc&) {
      lost = ENOMEM;  // nothing is wrong with the line
    } catch (const std::exception&) {
      inserted = false;  // one line is lost, not the batch
    }
    if (!inserted) {
      FI_LOG("Failed to insert event: %s", line.c_str());
    }
  }
}

bool IsRegularFile(int fd) {
  struct stat found = {};
  return fstat(fd, &found) == 0 && S_ISREG(found.st_mode);
}

OpTree* ReadDrained(const std::string& share_path, const std::string& drained_path) {
  // Not fopen, which does not say whether its file is left open by a thread that is cancelled.
  ScopedFd opened(OpenDescriptor(drained_path.c_str(), READING));
  ScopedFile stream(opened.fd < 0 ? nullptr : fdopen(opened.fd, "r"));
  if (stream.file == nullptr) {
    const int error = errno;
    FI_LOG("Failed to open queue, path=%s, reason=%m", drained_path.c_str());
    // What is not there is still in the queue file. What is there, the caller removes.
    if (error != ENOENT) {
      TALO::FILEINDEX::NoteLostChanges(share_path, error);
    }
    return nullptr;
  }

  (void)opened.Release();  // the stream's now

  auto tree = std::make_unique<OpTree>(share_path);
  const int lost = IsRegularFile(fileno(stream.file)) ? InsertLines(*tree, stream.file) : EINVAL;
  stream.Close();
  if (lost != 0) {
    TALO::FILEINDEX::NoteLostChanges(share_path, lost);
  }
  return tree.release();
}

}  // namespace

OpTree* ReadQueue(const std::string& share_path, const std::string& queue_path) {
  const std::string drained_path = queue_path + ".tmp";
  if (access(drained_path.c_str(), F_OK) == 0) {
    // Wanted: a copy left by an earlier drain is read with no lock; newer lines wait for the next.
    return ReadDrained(share_path, drained_path);
  }

  QueueLock lock;
  if (!lock.Take(queue_path)) {
    return nullptr;
  }

  lock.MoveAside(queue_path, drained_path);
  lock.Unlock();
  std::unique_ptr<OpTree> tree(ReadDrained(share_path, drained_path));
  lock.ReleaseAgain();
  return tree.release();
}

}  // namespace fileindexd
