// SPDX-License-Identifier: GPL-2.0-or-later
#include "platform/status.h"

#include "base/mutex_guard.h"
#include "scripted/script.h"

namespace fileindexd::TALO::FILEINDEX {

using scripted::TheScript;

namespace {

bool Told(const std::optional<int>& answer) {
  return answer.value_or(1) != 0;
}

void Put(std::set<std::string>& names, const std::string& name, bool in) {
  if (in) {
    names.insert(name);
  } else {
    names.erase(name);
  }
}

const char* Text(bool value) {
  return value ? "true" : "false";
}

}  // namespace

namespace StatusMgr {

bool GetPauseInfo(int64_t& resume_time) {
  if (!Told(TheScript().Enter("GetPauseInfo", "", ""))) {
    return false;
  }
  const MutexGuard lock(&TheScript().mutex);
  resume_time = TheScript().resume_time;
  return true;
}

bool IsUpdated(const std::string& marker) {
  const auto answer = TheScript().Enter("IsUpdated", marker, marker);
  const MutexGuard lock(&TheScript().mutex);
  return answer ? *answer != 0 : TheScript().markers.contains(marker);
}

bool SetUpdated(const std::string& marker) {
  if (!Told(TheScript().Enter("SetUpdated", marker, marker))) {
    return false;
  }
  const MutexGuard lock(&TheScript().mutex);
  TheScript().markers.insert(marker);
  return true;
}

bool ShareIsNeedReindex(const std::string& share_name) {
  const auto answer = TheScript().Enter("ShareIsNeedReindex", share_name, share_name);
  const MutexGuard lock(&TheScript().mutex);
  return answer ? *answer != 0 : TheScript().need_reindex.contains(share_name);
}

void ShareSetNeedReindex(const std::string& share_name, bool need) {
  TheScript().Enter("ShareSetNeedReindex", share_name, share_name + " " + Text(need));
  const MutexGuard lock(&TheScript().mutex);
  Put(TheScript().need_reindex, share_name, need);
}

bool ShareSetNoSpace(const std::string& share_name, bool no_space) {
  if (!Told(TheScript().Enter("ShareSetNoSpace", share_name, share_name + " " + Text(no_space)))) {
    return false;
  }
  const MutexGuard lock(&TheScript().mutex);
  Put(TheScript().no_space, share_name, no_space);
  return true;
}

}  // namespace StatusMgr

bool Updater_hvx60_beta2() {
  return Told(TheScript().Enter("Updater_hvx60_beta2", "", ""));
}

}  // namespace fileindexd::TALO::FILEINDEX
