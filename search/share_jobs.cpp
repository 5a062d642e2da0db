// SPDX-License-Identifier: GPL-2.0-or-later
// The files of a share on their way to the helpers and back.
#include <fcntl.h>

#include <algorithm>
#include <utility>

#include "search/log.h"
#include "search/open_file.h"
#include "search/share_contents.h"
#include "state/filesystem.h"
#include "state/layout.h"

namespace fileindexd {

namespace {

using std::chrono::milliseconds;
using std::chrono::seconds;

// Each batch is put on record by one commit. It grows while files are quick, so that commits are
// rare, and shrinks while they are slow, so that what is newer need not wait behind it.
constexpr milliseconds QUICK_BATCH(250);
constexpr milliseconds SLOW_BATCH(1000);

constexpr seconds FIRST_PATIENCE(2);
constexpr seconds LONGEST_PATIENCE(300);
constexpr size_t MOST_PATIENT = 4096;

}  // namespace

bool ShareContents::MayHaveJobs(Time now) const {
  return writer.IsOpen() && CanWork(now) &&
         (!ready.empty() || (may_have_jobs && patient.size() < MOST_PATIENT));
}

bool ShareContents::Next(Time now, uint64_t id, ExtractJob& job) {
  if (!MayHaveJobs(now) || (ready.empty() && !Refill(now))) {
    return false;
  }

  Ready& next = ready.front();
  Running& begun = running[id];
  begun.file = next.job.file;
  begun.identity = next.job.identity;
  ScopedFd same(fcntl(next.file.fd, F_DUPFD_CLOEXEC, 0));
  begun.open.Swap(same);

  job.id = id;
  job.file.Swap(next.file);
  job.name = std::move(next.name);
  ready.pop_front();
  return true;
}

bool ShareContents::Refill(Time now) {
  if (!HasSpace(StateRoot(), false)) {
    (void)IsFit(now);
    return false;
  }
  AdaptBatch(now);
  std::vector<ContentJob> jobs;
  if (!writer.NextJobs(batch, jobs, may_have_jobs)) {
    RestForError(now);
    return false;
  }

  root_suspect = false;
  for (ContentJob& job : jobs) {
    OpenJob(std::move(job), now);
    if (!writer.IsOpen()) {
      return false;
    }
  }
  // Files that are not what the index knows: is it the share at all?
  if (root_suspect && !IsFit(now)) {
    return false;
  }
  if (!ready.empty() && !BeginTries()) {
    RestForError(now);
    return false;
  }
  return !ready.empty();
}

void ShareContents::AdaptBatch(Time now) {
  const auto took = now - refilled;
  if (batch == 0 || took > SLOW_BATCH) {
    batch /= 2;
  } else if (took < QUICK_BATCH) {
    batch *= 2;
  }
  batch = std::clamp(batch, SMALLEST_BATCH, std::max(largest_batch, SMALLEST_BATCH));
  refilled = now;
}

// By the first of its names under which it is there.
void ShareContents::OpenJob(ContentJob&& job, Time now) {
  const auto known = patience.find(job.file);
  if (known != patience.end() && now < known->second.until) {
    patient.emplace(known->second.until, job.file);
    return;
  }

  Opening outcome = Opening::CHANGED;
  std::string reason;
  for (const std::string& path : job.paths) {
    ScopedFd file;
    const Opening opened = OpenFile(share, path, job.identity, file, reason);
    if (opened == Opening::DONE) {
      Ready& next = ready.emplace_back();
      next.file.Swap(file);
      next.name = path.substr(path.rfind('/') + 1);
      next.job = std::move(job);  // `path` with it
      return;
    }
    outcome = std::max(outcome, opened);  // of all its names, the one that promises most
  }

  if (outcome == Opening::REFUSED) {
    if (!writer.Fail(job.file, reason, {}, false)) {
      RestForError(now);
    }
    return;
  }
  if (outcome == Opening::LATER) {
    ServiceDebug("Share[%s] a file waits, reason=%s", share.name.c_str(), reason.c_str());
  }
  root_suspect = true;
  BePatient(job.file, now);
  patient.emplace(patience[job.file].until, job.file);
}

bool ShareContents::BeginTries() {
  std::vector<int64_t> files;
  files.reserve(ready.size());
  for (const Ready& one : ready) {
    files.push_back(one.job.file);
  }
  if (!writer.BeginTries(files)) {
    return false;
  }
  first_change.reset();
  return true;
}

void ShareContents::BePatient(int64_t file, Time now) {
  if (patience.size() >= MOST_PATIENT) {
    std::erase_if(patience, [now](const auto& one) { return one.second.until <= now; });
  }
  Patience& patient_with = patience[file];
  patient_with.rest = std::clamp(patient_with.rest * 2, FIRST_PATIENCE, LONGEST_PATIENCE);
  patient_with.until = now + patient_with.rest;
}

void ShareContents::End(ExtractOutcome&& outcome, Time now) {
  const auto found = running.find(outcome.id);
  if (found == running.end()) {
    return;
  }
  const int64_t file = found->second.file;
  const bool is_still = IsStill(found->second.open.fd, found->second.identity);
  running.erase(found);
  last_end = now;

  bool good = false;
  if (outcome.result == ExtractOutcome::Result::LOST || !is_still) {
    BePatient(file, now);
    good = writer.Release(file);
  } else {
    patience.erase(file);
    switch (outcome.result) {
      case ExtractOutcome::Result::DONE:
        good = writer.Finish(file, outcome.content);
        break;
      case ExtractOutcome::Result::FAILED:
        good = writer.Fail(file, outcome.reason, outcome.content, false);
        break;
      default:
        good = writer.Fail(file, outcome.reason, {}, true);
        break;
    }
  }
  if (!good || !CommitIfDue(now)) {
    RestForError(now);
    return;
  }
  may_have_jobs = true;  // it may wait again, or another have waited for its end
  may_merge = true;
}

}  // namespace fileindexd
