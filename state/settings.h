// SPDX-License-Identifier: GPL-2.0-or-later
// Shares and indexed folders as one immutable picture, taken from the store at one moment.
#pragma once

#include <string>
#include <string_view>
#include <vector>

#include "state/excludes.h"

namespace fileindexd {

// Kinds of content that are wanted.
struct ContentFlags {
  bool document = false;
  bool audio = false;
  bool video = false;
  bool photo = false;

  bool Any() const { return document || audio || video || photo; }
  bool operator==(const ContentFlags&) const = default;
};

struct Share {
  std::string name;
  std::string path;                  // normal
  std::string filesystem;            // identity on record, see filesystem.h
  std::string language = "english";  // whose word forms are found together; "none": of none
};

struct IndexedFolder {
  std::string share;  // name
  std::string path;   // normal; the share's path or below it
  ContentFlags wanted;
  Excludes excludes = {};  // relative to the folder; those of a folder inside it do not add to them
};

struct Settings {
  std::vector<Share> shares;           // by name, byte order
  std::vector<IndexedFolder> folders;  // by path, byte order
  std::string state_root;              // normal; what lies below it belongs nowhere

  // All paths here are normal. Null when there is none; the results live as long as this object.
  const Share* ShareByName(std::string_view name) const;
  const Share* ShareOfPath(std::string_view path) const;
  // The deepest folder that covers the path.
  const IndexedFolder* FolderOfPath(std::string_view path) const;
  // The folder at exactly that path.
  const IndexedFolder* FolderAt(std::string_view path) const;
  // Whether an indexed folder lies below the path; one at it does not count.
  bool HasFolderBelow(std::string_view path) const;
};

}  // namespace fileindexd
