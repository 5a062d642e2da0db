// SPDX-License-Identifier: GPL-2.0-or-later
#include "bench/question_fill.h"

#include <filesystem>
#include <fstream>
#include <memory>
#include <optional>
#include <vector>

#include "bench/bare_index.h"
#include "bench/bare_questions.h"
#include "bench/measure.h"
#include "index/contents_writer.h"
#include "state/filesystem.h"
#include "state/layout.h"
#include "state/store.h"

namespace fileindexd {

namespace {

constexpr size_t TAKEN_IN = 1000;   // entries at once, as the content service does
constexpr size_t HANDED_OUT = 256;  // texts at once

void Check(bool ok, const std::string& what) {
  if (!ok) {
    Fail("cannot " + what);
  }
}

Share MakeShare(const QuestionCorpus& corpus, uint64_t number) {
  std::string error;
  const std::string root = corpus.Root(number);
  std::filesystem::create_directories(root);
  const Share share = {QuestionCorpus::Share(number), root, FilesystemIdentity(root)};
  const auto store = StateStore::Open(error);
  Check(store != nullptr && MakeShareFolder(share.name, error) && store->AddShare(share) &&
            store->AddFolder(root, {}),
        "make the share " + share.name + ": " + error);
  std::filesystem::create_directory(IndexPath(share.name));
  return share;
}

// In commits as the daemon makes them, so that the tables have as many segments.
void FillEntries(const QuestionCorpus& corpus, uint64_t share, BareWriter& bare,
                 std::ofstream& names) {
  BareEngine engine(IndexPath(QuestionCorpus::Share(share)));
  for (uint64_t number = 0; number < corpus.count; ++number) {
    if (corpus.ShareOf(number) != share) {
      continue;
    }
    const Entry entry = corpus.EntryOf(number);
    engine.Put(entry);
    engine.CountChange();
    std::optional<Content> content;
    if (corpus.HasText(number)) {
      content = corpus.TextOf(number);
    }
    bare.Put(static_cast<int64_t>(number) + 1, entry, content.has_value() ? &*content : nullptr);
    names << LastComponent(entry.path) << '\n';
  }
  engine.CommitAndClose();
}

void FillContents(const QuestionCorpus& corpus, const Share& share) {
  const std::string what = "write the contents of " + share.name;
  ContentsWriter writer;
  Check(writer.Open(share, 1) == IndexError::NONE, what);
  for (bool more = true; more;) {
    Check(writer.TakeIn(TAKEN_IN, more) && writer.Commit(), what);
  }
  std::vector<ContentJob> jobs;
  for (bool more = true; more || !jobs.empty();) {
    Check(writer.NextJobs(HANDED_OUT, jobs, more), what);
    for (const ContentJob& job : jobs) {
      const uint64_t number = corpus.NumberOfInode(job.identity.inode);
      Check(writer.Finish(job.file, corpus.TextOf(number)), what);
      if (writer.PendingBytes() >= ContentsWriter::ENOUGH_PENDING) {
        Check(writer.Commit(), what);
      }
    }
  }
  Check(writer.Commit(), what);
}

}  // namespace

void FillQuestions(const QuestionCorpus& corpus, const std::string& bare_folder,
                   const std::string& names_file) {
  std::filesystem::create_directory(bare_folder);
  BareWriter bare(bare_folder);
  std::ofstream names(names_file);
  for (uint64_t number = 0; number < QUESTION_SHARES; ++number) {
    const Share share = MakeShare(corpus, number);
    FillEntries(corpus, number, bare, names);
    FillContents(corpus, share);
  }
  bare.Commit();
  names.close();
  Check(names.good(), "write " + names_file);
}

}  // namespace fileindexd
