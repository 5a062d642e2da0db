// SPDX-License-Identifier: GPL-2.0-or-later
// The least that the readers under test ask of the others.
#include "extract/format.h"
#include "extract/memory_file.h"

namespace fileindexd {

bool ReadText(const Document& document, ContentSink& sink, std::string& why) {
  std::string bytes;
  if (!ReadWhole(document, 1 << 26, bytes, why)) {
    return false;
  }
  sink.AddText(bytes);
  return true;
}

bool ReadHtml(const Document& document, ContentSink& sink, std::string& why) {
  std::string bytes;
  if (!ReadWhole(document, 1 << 26, bytes, why)) {
    return false;
  }
  bool is_tag = false;
  for (const char c : bytes) {
    is_tag = c == '<' || is_tag;
    sink.AddText(is_tag ? " " : std::string_view(&c, 1));
    is_tag = is_tag && c != '>';
  }
  return true;
}

bool ReadDocument(const Document& document, ContentSink& sink, std::string& why) {
  const std::string& name = document.name;
  const FormatReader reader = name.ends_with(".pdf")                             ? ReadPdf
                              : name.ends_with(".html")                          ? ReadHtml
                              : name.ends_with(".zip") || name.ends_with(".tar") ? ReadArchive
                                                                                 : ReadText;
  return reader(document, sink, why);
}

bool ReadRtf(const Document&, ContentSink& sink, std::string&) {
  sink.converter = "unrtf";
  return true;
}

}  // namespace fileindexd
