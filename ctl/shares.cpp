// SPDX-License-Identifier: GPL-2.0-or-later
// share add, remove, accept, set, list.
#include <algorithm>
#include <cerrno>
#include <cstring>
#include <filesystem>
#include <system_error>

#include "base/utf8.h"
#include "ctl/client.h"
#include "ctl/commands.h"
#include "ctl/output.h"
#include "ctl/places.h"
#include "ctl/values.h"
#include "index/emptied.h"
#include "index/reader.h"
#include "index/text_tokenizer.h"
#include "state/belonging.h"
#include "state/filesystem.h"
#include "state/layout.h"
#include "state/queue_writer.h"

namespace fileindexd {

namespace {

// False, with its line written, when `path` cannot be a share's directory.
bool CanBeShare(const std::string& path) {
  // The state root may stand behind a link; the share's path does not.
  std::string state_root;
  if (!ResolveDirectory(StateRoot(), state_root)) {
    return false;
  }
  if (Covers(state_root, path) || Covers(path, state_root)) {
    (void)Fail(EXIT_FAILED, "%s: lies in, or holds, the index's own state (%s)", path.c_str(),
               state_root.c_str());
    return false;
  }
  if (!IsRealFilesystem(path)) {
    (void)Fail(EXIT_FAILED, "%s: lies on no file system that can be indexed", path.c_str());
    return false;
  }

  return true;
}

constexpr int MOST_TRIES = 100;

// Again where a program that was just making a file there made it a moment too late.
void RemoveAll(const std::string& path, std::error_code& error) {
  for (int i = 0; i == 0 || (i < MOST_TRIES && error == std::errc::directory_not_empty); ++i) {
    error.clear();
    (void)std::filesystem::remove_all(path, error);
  }
}

// Of a folder that is being removed. It begins with a dot, as no share's name does.
constexpr const char* REMOVED = ".removed";

// What removals of whatever share left that were cut short.
void SweepRemoved() {
  std::error_code error;
  std::filesystem::directory_iterator folders(SharesFolder(), error);
  for (; !error && folders != std::filesystem::directory_iterator(); folders.increment(error)) {
    const std::string name = folders->path().filename();
    if (name.starts_with('.') && name.ends_with(REMOVED)) {
      std::error_code ignored;  // the next one tries again
      RemoveAll(folders->path(), ignored);
    }
  }
}

// Out of the way first: what has not seen yet that the share is gone makes nothing more there,
// unless it makes the folder itself.
bool RemoveShareFolder(const std::string& name) {
  SweepRemoved();
  const std::string folder = ShareFolder(name);
  const std::string removed = ShareFolder("." + name + REMOVED);
  std::error_code error;
  std::filesystem::rename(folder, removed, error);
  if (error == std::errc::no_such_file_or_directory) {
    return true;
  }
  // Where folders cannot be renamed (a mount point, a lower layer of an overlay): as it stands.
  const std::string& left = error ? folder : removed;
  RemoveAll(left, error);
  std::error_code ignored;
  if (error == std::errc::device_or_resource_busy && std::filesystem::is_empty(folder, ignored)) {
    error.clear();  // a mount point itself stays
  }
  if (error) {
    (void)Fail(EXIT_FAILED, "%s: %s", left.c_str(), error.message().c_str());
    return false;
  }

  return true;
}

// The first indexed folder of the share; null when it has none.
const IndexedFolder* FirstFolder(const Settings& settings, const Share& share) {
  const auto found =
      std::find_if(settings.folders.begin(), settings.folders.end(),
                   [&share](const IndexedFolder& folder) { return folder.share == share.name; });
  return found == settings.folders.end() ? nullptr : &*found;
}

// Whether there is anything in the index but the indexed folders themselves. False, with its line
// written, when that cannot be told.
bool HoldsSomething(const Settings& settings, const Share& share, bool& holds) {
  EntryReader reader;
  const IndexError opened = reader.Open(share.name);
  uint64_t entries = 0;
  if (opened != IndexError::PATH_NOT_FOUND &&
      (opened != IndexError::NONE || !reader.Count(entries))) {
    (void)Fail(EXIT_FAILED, "%s: index: %s", share.name.c_str(),
               opened != IndexError::NONE ? IndexErrorText(opened) : "cannot be read");
    return false;
  }
  holds = HoldsMoreThanFolders(settings, share, entries);
  return true;
}

enum class Acceptance { NOTHING, FILESYSTEM, EMPTY_ROOT };

// What is to be accepted at the share's path. False, with its line written, when nothing can be.
bool FindAcceptance(const Settings& settings, const Share& share, Acceptance& found) {
  switch (LookAtRoot(share)) {
    case RootState::MISSING:
      (void)Fail(EXIT_FAILED, "%s: %s is missing, or no directory: there is nothing to go on with",
                 share.name.c_str(), share.path.c_str());
      return false;
    case RootState::UNKNOWN:
      (void)Fail(EXIT_FAILED, "%s: %s cannot be looked at: %s", share.name.c_str(),
                 share.path.c_str(), strerror(errno));
      return false;
    case RootState::FOREIGN:
      found = Acceptance::FILESYSTEM;
      return true;
    case RootState::SOUND:
      break;
  }

  bool holds = false;
  if (IsRootEmpty(share) && !HoldsSomething(settings, share, holds)) {
    return false;
  }
  found = holds ? Acceptance::EMPTY_ROOT : Acceptance::NOTHING;
  return true;
}

// Puts on record that the share goes on with what is there. The reindex first: whatever comes
// between, no single change is taken up before everything is looked at.
bool RecordAcceptance(StateStore& store, const Share& share, bool reindex) {
  const bool is_empty = IsRootEmpty(share);
  const bool recorded = store.UpdateStatus(share.name, [reindex, is_empty](ShareStatus& status) {
    status.accept_empty = is_empty;
    status.needs_reindex = status.needs_reindex || reindex;
  });
  const std::string filesystem = recorded ? FilesystemIdentity(share.path) : std::string();
  if (recorded && filesystem.empty()) {
    (void)Fail(EXIT_FAILED, "%s: its file system cannot be told: %s", share.path.c_str(),
               strerror(errno));
    return false;
  }
  if (!recorded || !store.SetShareFilesystem(share.name, filesystem)) {
    (void)Fail(EXIT_FAILED, "%s", store.Error().c_str());
    return false;
  }
  return true;
}

}  // namespace

int ShareAdd(const Arguments& arguments) {
  if (!CanNameNewShare(arguments.share)) {
    return Fail(EXIT_USAGE,
                "%s: not a share's name: 1 to 64 bytes, no '/', no control characters, no '.' in "
                "front",
                arguments.share.c_str());
  }

  Session session;
  Share share;
  share.name = arguments.share;
  if (!session.Open() || !ResolveDirectory(arguments.path, share.path) || !CanBeShare(share.path)) {
    return EXIT_FAILED;
  }

  share.filesystem = FilesystemIdentity(share.path);
  if (share.filesystem.empty()) {
    return Fail(EXIT_FAILED, "%s: its file system cannot be told: %s", share.path.c_str(),
                strerror(errno));
  }

  // A removal that was cut short may have left the index of another share of that name.
  const bool is_new = session.settings->ShareByName(share.name) == nullptr;
  if (is_new && !RemoveShareFolder(share.name)) {
    return EXIT_FAILED;
  }
  if (!session.store->AddShare(share)) {
    return Fail(EXIT_FAILED, "%s", session.store->Error().c_str());
  }

  return EXIT_DONE;
}

// The record goes last but one: as long as it stands the command can be given again.
int ShareRemove(const Arguments& arguments) {
  Session session;
  if (!session.Open()) {
    return EXIT_FAILED;
  }
  const Share* share = session.FindShare(arguments.share);
  if (share == nullptr) {
    return EXIT_FAILED;
  }

  for (const IndexedFolder& folder : session.settings->folders) {
    if (folder.share == share->name && !session.store->RemoveFolder(folder.path)) {
      return Fail(EXIT_FAILED, "%s", session.store->Error().c_str());
    }
  }

  Json::Value data(Json::objectValue);
  data["share_name"] = share->name;
  const int code = CodeOfReply(AskDaemon("delete_share_worker", data), share->name);
  if (code != EXIT_DONE) {
    return code;
  }

  if (!session.store->RemoveShare(share->name)) {
    return Fail(EXIT_FAILED, "%s", session.store->Error().c_str());
  }
  return RemoveShareFolder(share->name) ? EXIT_DONE : EXIT_FAILED;
}

int ShareAccept(const Arguments& arguments) {
  Session session;
  if (!session.Open()) {
    return EXIT_FAILED;
  }
  const Share* share = session.FindShare(arguments.share);
  Acceptance found = Acceptance::NOTHING;
  if (share == nullptr || !FindAcceptance(*session.settings, *share, found)) {
    return EXIT_FAILED;
  }
  if (found == Acceptance::NOTHING) {
    (void)PutLine("nothing to accept");
    return EXIT_DONE;
  }
  if (!CanBeShare(share->path)) {
    return EXIT_FAILED;
  }

  const IndexedFolder* folder = FirstFolder(*session.settings, *share);
  if (!RecordAcceptance(*session.store, *share, folder != nullptr)) {
    return EXIT_FAILED;
  }
  if (folder == nullptr) {
    return EXIT_DONE;
  }

  // The reindex is on record; this is for a Worker that runs.
  std::string error;
  if (!AppendToQueue(share->name, {}, error)) {
    return Fail(EXIT_FAILED, "%s", error.c_str());
  }
  // A daemon that was started while the path could not be indexed has no Worker for it yet.
  Json::Value data(Json::objectValue);
  data["folder_path"] = folder->path;
  return CodeOfReply(AskDaemon("upsert_folder_setting", data), share->name);
}

int ShareSet(const Arguments& arguments) {
  const std::string language = LanguageName(arguments.language.value_or(""));
  if (language.empty()) {
    return Fail(EXIT_USAGE, "share set: --language: not one of %s: %s", KnownLanguages().c_str(),
                arguments.language.value_or("").c_str());
  }

  Session session;
  if (!session.Open() || session.FindShare(arguments.share) == nullptr) {
    return EXIT_FAILED;
  }
  return session.store->SetShareLanguage(arguments.share, language)
             ? EXIT_DONE
             : Fail(EXIT_FAILED, "%s", session.store->Error().c_str());
}

int ShareList(const Arguments& arguments) {
  Session session;
  if (!session.OpenToAsk()) {
    return EXIT_FAILED;
  }

  Json::Value list(Json::arrayValue);
  for (const Share& share : session.settings->shares) {
    if (!arguments.json) {
      (void)PutLine(ShownName(share.name) + "\t" + ShownName(share.path));
      continue;
    }

    Json::Value item(Json::objectValue);
    item["name"] = ToUtf8(share.name);
    SetPath(item, share.path);
    item["language"] = share.language;
    list.append(item);
  }
  if (arguments.json) {
    (void)PutJson(list);
  }
  return EXIT_DONE;
}

}  // namespace fileindexd
