// SPDX-License-Identifier: GPL-2.0-or-later
//
// DESIGN. One connection, one command, one reply:
//
//   request = length body      length: 4 bytes, unsigned, host byte order: bytes of the body
//                              body:   a JSON object and its NUL, which `length` counts
//   object  = {"type": string, "data": object}
//   reply   = 4 bytes, signed, host byte order: 0 done, -1 not
//
// The main thread serves it to the end before it looks at anything else, so a client gets 10 s for
// its whole request.
#include <poll.h>
#include <sys/socket.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstdint>
#include <cstdlib>
#include <cstring>

#include "base/scoped_fd.h"
#include "daemon/daemon.h"
#include "platform/json.h"
#include "platform/log.h"

namespace fileindexd {

namespace {

constexpr uint32_t MAX_LENGTH = 64U << 20;
constexpr size_t READ_SIZE = 1024;
constexpr int EINTR_TRIES = 3;
constexpr int64_t REQUEST_TIMEOUT_MS = 10000;

int64_t NowMs() {
  timespec now = {};
  clock_gettime(CLOCK_MONOTONIC, &now);
  return static_cast<int64_t>(now.tv_sec) * 1000 + now.tv_nsec / 1000000;
}

// One read of at most `size` bytes, before `deadline`. As read; a peer that has gone and a time
// that has run out are errors.
ssize_t ReadBefore(int fd, void* buffer, size_t size, int64_t deadline) {
  const int64_t left = deadline - NowMs();
  if (left <= 0) {
    errno = ETIMEDOUT;
    return -1;
  }

  pollfd poll_fd = {fd, POLLIN, 0};
  const int ready = poll(&poll_fd, 1, static_cast<int>(left));
  if (ready < 0) {
    return -1;
  }
  if (ready == 0) {
    errno = ETIMEDOUT;
    return -1;
  }

  const ssize_t got = read(fd, buffer, size);
  if (got == 0) {
    errno = ECONNRESET;
    return -1;
  }
  return got;
}

bool ReadFully(int fd, size_t size, void* buffer, int64_t deadline) {
  int tries = EINTR_TRIES;
  for (size_t offset = 0; offset < size;) {
    const ssize_t got = ReadBefore(fd, static_cast<char*>(buffer) + offset,
                                   std::min(size - offset, READ_SIZE), deadline);
    if (got >= 0) {
      offset += static_cast<size_t>(got);
    } else if (errno != EINTR || tries-- == 0) {
      FI_LOG("Failed to read from domain socket, reason=%m");
      return false;
    }
  }
  return true;
}

struct Buffer {
  ~Buffer() { free(bytes); }
  bool Resize(size_t size) {
    void* grown = realloc(bytes, size);
    if (grown == nullptr) {
      return false;
    }
    bytes = static_cast<char*>(grown);
    return true;
  }
  void Free() {
    free(bytes);
    bytes = nullptr;
  }

  char* bytes = nullptr;
};

// Receives one request; `body` ends at its first NUL, or with the request.
bool Receive(int fd, Buffer& buffer, std::string& body) {
  const int64_t deadline = NowMs() + REQUEST_TIMEOUT_MS;
  uint32_t length = 0;
  if (!buffer.Resize(sizeof(length)) || !ReadFully(fd, sizeof(length), buffer.bytes, deadline)) {
    FI_LOG("Receive command length failed");
    return false;
  }

  memcpy(&length, buffer.bytes, sizeof(length));
  if (length == 0 || length > MAX_LENGTH || !buffer.Resize(length) ||
      !ReadFully(fd, length, buffer.bytes, deadline)) {
    FI_LOG("Receive command body failed");
    return false;
  }

  body.assign(buffer.bytes, strnlen(buffer.bytes, length));
  return true;
}

bool Parse(const std::string& body, Json::Value& command) {
  if (!command.fromString(body) || !command.isObject() || !command.isMember("type") ||
      !command.isMember("data") || !command["data"].isObject()) {
    FI_LOG("Malformed command: %s", body.c_str());
    return false;
  }
  return true;
}

bool SetLogLevel(const std::string& level) {
  if (level == "debug") {
    TALO::FILEINDEX::LOG_LEVEL = LOG_LEVEL_DEBUG;
  } else if (level == "error") {
    TALO::FILEINDEX::LOG_LEVEL = LOG_LEVEL_ERROR;
  } else {
    FI_LOG("Unknown log level: %s", level.c_str());
    return false;
  }
  return true;
}

bool ReviveWorker(Daemon& daemon, const std::string& share_name) {
  daemon.DeleteWorker(share_name);
  if (!daemon.CreateWorker(share_name, true)) {
    FI_LOG("CreateWorker failed, share=%s", share_name.c_str());
    return false;
  }
  return true;
}

std::string Text(const Json::Value& data, const char* key) {
  return data.get(key, "").asString();
}

bool CarryOut(Daemon& daemon, const std::string& type, const Json::Value& data) {
  if (type == "set_log_level") {
    return SetLogLevel(Text(data, "log_level"));
  }
  if (type == "pause") {
    daemon.SetPaused(data.get("resume_time", 0).asInt64());
    return true;
  }
  if (type == "resume") {
    daemon.Resume();
    return true;
  }
  if (type == "upsert_folder_setting") {
    return daemon.UpsertFolderSetting(Text(data, "folder_path"));
  }
  if (type == "delete_folder_setting") {
    return daemon.DeleteFolderSetting(Text(data, "folder_path"));
  }
  if (type == "delete_share_worker") {
    daemon.DeleteWorker(Text(data, "share_name"));
    return true;
  }
  if (type == "revive_share_worker") {
    return ReviveWorker(daemon, Text(data, "share_name"));
  }

  FI_LOG("Unknown command type: %s", type.c_str());
  return false;
}

bool Serve(Daemon& daemon, int fd, Buffer& buffer) {
  std::string body;
  Json::Value command;
  if (!Receive(fd, buffer, body) || !Parse(body, command)) {
    return false;
  }

  const std::string type = command.get("type", "").asString();
  const Json::Value data = command["data"];
  FI_DEBUG("Got command: %s", command.toString().c_str());
  return CarryOut(daemon, type, data);
}

}  // namespace

void Daemon::HandleCommand() {
  ScopedFd connection(accept4(socket_fd, nullptr, nullptr, SOCK_CLOEXEC));
  if (connection.fd < 0) {
    FI_LOG("accept failed, reason=%m");
    return;
  }

  Buffer buffer;
  const int32_t reply = Serve(*this, connection.fd, buffer) ? 0 : -1;
  FI_DEBUG("Replying socket: %d", reply);

  buffer.Free();
  (void)!write(connection.fd, &reply, sizeof(reply));  // the client may have gone
  connection.Close();
}

}  // namespace fileindexd
