// SPDX-License-Identifier: GPL-2.0-or-later
// DESIGN: most bytes are ASCII, and most words occur again soon. So words of ASCII letters and
// digits alone are folded while they are copied, and their stems come out of a cache; everything
// else goes a slower way, character by character.
#include "index/text_tokenizer.h"

#include <algorithm>
#include <array>
#include <exception>
#include <memory>
#include <new>

#include "index/fts5_api.h"
#include "index/text_characters.h"
#include "index/text_parts.h"
#include "index/text_stems.h"
#include "index/token_memory.h"

namespace fileindexd {

namespace {

constexpr size_t MOST_BYTES = 64;  // of a word that is kept; the rest is cut off

using Emit = int (*)(void* context, int flags, const char* token, int size, int start, int end);

bool IsAsciiWord(unsigned char byte) {
  const CharacterClass type = ASCII_CLASSES[byte];
  return type != CharacterClass::SEPARATOR && type != CharacterClass::JOINER;
}

// A dot holds a number together.
bool IsDotInNumber(std::string_view text, size_t at) {
  const auto digit = [text](size_t i) { return text[i] >= '0' && text[i] <= '9'; };
  return text[at] == '.' && at > 0 && at + 1 < text.size() && digit(at - 1) && digit(at + 1);
}

// Up to the end of the last whole character that there is room for.
std::string_view Cut(std::string_view word) {
  if (word.size() <= MOST_BYTES) {
    return word;
  }
  size_t end = MOST_BYTES;
  while (end > 0 && (static_cast<unsigned char>(word[end]) & 0xc0) == 0x80) {
    --end;
  }
  return word.substr(0, end);
}

class Tokenizer {
 public:
  explicit Tokenizer(const std::string& language) : stems(language) {}

  bool IsGood() const { return stems.IsGood(); }
  int Run(void* to, int flags, std::string_view text, Emit function);

 private:
  size_t AsciiWord(std::string_view text, size_t at);
  size_t Word(std::string_view text, size_t at);
  size_t AnyWord(std::string_view text, size_t at);
  void PutAgain(std::string_view tokens, size_t start, size_t end);
  size_t Pairs(std::string_view text, size_t at);
  void Fold(std::string_view stem);
  void PutStem(std::string_view stem, std::string_view word, size_t start, size_t end);
  void PutParts(size_t start, size_t end);
  bool HoldsWordsFrom(std::string_view text, size_t at);

  void Put(std::string_view token, size_t start, size_t end, int flags = 0) {
    if (code == SQLITE_OK && !token.empty()) {
      if (is_recording) {
        record += static_cast<char>(flags);
        record += static_cast<char>(token.size());
        record += token;
      }
      code = emit(context, flags, token.data(), static_cast<int>(token.size()),
                  static_cast<int>(start), static_cast<int>(end));
    }
  }

