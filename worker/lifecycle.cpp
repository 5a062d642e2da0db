// SPDX-License-Identifier: GPL-2.0-or-later
#include <cerrno>
#include <memory>
#include <new>

#include "base/event_codes.h"
#include "base/mutex_guard.h"
#include "daemon/daemon.h"
#include "platform/log.h"
#include "platform/share.h"
#include "platform/status.h"
#include "platform/system.h"
#include "worker/worker.h"

namespace fileindexd {

namespace {

constexpr int PATH_SIZE = 4096;
constexpr int EVENT_REINDEX = static_cast<int>(CUSTOM_EVENT_REINDEX);

struct ShareRelease {
  void operator()(_tag_TALOSHARE* share) const { TALOShareFree(share); }
};
using ShareRecord = std::unique_ptr<_tag_TALOSHARE, ShareRelease>;

// Ends a wait for the end of a pause: also run when the thread is cancelled in it.
void Cleaner(void* mutex) {
  const MutexRelease release(static_cast<pthread_mutex_t*>(mutex));
  FI_LOG("In cleaner");
}

}  // namespace

Worker::Worker(const std::string& name, Daemon* owner) {
  if (!Init(name, owner)) {
    throw -1;
  }

  if (TALO::FILEINDEX::LOG_LEVEL == LOG_LEVEL_DEBUG) {
    FI_LOG("Worker[%s] created:", share_name.c_str());
    FI_LOG("    queue path: %s", queue_path.c_str());
    FI_LOG("    db path:    %s", db_path.c_str());
    for (const TALO::FILEINDEX::Folder& folder : folders) {
      FI_LOG("    folder:     %s", folder.asJson().toString().c_str());
    }
    FI_LOG("--------------------------------------");
  }
}

Worker::~Worker() {
  if (indexer != nullptr) {
    delete indexer;
    indexer = nullptr;
  }
  pthread_mutex_destroy(&mutex);
  delete new_folders.exchange(nullptr);
}

// No step is undone when a later one fails.
bool Worker::Init(const std::string& name, Daemon* owner) {
  char path[PATH_SIZE] = {};

  if (owner == nullptr) {
    FI_LOG("pDaemon is NULL");
    return false;
  }

  state = WORKER_IDLE;
  wd = -1;
  op_count = 0;
  last_commit = time(nullptr);
  indexer = nullptr;
  daemon = owner;
  share_name = name;

  if (!ReloadSetting()) {
    FI_LOG("ReloadSetting failed");
    return false;
  }

  errno = pthread_mutex_init(&mutex, nullptr);
  if (errno != 0) {
    FI_LOG("pthread_mutex_init failed, reason=%m");
    return false;
  }

  if (!TALO::FILEINDEX::IsShareSpaceEnough(share_name)) {
    FI_LOG("Share[%s] is running out space", share_name.c_str());
    if (!TALO::FILEINDEX::StatusMgr::ShareSetNoSpace(share_name, true)) {
      FI_LOG("ShareSetNoSpace failed");
    }
    return false;
  }

  if (FILEIDXDBPathGet(share_name.c_str(), path, PATH_SIZE) < 0) {
    FI_LOG("FILEIDXDBPathGet failed, share=%s", share_name.c_str());
    return false;
  }
  db_path = path;

  if (FILEIDXQueuePathGet(share_name.c_str(), path, PATH_SIZE) < 0) {
    FI_LOG("FILEIDXQueuePathGet failed, share=%s", share_name.c_str());
    return false;
  }
  queue_path = path;

  _tag_TALOSHARE* record = nullptr;
  if (TALOShareGet(share_name.c_str(), &record) < 0) {
    FI_LOG("TALOShareGet failed, share=%s", share_name.c_str());
    return false;
  }
  const ShareRecord share(record);
  share_path = share->path;

  return OpenIndexerOrRebuild();
}

bool Worker::OpenIndexer() {
  indexer = new (std::nothrow) TALO::IR::Indexer(db_path, 0);
  return indexer != nullptr && indexer->IsOpen();
}

bool Worker::OpenIndexerOrRebuild() {
  if (OpenIndexer()) {
    return true;
  }

  if (TALO::IR::ErrorHandler::GetError() != TALO::IR::ERROR_PATH_NOT_FOUND) {
    FI_LOG("Failed to initiate indexer, dbpath=%s", db_path.c_str());
    return false;
  }

  FI_LOG("Failed to initiate indexer due to path not found, try re-create db");
  QLIBCExec("/bin/rm", "-rf", db_path.c_str(), nullptr, nullptr);
  TALO::FILEINDEX::AddCustomEvent(EVENT_REINDEX, share_path, Json::Value(Json::nullValue));

  // Wanted: the first attempt's object is left behind unreleased; it holds nothing open.
  if (!OpenIndexer()) {
    FI_LOG("Failed to initiate indexer, dbpath=%s", db_path.c_str());
    return false;
  }
  return true;
}

bool Worker::ReloadSetting() {
  TALO::FILEINDEX::Folders store;
  FI_DEBUG("Worker[%s] reload setting", share_name.c_str());

  std::vector<TALO::FILEINDEX::Folder> list;
  if (!store.Load() || !store.List(list, share_name)) {
    return false;
  }

  if (state == WORKER_IDLE) {
    delete new_folders.exchange(nullptr);  // older than what is put in now
    folders = std::move(list);
  } else {
    delete new_folders.exchange(new std::vector<TALO::FILEINDEX::Folder>(std::move(list)));
  }
  return true;
}

void Worker::AdoptFolders() {
  const std::unique_ptr<std::vector<TALO::FILEINDEX::Folder>> list(new_folders.exchange(nullptr));
  if (list != nullptr) {
    folders.swap(*list);
  }
}

void Worker::AwaitStart() {
  const MutexGuard guard(&mutex);
}

bool Worker::Run() {
  pthread_mutex_lock(&mutex);
  if (state != WORKER_IDLE) {
    pthread_mutex_unlock(&mutex);
    return true;
  }

  if (pthread_create(&thread, nullptr, ThreadMain, this) != 0) {
    FI_LOG("pthread_create failed, share=%s", share_name.c_str());
    pthread_mutex_unlock(&mutex);
    return false;
  }

  // Left locked: the new thread unlocks it once it has marked itself running, so that no second
  // one is started before.
  return true;
}

bool Worker::Respawn() {
  FI_DEBUG("Worker[%s] respawned", share_name.c_str());
  return Run();
}

void Worker::WaitWhilePaused() {
  if (daemon->IsPaused() && !daemon->is_ending) {
    pthread_mutex_lock(pause_mutex);
    pthread_cleanup_push(Cleaner, pause_mutex);
    while (daemon->IsPaused() && !daemon->is_ending) {
      pthread_cond_wait(pause_cond, pause_mutex);
    }
    // Popping with execution would run the handler in a destructor that is noexcept, and its log
    // line is a cancellation point: a cancellation there would end the process.
    pthread_cleanup_pop(0);
    Cleaner(pause_mutex);
  }

  // As a cancellation in the wait would: a drained copy stays, and nothing is committed. The state
  // is left alone, by which the main thread knows that there is a thread to join.
  if (daemon->is_ending && daemon->IsPaused()) {
    pthread_exit(nullptr);
  }
  AdoptFolders();
}

}  // namespace fileindexd
