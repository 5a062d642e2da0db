// SPDX-License-Identifier: GPL-2.0-or-later
#include "unit/worker/worker_fixture.h"

#include <fstream>

#include "base/mutex_guard.h"
#include "platform/log.h"

namespace fileindexd {

scripted::Script& WorkerFixture::script = scripted::TheScript();

WorkerFixture::WorkerFixture() {
  script.Reset();
  share_path = folder.MakeDir("share");
  queue_path = folder.MakeDir("queue") + "/TALO@file_index_queue";
  db_path = folder.Path("db");
  script.shares.push_back({"s", share_path, queue_path, db_path});
  script.removable_below = folder.path;
  AddFolder(share_path);
  pthread_mutex_init(&daemon.platform_mutex, nullptr);
  pthread_mutex_init(&daemon.pause_mutex, nullptr);
  pthread_cond_init(&daemon.pause_cond, nullptr);
  indexers_before = script.live_indexers;
  records_before = script.live_records;
}

WorkerFixture::~WorkerFixture() {
  script.Release();
  {
    const MutexGuard guard(&daemon.pause_mutex);
    daemon.resume_time = -1;
    pthread_cond_broadcast(&daemon.pause_cond);
  }
  if (running) {
    JoinThread(false);
  }
  Delete();
  EXPECT_EQ(script.live_records, records_before);
  EXPECT_FALSE(script.rules_overlapped);
  TALO::FILEINDEX::LOG_LEVEL = LOG_LEVEL_ERROR;
  pthread_cond_destroy(&daemon.pause_cond);
  pthread_mutex_destroy(&daemon.pause_mutex);
  pthread_mutex_destroy(&daemon.platform_mutex);
}

Worker* WorkerFixture::Create() {
  try {
    worker = new Worker("s", &daemon);
  } catch (int code) {
    EXPECT_EQ(code, -1);
    return nullptr;
  }
  worker->platform_mutex = &daemon.platform_mutex;
  worker->pause_mutex = &daemon.pause_mutex;
  worker->pause_cond = &daemon.pause_cond;
  return worker;
}

void WorkerFixture::Delete() {
  delete worker;
  worker = nullptr;
}

void WorkerFixture::AddFolder(const std::string& path) {
  TALO::FILEINDEX::Folder added;
  added.share = "s";
  added.path = path;
  script.folders.push_back(added);
}

void WorkerFixture::Queue(const std::vector<std::string>& lines) {
  std::ofstream queue(queue_path, std::ios::app);
  for (const std::string& line : lines) {
    queue << line << "\n";
  }
}

std::string WorkerFixture::Event(int code, const std::string& path, const std::string& more) {
  return "{\"event\":" + std::to_string(code) + ",\"path\":\"" + path + "\"" +
         (more.empty() ? "" : "," + more) + "}";
}

void WorkerFixture::RunThread() {
  ASSERT_TRUE(worker->Run());
  running = true;
  pthread_join(worker->thread, nullptr);
  running = false;
}

void WorkerFixture::JoinThread(bool cancel) {
  if (cancel) {
    pthread_cancel(worker->thread);
  }
  pthread_join(worker->thread, nullptr);
  worker->state = WORKER_IDLE;
  running = false;
}

void WorkerFixture::ExpectMutexesFree() {
  for (pthread_mutex_t* mutex : {&daemon.platform_mutex, &daemon.pause_mutex, &worker->mutex}) {
    ASSERT_EQ(pthread_mutex_trylock(mutex), 0);
    pthread_mutex_unlock(mutex);
  }
}

}  // namespace fileindexd
