// SPDX-License-Identifier: GPL-2.0-or-later
#include "extract/track_format.h"

#include <string>

#include "extract/media_text.h"
#include "extract/read_at.h"

namespace fileindexd {

namespace {

constexpr size_t HEAD = 4096;
constexpr size_t PACKET = 188;           // of a transport stream
constexpr size_t STAMPED_PACKET = 192;   // with a time stamp before it, as camcorders write
constexpr size_t CHECKED_PACKET = 204;   // with a checksum behind it
constexpr size_t PACKETS_LOOKED_AT = 5;  // the same byte five times in step is no accident

struct Magic {
  size_t offset;
  std::string_view bytes;
  const char* parser;
};

constexpr Magic MAGICS[] = {
    {4, "ftyp", "Mpeg4"},
    {4, "moov", "Mpeg4"},
    {4, "mdat", "Mpeg4"},
    {4, "wide", "Mpeg4"},
    {4, "skip", "Mpeg4"},
    {4, "free", "Mpeg4"},
    {4, "pnot", "Mpeg4"},
    {0, "\x1a\x45\xdf\xa3", "Mk"},
    {0, "RIFF", "Riff"},
    {0, "RF64", "Riff"},
    {0, "FORM", "Riff"},
    {0, "FLV\x01", "Flv"},
    {0, "OggS", "Ogg"},
    {0, std::string_view("\x30\x26\xb2\x75\x8e\x66\xcf\x11", 8), "Wm"},
    {0, std::string_view("\x00\x00\x01\xba", 4), "MpegPs"},
    {0, std::string_view("\x00\x00\x01\xb3", 4), "Mpegv"},
    {0, "fLaC", "Flac"},
    {0, "ADIF", "Aac"},
    {0, "#!AMR", "Amr"},
    {0, "caff", "Caf"},
    {0, "DSD ", "Dsf"},
    {0, "\x0b\x77", "Ac3"},
    {0, "\x7f\xfe\x80\x01", "Dts"},
};

bool IsTransportStream(std::string_view head, size_t step, size_t offset) {
  for (size_t i = 0; i < PACKETS_LOOKED_AT; i++) {
    size_t at = offset + i * step;
    if (at >= head.size()) {
      return i > 1;  // a short file
    }
    if (head[at] != 0x47) {
      return false;
    }
  }
  return true;
}

}  // namespace

const char* TrackParserOf(const Document& document) {
  std::string bytes(HEAD, '\0');
  bytes.resize(ReadAt(document, 0, bytes.data(), bytes.size()));
  const std::string_view head = bytes;
  for (const Magic& magic : MAGICS) {
    if (head.size() > magic.offset && head.substr(magic.offset).starts_with(magic.bytes)) {
      return magic.parser;
    }
  }
  if (IsTransportStream(head, PACKET, 0) || IsTransportStream(head, CHECKED_PACKET, 0)) {
    return "MpegTs";
  }
  if (IsTransportStream(head, STAMPED_PACKET, 4)) {
    return "BdavTs";
  }
  if (head.size() > 2 && head[0] == '\xff' &&
      (static_cast<unsigned char>(head[1]) & 0xf6) == 0xf0) {
    return "Adts";
  }
  if (head.starts_with("ID3") || HasEnding(document.name, "mp3 mp2 mp1 mpga")) {
    return HasEnding(document.name, "aac adts") ? "Adts" : "Mpega";
  }
  return nullptr;
}

}  // namespace fileindexd
