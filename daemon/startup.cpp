// SPDX-License-Identifier: GPL-2.0-or-later
#include <sys/stat.h>
#include <unistd.h>

#include <csignal>
#include <cstdlib>
#include <string>

#include "daemon/daemon.h"
#include "platform/log.h"
#include "platform/status.h"
#include "platform/system.h"

namespace fileindexd {

namespace {

constexpr int ALREADY_ALIVE = 2;
constexpr const char* UPDATE_MARKER = "updater_hvx_60_meta2";

const std::string& PidFile() {
  static const std::string path = std::string("/var/run/") + PID_FILE_NAME;
  return path;
}

// The handler writes a log line, and logging locks: the signals are let through only while the main
// thread waits in its loop, never inside a library. Threads inherit the mask.
void BlockKillSignals() {
  sigset_t blocked;
  sigemptyset(&blocked);
  sigaddset(&blocked, SIGTERM);
  sigaddset(&blocked, SIGINT);
  pthread_sigmask(SIG_BLOCK, &blocked, nullptr);
}

bool LockWithin(pthread_mutex_t* mutex, time_t seconds) {
  timespec until = {};
  clock_gettime(CLOCK_REALTIME, &until);
  until.tv_sec += seconds;
  return pthread_mutex_timedlock(mutex, &until) == 0;
}

}  // namespace

volatile unsigned char stop_requested = 0;

void HandleKill(int signal_number) {
  FI_LOG("In kill handler(%d)", signal_number);
  stop_requested = 1;
}

int Daemon::Run() {
  BlockKillSignals();

  const int alive = IsAlive();
  if (alive == ALREADY_ALIVE) {
    FI_DEBUG("Daemon alive. No need to start");
    return alive;
  }
  if (alive == 0) {
    return CleanResource();
  }
  FI_DEBUG("Daemonized ...");

  srand(static_cast<unsigned>(time(nullptr)));
  signal(SIGTERM, HandleKill);
  signal(SIGINT, HandleKill);
  signal(SIGPIPE, SIG_IGN);
  FI_DEBUG("Signal handler set ...");

  if (!DoUpdate()) {
    FI_LOG("DoUpdate failed");
    return CleanResource();
  }
  FI_DEBUG("Update done ...");

  if (!SetupDomainSocket()) {
    FI_LOG("SetupDomainSocket failed");
    return CleanResource();
  }
  FI_DEBUG("Domain socket setup done ...");

  if (!SetupInotify()) {
    FI_LOG("SetupInotify failed");
    return CleanResource();
  }
  FI_DEBUG("inotify setup done ...");

  if (!SetupWorkers()) {
    FI_LOG("SetupWorkers failed");
    return CleanResource();
  }
  FI_DEBUG("Worker setup done ...");

  RunWorkers();
  FI_DEBUG("Workers start to run ...");
  StartSearchService();
  FI_DEBUG("Search daemon launched ...");

  MainLoop();
  return CleanResource();
}

int Daemon::IsAlive() {
  if (QLIBCProcAliveByPidFile(PidFile().c_str()) == 1) {
    return ALREADY_ALIVE;
  }
  return Daemonize() ? 1 : 0;
}

bool Daemon::Daemonize() {
  if (daemon(0, 0) != 0) {
    FI_LOG("Failed to become a daemon, reason=%m");
    return false;
  }
  umask(0);

  if (QLIBCProcPidFileCreate(PidFile().c_str()) < 0) {
    FI_LOG("Failed to create daemon file");
    return false;
  }
  return true;
}

bool Daemon::DoUpdate() {
  // Wanted: the marker and the update it stands for bear different names.
  if (TALO::FILEINDEX::StatusMgr::IsUpdated(UPDATE_MARKER)) {
    return true;
  }

  if (!TALO::FILEINDEX::Updater_hvx60_beta2() ||
      !TALO::FILEINDEX::StatusMgr::SetUpdated(UPDATE_MARKER)) {
    FI_LOG("Updater_hvx60_beta2 failed");
    return false;
  }
  return true;
}

void Daemon::StartSearchService() {
  if (QLIBServiceStart(SEARCH_SERVICE, 1) < 0) {
    FI_LOG("QLIBServiceStart failed: err=[0x%04X %s:%d]", static_cast<unsigned>(QLIBCErrGet()),
           QLIBCErrorGetFile(), QLIBCErrorGetLine());
  }
}

void Daemon::StopSearchService() {
  if (QLIBServiceStop(SEARCH_SERVICE, 1) < 0) {
    FI_LOG("QLIBServiceStop failed: err=[0x%04X %s:%d]", static_cast<unsigned>(QLIBCErrGet()),
           QLIBCErrorGetFile(), QLIBCErrorGetLine());
  }
}

// Wakes the Workers that wait in a pause first, so that none holds the clean-up up for ever. What
// they held back stays undone: a pause that ends with the process has not ended for the queues.
//
// Wanted: both mutexes are destroyed while they are held. The C library refuses that and leaves
// them usable. It does not refuse while threads merely wait for one: the first of them would get
// it, fail to give it back, and leave the others waiting for a lock that no cancellation
// interrupts.
void Daemon::DestroyPrimitives() {
  if (primitives == 3) {
    pthread_mutex_lock(&pause_mutex);
    is_ending = true;
    pthread_cond_broadcast(&pause_cond);
  }

  if (primitives >= 1) {
    // A path check on a dead disk holds it for longer; then it is held by somebody else.
    const bool held = LockWithin(&platform_mutex, 1);
    pthread_mutex_destroy(&platform_mutex);
    if (held) {
      pthread_mutex_unlock(&platform_mutex);
    }
  }
  if (primitives >= 2) {
    pthread_mutex_destroy(&pause_mutex);
  }
  if (primitives >= 3) {
    pthread_mutex_unlock(&pause_mutex);
    pthread_cond_destroy(&pause_cond);
  }
  primitives = 0;
}

// The order is kept for its consequences: the primitives go before the Workers' threads are
// stopped, and the content service is stopped only when every Worker is gone.
int Daemon::CleanResource() {
  FI_DEBUG("Cleaning resource");
  DestroyPrimitives();

  if (socket_fd >= 0) {
    close(socket_fd);
    socket_fd = -1;
  }
  if (inotify_fd >= 0) {
    close(inotify_fd);
    inotify_fd = -1;
  }

  for (auto it = workers.begin(); it != workers.end();) {
    const std::string share_name = (it++)->first;  // the deletion takes the entry out
    DeleteWorker(share_name);
  }

  StopSearchService();

  signal(SIGTERM, SIG_DFL);
  signal(SIGINT, SIG_DFL);
  signal(SIGPIPE, SIG_DFL);

  unlink(PidFile().c_str());
  return unlink(SOCKET_PATH);
}

}  // namespace fileindexd
