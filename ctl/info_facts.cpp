// SPDX-License-Identifier: GPL-2.0-or-later
#include "ctl/info_facts.h"

#include <sys/stat.h>

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <filesystem>
#include <functional>

#include "ctl/output.h"
#include "ctl/root_problem.h"
#include "index/compare.h"
#include "index/entry_table.h"
#include "index/found_kind.h"
#include "index/reader.h"
#include "index/suspicion.h"
#include "state/filesystem.h"
#include "state/layout.h"

namespace fileindexd {

namespace {

// A path behind a link inside a share is what the question is about: resolved, it would be another.
bool FindPath(const Settings& settings, const std::string& given, std::string& path) {
  std::error_code error;
  const std::string letters =
      given.starts_with('/') ? given : std::filesystem::current_path(error).string() + "/" + given;
  const auto normal = NormalPath(letters);
  if (!given.empty() && !error && normal.has_value() && settings.ShareOfPath(*normal) != nullptr) {
    path = *normal;
    return true;
  }
  return ResolvePath(given, path);
}

// The first path from below the share's root down to `path` for which `test` holds; empty: none.
std::string FirstOnTheWay(const Share& share, const std::string& path,
                          const std::function<bool(const std::string&)>& test) {
  for (size_t at = share.path == "/" ? 0 : share.path.size(); at < path.size();) {
    const size_t end = std::min(path.find('/', at + 1), path.size());
    std::string part = path.substr(0, end);
    if (test(part)) {
      return part;
    }
    at = end;
  }
  return {};
}

bool IsLink(const std::string& path) {
  struct stat st {};
  return lstat(path.c_str(), &st) == 0 && S_ISLNK(st.st_mode);
}

bool HasSkippedName(const std::string& path) {
  const std::string_view name = LastComponent(path);
  return IsPreservedName(name) || IsPassingName(name);
}

// What was seen there; a name alone may have sufficed.
Leaf LeafOf(const Look& look) {
  switch (look.thing) {
    case Thing::NONE:
      return Leaf::UNKNOWN;
    case Thing::DIRECTORY:
      return Leaf::DIRECTORY;
    default:
      return Leaf::OTHER;
  }
}

void Explain(const Settings& settings, PathFacts& facts, int reason) {
  const auto first = [&facts](const std::function<bool(const std::string&)>& test) {
    return FirstOnTheWay(*facts.share, facts.path, test);
  };
  facts.reason = std::string("it ") + (facts.look.verdict == Verdict::BELONGS ? "" : "is ") +
                 VerdictText(facts.look.verdict);
  switch (facts.look.verdict) {
    case Verdict::SKIPPED_NAME:
      facts.at = first(HasSkippedName);
      facts.reason = "a name on its way is never indexed: " + facts.at;
      break;
    case Verdict::OWN_STATE:
      facts.reason = "it lies in the indexer's own folder " + settings.state_root;
      break;
    case Verdict::EXCLUDED:
      facts.exclusion = FindExclusion(settings, facts.path, LeafOf(facts.look));
      facts.at = facts.exclusion.path;
      facts.reason = "the pattern " + *facts.exclusion.pattern + " of folder " +
                     facts.exclusion.folder->path + " keeps out " + facts.at;
      break;
    case Verdict::GONE:
      facts.reason = "it does not exist";
      break;
    case Verdict::BEHIND_LINK:
      facts.at = first(IsLink);
      facts.reason = "it is behind a symbolic link, and links are not followed: " + facts.at;
      break;
    case Verdict::BELOW_MOUNT:
      facts.at = first([](const std::string& path) { return IsMountPoint(path) == 1; });
      facts.reason = "it is below a mount point inside the share: " + facts.at;
      break;
    case Verdict::UNKNOWN:
      facts.reason = std::string("the file system does not answer: ") + strerror(reason);
      break;
    default:
      break;
  }
}

void AskIndex(Session& session, PathFacts& facts) {
  const Settings& settings = *session.settings;
  const bool is_lost = IsIndexLost(*session.store, settings, facts.share->name);
  EntryReader reader;
  const IndexError opened = OpenAndTell(reader.database, facts.share->name);
  if (opened == IndexError::PATH_NOT_FOUND && !is_lost) {
    facts.index_problem = "the share is not indexed yet";
    return;
  }
  if (opened != IndexError::NONE) {
    facts.index_read = false;
    facts.index_problem = std::string("the index cannot be read: ") + IndexErrorText(opened);
    return;
  }
  const bool read = reader.ForEach(facts.path, [&facts](const Entry& entry) {
    facts.in_index = entry.path == facts.path;
    facts.entry = entry;
    return false;
  });
  uint64_t entries = 0;
  if (!read || !reader.Count(entries)) {
    TellWriter(facts.share->name, reader.read_error);
    facts.index_read = false;
    facts.index_problem = "the index cannot be read";
    return;
  }
  facts.root_emptied = IsRootEmptied(settings, *facts.share, facts.status, facts.root, entries);
}

bool IsCurrent(const PathFacts& facts) {
  const Entry& entry = facts.entry;
  return !IsStale(entry, facts.look) &&
         entry.content_wanted == IsContentDue(entry, facts.look, facts.folder->wanted);
}

Agreement Compare(const PathFacts& facts) {
  if (facts.share == nullptr) {
    return Agreement::ABSENT;
  }
  if (!facts.index_read || facts.root != RootState::SOUND || facts.root_emptied ||
      facts.look.verdict == Verdict::UNKNOWN) {
    return Agreement::UNKNOWN;
  }
  if (facts.look.verdict != Verdict::BELONGS) {
    return facts.in_index ? Agreement::LEFT_OVER : Agreement::ABSENT;
  }
  if (!facts.in_index) {
    return Agreement::MISSING;
  }
  return IsCurrent(facts) ? Agreement::CURRENT : Agreement::STALE;
}

}  // namespace

const char* AgreementText(Agreement agreement) {
  switch (agreement) {
    case Agreement::CURRENT:
      return "current";
    case Agreement::STALE:
      return "stale";
    case Agreement::MISSING:
      return "missing";
    case Agreement::LEFT_OVER:
      return "left-over";
    case Agreement::ABSENT:
      return "absent";
    case Agreement::UNKNOWN:
      return "unknown";
  }
  return "";
}

bool FindFacts(Session& session, const std::string& given, PathFacts& facts) {
  const Settings& settings = *session.settings;
  if (!FindPath(settings, given, facts.path)) {
    return false;
  }
  facts.share = settings.ShareOfPath(facts.path);
  facts.folder = settings.FolderOfPath(facts.path);
  errno = 0;
  facts.look = LookAt(settings, facts.path);
  Explain(settings, facts, errno);
  if (facts.share != nullptr) {
    if (!session.store->GetStatus(facts.share->name, facts.status)) {
      (void)Fail(EXIT_FAILED, "%s", session.store->Error().c_str());
      return false;
    }
    facts.root = LookAtRoot(*facts.share);
    AskIndex(session, facts);
    if (facts.in_index && facts.entry.content_wanted) {
      facts.content = ContentOf(*facts.share, facts.entry);
    }
    facts.pending = ReadPending(facts.share->name, facts.path);
  }
  facts.agreement = Compare(facts);
  // Only now: the index has the kinds that names tell.
  if (facts.in_index && facts.entry.kind == Kind::OTHER && facts.content.is_known) {
    const Kind found = facts.content.stored.content.kind;
    facts.entry.content_wanted = IsWantedAs(found, facts.entry, settings);
    facts.entry.kind = found;
  }
  return true;
}

}  // namespace fileindexd
