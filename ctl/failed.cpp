// SPDX-License-Identifier: GPL-2.0-or-later
// failed: files whose content could not be read.
#include <string>
#include <utility>
#include <vector>

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

// Puts the share's failures out, or adds them to the list. Empty, or why they cannot be read.
std::string ListFailed(const Share& share, bool json, Json::Value& list) {
  ContentsReader reader;
  const IndexError opened = reader.Open(share.name);
  if (opened == IndexError::PATH_NOT_FOUND) {  // nothing was read yet
    return {};
  }
  if (opened != IndexError::NONE) {
    return share.name + ": contents: " + IndexErrorText(opened);
  }

  bool written = true;
  const bool read = reader.ForEachFailed([&](const FailedContent& failed) {
    written = PutFailed(share, failed, json, list);
    return written;
  });
  return read || !written ? "" : share.name + ": the contents cannot be read";
}

// The content service alone writes contents: it finds the wish in the state.
// Empty, or why it cannot be written down.
std::string AskForRetry(Session& session, const std::string& share) {
  const auto wish = [](ShareStatus& status) { status.retry_contents = true; };
  return session.store->UpdateStatus(share, wish) ? "" : session.store->Error();
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

  std::vector<std::string> problems;
  Json::Value list(Json::arrayValue);
  for (const Share& share : shares) {
    std::string problem = ListFailed(share, arguments.json, list);
    if (problem.empty() && arguments.retry) {
      problem = AskForRetry(session, share.name);
    }
    if (!problem.empty()) {
      problems.push_back(std::move(problem));
    }
  }
  // An empty list would say that nothing has failed: of no share could that be told.
  const bool is_answered = problems.empty() || problems.size() < shares.size() || !list.empty();
  if (arguments.json && is_answered) {
    (void)PutJson(list);
  }
  return FailAll(problems);
}

}  // namespace fileindexd
