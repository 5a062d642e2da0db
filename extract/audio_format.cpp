// SPDX-License-Identifier: GPL-2.0-or-later
#include "extract/audio_format.h"

#include <algorithm>

#include "extract/media_text.h"
#include "extract/read_at.h"

namespace fileindexd {

namespace {

constexpr size_t HEAD = 512;
constexpr size_t ID3_HEADER = 10;
constexpr int MAX_ID3_TAGS = 4;  // some writers put a new one before the old

constexpr std::string_view ASF_HEADER("\x30\x26\xb2\x75\x8e\x66\xcf\x11", 8);

struct Magic {
  std::string_view bytes;
  AudioFormat format;
};

constexpr Magic AT_THE_BEGINNING[] = {
    {"fLaC", AudioFormat::FLAC},       {"MAC ", AudioFormat::APE},
    {"MPCK", AudioFormat::MPC},        {"MP+", AudioFormat::MPC},
    {"TTA1", AudioFormat::TRUE_AUDIO}, {"wvpk", AudioFormat::WAVPACK},
    {ASF_HEADER, AudioFormat::ASF},
};

constexpr Magic IN_FIRST_PACKET[] = {
    {"\x01vorbis", AudioFormat::VORBIS},
    {"OpusHead", AudioFormat::OPUS},
    {"Speex   ", AudioFormat::SPEEX},
    {"\x7f"
     "FLAC",
     AudioFormat::OGG_FLAC},
};

struct EndingFormat {
  std::string_view endings;
  AudioFormat format;
};

constexpr EndingFormat BY_ENDING[] = {
    {"mp3 mp2 mp1 mpga aac adts", AudioFormat::MPEG},
    {"ape", AudioFormat::APE},
    {"mpc mp+", AudioFormat::MPC},
    {"wv", AudioFormat::WAVPACK},
    {"tta", AudioFormat::TRUE_AUDIO},
};

std::string HeadAt(const Document& document, int64_t offset) {
  std::string head(HEAD, '\0');
  head.resize(ReadAt(document, offset, head.data(), head.size()));
  return head;
}

// Whole length of the ID3v2 tag that begins here; 0 where none does.
int64_t Id3Length(std::string_view head) {
  if (!head.starts_with("ID3") || head.size() < ID3_HEADER) {
    return 0;
  }
  int64_t length = 0;
  for (size_t i = 6; i < ID3_HEADER; i++) {
    length = (length << 7) | (static_cast<unsigned char>(head[i]) & 0x7f);
  }
  bool has_footer = (static_cast<unsigned char>(head[5]) & 0x10) != 0;
  return length + static_cast<int64_t>(ID3_HEADER) * (has_footer ? 2 : 1);
}

// A frame's beginning with nothing in it that cannot be.
bool IsMpegFrame(std::string_view head) {
  if (head.size() < 4 || static_cast<unsigned char>(head[0]) != 0xff) {
    return false;
  }
  auto second = static_cast<unsigned char>(head[1]);
  auto third = static_cast<unsigned char>(head[2]);
  bool is_adts = (second & 0xf6) == 0xf0;
  bool is_mpeg = (second & 0xe0) == 0xe0 && (second & 0x18) != 0x08 && (second & 0x06) != 0 &&
                 (third & 0xf0) != 0xf0 && (third & 0x0c) != 0x0c;
  return is_adts || is_mpeg;
}

AudioFormat FormatOfHead(std::string_view head) {
  for (const Magic& magic : AT_THE_BEGINNING) {
    if (head.starts_with(magic.bytes)) {
      return magic.format;
    }
  }
  if (head.starts_with("OggS")) {
    for (const Magic& magic : IN_FIRST_PACKET) {
      if (head.find(magic.bytes) != std::string_view::npos) {
        return magic.format;
      }
    }
    return AudioFormat::UNKNOWN;
  }
  if (head.size() < 12) {
    return AudioFormat::UNKNOWN;
  }
  std::string_view form = head.substr(8, 4);
  if (head.starts_with("RIFF") && form == "WAVE") {
    return AudioFormat::WAV;
  }
  if (head.starts_with("FORM") && (form == "AIFF" || form == "AIFC")) {
    return AudioFormat::AIFF;
  }
  if (head.substr(4, 4) == "ftyp") {
    return AudioFormat::MP4;
  }
  return IsMpegFrame(head) ? AudioFormat::MPEG : AudioFormat::UNKNOWN;
}

}  // namespace

AudioFormat AudioFormatOf(const Document& document) {
  int64_t offset = 0;
  std::string head = HeadAt(document, 0);
  for (int tags = 0; tags < MAX_ID3_TAGS; tags++) {
    int64_t length = Id3Length(head);
    if (length == 0) {
      break;
    }
    offset += length;
    head = HeadAt(document, offset);
  }
  AudioFormat format = FormatOfHead(head);
  if (format != AudioFormat::UNKNOWN) {
    return format;
  }
  for (const EndingFormat& known : BY_ENDING) {
    if (HasEnding(document.name, known.endings)) {
      return known.format;
    }
  }
  return offset > 0 ? AudioFormat::MPEG : AudioFormat::UNKNOWN;
}

}  // namespace fileindexd
