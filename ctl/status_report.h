// SPDX-License-Identifier: GPL-2.0-or-later
// All that status tells, as it was at one moment, and how it is shown.
#pragma once

#include <json/value.h>
#include <sys/types.h>

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

#include "ctl/contents_report.h"
#include "ctl/places.h"
#include "ctl/watch_report.h"
#include "index/reader.h"
#include "state/belonging.h"
#include "state/progress.h"

namespace fileindexd {

struct ShareReport {
  Share share;
  bool has_folders = false;
  uint64_t waiting = 0;
  EntryReader::Summary index;
  std::string index_problem;  // empty: none; that there is no index yet is none
  bool needs_reindex = false;
  bool no_space = false;
  RootState root = RootState::UNKNOWN;
  bool unwatched = false;     // the daemon is not told of lines in the queue
  bool root_emptied = false;  // sound, and nothing in it where the index holds something
  std::vector<std::string> gone_folders;
  std::optional<ProgressRecord> work;        // of the Worker
  std::optional<ProgressRecord> comparison;  // of whoever compares
  WatchReport watch;
  ContentsReport contents;
};

struct StatusReport {
  pid_t daemon = 0;                     // 0: it does not run
  std::optional<int64_t> paused_until;  // none: not paused; 0: without end
  std::string left_out;                 // what is not read on this host; empty: nothing
  std::vector<ShareReport> shares;
};

// Looks at everything, under the settings in force, which are the session's then; `watches` is what
// the notification service told. False, with its line written, when the store cannot be read.
bool MakeReport(Session& session, const Watches& watches, StatusReport& report);

Json::Value ReportObject(const StatusReport& report);
// Lines for people.
std::string ReportText(const StatusReport& report);

}  // namespace fileindexd
