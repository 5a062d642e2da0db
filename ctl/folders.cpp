// SPDX-License-Identifier: GPL-2.0-or-later
// folder add, set, remove.
//
// A setting is stored first, then the daemon is told, then the event is queued that brings the
// index in line: the Worker that executes it has to know the new settings. Only a share's first
// folder is queued before: it is told of by starting a Worker, which reads the queue at once.
// Whatever goes wrong after the setting is stored, the rest is done all the same, because the
// command given again would find nothing to change.
#include <algorithm>
#include <cstring>
#include <filesystem>

#include "ctl/client.h"
#include "ctl/commands.h"
#include "ctl/content_kinds.h"
#include "ctl/output.h"
#include "ctl/places.h"
#include "state/belonging.h"
#include "state/event_codes.h"
#include "state/layout.h"
#include "state/queue_content.h"
#include "state/queue_writer.h"

namespace fileindexd {

namespace {

Reply TellDaemon(const char* type, const std::string& path) {
  Json::Value data(Json::objectValue);
  data["folder_path"] = path;
  return AskDaemon(type, data);
}

// Where the line cannot be written, the share's flag has all of it indexed again.
int Queue(Session& session, const IndexedFolder& folder, uint32_t event,
          const std::string& data = {}) {
  std::string error;
  if (AppendEvent(folder.share, event, folder.path, data, Durability::NONE, error)) {
    return EXIT_DONE;
  }

  (void)session.store->UpdateStatus(folder.share, [](ShareStatus& status) {
    status.needs_reindex = true;
  });  // one line tells enough
  return Fail(EXIT_FAILED, "%s", error.c_str());
}

size_t CountFolders(const Settings& settings, const std::string& share) {
  return static_cast<size_t>(
      std::count_if(settings.folders.begin(), settings.folders.end(),
                    [&share](const IndexedFolder& folder) { return folder.share == share; }));
}

// An index that a folder's removal could not discard holds entries that no folder covers any more:
// all of it is looked at again. False, with its line written, on failure.
bool SweepLeftIndex(Session& session, const std::string& share) {
  std::error_code error;
  if (!std::filesystem::exists(IndexPath(share), error)) {
    return true;
  }

  if (!session.store->UpdateStatus(share,
                                   [](ShareStatus& status) { status.needs_reindex = true; })) {
    (void)Fail(EXIT_FAILED, "%s", session.store->Error().c_str());
    return false;
  }
  return true;
}

// False, with its line written, when nothing at or below `path` could get into the index.
bool CanBeIndexed(const Settings& settings, const IndexedFolder& added) {
  Settings changed = settings;
  const auto place = std::upper_bound(
      changed.folders.begin(), changed.folders.end(), added,
      [](const IndexedFolder& left, const IndexedFolder& right) { return left.path < right.path; });
  changed.folders.insert(place, added);

  const Share* share = settings.ShareByName(added.share);
  if (share != nullptr && LookAtRoot(*share) != RootState::SOUND) {
    (void)Fail(EXIT_FAILED, "%s: the share's folder is missing or lies on another file system",
               share->path.c_str());
    return false;
  }

  const Look look = LookAt(changed, added.path);
  if (look.verdict != Verdict::BELONGS) {
    (void)Fail(EXIT_FAILED, "%s: cannot be indexed: %s", added.path.c_str(),
               VerdictText(look.verdict));
    return false;
  }

  return true;
}

// False, with its line written, when one of them is no pattern.
bool CheckExcludes(const std::vector<std::string>& patterns) {
  Excludes checked;
  std::string error;
  for (const std::string& pattern : patterns) {
    if (!checked.Add(pattern, error)) {
      (void)Fail(EXIT_USAGE, "%s", error.c_str());
      return false;
    }
  }
  return true;
}

// The indexed folder that an argument names; null, with its line written, when there is none. It
// may be gone from the disk.
const IndexedFolder* FindFolder(const Settings& settings, const std::string& given) {
  std::string path;
  if (!ResolveInShare(settings, given, path)) {
    return nullptr;
  }
  const IndexedFolder* folder = settings.FolderAt(path);
  std::error_code error;
  if (folder == nullptr) {
    const std::string target = std::filesystem::canonical(path, error).string();
    folder = error ? nullptr : settings.FolderAt(target);
  }
  if (folder == nullptr) {
    (void)Fail(EXIT_FAILED, "%s: not an indexed folder", path.c_str());
  }
  return folder;
}

// The daemon's hands are off the share: what was known of its files goes.
int DiscardIndex(Session& session, const std::string& share) {
  const std::string targets[] = {QueuePath(share),    DrainedPath(share),
                                 IndexPath(share),    DamagedIndexPath(share),
                                 ContentsPath(share), DamagedContentsPath(share)};
  for (const std::string& target : targets) {
    std::error_code error;
    (void)std::filesystem::remove_all(target, error);
    if (error) {
      return Fail(EXIT_FAILED, "%s: %s", target.c_str(), error.message().c_str());
    }
  }

  if (!session.store->UpdateStatus(share, [](ShareStatus& status) { status = {}; })) {
    return Fail(EXIT_FAILED, "%s", session.store->Error().c_str());
  }
  return EXIT_DONE;
}

// Without settings the share's Worker is deleted. A daemon that has none, because the share's root
// is gone, refuses; asked in the other way it has nothing to look up, and lets go in any case.
int RemoveLastFolder(Session& session, const IndexedFolder& folder) {
  Reply reply = TellDaemon("delete_folder_setting", folder.path);
  if (reply == Reply::REFUSED) {
    Json::Value data(Json::objectValue);
    data["share_name"] = folder.share;
    reply = AskDaemon("delete_share_worker", data);
  }

  const int code = CodeOfReply(reply, folder.path);
  return code == EXIT_DONE ? DiscardIndex(session, folder.share) : code;
}

}  // namespace

int FolderAdd(const Arguments& arguments) {
  if (!CheckExcludes(arguments.excludes)) {
    return EXIT_USAGE;
  }
  Session session;
  IndexedFolder folder;
  if (!session.Open() || !ResolveDirectory(arguments.path, folder.path)) {
    return EXIT_FAILED;
  }
  const Share* share = session.settings->ShareOfPath(folder.path);
  if (share == nullptr) {
    return Fail(EXIT_FAILED, "%s: lies in no share", folder.path.c_str());
  }
  if (session.settings->FolderAt(folder.path) != nullptr) {
    return Fail(EXIT_FAILED, "%s: is an indexed folder already", folder.path.c_str());
  }

  folder.share = share->name;
  for (const ContentKind& kind : CONTENT_KINDS) {
    folder.wanted.*kind.flag = arguments.all || (arguments.*kind.argument).value_or(false);
  }
  if (!CanBeIndexed(*session.settings, folder)) {
    return EXIT_FAILED;
  }

  const bool first = CountFolders(*session.settings, folder.share) == 0;
  if (first && !SweepLeftIndex(session, folder.share)) {
    return EXIT_FAILED;
  }
  if (!session.store->AddFolder(folder.path, folder.wanted, arguments.excludes)) {
    return Fail(EXIT_FAILED, "%s", session.store->Error().c_str());
  }

  int queued = first ? Queue(session, folder, CUSTOM_EVENT_REINDEX) : EXIT_DONE;
  const int told = CodeOfReply(TellDaemon("upsert_folder_setting", folder.path), folder.path);
  if (!first) {
    queued = Queue(session, folder, CUSTOM_EVENT_REINDEX);
  }
  return told != EXIT_DONE ? told : queued;
}

int FolderSet(const Arguments& arguments) {
  bool given = arguments.no_excludes || !arguments.excludes.empty();
  for (const ContentKind& kind : CONTENT_KINDS) {
    given = given || (arguments.*kind.argument).has_value();
  }
  if (!given) {
    return Fail(EXIT_USAGE, "folder set: nothing to set at %s", arguments.path.c_str());
  }
  if (!CheckExcludes(arguments.excludes)) {
    return EXIT_USAGE;
  }

  Session session;
  if (!session.Open()) {
    return EXIT_FAILED;
  }
  const IndexedFolder* folder = FindFolder(*session.settings, arguments.path);
  if (folder == nullptr) {
    return EXIT_FAILED;
  }

  ContentFlags changed;
  ContentFlags wanted = folder->wanted;
  for (const ContentKind& kind : CONTENT_KINDS) {
    wanted.*kind.flag = (arguments.*kind.argument).value_or(wanted.*kind.flag);
    changed.*kind.flag = wanted.*kind.flag != folder->wanted.*kind.flag;
  }
  const bool keeps = !arguments.no_excludes && arguments.excludes.empty();
  const std::vector<std::string>& excludes = keeps ? folder->excludes.patterns : arguments.excludes;
  const bool other_excludes = excludes != folder->excludes.patterns;
  if (!changed.Any() && !other_excludes) {
    return EXIT_DONE;
  }
  if (!session.store->SetFolder(folder->path, wanted, excludes)) {
    return Fail(EXIT_FAILED, "%s", session.store->Error().c_str());
  }

  const int told = CodeOfReply(TellDaemon("upsert_folder_setting", folder->path), folder->path);
  // A reindex sets everything anew, the flags too.
  const int queued =
      other_excludes ? Queue(session, *folder, CUSTOM_EVENT_REINDEX)
                     : Queue(session, *folder, CUSTOM_EVENT_UPDATE, ToText(FlagsObject(changed)));
  return told != EXIT_DONE ? told : queued;
}

int FolderRemove(const Arguments& arguments) {
  Session session;
  if (!session.Open()) {
    return EXIT_FAILED;
  }
  const IndexedFolder* folder = FindFolder(*session.settings, arguments.path);
  if (folder == nullptr) {
    return EXIT_FAILED;
  }
  if (!session.store->RemoveFolder(folder->path)) {
    return Fail(EXIT_FAILED, "%s", session.store->Error().c_str());
  }
  if (CountFolders(*session.settings, folder->share) == 1) {
    return RemoveLastFolder(session, *folder);
  }

  const int told = CodeOfReply(TellDaemon("delete_folder_setting", folder->path), folder->path);
  const ContentFlags every = {.document = true, .audio = true, .video = true, .photo = true};
  const int queued = Queue(session, *folder, CUSTOM_EVENT_UPDATE, ToText(FlagsObject(every)));
  return told != EXIT_DONE ? told : queued;
}

}  // namespace fileindexd
