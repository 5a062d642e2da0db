// SPDX-License-Identifier: GPL-2.0-or-later
// info: what is known of one path, and why it is in the index or not.
#include <unistd.h>

#include <algorithm>
#include <cstdio>
#include <limits>
#include <utility>

#include "base/utf8.h"
#include "ctl/commands.h"
#include "ctl/content_kinds.h"
#include "ctl/contents_report.h"
#include "ctl/info_facts.h"
#include "ctl/info_question.h"
#include "ctl/output.h"
#include "ctl/root_problem.h"

namespace fileindexd {

namespace {

constexpr size_t MOST_SHOWN_OF_FIELD = 10;  // on a terminal: lines, of which an archive has many

const char* VerdictKey(Verdict verdict) {
  switch (verdict) {
    case Verdict::BELONGS:
      return "belongs";
    case Verdict::BAD_PATH:
      return "bad-path";
    case Verdict::NO_SHARE:
      return "no-share";
    case Verdict::NOT_COVERED:
      return "not-covered";
    case Verdict::SKIPPED_NAME:
      return "skipped-name";
    case Verdict::OWN_STATE:
      return "own-state";
    case Verdict::EXCLUDED:
      return "excluded";
    case Verdict::GONE:
      return "gone";
    case Verdict::BEHIND_LINK:
      return "behind-link";
    case Verdict::BELOW_MOUNT:
      return "below-mount";
    case Verdict::IN_SNAPSHOT:
      return "in-snapshot";
    case Verdict::SPECIAL_FILE:
      return "special-file";
    case Verdict::UNKNOWN:
      return "unknown";
  }
  return "";
}

const char* ThingText(Thing thing) {
  switch (thing) {
    case Thing::FILE:
      return "file";
    case Thing::DIRECTORY:
      return "directory";
    case Thing::LINK:
      return "symbolic link";
    case Thing::NONE:
      break;
  }
  return "nothing";
}

const char* AgreementSentence(const PathFacts& facts) {
  switch (facts.agreement) {
    case Agreement::CURRENT:
      return "in the index, as it is on disk";
    case Agreement::STALE:
      return "in the index, but changed on disk since";
    case Agreement::MISSING:
      return "not in the index yet, and should be";
    case Agreement::LEFT_OVER:
      return "still in the index, and should not be";
    case Agreement::ABSENT:
      return "not in the index, and should not be";
    case Agreement::UNKNOWN:
      break;
  }
  if (!facts.index_read) {
    return "cannot be told";
  }
  return facts.in_index ? "in the index; it cannot be compared with the disk"
                        : "not in the index; it cannot be compared with the disk";
}

std::string ProblemOfRoot(const PathFacts& facts) {
  return facts.share == nullptr
             ? ""
             : RootProblem("the share's path", *facts.share, facts.root, facts.root_emptied);
}

bool NeedsReindex(const PathFacts& facts) {
  return facts.status.needs_reindex || facts.status.reindex_begun;
}

Json::Value EntryObject(const Entry& entry) {
  Json::Value object(Json::objectValue);
  object["thing"] = ThingText(entry.thing);
  object["kind"] = KindText(entry.kind);
  object["content"] = entry.content_wanted;
  object["inode"] = static_cast<Json::UInt64>(entry.inode);
  object["size"] = static_cast<Json::Int64>(entry.size);
  object["owner"] = entry.owner;
  object["group"] = entry.group;
  object["mode"] = entry.mode;
  for (const auto& [key, time] : {std::pair<const char*, int64_t>{"mtime", entry.mtime},
                                  {"ctime", entry.ctime},
                                  {"birth_time", entry.birth_time},
                                  {"first_seen", entry.first_seen},
                                  {"written", entry.written}}) {
    object[key] = static_cast<Json::Int64>(WholeSeconds(time));
  }
  return object;
}

Json::Value PendingObject(const Pending& pending) {
  Json::Value object(Json::objectValue);
  object["below"] = static_cast<Json::UInt64>(pending.below);
  object["events"] = Json::arrayValue;
  for (const PendingEvent& event : pending.events) {
    Json::Value item(Json::objectValue);
    item["event"] = event.event;
    item["above"] = event.above;
    item["begun"] = event.begun;
    SetPath(item, event.path);
    if (!event.path_old.empty()) {
      SetPath(item, event.path_old, "path_old");
    }
    object["events"].append(item);
  }
  return object;
}

Json::Value FactsObject(const PathFacts& facts) {
  Json::Value object(Json::objectValue);
  SetPath(object, facts.path);
  object["share"] = facts.share == nullptr ? Json::Value() : Json::Value(ToUtf8(facts.share->name));
  object["folder"] = Json::nullValue;
  object["flags"] = Json::nullValue;
  object["excludes"] = Json::arrayValue;
  if (facts.folder != nullptr) {
    SetPath(object, facts.folder->path, "folder");
    object["flags"] = FlagsObject(facts.folder->wanted);
    SetTexts(object, facts.folder->excludes.patterns, "excludes");
  }
  object["verdict"] = VerdictKey(facts.look.verdict);
  object["reason"] = ToUtf8(facts.reason);
  if (!facts.at.empty()) {
    SetPath(object, facts.at, "at");
  }
  if (facts.exclusion.pattern != nullptr) {
    SetPath(object, *facts.exclusion.pattern, "pattern");
  }
  object["state"] = AgreementText(facts.agreement);
  object["entry"] = facts.in_index ? EntryObject(facts.entry) : Json::Value();
  object["stored"] = ContentObject(facts.content);
  object["content_problem"] = facts.content.problem;
  object["words_made_anew"] = WordsObject(facts.content.words);
  object["needs_reindex"] = NeedsReindex(facts);
  object["root_problem"] = ToUtf8(ProblemOfRoot(facts));
  object["index_problem"] = facts.index_problem;
  object["pending"] = PendingObject(facts.pending);
  return object;
}

constexpr size_t FACT_WIDTH = 16;

void PutFact(const std::string& name, const std::string& text, size_t width = FACT_WIDTH) {
  (void)PutLine(name + std::string(name.size() < width ? width - name.size() : 1, ' ') +
                ShownText(text));
}

void PutContent(const EntryContent& content) {
  const bool is_terminal = isatty(STDOUT_FILENO) == 1;
  const size_t most = is_terminal ? MOST_SHOWN_OF_FIELD : std::numeric_limits<size_t>::max();
  const std::string before = "  content ";
  const FactLines lines = ContentLines(content, most);
  size_t width = FACT_WIDTH;
  for (const auto& [name, text] : lines) {
    width = std::max(width, before.size() + name.size() + 1);
  }
  for (const auto& [name, text] : lines) {
    PutFact(name.empty() ? "" : before + name, text, width);
  }
}

std::string TimeText(int64_t nanoseconds) {
  return nanoseconds == 0 ? "none" : LocalTime(WholeSeconds(nanoseconds));
}

void PutEntry(const Entry& entry) {
  char mode[8];
  (void)snprintf(mode, sizeof mode, "%04o", entry.mode & 07777U);
  PutFact("  thing", ThingText(entry.thing));
  PutFact("  kind", KindText(entry.kind));
  PutFact("  content", entry.content_wanted ? "wanted" : "not wanted");
  PutFact("  size", std::to_string(entry.size));
  PutFact("  modified", TimeText(entry.mtime));
  PutFact("  changed", TimeText(entry.ctime));
  PutFact("  born", TimeText(entry.birth_time));
  PutFact("  inode", std::to_string(entry.inode));
  PutFact("  owner, group", std::to_string(entry.owner) + ", " + std::to_string(entry.group));
  PutFact("  mode", mode);
  PutFact("  first seen", TimeText(entry.first_seen));
  PutFact("  last written", TimeText(entry.written));
}

void PutFacts(const PathFacts& facts) {
  PutFact("path", facts.path);
  PutFact("share", facts.share == nullptr ? "none" : facts.share->name);
  PutFact("folder", facts.folder == nullptr ? "none" : facts.folder->path);
  if (facts.folder != nullptr) {
    PutFact("contents of", FlagsText(facts.folder->wanted));
    for (const std::string& pattern : facts.folder->excludes.patterns) {
      PutFact("exclude", pattern);
    }
  }
  PutFact("rule", facts.reason);
  PutFact("index", AgreementSentence(facts));
  for (const std::string& problem : {ProblemOfRoot(facts), facts.index_problem}) {
    if (!problem.empty()) {
      PutFact("problem", problem);
    }
  }
  if (NeedsReindex(facts)) {
    PutFact("problem", "the whole share waits for a reindex");
  }
  if (facts.content.words) {
    PutFact("words", WordsText(*facts.content.words));
  }
  if (facts.in_index) {
    PutEntry(facts.entry);
    PutContent(facts.content);
  }
  for (const PendingEvent& event : facts.pending.events) {
    PutFact(
        event.begun ? "under way" : "pending",
        event.event + " " + (event.path_old.empty() ? "" : event.path_old + " -> ") + event.path);
  }
  if (facts.pending.below != 0) {
    PutFact("pending below", std::to_string(facts.pending.below) + " events");
  }
}

void PutLines(const FactLines& lines) {
  for (const auto& [name, text] : lines) {
    PutFact(name, text);
  }
}

}  // namespace

int Info(const Arguments& arguments) {
  Session session;
  if (!session.OpenToAsk()) {
    return EXIT_FAILED;
  }
  const int code =
      arguments.question ? CheckQuestion(*arguments.question, session.settings->shares) : EXIT_DONE;
  if (code != EXIT_DONE) {
    return code;
  }
  PathFacts facts;
  if (!FindFacts(session, arguments.path, facts)) {
    return EXIT_FAILED;
  }
  QuestionFacts question;
  if (arguments.question) {
    ExplainPath(*arguments.question, facts, question);
  }

  if (arguments.json) {
    Json::Value object = FactsObject(facts);
    if (arguments.question) {
      object["query"] = QuestionObject(question);
    }
    if (arguments.terms) {
      object["terms"] = TermsList(facts.content);
    }
    (void)PutJson(object);
    return EXIT_DONE;
  }
  PutFacts(facts);
  if (arguments.question) {
    PutLines(QuestionLines(question));
  }
  if (arguments.terms) {
    PutLines(TermLines(facts.content));
  }
  return EXIT_DONE;
}

}  // namespace fileindexd
