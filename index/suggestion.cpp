// SPDX-License-Identifier: GPL-2.0-or-later
#include "index/suggestion.h"

#include <algorithm>
#include <iterator>
#include <map>
#include <utility>
#include <vector>

#include "base/utf8.h"
#include "index/contents_schema.h"
#include "index/name_text.h"
#include "index/text_tokenizer.h"
#include "index/vocabulary.h"

namespace fileindexd {

namespace {

constexpr size_t SHORTEST = 3;     // letters of a word for which another is looked for
constexpr size_t MOST_SLIPS = 10;  // in one question: each costs a look through vocabularies
constexpr size_t MOST_TEXTS = 6;   // each may be asked

bool IsKnown(const AskedShare& share, const WordLeaf& leaf) {
  return share.run != nullptr && share.run->Sets().CountOf(leaf) > 0;
}

// A word of a leaf, and where it stands in the question.
struct WordPlace {
  std::string token;
  size_t start = 0;
  size_t end = 0;
};

// What may stand in the place of a word.
struct Change {
  size_t end = 0;
  std::vector<std::string> words;  // the best first; there is one
};
using Changes = std::map<size_t, Change>;  // by where the word starts

// But for a last one of which only the beginning is said.
std::vector<WordPlace> WordsOf(const QueryNode& node, NameMarker& names) {
  std::vector<uint32_t> origins;
  const std::string folded = names.folder.Words(node.text, &origins);
  std::vector<WordPlace> words;
  for (NameTokenizer::Place& place : names.tokenizer.Places(folded)) {
    words.push_back({std::move(place.token), node.text_at + origins[place.start],
                     node.text_at + origins[place.end]});
  }
  if (node.is_beginning && !words.empty()) {
    words.pop_back();
  }
  return words;
}

bool HasMatch(sqlite3* db, const char* sql, const std::string& query) {
  Statement read;
  bool found = false;
  if (query.empty() || read.Prepare(db, sql) != SQLITE_OK) {
    return false;
  }
  read.BindText(1, query);
  (void)read.ReadOne(found, [] {});
  return found;
}

// One share, and one word in the place of a leaf.
class WordSearch {
 public:
  WordSearch(AskedShare& of_share, const QueryNode& of_leaf)
      : share(of_share), leaf(of_leaf), db(of_share.reader.database.db) {}

  // Whether it stands where the leaf is looked for.
  bool Knows(const std::string& word) const {
    QueryNode alone = leaf;
    alone.text = word;
    alone.is_phrase = alone.is_beginning = false;
    return (IsInNames() &&
            HasMatch(db, "SELECT 1 FROM names WHERE names MATCH ?1 LIMIT 1", Quoted(word))) ||
           (IsInContents() &&
            HasMatch(db, "SELECT 1 FROM contents.words WHERE words MATCH ?1 LIMIT 1",
                     TextQueryOf(alone)));
  }

  void Look(const std::string& word, NearWords& near_words) const {
    Vocabulary names;
    Vocabulary texts;
    if (IsInNames() && names.Open(db, "main", "names", "") == SQLITE_OK) {
      names.Look(word, NO_LANGUAGE, near_words);
    }
    if (IsInContents() && texts.Open(db, "contents", "words", Column()) == SQLITE_OK) {
      texts.Look(word, LanguageOfWords(share.words.language), near_words);
    }
  }

 private:
  bool IsInNames() const { return leaf.scope == Scope::ANY || leaf.scope == Scope::NAME; }
  bool IsInContents() const { return leaf.scope != Scope::NAME && share.has_contents; }
  std::string Column() const {
    return leaf.scope == Scope::FIELD  ? ColumnName(leaf.field)
           : leaf.scope == Scope::TEXT ? ColumnAt(WORD_COLUMNS, TEXT_COLUMN)
                                       : "";
  }

