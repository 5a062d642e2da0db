// SPDX-License-Identifier: GPL-2.0-or-later
#include "extract/xml_part.h"

#include <utility>

namespace fileindexd {

namespace {

std::string_view View(const xmlChar* text) {
  return text != nullptr ? reinterpret_cast<const char*>(text) : "";
}

int ReadSource(void* source, char* into, int count) {
  return static_cast<int>(
      (*static_cast<XmlPart::Source*>(source))(into, static_cast<size_t>(count)));
}

}  // namespace

XmlPart::XmlPart(Source bytes_source) : source(std::move(bytes_source)) {
  // Half a part is better than none, so the parser goes on behind errors.
  reader = xmlReaderForIO(ReadSource, nullptr, &source, nullptr, nullptr,
                          XML_PARSE_NONET | XML_PARSE_RECOVER | XML_PARSE_NOERROR |
                              XML_PARSE_NOWARNING | XML_PARSE_COMPACT);
  if (reader != nullptr) {
    // Some errors are printed in spite of the options.
    xmlTextReaderSetStructuredErrorHandler(
        reader, [](void*, xmlErrorPtr) {}, nullptr);
  }
}

XmlPart::~XmlPart() {
  if (reader != nullptr) {
    xmlFreeTextReader(reader);
  }
}

bool XmlPart::Step() {
  const int code = reader != nullptr ? xmlTextReaderRead(reader) : -1;
  is_damaged = is_damaged || code < 0;
  return code == 1;
}

bool XmlPart::Next() {
  if (std::exchange(is_end_due, false)) {
    node = Node::END;
    return true;
  }
  while (Step()) {
    switch (xmlTextReaderNodeType(reader)) {
      case XML_READER_TYPE_ELEMENT:
        node = Node::BEGIN;
        name = View(xmlTextReaderConstLocalName(reader));
        is_end_due = xmlTextReaderIsEmptyElement(reader) == 1;
        return true;
      case XML_READER_TYPE_END_ELEMENT:
        node = Node::END;
        name = View(xmlTextReaderConstLocalName(reader));
        return true;
      case XML_READER_TYPE_TEXT:
      case XML_READER_TYPE_CDATA:
      case XML_READER_TYPE_WHITESPACE:
      case XML_READER_TYPE_SIGNIFICANT_WHITESPACE:
        node = Node::TEXT;
        text = View(xmlTextReaderConstValue(reader));
        return true;
      default:
        break;
    }
  }
  return false;
}

void XmlPart::Skip() {
  if (std::exchange(is_end_due, false)) {
    return;
  }
  const int depth = xmlTextReaderDepth(reader);
  while (Step() && (xmlTextReaderDepth(reader) > depth ||
                    xmlTextReaderNodeType(reader) != XML_READER_TYPE_END_ELEMENT)) {
  }
}

std::string XmlPart::Attribute(const char* attribute_name) const {
  std::string value;
  // The reader itself finds an attribute by its name with the prefix; the names wanted here are
  // unique without.
  for (int code = xmlTextReaderMoveToFirstAttribute(reader); code == 1;
       code = xmlTextReaderMoveToNextAttribute(reader)) {
    if (View(xmlTextReaderConstLocalName(reader)) == attribute_name) {
      value = View(xmlTextReaderConstValue(reader));
      break;
    }
  }
  xmlTextReaderMoveToElement(reader);
  return value;
}

}  // namespace fileindexd
