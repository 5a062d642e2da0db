// SPDX-License-Identifier: GPL-2.0-or-later
// share add, remove, list.
#include <cerrno>
#include <cstring>
#include <filesystem>

#include "ctl/client.h"
#include "ctl/commands.h"
#include "ctl/output.h"
#include "ctl/places.h"
#include "state/filesystem.h"
#include "state/layout.h"

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

bool RemoveShareFolder(const std::string& name) {
  std::error_code error;
  (void)std::filesystem::remove_all(ShareFolder(name), error);
  if (error) {
    (void)Fail(EXIT_FAILED, "%s: %s", ShareFolder(name).c_str(), error.message().c_str());
    return false;
  }

  return true;
}

}  // namespace

int ShareAdd(const Arguments& arguments) {
  if (!IsValidShareName(arguments.share)) {
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

int ShareList(const Arguments& arguments) {
  Session session;
  if (!session.Open()) {
    return EXIT_FAILED;
  }

  Json::Value list(Json::arrayValue);
  for (const Share& share : session.settings->shares) {
    if (!arguments.json) {
      (void)PutLine(share.name + "\t" + share.path);
      continue;
    }

    Json::Value item(Json::objectValue);
    item["name"] = ToUtf8(share.name);
    SetPath(item, share.path);
    list.append(item);
  }
  if (arguments.json) {
    (void)PutJson(list);
  }
  return EXIT_DONE;
}

}  // namespace fileindexd
