// SPDX-License-Identifier: GPL-2.0-or-later
// pause, resume, log-level, worker drop, worker revive.
#include <chrono>
#include <cstdint>
#include <ctime>
#include <optional>
#include <thread>

#include "ctl/client.h"
#include "ctl/commands.h"
#include "ctl/output.h"
#include "ctl/places.h"
#include "ctl/values.h"

namespace fileindexd {

namespace {

constexpr int64_t NOT_PAUSED = -1;
constexpr int64_t WITHOUT_END = 0;

// When the pause that was asked for ends: WITHOUT_END, or seconds since the epoch. None, with its
// line written, when it cannot be understood.
std::optional<int64_t> EndOfPause(const Arguments& arguments, int64_t now) {
  if (arguments.until) {
    const std::optional<int64_t> until = ParseTime(*arguments.until);
    if (!until) {
      (void)Fail(EXIT_USAGE, "pause: --until: not a time: %s", arguments.until->c_str());
      return std::nullopt;
    }

    // The epoch itself is long past, and must not be read as "without end".
    return *until == WITHOUT_END ? NOT_PAUSED : *until;
  }

  if (arguments.duration) {
    const std::optional<int64_t> length = ParseDuration(*arguments.duration);
    if (!length) {
      (void)Fail(EXIT_USAGE, "pause: --for: not a duration: %s", arguments.duration->c_str());
      return std::nullopt;
    }

    return now + *length;
  }

  return WITHOUT_END;
}

// The daemon's broadcast misses a Worker that is just between its look at the pause and its wait;
// nothing that could be awaited tells when it has begun to wait, so the command is sent again.
Reply AskTwice(const std::string& type, const Json::Value& data) {
  const Reply reply = AskDaemon(type, data);
  if (reply != Reply::DONE) {
    return reply;
  }

  std::this_thread::sleep_for(std::chrono::seconds(1));
  return AskDaemon(type, data);
}

int StorePause(int64_t resume_time) {
  Session session;
  if (!session.Open()) {
    return EXIT_FAILED;
  }
  if (!session.store->SetPause(resume_time)) {
    return Fail(EXIT_FAILED, "%s", session.store->Error().c_str());
  }

  return EXIT_DONE;
}

Json::Value ShareData(const std::string& share) {
  Json::Value data(Json::objectValue);
  data["share_name"] = share;
  return data;
}

}  // namespace

int Pause(const Arguments& arguments) {
  const int64_t now = std::time(nullptr);
  const std::optional<int64_t> resume_time = EndOfPause(arguments, now);
  if (!resume_time) {
    return EXIT_USAGE;
  }

  const int stored = StorePause(*resume_time);
  if (stored != EXIT_DONE) {
    return stored;
  }

  // A time that is past ends a pause, as `resume` does.
  const bool ends_pause = *resume_time != WITHOUT_END && *resume_time <= now;
  Json::Value data(Json::objectValue);
  data["resume_time"] = static_cast<Json::Int64>(*resume_time);
  return CodeOfReply(ends_pause ? AskTwice("pause", data) : AskDaemon("pause", data), "pause");
}

int Resume(const Arguments& /*arguments*/) {
  const int stored = StorePause(NOT_PAUSED);
  if (stored != EXIT_DONE) {
    return stored;
  }

  return CodeOfReply(AskTwice("resume", Json::Value(Json::objectValue)), "resume");
}

int LogLevel(const Arguments& arguments) {
  Json::Value data(Json::objectValue);
  data["log_level"] = arguments.level;
  return CodeOfNeededReply(AskDaemon("set_log_level", data), "log-level");
}

// The daemon is asked first: it may have a Worker of a share that is on record no longer.
int WorkerDrop(const Arguments& arguments) {
  const int code = CodeOfNeededReply(AskDaemon("delete_share_worker", ShareData(arguments.share)),
                                     arguments.share);
  if (code != EXIT_DONE) {
    return code;
  }

  Session session;
  return session.Open() && session.FindShare(arguments.share) != nullptr ? EXIT_DONE : EXIT_FAILED;
}

int WorkerRevive(const Arguments& arguments) {
  return CodeOfNeededReply(AskDaemon("revive_share_worker", ShareData(arguments.share)),
                           arguments.share);
}

}  // namespace fileindexd
