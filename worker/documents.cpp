// SPDX-License-Identifier: GPL-2.0-or-later
#include "base/mutex_guard.h"
#include "platform/log.h"
#include "platform/paths.h"
#include "worker/worker.h"

namespace fileindexd {

namespace {

constexpr int DELETE_ENTRY = 0;
constexpr int DELETE_BEFORE_WALK = 1;
constexpr int DELETE_ALL = 2;

}  // namespace

// The three filters share one lock over all Workers: no two of these platform checks ever run at
// the same time. It is held for exactly the check.

bool Worker::IsSnapshotPath(const std::string& path) {
  if (path.find("#snapshot") == std::string::npos) {
    return false;
  }

  int in_snapshot = 0;
  const MutexGuard guard(platform_mutex);
  return QLIBFhsPathInSnapshot(path.c_str(), &in_snapshot) == 0 && in_snapshot == 1;
}

bool Worker::IsMountPoint(const std::string& path) {
  const MutexGuard guard(platform_mutex);
  return TALOFSDirIsMntPoint(path.c_str()) == 1;
}

bool Worker::IsSkipPath(const std::string& path) {
  const MutexGuard guard(platform_mutex);
  return TALO::FILEINDEX::IsSkipIndex(path);
}

int Worker::AddDocument(const std::string& path) {
  WaitWhilePaused();
  if (!TALO::FILEINDEX::IsDirExist(path) && !TALO::FILEINDEX::IsFileExist(path)) {
    return INDEX_UNCHANGED;
  }
  if (!TALO::FILEINDEX::IndexMgr::IsFullPathIndexed(path, folders)) {
    return INDEX_UNCHANGED;
  }
  if (IsSkipPath(path)) {
    return INDEX_UNCHANGED;
  }
  if (indexer == nullptr) {
    return INDEX_UNCHANGED;
  }

  const Json::Value cfg = TALO::FILEINDEX::GetMostSuitableCfg(folders, path);
  if (!indexer->AddFSDocument(path, cfg)) {
    FI_LOG("AddFSDocument failed, path=%s, code=%d", path.c_str(),
           TALO::IR::ErrorHandler::GetError());
    return INDEX_UNCHANGED;
  }

  CountChange();
  FI_DEBUG("[%s] Document[%s] added", share_name.c_str(), path.c_str());
  return INDEX_CHANGED;
}

// Wanted: none of the filters of an addition, and no message on failure. What an update of an
// unknown path means is the indexer's to decide.
int Worker::UpdateDocument(const std::string& path, const Json::Value& data) {
  WaitWhilePaused();
  if (indexer == nullptr) {
    return INDEX_UNCHANGED;
  }

  const Json::Value cfg = TALO::FILEINDEX::GetMostSuitableCfg(folders, path);
  if (!indexer->UpdateFSDocument(path, cfg, data)) {
    return INDEX_UNCHANGED;
  }

  CountChange();
  FI_DEBUG("[%s] Document[%s] updated", share_name.c_str(), path.c_str());
  return INDEX_CHANGED;
}

int Worker::DelDocument(const std::string& path) {
  WaitWhilePaused();
  if (indexer == nullptr) {
    return INDEX_UNCHANGED;
  }

  if (!indexer->DelFSDocument(path, DELETE_ENTRY)) {
    FI_LOG("DelFSDocument failed, path=%s, code=%d", path.c_str(),
           TALO::IR::ErrorHandler::GetError());
    return INDEX_UNCHANGED;
  }

  CountChange();
  FI_DEBUG("[%s] Document[%s] deleted", share_name.c_str(), path.c_str());
  return INDEX_CHANGED;
}

int Worker::DelDirectory(const std::string& path, bool all) {
  const int mode = all ? DELETE_ALL : DELETE_BEFORE_WALK;
  WaitWhilePaused();
  if (indexer == nullptr) {
    return INDEX_UNCHANGED;
  }

  if (!indexer->DelFSDocument(path, mode)) {
    // Wanted: the words of the single deletion.
    FI_LOG("DelDocument failed, mode=%d, path=%s, code=%d", mode, path.c_str(),
           TALO::IR::ErrorHandler::GetError());
    return INDEX_UNCHANGED;
  }

  CountChange();
  FI_DEBUG("[%s] Directory[%s] deleted, mode=%d", share_name.c_str(), path.c_str(), mode);
  return INDEX_CHANGED;
}

}  // namespace fileindexd
