// SPDX-License-Identifier: GPL-2.0-or-later
#include "platform/settings.h"

#include <algorithm>
#include <iterator>

#include "platform/standalone/configuration.h"
#include "platform/standalone/environment.h"
#include "platform/standalone/uncancelled.h"
#include "state/layout.h"

namespace fileindexd::TALO::FILEINDEX {

namespace {

bool ReadFolders(std::vector<Folder>& folders) {
  return Uncancelled([&folders] {
    StateStore* store = Store();
    std::shared_ptr<const Settings> settings;
    if (store == nullptr || !store->GetSettings(settings)) {
      return false;
    }

    std::vector<Folder> read;
    for (const IndexedFolder& stored : settings->folders) {
      Folder folder;
      folder.share = stored.share;
      folder.path = stored.path;
      folder.document = stored.wanted.document;
      folder.audio = stored.wanted.audio;
      folder.video = stored.wanted.video;
      folder.photo = stored.wanted.photo;
      read.push_back(std::move(folder));
    }
    folders.swap(read);
    return true;
  });
}

unsigned BitsOf(const Folder& folder) {
  return (folder.document ? CONFIGURED_DOCUMENT : 0) | (folder.audio ? CONFIGURED_AUDIO : 0) |
         (folder.video ? CONFIGURED_VIDEO : 0) | (folder.photo ? CONFIGURED_PHOTO : 0);
}

}  // namespace

std::string Folder::GetFullPath() const {
  return path;
}

Json::Value Folder::asJson() const {
  Json::Value value(Json::objectValue);
  value["share"] = share;
  value["path"] = path;
  value["document"] = document;
  value["audio"] = audio;
  value["video"] = video;
  value["photo"] = photo;
  return value;
}

bool Folders::Load() {
  loaded = ReadFolders(all);
  return loaded;
}

bool Folders::List(std::vector<Folder>& folders, const std::string& share_name) {
  if (!loaded) {
    return false;
  }

  std::vector<Folder> of_share;
  std::copy_if(all.begin(), all.end(), std::back_inserter(of_share),
               [&share_name](const Folder& folder) { return folder.share == share_name; });
  folders.swap(of_share);
  return true;
}

bool IndexMgr::List(std::vector<Folder>& folders) {
  return ReadFolders(folders);
}

bool IndexMgr::IsFullPathIndexed(const std::string& path, const std::vector<Folder>& folders) {
  const std::optional<std::string> normal = NormalPath(path);
  return normal.has_value() &&
         std::any_of(folders.begin(), folders.end(),
                     [&normal](const Folder& folder) { return Covers(folder.path, *normal); });
}

Json::Value GetMostSuitableCfg(std::vector<Folder> folders, const std::string& path) {
  const std::optional<std::string> normal = NormalPath(path);
  const Folder* deepest = nullptr;
  for (const Folder& folder : folders) {
    if (normal.has_value() && Covers(folder.path, *normal) &&
        (deepest == nullptr || folder.path.size() > deepest->path.size())) {
      deepest = &folder;
    }
  }
  return deepest == nullptr ? Json::Value(Json::nullValue) : Json::Value(BitsOf(*deepest));
}

}  // namespace fileindexd::TALO::FILEINDEX
