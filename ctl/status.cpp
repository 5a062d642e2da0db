// SPDX-License-Identifier: GPL-2.0-or-later
// status.
#include <ctime>
#include <utility>

#include "ctl/client.h"
#include "ctl/commands.h"
#include "ctl/follow.h"
#include "ctl/output.h"
#include "ctl/pending.h"
#include "ctl/root_problem.h"
#include "ctl/status_report.h"
#include "ctl/watches.h"
#include "index/suspicion.h"
#include "state/layout.h"
#include "state/left_out.h"
#include "state/pause.h"
#include "state/pid_file.h"
#include "state/queue_writer.h"

namespace fileindexd {

namespace {

// An index that is not there is a problem where nothing is on the way that makes it.
void ReadIndex(Session& session, ShareReport& report) {
  EntryReader reader;
  const IndexError opened = OpenAndTell(reader.database, report.share.name);
  if (opened == IndexError::PATH_NOT_FOUND) {
    // It may just have been made.
    if (IsIndexExpected(*session.store, *session.settings, report.share.name) &&
        reader.Open(report.share.name) == IndexError::PATH_NOT_FOUND) {
      report.index_problem =
          "missing; to make it anew: fileindexctl reindex " + OneLine(report.share.path);
    }
    return;
  }
  if (opened != IndexError::NONE) {
    report.index_problem = IndexErrorText(opened);
    return;
  }

  if (!reader.Summarise(report.index)) {
    TellWriter(report.share.name, reader.read_error);
    report.index_problem = "cannot be read";
  }
}

std::optional<ProgressRecord> WorkAt(const std::string& path) {
  ProgressRecord record;
  return ReadProgress(path, record) ? std::optional(record) : std::nullopt;
}

void LookAtFolders(const Settings& settings, ShareReport& report) {
  for (const IndexedFolder& folder : settings.folders) {
    if (folder.share != report.share.name) {
      continue;
    }
    report.has_folders = true;
    if (IsDirectoryGone(folder.path)) {
      report.gone_folders.push_back(folder.path);
    }
  }
}

// False when the share's status cannot be read.
bool ReportShare(Session& session, const Share& share, pid_t daemon, ShareReport& report) {
  ShareStatus status;
  if (!session.store->GetStatus(share.name, status)) {
    return false;
  }

  report.share = share;
  report.waiting = WaitingLines(share.name);
  report.needs_reindex = status.needs_reindex || status.reindex_begun;
  report.no_space = status.no_space;
  report.root = LookAtRoot(share);
  report.work = WorkAt(WorkerProgressPath(share.name));
  report.comparison = WorkAt(ComparisonProgressPath(share.name));
  LookAtFolders(*session.settings, report);
  ReadIndex(session, report);
  report.contents = ReportContents(share, report.index.wanted);
  report.unwatched =
      report.has_folders && daemon > 0 && IsUnwatched(daemon, ShareFolder(share.name));
  report.root_emptied =
      IsRootEmptied(*session.settings, share, status, report.root, report.index.entries);
  return true;
}

// None: not paused. 0: without end.
std::optional<int64_t> PausedUntil(int64_t resume_time) {
  return IsPaused(resume_time, std::time(nullptr)) ? std::optional(resume_time) : std::nullopt;
}

// Whether the share went away while it was being looked at.
bool IsRemoved(Session& session, const std::string& name) {
  return session.store->GetSettings(session.settings) &&
         session.settings->ShareByName(name) == nullptr;
}

}  // namespace

bool MakeReport(Session& session, const Watches& watches, StatusReport& report) {
  int64_t resume_time = -1;
  std::shared_ptr<const Settings> settings = session.settings;
  if (session.store != nullptr &&
      (!session.store->GetSettings(settings) || !session.store->GetPause(resume_time))) {
    (void)Fail(EXIT_FAILED, "%s", session.store->Error().c_str());
    return false;
  }

  session.settings = settings;
  report = {};
  report.daemon = AliveByPidFile(DAEMON_PID_FILE, DAEMON_PROGRAM);
  report.paused_until = PausedUntil(resume_time);
  report.left_out = ReadLeftOut();
  for (const Share& share : settings->shares) {
    ShareReport found;
    if (ReportShare(session, share, report.daemon, found)) {
      found.watch = watches.Of(share.name);
      report.shares.push_back(std::move(found));
      continue;
    }
    const std::string error = session.store->Error();
    if (!IsRemoved(session, share.name)) {
      (void)Fail(EXIT_FAILED, "%s", error.c_str());
      return false;
    }
  }
  return true;
}

int Status(const Arguments& arguments) {
  Session session;
  if (!(arguments.follow ? session.Open() : session.OpenToAsk())) {
    return EXIT_FAILED;
  }
  if (arguments.follow) {
    return FollowStatus(session, arguments.json);
  }

  Watches watches;
  watches.Ask();
  StatusReport report;
  if (!MakeReport(session, watches, report)) {
    return EXIT_FAILED;
  }
  if (arguments.json) {
    (void)PutJson(ReportObject(report));
  } else {
    (void)Put(ReportText(report));
  }
  return EXIT_DONE;
}

}  // namespace fileindexd
