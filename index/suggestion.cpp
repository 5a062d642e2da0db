// SPDX-License-Identifier: GPL-2.0-or-later
#include "index/suggestion.h"

#include <algorithm>
#include <array>
#include <cstdlib>
#include <map>
#include <tuple>
#include <utility>
#include <vector>

#include "index/name_text.h"

namespace fileindexd {

namespace {

constexpr int64_t MOST_TERMS = 200'000;  // that are looked at for one word in one vocabulary
constexpr size_t SHORTEST = 3;           // letters of a word for which another is looked for
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

// A word of a vocabulary, the better the smaller: near, not cut short as stems are, frequent.
struct Nearest {
  int distance = 0;
  bool is_shorter = false;
  int64_t frequency = 0;
  std::string word;

  bool IsBetterThan(const Nearest& other) const {
    return std::make_tuple(distance, is_shorter, -frequency, word) <
           std::make_tuple(other.distance, other.is_shorter, -other.frequency, other.word);
  }
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

class Vocabulary {
 public:
  int Open(sqlite3* db, const char* database, const char* table) {
    const std::string name = std::string("vocabulary_") + table;
    const std::string make = "CREATE VIRTUAL TABLE IF NOT EXISTS temp." + name +
                             " USING fts5vocab(" + database + ", " + table + ", 'row')";
    // Temporary tables are changes too.
    (void)sqlite3_exec(db, "PRAGMA query_only = 0", nullptr, nullptr, nullptr);
    int code = sqlite3_exec(db, make.c_str(), nullptr, nullptr, nullptr);
    (void)sqlite3_exec(db, "PRAGMA query_only = 1", nullptr, nullptr, nullptr);
    const std::string read = "SELECT term, doc FROM temp." + name +
                             " WHERE term >= ?1 AND term <= ?2 LIMIT " + std::to_string(MOST_TERMS);
    code = code == SQLITE_OK ? terms.Prepare(db, read.c_str()) : code;
    return code;
  }

  void Look(const std::string& word, Nearest& best, bool& found) {
    const size_t letters = CharacterStarts(word).size() - 1;
    const int most = letters >= LONG ? 2 : 1;
    for (const std::string& beginning : Beginnings(word)) {
      const std::string end = BehindAll(beginning);
      terms.BindText(1, beginning);
      terms.BindText(2, end);
      while (terms.Step() == SQLITE_ROW) {
        const std::string term = terms.Bytes(0);
        const int distance = EditDistance(word, term, most);
        const Nearest near = {distance, term.size() < word.size(), terms.Int(1), term};
        if (distance > 0 && distance <= most && (!found || near.IsBetterThan(best))) {
          best = near;
          found = true;
        }
      }
      terms.Reset();
    }
  }

 private:
  Statement terms;
};

bool IsKnown(const AskedShare& share, const WordLeaf& leaf) {
  return share.run != nullptr && share.run->Sets().CountOf(leaf) > 0;
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

std::string Suggest(const Asked& asked, std::deque<AskedShare>& shares) {
  std::map<size_t, std::pair<size_t, std::string>> changes;  // by their start: end, and the word
  for (const WordLeaf& leaf : asked.leaves) {
    const QueryNode& node = *leaf.node;
    const bool is_plain = leaf.is_positive && node.part == Part::WORD && !node.is_phrase &&
                          !node.is_beginning && leaf.tokens.size() == 1 && node.scope == Scope::ANY;
    if (!is_plain || CharacterStarts(leaf.tokens.front()).size() <= SHORTEST ||
        std::any_of(shares.begin(), shares.end(),
                    [&](const AskedShare& share) { return IsKnown(share, leaf); })) {
      continue;
    }
    Nearest best;
    bool found = false;
    for (AskedShare& share : shares) {
      Vocabulary names;
      Vocabulary words;
      sqlite3* db = share.run == nullptr ? nullptr : share.reader.database.db;
      if (db != nullptr && names.Open(db, "main", "names") == SQLITE_OK) {
        names.Look(leaf.tokens.front(), best, found);
      }
      if (db != nullptr && share.has_contents && words.Open(db, "contents", "words") == SQLITE_OK) {
        words.Look(leaf.tokens.front(), best, found);
      }
    }
    if (!found) {
      return "";
    }
    changes[node.start] = {node.end, best.word};
  }

  std::string text;
  size_t at = 0;
  for (const auto& [start, change] : changes) {
    text += asked.text.substr(at, start - at) + change.second;
    at = change.first;
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
