// SPDX-License-Identifier: GPL-2.0-or-later
// Readers that other branches bring: this file goes when they are there.
#include "extract/format.h"

namespace fileindexd {

namespace {

bool NotYet(std::string& why) {
  why = "not read yet";
  return false;
}

}  // namespace

bool ReadPdf(const Document&, ContentSink&, std::string& why) {
  return NotYet(why);
}
bool ReadOfficeZip(const Document&, ContentSink&, std::string& why) {
  return NotYet(why);
}
bool ReadEpub(const Document&, ContentSink&, std::string& why) {
  return NotYet(why);
}
bool ReadOldOffice(const Document&, ContentSink& sink, std::string&) {
  sink.converter = "catdoc";
  return true;
}
bool ReadRtf(const Document&, ContentSink& sink, std::string&) {
  sink.converter = "unrtf";
  return true;
}
bool ReadMessage(const Document&, ContentSink&, std::string& why) {
  return NotYet(why);
}
bool ReadMailbox(const Document&, ContentSink&, std::string& why) {
  return NotYet(why);
}
bool ReadArchive(const Document&, ContentSink&, std::string& why) {
  return NotYet(why);
}
bool ReadAudio(const Document&, ContentSink&, std::string& why) {
  return NotYet(why);
}
bool ReadVideo(const Document&, ContentSink&, std::string& why) {
  return NotYet(why);
}
bool ReadPhoto(const Document&, ContentSink&, std::string& why) {
  return NotYet(why);
}

}  // namespace fileindexd
