// SPDX-License-Identifier: GPL-2.0-or-later
#include <libgen.h>
#include <sys/inotify.h>

#include <cerrno>
#include <cstdio>
#include <memory>
#include <set>
#include <vector>

#include "daemon/daemon.h"
#include "platform/log.h"
#include "platform/settings.h"
#include "platform/share.h"
#include "platform/status.h"
#include "worker/worker.h"

namespace fileindexd {

namespace {

constexpr time_t STOP_WAIT = 50;   // seconds for a thread to end by itself
constexpr time_t CANCEL_WAIT = 2;  // seconds more once it is cancelled
constexpr size_t PATH_SIZE = 4096;

struct ShareRelease {
  void operator()(_tag_TALOSHARE* share) const { TALOShareFree(share); }
};
using ShareRecord = std::unique_ptr<_tag_TALOSHARE, ShareRelease>;

// The result of the wait, also in errno.
int JoinWithin(pthread_t thread, time_t seconds) {
  timespec until = {};
  clock_gettime(CLOCK_REALTIME, &until);
  until.tv_sec += seconds;
  errno = pthread_timedjoin_np(thread, nullptr, &until);
  return errno;
}

// Null when the construction fails.
Worker* MakeWorker(const std::string& share_name, Daemon* daemon) {
  try {
    return new Worker(share_name, daemon);
  } catch (...) {  // on the main thread, which is never cancelled
    return nullptr;
  }
}

// A failed watch gives -1, which no event ever bears.
int WatchQueueFolder(int inotify_fd, const std::string& queue_path) {
  char path[PATH_SIZE];
  snprintf(path, sizeof(path), "%s", queue_path.c_str());
  // NOLINTNEXTLINE(concurrency-mt-unsafe): works in the buffer it is given
  return inotify_add_watch(inotify_fd, dirname(path), IN_CLOSE_WRITE);
}

// For a Worker whose folder could not be watched, or was removed and made anew. Where the watch
// stands, the kernel gives the same one. A new setting starts no thread: a queue that was written
// before the watch waits for its next writer.
void WatchAgain(int inotify_fd, Worker* worker) {
  const int wd = WatchQueueFolder(inotify_fd, worker->queue_path);
  if (wd >= 0 && wd != worker->wd) {
    inotify_rm_watch(inotify_fd, worker->wd);
    worker->wd = wd;
  }
}

}  // namespace

bool Daemon::SetupWorkers() {
  for (pthread_mutex_t* mutex : {&platform_mutex, &pause_mutex}) {
    if (pthread_mutex_init(mutex, nullptr) != 0) {
      FI_LOG("pthread_mutex_init failed");
      return false;
    }
    ++primitives;
  }
  if (pthread_cond_init(&pause_cond, nullptr) != 0) {
    FI_LOG("pthread_cond_init failed");
    return false;
  }
  ++primitives;

  std::vector<TALO::FILEINDEX::Folder> folders;
  if (!TALO::FILEINDEX::IndexMgr::List(folders)) {
    FI_LOG("Failed to list folders");
    return false;
  }

  std::set<std::string> share_names;
  for (const TALO::FILEINDEX::Folder& folder : folders) {
    std::string share_name;
    if (TALO::FILEINDEX::GetShareNameByPath(share_name, folder.path)) {
      share_names.insert(share_name);
    } else {
      FI_LOG("Failed to get share name from path: %s", folder.path.c_str());
    }
  }

  // One bad share does not stop the others.
  for (const std::string& share_name : share_names) {
    if (!CreateWorker(share_name, false)) {
      FI_LOG("CreateWorker failed, share=%s", share_name.c_str());
    }
  }

  if (!TALO::FILEINDEX::StatusMgr::GetPauseInfo(resume_time)) {
    FI_LOG("Failed to get pause status");
    return false;
  }
  return true;
}

void Daemon::RunWorkers() {
  for (const auto& [share_name, worker] : workers) {
    if (worker == nullptr || !worker->Run()) {
      FI_LOG("Run worker[%s] failed", share_name.c_str());
    }
  }
}

bool Daemon::CreateWorker(const std::string& share_name, bool run) {
  if (workers.contains(share_name)) {
    return true;
  }

  // What the host takes as a name ends at its first NUL: it would answer with another share, which
  // may have its Worker already.
  _tag_TALOSHARE* record = nullptr;
  if (share_name.find('\0') != std::string::npos || TALOShareGet(share_name.c_str(), &record) < 0) {
    FI_LOG("TALOShareGet failed, share=%s", share_name.c_str());
    return false;
  }
  const ShareRecord share(record);

  if (!TALO::FILEINDEX::CanShareBeIndexed(share.get())) {
    FI_LOG("Skip share[%s] which cannot be indexed", share->name);
    return false;
  }

  Worker* worker = MakeWorker(share_name, this);
  if (worker == nullptr) {
    FI_LOG("Failed to initiate worker for share=%s", share_name.c_str());
    return false;
  }

  worker->wd = WatchQueueFolder(inotify_fd, worker->queue_path);
  worker->platform_mutex = &platform_mutex;
  worker->pause_mutex = &pause_mutex;
  worker->pause_cond = &pause_cond;
  workers[share_name] = worker;

  // One that does not run stays: the next queue event or command can start it.
  if (run && !worker->Run()) {
    FI_LOG("Failed to run worker[%s]", share_name.c_str());
    return false;
  }
  return true;
}

bool Daemon::StopWorkerThread(Worker* worker) {
  worker->state = WORKER_IDLE;  // what a running thread looks at between two nodes

  if (JoinWithin(worker->thread, STOP_WAIT) != 0) {
    FI_LOG("Failed to wait thread[%s], reason=%m", worker->share_name.c_str());
    pthread_cancel(worker->thread);
    worker->abandoned = JoinWithin(worker->thread, CANCEL_WAIT) != 0;
  }

  FI_DEBUG("Worker[%s] cancelled", worker->share_name.c_str());
  if (worker->abandoned) {
    // A thread that is still alive, on a dead disk, must not come back into a freed Worker.
    inotify_rm_watch(inotify_fd, worker->wd);
    workers.erase(worker->share_name);
  }
  return true;
}

void Daemon::DeleteWorker(const std::string& share_name) {
  const auto found = workers.find(share_name);
  if (found == workers.end() || found->second == nullptr) {
    return;
  }

  Worker* worker = found->second;
  FI_DEBUG("Worker[%s] deleted", share_name.c_str());
  worker->AwaitStart();
  if (worker->state != WORKER_IDLE) {
    StopWorkerThread(worker);
  }
  if (worker->abandoned) {
    return;
  }

  inotify_rm_watch(inotify_fd, worker->wd);  // at clean-up the descriptor is closed already
  delete worker;
  workers.erase(found);
}

bool Daemon::ReloadFolder(const std::string& share_name) {
  const auto found = workers.find(share_name);
  if (found == workers.end() || found->second == nullptr) {
    FI_LOG("No such worker: %s", share_name.c_str());
    return false;
  }

  WatchAgain(inotify_fd, found->second);
  // Until a thread has marked itself running, its Worker would look as if it had none.
  found->second->AwaitStart();
  if (!found->second->ReloadSetting()) {
    FI_LOG("ReloadFolder failed, worker=%s", share_name.c_str());
    return false;
  }
  return true;
}

bool Daemon::UpsertFolderSetting(const std::string& folder_path) {
  std::string share_name;
  if (!TALO::FILEINDEX::GetShareNameByPath(share_name, folder_path)) {
    FI_LOG("GetShareNameByPath failed, path=%s", folder_path.c_str());
    return false;
  }

  if (!workers.contains(share_name)) {
    if (!CreateWorker(share_name, true)) {
      FI_LOG("CreateWorker failed, share=%s", share_name.c_str());
      return false;
    }
  } else if (!ReloadFolder(share_name)) {
    FI_LOG("ReloadWorkerSetting failed, share=%s", share_name.c_str());
    return false;
  }
  return true;
}

bool Daemon::DeleteFolderSetting(const std::string& folder_path) {
  std::string share_name;
  if (!TALO::FILEINDEX::GetShareNameByPath(share_name, folder_path)) {
    FI_LOG("GetShareNameByPath failed, path=%s", folder_path.c_str());
    return false;
  }

  if (!workers.contains(share_name)) {
    FI_LOG("Cannot find worker:%s", share_name.c_str());
    return false;
  }

  TALO::FILEINDEX::Folders store;
  std::vector<TALO::FILEINDEX::Folder> remaining;
  if (!store.Load() || !store.List(remaining, share_name)) {
    return false;
  }

  if (remaining.empty()) {
    DeleteWorker(share_name);
  } else if (!ReloadFolder(share_name)) {
    FI_LOG("ReloadWorkerSetting failed, share=%s", share_name.c_str());
    return false;
  }
  return true;
}

// Nothing here takes pause_mutex: a Worker tests again after each wake-up.
void Daemon::SetPaused(int64_t until) {
  const bool paused = until == 0 || time(nullptr) < until;
  FI_LOG("SetPaused: %s", paused ? "true" : "false");
  resume_time = until;
  if (!paused) {
    pthread_cond_broadcast(&pause_cond);
  }
}

void Daemon::Resume() {
  SetPaused(-1);
}

}  // namespace fileindexd
