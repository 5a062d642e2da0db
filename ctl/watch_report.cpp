// SPDX-License-Identifier: GPL-2.0-or-later
#include "ctl/watch_report.h"

#include <json/reader.h>

#include <exception>
#include <memory>

#include "base/utf8.h"
#include "ctl/output.h"
#include "state/notifier.h"

namespace fileindexd {

namespace {

constexpr std::chrono::seconds PATIENCE(2);
constexpr std::chrono::seconds BETWEEN_ASKS(1);
constexpr std::chrono::seconds BETWEEN_ASKS_OF_A_SILENT_ONE(10);

// The readers throw where the service says something else than it should.
WatchReport ReadShare(const Json::Value& share) {
  WatchReport report;
  report.is_known = true;
  if (!share["watched_by"].isNull()) {
    report.watched_by = share["watched_by"].asString();
  }
  report.problem = share["problem"].asString();
  if (!share["complete_until"].isNull()) {
    report.complete_until = share["complete_until"].asInt64();
  }
  report.backlog = share["backlog"].asUInt64();
  report.changes = share["changes"].asUInt64();
  report.lines = share["lines"].asUInt64();
  report.folded = share["folded"].asUInt64();
  report.overflows = share["overflows"].asUInt64();
  if (const Json::Value& compared = share["compared"]; !compared.isNull()) {
    ComparedReport& last = report.compared.emplace();
    last.ended = compared["ended"].asInt64();
    last.differences = compared["differences"].asUInt64();
    if (!compared["error"].isNull()) {
      last.error = compared["error"].asString();
    }
  }
  report.comparing = share["comparing"].asBool();
  return report;
}

// False when the text is not what state/notifier.h promises.
bool ReadReply(const std::string& text, std::map<std::string, WatchReport>& shares) {
  try {
    const Json::CharReaderBuilder builder;
    const std::unique_ptr<Json::CharReader> reader(builder.newCharReader());
    Json::Value reply;
    if (!reader->parse(text.data(), text.data() + text.size(), &reply, nullptr) ||
        !reply["ok"].asBool()) {
      return false;
    }

    for (const Json::Value& share : std::as_const(reply)["shares"]) {
      shares[share["name"].asString()] = ReadShare(share);
    }
    return true;
  } catch (const std::exception&) {
    return false;
  }
}

template <typename Number>
Json::Value NumberOrNull(bool is_known, Number number) {
  return is_known ? Json::Value(static_cast<Json::Int64>(number)) : Json::Value();
}

std::string ComparedText(const ComparedReport& last) {
  const std::string text = LocalTime(last.ended);
  return last.error ? text + ", not to its end: " + OneLine(*last.error)
                    : text + ", differences: " + std::to_string(last.differences);
}

}  // namespace

void Watches::Ask() {
  shares.clear();
  problem.clear();
  std::string reply;
  const NotifierReply result = AskNotifier(R"({"type":"status"})", PATIENCE, reply);
  asked = Clock::now();
  is_silent = result == NotifierReply::NO_ANSWER;
  if (result == NotifierReply::NOT_RUNNING) {
    problem = std::string(NOTIFIER_PROGRAM) + " does not run";
  } else if (is_silent) {
    problem = std::string(NOTIFIER_PROGRAM) + " does not answer";
  } else if (!ReadReply(reply, shares)) {
    problem = std::string("the answer of ") + NOTIFIER_PROGRAM + " makes no sense";
    shares.clear();
  }
}

Watches::Clock::time_point Watches::NextAsk() const {
  return asked + (is_silent ? BETWEEN_ASKS_OF_A_SILENT_ONE : BETWEEN_ASKS);
}

WatchReport Watches::Of(const std::string& share) const {
  const auto found = shares.find(share);
  if (found != shares.end()) {
    return found->second;
  }

  WatchReport nothing;
  nothing.problem =
      problem.empty() ? std::string(NOTIFIER_PROGRAM) + " does not know it yet" : problem;
  return nothing;
}

void AddWatch(Json::Value& object, const WatchReport& watch) {
  object["watched_by"] = watch.watched_by ? Json::Value(*watch.watched_by) : Json::Value();
  object["watch_problem"] =
      watch.problem.empty() ? Json::Value() : Json::Value(ToUtf8(watch.problem));
  object["complete_until"] =
      NumberOrNull(watch.complete_until.has_value(), watch.complete_until.value_or(0));
  object["backlog"] = NumberOrNull(watch.is_known, watch.backlog);
  object["changes"] = NumberOrNull(watch.is_known, watch.changes);
  object["lines"] = NumberOrNull(watch.is_known, watch.lines);
  object["folded"] = NumberOrNull(watch.is_known, watch.folded);
  object["overflows"] = NumberOrNull(watch.is_known, watch.overflows);
  object["compared"] = Json::nullValue;
  if (watch.compared) {
    Json::Value& compared = object["compared"];
    compared["ended"] = static_cast<Json::Int64>(watch.compared->ended);
    compared["differences"] = static_cast<Json::UInt64>(watch.compared->differences);
    compared["error"] =
        watch.compared->error ? Json::Value(ToUtf8(*watch.compared->error)) : Json::Value();
  }
  object["comparing"] = watch.is_known ? Json::Value(watch.comparing) : Json::Value();
}

std::vector<std::pair<std::string, std::string>> WatchLines(const WatchReport& watch) {
  std::string by = watch.watched_by.value_or("nobody");
  if (by == "comparison") {
    by += " at an interval";
  }
  if (!watch.problem.empty()) {
    by += ": " + OneLine(watch.problem);
  }

  std::vector<std::pair<std::string, std::string>> lines = {{"watched by", by}};
  if (!watch.is_known) {
    return lines;
  }
  lines.emplace_back("complete until",
                     watch.complete_until ? LocalTime(*watch.complete_until) : "not known");
  lines.emplace_back("changes", std::to_string(watch.changes) + " read, " +
                                    std::to_string(watch.lines) + " lines written, " +
                                    std::to_string(watch.folded) + " folded, " +
                                    std::to_string(watch.backlog) + " not written yet");
  if (watch.overflows > 0) {
    lines.emplace_back("overflows", std::to_string(watch.overflows));
  }
  if (watch.compared || watch.comparing) {
    std::string compared = watch.compared ? ComparedText(*watch.compared) : "";
    compared += watch.comparing ? (compared.empty() ? "now" : "; again now") : "";
    lines.emplace_back("compared", compared);
  }
  return lines;
}

}  // namespace fileindexd
