// SPDX-License-Identifier: GPL-2.0-or-later
// One XML file of a document, element by element.
#pragma once

#include <libxml/xmlreader.h>
#include <sys/types.h>

#include <functional>
#include <string>
#include <string_view>

namespace fileindexd {

// Names are local ones: producers choose prefixes as they like. Nothing outside is loaded and no
// entity of the file's own is expanded.
class XmlPart {
 public:
  enum class Node { BEGIN, END, TEXT };
  // Gives the next bytes: 0 at the end, -1 where they cannot be had.
  using Source = std::function<ssize_t(char* into, size_t count)>;

  explicit XmlPart(Source bytes_source);
  ~XmlPart();
  XmlPart(const XmlPart&) = delete;
  XmlPart& operator=(const XmlPart&) = delete;

  // Goes on. False at the end and where the part is damaged (see `is_damaged`). An element without
  // content begins and ends.
  bool Next();
  // Goes to the end of the element that has just begun.
  void Skip();

  Node node = Node::TEXT;
  std::string_view name;  // of an element; good until the next step
  std::string_view text;  // of TEXT; good until the next step
  bool is_damaged = false;

  // Of the element that has just begun; empty where it has none.
  std::string Attribute(const char* attribute_name) const;

 private:
  bool Step();

  Source source;
  xmlTextReaderPtr reader = nullptr;
  bool is_end_due = false;  // of an element without content
};

}  // namespace fileindexd
