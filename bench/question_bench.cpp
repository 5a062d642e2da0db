// SPDX-License-Identifier: GPL-2.0-or-later
// Questions, in this process, to shares that are kept open: first hits with their snippets, against
// the bare engine's own queries for the same rows with the fetching of as many texts; very common
// words and orders of all entries against rarer words; pieces of names against plocate.
//
// Everything is in the page cache: each question has been asked before. Kinds of questions have
// several examples, which are asked in turns with the reference; the middle one of all times and
// the one that 95 of 100 are not above are compared.
#include <cstdio>
#include <cstdlib>
#include <string>
#include <utility>
#include <vector>

#include "bench/bare_questions.h"
#include "bench/locate_peer.h"
#include "bench/measure.h"
#include "bench/question_corpus.h"
#include "bench/question_fill.h"
#include "bench/scratch.h"
#include "index/search.h"

namespace fileindexd {

namespace {

constexpr uint64_t ENTRIES = 1000000;
constexpr int EXAMPLES = 10;
constexpr uint64_t RARE = 10;
constexpr uint64_t SOME = 1000;
constexpr uint64_t MANY = 10000;

struct Example {
  std::string text;
  BareQuestion bare;
};

struct QuestionKind {
  std::string name;
  std::vector<Example> examples;
};

class QuestionBench {
 public:
  QuestionBench(const ScratchFolder& in_scratch, uint64_t in_divisor);

  void Fill();
  void AgainstBare();
  void AgainstRarer();
  void AgainstLocate();

 private:
  void Plan();
  void PlanWords(const std::string& name, uint64_t in_entries, Place place);
  void PlanNarrowed();
  uint64_t InEntries(uint64_t size) const { return Scaled(size, divisor, 2); }
  Answer Ask(const std::string& text, SortBy sort, uint64_t limit, bool counts);
  double TimeOfFirst(const std::string& text, SortBy sort = SortBy::SCORE);
  void Compare(BareQuestions& bare, const QuestionKind& kind);
  void CompareOwn(const std::string& name, const std::vector<std::pair<std::string, SortBy>>& ours,
                  const std::vector<std::string>& reference, double target);

