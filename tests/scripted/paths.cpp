// SPDX-License-Identifier: GPL-2.0-or-later
#include "platform/paths.h"

#include <sys/stat.h>

#include "scripted/script.h"

namespace fileindexd {

using scripted::RuleCall;
using scripted::TheScript;

namespace {

mode_t KindOf(const std::string& path) {
  struct stat found = {};
  return lstat(path.c_str(), &found) == 0 ? (found.st_mode & S_IFMT) : 0;
}

}  // namespace

namespace TALO::FILEINDEX {

bool IsDirExist(const std::string& path) {
  const auto answer = TheScript().Enter("IsDirExist", path, path);
  return answer ? *answer != 0 : KindOf(path) == S_IFDIR;
}

bool IsFileExist(const std::string& path) {
  const auto answer = TheScript().Enter("IsFileExist", path, path);
  const mode_t kind = KindOf(path);
  return answer ? *answer != 0 : kind == S_IFREG || kind == S_IFLNK;
}

bool CanFullPathBeIndexed(const std::string& path) {
  return TheScript().Enter("CanFullPathBeIndexed", path, path).value_or(1) != 0;
}

void NoteUnopenedDirectory(const std::string& path, int error) {
  TheScript().Enter("NoteUnopenedDirectory", path, path + " " + std::to_string(error));
}

bool IsSystemPreservedFileName(const std::string& name) {
  return TheScript().Enter("IsSystemPreservedFileName", name, name).value_or(0) != 0;
}

bool IsSkipIndex(const std::string& path) {
  const RuleCall inside;
  return TheScript().Enter("IsSkipIndex", path, path).value_or(0) != 0;
}

bool StringStartWith(const std::string& text, const std::string& prefix) {
  const auto answer = TheScript().EnterUnrecorded("StringStartWith", text);
  return answer ? *answer != 0 : text.starts_with(prefix);
}

void RetrieveBoolFromJsonObj(bool& value, const char* key, const Json::Value& object) {
  // A failure leaves the variable as it was, as a missing key does.
  const auto answer = TheScript().EnterUnrecorded("RetrieveBoolFromJsonObj", key);
  if (answer || !object.isObject() || !object.isMember(key) || !object[key].isBool()) {
    return;
  }
  value = object[key].asBool();
}

}  // namespace TALO::FILEINDEX

int QLIBFhsPathInSnapshot(const char* path, int* in_snapshot) {
  const RuleCall inside;
  const auto told = TheScript().Enter("QLIBFhsPathInSnapshot", path, path);
  *in_snapshot = told.value_or(0) == 0 ? 0 : 1;
  return told.value_or(0) < 0 ? -1 : 0;
}

int TALOFSDirIsMntPoint(const char* path) {
  const RuleCall inside;
  return TheScript().Enter("TALOFSDirIsMntPoint", path, path).value_or(0);
}

}  // namespace fileindexd
