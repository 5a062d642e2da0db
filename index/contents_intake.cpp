// SPDX-License-Identifier: GPL-2.0-or-later
// What entries say is wanted, and what they do not say any more.
#include <algorithm>

#include "index/contents_writer_impl.h"
#include "index/kind.h"

namespace fileindexd {

namespace {

constexpr int64_t DAY = 24 * 60 * 60;

}  // namespace

bool ContentsWriter::Impl::TakeIn(size_t limit, bool& more) {
  more = false;
  if (!Ready() || !ReadyToFollow()) {
    return false;
  }

  auto left = static_cast<int64_t>(limit);
  int code = TakeInAfter(table->meta.seen, left, more);
  if (code == SQLITE_OK && more) {
    code = table->Begin();  // so many rows are not looked at twice for nothing
  }
  if (code == SQLITE_OK && !more && is_looking) {
    code = TakeInAfter(looked, left, more);
    has_passed = table->changed;
    is_looking = more;
  }
  if (code == SQLITE_OK && !more) {
    code = table->Reword(more);
  }
  return Done(code);
}

// Of the entries written after `done`, `left` ones at most; both follow.
int ContentsWriter::Impl::TakeInAfter(int64_t& done, int64_t& left, bool& more) {
  std::vector<FollowedEntry> rows;
  int code = entries.Next(done, left, rows);
  more = static_cast<int64_t>(rows.size()) == left;
  for (size_t i = 0; i < rows.size() && code == SQLITE_OK; ++i) {
    if (IsFull()) {
      more = true;
      break;
    }
    code = TakeInEntry(rows[i]);
    done = rows[i].written;
    --left;
  }
  return code;
}

int ContentsWriter::Impl::TakeInEntry(const FollowedEntry& entry) {
  ContentFile file;
  bool found = false;
  const int code = table->Find(entry.identity.inode, entry.identity.birth_time, file, found);
  if (code != SQLITE_OK) {
    return code;
  }
  if (!entry.is_wanted) {
    return found ? DropUnwanted(file) : SQLITE_OK;
  }
  if (found) {
    return file.identity == entry.identity ? TakeInKnown(entry, file) : TakeInChanged(entry, file);
  }

  file.identity = entry.identity;
  file.ctime = entry.ctime;
  file.kind = entry.kind;
  file.reread = entry.reread;
  return table->Insert(file);
}

// A rename, a new link and a change of mode move the change time, too: only what somebody wrote to
// is read once more. A name that tells nothing does not take away what another one told.
int ContentsWriter::Impl::TakeInKnown(const FollowedEntry& entry, const ContentFile& file) {
  ContentFile now = file;
  bool again = entry.reread > file.reread;
  if (again) {
    // Its bytes may be others: what was read of them goes if they cannot be read.
    now.extractor = KEPT_OUT;
  }
  now.reread = std::max(file.reread, entry.reread);
  now.ctime = std::max(now.ctime, entry.ctime);
  RegainEntry(file, now);
  if (file.kind == Kind::OTHER && entry.kind != Kind::OTHER) {
    now.kind = entry.kind;
    again = again || (file.state == ContentState::DONE && file.found_kind == Kind::OTHER);
  }
  if (!again) {
    const int code = JudgeFound(file, now, again);
    if (code != SQLITE_OK) {
      return code;
    }
  }
  if (again) {
    WaitAnew(now);
    const auto handed = out.find(file.id);
    if (handed != out.end()) {
      handed->second.is_stale = true;
    }
  }
  const bool same = now.ctime == file.ctime && now.kind == file.kind && !again &&
                    file.unreferred_since == 0 && now.extractor == file.extractor;
  return same ? SQLITE_OK : table->Update(file, now);
}

// An entry refers to it. What older readers read while none did was passed over when all else was
// read anew.
void ContentsWriter::Impl::RegainEntry(const ContentFile& file, ContentFile& now) {
  if (file.unreferred_since != 0 && IsAged(file)) {
    table->meta.extractor = file.extractor;
    renewed = std::min(renewed, file.id - 1);
  }
  now.unreferred_since = 0;
}

// Of a file whose name tells no kind, settings may want what was found by now, or not any more.
int ContentsWriter::Impl::JudgeFound(const ContentFile& file, ContentFile& now, bool& again) {
  const bool waits = file.state == ContentState::WAITING || file.state == ContentState::UNREAD;
  if (waits && file.text == 0 && file.extractor == KEPT_OUT) {
    return SQLITE_OK;
  }
  bool is_kept = true;
  const int code = IsKept(file, file.found_kind, is_kept);
  if (code != SQLITE_OK || (waits ? is_kept : is_kept == (file.extractor != KEPT_OUT))) {
    return code;
  }
  again = is_kept && file.state != ContentState::QUARANTINED;
  now.extractor = KEPT_OUT;
  if (is_kept) {
    return SQLITE_OK;
  }
  SettleKeptOut(now);
  const int settled = now.state == ContentState::DONE ? table->SetReason(file.id, "") : SQLITE_OK;
  return settled == SQLITE_OK ? table->SetContent(file, OfKind(file.found_kind), now) : settled;
}

int ContentsWriter::Impl::IsKept(const ContentFile& file, Kind found, bool& is_kept) {
  is_kept = true;
  if (settings == nullptr || file.kind != Kind::OTHER || found == Kind::OTHER) {
    return SQLITE_OK;
  }
  std::vector<std::string> paths;
  const int code = entries.Paths(file.identity, paths);
  is_kept = paths.empty() || std::any_of(paths.begin(), paths.end(), [&](const auto& path) {
              const IndexedFolder* folder = settings->FolderOfPath(path);
              return folder != nullptr && IsContentWanted(found, folder->wanted);
            });
  return code;
}

// The row follows the file: what was read of its old bytes goes at once.
int ContentsWriter::Impl::TakeInChanged(const FollowedEntry& entry, const ContentFile& file) {
  // Of two links the one that was looked at earlier may still show the old state.
  if (entry.ctime < file.ctime) {
    Reference reference = Reference::NONE;
    const int code = entries.Refer(file.identity, reference);
    if (code != SQLITE_OK || reference == Reference::WANTED) {
      return code;
    }
  }

  ContentFile now = file;
  now.identity = entry.identity;
  now.ctime = entry.ctime;
  now.kind = entry.kind;
  now.reread = std::max(file.reread, entry.reread);
  now.extractor = 0;
  now.unreferred_since = 0;
  WaitAnew(now);
  int code = table->SetContent(file, Content(), now);
  code = code == SQLITE_OK ? table->SetReason(file.id, "") : code;
  return code == SQLITE_OK ? table->Update(file, now) : code;
}

int ContentsWriter::Impl::DropUnwanted(const ContentFile& file) {
  Reference reference = Reference::NONE;
  const int code = entries.Refer(file.identity, reference);
  return code == SQLITE_OK && reference == Reference::UNWANTED ? Remove(file) : code;
}

bool ContentsWriter::Impl::Sweep(int64_t now, size_t limit, bool& more) {
  more = false;
  if (!Ready() || !ReadyToFollow()) {
    return false;
  }

  std::vector<ContentFile> files;
  int code = table->Unreferred(now - DAY, static_cast<int64_t>(limit), files);
  more = files.size() == limit;
  for (size_t i = 0; i < files.size() && code == SQLITE_OK && !IsFull(); ++i) {
    code = SweepFile(files[i], now);
  }
  if (code != SQLITE_OK || more || IsFull() || !is_sweeping) {
    more = more || IsFull();
    return Done(code);
  }

  const auto left = static_cast<int64_t>(limit - files.size());
  code = table->Slice(swept, left, files);
  more = static_cast<int64_t>(files.size()) == left;
  for (size_t i = 0; i < files.size() && code == SQLITE_OK; ++i) {
    if (IsFull()) {
      more = true;
      break;
    }
    code = SweepFile(files[i], now);
    swept = files[i].id;
  }
  has_passed = table->changed;
  is_sweeping = more;
  return Done(code);
}

int ContentsWriter::Impl::SweepFile(const ContentFile& file, int64_t now) {
  Reference reference = Reference::NONE;
  const int code = entries.Refer(file.identity, reference);
  if (code != SQLITE_OK) {
    return code;
  }
  if (reference == Reference::UNWANTED) {
    return Remove(file);
  }

  ContentFile changed = file;
  if (reference == Reference::WANTED) {
    RegainEntry(file, changed);
  } else if (file.unreferred_since == 0 || file.unreferred_since > now) {
    changed.unreferred_since = now;
  } else if (now - file.unreferred_since >= DAY) {
    return Remove(file);
  }
  return changed.unreferred_since == file.unreferred_since ? SQLITE_OK
                                                           : table->Update(file, changed);
}

}  // namespace fileindexd
