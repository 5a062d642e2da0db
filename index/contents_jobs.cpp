// SPDX-License-Identifier: GPL-2.0-or-later
// What waits is handed out, and taken back when it ended.
#include <algorithm>
#include <utility>

#include "index/contents_writer_impl.h"

namespace fileindexd {

namespace {

// What was in flight at so many deaths of the service is read alone: only so does another one tell
// who it was.
constexpr int64_t SUSPECT_DEATHS = 2;
constexpr int64_t SLACK = 64;  // rows that wait and turn out to be of no file any more
constexpr int ROUNDS = 8;
constexpr int64_t MOST_LOOKED = 1000;  // rows in one go
constexpr size_t MOST_RENEWED = 64;    // at once
constexpr size_t MOST_UNREAD = 4;      // at once

}  // namespace

bool ContentsWriter::Impl::NextJobs(size_t limit, std::vector<ContentJob>& jobs, bool& more) {
  jobs.clear();
  more = false;
  if (!Ready() || !ReadyToFollow()) {
    return false;
  }

  Round round = BeginRound(limit);
  for (int i = 0; i < ROUNDS && round.dropped && jobs.size() < limit && !IsFull(); ++i) {
    round.dropped = false;
    std::vector<ContentFile> rows;
    int code = table->WaitingNew(round.most, extractor, rows);
    code = code == SQLITE_OK ? OfferSome(rows, round, jobs) : code;
    if (code != SQLITE_OK) {
      return Done(code);
    }
  }
  is_suspect_held = round.held;
  more = round.dropped || jobs.size() >= limit;
  return true;
}

// A suspect that waits to be alone would wait for all of these.
bool ContentsWriter::Impl::NextAgain(int64_t now, size_t limit, std::vector<ContentJob>& jobs,
                                     bool& more) {
  jobs.clear();
  more = false;
  if (!Ready() || !ReadyToFollow()) {
    return false;
  }
  if (is_suspect_held) {
    return true;
  }

  Round round = BeginRound(limit);
  int code = OfferUnread(now, round, jobs);
  if (code != SQLITE_OK) {
    return Done(code);
  }
  const bool more_are_due = (!jobs.empty() || round.dropped) && unread_due <= now;
  bool has_more = true;
  for (int i = 0; i < ROUNDS && has_more && jobs.size() < limit && !IsFull(); ++i) {
    round.dropped = false;
    std::vector<ContentFile> rows;
    code = table->WaitingAgain(round.most, extractor, rows);
    code = code == SQLITE_OK ? OfferSome(rows, round, jobs) : code;
    has_more = round.dropped;
    if (code == SQLITE_OK && !round.dropped && !round.held && jobs.size() < limit) {
      code = Renew(now, has_more);
    }
    if (code != SQLITE_OK) {
      return Done(code);
    }
  }
  more = has_more || more_are_due || jobs.size() >= limit;
  return true;
}

ContentsWriter::Impl::Round ContentsWriter::Impl::BeginRound(size_t limit) const {
  Round round;
  round.limit = limit;
  round.most = static_cast<int64_t>(limit + out.size() + released.size()) + SLACK;
  round.company = Begun();
  round.dropped = true;
  return round;
}

// A few of those that are due: each may hold its reader up for long. What is handed out stays due
// on disk: a kill must not put it off.
int ContentsWriter::Impl::OfferUnread(int64_t now, Round& round, std::vector<ContentJob>& jobs) {
  std::vector<ContentFile> rows;
  const auto most = static_cast<int64_t>(MOST_UNREAD + out.size());
  int code = unread_due <= now ? table->UnreadDue(now, most, rows) : SQLITE_OK;
  const size_t limit = std::exchange(round.limit, std::min(round.limit, MOST_UNREAD));
  round.dropped = false;
  code = code == SQLITE_OK ? OfferSome(rows, round, jobs) : code;
  round.limit = limit;
  return code == SQLITE_OK ? FollowUnread() : code;
}

// Until it is known what became of one that is handed out, it is not due again.
int ContentsWriter::Impl::FollowUnread() {
  return table->NextDue([this](int64_t file) { return out.contains(file); }, unread_due);
}

int ContentsWriter::Impl::OfferSome(std::vector<ContentFile>& rows, Round& round,
                                    std::vector<ContentJob>& jobs) {
  // What was given back goes last: it may be given back again at once.
  std::stable_partition(rows.begin(), rows.end(),
                        [this](const ContentFile& file) { return !released.contains(file.id); });
  Company& company = round.company;
  int code = SQLITE_OK;
  for (size_t i = 0; i < rows.size() && code == SQLITE_OK && jobs.size() < round.limit; ++i) {
    const bool is_suspect = rows[i].unended >= SUSPECT_DEATHS;
    if (out.contains(rows[i].id) || company.suspect) {
      continue;
    }
    if (is_suspect && company.any) {
      round.held = true;
      continue;
    }
    code = Offer(rows[i], jobs, round.dropped);
    company.any = company.any || !jobs.empty();
    company.suspect = is_suspect && !jobs.empty();
  }
  return code;
}

// Makes a few of what older readers read, or failed at, wait: no other ones do. What was read
// stays, and is found, until it is read anew. What has no entry may be about to get one back.
int ContentsWriter::Impl::Renew(int64_t now, bool& more) {
  more = false;
  if (table->meta.extractor == extractor) {
    return SQLITE_OK;
  }
  std::vector<ContentFile> files;
  int code = table->Slice(renewed, MOST_LOOKED, files);
  size_t begun = 0;
  for (size_t i = 0; i < files.size() && code == SQLITE_OK && begun < MOST_RENEWED; ++i) {
    renewed = files[i].id;
    if (IsAged(files[i]) && files[i].unreferred_since == 0) {
      code = RenewFile(files[i], now);
      ++begun;
    }
  }
  if (code == SQLITE_OK && files.empty()) {
    table->meta.extractor = extractor;
    code = table->Begin();
  }
  more = !files.empty();
  return code;
}

int ContentsWriter::Impl::RenewFile(const ContentFile& file, int64_t now) {
  Reference reference = Reference::NONE;
  const int code = entries.Refer(file.identity, reference);
  if (code != SQLITE_OK) {
    return code;
  }
  ContentFile changed = file;
  if (reference == Reference::WANTED) {
    WaitAnew(changed);
  } else {
    changed.unreferred_since = now;
  }
  return table->Update(file, changed);
}

ContentsWriter::Impl::Company ContentsWriter::Impl::Begun() const {
  Company company;
  for (const auto& [id, handed] : out) {
    company.any = company.any || handed.is_begun;
    company.suspect = company.suspect || (handed.is_begun && handed.is_suspect);
  }
  return company;
}

int ContentsWriter::Impl::Offer(const ContentFile& file, std::vector<ContentJob>& jobs,
                                bool& dropped) {
  ContentJob job;
  int code = entries.Paths(file.identity, job.paths);
  if (code != SQLITE_OK) {
    return code;
  }
  if (!job.paths.empty()) {
    job.file = file.id;
    job.identity = file.identity;
    job.kind = file.kind;
    job.tries = file.tries + file.unended;
    out[file.id] = {.identity = file.identity, .is_suspect = file.unended >= SUSPECT_DEATHS};
    released.erase(file.id);
    jobs.push_back(std::move(job));
    return SQLITE_OK;
  }

  // No entry waits for it. Whatever stands for that file now is taken in anew.
  dropped = true;
  FollowedEntry latest;
  bool found = false;
  code = entries.Latest(file.identity.inode, file.identity.birth_time, latest, found);
  if (code == SQLITE_OK && !found && WasReadByOlder(file)) {
    return PutAside(file);
  }
  code = code == SQLITE_OK ? Remove(file) : code;
  return code == SQLITE_OK && found ? TakeInEntry(latest) : code;
}

// Its entry may be about to come back, and then what was read stands for it until it is read anew.
int ContentsWriter::Impl::PutAside(const ContentFile& file) {
  released.erase(file.id);
  ContentFile aside = file;
  aside.state = ContentState::DONE;
  aside.tries = 0;
  aside.unended = 0;
  aside.unreferred_since = Now();
  const int code = table->SetReason(file.id, "");
  return code == SQLITE_OK ? table->Update(file, aside) : code;
}

int ContentsWriter::Impl::Remove(const ContentFile& file) {
  released.erase(file.id);
  return table->Remove(file);
}

bool ContentsWriter::Impl::BeginTries(const std::vector<int64_t>& files) {
  if (!Ready()) {
    return false;
  }
  size_t in_flight = files.size();
  for (const auto& [id, handed] : out) {
    in_flight += handed.is_begun ? 1 : 0;
  }
  const int64_t begun = in_flight == 1 ? 1 : 2;

  int code = SQLITE_OK;
  if (begun == 2 && alone != 0) {
    code = MarkBegun(alone, begun);
  }
  for (size_t i = 0; i < files.size() && code == SQLITE_OK; ++i) {
    code = MarkBegun(files[i], begun);
    const auto handed = out.find(files[i]);
    if (handed != out.end()) {
      handed->second.is_begun = true;
    }
  }
  alone = begun == 1 ? files.front() : 0;
  return Done(code) && Commit();
}

int ContentsWriter::Impl::MarkBegun(int64_t id, int64_t begun) {
  ContentFile file;
  bool found = false;
  const int code = table->FindById(id, file, found);
  if (code != SQLITE_OK || !found) {
    return code;
  }
  ContentFile marked = file;
  marked.begun = begun;
  return table->Update(file, marked);
}

int ContentsWriter::Impl::TakeBack(int64_t id, ContentFile& file, bool& found, bool& current) {
  const auto handed = out.find(id);
  found = false;
  current = false;
  if (handed == out.end()) {
    return SQLITE_OK;
  }
  const HandedOut was = handed->second;
  out.erase(handed);
  alone = alone == id ? 0 : alone;
  const int code = table->FindById(id, file, found);
  current = found && was.identity == file.identity && !was.is_stale;
  return code;
}

}  // namespace fileindexd
