// SPDX-License-Identifier: GPL-2.0-or-later
#include "index/snippet.h"

#include <algorithm>
#include <cstddef>
#include <deque>
#include <map>
#include <optional>
#include <set>
#include <string_view>
#include <utility>

#include "base/content.h"
#include "index/query.h"
#include "index/text_tokenizer.h"

namespace fileindexd {

namespace {

constexpr size_t WIDTH = 160;          // bytes
constexpr size_t BEFORE = 40;          // of them before the first word
constexpr size_t MOST_TEXT = 1 << 18;  // looked at
constexpr size_t MOST_PLACES = 256;    // of a word, or of a row of them

struct Wanted {
  std::string token;
  bool is_beginning;
  size_t word;
  size_t number;  // of the token in the question: those in one place have the same
  size_t first;   // of the word's numbers
  size_t last;
};

struct Place {
  size_t start;
  size_t end;
  size_t number;
};

std::vector<Wanted> TokensOf(const std::vector<const QueryNode*>& words, TextCutter& cutter) {
  std::vector<Wanted> tokens;
  size_t number = 0;
  for (size_t word = 0; word < words.size(); ++word) {
    const std::string& text = words[word]->text;
    const size_t first = tokens.size();
    const size_t first_number = number;
    size_t last_start = 0;
    cutter.Cut(text, true, [&](std::string_view token, size_t start, size_t) {
      number += tokens.size() > first && start != last_start ? 1 : 0;
      last_start = start;
      tokens.push_back({std::string(token), false, word, number, first_number, 0});
      return true;
    });
    const bool is_beginning = words[word]->is_beginning || IsBeginning(text);
    for (size_t i = first; i < tokens.size(); ++i) {
      tokens[i].is_beginning = is_beginning && tokens[i].number == number;
      tokens[i].last = number;
    }
    ++number;
  }
  return tokens;
}

// Those that are looked for in that field; none: in the text.
std::vector<Wanted> WantedIn(std::optional<ContentField> field,
                             const std::vector<const QueryNode*>& words,
                             const std::vector<Wanted>& tokens) {
  std::vector<Wanted> wanted;
  for (const Wanted& token : tokens) {
    const QueryNode& word = *words[token.word];
    const bool counts = word.scope == Scope::ANY ||
                        (word.scope == Scope::TEXT && !field.has_value()) ||
                        (word.scope == Scope::FIELD && field == word.field);
    if (counts) {
      wanted.push_back(token);
    }
  }
  return wanted;
}

// Whether all words that are looked for are shown from some place on: none shows more.
class Completeness {
 public:
  explicit Completeness(const std::vector<Wanted>& tokens) {
    for (const Wanted& token : tokens) {
      last_starts[token.number] = NOWHERE;
    }
  }

  void Add(const Place& place) {
    last_starts[place.number] = place.start;
    size_t first = place.start;
    for (const auto& [number, start] : last_starts) {
      first = start == NOWHERE || first == NOWHERE ? NOWHERE : std::min(first, start);
    }
    if (end == NOWHERE && first != NOWHERE && place.end < first + WIDTH - BEFORE) {
      end = first + WIDTH;
    }
  }
  // What stands there or behind is not shown.
  bool IsBehind(size_t start) const { return start >= end; }

 private:
  static constexpr size_t NOWHERE = SIZE_MAX;
  std::map<size_t, size_t> last_starts;  // by number
  size_t end = NOWHERE;
};

// Finds what is looked for in a text that is read word by word. Of a word with several tokens those
// count that stand in a row; where none do, each one.
class PlaceFinder {
 public:
  explicit PlaceFinder(const std::vector<Wanted>& wanted) : tokens(wanted), shown(wanted) {
    for (const Wanted& token : tokens) {
      if (rows.empty() || rows.back().first != token.first) {
        rows.push_back({token.first, token.last, {}, {}, 0});
        longest = std::max(longest, token.last - token.first + 1);
      }
    }
  }

  // False: what stands there or behind is not shown.
  bool Add(std::string_view token, size_t start, size_t end) {
    if (shown.IsBehind(start)) {
      return false;
    }
    if (recent.empty() || start != recent.back().start) {  // several may stand in one place
      EndWord();
      recent.push_back({start, end, 0});
      if (recent.size() > longest) {
        recent.pop_front();
      }
    }
    for (const Wanted& wanted : tokens) {
      if (wanted.is_beginning ? token.starts_with(wanted.token) : token == wanted.token) {
        met.insert(wanted.number);
      }
    }
    return true;
  }

  // All, in order.
  std::vector<Place> Places() {
    EndWord();
    for (const Row& row : rows) {
      for (const Place& part : row.count == 0 ? row.parts : std::vector<Place>()) {
        places.try_emplace(part.start, part);
      }
    }
    std::vector<Place> all;
    for (const auto& [start, place] : places) {
      all.push_back(place);
    }
    return all;
  }

 private:
  // The tokens of one word.
  struct Row {
    size_t first;
    size_t last;
    std::vector<size_t> begun;  // numbers up to which it stands in front of the next word
    std::vector<Place> parts;   // as long as it stands nowhere whole
    size_t count;               // how often it does
  };

