// SPDX-License-Identifier: GPL-2.0-or-later
#include "platform/settings.h"

#include "base/mutex_guard.h"
#include "scripted/script.h"

namespace fileindexd::TALO::FILEINDEX {

using scripted::TheScript;

namespace {

std::vector<Folder> Stored() {
  const MutexGuard lock(&TheScript().mutex);
  return TheScript().folders;
}

bool Covers(const Folder& folder, const std::string& path) {
  return (path + "/").starts_with(folder.path + "/");
}

}  // namespace

std::string Folder::GetFullPath() const {
  TheScript().EnterUnrecorded("GetFullPath", path);
  return path;
}

Json::Value Folder::asJson() const {
  TheScript().EnterUnrecorded("asJson", path);
  Json::Value json(Json::objectValue);
  json["path"] = path;
  json["document"] = document;
  return json;
}

bool Folders::Load() {
  const auto answer = TheScript().Enter("Folders::Load", "", "");
  if (answer && *answer == 0) {
    return false;
  }
  all = Stored();
  loaded = true;
  return true;
}

bool Folders::List(std::vector<Folder>& folders, const std::string& share_name) {
  const auto answer = TheScript().Enter("Folders::List", share_name, share_name);
  if (!loaded || (answer && *answer == 0)) {
    return false;
  }
  folders.clear();
  for (const Folder& folder : all) {
    if (folder.share == share_name) {
      folders.push_back(folder);
    }
  }
  return true;
}

namespace IndexMgr {

bool List(std::vector<Folder>& folders) {
  const auto answer = TheScript().Enter("IndexMgr::List", "", "");
  if (answer && *answer == 0) {
    return false;
  }
  folders = Stored();
  return true;
}

bool IsFullPathIndexed(const std::string& path, const std::vector<Folder>& folders) {
  const auto answer = TheScript().Enter("IsFullPathIndexed", path, path);
  if (answer) {
    return *answer != 0;
  }
  for (const Folder& folder : folders) {
    if (Covers(folder, path)) {
      return true;
    }
  }
  return false;
}

}  // namespace IndexMgr

Json::Value GetMostSuitableCfg(std::vector<Folder> folders, const std::string& path) {
  const auto answer = TheScript().Enter("GetMostSuitableCfg", path, path);
  if (answer && *answer == 0) {
    return Json::Value(Json::nullValue);
  }
  const Folder* best = nullptr;
  for (const Folder& folder : folders) {
    if (Covers(folder, path) && (best == nullptr || folder.path.size() > best->path.size())) {
      best = &folder;
    }
  }
  if (best == nullptr) {
    return Json::Value(Json::nullValue);
  }
  Json::Value cfg(Json::objectValue);
  cfg["document"] = best->document;
  return cfg;
}

}  // namespace fileindexd::TALO::FILEINDEX
