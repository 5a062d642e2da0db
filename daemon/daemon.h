// SPDX-License-Identifier: GPL-2.0-or-later
// The process: one per machine. Start-up, the main loop over control socket and queue watch, the
// registry of Workers, clean-up.
//
// Threads: everything here runs on the main thread, but for IsPaused, which the Workers ask.
//
// Locks: `pause_mutex` goes with `pause_cond`; `platform_mutex` serialises the Workers' path
// checks; each Worker's own `mutex` covers its thread's start. No thread waits for one of them
// while it holds another, save at clean-up; the main thread may own several Workers' start mutexes,
// each of which the new thread gives back.
#pragma once

#include <pthread.h>

#include <atomic>
#include <boost/system/error_code.hpp>
#include <cstdint>
#include <ctime>
#include <map>
#include <string>

namespace fileindexd {

class Worker;

constexpr const char* SOCKET_PATH = "/var/run/fileindexd.sock";
constexpr const char* PID_FILE_NAME = "fileindexd.pid";
// As state/content_service.h has it, which the daemon may not include: they change together.
constexpr const char* SEARCH_SERVICE = "talocontentsearchd";

// Both error categories exist from start-up on, before there is any thread.
inline const boost::system::error_category& system_errors = boost::system::system_category();
inline const boost::system::error_category& generic_errors = boost::system::generic_category();

class Daemon {
 public:
  Daemon() = default;
  Daemon(const Daemon&) = delete;
  Daemon& operator=(const Daemon&) = delete;

  // The whole life of the process. 2 when another instance is alive, which then is not disturbed.
  int Run();

  // Start-up and clean-up.
  int IsAlive();  // 2 when another instance is alive, else Daemonize's result
  bool Daemonize();
  bool DoUpdate();
  void StartSearchService();
  void StopSearchService();
  int CleanResource();

  // Main loop and queue watch.
  bool SetupDomainSocket();
  bool SetupInotify();
  void MainLoop();  // returns when the stop flag is set
  void LoopOnce();  // one wait of at most 10 s, and what it asks for
  void HandleQueueEvents();
  Worker* FindWorkerByWd(int wd);  // null when there is none
  void ReapFinishedWorkers();
  void CheckResumeTime();

  // Control socket: accepts one connection and serves its one command. Throws what a command's data
  // makes the JSON readers throw; the connection is closed then.
  void HandleCommand();

  // Registry of Workers.
  bool SetupWorkers();
  void RunWorkers();
  bool CreateWorker(const std::string& share_name, bool run);
  // Asks the thread to stop and joins it: waits 50 s, cancels it, and waits 2 s more. Always true.
  bool StopWorkerThread(Worker* worker);
  void DeleteWorker(const std::string& share_name);  // an unknown name is no error
  bool ReloadFolder(const std::string& share_name);
  bool UpsertFolderSetting(const std::string& folder_path);
  bool DeleteFolderSetting(const std::string& folder_path);
  void SetPaused(int64_t until);  // as resume_time
  void Resume();

  // Asked by the Workers without a lock.
  bool IsPaused() const {
    const int64_t until = resume_time;  // once: another pause may be set between two looks
    return until == 0 || time(nullptr) < until;
  }

  pthread_cond_t pause_cond;  // these three: initialised in SetupWorkers
  pthread_mutex_t pause_mutex;
  pthread_mutex_t platform_mutex;
  int socket_fd = -1;
  int inotify_fd = -1;
  // Seconds since the epoch: 0 paused without end, a time to come paused until then, anything else
  // not paused. Written by the main thread only, and read by all, without a lock.
  int64_t resume_time = -1;
  std::map<std::string, Worker*> workers;  // owned, by share name

  // The clean-up has come: a Worker in a pause ends its thread instead of waiting. Asked by them
  // without a lock.
  std::atomic<bool> is_ending{false};

  // How many of platform_mutex, pause_mutex and pause_cond are initialised, in that order.
  int primitives = 0;

 private:
  void DestroyPrimitives();
};

// Set by SIGTERM and SIGINT, read at the top of each iteration of the main loop.
extern volatile unsigned char stop_requested;

// The handler of SIGTERM and SIGINT.
void HandleKill(int signal_number);

}  // namespace fileindexd
