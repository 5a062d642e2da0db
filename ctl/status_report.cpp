// SPDX-License-Identifier: GPL-2.0-or-later
// How a status is shown. What it is made of is in status.cpp.
#include "ctl/status_report.h"

#include <algorithm>
#include <cmath>

#include "base/utf8.h"
#include "ctl/output.h"
#include "ctl/root_problem.h"

namespace fileindexd {

namespace {

constexpr int64_t SHORTEST_RATE_MS = 500;  // of less work nothing can be told

const char* RootText(const ShareReport& report) {
  switch (report.root) {
    case RootState::SOUND:
      return report.root_emptied ? "empty" : "sound";
    case RootState::MISSING:
      return "missing";
    case RootState::FOREIGN:
      return "foreign";
    case RootState::UNKNOWN:
      break;
  }
  return "unknown";
}

// A second, since the work began.
std::optional<double> Rate(const ProgressRecord& work) {
  const int64_t elapsed = work.updated - work.began;
  if (elapsed < SHORTEST_RATE_MS || work.done == 0) {
    return std::nullopt;
  }
  return static_cast<double>(work.done) * 1000.0 / static_cast<double>(elapsed);
}

std::optional<int64_t> SecondsLeft(const ProgressRecord& work) {
  const std::optional<double> rate = Rate(work);
  if (!rate || !work.total || *work.total < work.done) {
    return std::nullopt;
  }
  return static_cast<int64_t>(std::ceil(static_cast<double>(*work.total - work.done) / *rate));
}

// None for a number that nobody knows.
template <typename Number>
Json::Value NumberOrNull(const std::optional<Number>& number) {
  return number ? Json::Value(static_cast<Json::Int64>(*number)) : Json::Value();
}

Json::Value WorkObject(const std::optional<ProgressRecord>& work) {
  if (!work) {
    return {};
  }
  Json::Value object(Json::objectValue);
  object["what"] = WorkText(work->what);
  object["done"] = static_cast<Json::UInt64>(work->done);
  object["total"] = NumberOrNull(work->total);
  const std::optional<double> rate = Rate(*work);
  object["rate"] =
      rate ? Json::Value(static_cast<Json::Int64>(std::llround(*rate))) : Json::Value();
  object["seconds_left"] = NumberOrNull(SecondsLeft(*work));
  return object;
}

Json::Value ShareObject(const ShareReport& report) {
  Json::Value object(Json::objectValue);
  object["name"] = ToUtf8(report.share.name);
  SetPath(object, report.share.path);
  object["root"] = RootText(report);
  object["waiting"] = static_cast<Json::UInt64>(report.waiting);
  object["entries"] = static_cast<Json::UInt64>(report.index.entries);
  object["last_commit"] = Json::nullValue;
  if (report.index.last_commit != 0) {
    object["last_commit"] = static_cast<Json::Int64>(report.index.last_commit);
  }
  object["needs_reindex"] = report.needs_reindex;
  object["no_space"] = report.no_space;
  AddContents(object, report.contents);
  AddWatch(object, report.watch);
  object["progress"] = WorkObject(report.work ? report.work : report.comparison);
  if (!report.index_problem.empty()) {
    object["index_problem"] = ToUtf8(report.index_problem);
  }

  object["unwatched"] = report.unwatched;
  object["gone_folders"] = Json::arrayValue;
  for (const std::string& path : report.gone_folders) {
    Json::Value folder(Json::objectValue);
    SetPath(folder, path);
    object["gone_folders"].append(folder);
  }
  return object;
}

std::string DurationText(int64_t seconds) {
  constexpr int64_t MINUTE = 60;
  constexpr int64_t HOUR = 60 * MINUTE;
  if (seconds < 2 * MINUTE) {
    return std::to_string(seconds) + " s";
  }
  if (seconds < 2 * HOUR) {
    return std::to_string(seconds / MINUTE) + " min";
  }
  return std::to_string(seconds / HOUR) + " h " + std::to_string(seconds % HOUR / MINUTE) + " min";
}

std::string WorkLine(const ProgressRecord& work) {
  std::string text = std::string(WorkText(work.what)) + ", " + std::to_string(work.done);
  if (work.what == Work::UPDATE) {
    text += " changes";
  } else {
    // What is done is known, what is left is an estimate, and may have been too low.
    text += work.total ? " of about " + std::to_string(std::max(*work.total, work.done)) : "";
    text += " entries";
  }
  if (const std::optional<double> rate = Rate(work)) {
    text += ", " + std::to_string(std::llround(*rate)) + " a second";
  }
  if (const std::optional<int64_t> left = SecondsLeft(work)) {
    text += ", about " + DurationText(*left) + " left";
  }
  return text;
}

void AddLine(std::string& text, const std::string& label, const std::string& value) {
  constexpr size_t WIDTH = 15;
  text += "  " + label + std::string(WIDTH - label.size(), ' ') + ShownText(value) + "\n";
}

void AddShare(std::string& text, const ShareReport& report) {
  const int64_t last_commit = report.index.last_commit;
  text += "share " + ShownText(report.share.name) + "\n";
  AddLine(text, "path", report.share.path);
  if (const std::string problem =
          RootProblem("its path", report.share, report.root, report.root_emptied);
      !problem.empty()) {
    AddLine(text, "problem", problem);
  }
  if (!report.index_problem.empty()) {
    AddLine(text, "problem", "index: " + report.index_problem);
  }
  if (report.unwatched) {
    const std::string& name = report.share.name;
    AddLine(text, "problem",
            "the daemon does not watch its queue; to mend it: fileindexctl worker drop " + name +
                ", then fileindexctl worker revive " + name);
  }
  for (const std::string& path : report.gone_folders) {
    AddLine(text, "folder gone", path);
  }
  AddLine(text, "waiting lines", std::to_string(report.waiting));
  AddLine(text, "entries", std::to_string(report.index.entries));
  if (report.index.wanted > 0 || !report.contents.problem.empty()) {
    AddLine(text, "contents", ContentsText(report.contents));
  }
  if (report.contents.words) {
    AddLine(text, "words", WordsText(*report.contents.words));
  }
  AddLine(text, "last commit", last_commit == 0 ? "none" : LocalTime(last_commit));
  AddLine(text, "needs reindex", report.needs_reindex ? "yes" : "no");
  AddLine(text, "no space", report.no_space ? "yes" : "no");
  for (const auto& [label, value] : WatchLines(report.watch)) {
    AddLine(text, label, value);
  }
  for (const auto& work : {report.work, report.comparison}) {
    if (work) {
      AddLine(text, "in progress", WorkLine(*work));
    }
  }
}

}  // namespace

Json::Value ReportObject(const StatusReport& report) {
  Json::Value object(Json::objectValue);
  object["daemon"] = report.daemon > 0;
  object["pid"] =
      report.daemon > 0 ? Json::Value(static_cast<Json::Int64>(report.daemon)) : Json::Value();
  object["paused_until"] = NumberOrNull(report.paused_until);
  object["contents_left_out"] = report.left_out;
  object["shares"] = Json::arrayValue;
  for (const ShareReport& share : report.shares) {
    object["shares"].append(ShareObject(share));
  }
  return object;
}

std::string ReportText(const StatusReport& report) {
  std::string text = report.daemon > 0 ? "daemon runs, pid " + std::to_string(report.daemon)
                                       : "daemon does not run";
  if (!report.paused_until) {
    text += "\nnot paused\n";
  } else if (*report.paused_until == 0) {
    text += "\npaused without end\n";
  } else {
    text += "\npaused until " + LocalTime(*report.paused_until) + "\n";
  }
  if (!report.left_out.empty()) {
    text += "not read on this host: " + ShownText(report.left_out) + "\n";
  }
  for (const ShareReport& share : report.shares) {
    AddShare(text, share);
  }
  return text;
}

}  // namespace fileindexd
