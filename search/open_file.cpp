// SPDX-License-Identifier: GPL-2.0-or-later
#include "search/open_file.h"

#include <fcntl.h>
#include <sys/stat.h>

#include <cerrno>
#include <cstring>

#include "state/open_path.h"
#include "state/statx_look.h"

namespace fileindexd {

namespace {

// By way of the descriptor that was looked at: nothing can come between.
int OpenSeen(int seen) {
  const std::string path = "/proc/self/fd/" + std::to_string(seen);
  constexpr int FLAGS = O_RDONLY | O_NONBLOCK | O_NOCTTY | O_CLOEXEC;
  const int fd = open(path.c_str(), FLAGS | O_NOATIME);
  // Only a file's owner, or root, may read without being noticed.
  return fd < 0 && errno == EPERM ? open(path.c_str(), FLAGS) : fd;
}

}  // namespace

bool IsStill(int file, const FileIdentity& identity) {
  struct statx st {};
  if (statx(file, "", AT_EMPTY_PATH, WANTED, &st) != 0 || !S_ISREG(st.stx_mode)) {
    return false;
  }

  const int64_t birth = (st.stx_mask & STATX_BTIME) != 0 ? Nanoseconds(st.stx_btime) : 0;
  return FileIdentity{st.stx_ino, birth, static_cast<int64_t>(st.stx_size),
                      Nanoseconds(st.stx_mtime)} == identity;
}

// What the host or the disk may get over is no file's fault: a failure is on record for good.
Opening OpeningOfError(int error, std::string& reason) {
  switch (error) {
    case ENOENT:
    case ENOTDIR:
    case ELOOP:
    case ENAMETOOLONG:
    case ESTALE:
    case ENXIO:
    case EAGAIN:  // somebody holds a lease on it
      return Opening::CHANGED;
    case EACCES:
    case EPERM:
    case EFBIG:
    case EOVERFLOW:
      reason = std::string("cannot be opened: ") + strerrordesc_np(error);
      return Opening::REFUSED;
    case EMFILE:
    case ENFILE:
    case ENOMEM:
    case ENOBUFS:
    case EINTR:
      reason = strerrordesc_np(error);
      return Opening::LATER;
    default:
      reason = std::string("cannot be opened: ") + strerrordesc_np(error);
      return Opening::UNREAD;
  }
}

Opening OpenFile(const Share& share, const std::string& path, const FileIdentity& identity,
                 ScopedFd& file, std::string& reason) {
  const ScopedFd seen(OpenInShare(share.path, path));
  if (seen.fd < 0) {
    return OpeningOfError(errno, reason);
  }
  if (!IsStill(seen.fd, identity)) {
    return Opening::CHANGED;
  }

  ScopedFd opened(OpenSeen(seen.fd));
  if (opened.fd < 0) {
    return OpeningOfError(errno, reason);
  }

  file.Swap(opened);
  return Opening::DONE;
}

}  // namespace fileindexd
