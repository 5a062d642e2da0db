// SPDX-License-Identifier: GPL-2.0-or-later
// The state that a command works on, and the paths that are named on its command line.
#pragma once

#include <memory>
#include <string>

#include "state/settings.h"
#include "state/store.h"

namespace fileindexd {

// The store and the settings as they were when the command began.
struct Session {
  // False, with its line written, on failure.
  bool Open();
  // For what only asks: where there is no state, none is made. The settings are those without a
  // share then, and there is no store.
  bool OpenToAsk();
  // The share of that name; null, with its line written, when there is none.
  const Share* FindShare(const std::string& name) const;

  std::unique_ptr<StateStore> store;  // null: there is no state
  std::shared_ptr<const Settings> settings;
};

// All of these write a line when they return false.

// The path made absolute, the folder that holds it resolved, its last component left as it is; a
// path that names a directory by its end ("/", ".", "..") is resolved altogether. Of a folder that
// is gone, what exists of the way to it is resolved, and the rest taken by its letters.
bool ResolvePath(const std::string& given, std::string& path);

// The same; where that lies in no share and `given` leads into one through a link, the place that
// it leads to.
bool ResolveInShare(const Settings& settings, const std::string& given, std::string& path);

// An existing directory's own resolved path.
bool ResolveDirectory(const std::string& given, std::string& path);

// True when nothing is at `path`, or something that is no directory. What cannot be told is not.
bool IsDirectoryGone(const std::string& path);

}  // namespace fileindexd
