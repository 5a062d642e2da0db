// SPDX-License-Identifier: GPL-2.0-or-later
// inotify watches on the state folder and on the shares' indexes.
//
//   ROOT                      state.db changed, "shares" appeared
//   ROOT/shares               a share's folder came or went
//   ROOT/shares/NAME          its "index" came or went
//   ROOT/shares/NAME/index    a commit
//
// One thread. Events are hints: whoever gets one looks at what is there.
#pragma once

#include <map>
#include <set>
#include <string>

#include "base/scoped_fd.h"
#include "state/settings.h"

namespace fileindexd {

// What events have told since the last look.
struct Hints {
  bool everything = false;       // shares or folders may have come or gone
  std::set<std::string> shares;  // a commit, by the share's name
};

class Watches {
 public:
  // False with errno when the host gives no inotify descriptor.
  bool Open();

  // Watches what there is to watch for these shares, and no longer what there is not. Folders that
  // are missing have their parents watched; a watch that the host refuses is left out, with one log
  // line until it succeeds again: the caller looks from time to time in any case.
  void Set(const Settings& settings);

  // Reads the events that are waiting, a bounded number of them, and adds what they tell.
  void Read(Hints& hints);

  ScopedFd inotify;

 private:
  struct Target {
    enum { ROOT, SHARES, SHARE, INDEX } place;
    std::string share;  // name; of SHARE and INDEX
  };

  void Add(const std::string& path, const Target& target, std::map<int, Target>& kept);
  void Judge(int watch, unsigned mask, const std::string& name, Hints& hints) const;

  std::map<int, Target> targets;  // by watch descriptor
  bool refused = false;           // the host refused a watch at the last Set
  bool told = false;              // and that is logged
};

}  // namespace fileindexd
