// SPDX-License-Identifier: GPL-2.0-or-later
#include <poll.h>
#include <sys/inotify.h>
#include <sys/socket.h>
#include <sys/un.h>
#include <unistd.h>

#include <array>
#include <csignal>
#include <cstddef>
#include <cstring>

#include "daemon/daemon.h"
#include "platform/log.h"
#include "worker/worker.h"

namespace fileindexd {

namespace {

constexpr int BACKLOG = 10;
constexpr time_t WAIT_TIMEOUT = 10;  // seconds
constexpr size_t EVENT_BUFFER_SIZE = 16384;
constexpr const char QUEUE_NAME[] = "TALO@file_index_queue";
// Its final NUL is part of the comparison, so that longer names do not match.
constexpr size_t QUEUE_NAME_SIZE = sizeof(QUEUE_NAME);

bool IsQueueWritten(const inotify_event& event) {
  return (event.mask & IN_CLOSE_WRITE) != 0 && event.len >= QUEUE_NAME_SIZE &&
         memcmp(event.name, QUEUE_NAME, QUEUE_NAME_SIZE) == 0;
}

// What is waited for; a set of bits would have no room for the high numbers that are left over
// where whoever started the process left many descriptors open.
struct Readable {
  Readable(int inotify_fd, int socket_fd)
      : fds{{{inotify_fd, POLLIN, 0}, {socket_fd, POLLIN, 0}}} {}
  bool HasEvents() const { return fds[0].revents != 0; }
  bool HasClient() const { return fds[1].revents != 0; }

  std::array<pollfd, 2> fds;
};

// Waits for one of the two to be readable, with SIGTERM and SIGINT let through. As poll.
int WaitReadable(Readable& readable) {
  sigset_t mask;
  pthread_sigmask(SIG_BLOCK, nullptr, &mask);
  sigdelset(&mask, SIGTERM);
  sigdelset(&mask, SIGINT);

  // A wait that finds something readable runs no handler: under a stream of clients a signal would
  // stay pending. One with nothing to find does.
  const timespec at_once = {0, 0};
  if (ppoll(nullptr, 0, &at_once, &mask) < 0) {
    return -1;
  }

  const timespec timeout = {WAIT_TIMEOUT, 0};
  return ppoll(readable.fds.data(), readable.fds.size(), &timeout, &mask);
}

}  // namespace

bool Daemon::SetupDomainSocket() {
  socket_fd = socket(AF_UNIX, SOCK_STREAM, 0);
  if (socket_fd < 0) {
    FI_LOG("socket failed, reason=%m");
    return false;
  }

  unlink(SOCKET_PATH);  // left by an earlier run; usually there is none

  // The length counts the family and the path without its NUL.
  constexpr socklen_t ADDRESS_SIZE = 26;
  sockaddr_un address = {};
  address.sun_family = AF_UNIX;
  static_assert(offsetof(sockaddr_un, sun_path) + 24 == ADDRESS_SIZE);
  strncpy(address.sun_path, SOCKET_PATH, sizeof(address.sun_path) - 1);
  if (bind(socket_fd, reinterpret_cast<const sockaddr*>(&address), ADDRESS_SIZE) != 0) {
    FI_LOG("bind failed, reason=%m");
    return false;
  }

  if (listen(socket_fd, BACKLOG) != 0) {
    FI_LOG("listen failed, reason=%m");
    return false;
  }
  return true;
}

bool Daemon::SetupInotify() {
  inotify_fd = inotify_init();  // NOLINT(android-cloexec-inotify-init): children close what is ours
  if (inotify_fd < 0) {
    FI_LOG("inotify_init failed, reason=%m");
    return false;
  }
  return true;
}

void Daemon::MainLoop() {
  while (stop_requested == 0) {
    LoopOnce();
  }
  FI_LOG("Daemon Leaving main loop");
}

void Daemon::LoopOnce() {
  Readable readable(inotify_fd, socket_fd);
  if (WaitReadable(readable) <= 0) {
    // Quiet, or a signal: housekeeping. Wanted: under a steady stream of work it waits.
    ReapFinishedWorkers();
    CheckResumeTime();
    return;
  }

  try {
    if (readable.HasEvents()) {
      HandleQueueEvents();
    }
    if (readable.HasClient()) {
      HandleCommand();
    }
  } catch (...) {  // the main thread is never cancelled
    FI_LOG("MainLoop exception ...");
  }
}

void Daemon::HandleQueueEvents() {
  alignas(inotify_event) char buffer[EVENT_BUFFER_SIZE] = {};
  const ssize_t size = read(inotify_fd, buffer, sizeof(buffer));

  for (ssize_t offset = 0; offset < size;) {
    const auto& event = *reinterpret_cast<const inotify_event*>(buffer + offset);
    offset += static_cast<ssize_t>(sizeof(inotify_event) + event.len);
    if (!IsQueueWritten(event)) {
      continue;
    }

    Worker* worker = FindWorkerByWd(event.wd);
    if (worker == nullptr) {
      FI_LOG("Failed to get worker for wd=%d", event.wd);
      continue;
    }

    // A running thread looks for the queue file again after each pass.
    if (worker->state == WORKER_IDLE) {
      worker->Respawn();
    } else if (worker->state == WORKER_FINISHED) {
      StopWorkerThread(worker);
      if (!worker->abandoned) {
        worker->Respawn();
      }
    }
  }
}

Worker* Daemon::FindWorkerByWd(int wd) {
  for (const auto& [share_name, worker] : workers) {
    if (worker->wd == wd) {
      return worker;
    }
  }
  return nullptr;
}

void Daemon::ReapFinishedWorkers() {
  for (auto it = workers.begin(); it != workers.end();) {
    Worker* worker = (it++)->second;  // stopping may take the entry out
    if (worker->state == WORKER_FINISHED && !StopWorkerThread(worker)) {
      FI_LOG("Failed to stop worker=%s", worker->share_name.c_str());
    }
  }
}

void Daemon::CheckResumeTime() {
  if (resume_time >= 1 && resume_time < time(nullptr)) {
    Resume();
  }
}

}  // namespace fileindexd
