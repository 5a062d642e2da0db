// SPDX-License-Identifier: GPL-2.0-or-later
#include "extract/choice.h"

#include <magic.h>

#include <exception>
#include <memory>
#include <new>
#include <string>
#include <vector>

#include "extract/charset.h"
#include "extract/memory_file.h"
#include "extract/nested.h"

namespace fileindexd {

namespace {

// What libmagic looks at: its tests for text and for tar need no more.
constexpr size_t HEAD = 64 * 1024;

// Why nobody reads it here, however good it is.
constexpr const char* LEFT_OUT = "left out: this kernel cannot confine ";

struct Reading {
  FormatReader read;
  Kind kind;        // unless the reader knows better
  bool uses_files;  // its library opens files of its own at run time
};

// Every reader that there is, by its format.
Reading ReadingOf(Format format) {
  switch (format) {
    case Format::TEXT:
      return {ReadText, Kind::DOCUMENT, false};
    case Format::HTML:
      return {ReadHtml, Kind::DOCUMENT, false};
    case Format::XML:
      return {ReadXml, Kind::DOCUMENT, false};
    case Format::PDF:
      return {ReadPdf, Kind::DOCUMENT, true};
    case Format::OFFICE_ZIP:
      return {ReadOfficeZip, Kind::DOCUMENT, false};
    case Format::EPUB:
      return {ReadEpub, Kind::DOCUMENT, false};
    case Format::OLD_OFFICE:
      return {ReadOldOffice, Kind::DOCUMENT, false};
    case Format::RTF:
      return {ReadRtf, Kind::DOCUMENT, false};
    case Format::MESSAGE:
      return {ReadMessage, Kind::DOCUMENT, false};
    case Format::MAILBOX:
      return {ReadMailbox, Kind::DOCUMENT, false};
    case Format::ARCHIVE:
      return {ReadArchive, Kind::DOCUMENT, false};
    case Format::AUDIO:
      return {ReadAudio, Kind::AUDIO, false};
    case Format::VIDEO:
      return {ReadVideo, Kind::VIDEO, false};
    case Format::PHOTO:
      return {ReadPhoto, Kind::PHOTO, false};
    case Format::NONE:
      break;
  }
  return {nullptr, Kind::OTHER, false};
}

// Set once, before the doors close; readers of members come back here without a way to be told.
struct Surroundings {
  magic_t magic = nullptr;
  bool has_files = true;
};

Surroundings& Around() {
  static Surroundings surroundings;
  return surroundings;
}

// `head`: the first HEAD bytes.
Format FormatOfContent(const std::string& head) {
  if (head.empty() || Around().magic == nullptr) {
    return Format::NONE;
  }
  // libmagic knows a single message and no box of them.
  if (head.starts_with("From ") && head.find("\nFrom: ") != std::string::npos) {
    return Format::MAILBOX;
  }
  const char* mime = magic_buffer(Around().magic, head.data(), head.size());
  return mime == nullptr ? Format::NONE : FormatOfMime(mime);
}

bool Read(Format format, const Document& document, ContentSink& sink, std::string& why) {
  const Reading reading = ReadingOf(format);
  if (reading.uses_files && !Around().has_files) {
    why = std::string(LEFT_OUT) + "its library";
    return false;
  }
  sink.SetKind(reading.kind);
  bool is_read = false;
  try {
    is_read = reading.read(document, sink, why);
  } catch (const std::bad_alloc&) {
    throw;
  } catch (const std::exception& error) {
    why = error.what();  // what was found before stays
    why = why.empty() ? "cannot be read" : why;
    sink.has_thrown = true;
  }
  if (!sink.converter.empty() && (document.depth > 0 || !Around().has_files)) {
    if (document.depth == 0) {
      why = LEFT_OUT + sink.converter;
    }
    sink.converter.clear();  // a member has no descriptor that a program could be given
    return is_read && document.depth > 0;
  }
  return is_read;
}

// A package that is damaged or closed is an archive all the same; read as one, what was found of
// the document would be lost.
bool IsStillPackage(Format named, Format seen, bool has_found, const std::string& fault) {
  return (named == Format::OFFICE_ZIP || named == Format::EPUB) && seen == Format::ARCHIVE &&
         (fault == "encrypted" || has_found);
}

// Files of these are never all text.
bool IsBinary(Format format) {
  return format == Format::PHOTO || format == Format::AUDIO || format == Format::VIDEO ||
         format == Format::ARCHIVE || format == Format::OFFICE_ZIP || format == Format::EPUB ||
         format == Format::OLD_OFFICE;
}

// A name without an ending is a note's as often as not.
bool MayBeNote(const std::string& name, const std::string& head) {
  return name.find('.') == std::string::npos && !head.empty() && !LooksBinary(head, false);
}

bool HasFoundSince(const ContentSink::Mark& begin, const ContentSink& sink) {
  return sink.content.text.size() > begin.text_size ||
         sink.content.texts.size() > begin.texts.size();
}

bool ReadByContent(const Document& document, ContentSink& sink, std::string& why) {
  const std::string head = FirstBytes(document, HEAD);
  const Format seen = FormatOfContent(head);
  const bool may_be_note = MayBeNote(document.name, head);
  if (may_be_note && (seen == Format::NONE || IsBinary(seen))) {
    return Read(Format::TEXT, document, sink, why);
  }
  ContentSink::Mark begin = sink.Here();
  if (seen == Format::NONE || Read(seen, document, sink, why)) {
    return true;
  }
  if (!may_be_note || why == "encrypted" || why.starts_with(LEFT_OUT) ||
      HasFoundSince(begin, sink)) {
    return false;
  }
  why.clear();
  sink.ReturnTo(std::move(begin));
  return Read(Format::TEXT, document, sink, why);
}

bool ReadByName(const Document& document, ContentSink& sink, std::string& why) {
  const Format named = FormatOfName(document.name);
  if (named == Format::NONE) {
    return ReadByContent(document, sink, why);
  }
  if (document.size == 0) {
    sink.SetKind(ReadingOf(named).kind);
    return true;
  }

  // A name may lie. Whose reader refuses the content, is judged by the content.
  std::string fault;
  ContentSink::Mark begin = sink.Here();
  if (Read(named, document, sink, fault)) {
    return true;
  }
  const Format seen = FormatOfContent(FirstBytes(document, HEAD));
  if (seen == Format::NONE && named == Format::TEXT) {
    sink.ReturnTo(std::move(begin));
    return true;  // many endings of source code name something else elsewhere
  }
  const bool has_found = HasFoundSince(begin, sink);
  if (seen == Format::NONE || seen == named || IsStillPackage(named, seen, has_found, fault)) {
    why = fault;
    return false;
  }
  sink.ReturnTo(std::move(begin));
  return Read(seen, document, sink, why);
}

}  // namespace

bool LoadMagic(std::string& error) {
  if (Around().magic != nullptr) {
    return true;
  }
  // Not what is inside compressed files, and nothing that runs a program for it.
  magic_t magic = magic_open(MAGIC_MIME_TYPE | MAGIC_NO_CHECK_COMPRESS | MAGIC_NO_CHECK_ELF);
  if (magic == nullptr || magic_load(magic, nullptr) != 0) {
    const char* text = magic == nullptr ? nullptr : magic_error(magic);
    error = std::string("libmagic: ") + (text == nullptr ? "no memory" : text);
    if (magic != nullptr) {
      magic_close(magic);
    }
    return false;
  }
  Around().magic = magic;
  return true;
}

void LeaveOutFileUsers() {
  Around().has_files = false;
}

bool ReadDocument(const Document& document, ContentSink& sink, std::string& why) {
  const Allowance allowance;
  const bool is_read = ReadByName(document, sink, why);
  // Not before the end: what is cut takes no more.
  if (document.depth == 0 && allowance.HasBound()) {
    sink.content.is_cut = true;
  }
  return is_read;
}

}  // namespace fileindexd
