// SPDX-License-Identifier: GPL-2.0-or-later
// Indexed folders and their settings.
//
// A folder's setting says for its whole subtree which kinds of content are wanted. Folder lists are
// values: the daemon passes them through unchanged.
#pragma once

#include <string>
#include <vector>

#include "platform/json.h"

namespace fileindexd::TALO::FILEINDEX {

// One indexed folder.
class Folder {
 public:
  // The folder's absolute path.
  std::string GetFullPath() const;
  // The setting, for the log.
  Json::Value asJson() const;

  std::string share;  // name of the share that holds the folder
  std::string path;   // the path as it is stored
  bool document = false;
  bool audio = false;
  bool video = false;
  bool photo = false;
};

// The store of folder settings. Made on the stack: Load, then List.
class Folders {
 public:
  Folders() = default;
  Folders(const Folders&) = delete;
  Folders& operator=(const Folders&) = delete;
  virtual ~Folders() = default;

  // Reads all settings. False when the store cannot be read.
  bool Load();
  // Stores the settings of one share, in the store's order; an unknown share has none. False when
  // nothing was loaded, the list unchanged.
  bool List(std::vector<Folder>& folders, const std::string& share_name);

  bool loaded = false;
  std::vector<Folder> all;
};

namespace IndexMgr {

// Stores every indexed folder of every share. False when the store cannot be read.
bool List(std::vector<Folder>& folders);

// True when one of `folders` covers `path`. Purely lexical.
bool IsFullPathIndexed(const std::string& path, const std::vector<Folder>& folders);

}  // namespace IndexMgr

// The configuration of the deepest of `folders` that covers `path`, for the indexer: what is in it
// is between the two. Null when none covers it.
Json::Value GetMostSuitableCfg(std::vector<Folder> folders, const std::string& path);

}  // namespace fileindexd::TALO::FILEINDEX
