// SPDX-License-Identifier: GPL-2.0-or-later
#include "platform/paths.h"

#include <cerrno>
#include <cstring>
#include <ctime>
#include <utility>

#include "platform/standalone/environment.h"
#include "platform/standalone/glance.h"
#include "platform/standalone/shortage.h"
#include "platform/standalone/uncancelled.h"
#include "state/belonging.h"
#include "state/filesystem.h"
#include "state/layout.h"

namespace fileindexd {

namespace {

constexpr int64_t GLANCE_NS = 5'000'000;

// One operation on a document asks several questions about its path in a row, and then writes down
// what is there. All that is taken from one look, which is not kept for longer than such a row
// takes, however long the look itself took. It was made after the queue was drained, and so shows
// every change that led to the operation; whatever changes later has its own event, in a later
// drain.
struct Glance {
  std::string path;
  int64_t time = 0;                          // monotonic, after the look
  std::shared_ptr<const Settings> settings;  // null: none
  Look look;
  Thing thing = Thing::NONE;
};

struct Glances {
  Glance kept;
  FolderView folder;
  std::shared_ptr<const Settings> settings;  // null: to be asked for
  int64_t settings_time = 0;                 // monotonic, after they were asked for
};

Glances& OfThisThread() {
  thread_local Glances glances;
  return glances;
}

// What exists does not depend on whether it belongs. A verdict on the name alone has not looked.
bool IsNameVerdict(Verdict verdict) {
  switch (verdict) {
    case Verdict::BAD_PATH:
    case Verdict::NO_SHARE:
    case Verdict::NOT_COVERED:
    case Verdict::SKIPPED_NAME:
    case Verdict::OWN_STATE:
    case Verdict::EXCLUDED:
      return true;
    default:
      return false;
  }
}

// Of every path of our own state, also where its root is named by way of a link: no share holds it.
bool IsOutside(Verdict verdict) {
  return verdict == Verdict::NO_SHARE || verdict == Verdict::OWN_STATE;
}

int64_t Now() {
  timespec now = {};
  clock_gettime(CLOCK_MONOTONIC_COARSE, &now);
  return static_cast<int64_t>(now.tv_sec) * 1'000'000'000 + now.tv_nsec;
}

void NoteShortage(const Settings& settings, const std::string& path, int error) {
  if (IsShortage(error)) {
    NoteFailedLook(settings, path, error);
  }
}

Thing LookAgain(const Settings& settings, const std::string& path) {
  errno = 0;
  const Thing thing = ThingAt(settings, path);
  if (thing == Thing::NONE) {
    NoteShortage(settings, path, errno);
  }
  return thing;
}

const Glance& GlanceAt(const std::string& path) {
  auto& [kept, folder, settings, settings_time] = OfThisThread();
  const int64_t now = Now();
  if (kept.settings == nullptr || kept.path != path || now - kept.time >= GLANCE_NS) {
    // Who changes them queues an event behind the change: they may be as old as a look when it is
    // made, and as old again when it is used.
    if (settings == nullptr || now - settings_time >= GLANCE_NS) {
      settings = CurrentSettings();
      settings_time = Now();
    }
    kept.settings = settings;
    errno = 0;
    kept.look = LookNear(*kept.settings, path, folder);
    if (kept.look.verdict == Verdict::UNKNOWN) {
      NoteShortage(*kept.settings, path, errno);
    }
    kept.thing =
        IsNameVerdict(kept.look.verdict) ? LookAgain(*kept.settings, path) : kept.look.thing;
    kept.path = path;
    kept.time = Now();
    // Between two passes a queue file is asked for. That look is not kept, nor the folder and the
    // settings before it, and so nothing that was seen before the drain is believed after it.
    if (IsOutside(kept.look.verdict)) {
      kept.time = 0;
      folder = {};
      settings.reset();
    }
  }
  return kept;
}

// Walks descend into what is a directory. Two kinds are none to them: a snapshot, in which nothing
// ever belongs, and one that is kept out by a pattern (a build tree may be larger than all that is
// indexed), unless an indexed folder lies in it.
bool MayHoldEntries(const Glance& glance) {
  const Verdict verdict = glance.look.verdict;
  if (verdict == Verdict::EXCLUDED) {
    return glance.settings->HasFolderBelow(NormalPath(glance.path).value_or(glance.path));
  }
  return verdict != Verdict::IN_SNAPSHOT;
}

}  // namespace

bool TakeGlance(const std::string& path, Seen& seen) {
  Glance& kept = OfThisThread().kept;
  if (kept.settings == nullptr || kept.path != path || Now() - kept.time >= GLANCE_NS ||
      kept.look.verdict != Verdict::BELONGS) {
    return false;
  }
  seen = {std::move(kept.settings), kept.look};
  kept.settings.reset();
  return true;
}

namespace TALO::FILEINDEX {

bool IsDirExist(const std::string& path) {
  return Uncancelled([&path] {
    const Glance& glance = GlanceAt(path);
    return glance.thing == Thing::DIRECTORY && MayHoldEntries(glance);
  });
}

bool IsFileExist(const std::string& path) {
  return Uncancelled([&path] {
    const Glance& glance = GlanceAt(path);
    // What lies in no share is a queue file: those are regular files or nothing.
    return glance.thing == Thing::FILE ||
           (glance.thing == Thing::LINK && !IsOutside(glance.look.verdict));
  });
}

// What has no place in an index is not refused here: of that an add makes no entry, and an update
// takes the one out that is left. Only below the root of another file system lies something else.
bool CanFullPathBeIndexed(const std::string& path) {
  return Uncancelled([&path] {
    const Glance& glance = GlanceAt(path);
    const std::string normal = NormalPath(path).value_or(path);
    const Share* share = glance.settings->ShareOfPath(normal);
    if (share == nullptr || share->path == normal) {
      return share != nullptr;
    }
    if (IsNameVerdict(glance.look.verdict)) {
      return IsMountPoint(normal) != 1;  // it was judged by its name alone
    }
    // A file that is mounted over another is an entry like any: nothing lies below it.
    return glance.thing != Thing::DIRECTORY || !glance.look.mount_root;
  });
}

void NoteUnopenedDirectory(const std::string& path, int error) {
  if (!IsShortage(error)) {
    return;  // what is gone, or cannot be read, needs no settings
  }
  const CancelOff off;
  NoteShortage(*CurrentSettings(), path, error);
}

bool IsSystemPreservedFileName(const std::string& name) {
  return IsPreservedName(name) || IsPassingName(name);
}

// What is gone, or cannot be told, is let through: the indexer looks itself, drops the entry of
// what is gone, and tells what failed.
bool IsSkipIndex(const std::string& path) {
  const CancelOff off;
  const Verdict verdict = GlanceAt(path).look.verdict;
  return verdict != Verdict::BELONGS && verdict != Verdict::GONE && verdict != Verdict::UNKNOWN;
}

bool StringStartWith(const std::string& text, const std::string& prefix) {
  return text.starts_with(prefix);
}

void RetrieveBoolFromJsonObj(bool& value, const char* key, const Json::Value& object) {
  const ::Json::Value* found = object.isObject() ? object.find(key, key + strlen(key)) : nullptr;
  if (found != nullptr && found->isBool()) {
    value = found->asBool();
  }
}

}  // namespace TALO::FILEINDEX

int QLIBFhsPathInSnapshot(const char* path, int* in_snapshot) {
  const CancelOff off;
  const std::optional<std::string> normal = NormalPath(path);
  const std::shared_ptr<const Settings> settings = CurrentSettings();
  const Share* share = normal.has_value() ? settings->ShareOfPath(*normal) : nullptr;
  if (share == nullptr) {
    return -1;
  }
  *in_snapshot = IsInSnapshot(share->path, *normal) ? 1 : 0;
  return 0;
}

int TALOFSDirIsMntPoint(const char* path) {
  const CancelOff off;
  return IsMountPoint(path);
}

}  // namespace fileindexd
