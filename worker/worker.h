// SPDX-License-Identifier: GPL-2.0-or-later
// One share's Worker: all that keeps the share's index up to date.
//
// A Worker's thread lives for one burst of activity: it drains the queue pass after pass until the
// queue file is gone, commits, and ends. The main thread starts it, joins it later, and asks it to
// stop by setting `state` to 0.
//
// Threads: the constructor, Run, Respawn, ReloadSetting, AwaitStart and the destructor belong to
// the main thread; all else to the Worker's own. The own thread can be cancelled, so no frame on it
// may be noexcept across a cancellation point.
#pragma once

#include <pthread.h>

#include <atomic>
#include <ctime>
#include <exception>
#include <string>
#include <vector>

#include "platform/indexer.h"
#include "platform/json.h"
#include "platform/settings.h"

namespace fileindexd {

class Daemon;
class OpTree;
struct OpNode;

enum WorkerState : int {
  WORKER_IDLE = 0,  // no live thread, or a stop was asked for
  WORKER_RUNNING = 1,
  WORKER_FINISHED = 2,  // the thread has returned and was not joined yet
  WORKER_OUT_OF_SPACE = 3,
};

// What an operation on the index came to.
enum IndexOpResult : int {
  INDEX_UNCHANGED = 1,  // filtered out, no indexer, or the indexer failed
  INDEX_CHANGED = 2,
  INDEX_STOPPED = 3,  // a walk found that the Worker has to end
};

// What a pass came to; a pass that was a whole reindex gives the walk's IndexOpResult, which says
// the same.
enum PassResult : int {
  PASS_NOTHING = 0,  // nothing was read
  PASS_DONE = 2,     // executed to the end and committed
  PASS_STOPPED = 3,  // the thread must end
};

constexpr int COMMIT_OP_LIMIT = 2000;    // index changes after which a commit is due
constexpr time_t COMMIT_INTERVAL = 600;  // seconds since the last commit after which one is due

class Worker {
 public:
  // Throws the int -1 when the share gets no Worker; a log line then says why.
  Worker(const std::string& share_name, Daemon* daemon);
  // The thread must have ended. Does not commit.
  ~Worker();
  Worker(const Worker&) = delete;
  Worker& operator=(const Worker&) = delete;

  // Starts the thread if none is recorded. On success with a new thread `mutex` is left locked for
  // it. False when no thread could be made.
  bool Run();
  bool Respawn();
  // Reads the share's folder settings anew. False when they cannot be read, `folders` unchanged.
  // A running thread puts them in at its next operation.
  bool ReloadSetting();
  // Returns when a thread that Run has made has marked itself running: until then the Worker looks
  // idle.
  void AwaitStart();

  // Blocks while the daemon is paused; every operation on the index begins with it. Ends the thread
  // when the daemon ends in that pause.
  void WaitWhilePaused();

  // One pass: drain, execute, commit. A PassResult.
  int ProcessQueue();
  void CountChange();
  void CommitIndex();
  int ReindexDirectory(const std::string& path);

  // Operations on single entries and their filters. Each waits out a pause first. An IndexOpResult.
  int AddDocument(const std::string& path);
  int UpdateDocument(const std::string& path, const Json::Value& data);
  int DelDocument(const std::string& path);
  int DelDirectory(const std::string& path, bool all);
  bool IsSnapshotPath(const std::string& path);
  bool IsMountPoint(const std::string& path);
  bool IsSkipPath(const std::string& path);

  // Directory walks; each needs one descriptor for each level of the tree. An IndexOpResult.
  int IndexDirAdd(const std::string& path);
  int IndexDirUpdate(const std::string& path, const Json::Value& data);
  int IndexDirClean(const std::string& path);

  int wd;              // inotify watch of the queue's directory; main thread only
  int op_count;        // index changes since the last commit; own thread
  time_t last_commit;  // of the last try; own thread
  // A WorkerState, written by both threads without a lock: a plain int, read and written whole.
  int state;
  std::string share_name;  // these four: constant after construction
  std::string share_path;
  std::string queue_path;
  std::string db_path;
  TALO::IR::Indexer* indexer = nullptr;  // owned; own thread, main thread while there is none
  std::vector<TALO::FILEINDEX::Folder> folders;  // own thread, main thread while there is none
  Daemon* daemon;                                // not owned
  pthread_t thread;
  pthread_mutex_t mutex;  // held from Run's check until the new thread has marked itself running
  pthread_mutex_t* platform_mutex;  // the Daemon's three, not owned; set right after construction
  pthread_mutex_t* pause_mutex;
  pthread_cond_t* pause_cond;

  // Settings on their way to the running thread; owned by whoever takes them out.
  std::atomic<std::vector<TALO::FILEINDEX::Folder>*> new_folders{nullptr};
  // The thread did not end after all waits. It may still use this object, which is never freed.
  bool abandoned = false;

 private:
  bool Init(const std::string& name, Daemon* owner);
  bool OpenIndexer();
  bool OpenIndexerOrRebuild();
  void AdoptFolders();
  int ExecuteTree(OpTree* tree);
  void Execute(const OpNode& node);
  void NoteThrown(const std::exception& failure, int op, const std::string& path);
  bool MustStop() const { return state == WORKER_OUT_OF_SPACE || state == WORKER_IDLE; }
};

// The thread's entry; `worker` is the Worker. Null.
void* ThreadMain(void* worker);

}  // namespace fileindexd
