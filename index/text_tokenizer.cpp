// SPDX-License-Identifier: GPL-2.0-or-later
#include "index/text_tokenizer.h"

#include <exception>
#include <memory>
#include <new>
#include <optional>

#include "index/fts5_api.h"
#include "index/text_words.h"

namespace fileindexd {

namespace {

// Whether the last run of Han, kana or Hangul is one character, with no word behind it. Parts that
// join are one, as where words are cut: a syllable may come as its letters, a kana with its mark.
bool EndsInOnePaired(std::string_view word) {
  std::optional<CharacterTable> characters;  // none for the letters of most words
  size_t count = 0;                          // characters of the last run
  int32_t last = 0;                          // the one before; 0: none of a run
  for (size_t at = 0; at < word.size();) {
    const Character character = CharacterAt(word, at);
    const CharacterClass type = ClassOf(character.code);
    if (type == CharacterClass::PAIRED) {
      if (!characters.has_value()) {
        characters.emplace();
      }
      const int32_t plain = characters->Plain(character.code);
      const int32_t joined = Joined(last, plain);
      if (joined == 0) {
        count = last == 0 ? 1 : count + 1;
      }
      last = joined == 0 ? plain : joined;
    } else {
      if (type != CharacterClass::SEPARATOR && type != CharacterClass::MARK) {
        count = 0;
      }
      last = 0;
    }
    at += character.size;
  }
  return count == 1;
}

int Create(void* /*context*/, const char** arguments, int count, Fts5Tokenizer** made) {
  try {
    // A table of a language that is not known any more must open, to be renamed and dropped.
    const std::string language = LanguageName(count > 0 ? arguments[0] : NO_LANGUAGE);
    auto tokenizer = std::make_unique<TextWords>(language.empty() ? NO_LANGUAGE : language);
    if (!tokenizer->IsGood()) {
      return SQLITE_ERROR;
    }
    *made = reinterpret_cast<Fts5Tokenizer*>(tokenizer.release());
    return SQLITE_OK;
  } catch (const std::bad_alloc&) {
    return SQLITE_NOMEM;
  }
}

void Delete(Fts5Tokenizer* tokenizer) {
  delete reinterpret_cast<TextWords*>(tokenizer);
}

int Tokenize(Fts5Tokenizer* tokenizer, void* context, int flags, const char* text, int size,
             TextWords::Emit emit) {
  try {
    return reinterpret_cast<TextWords*>(tokenizer)->Run(
        context, flags, std::string_view(text, static_cast<size_t>(size)), emit);
  } catch (const std::exception&) {
    return SQLITE_NOMEM;
  }
}

}  // namespace

int RegisterTextTokenizer(sqlite3* db) {
  fts5_api* api = Fts5Of(db);
  if (api == nullptr) {
    return SQLITE_NOMEM;
  }
  fts5_tokenizer functions = {Create, Delete, Tokenize};
  return api->xCreateTokenizer(api, TEXT_TOKENIZER, nullptr, &functions, nullptr);
}

struct TextCutter::Impl {
  explicit Impl(const std::string& language) : words(language) {}
  TextWords words;
};

TextCutter::TextCutter(const std::string& language) : impl(std::make_unique<Impl>(language)) {}

TextCutter::~TextCutter() = default;

void TextCutter::Cut(std::string_view text, bool is_question, const Visit& visit) {
  const TextWords::Emit emit = [](void* to, int /*flags*/, const char* word, int size, int start,
                                  int end) {
    const auto& visitor = *static_cast<const Visit*>(to);
    const bool more = visitor(std::string_view(word, static_cast<size_t>(size)),
                              static_cast<size_t>(start), static_cast<size_t>(end));
    return more ? SQLITE_OK : SQLITE_DONE;
  };
  Visit kept = visit;
  (void)impl->words.Run(&kept, is_question ? FTS5_TOKENIZE_QUERY : FTS5_TOKENIZE_DOCUMENT, text,
                        emit);  // whether it was stopped does not count
}

std::string TextCutter::CutForTable(std::string_view text) {
  std::string cut;
  cut.reserve(text.size() + text.size() / 2);
  cut += CUT_MARK;
  const TextWords::Emit emit = [](void* to, int flags, const char* word, int size, int, int) {
    AppendToken(*static_cast<std::string*>(to), flags,
                std::string_view(word, static_cast<size_t>(size)));
    return SQLITE_OK;
  };
  (void)impl->words.Run(&cut, FTS5_TOKENIZE_DOCUMENT, text, emit);  // nothing stops it
  return cut;
}

bool IsBeginning(std::string_view word) {
  return word.ends_with('*') || EndsInOnePaired(word);
}

std::string Quoted(std::string_view text) {
  std::string quoted = "\"";
  for (const char c : text) {
    quoted.append(c == '"' ? 2 : 1, c);
  }
  return quoted + '"';
}

std::string TextQuery(std::string_view word) {
  return IsBeginning(word) ? Quoted(word) + " *" : Quoted(word);
}

}  // namespace fileindexd
