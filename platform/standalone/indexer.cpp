// SPDX-License-Identifier: GPL-2.0-or-later
#include "platform/indexer.h"

#include <mutex>

#include "index/writer.h"
#include "platform/paths.h"
#include "platform/standalone/configuration.h"
#include "platform/standalone/environment.h"
#include "platform/standalone/glance.h"
#include "platform/standalone/pass_progress.h"
#include "platform/standalone/uncancelled.h"
#include "platform/standalone/walk.h"

namespace fileindexd::TALO::IR {

namespace {

thread_local int last_error = 0;

// Between two slices of long work nothing is half done: a thread may end here.
void TestBetweenSlices() {
  int off = 0;
  pthread_setcancelstate(PTHREAD_CANCEL_ENABLE, &off);
  pthread_testcancel();
  pthread_setcancelstate(off, nullptr);
}

// The database's path is ROOT/shares/NAME/index.
std::string ShareOfDatabase(const std::string& db_path) {
  const size_t end = db_path.rfind('/');
  if (end == std::string::npos || end == 0) {
    return {};
  }
  const size_t start = db_path.rfind('/', end - 1);
  return db_path.substr(start + 1, end - start - 1);
}

ContentFlags FlagsOf(const Json::Value& object) {
  ContentFlags flags;
  FILEINDEX::RetrieveBoolFromJsonObj(flags.document, "document", object);
  FILEINDEX::RetrieveBoolFromJsonObj(flags.audio, "audio", object);
  FILEINDEX::RetrieveBoolFromJsonObj(flags.video, "video", object);
  FILEINDEX::RetrieveBoolFromJsonObj(flags.photo, "photo", object);
  return flags;
}

Below BelowOf(const std::string& path) {
  return BeginsWalk(path) ? Below::LOOKED_AT : Below::KEPT;
}

}  // namespace

struct Indexer::Handle {
  Handle(const std::string& share, StateStore& store)
      : share_name(share), progress(ProgressOf(share)), writer(share, store, [this] {
          progress.Look();
          TestBetweenSlices();
        }) {}

  // Runs one operation of the writer.
  template <typename Operation>
  bool Do(Operation operation) {
    return Uncancelled([&] {
      const std::lock_guard guard(inside);
      just_committed = false;
      const bool done = operation(writer);
      if (!done) {
        last_error = static_cast<int>(writer.last_error);
        NoteRoot(writer.last_error == IndexError::ROOT);
      }
      return done;
    });
  }

  // One that counts as a change.
  template <typename Operation>
  bool Change(Operation operation) {
    return Do([&](EntryWriter& entries) {
      progress.Count();
      return operation(entries);
    });
  }

  // What happened while the share could not be looked at is not seen again: when it is back, it is
  // looked at as a whole. Nobody is woken before that, as the next pass would fail like this one.
  void NoteRoot(bool is_away) {
    if (is_away && !away_noted) {
      away_noted = RecordReindex(share_name);
      (void)PutReindexOff(share_name);  // if it is only empty: that may change within the pass
    }
  }

  const std::string share_name;
  PassProgress& progress;
  bool just_committed = false;  // the last operation was a good commit
  bool away_noted = false;
  std::mutex inside;
  EntryWriter writer;
};

Indexer::Indexer(const std::string& db_path, _tag_backend_ir /*backend*/) {
  Uncancelled([&] {
    last_error = static_cast<int>(IndexError::OTHER);
    StateStore* store = Store();
    if (store == nullptr) {
      return false;
    }
    handle = std::make_unique<Handle>(ShareOfDatabase(db_path), *store);
    last_error = static_cast<int>(handle->writer.last_error);
    // The database was there at the commit, and nobody may touch the share for long: what it held
    // comes back without waiting for the next event.
    if (TakeReopening(handle->share_name) && last_error == ERROR_PATH_NOT_FOUND) {
      RequestReindex(handle->share_name);
    }
    return true;
  });
}

Indexer::~Indexer() {
  const CancelOff off;
  if (handle != nullptr) {
    handle->inside.lock();  // until no operation is inside
    handle->inside.unlock();
    if (!handle->just_committed) {
      handle->progress.End();  // the Worker ends, and not its transaction
    }
  }
  handle.reset();
}

bool Indexer::IsOpen() const {
  return handle != nullptr && handle->writer.IsOpen();
}

bool Indexer::AddFSDocument(const std::string& path, const Json::Value& cfg) {
  return handle != nullptr && handle->Change([&](EntryWriter& writer) {
    Seen kept;
    const Seen* seen = TakeGlance(path, kept) ? &kept : nullptr;
    return writer.Add(path, FlagsOfConfiguration(cfg), seen, BelowOf(path));
  });
}

bool Indexer::UpdateFSDocument(const std::string& path, const Json::Value& cfg,
                               const Json::Value& data) {
  return handle != nullptr && handle->Change([&](EntryWriter& writer) {
    Seen kept;
    const Seen* seen = TakeGlance(path, kept) ? &kept : nullptr;
    // Only that of a subtree has data.
    const Below below = data.isNull() ? Below::KEPT : BelowOf(path);
    return writer.Refresh(path, FlagsOfConfiguration(cfg), FlagsOf(data), seen, below);
  });
}

bool Indexer::DelFSDocument(const std::string& path, _tag_delete_mode mode) {
  return handle != nullptr && handle->Do([&](EntryWriter& writer) {
    if (static_cast<DeleteMode>(mode) != DeleteMode::STALE) {
      handle->progress.Count();
      return writer.Delete(path, static_cast<DeleteMode>(mode));
    }
    // It comes before a directory is walked again.
    handle->progress.BeginReindex(path);
    const bool done = writer.Delete(path, DeleteMode::STALE);
    if (done) {
      NoteLookedAt(path);
    }
    return done;
  });
}

bool Indexer::Commit() {
  return handle != nullptr && handle->Do([this](EntryWriter& writer) {
    const bool good = writer.Commit();
    NoteCommit(handle->share_name, good);
    handle->just_committed = good;
    // What is added of a disk that is away is gone for whoever asks, and never comes to us.
    handle->NoteRoot(IsRootAway(handle->share_name));
    return good;
  });
}

int ErrorHandler::GetError() {
  return last_error;
}

}  // namespace fileindexd::TALO::IR
