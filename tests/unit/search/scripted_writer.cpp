// SPDX-License-Identifier: GPL-2.0-or-later
#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/stat.h>

#include <algorithm>
#include <set>
#include <utility>

#include "tests/unit/search/scripted.h"

namespace fileindexd {

struct ContentsWriter::Impl {
  ScriptedContents* contents = nullptr;  // null: nothing was opened since it was closed
  bool is_open = false;                  // what fails closes it, but it still knows what is out
  int64_t extractor = 0;
  bool changed = false;
  bool entries_go = false;
  std::set<int64_t> out;  // given out and not ended
  IndexError error = IndexError::NONE;

  // False when the test wants this call to fail.
  bool Call(const std::string& name, const std::string& about = "") {
    EXPECT_FALSE(IsSideWorkRunning()) << name << " while another thread has the writer";
    contents->calls.push_back(about.empty() ? name : name + " " + about);
    const auto found = contents->failing.find(name);
    if (found != contents->failing.end()) {
      error = found->second;
      is_open = changed = false;
      contents->pending_bytes = 0;
    }
    return is_open;
  }

  // Those that fulfil the condition, and are not out.
  template <typename Condition>
  void Offer(size_t limit, std::vector<ContentJob>& jobs, const Condition& is_offered) {
    for (const auto& [row, file] : contents->now) {
      if (jobs.size() < limit && is_offered(file) && out.insert(row).second) {
        jobs.push_back(file.job);
        jobs.back().file = row;
      }
    }
  }

