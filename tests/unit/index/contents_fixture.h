// SPDX-License-Identifier: GPL-2.0-or-later
// A share "s" whose contents are all wanted, and a writer of them.
#pragma once

#include <ctime>
#include <map>
#include <memory>
#include <string>
#include <vector>

#include "index/contents_reader.h"
#include "index/contents_writer.h"
#include "index/search.h"
#include "tests/unit/index/fixture.h"

namespace fileindexd {

class ContentsTest : public IndexTest {
 protected:
  void SetUp() override;

  Share TheShare();
  void OpenContents(int64_t extractor = 1);  // anew
  void UseSettings();                        // that are in the store
  void TakeIn();                             // all there is, and commits
  void Sweep(int64_t now);                   // all there is, and commits
  // Names of what is handed out, in order, what is new first; each stays handed out.
  Names Jobs(size_t limit = 100);
  Names NewJobs(size_t limit = 100);          // of these alone what is new
  ContentJob JobOf(const std::string& name);  // of what was handed out
  // Puts a file there, adds it to the entries, and takes it in.
  void File(const std::string& name, const std::string& bytes = "bytes");
  // The same but for taking it in, old enough that nothing else has that time.
  void OldFile(const std::string& name, time_t mtime, const std::string& bytes = "bytes");
  // The same, taken in and read, with "old" and its name as its text.
  void ReadOldFile(const std::string& name, time_t mtime, const std::string& bytes = "bytes");
  static void SetTime(const std::string& path, time_t mtime);
  // Other bytes in what OldFile(name, 1000) made, with the same size and time; added.
  void WriteHidden(const std::string& name);
  void Finish(const std::string& name, const std::string& text);
  // Hands out all that waits, and finishes each with its own name as its text.
  Names Read();
  // Whole paths of the hits of `question` with that text, in order; "error: " as below.
  Names Paths(const std::string& text);
  // Relative paths of the hits, in order; "error: " and the reason when it was refused.
  Names Hits(const std::string& text);
  Names Sorted(const std::string& text);  // the same, by name
  static std::vector<FailedContent> Listed();
  int64_t Number(const std::string& sql);  // an answer of the contents database
  // How many stored files hold that word.
  int64_t Holding(const std::string& word);

  Question question;
  Answer answer;
  std::unique_ptr<ContentsWriter> contents;
  Names Handed(const std::vector<ContentJob>& jobs);
  std::map<std::string, ContentJob> handed;  // by name
  int64_t clock = 2'000'000'000;             // seconds since the epoch
  bool more_jobs = false;                    // as the last Jobs was told
};

Content TextContent(const std::string& text);

}  // namespace fileindexd
