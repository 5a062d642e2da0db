// SPDX-License-Identifier: GPL-2.0-or-later
#include "extract/passed_files.h"

#include <sys/socket.h>

#include <algorithm>
#include <cassert>
#include <cerrno>
#include <cstring>

namespace fileindexd {

namespace {

// Room for the files' numbers, and the message around it and the bytes.
struct Message {
  explicit Message(iovec bytes, size_t files) : content(bytes) {
    assert(files <= MOST_PASSED_FILES);
    head.msg_iov = &content;
    head.msg_iovlen = 1;
    if (files > 0) {
      head.msg_control = control;
      head.msg_controllen = CMSG_LEN(files * sizeof(int));
    }
  }
  Message(const Message&) = delete;
  Message& operator=(const Message&) = delete;

  iovec content;
  alignas(cmsghdr) char control[CMSG_SPACE(MOST_PASSED_FILES * sizeof(int))] = {};
  msghdr head = {};
};

}  // namespace

bool SendWithFiles(int socket, std::string_view bytes, std::span<const int> files, int flags) {
  Message message({const_cast<char*>(bytes.data()), bytes.size()}, files.size());
  if (!files.empty()) {
    cmsghdr* control = CMSG_FIRSTHDR(&message.head);
    control->cmsg_level = SOL_SOCKET;
    control->cmsg_type = SCM_RIGHTS;
    control->cmsg_len = CMSG_LEN(files.size_bytes());
    memcpy(CMSG_DATA(control), files.data(), files.size_bytes());
  }
  return sendmsg(socket, &message.head, flags | MSG_NOSIGNAL) == static_cast<ssize_t>(bytes.size());
}

ssize_t ReceiveWithFiles(int socket, std::span<char> bytes, std::span<ScopedFd> files) {
  Message message({bytes.data(), bytes.size()}, files.size());
  const ssize_t length = recvmsg(socket, &message.head, MSG_CMSG_CLOEXEC);
  if (length < 0) {
    return -1;
  }

  const cmsghdr* control = CMSG_FIRSTHDR(&message.head);
  const bool has_files = control != nullptr && control->cmsg_type == SCM_RIGHTS;
  const size_t count = has_files ? (control->cmsg_len - CMSG_LEN(0)) / sizeof(int) : 0;
  for (size_t i = 0; i < files.size(); ++i) {
    ScopedFd received;
    if (i < count) {
      memcpy(&received.fd, CMSG_DATA(control) + i * sizeof(int), sizeof(int));
    }
    files[i].Swap(received);
  }
  if ((message.head.msg_flags & MSG_CTRUNC) == 0) {
    return length;
  }
  std::for_each(files.begin(), files.end(), [](ScopedFd& file) { file.Close(); });
  errno = EMFILE;
  return -1;
}

}  // namespace fileindexd
