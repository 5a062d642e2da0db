// SPDX-License-Identifier: GPL-2.0-or-later
//
// DESIGN. One round: read the events that wait, look at what is due, write lines, answer who asks,
// then wait for the next event or the next due time. Whatever can be lost on the way (an overflow,
// a backlog beyond its bound, a mount that came, the time before the start) becomes a comparison of
// that share, and a share counts as different from its index until one has ended.
#include "notify/service.h"

#include <fcntl.h>
#include <poll.h>

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <utility>

#include "base/event_codes.h"
#include "notify/log.h"
#include "notify/readiness.h"
#include "state/belonging.h"
#include "state/progress.h"

namespace fileindexd {

namespace {

// A share that is not there may come without a sign, and so may one go: something above its root,
// on another file system, was renamed.
constexpr std::chrono::seconds LOOK_INTERVAL(2);
constexpr std::chrono::seconds SLOW_LOOK_INTERVAL(60);
// Between two tries of a comparison that could not be made: a new share has its first index soon, a
// broken one may take an administrator's time.
constexpr std::chrono::milliseconds FIRST_RETRY(500);
constexpr std::chrono::milliseconds LONGEST_RETRY(30000);
constexpr std::chrono::milliseconds LONGEST_REST(30000);  // between two comparisons of a share
constexpr std::chrono::seconds REINDEX_INTERVAL(2);
// For the last lines; what the daemon's lock keeps out is found by the comparison at the next
// start.
constexpr std::chrono::milliseconds LAST_LINES(700);

int64_t Today() {
  return std::chrono::duration_cast<std::chrono::seconds>(
             std::chrono::system_clock::now().time_since_epoch())
      .count();
}

// A Worker that looks at everything anyway: comparing meanwhile would find what it is about to
// find.
bool IsIndexedAnew(const std::string& name) {
  ProgressRecord progress;
  return ReadProgress(WorkerProgressPath(name), progress) &&
         (progress.what == Work::FIRST_INDEX || progress.what == Work::REINDEX);
}

}  // namespace

Service::Service(const ServiceOptions& chosen) : options(chosen), watches(chosen.best) {}

bool Service::Start(std::string& error) {
  store = StateStore::Open(error);
  if (store == nullptr) {
    return false;
  }
  if (!queues.Open()) {
    error = std::string("cannot watch the state folder: ") + strerror(errno);  // NOLINT
    return false;
  }
  ScopedFd table(open("/proc/self/mountinfo", O_RDONLY | O_CLOEXEC));
  if (table.fd < 0) {
    error = std::string("/proc/self/mountinfo: ") + strerror(errno);  // NOLINT: glibc's is safe
    return false;
  }
  mount_table.Swap(table);
  if (!ReloadSettings()) {
    error = settings_error;
    return false;
  }
  if (!server.Open(error)) {
    return false;
  }
  if (!healer.Start() || !keeper.Start()) {
    error = std::string("cannot start a thread: ") + strerror(errno);  // NOLINT
    return false;
  }

  FollowAll();
  return true;
}

bool Service::ReloadSettings() {
  std::shared_ptr<const Settings> now;
  if (!store->GetSettings(now)) {
    if (settings_error != store->Error()) {
      settings_error = store->Error();
      LogError("%s", settings_error.c_str());
    }
    return false;
  }
  settings_error.clear();
  follow_due = follow_due || settings != now;
  settings = now;
  return true;
}

void Service::FollowAll() {
  const bool first = !has_followed;
  has_followed = true;
  follow_due = false;
  const Watches::News news = watches.Follow(settings);

  std::set<std::string> names;
  for (const Share& share : settings->shares) {
    names.insert(share.name);
    std::unique_ptr<FedShare>& fed = shares[share.name];
    if (fed == nullptr) {
      fed = std::make_unique<FedShare>(share.name);
    }
  }
  for (auto share = shares.begin(); share != shares.end();) {
    if (names.contains(share->first)) {
      ++share;
      continue;
    }
    LogInfo("share %s is gone", share->first.c_str());
    healer.Forget(share->first);
    share = shares.erase(share);
  }
  queues.Set(names);

  for (const std::string& name : news.appeared) {
    WantComparison(name, first ? "the service starts" : "it appeared");
    if (!first) {
      keeper.Appeared(name);
    }
  }
  for (const std::string& name : news.changed) {
    WantComparison(name, "its folders changed");
  }
  for (const auto& [name, path] : news.mounts) {
    if (JudgeName(*settings, path) == Verdict::BELONGS) {
      shares[name]->feed.AddLines(*settings, {{CUSTOM_EVENT_REINDEX, path, {}, {}}});
    } else if (settings->HasFolderBelow(path)) {
      WantComparison(name, "a mount above an indexed folder changed");
    }
  }
}

void Service::WantComparison(const std::string& name, const char* reason) {
  LogDebug("share %s is to be compared: %s", name.c_str(), reason);
  FedShare& share = *shares.at(name);
  share.differs = true;
  share.urgency = watches.shares.at(name).can_hang ? Urgency::APART : Urgency::NOW;
  // Losses that go on must not have whole comparisons back to back.
  share.compare_at = std::max(Clock::now(), share.rest_until);
  share.retry = FIRST_RETRY;
}

void Service::StartDueComparisons(Clock::time_point now) {
  for (auto& [name, share] : shares) {
    if (!share->compare_at.has_value() || *share->compare_at > now) {
      continue;
    }
    if (watches.shares.at(name).by == WatchedBy::NOBODY) {
      share->compare_at.reset();
    } else if (IsIndexedAnew(name)) {
      share->compare_at = now + REINDEX_INTERVAL;
    } else {
      share->compare_at.reset();
      healer.Request(name, share->urgency);
    }
  }
}

void Service::TakeHealings() {
  for (Healing& healing : healer.Take()) {
    const auto known = shares.find(healing.share);
    if (known == shares.end()) {
      continue;
    }
    FedShare& share = *known->second;
    share.rest_until = Clock::now() + std::min(healing.worked, LONGEST_REST);
    const bool is_last = !healer.IsPending(healing.share) && !share.compare_at.has_value();
    const bool is_sure = healing.done && !healing.early;
    const std::string& name = known->first;
    if (healing.done) {
      LogDebug("share %s: %llu differences", name.c_str(),
               static_cast<unsigned long long>(healing.counts.differences));
      share.feed.AddLines(*settings, healing.lines);
    }
    if (is_sure) {
      const bool is_watched = watches.shares.at(name).by != WatchedBy::COMPARISON;
      if (is_last) {
        share.differs = false;
        if (is_watched) {
          share.urgency = Urgency::IDLE;
        }
        share.compare_at = Clock::now() + (is_watched ? options.daily : options.interval);
      }
      if (!is_watched) {
        share.complete_until = healing.began;
      }
      share.retry = FIRST_RETRY;
    } else if (is_last) {
      share.compare_at = std::max(Clock::now() + share.retry, share.rest_until);
      share.retry = std::min(share.retry * 2, LONGEST_RETRY);
    }
    if (!healing.done && share.told_error != healing.error) {
      LogError("share %s cannot be compared: %s", name.c_str(), healing.error.c_str());
    }
    share.told_error = healing.error;
    healing.lines.clear();
    share.last = std::move(healing);
  }
}

void Service::ReadEvents() {
  const Clock::time_point now = Clock::now();
  const Watches::Reading reading =
      watches.Read([this, now](const std::string& name, const Change& change) {
        return shares.at(name)->feed.Add(*settings, change, now);
      });
  for (const Watches::ChangedThing& thing : reading.unseen) {
    AddToDevice(thing.device, thing.inode);
  }
  all_read = reading.all_read;
  follow_due = follow_due || reading.roots_moved;
  for (const std::string& name : reading.overflown) {
    LogInfo("share %s: events were lost", name.c_str());
    WantComparison(name, "events were lost");
  }
}

bool Service::IsThere(const std::string& name) const {
  const ShareWatch& watch = watches.shares.at(name);
  return watch.by != WatchedBy::NOBODY && !watch.moved;
}

void Service::WorkFeeds(Clock::time_point now) {
  std::set<std::string> hurried;
  for (const Syncing& waiting : syncing) {
    hurried.insert(waiting.shares.begin(), waiting.shares.end());
  }
  const int64_t today = Today();
  for (auto& [name, share] : shares) {
    const ShareWatch& watch = watches.shares.at(name);
    if (watch.by == WatchedBy::NOBODY) {
      // Lines about a share that is not there could only do harm, and it is compared when it comes.
      share->feed.Clear();
      continue;
    }
    if (watch.moved) {
      continue;  // a look would find nothing there; what became of the root comes first
    }
    // Before a comparison has ended nobody is answered, and there is no hurry.
    const bool hurry = hurried.contains(name) && !share->differs && !share->feed.IsWrittenOut();
    const std::optional<Clock::time_point> due = share->feed.NextDue();
    if (hurry || (due.has_value() && *due <= now)) {
      share->feed.Work(*settings, now, hurry);
    }
    if (share->told_queue_error != share->feed.Error()) {
      share->told_queue_error = share->feed.Error();
      if (!share->told_queue_error.empty()) {
        LogError("share %s: %s", name.c_str(), share->told_queue_error.c_str());
      }
    }
    if (share->feed.TakeLoss()) {
      LogInfo("share %s: more changes than are kept", name.c_str());
      // Other names of the files that were changed may lie in its neighbours.
      for (const auto& [other, neighbour] : watches.shares) {
        if (other == name ||
            (watch.by == WatchedBy::FANOTIFY && neighbour.by == WatchedBy::FANOTIFY &&
             neighbour.place.device == watch.place.device)) {
          WantComparison(other, "more changes than are kept");
        }
      }
    }
    if (watch.by != WatchedBy::COMPARISON && all_read && !share->differs &&
        share->feed.IsWrittenOut()) {
      share->complete_until = today;
    }
  }
}

std::optional<Service::Clock::time_point> Service::NextDue() const {
  std::optional<Clock::time_point> next = next_look;
  const auto take = [&next](const std::optional<Clock::time_point>& time) {
    if (time.has_value() && (!next.has_value() || *time < *next)) {
      next = time;
    }
  };
  take(next_beat);
  for (const auto& [name, share] : shares) {
    take(share->compare_at);
    take(share->feed.NextDue());
    take(share->twins.NextDue());
  }
  return next;
}

void Service::Round(Clock::time_point now) {
  std::set<std::string> taken;
  if (queues.Read(taken)) {
    (void)ReloadSettings();  // the old ones hold until the new ones can be read
  }
  const bool look_due = next_look <= now;
  if (look_due && !settings_error.empty()) {
    (void)ReloadSettings();
  }
  if (follow_due || look_due) {
    FollowAll();
    const bool soon = watches.IsAnyMissing() || !settings_error.empty();
    next_look = now + (soon ? LOOK_INTERVAL : SLOW_LOOK_INTERVAL);
  }

  for (const Request& request : server.Serve()) {
    Serve(request);
  }
  ReadEvents();
  TakeHealings();
  StartDueComparisons(now);
  for (const std::string& name : taken) {
    const auto share = shares.find(name);
    if (share != shares.end() && IsThere(name)) {
      share->second->feed.Work(*settings, now);
    }
  }
  WorkFeeds(now);
  SearchTwins(now);
  AnswerClients();
}

void Service::Wait(int signals) {
  std::vector<pollfd> waiting = {{signals, POLLIN, 0},
                                 {mount_table.fd, POLLPRI, 0},
                                 {queues.Descriptor(), POLLIN, 0},
                                 {healer.Descriptor(), POLLIN, 0},
                                 {server.Descriptor(), POLLIN, 0}};
  for (const int descriptor : watches.Descriptors()) {
    waiting.push_back({descriptor, POLLIN, 0});
  }

  const std::optional<Clock::time_point> until = NextDue();
  int timeout = -1;
  if (!all_read || follow_due) {
    timeout = 0;
  } else if (until.has_value()) {
    const auto left = std::chrono::ceil<std::chrono::milliseconds>(*until - Clock::now());
    timeout = static_cast<int>(std::clamp<int64_t>(left.count(), 0, 3600 * 1000));
  }
  if (poll(waiting.data(), waiting.size(), timeout) <= 0) {
    return;
  }
  ended = waiting[0].revents != 0;
  follow_due = follow_due || waiting[1].revents != 0;
}

int Service::Run(int signals) {
  TellReady();
  if (AliveInterval().has_value()) {
    next_beat = Clock::now();
  }
  while (!ended && !queues.IsRootGone()) {
    Round(Clock::now());
    TellManager(Clock::now());
    Wait(signals);
  }
  TellStopping();
  if (queues.IsRootGone()) {
    LogError("%s was moved or removed: to be started anew", settings->state_root.c_str());
    return 1;
  }
  WriteOut();
  return 0;
}

void Service::WriteOut() {
  const Clock::time_point deadline = Clock::now() + LAST_LINES;
  all_read = false;
  while (!all_read && Clock::now() < deadline) {
    ReadEvents();
  }
  for (auto& [name, share] : shares) {
    if (IsThere(name) && Clock::now() < deadline) {
      share->feed.Work(*settings, Clock::now(), true, deadline);
    }
    // A lock that somebody holds cannot be awaited by an event; the feed says when to try again.
    while (Clock::now() < deadline && !share->feed.IsWrittenOut() &&
           share->feed.NextDue().has_value() && *share->feed.NextDue() < deadline) {
      const auto nap =
          std::chrono::ceil<std::chrono::milliseconds>(*share->feed.NextDue() - Clock::now());
      (void)poll(nullptr, 0, static_cast<int>(std::max<int64_t>(nap.count(), 1)));
      share->feed.Work(*settings, Clock::now(), true, deadline);
    }
    if (!share->feed.IsWrittenOut()) {
      LogInfo("share %s: %zu changes are left to the comparison at the next start", name.c_str(),
              share->feed.Backlog() + share->feed.Gathered());
    }
  }
}

}  // namespace fileindexd
