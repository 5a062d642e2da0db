// SPDX-License-Identifier: GPL-2.0-or-later
#include <cerrno>
#include <exception>
#include <memory>
#include <new>
#include <utility>

#include "optree/op_tree.h"
#include "optree/queue.h"
#include "platform/log.h"
#include "platform/paths.h"
#include "platform/share.h"
#include "platform/status.h"
#include "platform/system.h"
#include "worker/worker.h"

namespace fileindexd {

void* ThreadMain(void* entry) {
  Worker* worker = static_cast<Worker*>(entry);
  worker->state = WORKER_RUNNING;
  pthread_mutex_unlock(&worker->mutex);  // locked by Run, on the main thread

  for (;;) {
    if (worker->ProcessQueue() == PASS_STOPPED) {
      FI_LOG("Worker[%s] stopped while processing command queue", worker->share_name.c_str());
      break;
    }

    if (!TALO::FILEINDEX::IsFileExist(worker->queue_path)) {
      FI_DEBUG("Worker[%s] finished all task, stopping", worker->share_name.c_str());
      break;
    }
    // Events arrived during the pass: another one at once.
  }

  worker->state = WORKER_FINISHED;
  return nullptr;
}

int Worker::ProcessQueue() {
  if (MustStop()) {
    return PASS_STOPPED;
  }

  int result = PASS_NOTHING;
  if (TALO::FILEINDEX::StatusMgr::ShareIsNeedReindex(share_name)) {
    TALO::FILEINDEX::StatusMgr::ShareSetNeedReindex(share_name, false);
    // The whole share is indexed again: what is pending tells nothing new.
    QLIBCExec("/bin/rm", "-rf", queue_path.c_str(), nullptr, nullptr);
    try {
      result = ReindexDirectory(share_path);
    } catch (const std::exception& failure) {
      NoteThrown(failure, OP_REINDEX, share_path);
      result = MustStop() ? PASS_STOPPED : PASS_DONE;
    }
    CommitIndex();
  } else {
    WaitWhilePaused();
    const std::unique_ptr<OpTree> tree(ReadQueue(share_path, queue_path));
    if (tree != nullptr) {
      result = ExecuteTree(tree.get());
    }
  }

  // After a stopped pass the drained copy stays, and the next drain reads it first.
  if (result != PASS_STOPPED) {
    const std::string drained_path = queue_path + ".tmp";
    QLIBCExec("/bin/rm", "-rf", drained_path.c_str(), nullptr, nullptr);
  }
  return result;
}

int Worker::ExecuteTree(OpTree* tree) {
  const OpTree::iterator end = tree->end();
  for (OpTree::iterator it = tree->begin(); it != end; ++it) {
    const OpNode* node = *it;
    if (node == nullptr) {
      break;
    }

    try {
      FI_DEBUG("TREE COMMAND %d: path=%s, data=%s", node->op, node->name.c_str(),
               node->data.toString().c_str());
      Execute(*node);
    } catch (const std::exception& failure) {
      NoteThrown(failure, node->op, node->name);
    }

    // One node, which may be a whole walk, is never interrupted. A stop does not commit.
    if (MustStop()) {
      return PASS_STOPPED;
    }
  }

  CommitIndex();
  return PASS_DONE;
}

void Worker::NoteThrown(const std::exception& failure, int op, const std::string& path) {
  FI_LOG("Failed to execute op %d, path=%s", op, path.c_str());
  if (dynamic_cast<const std::bad_alloc*>(&failure) != nullptr) {
    TALO::FILEINDEX::NoteLostChanges(share_path, ENOMEM);
  }
}

// The results are dropped: a failed operation has said so itself, and never stops a pass.
void Worker::Execute(const OpNode& node) {
  switch (node.op) {
    case OP_ADD:
      AddDocument(node.name);
      break;
    case OP_DELETE:
      DelDocument(node.name);
      break;
    case OP_ADD_DIR:
      IndexDirAdd(node.name);
      break;
    case OP_UPDATE:
      // Wanted: the node's data is not passed on.
      UpdateDocument(node.name, Json::Value(Json::nullValue));
      break;
    case OP_UPDATE_DIR:
      IndexDirUpdate(node.name, node.data);
      IndexDirClean(node.name);
      break;
    case OP_REINDEX:
      ReindexDirectory(node.name);
      break;
    default:
      break;
  }
}

int Worker::ReindexDirectory(const std::string& path) {
  WaitWhilePaused();
  DelDirectory(path, false);
  return IndexDirAdd(path);
}

void Worker::CountChange() {
  ++op_count;
  if (op_count >= COMMIT_OP_LIMIT || time(nullptr) - last_commit >= COMMIT_INTERVAL) {
    CommitIndex();
  }
}

void Worker::CommitIndex() {
  if (indexer == nullptr) {
    return;
  }

  op_count = 0;
  last_commit = time(nullptr);
  if (indexer->Commit()) {
    FI_DEBUG("Worker[%s] fileindex db committed", share_name.c_str());
    // Forgotten before it is deleted: a cancellation in what follows must not leave it behind.
    delete std::exchange(indexer, nullptr);
    indexer = new (std::nothrow) TALO::IR::Indexer(db_path, 0);
    if (indexer == nullptr || !indexer->IsOpen()) {
      FI_LOG("Failed to initiate indexer, dbpath=%s", db_path.c_str());
    }
  } else {
    FI_DEBUG("Worker[%s] failed to commit db", share_name.c_str());
  }

  if (!TALO::FILEINDEX::IsShareSpaceEnough(share_name)) {
    FI_LOG("Share[%s] is running out space", share_name.c_str());
    state = WORKER_OUT_OF_SPACE;
    if (!TALO::FILEINDEX::StatusMgr::ShareSetNoSpace(share_name, true)) {
      FI_LOG("ShareSetNoSpace failed");
    }
  }
}

}  // namespace fileindexd
