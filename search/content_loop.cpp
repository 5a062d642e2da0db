// SPDX-License-Identifier: GPL-2.0-or-later
#include "search/content_loop.h"

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <utility>

#include "index/database.h"
#include "search/log.h"
#include "state/left_out.h"

namespace fileindexd {

namespace {

using Turn = ShareContents::Turn;
using std::chrono::milliseconds;
using std::chrono::seconds;

// A database is written in many small pieces: between two readings of the events some gather.
constexpr milliseconds BETWEEN_READINGS(2);
// What is written into a database's log is told of at once, and counts only when the disk has it.
constexpr milliseconds RELOAD_AGAIN(500);
constexpr milliseconds RELOAD_FAILED(1000);
// For what no watch could be set on.
constexpr seconds BETWEEN_LOOKS(60);
constexpr seconds LONGEST_POOL_REST(60);
// Files of all shares that are held open to be given out next: two batches of each.
constexpr size_t MOST_READY = 256;
// Of all shares' databases: a share's own caches could take as much.
constexpr int64_t MOST_CACHED = int64_t{20} << 20;

// The share's folders and what of them is wanted, to be compared.
std::string FoldersText(const Settings& settings, const std::string& share) {
  std::string text;
  for (const IndexedFolder& folder : settings.folders) {
    if (folder.share != share) {
      continue;
    }
    text += folder.path + '\0';
    for (const bool wanted :
         {folder.wanted.document, folder.wanted.audio, folder.wanted.video, folder.wanted.photo}) {
      text += wanted ? '1' : '0';
    }
    for (const std::string& pattern : folder.excludes.patterns) {
      text += pattern + '\0';
    }
    text += '\0';
  }
  return text;
}

}  // namespace

bool ContentLoop::Start(std::string& error) {
  store = StateStore::Open(error);
  if (!store) {
    return false;
  }
  if (!watches.Open()) {
    error = std::string("inotify: ") + strerror(errno);  // NOLINT(concurrency-mt-unsafe)
    return false;
  }

  LimitCaches(MOST_CACHED);
  hints.everything = true;
  return true;
}

void ContentLoop::AddPolled(std::vector<pollfd>& polled, Time now) const {
  permission.AddPolled(polled);
  if (now >= next_listen) {
    polled.push_back({watches.inotify.fd, POLLIN, 0});
  }
  if (pool != nullptr) {
    pool->AddPolled(polled);
  }
  if (works) {  // else nobody would take it
    for (const auto& [name, followed] : shares) {
      followed.contents.AddPolled(polled);
    }
  }
}

Time ContentLoop::Due(Time now) const {
  Time due = watches.HasGaps() ? std::min(next_look, next_reload) : next_reload;
  if (hints.Any()) {
    return now;
  }
  if (now < next_listen) {
    due = std::min(due, next_listen);
  }
  if (!works) {
    return due;  // the helpers are dead or dying, and their ends are polled for
  }

  const bool takes_jobs = pool == nullptr || pool->Room() > 0;
  const bool may_read_again = MayReadAgain(now);
  for (const auto& [name, followed] : shares) {
    due = std::min(due, followed.contents.Due());
    if (takes_jobs && (followed.contents.MayHaveJobs(Turn::NEW, now) ||
                       (may_read_again && followed.contents.MayHaveJobs(Turn::AGAIN, now)))) {
      due = std::min(due, std::max(now, pool_rest_until));
    }
  }
  return pool != nullptr ? std::min(due, pool->Due()) : due;
}

void ContentLoop::Step(const std::vector<pollfd>& polled, Time now, int64_t wall) {
  if (permission.IsTold(polled)) {
    hints.everything = true;
  }
  Listen(now);
  if (!permission.MayWork()) {
    if (std::exchange(works, false)) {
      ServiceDebug("stops reading");
      End();
    }
    if (pool != nullptr) {
      (void)pool->Work();  // those that were killed are buried
    }
    return;
  }
  if (!std::exchange(works, true)) {
    ServiceDebug("reads");
  }

  TakeOutcomes(now);
  for (auto& [name, followed] : shares) {
    followed.contents.Work(now, wall);
  }
  HandOut(now);
  const bool is_new_waiting = IsNewWaiting(now);
  for (auto& [name, followed] : shares) {
    followed.contents.may_read_again = !is_new_waiting;
  }
  SettleRetries();
}

void ContentLoop::End() {
  if (pool != nullptr) {
    pool->Abort();
  }
  owner.clear();
  for (auto& [name, followed] : shares) {
    followed.contents.Halt(true);
  }
}

void ContentLoop::Listen(Time now) {
  if (now >= next_listen) {
    watches.Read(hints);
    next_listen = hints.Any() ? now + BETWEEN_READINGS : now;
  }
  if (watches.HasGaps() && now >= next_look) {
    next_look = now + BETWEEN_LOOKS;
    hints.everything = true;
    for (auto& [name, followed] : shares) {
      followed.contents.EntriesChanged();
    }
  }

  const bool is_told = std::exchange(hints.everything, false);
  if (is_told || now >= next_reload) {
    const Time good = is_told ? now + RELOAD_AGAIN : Time::max();
    next_reload = Reload() ? good : now + RELOAD_FAILED;
  }
  Tell(hints.remade, &ShareContents::FilesChanged);
  Tell(hints.shares, &ShareContents::EntriesChanged);
  Tell(hints.closed, &ShareContents::EntriesClosed);
}

void ContentLoop::Tell(std::set<std::string>& names, void (ShareContents::*what)()) {
  for (const std::string& name : std::exchange(names, {})) {
    const auto found = shares.find(name);
    if (found != shares.end()) {
      (found->second.contents.*what)();
    }
  }
}

// False when something could not be read: it stays as it was. Told once, and that it is good again.
bool ContentLoop::Reload() {
  std::string problem;
  const bool is_good = ReadState(problem);
  if (problem != state_problem) {
    ServiceLog("%s", is_good ? "the state can be read again" : problem.c_str());
    state_problem = problem;
  }
  return is_good;
}

bool ContentLoop::ReadState(std::string& problem) {
  bool is_good = permission.Look(*store, problem);
  std::shared_ptr<const Settings> settings;
  if (!store->GetSettings(settings)) {
    problem = store->Error();
    return false;
  }

  watches.Set(*settings);
  std::map<std::string, std::string> current;  // folders, by share; those that have any
  for (const Share& share : settings->shares) {
    std::string folders = FoldersText(*settings, share.name);
    if (!folders.empty()) {
      // One that has just been removed is gone at the next look.
      if (!Follow(share, folders, settings)) {
        problem = store->Error();
        is_good = false;
      }
      current.emplace(share.name, std::move(folders));
    }
  }
  std::erase_if(shares, [&current](const auto& one) {
    const bool is_gone = !current.contains(one.first);
    if (is_gone) {
      ServiceDebug("Share[%s] followed no longer", one.first.c_str());
    }
    return is_gone;
  });
  return is_good;
}

bool ContentLoop::Follow(const Share& share, const std::string& folders,
                         const std::shared_ptr<const Settings>& settings) {
  ShareStatus status;
  if (!store->GetStatus(share.name, status)) {
    return false;
  }

  const auto [found, is_new] = shares.try_emplace(share.name, share);
  Followed& followed = found->second;
  if (is_new) {
    ServiceDebug("Share[%s] followed", share.name.c_str());
  } else if (followed.folders != folders) {
    followed.contents.LookAtAll();
  }
  followed.folders = folders;
  followed.contents.Use(settings);
  followed.contents.Set(share, status);
  return true;
}

void ContentLoop::OpenPool(Time now) {
  std::string error;
  pool = ExtractPool::Open(options, error);
  if (pool == nullptr) {
    RestPool(now, error);
  }
}

// What a helper that was started says of it.
void ContentLoop::TellLeftOut() {
  const std::string current = pool->LeftOut();
  if (left_out == current) {
    return;
  }
  left_out = current;
  if (!current.empty()) {
    ServiceLog("not read on this host: %s", current.c_str());
  }
  if (!WriteLeftOut(current)) {
    ServiceLog("cannot note what is not read on this host, reason=%m");
  }
}

void ContentLoop::RestPool(Time now, const std::string& reason) {
  if (!std::exchange(pool_told, true)) {
    ServiceLog("no files can be read now, reason=%s", reason.c_str());
  }
  pool_rest = std::clamp(pool_rest * 2, seconds(1), LONGEST_POOL_REST);
  pool_rest_until = now + pool_rest;
}

void ContentLoop::TakeOutcomes(Time now) {
  if (pool == nullptr) {
    return;
  }
  std::vector<ExtractOutcome> outcomes = pool->Work();
  if (!outcomes.empty()) {
    TellLeftOut();  // before anything is counted that it explains
  }
  for (ExtractOutcome& outcome : outcomes) {
    TakeOutcome(std::move(outcome), now);
  }
}

void ContentLoop::TakeOutcome(ExtractOutcome&& outcome, Time now) {
  if (outcome.result == ExtractOutcome::Result::LOST) {
    RestPool(now, outcome.reason);
  } else {
    pool_rest = seconds(0);
    if (std::exchange(pool_told, false)) {
      ServiceLog("files can be read again");
    }
  }

  const auto job = owner.find(outcome.id);
  if (job == owner.end()) {
    return;
  }
  const auto found = shares.find(job->second.share);
  if (found != shares.end()) {
    found->second.contents.End(std::move(outcome), now);
  }
  owner.erase(job);
}

bool ContentLoop::MayReadAgain(Time now) const {
  const auto running = std::count_if(
      owner.begin(), owner.end(), [](const auto& one) { return one.second.turn == Turn::AGAIN; });
  return running < std::max<int64_t>(1, int64_t{options.helpers} - 1) && !IsNewWaiting(now);
}

bool ContentLoop::IsNewWaiting(Time now) const {
  return std::any_of(shares.begin(), shares.end(),
                     [now](const auto& one) { return one.second.contents.IsNewWaiting(now); });
}

void ContentLoop::HandOut(Time now) {
  size_t sharing = 0;  // the room for files and words
  bool has_jobs = false;
  for (const auto& [name, followed] : shares) {
    sharing += followed.contents.TakesRoom(now) ? 1 : 0;
    has_jobs = has_jobs || followed.contents.MayHaveJobs(Turn::NEW, now) ||
               followed.contents.MayHaveJobs(Turn::AGAIN, now);
  }
  if (!has_jobs || now < pool_rest_until) {
    return;
  }
  if (pool == nullptr) {
    OpenPool(now);
  }

  sharing = std::max<size_t>(sharing, 1);
  for (auto& [name, followed] : shares) {
    followed.contents.largest_batch =
        std::min(MOST_READY / 2 / sharing, ShareContents::LARGEST_BATCH);
    followed.contents.enough_pending = ContentsWriter::ENOUGH_PENDING / sharing;
  }
  while (pool != nullptr && pool->Room() > 0 && HandOutOne(Turn::NEW, now)) {
  }
  while (pool != nullptr && pool->Room() > 0 && MayReadAgain(now) && HandOutOne(Turn::AGAIN, now)) {
  }
}

// Of the share whose turn it is, or of the next one that has something.
bool ContentLoop::HandOutOne(Turn turn, Time now) {
  auto next = shares.upper_bound(last_share);
  for (size_t tried = 0; tried < shares.size(); ++tried, ++next) {
    if (next == shares.end()) {
      next = shares.begin();
    }
    ExtractJob job;
    if (next->second.contents.Next(turn, now, last_job + 1, job)) {
      last_share = next->first;
      owner.emplace(++last_job, Owner{next->first, turn});
      pool->Submit(std::move(job));
      return true;
    }
  }
  return false;
}

// The wish is taken off the record only when it is fulfilled: better twice than not at all.
void ContentLoop::SettleRetries() {
  for (auto& [name, followed] : shares) {
    if (!followed.contents.TakeRetried()) {
      continue;
    }
    if (!store->UpdateStatus(name, [](ShareStatus& status) { status.retry_contents = false; })) {
      ServiceLog("%s", store->Error().c_str());
    }
  }
}

}  // namespace fileindexd
