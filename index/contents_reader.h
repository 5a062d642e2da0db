// SPDX-License-Identifier: GPL-2.0-or-later
// Reading one share's contents, by whoever likes to; never hinders the writer.
#pragma once

#include <array>
#include <cstdint>
#include <functional>
#include <optional>
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
  uint64_t not_kept = 0;  // looked into, and of no kind that is read, or is wanted
  uint64_t done_last_minute = 0;
};

struct FailedContent {
  std::string path;  // of one entry of that file
  std::string reason;
  int64_t tries = 0;
};

// Words that are made anew for another language; those of the old one are found until that is done.
struct WordsProgress {
  std::string language;  // whose words are found
  std::string wanted;
  uint64_t done = 0;  // texts
  uint64_t total = 0;
};

// What is stored for an entry. Waiting where nothing was read yet, or nothing is wanted.
struct StoredContent {
  std::string state = "waiting";  // or "done", "failed"
  std::string reason;             // of a failure
  Content content;
  int64_t extractor = 0;  // version of the readers that read it last; 0: none did
  int64_t tries = 0;      // that ended with the death of the reader
  std::string language;   // whose word forms its words were cut to, NO_LANGUAGE for none; of what
                          // is not waiting
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
  // Of a share with that language: none when its words are those that are wanted. False when that
  // cannot be told.
  bool FindWordsProgress(const std::string& share_language, std::optional<WordsProgress>& progress);
  bool ForEachFailed(const std::function<bool(const FailedContent&)>& visit);
  // What stands for the entry: of one moment. NONE, or why that cannot be told.
  IndexError Find(const Entry& entry, StoredContent& stored);

  IndexDatabase entries;  // with the contents attached as "contents"

 private:
  // Tells who writes the contents.
  IndexError Failed(int code);
  // The same of SQLite's last error; false.
  bool Refuse();
  // Tells who writes the entries as well, for they were read beside the contents.
  bool RefuseBoth();

  std::string share;
};

}  // namespace fileindexd
