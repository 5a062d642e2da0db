// SPDX-License-Identifier: GPL-2.0-or-later
#include "state/notifier.h"

#include <sys/socket.h>
#include <sys/un.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>
#include <string_view>

#include "base/scoped_fd.h"

namespace fileindexd {

namespace {

using Clock = std::chrono::steady_clock;

// Far above the status of any number of shares; below what would hurt whoever asks.
constexpr size_t LONGEST_REPLY = size_t{16} << 20;

// Lets one direction of the socket wait until `deadline`, and no longer.
bool WaitAtMostUntil(int fd, int direction, Clock::time_point deadline) {
  const auto left = std::chrono::duration_cast<std::chrono::microseconds>(deadline - Clock::now());
  if (left.count() <= 0) {
    errno = ETIMEDOUT;
    return false;
  }

  timeval limit = {};
  limit.tv_sec = static_cast<time_t>(left.count() / 1000000);
  limit.tv_usec = static_cast<suseconds_t>(left.count() % 1000000);
  return setsockopt(fd, SOL_SOCKET, direction, &limit, sizeof(limit)) == 0;
}

bool SendAll(int fd, std::string_view bytes, Clock::time_point deadline) {
  while (!bytes.empty()) {
    if (!WaitAtMostUntil(fd, SO_SNDTIMEO, deadline)) {
      return false;
    }

    const ssize_t count = send(fd, bytes.data(), bytes.size(), MSG_NOSIGNAL);
    if (count < 0 && errno != EINTR) {
      return false;
    }

    bytes.remove_prefix(count > 0 ? static_cast<size_t>(count) : 0);
  }
  return true;
}

// The first line that comes, without its newline.
bool ReceiveLine(int fd, std::string& line, Clock::time_point deadline) {
  std::string received;
  std::string buffer(65536, '\0');
  while (received.size() <= LONGEST_REPLY) {
    if (!WaitAtMostUntil(fd, SO_RCVTIMEO, deadline)) {
      return false;
    }

    const ssize_t count = recv(fd, buffer.data(), buffer.size(), 0);
    if (count < 0 && errno == EINTR) {
      continue;
    }
    if (count <= 0) {
      return false;
    }

    const std::string_view part(buffer.data(), static_cast<size_t>(count));
    const size_t end = part.find('\n');
    received.append(part.substr(0, end));
    if (end != std::string_view::npos) {
      line.swap(received);
      return true;
    }
  }
  return false;
}

}  // namespace

NotifierReply AskNotifier(const std::string& request, std::chrono::milliseconds patience,
                          std::string& reply) {
  const Clock::time_point deadline = Clock::now() + patience;
  const ScopedFd service(socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0));
  // With many who wait to be taken in, connect() waits as well.
  if (service.fd < 0 || !WaitAtMostUntil(service.fd, SO_SNDTIMEO, deadline)) {
    return NotifierReply::NO_ANSWER;
  }

  sockaddr_un address = {};
  address.sun_family = AF_UNIX;
  strncpy(address.sun_path, NOTIFIER_SOCKET, sizeof(address.sun_path) - 1);
  if (connect(service.fd, reinterpret_cast<const sockaddr*>(&address), sizeof(address)) != 0) {
    const bool nobody = errno == ENOENT || errno == ECONNREFUSED;
    return nobody ? NotifierReply::NOT_RUNNING : NotifierReply::NO_ANSWER;
  }

  const bool answered =
      SendAll(service.fd, request + "\n", deadline) && ReceiveLine(service.fd, reply, deadline);
  return answered ? NotifierReply::ANSWERED : NotifierReply::NO_ANSWER;
}

}  // namespace fileindexd
