// SPDX-License-Identifier: GPL-2.0-or-later
// search.
#include "index/search.h"

#include <unistd.h>

#include <algorithm>
#include <chrono>
#include <cstdint>
#include <optional>

#include "ctl/commands.h"
#include "ctl/hit_output.h"
#include "ctl/output.h"
#include "ctl/pending.h"
#include "ctl/places.h"
#include "ctl/search_notes.h"
#include "ctl/terminal/screen.h"
#include "ctl/values.h"
#include "ctl/wait.h"
#include "state/layout.h"

namespace fileindexd {

namespace {

constexpr uint64_t USUAL_HITS = 20;

bool ReadCount(const char* name, const std::optional<std::string>& given, uint64_t& count) {
  if (!given) {
    return true;
  }

  const std::optional<uint64_t> number = ParseCount(*given);
  if (!number) {
    (void)Fail(EXIT_USAGE, "search: %s: not a number: %s", name, given->c_str());
    return false;
  }

  count = *number;
  return true;
}

bool ReadLimit(const std::optional<std::string>& given, uint64_t& limit) {
  limit = given == "all" ? UINT64_MAX : USUAL_HITS;
  return given == "all" || ReadCount("--limit", given, limit);
}

bool IsAboveShare(const Settings& settings, const std::string& path) {
  return std::any_of(settings.shares.begin(), settings.shares.end(),
                     [&path](const Share& share) { return Covers(path, share.path); });
}

// The shares to be searched. False, with its line written, when there is nothing to ask.
bool ChooseShares(const Session& session, const Arguments& arguments, Question& question) {
  if (arguments.in_share && session.FindShare(*arguments.in_share) == nullptr) {
    return false;
  }
  if (arguments.under) {
    std::string path;
    if (!ResolvePath(*arguments.under, path)) {
      return false;
    }

    // Above the shares is a place to search under as well; a link into one counts as its target.
    question.under = path;
    const bool inside = session.settings->ShareOfPath(path) != nullptr;
    if (!inside && !IsAboveShare(*session.settings, path) &&
        !ResolveInShare(*session.settings, path, question.under)) {
      return false;
    }
  }

  for (const Share& share : session.settings->shares) {
    if (!arguments.in_share || share.name == *arguments.in_share) {
      question.shares.push_back(share.name);
      question.roots.emplace(share.name, share.path);
    }
    question.known.push_back(share.name);
  }
  return true;
}

void FindLost(const Session& session, Question& question) {
  for (const std::string& share : question.shares) {
    if (IsIndexLost(*session.store, *session.settings, share)) {
      question.lost.push_back(share);
    }
  }
}

bool ReadSeconds(const Arguments& arguments, std::chrono::seconds& patience) {
  constexpr uint64_t LONGEST = uint64_t{100000} * 24 * 60 * 60;  // safe to add to a time
  auto seconds = static_cast<uint64_t>(patience.count());
  if (!ReadCount("--timeout", arguments.timeout, seconds)) {
    return false;
  }
  if (seconds == 0) {
    (void)Fail(EXIT_USAGE, "search: --timeout: must be at least 1");
    return false;
  }

  patience = std::chrono::seconds(std::min(seconds, LONGEST));
  return true;
}

void PutHits(const std::vector<Hit>& hits, const Arguments& arguments,
             const std::optional<Screen>& screen) {
  if (screen.has_value()) {
    const HitFormat format(hits, *screen);
    for (const Hit& hit : hits) {
      for (const std::string& line : format.Lines(hit)) {
        if (!PutLine(line)) {
          return;
        }
      }
    }
    return;
  }

  for (const Hit& hit : hits) {
    const bool put = arguments.json ? PutJson(HitObject(hit))
                                    : PutLine(hit.entry.path, arguments.nul_ended ? '\0' : '\n');
    if (!put) {
      return;
    }
  }
}

SortBy SortOf(const std::optional<std::string>& given) {
  if (!given) {
    return SortBy::SCORE;
  }
  return *given == "name" ? SortBy::NAME : *given == "size" ? SortBy::SIZE : SortBy::MODIFIED;
}

void PutAnswer(const Answer& answer, const Arguments& arguments,
               const std::optional<Screen>& screen) {
  if (arguments.count && arguments.json) {
    Json::Value object(Json::objectValue);
    object["count"] = static_cast<Json::UInt64>(answer.total);
    (void)PutJson(object);
  } else if (arguments.count) {
    (void)PutLine(std::to_string(answer.total));
  } else {
    PutHits(answer.hits, arguments, screen);
  }
}

// "-h" leaves out what holds an h, and is meant for help where it stands alone.
int Refuse(const Question& question, const std::string& error) {
  const bool wants_help =
      question.text == "-h" || question.text == "-?" || question.text == "-help";
  return Fail(EXIT_USAGE, "search: %s%s", error.c_str(), wants_help ? "; --help shows help" : "");
}

}  // namespace

int Search(const Arguments& arguments) {
  Question question;
  question.text = arguments.query;
  std::chrono::seconds patience(60);
  if (!ReadLimit(arguments.limit, question.limit) ||
      !ReadCount("--offset", arguments.offset, question.offset) ||
      !ReadSeconds(arguments, patience)) {
    return EXIT_USAGE;
  }
  if (arguments.kind) {
    question.kind = KindFromText(*arguments.kind);
  }
  question.sort = SortOf(arguments.sort);
  question.reverse = arguments.reverse;
  question.count_all = arguments.count;
  const bool for_people = !arguments.json && !arguments.nul_ended && !arguments.count;
  const std::optional<Screen> screen = for_people ? FindScreen() : std::nullopt;
  question.shows = arguments.json || screen.has_value();
  // Where nobody has said how many hits and somebody looks on, it is told that there are more: one
  // more is asked for to know it.
  const bool tells_of_more =
      !arguments.limit && !arguments.count && (screen.has_value() || isatty(STDERR_FILENO) == 1);
  question.limit += tells_of_more ? 1 : 0;

  Session session;
  if (!(arguments.wait ? session.Open() : session.OpenToAsk()) ||
      !ChooseShares(session, arguments, question)) {
    return EXIT_FAILED;
  }
  std::string error;
  if (arguments.wait) {
    // What makes no sense now will not do so later.
    std::vector<std::string> reached;
    if (!Understand(question, reached, error)) {
      return Refuse(question, error);
    }
    const int code = AwaitChanges(session, reached, patience);
    if (code != EXIT_DONE) {
      return code;
    }
  }

  FindLost(session, question);
  Answer answer;
  if (!Ask(question, answer, error)) {
    return Refuse(question, error);
  }

  const bool has_more = tells_of_more && answer.hits.size() > USUAL_HITS;
  answer.hits.resize(has_more ? USUAL_HITS : answer.hits.size());
  PutAnswer(answer, arguments, screen);
  const bool is_behind_all = answer.hits.empty() && answer.total > 0 && question.limit > 0;
  if (has_more) {
    TellOfMore(USUAL_HITS, screen);
  } else if (is_behind_all && answer.failures.empty()) {
    TellNothingBehind(question, answer, screen);
  } else if (answer.total == 0 && answer.failures.empty() &&
             (question.limit > 0 || question.count_all)) {
    TellNothingFound(question, answer, screen);
  }
  if (!arguments.json) {
    TellOfWords(*session.settings, answer, screen);
  }
  return FailAll(answer.failures);
}

}  // namespace fileindexd