  // All is known of the last word.
  void EndWord() {
    for (Row& row : rows) {
      if (row.count == MOST_PLACES) {
        continue;
      }
      std::vector<size_t> begun;  // ascending
      for (auto number = met.lower_bound(row.first); number != met.upper_bound(row.last);
           ++number) {
        if (*number == row.first ||
            std::binary_search(row.begun.begin(), row.begun.end(), *number - 1)) {
          begun.push_back(*number);
        }
        if (row.count == 0 && ++part_counts[*number] <= MOST_PLACES) {
          row.parts.push_back({recent.back().start, recent.back().end, *number});
        }
      }
      row.begun = std::move(begun);
      if (!row.begun.empty() && row.begun.back() == row.last) {
        ++row.count;
        TakeLast(row);
      }
    }
    met.clear();
  }

  void TakeLast(const Row& row) {
    auto place = recent.end() - static_cast<std::ptrdiff_t>(row.last - row.first + 1);
    for (size_t number = row.first; number <= row.last; ++number, ++place) {
      const Place taken = {place->start, place->end, number};
      places.try_emplace(taken.start, taken);
      shown.Add(taken);
    }
  }

  const std::vector<Wanted>& tokens;
  Completeness shown;
  std::vector<Row> rows;
  size_t longest = 0;
  std::deque<Place> recent;              // the last words, as many as the longest row has
  std::set<size_t> met;                  // numbers, at the last of them
  std::map<size_t, size_t> part_counts;  // by number: a common word does not hide a rare one
  std::map<size_t, Place> places;        // by start
};

// All, or as far as those behind do not count.
std::vector<Place> PlacesIn(std::string_view text, const std::vector<Wanted>& tokens,
                            TextCutter& cutter) {
  if (tokens.empty()) {
    return {};
  }
  PlaceFinder finder(tokens);
  cutter.Cut(text, false, [&finder](std::string_view token, size_t start, size_t end) {
    return finder.Add(token, start, end);
  });
  return finder.Places();
}

// The place from which on most different words are shown.
size_t BestOf(const std::vector<Place>& places) {
  size_t best = 0;
  size_t most = 0;
  for (size_t i = 0; i < places.size(); ++i) {
    std::set<size_t> shown;
    for (size_t j = i; j < places.size() && places[j].end < places[i].start + WIDTH - BEFORE; ++j) {
      shown.insert(places[j].number);
    }
    if (shown.size() > most) {
      most = shown.size();
      best = i;
    }
  }
  return best;
}

bool IsInside(std::string_view text, size_t at) {
  return at < text.size() && (static_cast<unsigned char>(text[at]) & 0xc0) == 0x80;
}

// Begins and ends at a blank where one is near.
std::pair<size_t, size_t> RangeAround(std::string_view text, const Place& place) {
  constexpr size_t NEAR = 20;
  size_t start = place.start > BEFORE ? place.start - BEFORE : 0;
  const size_t blank = start == 0 ? std::string_view::npos : text.find_first_of(" \t\n\r", start);
  if (blank != std::string_view::npos && blank < start + NEAR && blank < place.start) {
    start = blank + 1;
  }
  size_t end = std::min(std::max(start + WIDTH, place.end), text.size());
  const size_t last =
      end == text.size() ? std::string_view::npos : text.find_last_of(" \t\n\r", end);
  if (last != std::string_view::npos && last + NEAR > end && last > place.end) {
    end = last;
  }
  while (IsInside(text, start)) {
    ++start;
  }
  while (IsInside(text, end)) {
    ++end;
  }
  return {start, end};
}

Snippet Around(std::string_view text, const std::vector<Place>& places) {
  Snippet snippet;
  const auto [start, end] = RangeAround(text, places[BestOf(places)]);
  snippet.text = std::string(text.substr(start, end - start));
  for (char& c : snippet.text) {
    c = static_cast<unsigned char>(c) < 0x20 || c == 0x7f ? ' ' : c;
  }
  for (const Place& place : places) {
    if (place.start >= start && place.end <= end) {
      snippet.marks.push_back({place.start - start, place.end - start});
    }
  }
  return snippet;
}

}  // namespace

Snippet MakeSnippet(const Content& content, const std::vector<const QueryNode*>& words,
                    TextCutter& cutter) {
  const std::vector<Wanted> tokens = TokensOf(words, cutter);
  size_t looked_at = std::min(content.text.size(), MOST_TEXT);
  while (IsInside(content.text, looked_at)) {
    --looked_at;
  }
  const std::string_view text = std::string_view(content.text).substr(0, looked_at);
  const std::vector<Place> in_text = PlacesIn(text, WantedIn({}, words, tokens), cutter);
  if (!in_text.empty()) {
    return Around(text, in_text);
  }
  for (const TextField& field : content.texts) {
    const std::vector<Place> in_field =
        PlacesIn(field.text, WantedIn(field.field, words, tokens), cutter);
    if (!in_field.empty()) {
      return Around(field.text, in_field);
    }
  }
  return {};
}

}  // namespace fileindexd
