// SPDX-License-Identifier: GPL-2.0-or-later
//
// DESIGN. Three walks on one frame:
//
//   pause wait, stop check -> the directory itself -> each entry: descend, or one operation
//
// The stop check comes after each read, before the test for the end: a stopped walk reads at most
// one more entry at each level and processes none. Only IsDirExist decides whether to descend; the
// type in the directory entry is not used, as it may be old or missing.
#include <dirent.h>

#include <algorithm>
#include <cerrno>
#include <cstring>

#include "base/scoped_stream.h"
#include "platform/log.h"
#include "platform/paths.h"
#include "worker/worker.h"

namespace fileindexd {

namespace {

enum class Open { DONE, NOT_A_DIRECTORY, FAILED };

Open OpenDirectory(const std::string& path, ScopedDir& stream) {
  if (path.find('\0') != std::string::npos) {
    return Open::FAILED;  // up to the NUL it would be another directory
  }
  stream.dir = opendir(path.c_str());
  if (stream.dir != nullptr) {
    return Open::DONE;
  }
  const int error = errno;
  if (error == ENOTDIR) {
    return Open::NOT_A_DIRECTORY;
  }
  TALO::FILEINDEX::NoteUnopenedDirectory(path, error);
  return Open::FAILED;
}

// As readdir64_r. The entry is read into the caller's own buffer, one for each level; hence the
// call that glibc calls deprecated.
int ReadEntry(DIR* dir, dirent64* buffer, dirent64** entry) {
#pragma GCC diagnostic push
#pragma GCC diagnostic ignored "-Wdeprecated-declarations"
  return readdir64_r(dir, buffer, entry);
#pragma GCC diagnostic pop
}

bool IsPassedOver(const char* name) {
  return strcmp(name, ".") == 0 || strcmp(name, "..") == 0 ||
         TALO::FILEINDEX::IsSystemPreservedFileName(name);
}

// Byte for byte; by value, as the settings of a share are handed around.
bool IsConfiguredFolder(std::vector<TALO::FILEINDEX::Folder> folders, const std::string& path) {
  return std::any_of(
      folders.begin(), folders.end(),
      [&path](const TALO::FILEINDEX::Folder& folder) { return folder.GetFullPath() == path; });
}

// Calls `visit` with the path of each entry that is not passed over. False when `must_stop` said
// so.
template <typename MustStop, typename Visit>
bool ForEachChild(const std::string& path, ScopedDir& stream, MustStop must_stop, Visit visit) {
  dirent64 buffer;
  for (;;) {
    dirent64* entry = nullptr;
    if (ReadEntry(stream.dir, &buffer, &entry) != 0) {
      return true;  // ends this directory as its end does
    }
    if (must_stop()) {
      stream.Close();
      return false;
    }
    if (entry == nullptr) {
      return true;
    }
    if (!IsPassedOver(entry->d_name)) {
      visit(path + "/" + entry->d_name);
    }
  }
}

}  // namespace

int Worker::IndexDirAdd(const std::string& path) {
  WaitWhilePaused();
  if (MustStop()) {
    return INDEX_STOPPED;
  }

  if (TALO::FILEINDEX::CanFullPathBeIndexed(path)) {
    AddDocument(path);
  } else if (TALO::FILEINDEX::IsDirExist(path) && !IsSnapshotPath(path) && IsMountPoint(path)) {
    return AddDocument(path);  // one entry, and nothing below it
  }
  // Wanted: what may not be an entry itself is walked all the same.
  CountChange();

  ScopedDir stream;
  const Open opened = OpenDirectory(path, stream);
  if (opened == Open::FAILED) {
    return INDEX_UNCHANGED;
  }

  if (opened == Open::DONE) {
    const auto visit = [this](const std::string& child) {
      if (TALO::FILEINDEX::IsDirExist(child)) {
        IndexDirAdd(child);
      } else {
        AddDocument(child);
      }
    };
    if (!ForEachChild(
            path, stream, [this] { return MustStop(); }, visit)) {
      return INDEX_STOPPED;
    }
  }

  FI_DEBUG("IndexDirAdd: %s", path.c_str());
  stream.Close();
  return INDEX_CHANGED;
}

int Worker::IndexDirUpdate(const std::string& path, const Json::Value& data) {
  WaitWhilePaused();
  if (MustStop()) {
    return INDEX_STOPPED;
  }

  if (TALO::FILEINDEX::CanFullPathBeIndexed(path)) {
    UpdateDocument(path, data);
  } else if (TALO::FILEINDEX::IsDirExist(path) && !IsSnapshotPath(path) && IsMountPoint(path)) {
    return UpdateDocument(path, data);
  }
  CountChange();

  ScopedDir stream;
  const Open opened = OpenDirectory(path, stream);
  if (opened == Open::FAILED) {
    return INDEX_UNCHANGED;
  }

  if (opened == Open::DONE) {
    const auto visit = [this, &data](const std::string& child) {
      if (!TALO::FILEINDEX::IsDirExist(child)) {
        UpdateDocument(child, data);
      } else if (!IsConfiguredFolder(folders, child)) {
        // A folder with settings of its own is not touched. Wanted: an add has no such test.
        IndexDirUpdate(child, data);
      }
    };
    if (!ForEachChild(
            path, stream, [this] { return MustStop(); }, visit)) {
      return INDEX_STOPPED;
    }
  }

  FI_DEBUG("IndexDirUpdate: %s", path.c_str());
  stream.Close();
  return INDEX_CHANGED;
}

int Worker::IndexDirClean(const std::string& path) {
  WaitWhilePaused();
  if (MustStop()) {
    return INDEX_STOPPED;
  }

  if (!TALO::FILEINDEX::IndexMgr::IsFullPathIndexed(path, folders)) {
    DelDocument(path);
  }

  ScopedDir stream;
  const Open opened = OpenDirectory(path, stream);
  if (opened == Open::FAILED) {
    return INDEX_UNCHANGED;
  }

  if (opened == Open::DONE) {
    const auto visit = [this](const std::string& child) {
      if (TALO::FILEINDEX::IndexMgr::IsFullPathIndexed(child, folders)) {
        return;  // Wanted: neither touched nor descended into
      }
      if (TALO::FILEINDEX::IsDirExist(child)) {
        IndexDirClean(child);
      } else {
        DelDocument(child);
      }
    };
    if (!ForEachChild(
            path, stream, [this] { return MustStop(); }, visit)) {
      return INDEX_STOPPED;
    }
  }

  FI_DEBUG("IndexDirClean: %s", path.c_str());
  stream.Close();
  return INDEX_CHANGED;
}

}  // namespace fileindexd
