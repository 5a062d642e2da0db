// SPDX-License-Identifier: GPL-2.0-or-later
// The notification service: one thread that reads events, writes lines, and never waits for
// anything but the next event; comparing and helping the daemon have threads of their own.
#pragma once

#include <chrono>
#include <cstdint>
#include <map>
#include <memory>
#include <optional>
#include <set>
#include <string>
#include <vector>

#include "base/scoped_fd.h"
#include "notify/healer.h"
#include "notify/keeper.h"
#include "notify/queue_watch.h"
#include "notify/server.h"
#include "notify/share_feed.h"
#include "notify/twins.h"
#include "notify/watches.h"
#include "state/store.h"

namespace fileindexd {

struct ServiceOptions {
  WatchedBy best = WatchedBy::FANOTIFY;
  std::chrono::seconds interval{600};  // between comparisons where nothing better is to be had
  std::chrono::seconds daily{86400};   // between comparisons of what is watched
};

// What is known of one share beyond how it is watched.
struct FedShare {
  using Clock = ShareFeed::Clock;

  explicit FedShare(const std::string& name) : feed(name), twins(name) {}

  ShareFeed feed;
  Twins twins;
  // When the next comparison is to be asked for, and how urgent it is. None: at the next sign.
  std::optional<Clock::time_point> compare_at;
  Urgency urgency = Urgency::NOW;
  std::chrono::milliseconds retry{0};  // until the next try, after one that failed
  bool differs = true;                 // the index may, until a comparison has ended
  Healing last;                        // without its lines; `ended` 0: none yet
  Clock::time_point rest_until;        // no comparison before
  std::string told_queue_error;        // the feed's, that was logged
  std::string told_error;              // the last one that was logged
  int64_t complete_until = 0;          // seconds since the epoch; 0: never yet
};

class Service {
 public:
  explicit Service(const ServiceOptions& chosen);

  // Opens everything and begins to watch. False, and `error` then says why.
  bool Start(std::string& error);
  // Until `signals`, a signalfd, is readable. Then writes out what is gathered. The exit code.
  int Run(int signals);

 private:
  using Clock = ShareFeed::Clock;

  // Whatever waited when somebody asked is read after so many rounds, even if more comes all the
  // time.
  static constexpr int ROUNDS_TO_READ_ALL = 4;

  bool ReloadSettings();
  void FollowAll();
  void WantComparison(const std::string& name, const char* reason);
  void StartDueComparisons(Clock::time_point now);
  void TakeHealings();
  void ReadEvents();
  bool IsThere(const std::string& name) const;
  void WorkFeeds(Clock::time_point now);
  void AddToDevice(const std::string& device, uint64_t inode);
  void NoteChangedFile(const std::string& name, const ChangedFile& file);
  void SearchTwins(Clock::time_point now);
  void AnswerClients();
  void Serve(const Request& request);
  std::string StatusReply() const;
  void Round(Clock::time_point now);
  void Wait(int signals);
  void TellManager(Clock::time_point now);
  std::optional<Clock::time_point> NextDue() const;
  void WriteOut();

  struct Syncing {
    uint64_t client = 0;
    std::set<std::string> shares;             // that are not done yet
    std::map<std::string, uint64_t> tickets;  // of their twins; none before all is written out
    int rounds = 0;                           // since it asked
  };

  bool IsWrittenOut(const std::string& name) const;
  bool IsSynced(const std::string& name, const Syncing& waiting) const;

  const ServiceOptions options;
  std::unique_ptr<StateStore> store;
  std::shared_ptr<const Settings> settings;
  Watches watches;
  QueueWatch queues;
  Healer healer;
  Keeper keeper;
  Server server;
  ScopedFd mount_table;
  std::map<std::string, std::unique_ptr<FedShare>> shares;  // by name
  std::vector<Syncing> syncing;
  bool follow_due = true;
  bool has_followed = false;
  bool all_read = false;
  bool ended = false;
  std::string settings_error;
  Clock::time_point next_look;                 // at the roots of the shares
  std::optional<Clock::time_point> next_beat;  // for the service manager
};

}  // namespace fileindexd
