// SPDX-License-Identifier: GPL-2.0-or-later
// Appends to one share's queue file without ever waiting, and never beyond QUEUE_LINE_LIMIT lines:
// for whoever has more lines than the daemon takes at once, and time.
//
// Knows how many lines the file holds: those of a file that it meets are counted once, later only
// what others have appended. One thread.
#pragma once

#include <sys/types.h>

#include <cstdint>
#include <functional>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "base/scoped_fd.h"

namespace fileindexd {

enum class Appended {
  DONE,    // all that was given is in the file
  LOCKED,  // by another program; it lasts some milliseconds, mostly
  FULL,    // until the daemon takes the file
  FAILED,
};

class QueueAppender {
 public:
  // Called with each line that another program has written into the file that lines are about to be
  // given to, once, in their order. (Where the last has no newline it comes again, with ours behind
  // it, as do lines after a failure to read.)
  using Meet = std::function<void(std::string_view line)>;

  explicit QueueAppender(std::string name_of_share, Meet meet_line = {})
      : share_name(std::move(name_of_share)), meet(std::move(meet_line)) {}

  // Asks `give`, with the file locked, for at most as many lines as it takes, at least one, and
  // appends them. Giving none means that those that there are do not fit: FULL. Unless the result
  // is DONE nothing was written; only after FAILED may `give` have been asked, and `error` tells.
  using Give = std::function<std::vector<std::string>(size_t most)>;
  Appended Append(const Give& give, std::string& error);

  // Whether the file that lines were counted in last stands still, and the daemon has not taken it.
  // Does not open it: every close of the file makes the daemon look.
  bool IsWaiting() const;

  // Of the file that lines were met in or given to last: another number, another file.
  uint64_t FileNumber() const { return file_number; }

 private:
  // The file whose lines are counted. An inode number may be given again to the next queue file;
  // its time of birth, or its being shorter, tells.
  struct Counted {
    dev_t device = 0;
    ino_t inode = 0;
    int64_t birth_time = 0;
    off_t size = 0;  // bytes that are counted
    off_t met = 0;   // bytes whose lines were met, or are ours
    uint64_t lines = 0;
    bool open_end = false;  // the last line has no newline yet
  };

  static bool Identify(int directory, const char* path, int flags, Counted& file);
  bool IsSameFile(const Counted& file) const;
  bool Count(const ScopedFd& locked, std::string& error);

  const std::string share_name;
  const Meet meet;
  Counted counted;
  uint64_t file_number = 0;
  ScopedFd waiting;  // opened while another program held the lock
};

}  // namespace fileindexd
