// SPDX-License-Identifier: GPL-2.0-or-later
#include <algorithm>
#include <map>
#include <string>
#include <string_view>
#include <vector>

#include "extract/format.h"
#include "extract/memory_file.h"
#include "extract/nested.h"
#include "extract/office_words.h"
#include "extract/unpacker.h"
#include "extract/xml_part.h"

namespace fileindexd {

namespace {

constexpr size_t MAX_PACKAGE = 8 << 20;
constexpr size_t MAX_CHAPTER = 16 << 20;
constexpr size_t MAX_HELD = 64 << 20;  // of chapters that wait for their turn
constexpr int MAX_CHAPTERS = 10'000;

std::string Unescaped(std::string_view reference) {
  const auto digit = [](char c) {
    return c >= '0' && c <= '9'   ? c - '0'
           : c >= 'A' && c <= 'F' ? c - 'A' + 10
           : c >= 'a' && c <= 'f' ? c - 'a' + 10
                                  : -1;
  };
  std::string path;
  for (size_t i = 0; i < reference.size(); ++i) {
    const bool is_escape = reference[i] == '%' && i + 2 < reference.size() &&
                           digit(reference[i + 1]) >= 0 && digit(reference[i + 2]) >= 0;
    if (is_escape) {
      path += static_cast<char>(digit(reference[i + 1]) * 16 + digit(reference[i + 2]));
      i += 2;
    } else {
      path += reference[i];
    }
  }
  return path;
}

bool IsChapter(std::string_view name) {
  return name.ends_with(".xhtml") || name.ends_with(".html") || name.ends_with(".htm");
}

// The book's own description: its fields, and in which order its chapters are read.
class Package {
 public:
  void Read(XmlPart& part, std::string_view package_name, ContentSink& sink) {
    folder = package_name.substr(0, package_name.rfind('/') + 1);
    while (part.Next()) {
      if (part.node == XmlPart::Node::BEGIN) {
        TakeElement(part, sink);
      }
    }
  }

  // Where a chapter stands; those that are not named come last.
  size_t PlaceOf(const std::string& name) const {
    const auto place = places.find(name);
    return place != places.end() ? place->second : MAX_CHAPTERS;
  }

 private:
  void TakeElement(XmlPart& part, ContentSink& sink) {
    const std::string name(part.name);
    if (name == "title") {
      sink.Set(ContentField::TITLE, TextOfElement(part));
    } else if (name == "creator") {
      sink.Set(ContentField::AUTHOR, TextOfElement(part));
    } else if (name == "subject") {
      sink.Set(ContentField::KEYWORDS, TextOfElement(part));
    } else if (name == "description") {
      sink.Set(ContentField::DESCRIPTION, TextOfElement(part));
    } else if (name == "date") {
      SetDate(ContentField::CREATED, TextOfElement(part), sink);
    } else if (name == "item" && items.size() < MAX_CHAPTERS) {
      items[part.Attribute("id")] = folder + Unescaped(part.Attribute("href"));
    } else if (name == "itemref" && places.size() < MAX_CHAPTERS) {
      const auto item = items.find(part.Attribute("idref"));
      if (item != items.end()) {
        places.emplace(item->second, places.size());
      }
    }
  }

  std::string folder;
  std::map<std::string, std::string> items;  // paths by their ids
  std::map<std::string, size_t> places;
};

struct Chapter {
  size_t place = 0;
  std::string name;
  std::string bytes;
};

class Book {
 public:
  Book(const Document& read_document, ContentSink& text_sink)
      : document(read_document), sink(text_sink) {}

  // The package may lie behind the chapters, so the file is gone through twice.
  bool Read(std::string& why) {
    if (!ReadPackage(why)) {
      return false;
    }
    Unpacker zip;
    if (!zip.Open(document, Unpacker::Formats::ZIP, why)) {
      return false;
    }
    for (int i = 0; i < MAX_CHAPTERS && !sink.IsFull() && zip.Next(); ++i) {
      if (IsChapter(zip.name)) {
        Take(zip);
      }
    }
    AddHeld();
    if (is_encrypted) {
      why = "encrypted";
    } else if (zip.is_damaged) {
      why = "damaged";
    }
    return why.empty();
  }

 private:
  bool ReadPackage(std::string& why) {
    Unpacker zip;
    if (!zip.Open(document, Unpacker::Formats::ZIP, why)) {
      return false;
    }
    bool is_found = false;
    while (zip.Next()) {
      is_encrypted = is_encrypted || zip.name == "META-INF/rights.xml" || zip.is_encrypted;
      if (!is_found && zip.name.ends_with(".opf")) {
        std::string bytes;
        (void)zip.ReadAll(MAX_PACKAGE, bytes);  // of a longer one, the beginning
        std::string_view rest = bytes;
        XmlPart part([&rest](char* into, size_t count) {
          const size_t taken = rest.copy(into, count);
          rest.remove_prefix(taken);
          return static_cast<ssize_t>(taken);
        });
        package.Read(part, zip.name, sink);
        is_found = true;
      }
    }
    if (!is_found) {
      why = zip.is_damaged ? "damaged" : "not an EPUB file";
    }
    return is_found;
  }

  // Chapters mostly lie in reading order; what does not is held back as far as memory allows.
  void Take(Unpacker& zip) {
    Chapter chapter{package.PlaceOf(zip.name), zip.name, ""};
    (void)zip.ReadAll(MAX_CHAPTER, chapter.bytes);
    if (chapter.place == next_place) {
      Add(chapter);
      ++next_place;
      return;
    }
    if (held_bytes + chapter.bytes.size() > MAX_HELD) {
      AddHeld();
    }
    held_bytes += chapter.bytes.size();
    held.push_back(std::move(chapter));
  }

  void AddHeld() {
    std::stable_sort(held.begin(), held.end(), [](const Chapter& a, const Chapter& b) {
      return a.place != b.place ? a.place < b.place : a.name < b.name;
    });
    for (const Chapter& chapter : held) {
      if (!sink.IsFull()) {
        Add(chapter);
      }
    }
    held.clear();
    held_bytes = 0;
  }

  void Add(const Chapter& chapter) {
    MemoryFile file;
    if (!chapter.bytes.empty() && file.Open() && file.Append(chapter.bytes)) {
      ReadNestedText(ReadHtml, file.AsDocument(chapter.name, document.depth + 1), sink);
    }
  }

  const Document& document;
  ContentSink& sink;
  Package package;
  std::vector<Chapter> held;
  size_t held_bytes = 0;
  size_t next_place = 0;
  bool is_encrypted = false;
};

}  // namespace

bool ReadEpub(const Document& document, ContentSink& sink, std::string& why) {
  sink.SetKind(Kind::DOCUMENT);
  const Allowance allowance;
  return Book(document, sink).Read(why);
}

}  // namespace fileindexd
