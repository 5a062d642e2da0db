// SPDX-License-Identifier: GPL-2.0-or-later
// The state database: shares, folder settings, status flags, pause state, update markers.
//
// Every program opens it; each change is one short transaction. A store may be used from several
// threads: it serialises its users. Nothing throws. Every operation returns false on failure and
// then Error() tells what and why, in one line that names the file; out-parameters are set only on
// success. It is upgraded in place, never rebuilt: one of a newer version is refused, a damaged one
// is replaced by the sound copy that changes leave beside it.
#pragma once

#include <cstdint>
#include <functional>
#include <memory>
#include <string>
#include <vector>

#include "state/settings.h"

namespace fileindexd {

// What is remembered of one share. Readers: all. Writers: the daemon, but for what is said.
struct ShareStatus {
  bool needs_reindex = false;   // also set by tools
  bool reindex_begun = false;   // a whole reindex began and has not ended
  bool no_space = false;        // cleared by whoever sees that there is space again
  bool missing = false;         // the last opening of the index found no database
  bool rebuild_wanted = false;  // the next opening may create the database
  bool accept_empty = false;    // an empty root is what the user wants; set by tools
  // What failed to be read is to be tried again; set by tools, cleared by the content service.
  bool retry_contents = false;
};

class StateStore {
 public:
  // Opens the database, making it and the state root where they are missing. None on failure, and
  // `error` then tells.
  static std::unique_ptr<StateStore> Open(std::string& error);
  ~StateStore();
  StateStore(const StateStore&) = delete;
  StateStore& operator=(const StateStore&) = delete;

  // One write and one read of the database, so that all that a later failure could keep from being
  // made (its log, its shared memory) exists.
  bool Touch();

  // The settings in force. Cheap when nothing changed since the last call: the same object again.
  bool GetSettings(std::shared_ptr<const Settings>& settings);

  // False with a sentence for the user when the share exists, its name is not valid, or its path
  // lies in, or holds, another share. Paths are normal.
  bool AddShare(const Share& share);
  bool RemoveShare(const std::string& name);  // with its folders and status
  bool SetShareFilesystem(const std::string& name, const std::string& filesystem);
  // One that the words of contents know (see index/text_tokenizer.h): that is the caller's to
  // check.
  bool SetShareLanguage(const std::string& name, const std::string& language);

  // The share is that of the path. Adding a folder that is there fails, changing or removing one
  // that is not fails, and so does a pattern that is none (see excludes.h).
  bool AddFolder(const std::string& path, const ContentFlags& wanted,
                 const std::vector<std::string>& excludes = {});
  bool SetFolder(const std::string& path, const ContentFlags& wanted);  // excludes stay
  bool SetFolder(const std::string& path, const ContentFlags& wanted,
                 const std::vector<std::string>& excludes);
  bool RemoveFolder(const std::string& path);

  // Both fail for a share that is not registered.
  bool GetStatus(const std::string& share, ShareStatus& status);
  // Changes what `change` changes, in one transaction; writes nothing when it changes nothing.
  // `change` is called under the store's mutex: it must not use the store. It is called again where
  // the database was replaced meanwhile.
  bool UpdateStatus(const std::string& share, const std::function<void(ShareStatus&)>& change);

  // Seconds since the epoch, 0 without end, -1 not paused (as on first use).
  bool GetPause(int64_t& resume_time);
  bool SetPause(int64_t resume_time);
  // Not paused any more, unless the pause was changed since `resume_time` was read.
  bool ClearPause(int64_t resume_time);

  bool HasMarker(const std::string& marker, bool& has);
  bool SetMarker(const std::string& marker);

  std::string Error();

 private:
  StateStore();

  struct Impl;
  std::unique_ptr<Impl> impl;
};

}  // namespace fileindexd
