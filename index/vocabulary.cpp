// SPDX-License-Identifier: GPL-2.0-or-later
#include "index/vocabulary.h"

#include <algorithm>
#include <set>

#include "base/utf8.h"
#include "index/edit_distance.h"
#include "index/text_stems.h"
#include "index/text_tokenizer.h"

namespace fileindexd {

namespace {

constexpr int64_t MOST_TERMS = 200'000;  // that are read at once, of those that begin alike
constexpr size_t SHORTEST_STEM = 3;      // letters of a word that others may have for their stem
constexpr size_t LONG = 6;               // letters of a word in which two slips are likely

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

}  // namespace

bool NearWords::Takes(const Nearness& nearness) const {
  return words.size() < MOST || nearness <= words.back().nearness;
}

// Several vocabularies may have one word.
void NearWords::Add(const Nearness& nearness, int64_t documents, std::string word) {
  Word added = {nearness, -documents, std::move(word)};
  const auto known = std::find_if(words.begin(), words.end(),
                                  [&added](const Word& other) { return other.text == added.text; });
  if (known != words.end()) {
    added = std::min(added, *known);
    words.erase(known);
  }
  words.insert(std::upper_bound(words.begin(), words.end(), added), std::move(added));
  words.resize(std::min(words.size(), MOST));
}

std::vector<std::string> NearWords::Texts() const {
  std::vector<std::string> texts;
  for (const Word& word : words) {
    texts.push_back(word.text);
  }
  return texts;
}

int Vocabulary::Open(sqlite3* db, const char* database, const char* table,
                     const std::string& of_column) {
  column = of_column;
  const char* type = column.empty() ? "row" : "col";
  const std::string name = std::string("vocabulary_") + table + "_" + type;
  const std::string make = "CREATE VIRTUAL TABLE IF NOT EXISTS temp." + name + " USING fts5vocab(" +
                           database + ", " + table + ", '" + type + "')";
  // Temporary tables are changes too.
  (void)sqlite3_exec(db, "PRAGMA query_only = 0", nullptr, nullptr, nullptr);
  const int code = sqlite3_exec(db, make.c_str(), nullptr, nullptr, nullptr);
  (void)sqlite3_exec(db, "PRAGMA query_only = 1", nullptr, nullptr, nullptr);
  const std::string read = "SELECT term, doc, cnt" + std::string(column.empty() ? "" : ", col") +
                           " FROM temp." + name + " WHERE term >= ?1 AND term <= ?2";
  return code == SQLITE_OK ? terms.Prepare(db, read.c_str()) : code;
}

void Vocabulary::Look(const std::string& word, const std::string& language, NearWords& near_words) {
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
    if (!near_words.Takes(nearness)) {
      break;
    }
    const auto of_term = forms.find(term.text);
    const bool is_word = of_term == forms.end() || of_term->second.times < term.times;
    const Term& written = is_word ? term : of_term->second.best;
    if (!written.text.empty()) {
      near_words.Add(nearness, written.documents, written.text);
    }
  }
}

void Vocabulary::ForEach(const std::vector<std::string>& beginnings,
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

Vocabulary::FormsByStem Vocabulary::FormsOf(const std::string& word, const std::vector<Near>& found,
                                            const std::string& language) {
  FormsByStem forms;
  std::set<std::string> beginnings;
  for (const Near& near : found) {
    const std::string& text = near.term.text;
    const std::vector<size_t> starts = CharacterStarts(text);
    if (language != NO_LANGUAGE && starts.size() > SHORTEST_STEM) {
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

}  // namespace fileindexd