  bool End(const char* name, int64_t file, ScriptedFile::State state, const std::string& text) {
    if (!Call(name, std::to_string(file))) {
      return false;
    }
    ScriptedFile& row = contents->now[file];
    row.state = state;
    row.text = text;
    row.extractor = extractor;
    out.erase(file);
    changed = true;
    return true;
  }
};

namespace {

std::map<std::string, ScriptedContents>& All() {
  static std::map<std::string, ScriptedContents> all;
  return all;
}

}  // namespace

ScriptedContents& Scripted(const std::string& share) {
  return All()[share];
}

void ForgetScripted() {
  for (auto& [share, contents] : All()) {
    contents = {};  // writers may still know it
  }
}

FileIdentity IdentityOf(const std::string& path) {
  struct statx st {};
  EXPECT_EQ(
      statx(AT_FDCWD, path.c_str(), AT_SYMLINK_NOFOLLOW, STATX_BASIC_STATS | STATX_BTIME, &st), 0);
  const auto nanoseconds = [](const statx_timestamp& time) {
    return static_cast<int64_t>(time.tv_sec) * 1'000'000'000 + time.tv_nsec;
  };
  const int64_t birth = (st.stx_mask & STATX_BTIME) != 0 ? nanoseconds(st.stx_btime) : 0;
  return {st.stx_ino, birth, static_cast<int64_t>(st.stx_size), nanoseconds(st.stx_mtime)};
}

ContentsWriter::ContentsWriter() : impl(std::make_unique<Impl>()) {}
ContentsWriter::~ContentsWriter() = default;

IndexError ContentsWriter::Open(const Share& share, int64_t extractor_version) {
  impl->contents = &Scripted(share.name);
  impl->is_open = true;
  if (!impl->Call("Open")) {
    impl->entries_go = impl->contents->entries_go;
    impl->contents = nullptr;
    return impl->error;
  }
  impl->contents->now = impl->contents->kept;
  impl->extractor = extractor_version;
  for (auto& [row, file] : impl->contents->now) {
    if (file.state == ScriptedFile::State::FAILED && file.extractor < extractor_version) {
      file.state = ScriptedFile::State::WAITS;
    }
  }
  return IndexError::NONE;
}

void ContentsWriter::Close() {
  if (impl->contents != nullptr) {
    (void)impl->Call("Close");
  }
  *impl = Impl();
}

bool ContentsWriter::IsOpen() const {
  EXPECT_FALSE(IsSideWorkRunning());
  return impl->is_open;
}

bool ContentsWriter::AreEntriesBeingRemoved() const {
  return impl->entries_go;
}

void ContentsWriter::UseSettings(std::shared_ptr<const Settings> /*in_force*/) {
  EXPECT_FALSE(IsSideWorkRunning());
  if (impl->contents != nullptr) {
    impl->contents->calls.emplace_back("UseSettings");
  }
}

bool ContentsWriter::TakeIn(size_t /*limit*/, bool& more) {
  more = false;
  if (!impl->Call("TakeIn")) {
    return false;
  }
  for (const auto& [row, file] : impl->contents->entries) {
    impl->changed = impl->contents->now.emplace(row, file).second || impl->changed;
  }
  return true;
}

void ContentsWriter::LookAtAll() {
  (void)impl->Call("LookAtAll");
}

bool ContentsWriter::NextJobs(size_t limit, std::vector<ContentJob>& jobs, bool& more) {
  more = std::exchange(impl->contents->unseen, false);
  if (more) {
    return true;  // as if all that was looked at had no entry any more
  }
  if (!impl->Call("NextJobs", std::to_string(limit))) {
    return false;
  }
  impl->Offer(limit, jobs, [](const ScriptedFile& file) {
    return file.state == ScriptedFile::State::WAITS && !file.is_old;
  });
  more = jobs.size() >= limit;
  return true;
}

bool ContentsWriter::NextAgain(int64_t now, size_t limit, std::vector<ContentJob>& jobs,
                               bool& more) {
  if (!impl->Call("NextAgain")) {
    return false;
  }
  impl->Offer(std::min(limit, impl->contents->most_again), jobs, [now](const ScriptedFile& file) {
    return file.state == ScriptedFile::State::UNREAD
               ? file.due <= now
               : file.state == ScriptedFile::State::WAITS && file.is_old;
  });
  more = jobs.size() >= limit;
  return true;
}

int64_t ContentsWriter::UnreadDue() const {
  EXPECT_FALSE(IsSideWorkRunning());
  int64_t due = INT64_MAX;
  for (const auto& [row, file] : impl->contents->now) {
    if (file.state == ScriptedFile::State::UNREAD && !impl->out.contains(row)) {
      due = std::min(due, file.due);
    }
  }
  return due;
}

bool ContentsWriter::Unread(int64_t file, const std::string& reason, int64_t now) {
  impl->contents->now[file].due = now + UNREAD_PAUSE;
  return impl->End("Unread", file, ScriptedFile::State::UNREAD, reason);
}

bool ContentsWriter::BeginTries(const std::vector<int64_t>& files) {
  for (const int64_t file : files) {
    ++impl->contents->now[file].tries;
  }
  return impl->Call("BeginTries", std::to_string(files.size())) && Commit();
}

bool ContentsWriter::Finish(int64_t file, const PreparedContent& found) {
  impl->contents->pending_bytes += found.content.text.size();
  impl->contents->now[file].is_prepared = !found.packed.empty() && !found.cut_text.empty();
  return impl->End("Finish", file, ScriptedFile::State::DONE, found.content.text);
}

bool ContentsWriter::Fail(int64_t file, const std::string& reason, const Content& found,
                          bool killed) {
  impl->contents->now[file].found = found.text;
  const bool again = killed && impl->contents->now[file].tries < 2;
  return impl->End("Fail", file, again ? ScriptedFile::State::WAITS : ScriptedFile::State::FAILED,
                   reason);
}

bool ContentsWriter::Release(int64_t file) {
  int64_t& tries = impl->contents->now[file].tries;
  tries = tries > 0 ? tries - 1 : 0;
  return impl->End("Release", file, ScriptedFile::State::WAITS, "");
}

bool ContentsWriter::RetryFailed() {
  for (auto& [row, file] : impl->contents->now) {
    if (file.state != ScriptedFile::State::DONE) {
      file.state = ScriptedFile::State::WAITS;
    }
  }
  impl->changed = true;
  return impl->Call("RetryFailed");
}

bool ContentsWriter::Sweep(int64_t /*now*/, size_t /*limit*/, bool& more) {
  more = false;
  return impl->Call("Sweep");
}

bool ContentsWriter::Merge(bool& more) {
  more = impl->contents->unmerged > 0;
  impl->contents->unmerged -= more ? 1 : 0;
  return impl->Call("Merge");
}

void ContentsWriter::CutLog() {
  (void)impl->Call("CutLog");
}

bool ContentsWriter::HasChanges() const {
  EXPECT_FALSE(IsSideWorkRunning());
  return impl->changed;
}

size_t ContentsWriter::PendingBytes() const {
  EXPECT_FALSE(IsSideWorkRunning());
  return impl->contents->pending_bytes;
}

bool ContentsWriter::Commit() {
  if (!impl->Call("Commit")) {
    return false;
  }
  impl->contents->kept = impl->contents->now;
  impl->contents->pending_bytes = 0;
  impl->changed = false;
  return true;
}

IndexError ContentsWriter::Error() const {
  EXPECT_FALSE(IsSideWorkRunning());
  return impl->error;
}

}  // namespace fileindexd
