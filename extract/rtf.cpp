// SPDX-License-Identifier: GPL-2.0-or-later
// The fields come from the group "info". The text of a file of its own is left to a converter; that
// of a member, which no converter is given, is read here.
#include <iconv.h>

#include <array>
#include <chrono>
#include <map>
#include <string>
#include <vector>

#include "extract/format.h"
#include "extract/memory_file.h"
#include "extract/nested.h"
#include "extract/rtf_tokens.h"
#include "extract/utf16.h"

namespace fileindexd {

namespace {

constexpr int64_t MAX_RTF = 128 << 20;  // pictures are in there, two letters a byte
constexpr size_t MAX_GROUPS = 1000;     // within each other

enum class Place { BODY, TITLE, AUTHOR, SUBJECT, KEYWORDS, COMMENT, CREATED, FONTS, NOWHERE };

struct Group {
  Place place = Place::BODY;
  int code_page = 0;       // of the font; 0: the document's
  int fallback_bytes = 1;  // that stand for a letter that is also given by number
};

// Words that begin what is no text, or a field.
const std::map<std::string_view, Place>& Places() {
  static const std::map<std::string_view, Place> places{
      {"title", Place::TITLE},        {"author", Place::AUTHOR},
      {"subject", Place::SUBJECT},    {"keywords", Place::KEYWORDS},
      {"doccomm", Place::COMMENT},    {"creatim", Place::CREATED},
      {"fonttbl", Place::FONTS},      {"info", Place::NOWHERE},
      {"colortbl", Place::NOWHERE},   {"stylesheet", Place::NOWHERE},
      {"pict", Place::NOWHERE},       {"object", Place::NOWHERE},
      {"fldinst", Place::NOWHERE},    {"listtable", Place::NOWHERE},
      {"revtbl", Place::NOWHERE},     {"themedata", Place::NOWHERE},
      {"datastore", Place::NOWHERE},  {"xmlnstbl", Place::NOWHERE},
      {"filetbl", Place::NOWHERE},    {"bkmkstart", Place::NOWHERE},
      {"bkmkend", Place::NOWHERE},    {"latentstyles", Place::NOWHERE},
      {"nonshppict", Place::NOWHERE}, {"generator", Place::NOWHERE},
  };
  return places;
}

int CodePageOfCharset(int charset) {
  static const std::map<int, int> known{
      {128, 932},  {129, 949},  {134, 936},  {136, 950},  {161, 1253}, {162, 1254}, {163, 1258},
      {177, 1255}, {178, 1256}, {186, 1257}, {204, 1251}, {222, 874},  {238, 1250}};
  const auto page = known.find(charset);
  return page != known.end() ? page->second : 0;
}

// Text that words stand for.
const char* TextOfWord(std::string_view word) {
  static const std::map<std::string_view, const char*> texts{
      {"par", "\n"},           {"line", "\n"},       {"tab", " "},         {"cell", "\n"},
      {"row", "\n"},           {"sect", "\n"},       {"page", "\n"},       {"emdash", "\u2014"},
      {"endash", "\u2013"},    {"lquote", "\u2018"}, {"rquote", "\u2019"}, {"ldblquote", "\u201c"},
      {"rdblquote", "\u201d"}, {"bullet", "\u2022"}, {"emspace", " "},     {"enspace", " "}};
  const auto text = texts.find(word);
  return text != texts.end() ? text->second : nullptr;
}

std::string FromCodePage(int code_page, std::string_view bytes) {
  const std::string charset = "CP" + std::to_string(code_page);
  const iconv_t converter = iconv_open("UTF-8", charset.c_str());
  if (converter == reinterpret_cast<iconv_t>(-1)) {  // NOLINT: iconv_open's way to fail
    return code_page == 1252 ? std::string(bytes.size(), ' ') : FromCodePage(1252, bytes);
  }
  std::string text;
  std::array<char, 4096> block;
  char* in = const_cast<char*>(bytes.data());  // NOLINT: iconv's type
  size_t in_left = bytes.size();
  while (in_left > 0) {
    char* out = block.data();
    size_t out_left = block.size();
    const size_t before = in_left;
    const size_t code = iconv(converter, &in, &in_left, &out, &out_left);
    text.append(block.data(), block.size() - out_left);
    if (code == static_cast<size_t>(-1) && in_left == before && out_left == block.size()) {
      text += ' ';  // no letter of that page
      ++in;
      --in_left;
    }
  }
  iconv_close(converter);
  return text;
}

class RtfReader {
 public:
  RtfReader(std::string_view bytes, bool wants_text, ContentSink& text_sink)
      : tokens(bytes), wants_body(wants_text), sink(text_sink) {}

  void Read() {
    const Allowance allowance;
    unsigned steps = 0;
    for (RtfToken token = tokens.Next(); token.type != RtfToken::Type::END; token = tokens.Next()) {
      if (sink.IsFull() || (++steps % 65536 == 0 && allowance.IsSpent())) {
        break;
      }
      // The information stands before the text: of that nothing is wanted any more.
      if (!wants_body && token.type == RtfToken::Type::WORD && token.word == "pard") {
        break;
      }
      Take(token);
    }
    Flush();
    SetFields();
  }

