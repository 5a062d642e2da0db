// SPDX-License-Identifier: GPL-2.0-or-later
// Shares full of made-up entries and contents, and what is known of each in the plainest form: what
// a question has to find can be told from that by looking at one file after the other.
#pragma once

#include <map>
#include <memory>
#include <random>
#include <set>
#include <string>
#include <tuple>
#include <vector>

#include "base/content.h"
#include "index/entry.h"
#include "tests/scripted/temp_folder.h"

namespace fileindexd {

// A word, and in how many ways it is written. All ways mean the same.
struct SpeltWord {
  std::string plain;  // small letters without accents
  std::vector<std::string> spellings;
};
// None is a form of another, nor a beginning but for "star" of "starch". Few, so that they meet
// often.
const std::vector<SpeltWord>& SpeltWords();

enum class PlainStage { NOT_WANTED, WAITING, DONE, FAILED };

struct PlainFile {
  std::string share;
  Entry entry;
  std::string plain_path;  // in plain words
  PlainStage stage = PlainStage::NOT_WANTED;
  Content content;                            // what was found, in its spellings
  std::map<ContentField, std::string> texts;  // the same in plain words, but for the text
  std::string text;

  std::string PlainName() const { return plain_path.substr(plain_path.rfind('/') + 1); }
  bool WasRead() const { return stage == PlainStage::DONE || stage == PlainStage::FAILED; }
  const int64_t* Number(ContentField field) const;  // null: none
};

class Chance {
 public:
  explicit Chance(unsigned seed) : random(seed) {}

  size_t Below(size_t end) { return random() % end; }
  int64_t Between(int64_t low, int64_t high) {  // both inclusive
    return low + static_cast<int64_t>(random() % static_cast<uint64_t>(high - low + 1));
  }
  bool OneOf(size_t number) { return Below(number) == 0; }
  const SpeltWord& Word() { return SpeltWords()[Below(SpeltWords().size())]; }
  const std::string& Spell(const SpeltWord& word) {
    return word.spellings[Below(word.spellings.size())];
  }
  template <typename T>
  const T& Of(const std::vector<T>& all) {
    return all[Below(all.size())];
  }

 private:
  std::mt19937_64 random;
};

class PlainWorld {
 public:
  // `files` of them in three shares, the first one the largest. The state folder that is in force
  // from then on is its own.
  PlainWorld(unsigned seed, size_t files);

  // Writes everything; expects success.
  void Store();

  // Whether another file of its share, read to its end, has the same size and sample.
  bool HasTwin(const PlainFile& file) const;

  std::vector<PlainFile> files;
  std::vector<std::string> shares;
  std::vector<std::string> folders;  // paths, the roots among them

 private:
  struct Line;  // the same words twice: as spelt, and plain
  void MakeShare(const std::string& share, size_t count);
  void MakeFolders(const std::string& share, size_t count);
  void MakeFile(const std::string& share);
  void MakeContent(PlainFile& file);
  void Describe(PlainFile& file);
  Line Words(size_t most, const std::string& separators);
  Line Name(bool with_ending);
  bool Place(PlainFile& file, const std::string& folder, const Line& name);
  void StoreShare(const std::string& share);

  using Sampled = std::tuple<std::string, int64_t, uint64_t>;  // share, size, sample
  Chance chance;
  std::map<Sampled, std::set<uint64_t>> sampled;     // inodes
  std::map<std::string, std::string> plain_folders;  // by path
  std::set<std::string> taken;                       // paths
  uint64_t last_inode = 0;
  scripted::TempFolder state;
};

}  // namespace fileindexd
