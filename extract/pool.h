// SPDX-License-Identifier: GPL-2.0-or-later
// The pool of closed helpers: hands files to them and takes what they found.
//
// One thread. Nothing here waits: the caller polls the pool's descriptors with its own, calls Work
// when one of them is ready or the deadline has come, and gets the outcomes. A helper that crashes,
// is too slow, too big, or answers nonsense is killed and replaced; its job ends as KILLED.
#pragma once

#include <poll.h>

#include <chrono>
#include <cstdint>
#include <memory>
#include <string>
#include <vector>

#include "base/content.h"
#include "base/scoped_fd.h"

namespace fileindexd {

struct ExtractJob {
  uint64_t id = 0;                 // the caller's
  std::shared_ptr<ScopedFd> file;  // open for reading; let go when the job has ended
  std::string name;                // last component of its path
};

struct ExtractOutcome {
  enum class Result {
    DONE,
    FAILED,  // the file's fault: `reason`; `content` holds what was found before
    KILLED,  // the helper died over it: `reason`
    LOST,    // the host's fault (no process, no memory): try again later; `reason`
    UNREAD,  // the disk's fault, which did not give the file's bytes: the same, but others go on
  };
  uint64_t id = 0;
  Result result = Result::LOST;
  Content content;
  std::string reason;  // one line, for an administrator
};

struct PoolOptions {
  unsigned helpers = 1;
  size_t text_cap = 1 << 20;  // bytes of text kept of a document
  // For one document, from when a helper has it; then the helper is killed. One that got less than
  // a quarter of it as processor time was held up by the host, or by the file's disk, and the
  // document is begun again with a deadline of its own: twice at most, so that no document keeps a
  // place among the helpers for longer than three deadlines.
  std::chrono::milliseconds deadline{60'000};
  std::string program;  // fileindex-extract's path
};

class ExtractPool {
 public:
  // Checks that the program is there; starts helpers only when jobs come. None on failure, and
  // `error` then says why.
  static std::unique_ptr<ExtractPool> Open(const PoolOptions& options, std::string& error);
  ~ExtractPool();  // kills what runs
  ExtractPool(const ExtractPool&) = delete;
  ExtractPool& operator=(const ExtractPool&) = delete;

  // How many more jobs are taken now: idle helpers and one waiting job for each.
  size_t Room() const;
  size_t Running() const;  // jobs taken and not ended
  void Submit(ExtractJob&& job);

  void AddPolled(std::vector<pollfd>& polled) const;
  // When Work wants to be called even though nothing is ready; max() without running jobs.
  std::chrono::steady_clock::time_point Due() const;
  std::vector<ExtractOutcome> Work(
      std::chrono::steady_clock::time_point now = std::chrono::steady_clock::now());

  // Kills the helpers; running jobs end without outcome. For pauses.
  void Abort();

  // Formats that the host's kernel keeps us from reading safely, in words; empty: none.
  std::string LeftOut() const;

 private:
  struct Impl;
  explicit ExtractPool(std::unique_ptr<Impl> opened);
  std::unique_ptr<Impl> impl;
};

// Of the readers as a whole: a higher one reads anew what failed, and later, what was read.
constexpr int64_t EXTRACTOR_VERSION = 6;

}  // namespace fileindexd
