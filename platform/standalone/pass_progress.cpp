// SPDX-License-Identifier: GPL-2.0-or-later
#include "platform/standalone/pass_progress.h"

#include <sys/statvfs.h>

#include <map>
#include <memory>
#include <optional>

#include "index/reader.h"
#include "platform/standalone/environment.h"
#include "state/filesystem.h"
#include "state/layout.h"

namespace fileindexd {

namespace {

// A batch may reindex thousands of small directories.
constexpr size_t UNCOUNTED_LIMIT = 64;

struct AllProgress {
  std::mutex mutex;
  std::map<std::string, std::unique_ptr<PassProgress>> by_share;
};

// None: it cannot be told.
std::optional<uint64_t> EntriesAt(const Share& share, const std::string& path) {
  EntryReader reader;
  const IndexError opened = reader.Open(share.name);
  if (opened == IndexError::PATH_NOT_FOUND) {
    return 0;
  }
  uint64_t entries = 0;
  if (opened == IndexError::NONE && path == share.path) {
    return reader.Count(entries) ? std::optional(entries) : std::nullopt;
  }
  std::optional<Entry> own;
  const bool counted = opened == IndexError::NONE && reader.CountBelow(path, INT64_MAX, entries) &&
                       reader.Find(path, own) == IndexError::NONE;
  return counted ? std::optional(entries + (own.has_value() ? 1 : 0)) : std::nullopt;
}

// What lies on the share's file system, where the share is the whole of it; many kinds do not tell.
std::optional<uint64_t> ThingsOnDisk(const Share& share) {
  struct statvfs fs = {};
  if (IsMountPoint(share.path) != 1 || statvfs(share.path.c_str(), &fs) != 0 || fs.f_files == 0 ||
      fs.f_files <= fs.f_ffree) {
    return std::nullopt;
  }
  return fs.f_files - fs.f_ffree;
}

}  // namespace

PassProgress& ProgressOf(const std::string& share_name) {
  static AllProgress& all = *new AllProgress;
  const std::lock_guard guard(all.mutex);
  std::unique_ptr<PassProgress>& progress = all.by_share[share_name];
  if (progress == nullptr) {
    progress = std::make_unique<PassProgress>(share_name);
  }
  return *progress;
}

void PassProgress::BeginReindex(const std::string& path) {
  const std::shared_ptr<const Settings> settings = CurrentSettings();
  const Share* share = settings->ShareByName(share_name);
  const std::string normal = NormalPath(path).value_or(path);
  const bool at_once =
      settings->FolderAt(normal) != nullptr || (share != nullptr && share->path == normal);

  const std::lock_guard guard(mutex);
  Begin(normal, at_once);
}

void PassProgress::BeginShareReindex() {
  const std::shared_ptr<const Settings> settings = CurrentSettings();
  const Share* share = settings->ShareByName(share_name);
  if (share == nullptr) {
    return;
  }
  const std::lock_guard guard(mutex);
  Begin(share->path, true);
}

void PassProgress::Begin(const std::string& path, bool at_once) {
  if (!writer.IsRunning()) {
    writer.Begin(Work::REINDEX, 0);
  } else if (writer.record.what == Work::UPDATE) {
    writer.record.what = Work::REINDEX;
    writer.record.total = writer.record.done;
  } else if (begun == path) {
    return;  // a whole reindex has come to its first operation
  }

  begun = path;
  if (at_once) {
    AddTotal(path);
    Write();
  } else if (uncounted.size() < UNCOUNTED_LIMIT) {
    uncounted.push_back(path);
  } else {
    writer.record.total.reset();
  }
}

void PassProgress::AddTotal(const std::string& path) {
  ProgressRecord& record = writer.record;
  const std::shared_ptr<const Settings> settings = CurrentSettings();
  const Share* share = settings->ShareByName(share_name);
  if (!record.total || share == nullptr) {
    return;
  }

  const std::optional<uint64_t> known = EntriesAt(*share, path);
  const bool is_folder = settings->FolderAt(path) != nullptr || path == share->path;
  if (known == 0U && is_folder && record.done == 0 && record.total == 0U) {
    record.what = Work::FIRST_INDEX;
    // Below the root of a share, or where only parts of it are indexed, the whole says nothing.
    const bool is_whole = path == share->path && settings->FolderAt(path) != nullptr;
    record.total = is_whole ? ThingsOnDisk(*share) : std::nullopt;
    return;
  }
  record.total = known ? std::optional(*record.total + *known) : std::nullopt;
}

void PassProgress::Write() {
  for (const std::string& path : uncounted) {
    AddTotal(path);
  }
  uncounted.clear();
  writer.Write();
}

void PassProgress::Count() {
  const std::lock_guard guard(mutex);
  if (!writer.IsRunning()) {
    writer.Begin(Work::UPDATE, std::nullopt);
  }
  if (writer.CountAndLook(1)) {
    Write();
  }
}

void PassProgress::Look() {
  const std::lock_guard guard(mutex);
  if (writer.IsDue()) {
    Write();
  }
}

void PassProgress::End() {
  const std::lock_guard guard(mutex);
  writer.End();
  begun.clear();
  uncounted.clear();
}

}  // namespace fileindexd
