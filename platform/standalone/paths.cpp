// SPDX-License-Identifier: GPL-2.0-or-later
#include "platform/paths.h"

#include <algorithm>

#include "platform/standalone/environment.h"
#include "platform/standalone/uncancelled.h"
#include "state/belonging.h"
#include "state/filesystem.h"
#include "state/layout.h"

namespace fileindexd {

namespace TALO::FILEINDEX {

bool IsDirExist(const std::string& path) {
  return Uncancelled([&path] { return ThingAt(*CurrentSettings(), path) == Thing::DIRECTORY; });
}

bool IsFileExist(const std::string& path) {
  return Uncancelled([&path] {
    const std::shared_ptr<const Settings> settings = CurrentSettings();
    const Thing thing = ThingAt(*settings, path);
    // What lies in our own state is a queue file: those are regular files or nothing.
    return thing == Thing::FILE || (thing == Thing::LINK && !Covers(settings->state_root, path));
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
    return share != nullptr && (share->path == *normal || IsMountPoint(*normal) != 1);
  });
}

bool IsSystemPreservedFileName(const std::string& name) {
  return IsPreservedName(name) || IsPassingName(name);
}

// What is gone, or cannot be told, is let through: the indexer looks itself, drops the entry of
// what is gone, and tells what failed.
bool IsSkipIndex(const std::string& path) {
  const CancelOff off;
  const Verdict verdict = LookAt(*CurrentSettings(), path).verdict;
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
