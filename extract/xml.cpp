// SPDX-License-Identifier: GPL-2.0-or-later
#include <libxml/xmlreader.h>

#include <cerrno>
#include <memory>
#include <new>
#include <optional>
#include <utility>

#include "extract/format.h"
#include "extract/html.h"
#include "extract/memory_file.h"
#include "extract/read_at.h"

namespace fileindexd {

namespace {

// No limits lifted, nothing fetched, no entity put in.
constexpr int OPTIONS =
    XML_PARSE_NONET | XML_PARSE_NOERROR | XML_PARSE_NOWARNING | XML_PARSE_RECOVER;

// Below the root: a title further down is one of many.
constexpr int DEEPEST_FIELD = 4;

struct Source {
  const Document& document;
  int64_t at = 0;
};

int ReadSource(void* context, char* buffer, int length) {
  auto& source = *static_cast<Source*>(context);
  const size_t got = ReadAt(source.document, source.at, buffer, static_cast<size_t>(length));
  source.at += static_cast<int64_t>(got);
  return got == 0 && errno != 0 ? -1 : static_cast<int>(got);
}

std::string_view View(const xmlChar* text) {
  return text == nullptr ? std::string_view() : reinterpret_cast<const char*>(text);
}

// Elements whose text is a field, whatever their namespace's prefix.
std::optional<ContentField> FieldOf(std::string_view element, int depth) {
  if (depth > DEEPEST_FIELD) {
    return std::nullopt;
  }
  if (element == "title") {
    return ContentField::TITLE;
  }
  if (element == "creator" || element == "author") {
    return ContentField::AUTHOR;
  }
  if (element == "description" || element == "desc") {
    return ContentField::DESCRIPTION;
  }
  if (element == "keywords" || element == "keyword") {
    return ContentField::KEYWORDS;
  }
  return std::nullopt;
}

bool IsHidden(std::string_view prefixed) {
  const std::string_view element = prefixed.substr(prefixed.rfind(':') + 1);  // npos + 1 is 0
  return element == "script" || element == "style" || element == "binary" ||
         element == "binary-data";
}

// Walks the nodes. What stands in a field's element is text as well: it is part of the document.
class Walk {
 public:
  Walk(xmlTextReader* opened, ContentSink& filled) : reader(opened), sink(filled) {}

  void Take() {
    const std::string_view name = View(xmlTextReaderConstLocalName(reader));
    const int depth = xmlTextReaderDepth(reader);
    switch (xmlTextReaderNodeType(reader)) {
      case XML_READER_TYPE_ELEMENT:
        Begin(name, depth);
        break;
      case XML_READER_TYPE_END_ELEMENT:
        End(depth);
        break;
      case XML_READER_TYPE_TEXT:
      case XML_READER_TYPE_CDATA:
        Add(View(xmlTextReaderConstValue(reader)));
        break;
      case XML_READER_TYPE_SIGNIFICANT_WHITESPACE:
      case XML_READER_TYPE_WHITESPACE:
        sink.AddText(" ");
        break;
      default:
        break;
    }
  }

  bool has_element = false;

 private:
  void Begin(std::string_view name, int depth) {
    has_element = true;
    sink.AddText(" ");
    if (xmlTextReaderIsEmptyElement(reader) == 1) {
      return;
    }
    if (hidden_from < 0 && IsHidden(name)) {
      hidden_from = depth;
    }
    if (!field) {
      field = FieldOf(name, depth);
      field_from = depth;
      value.clear();
    }
  }

  void End(int depth) {
    sink.AddText(" ");
    if (depth == hidden_from) {
      hidden_from = -1;
    }
    if (field && depth == field_from) {
      sink.Set(*field, value);
      field.reset();
    }
  }

  void Add(std::string_view text) {
    if (hidden_from >= 0) {
      return;
    }
    sink.AddText(text);
    if (field && value.size() < ContentSink::MAX_FIELD) {
      value += text.substr(0, ContentSink::MAX_FIELD);
      value += ' ';
    }
  }

  xmlTextReader* reader;
  ContentSink& sink;
  int hidden_from = -1;  // depth of the outermost element that nobody reads; -1: none
  std::optional<ContentField> field;
  int field_from = 0;
  std::string value;
};

// It begins with a mark, whatever is wrong with the rest.
bool IsMeantForXml(const Document& document) {
  const std::string head = FirstBytes(document, 256);
  const size_t begin = head.find_first_not_of(" \t\r\n\xEF\xBB\xBF");
  return begin != std::string::npos && head[begin] == '<' &&
         head.find('>', begin) != std::string::npos;
}

// Behind a fault the parser gives nothing, and of some it gives nothing at all. Pages have the same
// marks, and their parser goes on.
void ReadBeyondFault(const Document& document, ContentSink::Mark&& begin, ContentSink& sink) {
  Content found = sink.content;
  sink.ReturnTo(std::move(begin));
  sink.content.texts = found.texts;
  std::string why;
  (void)ReadXmlAsHtml(document, IsHidden, sink, why);
  if (sink.content.text.size() < found.text.size()) {
    sink.content = std::move(found);
  }
}

}  // namespace

bool ReadXml(const Document& document, ContentSink& sink, std::string& why) {
  Source source = {document};
  const std::unique_ptr<xmlTextReader, decltype(&xmlFreeTextReader)> reader(
      xmlReaderForIO(ReadSource, nullptr, &source, nullptr, nullptr, OPTIONS), &xmlFreeTextReader);
  if (reader == nullptr) {
    throw std::bad_alloc();
  }
  xmlTextReaderSetErrorHandler(
      reader.get(), [](void*, const char*, xmlParserSeverities, xmlTextReaderLocatorPtr) {},
      nullptr);

  ContentSink::Mark begin = sink.Here();
  Walk walk(reader.get(), sink);
  int result = 1;
  while (!sink.IsFull() && (result = xmlTextReaderRead(reader.get())) == 1) {
    walk.Take();
  }
  if (result < 0) {
    const bool is_meant = walk.has_element || IsMeantForXml(document);
    why = is_meant ? "damaged XML" : "not an XML file";
    if (is_meant) {
      ReadBeyondFault(document, std::move(begin), sink);
    }
    return false;
  }
  return true;
}

}  // namespace fileindexd
