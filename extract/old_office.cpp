// SPDX-License-Identifier: GPL-2.0-or-later
#include "extract/old_office.h"

#include <string>
#include <vector>

#include "extract/memory_file.h"
#include "extract/ole_file.h"
#include "extract/read_at.h"

namespace fileindexd {

namespace {

// A program does not tell what the disk did not give it: what can be had is settled here.
void ReadThrough(const Document& document) {
  std::vector<char> block(size_t{64} * 1024);
  int64_t at = 0;
  while (const size_t got = ReadAt(document, at, block.data(), block.size())) {
    at += static_cast<int64_t>(got);
  }
}

// A converter is given the document itself, which a member of an archive is not.
bool LeaveTo(const char* converter, const Document& document, ContentSink& sink) {
  if (document.depth == 0) {
    ReadThrough(document);
    sink.converter = converter;
  }
  return true;
}

bool ReadStreams(const OleFile& ole, ContentSink& sink, std::string& why) {
  if (ole.Has("EncryptedPackage") || ole.Has("EncryptedSummary")) {
    why = "encrypted";
    return false;
  }
  ole.SetSummary(sink);
  if (ole.Has("WordDocument")) {
    return AddWordText(ole.Stream("WordDocument"), ole.Stream("0Table"), ole.Stream("1Table"), sink,
                       why);
  }
  for (const char* workbook : {"Workbook", "Book"}) {
    if (ole.Has(workbook)) {
      return AddWorkbookText(ole.Stream(workbook), sink, why);
    }
  }
  if (ole.Has("PowerPoint Document") && ole.Has("Current User")) {
    return AddSlidesText(ole.Stream("PowerPoint Document"), ole.Stream("Current User"), sink, why);
  }
  why = ole.Has("PP40") || ole.Has("PowerPoint Document")
            ? "a presentation from before 1997: no reader is known for it"
            : "not an office document";
  return false;
}

}  // namespace

bool ReadOldOffice(const Document& document, ContentSink& sink, std::string& why) {
  sink.SetKind(Kind::DOCUMENT);
  // Programs save under the old endings what is none of the old formats.
  const std::string begin = FirstBytes(document, 64);
  if (begin.starts_with("PK\3\4")) {
    return ReadOfficeZip(document, sink, why);
  }
  if (begin.starts_with("{\\rtf")) {
    return ReadRtf(document, sink, why);
  }
  if (begin.starts_with("<") || begin.starts_with("\xEF\xBB\xBF<")) {
    return ReadHtml(document, sink, why);
  }
  OleFile ole;
  if (begin.starts_with("\xDB\xA5") || begin.starts_with("\x31\xBE")) {
    return LeaveTo("catdoc", document, sink);  // older than compound files
  }
  if (IsBareWorkbook(begin)) {
    std::string workbook;
    return ReadWhole(document, OleFile::MAX_STREAM, workbook, why) &&
           AddWorkbookText(workbook, sink, why);
  }
  if (!ole.Open(document, why)) {
    return false;
  }
  const bool is_good = ReadStreams(ole, sink, why);
  if (document.depth > 0) {
    sink.converter.clear();
  }
  return is_good;
}

}  // namespace fileindexd
