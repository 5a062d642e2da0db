// SPDX-License-Identifier: GPL-2.0-or-later
#include "index/question_words.h"

#include <algorithm>

#include "index/entry_table.h"
#include "index/text_tokenizer.h"
#include "state/layout.h"

namespace fileindexd {

namespace {

constexpr size_t MOST_BYTES = 4096;
constexpr size_t MOST_WORDS = 100;

// Ranks of a match; what is covered of the name adds less than one.
constexpr double WHOLE_NAME = 3;
constexpr double WHOLE_STEM = 2;  // but for the ending
constexpr double AT_START = 1;

bool IsBlank(char c) {
  return static_cast<unsigned char>(c) <= 0x20 || c == 0x7f;
}

std::vector<std::string> SplitAtBlanks(const std::string& text) {
  std::vector<std::string> words;
  auto at = text.begin();
  while (true) {
    at = std::find_if_not(at, text.end(), IsBlank);
    if (at == text.end()) {
      return words;
    }
    const auto end = std::find_if(at, text.end(), IsBlank);
    words.emplace_back(at, end);
    at = end;
  }
}

std::string Quoted(std::string_view text) {
  std::string quoted = "\"";
  for (const char c : text) {
    quoted.append(c == '"' ? 2 : 1, c);
  }
  return quoted + '"';
}

// Where each character of valid UTF-8 begins, and the end.
std::vector<size_t> CharacterStarts(std::string_view text) {
  std::vector<size_t> starts;
  for (size_t i = 0; i < text.size(); ++i) {
    if ((static_cast<unsigned char>(text[i]) & 0xc0) != 0x80) {
      starts.push_back(i);
    }
  }
  starts.push_back(text.size());
  return starts;
}

std::string_view StemOf(std::string_view name) {
  const size_t dot = name.rfind('.');
  return dot == std::string_view::npos || dot == 0 ? name : name.substr(0, dot);
}

}  // namespace

bool QuestionWords::Read(const std::string& text, std::string& error) {
  if (text.size() > MOST_BYTES) {
    error = "the question is too long";
    return false;
  }
  if (!tokenizer.Open()) {
    error = "out of memory";
    return false;
  }

  const std::vector<std::string> parts = SplitAtBlanks(ToUtf8(text));
  if (parts.empty() || parts.size() > MOST_WORDS) {
    error = parts.empty() ? "nothing to search for" : "too many words";
    return false;
  }

  for (const std::string& part : parts) {
    const std::vector<std::string> found = tokenizer.Tokens(part);
    if (found.empty()) {
      signs.push_back(part);
      continue;
    }
    const bool prefix = part.back() == '*';
    words.push_back({part, prefix, found});
    for (const std::string& token : found) {
      tokens.push_back({token});
    }
    tokens.back().prefix = prefix;
  }
  return true;
}

std::string QuestionWords::NamesQuery() const {
  std::string query;
  for (const Word& word : words) {
    query += (query.empty() ? "" : " AND ") + Quoted(word.text) + (word.prefix ? " *" : "");
  }
  return query;
}

std::string QuestionWords::NameQuery(size_t word) const {
  return Quoted(words[word].text) + (words[word].prefix ? " *" : "");
}

std::string QuestionWords::ContentQuery(size_t word) const {
  return TextQuery(words[word].text);
}

// As the full-text table finds it: all tokens in a row, the last one maybe a beginning.
bool QuestionWords::Holds(const std::vector<std::string>& name, const Word& word) {
  const size_t count = word.tokens.size();
  for (size_t at = 0; at + count <= name.size(); ++at) {
    bool same = true;
    for (size_t i = 0; i < count && same; ++i) {
      const bool beginning = word.prefix && i + 1 == count;
      same = beginning ? name[at + i].starts_with(word.tokens[i]) : name[at + i] == word.tokens[i];
    }
    if (same) {
      return true;
    }
  }
  return false;
}

std::vector<bool> QuestionWords::InName(std::string_view name) const {
  const std::vector<std::string> name_tokens = tokenizer.Tokens(name);
  std::vector<bool> in_name;
  for (const Word& word : words) {
    in_name.push_back(Holds(name_tokens, word));
  }
  return in_name;
}

std::string QuestionWords::PartsQuery() const {
  std::string query;
  for (const std::string& sign : signs) {
    const std::vector<size_t> starts = CharacterStarts(sign);
    for (size_t i = 0; i + 3 < starts.size(); ++i) {
      query += (query.empty() ? "" : " AND ") +
               Quoted(std::string_view(sign).substr(starts[i], starts[i + 3] - starts[i]));
    }
  }
  return query;
}

bool QuestionWords::HoldsSigns(std::string_view name) const {
  return std::all_of(signs.begin(), signs.end(), [name](const std::string& sign) {
    return name.find(sign) != std::string_view::npos;
  });
}

double QuestionWords::Covered(const std::vector<std::string>& name) const {
  size_t covered = 0;
  size_t all = 0;
  for (const std::string& word : name) {
    size_t best = 0;
    for (const Token& token : tokens) {
      if (token.prefix ? word.starts_with(token.text) : word == token.text) {
        best = std::max(best, token.text.size());
      }
    }
    covered += best;
    all += word.size();
  }
  return all == 0 ? 0 : static_cast<double>(covered) / static_cast<double>(all + 1);
}

double QuestionWords::Score(const Entry& entry) const {
  const std::string name = ToUtf8(LastComponent(entry.path));
  if (tokens.empty()) {
    const bool whole = signs.size() == 1 && name == signs.front();
    const double rank = whole ? WHOLE_NAME : name.starts_with(signs.front()) ? AT_START : 0;
    size_t covered = 0;
    for (const std::string& sign : signs) {
      covered += sign.size();
    }
    return rank + static_cast<double>(std::min(covered, name.size())) /
                      static_cast<double>(name.size() + 1);
  }

  const auto same = [](const std::string& word, const Token& token) { return word == token.text; };
  const auto begins = [](const std::string& word, const Token& token) {
    return token.prefix ? word.starts_with(token.text) : word == token.text;
  };
  const std::vector<std::string> name_tokens = tokenizer.Tokens(name);
  const double covered = Covered(name_tokens);
  if (std::equal(name_tokens.begin(), name_tokens.end(), tokens.begin(), tokens.end(), same)) {
    return WHOLE_NAME + covered;
  }
  const std::vector<std::string> stem =
      entry.kind == Kind::FOLDER ? name_tokens : tokenizer.Tokens(StemOf(name));
  if (std::equal(stem.begin(), stem.end(), tokens.begin(), tokens.end(), same)) {
    return WHOLE_STEM + covered;
  }
  const bool at_start =
      name_tokens.size() >= tokens.size() &&
      std::equal(tokens.begin(), tokens.end(), name_tokens.begin(),
                 [&](const Token& t, const std::string& w) { return begins(w, t); });
  return (at_start ? AT_START : 0) + covered;
}

}  // namespace fileindexd
