// SPDX-License-Identifier: GPL-2.0-or-later
#include "notify/keeper_round.h"

#include <fcntl.h>
#include <sys/stat.h>

#include <algorithm>

#include "notify/log.h"
#include "state/belonging.h"
#include "state/filesystem.h"
#include "state/json_text.h"
#include "state/layout.h"
#include "state/progress.h"
#include "state/queue_writer.h"

namespace fileindexd {

namespace {

constexpr int64_t STALE_AGE = 10;     // seconds
constexpr int64_t ASK_INTERVAL = 60;  // seconds
constexpr int ROUNDS_STAYED = 2;      // before a queue file counts as left alone
constexpr std::chrono::milliseconds BETWEEN_RESUMES(1000);
constexpr int64_t NANOSECONDS = 1000000000;

bool LookAtFile(const std::string& path, struct statx& stx) {
  return statx(AT_FDCWD, path.c_str(), AT_SYMLINK_NOFOLLOW, STATX_BASIC_STATS | STATX_BTIME,
               &stx) == 0;
}

// A time in the future tells of a clock that was set back.
bool IsStaleFile(const struct statx& stx, int64_t now) {
  return stx.stx_mtime.tv_sec + STALE_AGE < now || stx.stx_mtime.tv_sec > now;
}

// A drained copy without a queue file is touched too: it may be left over from a pass that was
// stopped, and the next one works it. So is the queue of a share whose flag stands, for the flag
// alone starts no pass.
bool NeedsTouch(const std::string& share, const ShareStatus& status, int64_t now) {
  struct statx stx {};
  if (LookAtFile(QueuePath(share), stx)) {
    return IsStaleFile(stx, now);
  }
  return status.needs_reindex || status.reindex_begun ||
         (LookAtFile(DrainedPath(share), stx) && IsStaleFile(stx, now));
}

// In its last second, too: the daemon itself ends it only after that.
bool IsPauseInForce(int64_t resume_time, int64_t now) {
  return resume_time == 0 || resume_time >= now;
}

const IndexedFolder* AnyFolder(const Settings& settings, const std::string& share) {
  const auto folder =
      std::find_if(settings.folders.begin(), settings.folders.end(),
                   [&](const IndexedFolder& candidate) { return candidate.share == share; });
  return folder == settings.folders.end() ? nullptr : &*folder;
}

// The daemon, or the tool that adds a share, makes the folder.
bool IsKept(const Settings& settings, const std::string& share) {
  struct statx stx {};
  return AnyFolder(settings, share) != nullptr && LookAtFile(ShareFolder(share), stx);
}

std::string Command(const std::string& type, const std::string& data) {
  return "{\"type\":" + JsonText(type) + ",\"data\":{" + data + "}}";
}

}  // namespace

// The same trouble comes every 15 s.
void KeeperRound::Tell(std::string& told, const std::string& what) {
  if (told != what && !what.empty()) {
    LogError("%s", what.c_str());
  }
  told = what;
}

// Empty also for a reply that was not waited for.
std::string KeeperRound::Trouble(Reply reply) const {
  switch (reply) {
    case Reply::DONE:
    case Reply::NOT_RUNNING:
      break;
    case Reply::REFUSED:
      return "the daemon could not do it, its log tells why";
    case Reply::NO_ANSWER:
      return daemon.wait(std::chrono::milliseconds(0)) ? "the daemon does not answer" : "";
  }
  return {};
}

void KeeperRound::Touch(const std::string& share, Kept& kept) {
  std::string error;
  Tell(kept.trouble, TouchQueue(share, error) ? "" : "share " + share + ": " + error);
}

// One whose disk is away could not be given any.
void KeeperRound::AskForWorker(const Settings& settings, const Share& share, int64_t now,
                               Kept& kept) {
  const IndexedFolder* folder = AnyFolder(settings, share.name);
  if (folder == nullptr || LookAtRoot(share) != RootState::SOUND) {
    return;
  }

  kept.last_ask = now;
  kept.rounds = 0;
  const Reply reply =
      daemon.send(Command("upsert_folder_setting", "\"folder_path\":" + JsonText(folder->path)));
  Tell(kept.ask_trouble,
       Trouble(reply).empty() ? "" : "share " + share.name + ": no worker: " + Trouble(reply));
  if (reply == Reply::DONE) {
    LogInfo("share %s: the daemon was asked for a worker", share.name.c_str());
  }
}

// True while the share is not full. The judgement is the daemon's own.
bool KeeperRound::SeesSpace(const Share& share, ShareStatus& status, Kept& kept) {
  if (!HasSpace(share.path, true) || !HasSpace(StateRoot(), false)) {
    return false;
  }
  if (!store.UpdateStatus(share.name, [](ShareStatus& changed) { changed.no_space = false; })) {
    Tell(kept.trouble, store.Error());
    return false;
  }
  LogInfo("share %s: there is space again", share.name.c_str());
  status.no_space = false;
  return true;
}

// Whether the queue file, or a drained copy, stands there although every reason to leave it is
// ruled out: a daemon that is away or paused, a pass that runs. A short pass shows no progress, but
// its copy does not stay either.
bool KeeperRound::HasStayed(const Share& share, Kept& kept) {
  struct statx queue {};
  ProgressRecord record;
  if (!daemon_lives || paused ||
      (!LookAtFile(DrainedPath(share.name), queue) && !LookAtFile(QueuePath(share.name), queue)) ||
      ReadProgress(WorkerProgressPath(share.name), record)) {
    kept.rounds = 0;
    kept.queue = {};
    return false;
  }

  const bool has_birth_time = (queue.stx_mask & STATX_BTIME) != 0;
  const QueueFile file = {
      queue.stx_ino,
      has_birth_time ? queue.stx_btime.tv_sec * NANOSECONDS + queue.stx_btime.tv_nsec : 0};
  kept.rounds = file == kept.queue ? kept.rounds + 1 : 0;
  kept.queue = file;
  return kept.rounds >= ROUNDS_STAYED;
}

void KeeperRound::RunShare(const Settings& settings, const Share& share, int64_t now) {
  Kept& kept = shares[share.name];
  ShareStatus status;
  if (!store.GetStatus(share.name, status)) {
    Tell(kept.trouble, store.Error());
    return;
  }

  // While the share is full, a touch would only make it meet its limit again.
  const bool was_full = status.no_space;
  if (was_full && !SeesSpace(share, status, kept)) {
    kept.rounds = 0;
    return;
  }

  const bool has_stayed = HasStayed(share, kept);
  const bool is_due = now - kept.last_ask >= ASK_INTERVAL || now < kept.last_ask;
  // A share that was full when the daemon started has no Worker.
  if (daemon_lives && (was_full || (has_stayed && is_due))) {
    AskForWorker(settings, share, now, kept);
  }
  if (was_full || has_stayed || NeedsTouch(share.name, status, now)) {
    Touch(share.name, kept);
  }
}

void KeeperRound::Run(int64_t now) {
  std::shared_ptr<const Settings> settings;
  int64_t resume_time = -1;
  if (!store.GetSettings(settings) || !store.GetPause(resume_time)) {
    Tell(store_trouble, store.Error());
    return;
  }
  Tell(store_trouble, "");

  EndPause(now);
  daemon_lives = daemon.lives();
  paused = IsPauseInForce(resume_time, now);
  std::erase_if(shares,
                [&](const auto& known) { return settings->ShareByName(known.first) == nullptr; });
  for (const Share& share : settings->shares) {
    if (!daemon.wait(std::chrono::milliseconds(0))) {
      return;
    }
    if (IsKept(*settings, share.name)) {
      RunShare(*settings, share, now);
    }
  }
}

void KeeperRound::Appear(const std::string& share_name, int64_t now) {
  std::shared_ptr<const Settings> settings;
  if (!store.GetSettings(settings)) {
    Tell(store_trouble, store.Error());
    return;
  }
  const Share* share = settings->ShareByName(share_name);
  if (share == nullptr || !IsKept(*settings, share_name)) {
    return;
  }

  Kept& kept = shares[share_name];
  if (daemon.lives()) {
    AskForWorker(*settings, *share, now, kept);
  }
  Touch(share_name, kept);
}

// Two resumes, because the daemon's broadcast misses a Worker that is just between its look at the
// pause and its wait. A daemon that does not run reads the store when it starts.
void KeeperRound::EndPause(int64_t now) {
  int64_t resume_time = -1;
  if (!store.GetPause(resume_time) || resume_time <= 0 || IsPauseInForce(resume_time, now)) {
    return;
  }

  if (daemon.lives()) {
    Reply reply = Reply::DONE;
    const bool sent = SendResume(resume_time, reply) && daemon.wait(BETWEEN_RESUMES) &&
                      SendResume(resume_time, reply);
    if (!Trouble(reply).empty()) {
      Tell(pause_trouble, "resume: " + Trouble(reply));
    }
    if (!sent) {
      return;
    }
    LogInfo("the time of the pause has passed: resumed");
  }
  Tell(pause_trouble, store.ClearPause(resume_time) ? "" : store.Error());
}

// False when the pause does not end by this: it was changed meanwhile, or the daemon was not told.
bool KeeperRound::SendResume(int64_t resume_time, Reply& reply) {
  int64_t stored = -1;
  if (!store.GetPause(stored) || stored != resume_time) {
    return false;
  }
  reply = daemon.send(Command("resume", ""));
  if (reply != Reply::DONE && reply != Reply::NOT_RUNNING) {
    return false;
  }

  if (!store.GetPause(stored) || stored == resume_time) {
    return true;
  }
  RestorePause(stored);
  return false;
}

// Whoever paused anew stored it first and told the daemon then; our resume may have come after.
void KeeperRound::RestorePause(int64_t resume_time) {
  if (resume_time >= 0) {
    (void)daemon.send(Command("pause", "\"resume_time\":" + std::to_string(resume_time)));
  }
}

}  // namespace fileindexd
