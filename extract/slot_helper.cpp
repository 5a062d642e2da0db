// SPDX-License-Identifier: GPL-2.0-or-later
// A slot's dealings with its helper: started, given jobs, listened to, dropped.
#include <sys/socket.h>
#include <unistd.h>

#include <cerrno>

#include "extract/error_text.h"
#include "extract/helper_codes.h"
#include "extract/passed_files.h"
#include "extract/slot.h"

namespace fileindexd {

namespace {

// A process that ends closes its socket a moment before it is seen to have ended.
constexpr std::chrono::seconds GRACE(2);

}  // namespace

bool Slot::Hand(int file, const std::string& name, std::string& error) {
  const bool is_old = helper.IsThere();
  if (!is_old && !Start(error)) {
    return false;
  }
  has_begun = false;
  if (Send(file, name)) {
    return true;
  }

  const bool is_gone = errno == EPIPE;
  if (is_gone && !is_old) {
    return true;  // its end will be judged
  }
  error = "helper: " + ErrorText(errno);
  DropHelper();
  // One that ended while it had nothing to do has nothing to do with this file.
  return is_gone && Hand(file, name, error);
}

bool Slot::Start(std::string& error) {
  int ends[2] = {-1, -1};
  if (socketpair(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0, ends) != 0) {
    error = "socket: " + ErrorText(errno);
    return false;
  }

  ScopedFd ours(ends[0]);
  const ScopedFd theirs(ends[1]);
  helper_start = starter.Ask(options.program, {SERVE_MODE}, {-1, -1, theirs.fd}, error);
  if (helper_start == 0) {
    return false;
  }
  socket.Swap(ours);
  received.clear();
  is_ready = false;
  is_closing = false;
  jobs_done = 0;
  return true;
}

// The message is small and the socket empty: it goes as a whole or not at all. False with errno.
bool Slot::Send(int file, const std::string& name) {
  if (lseek(file, 0, SEEK_SET) != 0) {
    return false;
  }

  const std::string frame = EncodeJob({static_cast<uint32_t>(options.text_cap), name});
  return SendWithFiles(socket.fd, frame, {&file, 1}, MSG_DONTWAIT);
}

void Slot::Receive(Clock::time_point now) {
  char buffer[64 * 1024];
  const size_t most = MaxFrame(options.text_cap) + 1;
  while (!is_closing && socket.fd >= 0 && received.size() < most) {
    const ssize_t length = recv(socket.fd, buffer, sizeof(buffer), MSG_DONTWAIT);
    if (length < 0 && (errno == EAGAIN || errno == EINTR)) {
      return;
    }
    if (length <= 0) {
      is_closing = true;
      grace = now + GRACE;
      return;
    }
    received.append(buffer, static_cast<size_t>(length));
  }
}

void Slot::DropHelper() {
  if (helper_start != 0) {
    starter.Drop(std::exchange(helper_start, 0), helper);
  }
  Kill(helper);
  if (helper.IsThere()) {
    dying.emplace_back().Swap(helper);
  }
  socket.Close();
  received.clear();
  is_closing = false;
}

void Slot::AddPolled(std::vector<pollfd>& polled) const {
  if (helper.IsThere()) {
    polled.push_back({helper.pid_fd.fd, POLLIN, 0});
    if (!is_closing) {
      polled.push_back({socket.fd, POLLIN, 0});
    }
  }
  if (converter.IsThere()) {
    polled.push_back({converter.pid_fd.fd, POLLIN, 0});
  }
}

}  // namespace fileindexd
