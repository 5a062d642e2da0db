// SPDX-License-Identifier: GPL-2.0-or-later
#include "extract/html.h"

#include <libxml/HTMLparser.h>

#include <algorithm>
#include <array>
#include <memory>
#include <new>

#include "base/ascii.h"
#include "extract/decoder.h"

namespace fileindexd {

namespace {

constexpr size_t HEAD = 4096;  // where a page says its charset

// Within these, words go on.
constexpr std::array<std::string_view, 29> INLINE = {
    "a",    "abbr",   "acronym", "b",   "bdi", "bdo",  "big", "cite", "code", "del",
    "em",   "font",   "i",       "ins", "kbd", "mark", "q",   "s",    "samp", "small",
    "span", "strong", "sub",     "sup", "tt",  "u",    "dfn", "var",  "wbr"};
// Nobody reads what stands in these.
constexpr std::array<std::string_view, 5> HIDDEN = {"script", "style", "template", "object",
                                                    "noscript"};

template <size_t SIZE>
bool IsAmong(const std::array<std::string_view, SIZE>& names, std::string_view name) {
  return std::find(names.begin(), names.end(), name) != names.end();
}

std::string_view View(const xmlChar* text) {
  return text == nullptr ? std::string_view() : reinterpret_cast<const char*>(text);
}

// "charset=x", "charset = 'x'", and the encoding of an XML declaration.
std::string DeclaredCharset(std::string_view bytes) {
  const std::string head = LowerText(bytes.substr(0, HEAD));
  for (const std::string_view word : {"charset", "encoding"}) {
    const size_t at = head.find(word);
    if (at == std::string::npos) {
      continue;
    }
    constexpr const char* NAME = "abcdefghijklmnopqrstuvwxyz0123456789-_.:+";
    const size_t begin = head.find_first_not_of(" \t\r\n='\"", at + word.size());
    if (begin == std::string::npos || head.find('=', at) > begin) {
      continue;
    }
    const size_t end = std::min(head.find_first_not_of(NAME, begin), head.size());
    const std::string name = head.substr(begin, end - begin);
    // What was read so far would not be there if it were UTF-16 or UTF-32; and what UTF-8 is, the
    // bytes themselves tell better.
    return name.starts_with("utf-") || name == "utf8" ? "" : name;
  }
  return "";
}

bool IsHidden(std::string_view element) {
  return IsAmong(HIDDEN, element);
}

std::string Without(std::string_view mark, std::string_view text) {
  std::string kept;
  for (size_t at = text.find(mark); at != std::string_view::npos; at = text.find(mark)) {
    kept += text.substr(0, at);
    text.remove_prefix(at + mark.size());
  }
  kept += text;
  return kept;
}

struct Page {
  ContentSink& sink;
  bool (*is_hidden)(std::string_view element);
  int hidden = 0;         // elements around that nobody reads
  bool in_title = false;  // of the page, not of a picture in it
  std::string title;
  bool failed = false;  // no memory: an exception cannot pass through the parser
};

void TakeMeta(Page& page, const xmlChar** attributes) {
  std::string name;
  std::string_view value;
  for (; attributes != nullptr && attributes[0] != nullptr; attributes += 2) {
    const std::string key = LowerText(View(attributes[0]));
    if (key == "name" || key == "property") {
      name = LowerText(View(attributes[1]));
    } else if (key == "content") {
      value = View(attributes[1]);
    }
  }

  if (name == "author" || name == "dc.creator" || name == "article:author") {
    page.sink.Set(ContentField::AUTHOR, value);
  } else if (name == "description" || name == "dc.description" || name == "og:description") {
    page.sink.Set(ContentField::DESCRIPTION, value);
  } else if (name == "keywords" || name == "dc.subject") {
    page.sink.Set(ContentField::KEYWORDS, value);
  }
}

// Runs `step` where no exception may leave.
template <typename Step>
void Guarded(void* context, const Step& step) {
  Page& page = *static_cast<Page*>(context);
  try {
    step(page);
  } catch (const std::bad_alloc&) {
    page.failed = true;
  }
}

void StartElement(void* context, const xmlChar* name, const xmlChar** attributes) {
  Guarded(context, [&](Page& page) {
    const std::string_view element = View(name);
    page.hidden += page.is_hidden(element) ? 1 : 0;
    page.in_title = page.in_title || (element == "title" && page.title.empty());
    if (!IsAmong(INLINE, element)) {
      page.sink.AddText(" ");
    }
    if (element == "meta") {
      TakeMeta(page, attributes);
    }
  });
}

void EndElement(void* context, const xmlChar* name) {
  Guarded(context, [&](Page& page) {
    const std::string_view element = View(name);
    page.hidden -= page.is_hidden(element) && page.hidden > 0 ? 1 : 0;
    if (element == "title") {
      page.in_title = false;
    }
    if (!IsAmong(INLINE, element)) {
      page.sink.AddText(" ");
    }
  });
}

void Characters(void* context, const xmlChar* text, int length) {
  Guarded(context, [&](Page& page) {
    const std::string_view bytes(reinterpret_cast<const char*>(text), static_cast<size_t>(length));
    if (page.in_title && page.title.size() < ContentSink::MAX_FIELD) {
      page.title += bytes;
    } else if (page.hidden == 0 && !page.in_title) {
      page.sink.AddText(bytes);
    }
  });
}

htmlSAXHandler Handler() {
  htmlSAXHandler handler = {};
  handler.startElement = StartElement;
  handler.endElement = EndElement;
  handler.characters = Characters;
  handler.ignorableWhitespace = Characters;
  // Scripts and styles come as cdataBlock, which nobody takes.
  return handler;
}

// `take` gives the parser a piece of the text.
template <typename Take>
bool ReadMarkup(const Document& document, Page& page, const Take& take, std::string& why) {
  ContentSink& sink = page.sink;
  htmlSAXHandler handler = Handler();
  const std::unique_ptr<htmlParserCtxt, decltype(&htmlFreeParserCtxt)> parser(
      htmlCreatePushParserCtxt(&handler, &page, nullptr, 0, nullptr, XML_CHAR_ENCODING_UTF8),
      &htmlFreeParserCtxt);
  if (parser == nullptr) {
    throw std::bad_alloc();
  }
  (void)htmlCtxtUseOptions(parser.get(), HTML_PARSE_RECOVER | HTML_PARSE_NOERROR |
                                             HTML_PARSE_NOWARNING | HTML_PARSE_NONET |
                                             HTML_PARSE_IGNORE_ENC);

  // A page that begins with a stray end of something would count as empty.
  (void)htmlParseChunk(parser.get(), "<html>", 6, 0);
  const bool is_read = DecodeText(
      document, DeclaredCharset,
      [&](std::string_view text) {
        take(parser.get(), text);
        return !sink.IsFull() && !page.failed;
      },
      why);
  if (!sink.IsFull() && !page.failed) {
    (void)htmlParseChunk(parser.get(), nullptr, 0, 1);
  }
  if (page.failed) {
    throw std::bad_alloc();
  }
  sink.Set(ContentField::TITLE, page.title);
  return is_read;
}

void Parse(htmlParserCtxt* parser, std::string_view text) {
  (void)htmlParseChunk(parser, text.data(), static_cast<int>(text.size()), 0);
}

}  // namespace

bool ReadHtml(const Document& document, ContentSink& sink, std::string& why) {
  Page page = {sink, IsHidden, 0, false, "", false};
  return ReadMarkup(document, page, Parse, why);
}

bool ReadXmlAsHtml(const Document& document, bool (*is_hidden)(std::string_view element),
                   ContentSink& sink, std::string& why) {
  Page page = {sink, is_hidden, 0, false, "", false};
  // The marks around text that is taken as it is are unknown to pages. One that two pieces share
  // stays.
  const auto take = [](htmlParserCtxt* parser, std::string_view text) {
    Parse(parser, Without("]]>", Without("<![CDATA[", text)));
  };
  return ReadMarkup(document, page, take, why);
}

}  // namespace fileindexd
