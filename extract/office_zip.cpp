// SPDX-License-Identifier: GPL-2.0-or-later
#include <algorithm>
#include <cerrno>
#include <string>
#include <string_view>

#include "base/ascii.h"
#include "extract/format.h"
#include "extract/memory_file.h"
#include "extract/nested.h"
#include "extract/office_words.h"
#include "extract/read_at.h"
#include "extract/unpacker.h"
#include "extract/xml_part.h"

namespace fileindexd {

namespace {

constexpr int MAX_PARTS = 100'000;

using PartReader = void (*)(XmlPart& part, ContentSink& sink);

struct PartRule {
  std::string_view begin;  // of the part's plain name
  PartReader read;
};

// Masters and layouts hold "click to edit", so slides alone are read of a presentation.
constexpr PartRule RULES[] = {
    {"word/document", AddOoxmlWords},
    {"word/footnotes", AddOoxmlWords},
    {"word/endnotes", AddOoxmlWords},
    {"word/comments", AddOoxmlWords},
    {"word/header", AddOoxmlWords},
    {"word/footer", AddOoxmlWords},
    {"word/diagrams/data", AddOoxmlWords},
    {"ppt/slides/slide", AddOoxmlWords},
    {"ppt/notesslides/notesslide", AddOoxmlWords},
    {"ppt/comments/", AddOoxmlWords},
    {"ppt/diagrams/data", AddOoxmlWords},
    {"xl/sharedstrings", AddOoxmlWords},
    {"xl/comments", AddOoxmlWords},
    {"xl/drawings/drawing", AddOoxmlWords},
    {"xl/worksheets/sheet", AddSheetWords},
    {"xl/workbook.xml", AddSheetNames},
    {"docprops/core", SetOoxmlFields},
    {"docprops/app", SetOoxmlFields},
    {"content.xml", ReadOdfPart},
    {"meta.xml", ReadOdfMeta},
    {"styles.xml", ReadOdfPart},
};

// Packers differ in the case of names, and in whether they begin with a slash.
std::string PlainName(std::string_view name) {
  return LowerText(name.substr(std::min(name.find_first_not_of('/'), name.size())));
}

PartReader ReaderOf(std::string_view name) {
  if (name.ends_with(".psmdcp")) {
    return SetOoxmlFields;  // the properties, under a name made for each document
  }
  if (!name.ends_with(".xml")) {
    return nullptr;
  }
  for (const PartRule& rule : RULES) {
    if (name.starts_with(rule.begin)) {
      return rule.read;
    }
  }
  return nullptr;
}

class OfficeZip {
 public:
  OfficeZip(const Document& read_document, ContentSink& text_sink)
      : document(read_document), sink(text_sink) {}

  // Tables come last: their words stand in a part behind them, and a table of numbers alone may be
  // more than the text takes.
  bool Read(std::string& why) {
    const Allowance allowance;
    Unpacker zip;
    if (!zip.Open(document, Unpacker::Formats::ZIP, why)) {
      return false;
    }
    for (int i = 0; i < MAX_PARTS && zip.Next(); ++i) {
      const std::string name = PlainName(zip.name);
      const PartReader reader = ReaderOf(name);
      if (reader == AddSheetWords) {
        ++tables;
      } else if (name == "meta-inf/manifest.xml") {
        ReadManifest(zip);
      } else if (reader != nullptr) {
        ++parts;
        ReadPart(zip, reader);
      }
    }
    if (tables > 0 && !sink.IsFull()) {
      ReadTables();
    }
    parts += tables;
    if (is_encrypted) {
      why = "encrypted";
    } else if (parts == 0) {
      why = zip.is_damaged ? "damaged" : "not an office document";
    } else if (zip.is_damaged || is_damaged) {
      why = "damaged";
    }
    return why.empty();
  }

 private:
  void ReadTables() {
    Unpacker zip;
    std::string fault;
    if (!zip.Open(document, Unpacker::Formats::ZIP, fault)) {
      return;
    }
    for (int left = tables; left > 0 && !sink.IsFull() && zip.Next();) {
      if (ReaderOf(PlainName(zip.name)) == AddSheetWords) {
        ReadPart(zip, AddSheetWords);
        --left;
      }
    }
  }

  void ReadManifest(Unpacker& zip) {
    XmlPart part([&zip](char* into, size_t count) { return zip.Read(into, count); });
    is_encrypted = IsOdfEncrypted(part) || is_encrypted;
  }

  void ReadPart(Unpacker& zip, PartReader reader) {
    XmlPart part([&zip](char* into, size_t count) { return zip.Read(into, count); });
    reader(part, sink);
    sink.AddText("\n");
    is_damaged = is_damaged || part.is_damaged;
    is_encrypted = is_encrypted || zip.is_encrypted;
  }

  const Document& document;
  ContentSink& sink;
  int parts = 0;
  int tables = 0;
  bool is_damaged = false;
  bool is_encrypted = false;
};

// The form in one XML file that is not packed.
bool ReadFlat(const Document& document, ContentSink& sink, std::string& why) {
  const Allowance allowance;
  int64_t at = 0;
  XmlPart part([&](char* into, size_t count) -> ssize_t {
    const size_t got = allowance.IsSpent() ? 0 : ReadAt(document, at, into, count);
    at += static_cast<int64_t>(got);
    return got == 0 && (allowance.IsSpent() || errno != 0) ? -1 : static_cast<ssize_t>(got);
  });
  ReadOdfPart(part, sink);
  if (part.is_damaged) {
    why = "damaged";
  }
  return why.empty();
}

}  // namespace

bool ReadOfficeZip(const Document& document, ContentSink& sink, std::string& why) {
  sink.SetKind(Kind::DOCUMENT);
  const std::string begin = FirstBytes(document, 8);
  if (begin.starts_with("PK")) {
    return OfficeZip(document, sink).Read(why);
  }
  if (begin.starts_with("\xD0\xCF\x11\xE0")) {
    return ReadOldOffice(document, sink, why);  // a wrong ending, or an encrypted document's cover
  }
  if (begin.starts_with("{\\rtf")) {
    return ReadRtf(document, sink, why);
  }
  if (begin.starts_with("<") || begin.starts_with("\xEF\xBB\xBF<")) {
    return ReadFlat(document, sink, why);
  }
  why = "not an office document";
  return false;
}

}  // namespace fileindexd
