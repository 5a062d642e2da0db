// SPDX-License-Identifier: GPL-2.0-or-later
#include "platform/paths.h"

#include <cerrno>
#include <ctime>

#include "platform/standalone/environment.h"
#include "platform/standalone/shortage.h"
#include "platform/standalone/uncancelled.h"
#include "state/belonging.h"
#include "state/filesystem.h"
#include "state/layout.h"

namespace fileindexd {

namespace {

constexpr int64_t GLANCE_NS = 5'000'000;

// One operation on a document asks several questions about its path in a row. The answers are taken
// from one look, which is not kept for longer than such a row takes.
struct Glance {
  std::string path;
  int64_t time = 0;  // monotonic
  std::shared_ptr<const Settings> settings;
  Verdict verdict = Verdict::UNKNOWN;
  Thing thing = Thing::NONE;
};

// What exists does not depend on whether it belongs. A verdict on the name alone has not looked.
bool IsNameVerdict(Verdict verdict) {
  switch (verdict) {
    case Verdict::BAD_PATH:
    case Verdict::NO_SHARE:
    case Verdict::NOT_COVERED:
    case Verdict::SKIPPED_NAME:
    case Verdict::OWN_STATE:
      return true;
    default:
      return false;
  }
}

int64_t Now() {
  timespec now = {};
  clock_gettime(CLOCK_MONOTONIC_COARSE, &now);
  return static_cast<int64_t>(now.tv_sec) * 1'000'000'000 + now.tv_nsec;
}

// `error`: of a look that failed.
void NoteShortage(const Settings& settings, const std::string& path, const Look& look, int error) {
  const std::optional<std::string> normal = NormalPath(path);
  const Share* share = normal.has_value() ? settings.ShareOfPath(*normal) : nullptr;
  if (share == nullptr) {
    return;
  }
  if (look.verdict == Verdict::UNKNOWN) {
    NoteFailedLook(share->name, path, error);
  } else if (look.verdict == Verdict::BELONGS && look.thing == Thing::DIRECTORY) {
    NoteDirectory(share->name, path);
  }
}

const Glance& GlanceAt(const std::string& path) {
  thread_local Glance kept;
  const int64_t now = Now();
  if (kept.settings == nullptr || kept.path != path || now - kept.time >= GLANCE_NS) {
    kept.settings = CurrentSettings();
    errno = 0;
    const Look look = LookAt(*kept.settings, path);
    NoteShortage(*kept.settings, path, look, errno);
    kept.verdict = look.verdict;
    kept.thing = IsNameVerdict(look.verdict) ? ThingAt(*kept.settings, path) : look.thing;
    kept.path = path;
    // Between two passes a queue file is asked for. That look is not kept, and so nothing that was
    // seen before the drain is believed after it.
    kept.time = Covers(kept.settings->state_root, path) ? 0 : now;
  }
  return kept;
}

}  // namespace

namespace TALO::FILEINDEX {

bool IsDirExist(const std::string& path) {
  return Uncancelled([&path] { return GlanceAt(path).thing == Thing::DIRECTORY; });
}

bool IsFileExist(const std::string& path) {
  return Uncancelled([&path] {
    const Glance& glance = GlanceAt(path);
    // What lies in our own state is a queue file: those are regular files or nothing.
    return glance.thing == Thing::FILE ||
           (glance.thing == Thing::LINK && !Covers(glance.settings->state_root, path));
  });
}

bool CanFullPathBeIndexed(const std::string& path) {
  return Uncancelled([&path] {
    const std::shared_ptr<const Settings> settings = CurrentSettings();
    const std::optional<std::string> normal = NormalPath(path);
    if (!normal.has_value()) {
      return false;
    }

    const Verdict verdict = LookAt(*settings, *normal).verdict;
    if (verdict != Verdict::BELONGS && verdict != Verdict::NOT_COVERED) {
      return false;
    }

    const Share* share = settings->ShareOfPath(*normal);
    return share != nullptr && (share->path == *normal || IsMountPoint(*normal) == 0);
  });
}

bool IsSystemPreservedFileName(const std::string& name) {
  return IsPreservedName(name) || IsPassingName(name);
}

// What is gone, or cannot be told, is let through: the indexer looks itself, drops the entry of
// what is gone, and tells what failed.
bool IsSkipIndex(const std::string& path) {
  const CancelOff off;
  const Verdict verdict = GlanceAt(path).verdict;
  return verdict != Verdict::BELONGS && verdict != Verdict::GONE && verdict != Verdict::UNKNOWN;
}

bool StringStartWith(const std::string& text, const std::string& prefix) {
  return text.starts_with(prefix);
}

void RetrieveBoolFromJsonObj(bool& value, const char* key, const Json::Value& object) {
  if (object.isObject() && object.isMember(key) && object[key].isBool()) {
    value = object[key].asBool();
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
