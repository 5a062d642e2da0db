// SPDX-License-Identifier: GPL-2.0-or-later
// search.
#include "index/search.h"

#include <unistd.h>

#include <algorithm>
#include <chrono>
#include <cstdint>
#include <cstdio>
#include <optional>

#include "ctl/commands.h"
#include "ctl/output.h"
#include "ctl/places.h"
#include "ctl/values.h"
#include "ctl/wait.h"
#include "state/layout.h"

namespace fileindexd {

namespace {

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

bool IsAboveShare(const Settings& settings, const std::string& path) {
  return std::any_of(settings.shares.begin(), settings.shares.end(),
                     [&path](const Share& share) { return Covers(path, share.path); });
}

// The shares to be searched, those without an index included. False, with its line written, when
// there is nothing to ask.
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
    const bool named = !arguments.in_share || share.name == *arguments.in_share;
    const bool reached = question.under.empty() || Covers(question.under, share.path) ||
                         Covers(share.path, question.under);
    if (named && reached) {
      question.shares.push_back(share.name);
    }
  }
  return true;
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

Json::Value HitObject(const Hit& hit) {
  Json::Value object(Json::objectValue);
  object["share"] = ToUtf8(hit.share);
  SetPath(object, hit.entry.path);
  object["kind"] = KindText(hit.entry.kind);
  object["size"] = static_cast<Json::Int64>(hit.entry.size);
  object["mtime"] = static_cast<Json::Int64>(WholeSeconds(hit.entry.mtime));
  object["score"] = hit.score;
  object["snippet"] = hit.snippet.text;
  return object;
}

// "4.0K": three figures at most, and a unit of 1024s.
std::string ShortSize(int64_t bytes) {
  constexpr char UNITS[] = "BKMGTPE";
  auto size = static_cast<double>(bytes);
  size_t unit = 0;
  while (size >= 1024 && unit + 2 < sizeof(UNITS)) {
    size /= 1024;
    ++unit;
  }

  char text[32];
  (void)snprintf(text, sizeof(text), unit > 0 && size < 10 ? "%.1f%c" : "%.0f%c", size,
                 UNITS[unit]);
  return text;
}

// Below its hit, the question's words bright.
void PutSnippet(const Snippet& snippet) {
  constexpr const char* BRIGHT = "\x1b[1m";
  constexpr const char* PLAIN = "\x1b[0m";
  std::string line = "    ";
  size_t at = 0;
  for (const Snippet::Mark& mark : snippet.marks) {
    line += Printable(snippet.text.substr(at, mark.start - at)) + BRIGHT +
            Printable(snippet.text.substr(mark.start, mark.end - mark.start)) + PLAIN;
    at = mark.end;
  }
  (void)PutLine(line + Printable(snippet.text.substr(at)));
}

// For people: columns, and nothing in a name that would move the cursor.
void PutColumns(const std::vector<Hit>& hits) {
  constexpr size_t WIDEST = 100;
  std::vector<std::string> names;
  size_t width = 0;
  for (const Hit& hit : hits) {
    names.push_back(Printable(hit.entry.path));
    width = std::max(width, std::min(names.back().size(), WIDEST));
  }

  for (size_t index = 0; index < hits.size(); ++index) {
    const Entry& entry = hits[index].entry;
    std::string line = names[index];
    line.resize(std::max(width, line.size()), ' ');
    const bool is_folder = entry.kind == Kind::FOLDER;
    const std::string size = is_folder ? "-" : ShortSize(entry.size);
    line += "  " + std::string(size.size() < 6 ? 6 - size.size() : 0, ' ') + size;
    line += "  " + (is_folder ? "-" : LocalTime(WholeSeconds(entry.mtime)));
    (void)PutLine(line);
    if (!hits[index].snippet.text.empty()) {
      PutSnippet(hits[index].snippet);
    }
  }
}

void PutHits(const std::vector<Hit>& hits, const Arguments& arguments) {
  if (!arguments.json && !arguments.nul_ended && isatty(STDOUT_FILENO) == 1) {
    PutColumns(hits);
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

}  // namespace

int Search(const Arguments& arguments) {
  Question question;
  question.text = arguments.query;
  std::chrono::seconds patience(60);
  if (!ReadCount("--limit", arguments.limit, question.limit) ||
      !ReadCount("--offset", arguments.offset, question.offset) ||
      !ReadSeconds(arguments, patience)) {
    return EXIT_USAGE;
  }
  if (arguments.kind) {
    question.kind = KindFromText(*arguments.kind);
  }

  Session session;
  if (!session.Open() || !ChooseShares(session, arguments, question)) {
    return EXIT_FAILED;
  }
  if (arguments.wait) {
    const int code = AwaitChanges(session, question.shares, patience);
    if (code != EXIT_DONE) {
      return code;
    }
  }
  // A share without an index yet holds nothing to find: that is no failure.
  std::erase_if(question.shares,
                [](const std::string& share) { return IsDirectoryGone(IndexPath(share)); });

  question.count_all = arguments.count;

  Answer answer;
  std::string error;
  if (!Ask(question, answer, error)) {
    return Fail(EXIT_USAGE, "search: %s: %s", arguments.query.c_str(), error.c_str());
  }

  if (arguments.count) {
    (void)PutLine(std::to_string(answer.total));
  } else {
    PutHits(answer.hits, arguments);
  }
  for (const std::string& failure : answer.failures) {
    (void)Fail(EXIT_FAILED, "%s", failure.c_str());
  }
  return answer.failures.empty() ? EXIT_DONE : EXIT_FAILED;
}

}  // namespace fileindexd