  AskedShare& share;
  const QueryNode& leaf;
  sqlite3* db;
};

// The nearest words to one that no share knows, the best first.
std::vector<std::string> NearTo(const std::string& word, const QueryNode& leaf,
                                std::deque<AskedShare>& shares) {
  NearWords near_words;
  for (AskedShare& share : shares) {
    if (share.run != nullptr) {
      WordSearch(share, leaf).Look(word, near_words);
    }
  }
  return near_words.Texts();
}

bool AnyKnows(const std::string& word, const QueryNode& leaf, std::deque<AskedShare>& shares) {
  return std::any_of(shares.begin(), shares.end(), [&](AskedShare& share) {
    return share.run != nullptr && WordSearch(share, leaf).Knows(word);
  });
}

// The text with one word for each change, `ranks` behind the best.
std::string Changed(const std::string& text, const Changes& changes,
                    const std::vector<size_t>& ranks) {
  std::string changed;
  size_t at = 0;
  auto rank = ranks.begin();
  for (const auto& [start, change] : changes) {
    changed += text.substr(at, start - at) + change.words[*rank++];
    at = change.end;
  }
  return changed + text.substr(at);
}

// Adds the texts whose words are `behind` places behind the best ones, all counted together; those
// of `ranks` are chosen, and `next` is the first other change.
void AddTexts(const std::string& text, const Changes& changes, Changes::const_iterator next,
              size_t behind, std::vector<size_t>& ranks, std::vector<std::string>& texts) {
  if (next == changes.end()) {
    if (behind == 0 && texts.size() < MOST_TEXTS) {
      texts.push_back(Changed(text, changes, ranks));
    }
    return;
  }
  const size_t last = std::min(behind, next->second.words.size() - 1);
  for (size_t rank = 0; rank <= last && texts.size() < MOST_TEXTS; ++rank) {
    ranks.push_back(rank);
    AddTexts(text, changes, std::next(next), behind - rank, ranks, texts);
    ranks.pop_back();
  }
}

bool IsLetter(char c) {
  return (c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z');
}

}  // namespace

std::vector<std::string> Suggest(const Asked& asked, std::deque<AskedShare>& shares,
                                 NameMarker& names) {
  Changes changes;
  size_t looks = 0;
  for (const WordLeaf& leaf : asked.leaves) {
    const QueryNode& node = *leaf.node;
    const bool has_words = node.part == Part::WORD || node.part == Part::EXACT_NAME;
    if (!leaf.is_positive || !has_words ||
        std::any_of(shares.begin(), shares.end(),
                    [&](const AskedShare& share) { return IsKnown(share, leaf); })) {
      continue;
    }
    QueryNode where = node;
    where.scope = node.part == Part::EXACT_NAME ? Scope::NAME : node.scope;
    for (const WordPlace& word : WordsOf(node, names)) {
      if (CharacterStarts(word.token).size() <= SHORTEST || AnyKnows(word.token, where, shares)) {
        continue;
      }
      if (looks++ == MOST_SLIPS) {
        return {};
      }
      std::vector<std::string> words = NearTo(word.token, where, shares);
      if (!words.empty()) {
        changes.emplace(word.start, Change{word.end, std::move(words)});
      }
    }
  }

  std::vector<std::string> texts;
  size_t worst = 0;
  for (const auto& [start, change] : changes) {
    worst += change.words.size() - 1;
  }
  for (size_t behind = 0; behind <= worst && !changes.empty(); ++behind) {
    std::vector<size_t> ranks;
    AddTexts(asked.text, changes, changes.begin(), behind, ranks, texts);
  }
  return texts;
}

std::string WordLikeField(const QueryNode& node) {
  if (node.part == Part::NOT) {
    return "";
  }
  for (const QueryNode& below : node.below) {
    std::string word = WordLikeField(below);
    if (!word.empty()) {
      return word;
    }
  }
  if (node.part != Part::WORD || node.scope != Scope::ANY || node.is_phrase) {
    return "";
  }
  const std::string& text = node.text;
  const auto end = std::find_if_not(text.begin(), text.end(), IsLetter);
  const std::string_view rest(end, text.end());
  const bool is_like_field = end - text.begin() >= 2 && rest.size() >= 2 && rest[0] == ':' &&
                             rest[1] != ':' && rest[1] != '/';
  return is_like_field ? text : "";
}

}  // namespace fileindexd
