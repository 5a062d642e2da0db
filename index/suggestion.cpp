// SPDX-License-Identifier: GPL-2.0-or-later
#include "index/suggestion.h"

#include <algorithm>
#include <array>
#include <compare>
#include <cstdlib>
#include <functional>
#include <map>
#include <optional>
#include <set>
#include <utility>
#include <vector>

#include "index/contents_schema.h"
#include "index/name_text.h"
#include "index/text_stems.h"
#include "index/text_tokenizer.h"

namespace fileindexd {

namespace {

constexpr int64_t MOST_TERMS = 200'000;  // that are read at once, of those that begin alike
constexpr size_t SHORTEST = 3;           // letters of a word for which another is looked for
constexpr size_t MOST_SLIPS = 10;        // in one question: each costs a look through vocabularies
constexpr size_t LONG = 6;               // letters of a word in which two slips are likely

std::vector<int32_t> Codes(const std::string& text) {
  std::vector<int32_t> codes;
  for (size_t at = 0; at < text.size();) {
    const Character character = CharacterAt(text, at);
    codes.push_back(character.code);
    at += character.size;
  }
  return codes;
}

// The word of vocabularies that is nearest to one, and rather not shorter than it, as stems are. Of
// those as near the most frequent, and of these the first.
class NearestWord {
 public:
  // Whether a word as near as that may be it.
  bool Takes(int distance, bool is_shorter) const {
    return !best.has_value() ||
           std::pair(distance, is_shorter) <= std::pair(best->distance, best->is_shorter);
  }

  void Add(int distance, bool is_shorter, int64_t frequency, std::string word) {
    Word added = {distance, is_shorter, -frequency, std::move(word)};
    if (!best.has_value() || added < *best) {
      best = std::move(added);
    }
  }

  std::string Text() const { return best.has_value() ? best->text : ""; }  // empty: there is none

 private:
  struct Word {
    int distance = 0;
    bool is_shorter = false;
    int64_t rarity = 0;
    std::string text;
    auto operator<=>(const Word&) const = default;
  };
  std::optional<Word> best;
};

// Words with the first letter of the asked one: slips happen there rarely, and the others would
// mean the whole vocabulary. A swap of the first two letters is looked at too.
std::vector<std::string> Beginnings(const std::string& word) {
  std::vector<std::string> beginnings;
  const std::vector<size_t> starts = CharacterStarts(word);
  beginnings.push_back(word.substr(0, starts[1]));
  if (starts.size() > 2) {
    std::string second = word.substr(starts[1], starts[2] - starts[1]);
    if (second != beginnings.front()) {
      beginnings.push_back(std::move(second));
    }
  }
  return beginnings;
}

// Less than this begins with it.
std::string BehindAll(const std::string& beginning) {
  return beginning + "\xf4\x8f\xbf\xbf";
}

// The words of one full-text table, or of one column of it.
class Vocabulary {
 public:
  // `of_column`: empty: of all.
  int Open(sqlite3* db, const char* database, const char* table, const std::string& of_column) {
    column = of_column;
    const char* type = column.empty() ? "row" : "col";
    const std::string name = std::string("vocabulary_") + table + "_" + type;
    const std::string make = "CREATE VIRTUAL TABLE IF NOT EXISTS temp." + name +
                             " USING fts5vocab(" + database + ", " + table + ", '" + type + "')";
    // Temporary tables are changes too.
    (void)sqlite3_exec(db, "PRAGMA query_only = 0", nullptr, nullptr, nullptr);
    int code = sqlite3_exec(db, make.c_str(), nullptr, nullptr, nullptr);
    (void)sqlite3_exec(db, "PRAGMA query_only = 1", nullptr, nullptr, nullptr);
    const std::string read = "SELECT term, doc, cnt" + std::string(column.empty() ? "" : ", col") +
                             " FROM temp." + name + " WHERE term >= ?1 AND term <= ?2";
    code = code == SQLITE_OK ? terms.Prepare(db, read.c_str()) : code;
    return code;
  }

  // `language`: whose stems stand beside the words.
  void Look(const std::string& word, const std::string& language, NearestWord& nearest) {
    std::vector<Near> found;
    const size_t letters = CharacterStarts(word).size() - 1;
    const int most = letters >= LONG ? 2 : 1;
    ForEach(Beginnings(word), [&](const Term& term) {
      const int distance = EditDistance(word, term.text, most);
      if (distance > 0 && distance <= most) {
        found.push_back({{distance, term.text.size() < word.size()}, term});
      }
    });
    std::stable_sort(found.begin(), found.end(), [](const Near& one, const Near& other) {
      return one.nearness < other.nearness;
    });
    const FormsByStem forms = FormsOf(word, found, language);
    for (const auto& [nearness, term] : found) {
      if (!nearest.Takes(nearness.first, nearness.second)) {
        break;
      }
      const auto of_term = forms.find(term.text);
      const bool is_word = of_term == forms.end() || of_term->second.times < term.times;
      const Term& written = is_word ? term : of_term->second.best;
      if (!written.text.empty()) {
        nearest.Add(nearness.first, nearness.second, written.documents, written.text);
      }
    }
  }

 private:
  struct Term {
    std::string text;
    int64_t documents = 0;
    int64_t times = 0;
  };
  struct Near {
    std::pair<int, bool> nearness;
    Term term;
  };
  // What stands under one stem: how often, and of what the slips leave half the most frequent.
  struct Forms {
    int64_t times = 0;
    Term best;
  };
  using FormsByStem = std::map<std::string, Forms, std::less<>>;

