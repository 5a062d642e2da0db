// SPDX-License-Identifier: GPL-2.0-or-later
#include "extract/office_words.h"

#include <algorithm>
#include <array>
#include <charconv>

#include "extract/iso_date.h"

namespace fileindexd {

namespace {

// Twice the same text in another form, text that was deleted, how a word is pronounced, and the
// numbers of slides.
bool IsLeftOut(std::string_view name) {
  constexpr std::array<std::string_view, 5> NAMES{"Fallback", "moveFrom", "del", "rPh", "fld"};
  return std::find(NAMES.begin(), NAMES.end(), name) != NAMES.end();
}

bool IsGap(std::string_view name) {
  constexpr std::array<std::string_view, 8> NAMES{"tab", "br", "cr",      "p",
                                                  "tc",  "si", "comment", "cm"};
  return std::find(NAMES.begin(), NAMES.end(), name) != NAMES.end();
}

// Of the heads and feet of a sheet's pages.
bool IsPageEdge(std::string_view name) {
  return name.ends_with("Header") || name.ends_with("Footer");
}

// Their text is mixed with marks: &L, &C and &R begin a third of the line, &"font", &12 and &K with
// six digits change the look, && is the letter itself, and others stand for a number or a name.
std::string WithoutMarks(std::string_view line) {
  std::string words;
  for (size_t at = 0; at < line.size(); ++at) {
    if (line[at] != '&') {
      words += line[at];
      continue;
    }
    const char mark = ++at < line.size() ? line[at] : '&';
    if (mark == '&') {
      words += mark;
    } else if (mark == '"') {
      at = std::min(line.find('"', at + 1), line.size());
    } else if (mark >= '0' && mark <= '9') {
      at = std::min(line.find_first_not_of("0123456789", at), line.size()) - 1;
    } else if (mark == 'K') {
      at += 6;
    } else {
      constexpr std::string_view LOOKS = "BIUESXYOH";  // within a word, too
      words += LOOKS.find(mark) == std::string_view::npos ? " " : "";
    }
  }
  return words;
}

}  // namespace

void SetDate(ContentField field, std::string_view text, ContentSink& sink) {
  const std::optional<int64_t> date = ParseIsoDate(text);
  if (date.has_value()) {
    sink.Set(field, *date);
  }
}

std::string TextOfElement(XmlPart& part) {
  std::string text;
  int depth = 1;
  while (depth > 0 && part.Next()) {
    if (part.node == XmlPart::Node::TEXT) {
      text += part.text.substr(
          0, ContentSink::MAX_FIELD - std::min(text.size(), ContentSink::MAX_FIELD));
    } else {
      depth += part.node == XmlPart::Node::BEGIN ? 1 : -1;
    }
  }
  return text;
}

void AddOoxmlWords(XmlPart& part, ContentSink& sink) {
  bool is_text = false;
  while (!sink.IsFull() && part.Next()) {
    if (part.node == XmlPart::Node::TEXT) {
      if (is_text) {
        sink.AddText(part.text);
      }
    } else if (part.node == XmlPart::Node::BEGIN && IsLeftOut(part.name)) {
      part.Skip();
    } else if (part.name == "t" || part.name == "text") {
      is_text = part.node == XmlPart::Node::BEGIN;
      sink.AddText(part.name == "text" && !is_text ? "\n" : "");
    } else if (part.name == "noBreakHyphen" && part.node == XmlPart::Node::BEGIN) {
      sink.AddText("-");
    } else if (part.node == XmlPart::Node::END && IsGap(part.name)) {
      sink.AddText("\n");
    }
  }
}

void AddSheetWords(XmlPart& part, ContentSink& sink) {
  bool is_wanted = false;  // the cell's value: not an index into the shared strings
  bool is_text = false;
  while (!sink.IsFull() && part.Next()) {
    if (part.node == XmlPart::Node::TEXT) {
      if (is_text) {
        sink.AddText(part.text);
      }
      continue;
    }
    const bool begins = part.node == XmlPart::Node::BEGIN;
    if (part.name == "c") {
      const std::string type = begins ? part.Attribute("t") : "";
      is_wanted =
          type.empty() || type == "n" || type == "str" || type == "inlineStr" || type == "d";
      sink.AddText(begins ? "" : " ");
    } else if (part.name == "v" || part.name == "t") {
      is_text = begins && is_wanted;
    } else if (begins && part.name == "rPh") {
      part.Skip();
    } else if (begins && IsPageEdge(part.name)) {
      sink.AddText(WithoutMarks(TextOfElement(part)) + "\n");
    }
  }
}

void AddSheetNames(XmlPart& part, ContentSink& sink) {
  while (!sink.IsFull() && part.Next()) {
    if (part.node == XmlPart::Node::BEGIN && part.name == "sheet") {
      sink.AddText(part.Attribute("name"));
      sink.AddText("\n");
    }
  }
}

void SetOoxmlFields(XmlPart& part, ContentSink& sink) {
  while (part.Next()) {
    if (part.node != XmlPart::Node::BEGIN) {
      continue;
    }
    const std::string name(part.name);
    if (name == "title") {
      sink.Set(ContentField::TITLE, TextOfElement(part));
    } else if (name == "creator") {
      sink.Set(ContentField::AUTHOR, TextOfElement(part));
    } else if (name == "subject") {
      sink.Set(ContentField::SUBJECT, TextOfElement(part));
    } else if (name == "description") {
      sink.Set(ContentField::DESCRIPTION, TextOfElement(part));
    } else if (name == "keywords") {
      sink.Set(ContentField::KEYWORDS, TextOfElement(part));
    } else if (name == "created") {
      SetDate(ContentField::CREATED, TextOfElement(part), sink);
    } else if (name == "Pages" || name == "Slides") {
      const std::string text = TextOfElement(part);
      int64_t pages = 0;
      std::from_chars(text.data(), text.data() + text.size(), pages);
      if (pages > 0) {
        sink.Set(ContentField::PAGES, pages);
      }
    }
  }
}

}  // namespace fileindexd
