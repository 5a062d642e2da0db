// SPDX-License-Identifier: GPL-2.0-or-later
// inotify watches on the state folder, on the shares' indexes, and on the daemon's pid file.
//
//   ROOT                      state.db changed, "shares" appeared
//   ROOT/shares               a share's folder came or went
//   ROOT/shares/NAME          its "index" came or went, its "contents" went
//   ROOT/shares/NAME/index    a commit; the database came or went
//   ROOT/shares/NAME/contents somebody has met damage in the database
//   /var/run                  the daemon began
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
  bool everything = false;       // shares, folders, flags, the pause or the daemon may be others
  std::set<std::string> shares;  // a commit that has begun at least, by the share's name
  std::set<std::string> closed;  // somebody has closed the entries, as the daemon does after each
  std::set<std::string> remade;  // a database came or went, or is suspected, by the share's name

  bool Any() const { return everything || !shares.empty() || !closed.empty() || !remade.empty(); }
};

class Watches {
 public:
  // False with errno when the host gives no inotify descriptor.
  bool Open();

  // Watches what there is to watch for these shares, and no longer what there is not. Folders that
  // are missing have their parents watched; a watch that the host refuses is left out, with one log
  // line until it succeeds again: the caller looks from time to time while HasGaps.
  void Set(const Settings& settings);

  // Reads the events that are waiting, a bounded number of them, and adds what they tell.
  void Read(Hints& hints);

  bool HasGaps() const { return refused; }

  ScopedFd inotify;

 private:
  struct Target {
    enum { ROOT, SHARES, SHARE, INDEX, CONTENTS, RUN } place;
    std::string share;  // name; of SHARE, INDEX and CONTENTS
  };

  void Add(const std::string& path, const Target& target, std::map<int, Target>& kept);
  void Judge(int watch, unsigned mask, const std::string& name, Hints& hints) const;

  std::map<int, Target> targets;  // by watch descriptor
  bool refused = false;           // the host refused a watch at the last Set
  bool told = false;              // and that is logged
};

}  // namespace fileindexd
