// SPDX-License-Identifier: GPL-2.0-or-later
// Writing one share's contents. The content service alone does it; one thread at a time.
//
// Contents stand under a file's identity, not its path: a rename, a move, another hard link, a
// reindex or a rebuilt entries database costs no reading. Changes gather in one transaction until
// Commit; a failure undoes all since the last one, and the caller closes and opens anew.
#pragma once

#include <chrono>
#include <cstdint>
#include <memory>
#include <string>
#include <vector>

#include "base/content.h"
#include "index/database.h"
#include "index/entry.h"
#include "index/prepared_content.h"
#include "state/settings.h"

namespace fileindexd {

// A file that is to be read.
struct ContentJob {
  int64_t file = 0;  // row in the contents
  FileIdentity identity;
  Kind kind = Kind::OTHER;         // by its name
  int64_t tries = 0;               // that killed a helper, or were never ended
  std::vector<std::string> paths;  // of entries with that identity, at least one
};

class ContentsWriter {
 public:
  // Bigger transactions cost memory and gain nothing.
  static constexpr size_t ENOUGH_PENDING = size_t{6} << 20;

  ContentsWriter();
  ~ContentsWriter();

  // Opens the share's contents beside its entries, and makes them where they are missing, of
  // another file system, or of another schema or damaged (then a copy is set aside). Entries that
  // are missing are PATH_NOT_FOUND.
  IndexError Open(const Share& share, int64_t extractor_version);
  void Close();
  bool IsOpen() const;
  // Whether the last opening did not find the entries because they seem to be going at this moment.
  // Their log may have gone alone: the next opening after LONGEST_REMOVAL tells.
  bool AreEntriesBeingRemoved() const;
  static constexpr std::chrono::seconds LONGEST_REMOVAL{2};

  // Whose folders tell which kinds are wanted of files whose names tell none: what was found to be
  // of another kind is not kept. Until it is called, all are. When they changed: LookAtAll.
  void UseSettings(std::shared_ptr<const Settings> in_force);

  // Takes in entries that changed since the last call, at most `limit` rows and ENOUGH_PENDING:
  // files wanted and not known, or changed, begin to wait. One of which only the ctime is another
  // waits again when an add said that it was written to (see `reread` in schema.h); else the ctime
  // is just stored. `more`: call again.
  bool TakeIn(size_t limit, bool& more);
  // Has TakeIn look at every entry again: at the start, after a rebuild, when settings changed,
  // once a day. Along with it goes what entries no longer want (see Sweep).
  void LookAtAll();

  // What is new and waits, newest and smallest first, without what is handed out and not ended.
  // `more`: there may be others, though these are less than `limit`.
  bool NextJobs(size_t limit, std::vector<ContentJob>& jobs, bool& more);
  // What is read again, and comes behind all that is new: first a few of those that the disk did
  // not give and that are due; then what an older extractor read or failed at. Of that a few at a
  // time begin to wait, in the order in which they became known; of these few the newest and
  // smallest come first. What is stored is kept until that. `now`: seconds since the epoch.
  bool NextAgain(int64_t now, size_t limit, std::vector<ContentJob>& jobs, bool& more);
  // When the next file is due that the disk did not give; INT64_MAX: there is none.
  int64_t UnreadDue() const;
  // On disk when it returns: what is about to be tried.
  bool BeginTries(const std::vector<int64_t>& files);
  bool Finish(int64_t file, const PreparedContent& found);
  // It cannot be read; what was found before the failure is kept, or what an earlier reading of the
  // same bytes had found. `killed`: the helper died; after the second time the file is not handed
  // out again until it or the extractor changes.
  bool Fail(int64_t file, const std::string& reason, const Content& found, bool killed);
  // The disk did not give its bytes. It counts as failed until it does, and is due again after a
  // pause, that grows from seconds to an hour.
  bool Unread(int64_t file, const std::string& reason, int64_t now);
  // Not tried after all, or its file changed meanwhile: it waits again.
  bool Release(int64_t file);
  // All that failed waits again.
  bool RetryFailed();

  // Removes, at most `limit` rows and ENOUGH_PENDING, contents whose kind is no longer wanted, and
  // those that no entry referred to for a day. `now`: seconds since the epoch.
  bool Sweep(int64_t now, size_t limit, bool& more);

  // Where much is new, one step of some hundredths of a second towards smaller words: for when
  // there is nothing else to do. `more`: call again, after a commit.
  bool Merge(bool& more);
  // Empties the log on disk. Whoever opens the database when nobody has it open reads all of it
  // first.
  void CutLog();

  bool HasChanges() const;
  // Text since the last commit. What is removed counts twice: that is done by the commit, at once.
  size_t PendingBytes() const;
  bool Commit();

  IndexError Error() const;  // of the last operation that returned false

 private:
  struct Impl;
  std::unique_ptr<Impl> impl;
};

}  // namespace fileindexd
