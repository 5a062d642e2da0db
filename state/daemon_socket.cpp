// SPDX-License-Identifier: GPL-2.0-or-later
#include "state/daemon_socket.h"

#include <poll.h>
#include <sys/socket.h>
#include <sys/un.h>

#include <algorithm>
#include <cerrno>
#include <chrono>
#include <cstdint>
#include <cstring>

#include "base/scoped_fd.h"

namespace fileindexd {

namespace {

using Clock = std::chrono::steady_clock;
using std::chrono::milliseconds;

// The longest stop of a Worker, 52 s, and some of the time that another client's command takes.
constexpr std::chrono::seconds PATIENCE(70);
constexpr milliseconds CONNECT_SLICE(200);  // between two looks at `cancel_fd`

struct Conversation {
  ScopedFd socket;
  int cancel_fd = -1;
  Clock::time_point deadline;

  milliseconds Left() const {
    const auto left = std::chrono::ceil<milliseconds>(deadline - Clock::now());
    return std::max(left, milliseconds(0));
  }

  // False when it is cancelled, or nothing happens in time.
  bool Await(short events) const {
    for (;;) {
      pollfd watched[] = {{cancel_fd, POLLIN, 0}, {socket.fd, events, 0}};
      const int ready = poll(watched, 2, static_cast<int>(Left().count()));
      if (ready < 0 && errno == EINTR) {
        continue;
      }
      return ready > 0 && watched[0].revents == 0;
    }
  }

  bool IsCancelled() const {
    pollfd watched = {cancel_fd, POLLIN, 0};
    return poll(&watched, 1, 0) > 0;
  }
};

// While the daemon's backlog is full, connect() waits too, and no event tells of its end.
bool Connect(const Conversation& with) {
  sockaddr_un address = {};
  address.sun_family = AF_UNIX;
  strncpy(address.sun_path, CONTROL_SOCKET, sizeof(address.sun_path) - 1);
  for (;;) {
    const milliseconds slice = std::min(with.Left(), CONNECT_SLICE);
    if (slice.count() == 0 || with.IsCancelled()) {
      errno = ETIMEDOUT;
      return false;
    }

    timeval limit = {};
    limit.tv_usec = static_cast<suseconds_t>(slice.count() * 1000);
    if (setsockopt(with.socket.fd, SOL_SOCKET, SO_SNDTIMEO, &limit, sizeof(limit)) != 0) {
      return false;
    }
    if (connect(with.socket.fd, reinterpret_cast<const sockaddr*>(&address), sizeof(address)) ==
        0) {
      return true;
    }
    if (errno != EAGAIN && errno != EINTR) {
      return false;
    }
  }
}

// One send where the kernel takes it: a daemon that reads a broken request has to wait for its end.
bool SendAll(const Conversation& with, const std::string& bytes) {
  size_t sent = 0;
  while (sent < bytes.size()) {
    const ssize_t count =
        send(with.socket.fd, bytes.data() + sent, bytes.size() - sent, MSG_NOSIGNAL | MSG_DONTWAIT);
    if (count >= 0) {
      sent += static_cast<size_t>(count);
    } else if (errno == EAGAIN) {
      if (!with.Await(POLLOUT)) {
        return false;
      }
    } else if (errno != EINTR) {
      return false;
    }
  }
  return true;
}

bool ReceiveReply(const Conversation& with, int32_t& reply) {
  char bytes[sizeof(reply)];
  size_t received = 0;
  while (received < sizeof(bytes)) {
    if (!with.Await(POLLIN)) {
      return false;
    }

    const ssize_t count =
        recv(with.socket.fd, bytes + received, sizeof(bytes) - received, MSG_DONTWAIT);
    if (count == 0 || (count < 0 && errno != EINTR && errno != EAGAIN)) {
      return false;
    }
    received += count > 0 ? static_cast<size_t>(count) : 0;
  }

  memcpy(&reply, bytes, sizeof(reply));
  return true;
}

}  // namespace

Reply SendToDaemon(const std::string& command, int cancel_fd) {
  const Conversation with = {ScopedFd(socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0)), cancel_fd,
                             Clock::now() + PATIENCE};
  if (with.socket.fd < 0) {
    return Reply::NO_ANSWER;
  }
  if (!Connect(with)) {
    const bool nobody = errno == ENOENT || errno == ECONNREFUSED;
    return nobody ? Reply::NOT_RUNNING : Reply::NO_ANSWER;
  }

  const auto length = static_cast<uint32_t>(command.size() + 1);  // with its NUL
  std::string request(sizeof(length), '\0');
  memcpy(request.data(), &length, sizeof(length));
  request.append(command.c_str(), length);

  int32_t reply = -1;
  if (!SendAll(with, request) || !ReceiveReply(with, reply)) {
    return Reply::NO_ANSWER;
  }
  return reply == 0 ? Reply::DONE : Reply::REFUSED;
}

}  // namespace fileindexd
