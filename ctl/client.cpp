// SPDX-License-Identifier: GPL-2.0-or-later
#include "ctl/client.h"

#include <sys/socket.h>
#include <sys/un.h>
#include <unistd.h>

#include <cerrno>
#include <chrono>
#include <cstdint>
#include <cstring>

#include "base/scoped_fd.h"
#include "ctl/output.h"

namespace fileindexd {

namespace {

using Clock = std::chrono::steady_clock;

// The longest stop of a Worker, 52 s, and some of the time that another client's command takes.
constexpr std::chrono::seconds PATIENCE(70);

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

// One send where the kernel takes it: a daemon that reads a broken request has to wait for its end.
bool SendAll(int fd, const std::string& bytes, Clock::time_point deadline) {
  size_t sent = 0;
  while (sent < bytes.size()) {
    if (!WaitAtMostUntil(fd, SO_SNDTIMEO, deadline)) {
      return false;
    }

    const ssize_t count = send(fd, bytes.data() + sent, bytes.size() - sent, MSG_NOSIGNAL);
    if (count < 0 && errno == EINTR) {
      continue;
    }
    if (count < 0) {
      return false;
    }

    sent += static_cast<size_t>(count);
  }
  return true;
}

bool ReceiveReply(int fd, int32_t& reply, Clock::time_point deadline) {
  char bytes[sizeof(reply)];
  size_t received = 0;
  while (received < sizeof(bytes)) {
    if (!WaitAtMostUntil(fd, SO_RCVTIMEO, deadline)) {
      return false;
    }

    const ssize_t count = recv(fd, bytes + received, sizeof(bytes) - received, 0);
    if (count < 0 && errno == EINTR) {
      continue;
    }
    if (count <= 0) {
      return false;
    }

    received += static_cast<size_t>(count);
  }

  memcpy(&reply, bytes, sizeof(reply));
  return true;
}

}  // namespace

Reply AskDaemon(const std::string& type, const Json::Value& data) {
  const Clock::time_point deadline = Clock::now() + PATIENCE;
  ScopedFd socket_fd(socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0));
  if (socket_fd.fd < 0) {
    return Reply::NO_ANSWER;
  }

  // With a full backlog connect() waits as well.
  sockaddr_un address = {};
  address.sun_family = AF_UNIX;
  strncpy(address.sun_path, CONTROL_SOCKET, sizeof(address.sun_path) - 1);
  if (!WaitAtMostUntil(socket_fd.fd, SO_SNDTIMEO, deadline)) {
    return Reply::NO_ANSWER;
  }
  if (connect(socket_fd.fd, reinterpret_cast<const sockaddr*>(&address), sizeof(address)) != 0) {
    const bool nobody = errno == ENOENT || errno == ECONNREFUSED;
    return nobody ? Reply::NOT_RUNNING : Reply::NO_ANSWER;
  }

  Json::Value command(Json::objectValue);
  command["type"] = type;
  command["data"] = data;
  const std::string body = ToText(command);
  const auto length = static_cast<uint32_t>(body.size() + 1);  // with its NUL
  std::string request(sizeof(length), '\0');
  memcpy(request.data(), &length, sizeof(length));
  request.append(body.c_str(), length);

  int32_t reply = -1;
  if (!SendAll(socket_fd.fd, request, deadline) || !ReceiveReply(socket_fd.fd, reply, deadline)) {
    return Reply::NO_ANSWER;
  }

  return reply == 0 ? Reply::DONE : Reply::REFUSED;
}

int CodeOfReply(Reply reply, const std::string& subject) {
  switch (reply) {
    case Reply::DONE:
    case Reply::NOT_RUNNING:
      return EXIT_DONE;
    case Reply::REFUSED:
      return Fail(EXIT_FAILED, "%s: the daemon could not do it, its log tells why",
                  subject.c_str());
    case Reply::NO_ANSWER:
      break;
  }
  return Fail(EXIT_NO_DAEMON, "%s: the daemon does not answer", subject.c_str());
}

int CodeOfNeededReply(Reply reply, const std::string& subject) {
  if (reply == Reply::NOT_RUNNING) {
    return Fail(EXIT_NO_DAEMON, "%s: the daemon does not run", subject.c_str());
  }

  return CodeOfReply(reply, subject);
}

}  // namespace fileindexd
