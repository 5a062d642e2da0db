// SPDX-License-Identifier: GPL-2.0-or-later
#include "search/follower.h"

#include <sqlite3.h>

#include <cerrno>
#include <csignal>
#include <cstring>
#include <set>

#include "index/reader.h"
#include "search/log.h"

namespace fileindexd {

namespace {

// Steps of SQLite's machine between two looks for a signal: some milliseconds.
constexpr int STEPS_BETWEEN_LOOKS = 100000;

int InterruptWhenEnding(void* /*context*/) {
  return IsEndAsked() ? 1 : 0;
}

}  // namespace

bool IsEndAsked() {
  sigset_t pending;
  return sigpending(&pending) == 0 &&
         (sigismember(&pending, SIGTERM) == 1 || sigismember(&pending, SIGINT) == 1);
}

bool Follower::Start(std::string& error) {
  store = StateStore::Open(error);
  if (!store) {
    return false;
  }
  if (!watches.Open()) {
    error = std::string("inotify: ") + strerror(errno);
    return false;
  }

  LookAtAll();
  Step();
  return true;
}

void Follower::LookAtAll() {
  hints.everything = true;
  for (const auto& [name, share] : shares) {
    hints.shares.insert(name);
  }
}

void Follower::Step() {
  if (hints.everything) {
    hints.everything = false;
    if (!ReloadSettings()) {
      return;
    }
  }

  while (!hints.shares.empty() && !IsEndAsked()) {
    const std::string name = *hints.shares.begin();
    hints.shares.erase(hints.shares.begin());
    const auto found = shares.find(name);
    if (found != shares.end()) {
      LookAt(name, found->second);
    }
  }
}

// Shares that are new, or whose index appeared, are hinted at.
bool Follower::ReloadSettings() {
  if (!store->GetSettings(settings)) {
    ServiceLog("%s", store->Error().c_str());
    return false;
  }

  watches.Set(*settings);
  std::map<std::string, FollowedShare> current;
  for (const Share& share : settings->shares) {
    const auto known = shares.find(share.name);
    if (known == shares.end()) {
      ServiceDebug("Share[%s] followed", share.name.c_str());
    }

    current[share.name] = known == shares.end() ? FollowedShare() : known->second;
    if (!current[share.name].readable) {
      hints.shares.insert(share.name);
    }
  }
  for (const auto& [name, share] : shares) {
    if (!current.contains(name)) {
      ServiceDebug("Share[%s] followed no longer", name.c_str());
    }
  }
  shares.swap(current);
  return true;
}

void Follower::LookAt(const std::string& name, FollowedShare& share) {
  EntryReader reader;
  const IndexError opened = reader.Open(name);
  FollowedShare seen;
  if (opened == IndexError::NONE) {
    EntryReader::Summary summary;
    sqlite3_progress_handler(reader.database.db, STEPS_BETWEEN_LOOKS, InterruptWhenEnding, nullptr);
    if (!reader.Summarise(summary)) {
      ServiceDebug("Share[%s] cannot be read", name.c_str());
    } else {
      seen = {true, summary.entries, summary.wanted, summary.last_commit};
    }
  } else if (opened != IndexError::PATH_NOT_FOUND) {
    ServiceDebug("Share[%s] cannot be opened, reason=%s", name.c_str(), IndexErrorText(opened));
  }

  if (seen.entries != share.entries || seen.wanted != share.wanted ||
      seen.readable != share.readable || seen.last_commit != share.last_commit) {
    ServiceDebug("Share[%s] %llu entries, content of %llu wanted", name.c_str(),
                 static_cast<unsigned long long>(seen.entries),
                 static_cast<unsigned long long>(seen.wanted));
  }
  share = seen;
}

}  // namespace fileindexd