  // What begins with one of them; none begins with another.
  void ForEach(const std::vector<std::string>& beginnings,
               const std::function<void(const Term&)>& visit) {
    int64_t left = MOST_TERMS;
    for (const std::string& beginning : beginnings) {
      const std::string end = BehindAll(beginning);
      terms.BindText(1, beginning);
      terms.BindText(2, end);
      for (; left > 0 && terms.Step() == SQLITE_ROW; --left) {
        if (column.empty() || terms.Bytes(3) == column) {
          visit({terms.Bytes(0), terms.Int(1), terms.Int(2)});
        }
      }
      terms.Reset();
    }
  }

  // Of those that were found, as what never stands but as the stem of others is no word. At most
  // the last letter of a stem is none of its words'.
  FormsByStem FormsOf(const std::string& word, const std::vector<Near>& found,
                      const std::string& language) {
    FormsByStem forms;
    std::set<std::string> beginnings;
    for (const Near& near : found) {
      const std::string& text = near.term.text;
      const std::vector<size_t> starts = CharacterStarts(text);
      if (language != NO_LANGUAGE && starts.size() > SHORTEST) {
        forms.try_emplace(text);
        beginnings.insert(text.substr(0, starts[starts.size() - 2]));
      }
    }
    if (forms.empty()) {
      return forms;
    }

    std::vector<std::string> apart;
    for (const std::string& beginning : beginnings) {
      if (apart.empty() || !beginning.starts_with(apart.back())) {
        apart.push_back(beginning);
      }
    }
    Stems stems(language);
    ForEach(apart, [&](const Term& form) {
      const auto of_stem = forms.find(stems.Of(form.text));
      if (of_stem == forms.end() || of_stem->first == form.text) {
        return;
      }
      Forms& others = of_stem->second;
      others.times += form.times;
      const int most = static_cast<int>(CharacterStarts(form.text).size() - 1) / 2;
      if (form.documents > others.best.documents && EditDistance(word, form.text, most) <= most) {
        others.best = form;
      }
    });
    return forms;
  }

  std::string column;
  Statement terms;
};

bool IsKnown(const AskedShare& share, const WordLeaf& leaf) {
  return share.run != nullptr && share.run->Sets().CountOf(leaf) > 0;
}

// A word of a leaf, and where it stands in the question.
struct WordPlace {
  std::string token;
  size_t start = 0;
  size_t end = 0;
};

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

  void Look(const std::string& word, NearestWord& nearest) const {
    Vocabulary names;
    Vocabulary texts;
    if (IsInNames() && names.Open(db, "main", "names", "") == SQLITE_OK) {
      names.Look(word, NO_LANGUAGE, nearest);
    }
    if (IsInContents() && texts.Open(db, "contents", "words", Column()) == SQLITE_OK) {
      texts.Look(word, LanguageOfWords(share.words.language), nearest);
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

// The nearest word to one that no share knows; empty: there is none.
std::string NearestTo(const std::string& word, const QueryNode& leaf,
                      std::deque<AskedShare>& shares) {
  NearestWord nearest;
  for (AskedShare& share : shares) {
    if (share.run != nullptr) {
      WordSearch(share, leaf).Look(word, nearest);
    }
  }
  return nearest.Text();
}

bool AnyKnows(const std::string& word, const QueryNode& leaf, std::deque<AskedShare>& shares) {
  return std::any_of(shares.begin(), shares.end(), [&](AskedShare& share) {
    return share.run != nullptr && WordSearch(share, leaf).Knows(word);
  });
}

bool IsLetter(char c) {
  return (c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z');
}

}  // namespace

int EditDistance(const std::string& from, const std::string& to, int most) {
  const std::vector<int32_t> a = Codes(from);
  const std::vector<int32_t> b = Codes(to);
  if (std::abs(static_cast<int>(a.size()) - static_cast<int>(b.size())) > most) {
    return most + 1;
  }
  std::array<std::vector<int>, 3> rows;  // the last two and this one
  for (std::vector<int>& row : rows) {
    row.resize(b.size() + 1);
  }
  for (size_t j = 0; j <= b.size(); ++j) {
    rows[0][j] = static_cast<int>(j);
  }
  for (size_t i = 1; i <= a.size(); ++i) {
    std::vector<int>& row = rows[i % 3];
    const std::vector<int>& above = rows[(i + 2) % 3];
    const std::vector<int>& two_above = rows[(i + 1) % 3];
    row[0] = static_cast<int>(i);
    int least = row[0];
    for (size_t j = 1; j <= b.size(); ++j) {
      row[j] =
          std::min({above[j] + 1, row[j - 1] + 1, above[j - 1] + (a[i - 1] == b[j - 1] ? 0 : 1)});
      if (i > 1 && j > 1 && a[i - 1] == b[j - 2] && a[i - 2] == b[j - 1]) {
        row[j] = std::min(row[j], two_above[j - 2] + 1);
      }
      least = std::min(least, row[j]);
    }
    if (least > most) {
      return most + 1;
    }
  }
  return std::min(rows[a.size() % 3][b.size()], most + 1);
}

std::string Suggest(const Asked& asked, std::deque<AskedShare>& shares, NameMarker& names) {
  std::map<size_t, WordPlace> changes;  // by their start, with the new word
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
    for (WordPlace& word : WordsOf(node, names)) {
      if (CharacterStarts(word.token).size() <= SHORTEST || AnyKnows(word.token, where, shares)) {
        continue;
      }
      if (looks++ == MOST_SLIPS) {
        return "";
      }
      word.token = NearestTo(word.token, where, shares);
      if (!word.token.empty()) {
        changes.emplace(word.start, std::move(word));
      }
    }
  }

  std::string text;
  size_t at = 0;
  for (const auto& [start, change] : changes) {
    text += asked.text.substr(at, start - at) + change.token;
    at = change.end;
  }
  return changes.empty() ? "" : text + asked.text.substr(at);
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