 private:
  void Take(const RtfToken& token) {
    switch (token.type) {
      case RtfToken::Type::GROUP_BEGIN:
        Flush();
        ++depth;
        if (groups.size() < MAX_GROUPS) {
          groups.push_back(groups.back());
        }
        break;
      case RtfToken::Type::GROUP_END:
        Flush();
        if (depth <= groups.size() && groups.size() > 1) {
          groups.pop_back();
        }
        depth -= depth > 0 ? 1 : 0;
        break;
      case RtfToken::Type::BYTE:
        TakeByte(token.byte);
        break;
      case RtfToken::Type::SYMBOL:
        TakeSymbol(token.byte);
        break;
      default:
        TakeWord(token);
        break;
    }
  }

  void TakeByte(char byte) {
    if (skipped_bytes > 0) {
      --skipped_bytes;
    } else {
      packed += byte;
    }
  }

  void TakeSymbol(char symbol) {
    if (symbol == '*') {
      groups.back().place = Place::NOWHERE;  // unless the word behind it is known
    } else if (symbol == '~') {
      AddText(" ");
    } else if (symbol == '_') {
      AddText("-");
    } else if (symbol == '\\' || symbol == '{' || symbol == '}') {
      TakeByte(symbol);
    } else if (symbol == '\r' || symbol == '\n') {
      AddText("\n");
    }
  }

  void TakeWord(const RtfToken& token) {
    Group& group = groups.back();
    skipped_bytes = 0;
    const auto place = Places().find(token.word);
    const char* text = TextOfWord(token.word);
    if (place != Places().end()) {
      Flush();
      group.place = place->second;
    } else if (text != nullptr) {
      AddText(text);
    } else if (token.word == "u") {
      Flush();
      joiner.Add(static_cast<uint16_t>(token.number), unpacked);
      skipped_bytes = group.fallback_bytes;
    } else if (token.word == "uc") {
      group.fallback_bytes = token.number;
    } else if (token.word == "ansicpg") {
      document_page = token.number;
    } else if (token.word == "f" && group.place == Place::FONTS) {
      font = token.number;
    } else if (token.word == "fcharset" && group.place == Place::FONTS &&
               pages.size() < MAX_GROUPS) {
      pages[font] = CodePageOfCharset(token.number);
    } else if (token.word == "f" || token.word == "plain" || token.word == "pard") {
      Flush();
      const auto page = pages.find(token.number);
      group.code_page = token.word == "f" && page != pages.end() ? page->second : 0;
    } else if (group.place == Place::CREATED) {
      date[std::string(token.word.substr(0, 4))] = token.number;
    }
  }

  void AddText(std::string_view text) {
    Flush();
    unpacked += text;
    Flush();
  }

  // Hands on what has come together in this group.
  void Flush() {
    const Group& group = groups.back();
    if (!packed.empty()) {
      unpacked += FromCodePage(group.code_page != 0 ? group.code_page : document_page, packed);
      packed.clear();
    }
    if (group.place == Place::BODY && wants_body) {
      sink.AddText(unpacked);
    } else if (group.place != Place::BODY && group.place < Place::CREATED) {
      std::string& field = fields[group.place];
      field += unpacked.substr(
          0, ContentSink::MAX_FIELD - std::min(field.size(), ContentSink::MAX_FIELD));
    }
    unpacked.clear();
  }

  void SetFields() {
    sink.Set(ContentField::TITLE, fields[Place::TITLE]);
    sink.Set(ContentField::AUTHOR, fields[Place::AUTHOR]);
    sink.Set(ContentField::SUBJECT, fields[Place::SUBJECT]);
    sink.Set(ContentField::KEYWORDS, fields[Place::KEYWORDS]);
    sink.Set(ContentField::DESCRIPTION, fields[Place::COMMENT]);
    const std::chrono::year_month_day day{std::chrono::year(date["yr"]),
                                          std::chrono::month(static_cast<unsigned>(date["mo"])),
                                          std::chrono::day(static_cast<unsigned>(date["dy"]))};
    if (day.ok() && date["yr"] > 0) {
      sink.Set(ContentField::CREATED,
               int64_t{std::chrono::sys_days(day).time_since_epoch().count()} * 86400 +
                   int64_t{date["hr"]} * 3600 + int64_t{date["min"]} * 60 + date["sec"]);
    }
  }

  RtfTokens tokens;
  bool wants_body;
  ContentSink& sink;
  std::vector<Group> groups{Group{}};
  size_t depth = 1;          // of groups, those that are not kept included
  std::map<int, int> pages;  // code pages by fonts
  int font = 0;
  int document_page = 1252;
  int skipped_bytes = 0;
  std::string packed;    // bytes of the code page
  std::string unpacked;  // UTF-8
  Utf16Joiner joiner;
  std::map<Place, std::string> fields;
  std::map<std::string, int> date;
};

}  // namespace

bool ReadRtf(const Document& document, ContentSink& sink, std::string& why) {
  sink.SetKind(Kind::DOCUMENT);
  std::string bytes;
  if (!ReadWhole(document, MAX_RTF, bytes, why)) {
    return false;
  }
  if (!bytes.starts_with("{\\rtf")) {
    why = "not an RTF file";
    return false;
  }
  const bool is_member = document.depth > 0;
  RtfReader(bytes, is_member, sink).Read();
  if (!is_member) {
    sink.converter = "unrtf";
  }
  return true;
}

}  // namespace fileindexd
