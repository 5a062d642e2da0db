// SPDX-License-Identifier: GPL-2.0-or-later
#include "platform/standalone/shortage.h"

#include <cerrno>
#include <cstdlib>
#include <map>
#include <mutex>
#include <utility>

#include "platform/log.h"
#include "platform/standalone/environment.h"
#include "state/queue_writer.h"

namespace fileindexd {

namespace {

constexpr int MAX_TRIES = 8;
constexpr unsigned FIRST_WAIT_US = 20000;  // at most; doubled for each try

struct Pass {
  bool is_short = false;
  int tries = 0;  // passes in a row that were short
};

struct Passes {
  std::mutex mutex;
  std::map<std::string, Pass> by_share;
};

// Never destroyed: a thread that outlives main may still ask.
Passes& ThePasses() {
  static Passes& passes = *new Passes;
  return passes;
}

// True for the first one of the pass.
bool MarkShort(const std::string& share) {
  Passes& passes = ThePasses();
  const std::lock_guard guard(passes.mutex);
  return !std::exchange(passes.by_share[share].is_short, true);
}

// How many passes in a row were short; 0 when this one was not.
int CountShort(const std::string& share) {
  Passes& passes = ThePasses();
  const std::lock_guard guard(passes.mutex);
  const auto found = passes.by_share.find(share);
  if (found == passes.by_share.end()) {
    return 0;
  }
  if (!found->second.is_short) {
    passes.by_share.erase(found);
    return 0;
  }
  found->second.is_short = false;
  return ++found->second.tries;
}

}  // namespace

bool IsShortage(int error) {
  return error == EMFILE || error == ENFILE;
}

void NoteFailedLook(const Settings& settings, const std::string& path, int error) {
  const Share* share = FindShareOfPath(settings, path);
  if (share != nullptr && MarkShort(share->name)) {
    errno = error;
    FI_LOG("Share[%s] has to be indexed again, path=%s, reason=%m", share->name.c_str(),
           path.c_str());
  }
}

bool IsPassShort(const std::string& share) {
  Passes& passes = ThePasses();
  const std::lock_guard guard(passes.mutex);
  const auto found = passes.by_share.find(share);
  return found != passes.by_share.end() && found->second.is_short;
}

unsigned EndPass(const std::string& share) {
  const int tries = CountShort(share);
  if (tries == 0) {
    return 0;
  }

  if (tries > MAX_TRIES) {
    FI_LOG("Share[%s] is not indexed as a whole", share.c_str());
    return 0;
  }

  std::string error;
  if (!AppendToQueue(share, {}, error)) {
    FI_LOG("Failed to wake share[%s]: %s", share.c_str(), error.c_str());
  }
  // The standard generator, seeded once at start-up, locks within itself.
  return static_cast<unsigned>(rand()) % (FIRST_WAIT_US << tries);  // NOLINT(concurrency-mt-unsafe)
}

}  // namespace fileindexd
