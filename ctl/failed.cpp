// SPDX-License-Identifier: GPL-2.0-or-later
// failed: files whose content could not be read.
#include <ctime>
#include <string>
#include <utility>
#include <vector>

#include "base/utf8.h"
#include "ctl/commands.h"
#include "ctl/output.h"
#include "ctl/places.h"
#include "index/contents_reader.h"
#include "state/content_service.h"
#include "state/pause.h"
#include "state/pid_file.h"

namespace fileindexd {

namespace {

// What could not be read at the first try is not tried again; what killed a helper is, once.
std::string TriesText(int64_t tries) {
  return tries > 1 ? " (" + std::to_string(tries) + " tries)" : "";
}

// What happens to a wish to have them tried again.
struct Retry {
  bool is_wanted = false;
  bool runs = false;  // the content service, which does it
  bool is_paused = false;
};

// Goes through the failures of shares, and puts them out or collects them.
struct Listing {
  Retry retry;
  bool json = false;
  Json::Value list = Json::Value(Json::arrayValue);
  uint64_t files = 0;
};

bool PutFailed(const Share& share, const FailedContent& failed, Listing& listing) {
  ++listing.files;
  if (!listing.json) {
    return listing.retry.is_wanted || PutLine(ShownText(failed.path) + ": " +
                                              ShownText(failed.reason) + TriesText(failed.tries));
  }

  Json::Value object(Json::objectValue);
  object["share"] = ToUtf8(share.name);
  SetPath(object, failed.path);
  object["reason"] = ToUtf8(failed.reason);
  object["tries"] = static_cast<Json::Int64>(failed.tries);
  if (listing.retry.is_wanted) {
    object["retry"] = true;
    object["service_runs"] = listing.retry.runs;
    object["paused"] = listing.retry.is_paused;
  }
  listing.list.append(object);
  return true;
}

// Puts the share's failures out, or collects them. Empty, or why they cannot be read.
std::string ListFailed(const Share& share, Listing& listing) {
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
    written = PutFailed(share, failed, listing);
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

// False, with its line written, on failure.
bool LookAtService(Session& session, Retry& retry) {
  int64_t resume_time = -1;
  if (!session.store->GetPause(resume_time)) {
    (void)Fail(EXIT_FAILED, "%s", session.store->Error().c_str());
    return false;
  }
  retry.runs = AliveByPidFile(SERVICE_PID_FILE, SERVICE_PROGRAM) > 0;
  retry.is_paused = IsPaused(resume_time, time(nullptr));
  return true;
}

std::string RetryText(const Listing& listing) {
  const Retry& retry = listing.retry;
  std::string text = listing.files == 1
                         ? "1 file will be tried again"
                         : std::to_string(listing.files) + " files will be tried again";
  if (listing.files == 0) {
    return text;
  }
  return text + (retry.is_paused ? " when indexing is resumed: it is paused"
                 : !retry.runs   ? " when the content service runs: it does not"
                                 : "");
}

}  // namespace

int Failed(const Arguments& arguments) {
  Session session;
  if (!(arguments.retry ? session.Open() : session.OpenToAsk())) {
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

  Listing listing;
  listing.json = arguments.json;
  listing.retry.is_wanted = arguments.retry;
  if (arguments.retry && !LookAtService(session, listing.retry)) {
    return EXIT_FAILED;
  }
  std::vector<std::string> problems;
  for (const Share& share : shares) {
    const uint64_t files = listing.files;
    const Json::ArrayIndex listed = listing.list.size();
    std::string problem = ListFailed(share, listing);
    if (problem.empty() && arguments.retry) {
      problem = AskForRetry(session, share.name);
      if (!problem.empty()) {  // none of them is tried
        listing.files = files;
        listing.list.resize(listed);
      }
    }
    if (!problem.empty()) {
      problems.push_back(std::move(problem));
    }
  }
  // An empty list would say that nothing has failed: of no share could that be told.
  const bool is_answered = problems.empty() || problems.size() < shares.size();
  if (arguments.json && (is_answered || !listing.list.empty())) {
    (void)PutJson(listing.list);
  } else if (!arguments.json && arguments.retry && is_answered) {
    (void)PutLine(RetryText(listing));
  }
  return FailAll(problems);
}

}  // namespace fileindexd
