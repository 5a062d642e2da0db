// SPDX-License-Identifier: GPL-2.0-or-later
#include <charconv>

#include "extract/office_words.h"

namespace fileindexd {

namespace {

void SetPages(XmlPart& part, ContentSink& sink) {
  const std::string text = part.Attribute("page-count");
  int64_t pages = 0;
  std::from_chars(text.data(), text.data() + text.size(), pages);
  if (pages > 0) {
    sink.Set(ContentField::PAGES, pages);
  }
}

// Up to the end of <office:meta>. The first author counts: "creator" is who saved it last.
void SetOdfFields(XmlPart& part, ContentSink& sink) {
  std::string last_author;
  while (part.Next() && !(part.node == XmlPart::Node::END && part.name == "meta")) {
    if (part.node != XmlPart::Node::BEGIN) {
      continue;
    }
    const std::string name(part.name);
    if (name == "title") {
      sink.Set(ContentField::TITLE, TextOfElement(part));
    } else if (name == "initial-creator") {
      sink.Set(ContentField::AUTHOR, TextOfElement(part));
    } else if (name == "creator") {
      last_author = TextOfElement(part);
    } else if (name == "subject") {
      sink.Set(ContentField::SUBJECT, TextOfElement(part));
    } else if (name == "description") {
      sink.Set(ContentField::DESCRIPTION, TextOfElement(part));
    } else if (name == "keyword") {
      sink.Set(ContentField::KEYWORDS, TextOfElement(part));
    } else if (name == "creation-date") {
      SetDate(ContentField::CREATED, TextOfElement(part), sink);
    } else if (name == "document-statistic") {
      SetPages(part, sink);
    }
  }
  sink.Set(ContentField::AUTHOR, last_author);  // stays out where the first one is known
}

// Text stands in paragraphs and headings alone; what else lies between is layout.
class OdfWords {
 public:
  explicit OdfWords(ContentSink& text_sink) : sink(text_sink) {}

  void Take(XmlPart& part) {
    if (part.node == XmlPart::Node::TEXT) {
      if (paragraphs > 0) {
        sink.AddText(part.text);
      }
      return;
    }
    const bool begins = part.node == XmlPart::Node::BEGIN;
    if (part.name == "p" || part.name == "h") {
      paragraphs += begins ? 1 : paragraphs > 0 ? -1 : 0;
      sink.AddText("\n");
    } else if (begins && (part.name == "s" || part.name == "tab" || part.name == "line-break")) {
      sink.AddText(" ");
    } else if (begins && part.name == "table") {
      sink.AddText(part.Attribute("name"));
      sink.AddText("\n");
    } else if (part.name == "annotation" || part.name == "note") {
      sink.AddText("\n");  // stands within a paragraph, belongs to none of its words
      is_annotation = begins && part.name == "annotation";
    } else if (is_annotation && (part.name == "creator" || part.name.starts_with("date"))) {
      sink.AddText("\n");
    }
  }

 private:
  ContentSink& sink;
  bool is_annotation = false;
  int paragraphs = 0;  // a frame in a paragraph holds paragraphs again
};

}  // namespace

void ReadOdfPart(XmlPart& part, ContentSink& sink) {
  OdfWords words(sink);
  while (part.Next()) {
    const bool begins = part.node == XmlPart::Node::BEGIN;
    if (begins && part.name == "tracked-changes") {
      part.Skip();  // holds what was deleted
    } else if (begins && part.name == "meta") {
      SetOdfFields(part, sink);  // of the flat form
    } else if (sink.IsFull()) {
      return;
    } else {
      words.Take(part);
    }
  }
}

void ReadOdfMeta(XmlPart& part, ContentSink& sink) {
  while (part.Next()) {
    if (part.node == XmlPart::Node::BEGIN && part.name == "meta") {
      SetOdfFields(part, sink);
    }
  }
}

bool IsOdfEncrypted(XmlPart& part) {
  while (part.Next()) {
    if (part.node == XmlPart::Node::BEGIN && part.name == "encryption-data") {
      return true;
    }
  }
  return false;
}

}  // namespace fileindexd
