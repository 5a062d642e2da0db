// SPDX-License-Identifier: GPL-2.0-or-later
// A contents database that a test fills and looks at, in the place of the real writer.
//
// What is unread is due after a minute. What is written stands in `now` until a commit makes it
// `kept`; an opening begins with what was kept, where what failed with an older extractor waits.
// And a pool whose helpers do what the test says, and openers that have no thread. One thread.
#pragma once

#include <cstdint>
#include <list>
#include <map>
#include <string>
#include <vector>

#include "extract/pool.h"
#include "index/contents_writer.h"

namespace fileindexd {

constexpr int64_t UNREAD_PAUSE = 60;  // seconds

struct ScriptedFile {
  enum class State { WAITS, DONE, FAILED, UNREAD };
  ContentJob job;
  State state = State::WAITS;
  int64_t tries = 0;                      // begun, not taken back
  std::string text;                       // or the reason of a failure
  std::string found;                      // text, in spite of that
  int64_t extractor = EXTRACTOR_VERSION;  // that failed
  bool is_prepared = false;
  bool is_old = false;  // what waits was read by older readers
  int64_t due = 0;      // of an unread one
};

struct ScriptedContents {
  std::map<int64_t, ScriptedFile> entries;  // what TakeIn finds, by row
  std::map<int64_t, ScriptedFile> kept;
  std::map<int64_t, ScriptedFile> now;
  std::vector<std::string> calls;
  std::map<std::string, IndexError> failing;  // by the call's name: it fails so, until removed
  bool entries_go = false;                    // where Open does not find them
  size_t pending_bytes = 0;
  int unmerged = 0;              // so many times Merge says that there is more
  size_t most_again = SIZE_MAX;  // NextAgain gives no more at once, and does not say that there are
  bool unseen = false;           // the next NextJobs gives nothing, and says that there may be more
};

// Those of a share, which all its writers write to.
ScriptedContents& Scripted(const std::string& share = "a");
void ForgetScripted();

struct ScriptedPool {
  std::list<ExtractJob> running;
  std::vector<ExtractOutcome> outcomes;  // for the next Work
  size_t room = 2;                       // for so many jobs
  unsigned aborts = 0;
  std::string left_out;
  std::string opening_error;  // not empty: no pool can be opened

  // The first job ends so.
  void End(ExtractOutcome::Result result, const std::string& text);
};

// Of all shares: what is asked is not answered. False in the beginning.
bool& FilesystemHangs();

// Of all shares: what is done beside has not ended until it is awaited. False in the beginning.
bool& SideWorkTakesTime();
// Of all shares: there is no thread for it. False in the beginning.
bool& SideWorkFails();
// Whether some is begun and not awaited: the writer is not to be used then.
bool IsSideWorkRunning();

// What stands for their descriptors among what is polled.
constexpr int OPENER_POLLED = -2;
constexpr int SIDE_WORK_POLLED = -3;

// As the entries would have it.
FileIdentity IdentityOf(const std::string& path);

// The one of the process.
ScriptedPool& Pool();

}  // namespace fileindexd
