// SPDX-License-Identifier: GPL-2.0-or-later
#include <syslog.h>

#include "base/standard_streams.h"
#include "daemon/daemon.h"

int main() {
  fileindexd::FillStandardStreams();
  openlog("fileindexd", 0, LOG_DAEMON);

  // The exit status is 0 whichever way the run ended.
  fileindexd::Daemon daemon;
  (void)daemon.Run();
  return 0;
}