  const ScratchFolder& scratch;
  uint64_t divisor;
  QuestionCorpus corpus;
  std::vector<QuestionKind> kinds;
  std::vector<std::string> some_words;
  std::vector<std::string> many_words;
  Asker asker;
};

QuestionBench::QuestionBench(const ScratchFolder& in_scratch, uint64_t in_divisor)
    : scratch(in_scratch), divisor(in_divisor), corpus(Scaled(ENTRIES, in_divisor, 1000)) {
  corpus.above = scratch.path + "/shares";
  Plan();
}

void QuestionBench::PlanWords(const std::string& name, uint64_t in_entries, Place place) {
  QuestionKind& kind = kinds.emplace_back();
  kind.name = name;
  for (int i = 0; i < EXAMPLES; ++i) {
    const std::string word = corpus.PlantWord(InEntries(in_entries), place);
    kind.examples.push_back({word, {{word}, ""}});
  }
}

void QuestionBench::Plan() {
  const auto words_of = [this] {
    std::vector<std::string> words;
    for (const Example& example : kinds.back().examples) {
      words.push_back(example.text);
    }
    return words;
  };
  PlanWords("word in 10 entries", RARE, Place::ANYWHERE);
  PlanWords("word in 1,000 entries", SOME, Place::ANYWHERE);
  some_words = words_of();
  PlanWords("word in 10,000 entries", MANY, Place::ANYWHERE);
  many_words = words_of();
  PlanWords("word in 10,000 names", MANY, Place::NAMES);
  PlanWords("word in 10,000 texts", MANY, Place::TEXTS);
  QuestionKind pairs = {"two words, each in 10,000 entries", {}};
  QuestionKind phrases = {"phrase in 1,000 entries", {}};
  for (int i = 0; i < EXAMPLES; ++i) {
    const std::string pair = corpus.PlantPair(InEntries(MANY));
    const size_t blank = pair.find(' ');
    pairs.examples.push_back({pair, {{pair.substr(0, blank), pair.substr(blank + 1)}, ""}});
    const std::string phrase = corpus.PlantPhrase(InEntries(SOME));
    phrases.examples.push_back({phrase, {{phrase}, ""}});
  }
  kinds.push_back(std::move(pairs));
  kinds.push_back(std::move(phrases));
  PlanNarrowed();
}

// A year of one kind, and a folder.
void QuestionBench::PlanNarrowed() {
  QuestionKind dated = {"word in 10,000 with kind and date range", {}};
  QuestionKind below = {"word in 10,000 below a folder", {}};
  for (int i = 0; i < EXAMPLES; ++i) {
    const std::string& word = many_words[static_cast<size_t>(i)];
    dated.examples.push_back({word + " kind:document modified:2024-01-01..2024-12-31",
                              {{word},
                               "entries.kind = 1 AND entries.mtime >= 1704067200000000000 AND "
                               "entries.mtime < 1735689600000000000"}});
    const std::string folder = corpus.FolderOf(corpus.count * static_cast<uint64_t>(i) / EXAMPLES);
    below.examples.push_back(
        {word + " under:" + folder,
         {{word},
          "entries.path > CAST('" + folder + "/' AS BLOB) AND entries.path < CAST('" + folder +
              "0' AS BLOB)"}});
  }
  kinds.push_back(std::move(dated));
  kinds.push_back(std::move(below));
}

void QuestionBench::Fill() {
  FillQuestions(corpus, scratch.path + "/bare", scratch.path + "/names");
}

Answer QuestionBench::Ask(const std::string& text, SortBy sort, uint64_t limit, bool counts) {
  Question question;
  question.text = text;
  question.sort = sort;
  question.limit = limit;
  question.count_all = counts;
  for (uint64_t share = 0; share < QUESTION_SHARES; ++share) {
    question.shares.push_back(QuestionCorpus::Share(share));
  }
  Answer answer;
  std::string error;
  if (!asker.Ask(question, answer, error) || !answer.failures.empty()) {
    Fail(text + ": " + (answer.failures.empty() ? error : answer.failures.front()));
  }
  return answer;
}

// As fileindexctl asks: twenty hits, and no more looked at than that takes.
double QuestionBench::TimeOfFirst(const std::string& text, SortBy sort) {
  return TimeOf([&] { (void)Ask(text, sort, 20, false); });
}

void QuestionBench::Compare(BareQuestions& bare, const QuestionKind& kind) {
  for (const Example& example : kind.examples) {
    if (Ask(example.text, SortBy::SCORE, 0, true).total != bare.Ask(example.bare)) {
      Fail(example.text + ": the two sides found different rows");
    }
  }
  std::vector<double> ours;
  std::vector<double> reference;
  for (int round = 0; round <= ROUNDS; ++round) {
    for (const Example& example : kind.examples) {
      const double asking = TimeOfFirst(example.text);
      const double querying = TimeOf([&] { (void)bare.Ask(example.bare); });
      if (round > 0) {
        ours.push_back(asking);
        reference.push_back(querying);
      }
    }
  }
  PrintTimes(kind.name + ": median", Median(ours), Median(reference), 1.5);
  PrintTimes(kind.name + ": 95 %", Percentile95(ours), Percentile95(reference), 2);
}

void QuestionBench::AgainstBare() {
  BareQuestions bare(scratch.path + "/bare");
  for (const QuestionKind& kind : kinds) {
    Compare(bare, kind);
  }
}

void QuestionBench::CompareOwn(const std::string& name,
                               const std::vector<std::pair<std::string, SortBy>>& ours,
                               const std::vector<std::string>& reference, double target) {
  std::vector<double> of_ours;
  std::vector<double> of_reference;
  for (int round = 0; round <= ROUNDS; ++round) {
    for (size_t i = 0; i < reference.size(); ++i) {
      const auto& [text, sort] = ours[i % ours.size()];
      const double asking = TimeOfFirst(text, sort);
      const double referring = TimeOfFirst(reference[i]);
      if (round > 0) {
        of_ours.push_back(asking);
        of_reference.push_back(referring);
      }
    }
  }
  PrintTimes(name, Median(of_ours), Median(of_reference), target);
}

void QuestionBench::AgainstRarer() {
  CompareOwn("word in half of all entries / in 10,000", {{HALF_WORD, SortBy::SCORE}}, many_words,
             20);
  CompareOwn("all entries by size / word in 1,000", {{"is:file", SortBy::SIZE}}, some_words, 2);
  CompareOwn("all entries by date / word in 1,000", {{"is:file", SortBy::MODIFIED}}, some_words, 2);
}

void QuestionBench::AgainstLocate() {
  if (!LocatePeer::IsInstalled()) {
    return;
  }
  const LocatePeer peer(scratch.path + "/names", scratch.path);
  // Of common and of rare words, three letters and more.
  const std::string common = QuestionCorpus::VocabularyWord(1);
  const std::string rarer = QuestionCorpus::VocabularyWord(40);
  const std::string rare = QuestionCorpus::VocabularyWord(1500);
  std::vector<std::string> parts = {
      common.substr(1, 3), rarer.substr(2, 3),        rare.substr(1, 3),   common.substr(0, 4),
      rarer.substr(1, 4),  rare.substr(1, 4),         common.substr(1, 5), rarer.substr(0, 5),
      rare.substr(2, 5),   many_words[0].substr(1, 5)};
  std::vector<double> ours;
  std::vector<double> with_start;
  std::vector<double> start;
  for (int round = 0; round <= ROUNDS; ++round) {
    for (const std::string& part : parts) {
      const std::string text = "name:*" + part + "*";
      uint64_t total = 0;
      const double counting = TimeOf([&] { total = Ask(text, SortBy::SCORE, 0, true).total; });
      const double locating = peer.TimeOfCount(part);
      const double starting = peer.TimeOfStart(part);
      if (round == 0) {
        if (total != peer.Count(part)) {
          Fail(text + ": plocate counts otherwise");
        }
        continue;
      }
      ours.push_back(counting);
      with_start.push_back(locating);
      start.push_back(starting);
    }
  }
  PrintTimes("name:*part*, number of hits / plocate -c -i", Median(ours),
             Median(with_start) - Median(start), 1);
}

}  // namespace

}  // namespace fileindexd

int main(int argc, char** argv) {
  using namespace fileindexd;  // NOLINT(google-build-using-namespace): the program itself
  const uint64_t divisor = DivisorFrom(argc, argv);
  const ScratchFolder scratch;
  const std::string state = scratch.path + "/state";
  setenv("FILEINDEXD_STATE_DIR", state.c_str(), 1);  // NOLINT(concurrency-mt-unsafe): one thread
  setenv("TZ", "UTC", 1);                            // NOLINT(concurrency-mt-unsafe): the same
  QuestionBench bench(scratch, divisor);
  bench.Fill();
  bench.AgainstBare();
  bench.AgainstRarer();
  bench.AgainstLocate();
  return 0;
}
