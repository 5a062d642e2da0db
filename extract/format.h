// SPDX-License-Identifier: GPL-2.0-or-later
// What reads one family of file formats, inside the closed helper.
//
// A reader gets a hostile file. It may throw std::exception, be killed for time or memory, and
// crash: all of that costs this one file. It keeps nothing between two files, reads only the
// descriptor it is given, and opens nothing but what its library needs of the system (see doors.h).
#pragma once

#include <cstdint>
#include <string>
#include <string_view>
#include <vector>

#include "base/content.h"

namespace fileindexd {

struct Document {
  int file = -1;     // open for reading, seekable; not the reader's to close
  std::string name;  // last component of its path, any bytes; a member's name in an archive
  int64_t size = 0;  // bytes
  int depth = 0;     // of archives and messages around it
  // Gets the errno of the first of its reads that fails: the disk's fault, whatever the reader
  // makes of it. Null: nobody asks, as for members, which lie in memory.
  int* fault = nullptr;
};

// Takes what readers find, up to the bounds of an answer.
class ContentSink {
 public:
  explicit ContentSink(size_t text_cap_bytes) : text_cap(text_cap_bytes) {}

  // Appends running text. Bytes that are no UTF-8 and control characters are replaced by blanks,
  // runs of white space become one. Ends no word by itself: give white space where words end. A
  // character may be cut in two between one call and the next.
  void AddText(std::string_view bytes);
  // Numbers that cannot be true (see IsPlausible) and empty texts are left out; the first value of
  // a field stays, but that KEYWORDS, MEMBERS, ATTACHMENTS, TO and CODECS gather what comes.
  // Cleaned like text, cut at MAX_FIELD bytes.
  void Set(ContentField field, std::string_view text);
  void Set(ContentField field, int64_t number);
  void SetKind(Kind kind) { content.kind = kind; }
  // Nothing more is taken as text: a reader stops.
  bool IsFull() const { return content.is_cut; }

  // Where it stands, to come back to when a reader was the wrong one. Costs what the fields hold,
  // not the text.
  struct Mark {
    Kind kind = Kind::OTHER;
    std::vector<TextField> texts;
    std::vector<NumberField> numbers;
    size_t text_size = 0;
    std::string text_end;  // what cutting the word after it may take away
    bool is_cut = false;
    bool is_apart = false;
    std::string pending;
    std::string converter;
  };
  Mark Here() const;
  // All that came since is forgotten, but that a library was left by an exception.
  void ReturnTo(Mark&& mark);

  static constexpr size_t MAX_FIELD = 64 * 1024;

  Content content;
  // A library was left by an exception, and may have left something behind.
  bool has_thrown = false;
  // Not empty: the text of this file is best read by that program (see converters.h).
  std::string converter;

 private:
  void Append(std::string_view word);

  size_t text_cap;
  bool is_apart = false;  // white space came since the last word
  std::string pending;    // begin of a character
};

// False when the file cannot be read as that format, and `why` then says so in a few words for an
// administrator ("damaged", "encrypted", "not a PDF file"). What was put into the sink before is
// kept: half a document is better than none.
using FormatReader = bool (*)(const Document& document, ContentSink& sink, std::string& why);

bool ReadText(const Document& document, ContentSink& sink, std::string& why);  // any charset
bool ReadHtml(const Document& document, ContentSink& sink, std::string& why);
bool ReadXml(const Document& document, ContentSink& sink, std::string& why);  // SVG too
bool ReadPdf(const Document& document, ContentSink& sink, std::string& why);
bool ReadOfficeZip(const Document& document, ContentSink& sink, std::string& why);  // docx … odp
bool ReadEpub(const Document& document, ContentSink& sink, std::string& why);
bool ReadOldOffice(const Document& document, ContentSink& sink, std::string& why);  // doc, xls, ppt
bool ReadRtf(const Document& document, ContentSink& sink, std::string& why);
bool ReadMessage(const Document& document, ContentSink& sink, std::string& why);  // eml
bool ReadMailbox(const Document& document, ContentSink& sink, std::string& why);  // mbox
bool ReadArchive(const Document& document, ContentSink& sink, std::string& why);
bool ReadAudio(const Document& document, ContentSink& sink, std::string& why);
bool ReadVideo(const Document& document, ContentSink& sink, std::string& why);
bool ReadPhoto(const Document& document, ContentSink& sink, std::string& why);

// Chooses by the name's ending, where that tells nothing by the content, and reads. True with kind
// OTHER and nothing else for what no reader is for.
bool ReadDocument(const Document& document, ContentSink& sink, std::string& why);

}  // namespace fileindexd
