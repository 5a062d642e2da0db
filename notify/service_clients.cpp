// SPDX-License-Identifier: GPL-2.0-or-later
// What the service tells those who ask.
#include <json/json.h>
#include <poll.h>

#include <algorithm>

#include "base/utf8.h"
#include "notify/readiness.h"
#include "notify/service.h"

namespace fileindexd {

namespace {

std::string OneLine(const Json::Value& value) {
  Json::StreamWriterBuilder builder;
  builder["indentation"] = "";
  builder["emitUTF8"] = true;
  return Json::writeString(builder, value);
}

Json::Value ComparedObject(const Healing& last) {
  if (last.ended == 0) {
    return {};
  }
  Json::Value compared(Json::objectValue);
  compared["ended"] = static_cast<Json::Int64>(last.ended);
  compared["differences"] = static_cast<Json::UInt64>(last.counts.differences);
  compared["error"] = last.done ? Json::Value() : Json::Value(ToUtf8(last.error));
  return compared;
}

}  // namespace

std::string Service::StatusReply() const {
  Json::Value reply(Json::objectValue);
  reply["ok"] = true;
  reply["shares"] = Json::Value(Json::arrayValue);
  for (const auto& [name, share] : shares) {
    const ShareWatch& watch = watches.shares.at(name);
    const char* by = WatchedByText(watch.by);
    Json::Value told(Json::objectValue);
    told["name"] = name;
    told["watched_by"] = by != nullptr ? Json::Value(by) : Json::Value();
    told["problem"] = ToUtf8(watch.problem.empty() ? share->told_queue_error : watch.problem);
    told["changes"] = static_cast<Json::UInt64>(share->feed.counts.changes);
    told["lines"] = static_cast<Json::UInt64>(share->feed.counts.lines);
    told["folded"] = static_cast<Json::UInt64>(share->feed.counts.folded);
    told["overflows"] = static_cast<Json::UInt64>(watch.overflows);
    told["backlog"] = static_cast<Json::UInt64>(share->feed.Backlog());
    told["complete_until"] = share->complete_until != 0
                                 ? Json::Value(static_cast<Json::Int64>(share->complete_until))
                                 : Json::Value();
    told["compared"] = ComparedObject(share->last);
    told["comparing"] = healer.IsPending(name);
    reply["shares"].append(told);
  }
  return OneLine(reply);
}

void Service::Serve(const Request& request) {
  if (request.type == Request::Type::STATUS) {
    server.Answer(request.client, StatusReply());
    return;
  }

  // Shares and mounts that came before the question are part of it.
  if (!ReloadSettings()) {
    Json::Value reply(Json::objectValue);
    reply["ok"] = false;
    reply["error"] = ToUtf8(settings_error);
    server.Answer(request.client, OneLine(reply));
    return;
  }
  pollfd table = {mount_table.fd, POLLPRI, 0};
  follow_due = follow_due || poll(&table, 1, 0) > 0;
  if (follow_due || watches.IsAnyMissing()) {
    FollowAll();
  }
  Syncing waiting{request.client, {}, {}, 0};
  for (const auto& [name, share] : shares) {
    const bool is_meant =
        request.shares.empty() ||
        std::find(request.shares.begin(), request.shares.end(), name) != request.shares.end();
    if (!is_meant) {
      continue;
    }
    waiting.shares.insert(name);
    if (watches.shares.at(name).by == WatchedBy::COMPARISON) {
      WantComparison(name, "somebody wants to know");
    }
  }
  all_read = false;
  syncing.push_back(std::move(waiting));
}

// A share whose lines are all in its queue file; or of which nothing more will come.
bool Service::IsWrittenOut(const std::string& name) const {
  const auto share = shares.find(name);
  return share == shares.end() || watches.shares.at(name).by == WatchedBy::NOBODY ||
         (!share->second->differs && share->second->feed.IsWrittenOut());
}

bool Service::IsSynced(const std::string& name, const Syncing& waiting) const {
  const auto ticket = waiting.tickets.find(name);
  const auto share = shares.find(name);
  return IsWrittenOut(name) && (share == shares.end() || ticket == waiting.tickets.end() ||
                                share->second->twins.IsDone(ticket->second));
}

void Service::AnswerClients() {
  if (follow_due) {
    return;  // what was read tells that a share is not what it was
  }
  std::erase_if(syncing, [this](Syncing& waiting) {
    ++waiting.rounds;
    if (!all_read && waiting.rounds < ROUNDS_TO_READ_ALL) {
      return false;
    }
    // All is looked at once all is written out, and what that found is in the search.
    if (waiting.tickets.empty() &&
        std::all_of(waiting.shares.begin(), waiting.shares.end(),
                    [this](const std::string& name) { return IsWrittenOut(name); })) {
      for (const auto& [name, share] : shares) {
        waiting.tickets.emplace(name, share->twins.DrawTicket());
      }
    }
    if (!waiting.tickets.empty()) {
      std::erase_if(waiting.shares,
                    [&](const std::string& name) { return IsSynced(name, waiting); });
    }
    if (!waiting.shares.empty()) {
      return !server.IsWaiting(waiting.client);
    }
    server.Answer(waiting.client, "{\"ok\":true}");
    return true;
  });
}

void Service::TellManager(Clock::time_point now) {
  if (!next_beat.has_value() || *next_beat > now) {
    return;
  }
  next_beat = now + *AliveInterval();
  uint64_t lines = 0;
  uint64_t backlog = 0;
  size_t watched = 0;
  for (const auto& [name, share] : shares) {
    lines += share->feed.counts.lines;
    backlog += share->feed.Backlog();
    watched += watches.shares.at(name).by != WatchedBy::NOBODY ? 1 : 0;
  }
  TellAlive();
  TellStatus(std::to_string(watched) + " of " + std::to_string(shares.size()) +
             " shares watched, " + std::to_string(lines) + " lines written, " +
             std::to_string(backlog) + " waiting");
}

}  // namespace fileindexd
