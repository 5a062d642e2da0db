// SPDX-License-Identifier: GPL-2.0-or-later
// Reading one share's contents, by whoever likes to; never hinders the writer.
#pragma once

#include <array>
#include <cstdint>
#include <functional>
#include <string>

#include "base/content.h"
#include "index/database.h"
#include "index/entry.h"

namespace fileindexd {

struct ContentCounts {
  struct OfKind {
    uint64_t waiting = 0;
    uint64_t done = 0;
    uint64_t failed = 0;
  };
  std::array<OfKind, 5> kinds;  // by Kind, folders left out
  OfKind all;
  uint64_t done_last_minute = 0;
};

struct FailedContent {
  std::string path;  // of one entry of that file
  std::string reason;
  int64_t tries = 0;
};

struct ContentReading {
  int64_t extractor = 0;  // version of the readers that read it last; 0: none did
  int64_t tries = 0;      // that ended with the death of the reader
};

// Attaches the share's contents to its open entries as "contents", with all that questions need.
// PATH_NOT_FOUND: nothing was read out of the share's files yet. The entries stay usable whatever
// comes.
IndexError AttachContents(IndexDatabase& entries, const std::string& share_name);

class ContentsReader {
 public:
  // PATH_NOT_FOUND: nothing was read out of the share's files yet.
  IndexError Open(const std::string& share_name);

  bool Count(ContentCounts& counts);
  bool ForEachFailed(const std::function<bool(const FailedContent&)>& visit);
  // Whether there is any for the entry. NONE, or why that cannot be told.
  IndexError LookFor(const Entry& entry, bool& is_there);
  // The content that stands for the entry: state in words ("waiting", "done", "failed"), and the
  // reason of a failure. False when there is none, or reading failed.
  bool Find(const Entry& entry, Content& content, std::string& state, std::string& reason);
  // How it was read. False as above.
  bool FindReading(const Entry& entry, ContentReading& reading);
  // Whose word forms its words were cut to; NO_LANGUAGE where that is not to be had.
  std::string Language();

  IndexDatabase entries;  // with the contents attached as "contents"
};

}  // namespace fileindexd
