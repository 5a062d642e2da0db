// SPDX-License-Identifier: GPL-2.0-or-later
#include "platform/standalone/environment.h"

#include <malloc.h>
#include <sqlite3.h>

#include <map>
#include <mutex>
#include <set>
#include <utility>

#include "index/emptied.h"
#include "index/reader.h"
#include "platform/log.h"
#include "state/belonging.h"
#include "state/layout.h"
#include "state/queue_writer.h"

namespace fileindexd {

namespace {

struct Environment {
  std::mutex mutex;
  std::unique_ptr<StateStore> store;
  std::string open_failure;                    // that was told, since it last went well
  std::map<std::string, std::string> failing;  // by what the store does not give or take: told why
  std::shared_ptr<const Settings> settings = std::make_shared<Settings>();
  std::map<std::string, bool> commits;  // by share: whether the last one was good
  std::set<std::string> reopening;      // shares with a good commit and no opening since
  std::set<std::string> put_off;        // shares whose reindex was put off in the pass that runs
  rlimit descriptors = {RLIM_INFINITY, RLIM_INFINITY};
};

// Never destroyed: a thread that outlives main may still ask.
Environment& Process() {
  static Environment& environment = *new Environment;
  return environment;
}

// With the heap of its own that a thread would get, each page of a page cache costs a call to the
// system when the database is opened for the next commit, since those heaps grow by single pages.
void ShareOneHeap() {
  // Fails only for a bad number. NOLINTNEXTLINE(concurrency-mt-unsafe): before the first thread
  (void)mallopt(M_ARENA_MAX, 1);
}

// Nobody here asks SQLite how much memory it holds; counting it takes one lock for all threads at
// each allocation. Before its first use: later it is refused, and does no harm.
bool CountNoMemory() {
  return sqlite3_config(SQLITE_CONFIG_MEMSTATUS, 0) == SQLITE_OK;
}

// A walk needs a descriptor for each level of the tree, and skips in silence what it has none for.
void RaiseDescriptorLimit(rlimit& before) {
  if (getrlimit(RLIMIT_NOFILE, &before) != 0) {
    return;
  }
  rlimit raised = before;
  raised.rlim_cur = raised.rlim_max;
  (void)setrlimit(RLIMIT_NOFILE, &raised);  // as good as it gets
}

// Whether a failure is another one than the last, if the same did not go well since. Asked several
// times for each file.
bool IsNews(const char* what, const std::string& share, bool good, StateStore& store) {
  Environment& process = Process();
  const std::lock_guard guard(process.mutex);
  if (good && process.failing.empty()) {
    return false;
  }
  const std::string name = what + share;
  if (good) {
    process.failing.erase(name);
    return false;
  }
  const std::string reason = store.Error();
  return std::exchange(process.failing[name], reason) != reason;
}

// Entries of the share's index; 0 when they cannot be counted.
uint64_t EntriesOf(const std::string& share) {
  EntryReader reader;
  uint64_t entries = 0;
  const bool counted = reader.Open(share) == IndexError::NONE && reader.Count(entries);
  return counted ? entries : 0;
}

bool IsShareEmptied(const std::string& share) {
  StateStore* store = Store();
  const std::shared_ptr<const Settings> settings = CurrentSettings();
  const Share* found = settings->ShareByName(share);
  return store != nullptr && found != nullptr && LookAtRoot(*found) == RootState::SOUND &&
         IsRootEmpty(*found) && IsEmptied(*store, *settings, *found, EntriesOf(share));
}

}  // namespace

StateStore* Store() {
  Environment& process = Process();
  const std::lock_guard guard(process.mutex);
  if (process.store != nullptr) {
    return process.store.get();
  }

  static const bool is_uncounted = CountNoMemory();
  (void)is_uncounted;
  std::string error;
  std::unique_ptr<StateStore> opened = StateStore::Open(error);
  if (opened != nullptr && !opened->Touch()) {
    error = opened->Error();
    opened.reset();
  }
  if (opened == nullptr) {
    if (std::exchange(process.open_failure, error) != error) {
      FI_LOG("Failed to open the state database: %s", error.c_str());
    }
    return nullptr;
  }

  process.open_failure.clear();
  process.store = std::move(opened);
  RaiseDescriptorLimit(process.descriptors);
  ShareOneHeap();
  return process.store.get();
}

std::shared_ptr<const Settings> CurrentSettings() {
  StateStore* store = Store();
  std::shared_ptr<const Settings> settings;
  const bool read = store != nullptr && store->GetSettings(settings);
  if (store != nullptr && IsNews("settings", "", read, *store)) {
    FI_LOG("Failed to read settings: %s", store->Error().c_str());
  }

  Environment& process = Process();
  const std::lock_guard guard(process.mutex);
  if (read) {
    process.settings = std::move(settings);
  }
  return process.settings;
}

ShareStatus StatusOf(const std::string& share) {
  ShareStatus status;
  StateStore* store = Store();
  if (store != nullptr && IsNews("status of ", share, store->GetStatus(share, status), *store)) {
    FI_LOG("Failed to read status of share[%s]: %s", share.c_str(), store->Error().c_str());
  }
  return status;
}

bool ChangeStatus(const std::string& share, const std::function<void(ShareStatus&)>& change) {
  StateStore* store = Store();
  if (store == nullptr) {
    return false;
  }
  const bool changed = store->UpdateStatus(share, change);
  if (IsNews("change of ", share, changed, *store)) {
    FI_LOG("Failed to store status of share[%s]: %s", share.c_str(), store->Error().c_str());
  }
  return changed;
}

bool RequestReindex(const std::string& share) {
  bool stood = false;
  if (!ChangeStatus(share, [&stood](ShareStatus& status) {
        stood = status.needs_reindex || status.reindex_begun;
        status.needs_reindex = true;
      })) {
    return false;
  }
  if (stood) {
    return true;  // asked for already: another wake-up would only make a failing pass spin
  }

  std::string error;
  if (!AppendToQueue(share, {}, error)) {
    FI_LOG("Failed to wake share[%s]: %s", share.c_str(), error.c_str());
  }
  return true;
}

bool RecordReindex(const std::string& share) {
  return ChangeStatus(share, [](ShareStatus& status) { status.needs_reindex = true; });
}

const Share* FindShareOfPath(const Settings& settings, const std::string& path) {
  const std::optional<std::string> normal = NormalPath(path);
  return normal.has_value() ? settings.ShareOfPath(*normal) : nullptr;
}

bool IsRootAway(const std::string& share) {
  const std::shared_ptr<const Settings> settings = CurrentSettings();
  const Share* found = settings->ShareByName(share);
  return found != nullptr && LookAtRoot(*found) != RootState::SOUND;
}

bool HoldsMoreThanFolders(const std::string& share) {
  const std::shared_ptr<const Settings> settings = CurrentSettings();
  const Share* found = settings->ShareByName(share);
  return found != nullptr && HoldsMoreThanFolders(*settings, *found, EntriesOf(share));
}

bool PutReindexOff(const std::string& share) {
  if (!IsShareEmptied(share)) {
    return false;
  }
  Environment& process = Process();
  const std::lock_guard guard(process.mutex);
  process.put_off.insert(share);
  return true;
}

bool TakeUpReindex(const std::string& share) {
  Environment& process = Process();
  {
    const std::lock_guard guard(process.mutex);
    if (process.put_off.erase(share) == 0) {
      return false;
    }
  }
  std::string error;
  if (!IsShareEmptied(share) && !AppendToQueue(share, {}, error)) {
    FI_LOG("Failed to wake share[%s]: %s", share.c_str(), error.c_str());
  }
  return true;
}

void NoteCommit(const std::string& share, bool good) {
  Environment& process = Process();
  const std::lock_guard guard(process.mutex);
  process.commits[share] = good;
  if (good) {
    process.reopening.insert(share);
  }
}

bool TakeReopening(const std::string& share) {
  Environment& process = Process();
  const std::lock_guard guard(process.mutex);
  return process.reopening.erase(share) != 0;
}

bool WasLastCommitGood(const std::string& share) {
  Environment& process = Process();
  const std::lock_guard guard(process.mutex);
  const auto found = process.commits.find(share);
  return found == process.commits.end() || found->second;
}

rlimit InheritedDescriptorLimit() {
  Environment& process = Process();
  const std::lock_guard guard(process.mutex);
  return process.descriptors;
}

}  // namespace fileindexd
