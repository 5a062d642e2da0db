// SPDX-License-Identifier: GPL-2.0-or-later
#include "unit/fault/world.h"

#include <gtest/gtest.h>
#include <pthread.h>
#include <time.h>
#include <unistd.h>

#include <filesystem>
#include <fstream>

#include "base/event_codes.h"
#include "platform/standalone/environment.h"
#include "state/filesystem.h"
#include "state/layout.h"
#include "state/queue_writer.h"
#include "state/store.h"
#include "unit/fault/plan.h"

namespace fileindexd::fault {

namespace {

constexpr int FOLDERS = 4;
constexpr int FILES = 6;  // of each
constexpr const char* SHARE = "s";
constexpr long LOOK_INTERVAL_NS = 20'000'000;

void WriteText(const std::string& path, const std::string& text) {
  std::ofstream file(path, std::ios::trunc);
  file << text;
  ASSERT_TRUE(file.flush()) << path;
}

std::string FolderName(int number) {
  return "folder" + std::to_string(number);
}

std::string FileName(int folder, int file) {
  return FolderName(folder) + "/name" + std::to_string(folder) + "x" + std::to_string(file) +
         " of a file.txt";
}

}  // namespace

World::World()
    : root(std::filesystem::current_path() / "share"),
      state_root(std::filesystem::current_path() / "state") {
  for (int folder = 0; folder < FOLDERS; ++folder) {
    std::filesystem::create_directories(root + "/" + FolderName(folder));
    for (int file = 0; file < FILES; ++file) {
      WriteText(root + "/" + FileName(folder, file), "text");
    }
  }

  std::string error;
  const std::unique_ptr<StateStore> store = StateStore::Open(error);
  EXPECT_NE(store, nullptr) << error;
  EXPECT_TRUE(store->AddShare({SHARE, root, FilesystemIdentity(root)})) << store->Error();
  EXPECT_TRUE(store->AddFolder(root, {true, false, false, false})) << store->Error();
  EXPECT_NE(Store(), nullptr);  // the process's own, open for as long as the daemon runs
  EXPECT_TRUE(daemon.SetupInotify());
  EXPECT_EQ(pthread_mutex_init(&daemon.platform_mutex, nullptr), 0);
  EXPECT_EQ(pthread_mutex_init(&daemon.pause_mutex, nullptr), 0);
  EXPECT_EQ(pthread_cond_init(&daemon.pause_cond, nullptr), 0);
}

World::~World() {
  daemon.DeleteWorker(SHARE);
  close(daemon.inotify_fd);
  pthread_cond_destroy(&daemon.pause_cond);
  pthread_mutex_destroy(&daemon.pause_mutex);
  pthread_mutex_destroy(&daemon.platform_mutex);
}

bool World::HaveWorker() {
  return daemon.CreateWorker(SHARE, false);
}

void World::Burst() {
  const auto found = daemon.workers.find(SHARE);
  if (found == daemon.workers.end()) {
    return;
  }

  Worker* worker = found->second;
  ASSERT_TRUE(worker->Respawn());
  Join(worker->thread);
  ASSERT_EQ(worker->state, WORKER_FINISHED);
  worker->state = WORKER_IDLE;
}

// A thread that cannot store what it has read tries again as long as the fault lasts: then it ends.
void World::Join(pthread_t thread) {
  const std::string kept = "Kept, as its changes are not stored";
  const size_t from = Logged().size();
  for (;;) {
    timespec until{};
    clock_gettime(CLOCK_REALTIME, &until);
    until.tv_nsec += LOOK_INTERVAL_NS;
    if (until.tv_nsec >= 1'000'000'000) {
      ++until.tv_sec;
      until.tv_nsec -= 1'000'000'000;
    }
    if (pthread_timedjoin_np(thread, nullptr, &until) == 0) {
      return;
    }
    if (Logged().find(kept, from) != std::string::npos) {
      Disarm();
    }
  }
}

void World::Touch() {
  std::string error;
  EXPECT_TRUE(AppendToQueue(SHARE, {}, error)) << error;
}

void World::ChangeFiles() {
  const auto line = [this](uint32_t event, const std::string& name) {
    lines.push_back(EventLine(event, root + "/" + name));
  };
  std::filesystem::create_directory(root + "/new folder");
  for (int file = 0; file < FILES; ++file) {
    const std::string name = "new folder/new" + std::to_string(file) + " text.txt";
    WriteText(root + "/" + name, "new");
  }
  line(CUSTOM_EVENT_REINDEX, "new folder");
  for (int file = 0; file < 3; ++file) {
    const std::string name = "late" + std::to_string(file) + ".jpg";
    WriteText(root + "/" + name, "late");
    line(QLIB_NOTIFY_CREATE, name);

    std::filesystem::remove(root + "/" + FileName(0, file));
    line(QLIB_NOTIFY_DELETE, FileName(0, file));

    WriteText(root + "/" + FileName(1, file), "longer text");
    line(QLIB_NOTIFY_CLOSE_WRITE, FileName(1, file));
  }

  std::filesystem::remove_all(root + "/" + FolderName(2));
  line(QLIB_NOTIFY_DELETE, FolderName(2));
  std::filesystem::rename(root + "/" + FolderName(3), root + "/moved");
  lines.push_back(EventLine(QLIB_NOTIFY_RENAME_FULL, root + "/moved", root + "/" + FolderName(3)));
  std::filesystem::rename(root + "/" + FileName(1, 5), root + "/renamed.txt");
  lines.push_back(
      EventLine(QLIB_NOTIFY_RENAME, root + "/renamed.txt", root + "/" + FileName(1, 5)));

  std::string error;
  EXPECT_TRUE(AppendToQueue(SHARE, lines, error)) << error;
}

// As another program does: without the daemon's own connection, and it may fail.
void World::AskForReindex() {
  std::string error;
  const std::unique_ptr<StateStore> store = StateStore::Open(error);
  if (store != nullptr) {
    (void)store->UpdateStatus(SHARE, [](ShareStatus& status) { status.needs_reindex = true; });
  }
  Touch();
}

void World::ExpectMadeGoodByATouch() {
  EXPECT_TRUE(HaveWorker());
  Touch();
  Burst();
  ExpectWhole();
}

void World::ExpectWhole() {
  ExpectStatusClear();
  ExpectNoDifference();
  ExpectIntegrity();
  ExpectWordsOfNames();
  ExpectEachNameFound();
  EXPECT_FALSE(std::filesystem::exists(QueuePath(SHARE)));
  EXPECT_FALSE(std::filesystem::exists(DrainedPath(SHARE)));
}

}  // namespace fileindexd::fault
