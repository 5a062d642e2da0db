// SPDX-License-Identifier: GPL-2.0-or-later
// status.
#include <cstdint>
#include <ctime>
#include <optional>
#include <vector>

#include "ctl/client.h"
#include "ctl/commands.h"
#include "ctl/output.h"
#include "ctl/places.h"
#include "index/reader.h"
#include "state/belonging.h"
#include "state/layout.h"
#include "state/pid_file.h"
#include "state/queue_writer.h"

namespace fileindexd {

namespace {

struct ShareReport {
  const Share* share = nullptr;
  uint64_t waiting = 0;
  EntryReader::Summary index;
  std::string index_problem;  // empty: none; that there is no index yet is none
  bool needs_reindex = false;
  bool no_space = false;
  RootState root = RootState::UNKNOWN;
  std::vector<std::string> gone_folders;
};

const char* RootText(RootState root) {
  switch (root) {
    case RootState::SOUND:
      return "sound";
    case RootState::MISSING:
      return "missing";
    case RootState::FOREIGN:
      return "foreign";
    case RootState::UNKNOWN:
      break;
  }
  return "unknown";
}

void ReadIndex(ShareReport& report) {
  EntryReader reader;
  const IndexError opened = reader.Open(report.share->name);
  if (opened == IndexError::PATH_NOT_FOUND) {
    return;
  }
  if (opened != IndexError::NONE) {
    report.index_problem = IndexErrorText(opened);
    return;
  }

  if (!reader.Summarise(report.index)) {
    report.index_problem = "cannot be read";
  }
}

// False, with its line written, when the store cannot be read.
bool ReportShare(Session& session, const Share& share, ShareReport& report) {
  ShareStatus status;
  if (!session.store->GetStatus(share.name, status)) {
    (void)Fail(EXIT_FAILED, "%s", session.store->Error().c_str());
    return false;
  }

  report.share = &share;
  report.waiting = WaitingLines(share.name);
  report.needs_reindex = status.needs_reindex || status.reindex_begun;
  report.no_space = status.no_space;
  report.root = LookAtRoot(share);
  ReadIndex(report);
  for (const IndexedFolder& folder : session.settings->folders) {
    if (folder.share == share.name && IsDirectoryGone(folder.path)) {
      report.gone_folders.push_back(folder.path);
    }
  }
  return true;
}

Json::Value ReportObject(const ShareReport& report) {
  Json::Value object(Json::objectValue);
  object["name"] = ToUtf8(report.share->name);
  SetPath(object, report.share->path);
  object["root"] = RootText(report.root);
  object["waiting"] = static_cast<Json::UInt64>(report.waiting);
  object["entries"] = static_cast<Json::UInt64>(report.index.entries);
  object["last_commit"] = Json::nullValue;
  if (report.index.last_commit != 0) {
    object["last_commit"] = static_cast<Json::Int64>(report.index.last_commit);
  }
  object["needs_reindex"] = report.needs_reindex;
  object["no_space"] = report.no_space;
  object["contents_waiting"] = static_cast<Json::UInt64>(report.index.wanted);
  object["contents_failed"] = 0;
  object["watched_by"] = "none";
  if (!report.index_problem.empty()) {
    object["index_problem"] = report.index_problem;
  }

  object["gone_folders"] = Json::arrayValue;
  for (const std::string& path : report.gone_folders) {
    Json::Value folder(Json::objectValue);
    SetPath(folder, path);
    object["gone_folders"].append(folder);
  }
  return object;
}

void PutReport(const ShareReport& report) {
  const Share& share = *report.share;
  const int64_t last_commit = report.index.last_commit;
  (void)PutLine("share " + share.name);
  (void)PutLine("  path           " + share.path);
  if (report.root == RootState::MISSING) {
    (void)PutLine("  problem        its path is missing; the index is left as it is");
  } else if (report.root == RootState::FOREIGN) {
    (void)PutLine(
        "  problem        its path lies on another file system than before; the index "
        "is left as it is");
  } else if (report.root == RootState::UNKNOWN) {
    (void)PutLine("  problem        its path cannot be looked at");
  }
  if (!report.index_problem.empty()) {
    (void)PutLine("  problem        index: " + report.index_problem);
  }
  for (const std::string& path : report.gone_folders) {
    (void)PutLine("  folder gone    " + path);
  }
  (void)PutLine("  waiting lines  " + std::to_string(report.waiting));
  (void)PutLine("  entries        " + std::to_string(report.index.entries));
  (void)PutLine("  last commit    " + (last_commit == 0 ? "none" : LocalTime(last_commit)));
  (void)PutLine(std::string("  needs reindex  ") + (report.needs_reindex ? "yes" : "no"));
  (void)PutLine(std::string("  no space       ") + (report.no_space ? "yes" : "no"));
}

// None: not paused. 0: without end.
std::optional<int64_t> PausedUntil(int64_t resume_time) {
  if (resume_time != 0 && resume_time <= std::time(nullptr)) {
    return std::nullopt;
  }
  return resume_time;
}

void PutDaemon(pid_t pid, const std::optional<int64_t>& paused_until) {
  (void)PutLine(pid > 0 ? "daemon runs, pid " + std::to_string(pid) : "daemon does not run");
  if (!paused_until) {
    (void)PutLine("not paused");
  } else {
    (void)PutLine(*paused_until == 0 ? "paused without end"
                                     : "paused until " + LocalTime(*paused_until));
  }
}

}  // namespace

int Status(const Arguments& arguments) {
  Session session;
  if (!session.Open()) {
    return EXIT_FAILED;
  }
  int64_t resume_time = -1;
  if (!session.store->GetPause(resume_time)) {
    return Fail(EXIT_FAILED, "%s", session.store->Error().c_str());
  }

  const pid_t pid = AliveByPidFile(DAEMON_PID_FILE, DAEMON_PROGRAM);
  const std::optional<int64_t> paused_until = PausedUntil(resume_time);
  Json::Value document(Json::objectValue);
  document["daemon"] = pid > 0;
  document["pid"] = pid > 0 ? Json::Value(static_cast<Json::Int64>(pid)) : Json::Value();
  document["paused_until"] =
      paused_until ? Json::Value(static_cast<Json::Int64>(*paused_until)) : Json::Value();
  document["shares"] = Json::arrayValue;
  if (!arguments.json) {
    PutDaemon(pid, paused_until);
  }

  for (const Share& share : session.settings->shares) {
    ShareReport report;
    if (!ReportShare(session, share, report)) {
      return EXIT_FAILED;
    }
    if (arguments.json) {
      document["shares"].append(ReportObject(report));
    } else {
      PutReport(report);
    }
  }
  if (arguments.json) {
    (void)PutJson(document);
  }
  return EXIT_DONE;
}

}  // namespace fileindexd
