// SPDX-License-Identifier: GPL-2.0-or-later
#include "platform/share.h"

#include <cstring>

#include "base/mutex_guard.h"
#include "scripted/script.h"

namespace fileindexd {

using scripted::Share;
using scripted::TheScript;

namespace {

std::optional<Share> FindShare(const std::string& name) {
  const MutexGuard lock(&TheScript().mutex);
  for (const Share& share : TheScript().shares) {
    if (share.name == name) {
      return share;
    }
  }
  return std::nullopt;
}

int CopyPath(const char* operation, const char* share_name, std::string Share::*path, char* buffer,
             int size) {
  const auto answer = TheScript().Enter(operation, share_name, share_name);
  const auto share = FindShare(share_name);
  if (answer.value_or(0) < 0 || !share || (*share.*path).size() + 1 > static_cast<size_t>(size)) {
    return -1;
  }
  std::memcpy(buffer, (*share.*path).c_str(), (*share.*path).size() + 1);
  return 0;
}

void CountRecords(int difference) {
  const MutexGuard lock(&TheScript().mutex);
  TheScript().live_records += difference;
}

}  // namespace

int TALOShareGet(const char* name, _tag_TALOSHARE** share) {
  const auto answer = TheScript().Enter("TALOShareGet", name, name);
  const auto found = FindShare(name);
  if (answer.value_or(0) < 0 || !found) {
    return -1;
  }
  *share = new _tag_TALOSHARE{strdup(found->name.c_str()), strdup(found->path.c_str())};
  CountRecords(1);
  return 0;
}

void TALOShareFree(_tag_TALOSHARE* share) {
  if (share == nullptr) {
    return;
  }
  free(const_cast<char*>(share->name));  // NOLINT: strdup's own
  free(const_cast<char*>(share->path));  // NOLINT: strdup's own
  delete share;
  CountRecords(-1);
}

int FILEIDXDBPathGet(const char* share_name, char* buffer, int size) {
  return CopyPath("FILEIDXDBPathGet", share_name, &Share::db_path, buffer, size);
}

int FILEIDXQueuePathGet(const char* share_name, char* buffer, int size) {
  return CopyPath("FILEIDXQueuePathGet", share_name, &Share::queue_path, buffer, size);
}

namespace TALO::FILEINDEX {

void AddCustomEvent(const int& event, const std::string& path, const Json::Value& data) {
  TheScript().Enter("AddCustomEvent", path,
                    std::to_string(event) + " " + path + " " + data.toString());
}

void NoteLostChanges(const std::string& path, int error) {
  TheScript().Enter("NoteLostChanges", path, path + " " + std::to_string(error));
}

bool GetShareNameByPath(std::string& share_name, const std::string& path) {
  const auto answer = TheScript().Enter("GetShareNameByPath", path, path);
  if (answer && *answer == 0) {
    return false;
  }
  const MutexGuard lock(&TheScript().mutex);
  for (const Share& share : TheScript().shares) {
    if ((path + "/").starts_with(share.path + "/")) {
      share_name = share.name;
      return true;
    }
  }
  return false;
}

bool CanShareBeIndexed(const _tag_TALOSHARE* share) {
  return TheScript().Enter("CanShareBeIndexed", share->name, share->name).value_or(1) != 0;
}

bool IsShareSpaceEnough(const std::string& share_name) {
  return TheScript().Enter("IsShareSpaceEnough", share_name, share_name).value_or(1) != 0;
}

}  // namespace TALO::FILEINDEX
}  // namespace fileindexd
