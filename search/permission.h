// SPDX-License-Identifier: GPL-2.0-or-later
// Whether the service may work: a daemon runs, and nobody has paused indexing.
//
// One thread. The end of the daemon and the end of a pause wake whoever polls; the beginning of
// either is told by the watches, and looked at then.
#pragma once

#include <poll.h>
#include <sys/types.h>

#include <cstdint>
#include <string>
#include <vector>

#include "base/scoped_fd.h"
#include "state/store.h"

namespace fileindexd {

class Permission {
 public:
  // Looks at the pid file and at the store. What cannot be read stays as it was: false, `error`
  // says why, and nobody tells when to look again.
  bool Look(StateStore& store, std::string& error);
  bool MayWork() const { return daemon_end.fd >= 0 && !paused; }

  void AddPolled(std::vector<pollfd>& polled) const;
  // True when one of the descriptors is ready: it is time to look again.
  bool IsTold(const std::vector<pollfd>& polled) const;

 private:
  bool LookAtDaemon(std::string& error);
  bool AwaitResume(int64_t resume_time, std::string& error);

  pid_t daemon = 0;
  ScopedFd daemon_end;  // of process `daemon`; none: it does not run
  bool paused = true;
  ScopedFd resume;  // the clock at which the pause ends, or that it was set; none: no such pause
};

}  // namespace fileindexd