  Stems stems;
  CharacterTable characters;
  // Of the call that runs.
  void* context = nullptr;
  Emit emit = nullptr;
  int code = SQLITE_OK;
  bool is_question = false;
  bool is_beginning = false;  // the question's word is the beginning of one
  // Of the word at hand.
  std::string exact;  // lower case, with accents
  std::string folded_stem;
  TextWord word;
  bool is_recording = false;
  std::string record;  // what is put, to be remembered
  TokenMemory memory;
};

int Tokenizer::Run(void* to, int flags, std::string_view text, Emit function) {
  context = to;
  emit = function;
  code = SQLITE_OK;
  is_recording = false;
  is_question = (flags & FTS5_TOKENIZE_QUERY) != 0;
  is_beginning = (flags & FTS5_TOKENIZE_PREFIX) != 0;
  for (size_t at = 0; at < text.size() && code == SQLITE_OK;) {
    const auto byte = static_cast<unsigned char>(text[at]);
    if (byte < 0x80) {
      at = IsAsciiWord(byte) ? AsciiWord(text, at) : at + 1;
      continue;
    }
    const Character character = CharacterAt(text, at);
    const CharacterClass type = characters.Of(character.code).type;
    if (type == CharacterClass::SEPARATOR || type == CharacterClass::MARK) {
      at += character.size;
    } else {
      at = type == CharacterClass::PAIRED ? Pairs(text, at) : Word(text, at);
    }
  }
  return code;
}

// The quick way. Whatever is more than letters and digits, or may have parts, goes the slow one.
size_t Tokenizer::AsciiWord(std::string_view text, size_t at) {
  std::array<char, MOST_BYTES> folded;  // NOLINT: what is read has been written
  size_t size = 0;
  bool has_small = false;
  bool has_digit = false;
  bool has_inner_capital = false;
  size_t end = at;
  for (; end < text.size(); ++end) {
    const auto byte = static_cast<unsigned char>(text[end]);
    const CharacterClass type = byte < 0x80 ? ASCII_CLASSES[byte] : CharacterClass::MARK;
    if (type == CharacterClass::SEPARATOR) {
      break;
    }
    if (type == CharacterClass::MARK || type == CharacterClass::JOINER) {
      return Word(text, at);
    }
    has_small = has_small || type == CharacterClass::LETTER;
    has_digit = has_digit || type == CharacterClass::DIGIT;
    has_inner_capital = has_inner_capital || (type == CharacterClass::UPPER && end != at);
    if (size < MOST_BYTES) {
      folded[size++] = static_cast<char>(type == CharacterClass::UPPER ? byte + 0x20 : byte);
    }
  }
  if ((has_small && has_inner_capital) || (end < text.size() && IsDotInNumber(text, end))) {
    return Word(text, at);
  }

  const std::string_view token(folded.data(), size);
  Put(token, at, end);
  if (!has_digit && !is_beginning && end - at <= MOST_BYTES) {
    PutStem(stems.Of(token), token, at, end);
  }
  return end;
}

size_t Tokenizer::Word(std::string_view text, size_t at) {
  size_t end = at;
  while (end < text.size() && static_cast<unsigned char>(text[end]) < 0x80 &&
         (ASCII_CLASSES[static_cast<unsigned char>(text[end])] != CharacterClass::SEPARATOR ||
          IsDotInNumber(text, end))) {
    ++end;
  }
  const bool is_ascii = end == text.size() || static_cast<unsigned char>(text[end]) < 0x80;
  if (!is_ascii || is_question || end - at > TokenMemory::MOST_BYTES) {
    return AnyWord(text, at);
  }

  const std::string_view raw = text.substr(at, end - at);
  const std::string* tokens = memory.Find(raw);
  if (tokens != nullptr) {
    PutAgain(*tokens, at, end);
    return end;
  }
  record.clear();
  is_recording = true;
  end = AnyWord(text, at);
  is_recording = false;
  if (code == SQLITE_OK) {  // else it is not all of them
    memory.Remember(raw, record);
  }
  return end;
}

void Tokenizer::PutAgain(std::string_view tokens, size_t start, size_t end) {
  while (!tokens.empty()) {
    const auto size = static_cast<size_t>(static_cast<unsigned char>(tokens[1]));
    Put(tokens.substr(2, size), start, end, tokens[0]);
    tokens.remove_prefix(2 + size);
  }
}

size_t Tokenizer::AnyWord(std::string_view text, size_t at) {
  exact.clear();
  word.Clear();
  const size_t start = at;
  bool has_marks = false;
  while (at < text.size()) {
    const Character character = CharacterAt(text, at);
    const auto byte = static_cast<size_t>(character.code);
    const bool has_room = word.folded.size() <= MOST_BYTES;  // nothing is kept of the rest
    if (IsDotInNumber(text, at) || text[at] == '_') {
      if (has_room) {
        word.Add(CharacterClass::JOINER, text.substr(at, 1));
      }
      ++at;
      continue;
    }
    if (character.code < 0x80 && ASCII_CLASSES[byte] == CharacterClass::SEPARATOR) {
      break;
    }
    const CharacterTable::Entry& entry = characters.Of(character.code);
    if (entry.type == CharacterClass::SEPARATOR || entry.type == CharacterClass::PAIRED) {
      break;
    }
    has_marks = has_marks || entry.type == CharacterClass::MARK;
    if (entry.type != CharacterClass::MARK && has_room) {
      exact += entry.Exact();
      word.Add(entry.type, entry.Folded());
    }
    at += character.size;
  }
  word.EndJoiners();
  const std::string_view token = Cut(word.folded);
  Put(token, start, at);
  if (token.size() == word.folded.size() && word.IsLetters() && !is_beginning) {
    // Stems are found by the accents, which may have come as characters of their own.
    const std::string composed = has_marks ? LowerComposed(text.substr(start, at - start)) : exact;
    Fold(stems.Of(composed));
    PutStem(folded_stem, token, start, at);
  }
  if (token.size() == word.folded.size() && !is_question) {
    PutParts(start, at);
  }
  return at;
}

void Tokenizer::Fold(std::string_view stem) {
  folded_stem.clear();
  for (size_t at = 0; at < stem.size();) {
    const Character character = CharacterAt(stem, at);
    folded_stem += characters.Of(character.code).Folded();
    at += character.size;
  }
}

void Tokenizer::PutStem(std::string_view stem, std::string_view whole, size_t start, size_t end) {
  if (stem != whole && stem.size() <= MOST_BYTES) {
    Put(stem, start, end, FTS5_TOKEN_COLOCATED);
  }
}

void Tokenizer::PutParts(size_t start, size_t end) {
  for (const std::string_view part : word.Parts()) {
    Put(part, start, end, FTS5_TOKEN_COLOCATED);
    if (part.front() < '0' || part.front() > '9') {
      PutStem(stems.Of(part), part, start, end);
    }
  }
}

// Each character with the one behind it, and the last one alone.
size_t Tokenizer::Pairs(std::string_view text, size_t at) {
  struct Place {
    int32_t code = 0;
    size_t start = 0;
    size_t end = 0;
  };
  Place before;
  Place last;
  std::string pair;
  const auto put_pair = [&] {
    pair.clear();
    AppendUtf8(before.code, pair);
    AppendUtf8(last.code, pair);
    Put(pair, before.start, last.end);
  };
  while (at < text.size() && code == SQLITE_OK) {
    const Character character = CharacterAt(text, at);
    if (character.size == 1 || characters.Of(character.code).type != CharacterClass::PAIRED) {
      break;
    }
    const int32_t plain = characters.Plain(character.code);
    const int32_t joined = last.code == 0 ? 0 : Joined(last.code, plain);
    if (joined != 0) {
      last = {joined, last.start, at + character.size};
    } else {
      if (before.code != 0) {
        put_pair();
      }
      before = last;
      last = {plain, at, at + character.size};
    }
    at += character.size;
  }
  const bool is_only = before.code == 0;
  if (!is_only) {
    put_pair();
  }
  // A question's last character may go on in the text; if words follow, their place counts.
  if (is_only || !is_question || HoldsWordsFrom(text, at)) {
    pair.clear();
    AppendUtf8(last.code, pair);
    Put(pair, last.start, last.end);
  }
  return at;
}

bool Tokenizer::HoldsWordsFrom(std::string_view text, size_t at) {
  while (at < text.size()) {
    const Character character = CharacterAt(text, at);
    const CharacterClass type = characters.Of(character.code).type;
    if (type != CharacterClass::SEPARATOR && type != CharacterClass::MARK) {
      return true;
    }
    at += character.size;
  }
  return false;
}

// Whether the last characters that count are one of Han, kana or Hangul alone.
bool EndsInOnePaired(std::string_view word) {
  CharacterTable characters;
  int run = 0;
  for (size_t at = 0; at < word.size();) {
    const Character character = CharacterAt(word, at);
    const CharacterClass type = characters.Of(character.code).type;
    if (type == CharacterClass::PAIRED) {
      ++run;
    } else if (type != CharacterClass::SEPARATOR && type != CharacterClass::MARK) {
      run = 0;
    }
    at += character.size;
  }
  return run == 1;
}

int Create(void* /*context*/, const char** arguments, int count, Fts5Tokenizer** made) {
  try {
    auto tokenizer = std::make_unique<Tokenizer>(count > 0 ? arguments[0] : NO_LANGUAGE);
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
  delete reinterpret_cast<Tokenizer*>(tokenizer);
}

int Tokenize(Fts5Tokenizer* tokenizer, void* context, int flags, const char* text, int size,
             Emit emit) {
  try {
    return reinterpret_cast<Tokenizer*>(tokenizer)->Run(
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
  explicit Impl(const std::string& language) : tokenizer(language) {}
  Tokenizer tokenizer;
};

TextCutter::TextCutter(const std::string& language) : impl(std::make_unique<Impl>(language)) {}

TextCutter::~TextCutter() = default;

void TextCutter::Cut(std::string_view text, bool is_question, const Visit& visit) {
  const Emit emit = [](void* to, int /*flags*/, const char* word, int size, int start, int end) {
    const auto& visitor = *static_cast<const Visit*>(to);
    const bool more = visitor(std::string_view(word, static_cast<size_t>(size)),
                              static_cast<size_t>(start), static_cast<size_t>(end));
    return more ? SQLITE_OK : SQLITE_DONE;
  };
  Visit kept = visit;
  (void)impl->tokenizer.Run(&kept, is_question ? FTS5_TOKENIZE_QUERY : FTS5_TOKENIZE_DOCUMENT, text,
                            emit);  // whether it was stopped does not count
}

bool IsBeginning(std::string_view word) {
  return word.ends_with('*') || EndsInOnePaired(word);
}

std::string TextQuery(std::string_view word) {
  std::string query = "\"";
  for (const char c : word) {
    query.append(c == '"' ? 2 : 1, c);
  }
  query += '"';
  return IsBeginning(word) ? query + " *" : query;
}

}  // namespace fileindexd
