// SPDX-License-Identifier: GPL-2.0-or-later
// failed: files whose content could not be read.
#include "base/utf8.h"
#include "ctl/commands.h"
#include "ctl/output.h"
#include "ctl/places.h"
#include "index/contents_reader.h"

namespace fileindexd {

namespace {

// What could not be read at the first try is not tried again; what killed a helper is, once.
std::string TriesText(int64_t tries) {
  return tries > 1 ? " (" + std::to_string(tries) + " tries)" : "";
}

bool PutFailed(const Share& share, const FailedContent& failed, bool json, Json::Value& list) {
  if (!json) {
    return PutLine(ShownText(failed.path) + ": " + ShownText(failed.reason) +
                   TriesText(failed.tries));
  }

  Json::Value object(Json::objectValue);
  object["share"] = ToUtf8(share.name);
  SetPath(object, failed.path);
  object["reason"] = ToUtf8(failed.reason);
  object["tries"] = static_cast<Json::Int64>(failed.tries);
  list.append(object);
  return true;
}

// Puts the share's failures out, or adds them to the list.
int ListFailed(const Share& share, bool json, Json::Value& list) {
  ContentsReader reader;
  const IndexError opened = reader.Open(share.name);
  if (opened == IndexError::PATH_NOT_FOUND) {  // nothing was read yet
    return EXIT_DONE;
  }
  if (opened != IndexError::NONE) {
    return Fail(EXIT_FAILED, "%s: contents: %s", share.name.c_str(), IndexErrorText(opened));
  }

  bool written = true;
  const bool read = reader.ForEachFailed([&](const FailedContent& failed) {
    written = PutFailed(share, failed, json, list);
    return written;
  });
  if (!read && written) {
    return Fail(EXIT_FAILED, "%s: the contents cannot be read", share.name.c_str());
  }
  return EXIT_DONE;
}

// The content service alone writes contents: it finds the wish in the state.
int AskForRetry(Session& session, const std::string& share) {
  const auto wish = [](ShareStatus& status) { status.retry_contents = true; };
  if (!session.store->UpdateStatus(share, wish)) {
    return Fail(EXIT_FAILED, "%s", session.store->Error().c_str());
  }
  return EXIT_DONE;
}

}  // namespace

int Failed(const Arguments& arguments) {
  Session session;
  if (!session.Open()) {
    return EXIT_FAILED;
  }
  std::vector<Share> shares = session.settings->shares;
  if (!arguments.share.empty()) {
    const Share* share = session.FindShare(arguments.share);
    if (share == nullptr) {
      return EXIT_FAILED;
    }
    shares = {*share};
  }

  int code = EXIT_DONE;
  Json::Value list(Json::arrayValue);
  for (const Share& share : shares) {
    int done = ListFailed(share, arguments.json, list);
    if (done == EXIT_DONE && arguments.retry) {
      done = AskForRetry(session, share.name);
    }
    code = done == EXIT_DONE ? code : done;
  }
  if (arguments.json) {
    (void)PutJson(list);
  }
  return code;
}

}  // namespace fileindexd
