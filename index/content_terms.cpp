// SPDX-License-Identifier: GPL-2.0-or-later
#include "index/content_terms.h"

#include <map>
#include <string_view>

#include "index/content_text.h"
#include "index/text_tokenizer.h"

namespace fileindexd {

std::vector<ContentTerm> TermsOf(const Content& content, const std::string& language) {
  std::map<std::string, uint64_t, std::less<>> counts;
  TextCutter cutter(language);
  const auto count_words = [&](std::string_view text) {
    cutter.Cut(text, false, [&counts](std::string_view word, size_t, size_t) {
      const auto known = counts.find(word);
      if (known != counts.end()) {
        ++known->second;
      } else {
        counts.emplace(word, 1);
      }
      return true;
    });
  };
  const ContentWords words = WordsOf(content);
  for (const std::string_view field : words.fields) {
    count_words(field);
  }
  count_words(words.text);
  count_words(words.numbers);

  std::vector<ContentTerm> terms;
  terms.reserve(counts.size());
  for (const auto& [term, count] : counts) {
    terms.push_back({term, count});
  }
  return terms;
}

}  // namespace fileindexd
