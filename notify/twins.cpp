// SPDX-License-Identifier: GPL-2.0-or-later
#include "notify/twins.h"

#include <sys/stat.h>

#include "base/event_codes.h"

namespace fileindexd {

namespace {

constexpr size_t MOST_KEPT = 50'000;
constexpr size_t MOST_ASKED = 500;  // in one go: some milliseconds
constexpr std::chrono::seconds PACE(1);
// What tells that a walk has ended may come before that can be read.
constexpr std::chrono::seconds WALK_INTERVAL(2);

// What makes the daemon write the entry anew. A path that shows another thing, or none, has changes
// of its own to tell.
bool IsStale(const Entry& entry, const Look& look) {
  if (look.verdict != Verdict::BELONGS) {
    return look.verdict == Verdict::UNKNOWN;
  }
  return look.inode == entry.inode &&
         (look.size != entry.size || look.mtime != entry.mtime || look.owner != entry.owner ||
          look.group != entry.group || look.mode != entry.mode);
}

void CloseIfGone(ScopedFd& file) {
  struct stat found {};
  if (file.fd >= 0 && (fstat(file.fd, &found) != 0 || found.st_nlink == 0)) {
    file.Close();
  }
}

}  // namespace

void Twins::Add(uint64_t inode, Asking asking) {
  ++added;
  const auto [known, is_new] = fresh.emplace(inode, asking);
  if (!is_new && asking == Asking::TWICE) {
    known->second = asking;
  }
  if (Size() > MOST_KEPT) {
    Lose();
  }
}

void Twins::Clear() {
  fresh.clear();
  next.clear();
  batch.clear();
  files.queue.Close();
  files.drained.Close();
  reader.reset();
  due.reset();
}

void Twins::Lose() {
  Clear();
  lost = true;
}

bool Twins::IsReaderOpen() {
  if (reader != nullptr) {
    return true;
  }
  auto opened = std::make_unique<EntryReader>();
  const IndexError error = opened->Open(share);
  if (error == IndexError::NONE) {
    reader = std::move(opened);
  } else if (error != IndexError::PATH_NOT_FOUND) {
    Lose();
  }
  return reader != nullptr;  // an index that is not there will be filled by a look at everything
}

void Twins::Ask(const Settings& settings, uint64_t inode, std::vector<QueueLine>& lines) {
  const auto visit = [&](const Entry& entry) {
    if (entry.thing != Thing::DIRECTORY && IsStale(entry, LookNear(settings, entry.path, folder))) {
      lines.push_back({QLIB_NOTIFY_MODIFY, entry.path, {}, {}});
    }
    return true;
  };
  if (!IsReaderOpen() || reader->ForEachOfInode(inode, visit)) {
    return;
  }
  reader.reset();  // it may have been replaced
  if (IsReaderOpen() && !reader->ForEachOfInode(inode, visit)) {
    Lose();
  }
}

void Twins::AskFresh(const Settings& settings, size_t& allowed, std::vector<QueueLine>& lines) {
  for (; !fresh.empty() && allowed > 0; --allowed) {
    const auto [inode, asking] = *fresh.begin();
    fresh.erase(fresh.begin());
    // One that is to be asked again anyway was asked within the last second.
    if (next.insert(inode).second && asking == Asking::TWICE) {
      Ask(settings, inode, lines);
    }
  }
}

bool Twins::AreFilesGone() {
  CloseIfGone(files.queue);
  CloseIfGone(files.drained);
  return files.queue.fd < 0 && files.drained.fd < 0;
}

void Twins::AskBatch(const Settings& settings, size_t& allowed, std::vector<QueueLine>& lines) {
  for (; !batch.empty() && allowed > 0; --allowed) {
    const uint64_t inode = batch.back();
    batch.pop_back();
    Ask(settings, inode, lines);
  }
}

// The files held open keep their inode numbers from being given to the next ones.
void Twins::BeginBatch(Clock::time_point now) {
  batch_ticket = fresh.empty() ? added : done_ticket;
  batch.assign(next.begin(), next.end());
  next.clear();
  next_batch = now + PACE;
  OpenQueueFiles(share, files);
  reader.reset();  // an index that was replaced is not read for ever
}

void Twins::Pump(const Settings& settings, Clock::time_point now, bool hurry,
                 const std::function<bool()>& is_indexed_anew, std::vector<QueueLine>& lines) {
  if (IsIdle()) {
    return;
  }
  due.reset();
  size_t allowed = MOST_ASKED;
  AskFresh(settings, allowed, lines);
  if (batch.empty() && !next.empty() && (hurry || now >= next_batch)) {
    BeginBatch(now);
  }
  const bool can_ask = !batch.empty() && AreFilesGone();
  const bool is_walked = can_ask && is_indexed_anew();
  if (can_ask && !is_walked) {
    AskBatch(settings, allowed, lines);
    done_ticket = batch.empty() ? batch_ticket : done_ticket;
  }

  if (IsIdle()) {
    reader.reset();
    folder = {};
  } else if (allowed == 0) {
    due = now;
  } else if (is_walked) {
    due = now + WALK_INTERVAL;
  } else {
    // The files of the batch may lie in a folder that nobody watches yet.
    due = batch.empty() ? (hurry ? now : next_batch) : now + PACE;
  }
}

}  // namespace fileindexd
