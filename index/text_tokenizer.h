// SPDX-License-Identifier: GPL-2.0-or-later
// The words of contents: a tokenizer for the full-text tables, and the languages that it knows.
//
//   tokenize='fileindex LANGUAGE'
//
// Case, accents and compatibility forms do not count. Every word stands beside its stem in that
// language. Han, kana and Hangul stand as overlapping pairs of characters, and the last one of a
// run alone, so that words are found without boundaries; one character is looked for as the
// beginning of a pair. Identifiers (foo_bar, fooBar, v1.2) stand whole and in their parts, all in
// one place. A question's words come whole, beside their stems.
//
// A document may be given to a table cut already, of the same words:
//
//   cut     CUT_MARK token…    tokens as in token_memory.h
#pragma once

#include <sqlite3.h>

#include <functional>
#include <memory>
#include <string>
#include <string_view>
#include <vector>

namespace fileindexd {

constexpr const char* TEXT_TOKENIZER = "fileindex";
constexpr const char* DEFAULT_LANGUAGE = "english";
constexpr const char* NO_LANGUAGE = "none";  // no stems
// No text begins so: the first byte is in no UTF-8.
constexpr std::string_view CUT_MARK = "\xff-cut";

// Makes the tokenizer known to the connection: whoever reads or writes words needs it. SQLite's
// code.
int RegisterTextTokenizer(sqlite3* db);

// The same words outside a table. One thread.
class TextCutter {
 public:
  explicit TextCutter(const std::string& language);  // one of LanguageName
  ~TextCutter();
  TextCutter(const TextCutter&) = delete;
  TextCutter& operator=(const TextCutter&) = delete;

  // Visits each word with the bytes that it stands for, until `visit` returns false. Throws
  // std::bad_alloc, and nothing else.
  using Visit = std::function<bool(std::string_view word, size_t start, size_t end)>;
  void Cut(std::string_view text, bool is_question, const Visit& visit);
  // What may be given to a table of that language in place of the text.
  std::string CutForTable(std::string_view text);

 private:
  struct Impl;
  std::unique_ptr<Impl> impl;
};

// In the full-text tables' own language: a literal, so that no text of a user is taken for syntax.
std::string Quoted(std::string_view text);
// One word of a question, quoted. One that ends with '*' matches beginnings, as does a last
// character of Han, kana or Hangul that stands alone.
std::string TextQuery(std::string_view word);
bool IsBeginning(std::string_view word);  // whether it matches beginnings

// The name under which a language is kept ("en" and "English" are "english"); empty: not known.
std::string LanguageName(std::string_view given);
// That of a share's words, which may have been given none, or one that is not known any more.
std::string LanguageOfWords(std::string_view given);
std::vector<std::string> Languages();  // names, sorted, NO_LANGUAGE among them

}  // namespace fileindexd
