// SPDX-License-Identifier: GPL-2.0-or-later
#include "tests/unit/extract/media/film_samples.h"

#include "tests/unit/extract/media/bytes.h"

namespace fileindexd {

namespace {

constexpr uint64_t FROM_1904 = 2082844800;          // seconds up to the epoch
constexpr uint64_t FROM_1601 = 116444736000000000;  // tenths of microseconds up to the epoch
constexpr int64_t FROM_2001 = 978307200;            // seconds after the epoch

// Times, scale and duration of a version 0 header of an MP4.
std::string Times(uint64_t scale, uint64_t duration) {
  const uint64_t created = static_cast<uint64_t>(FILM_RECORDED) + FROM_1904;
  return Big(0, 4) + Big(created, 4) + Big(created, 4) + Big(scale, 4) + Big(duration, 4);
}

const std::string UNIT_MATRIX =
    Hex("00010000 00000000 00000000 00000000 00010000 00000000"
        "00000000 00000000 40000000");

std::string MovieHeader() {
  return Box("mvhd", Times(1000, 2000) + Hex("00010000 0100 0000") + std::string(8, '\0') +
                         UNIT_MATRIX + std::string(24, '\0') + Big(2, 4));
}

struct Mp4Track {
  std::string handler;
  std::string media_header;
  std::string description;  // what stands in stsd
  uint64_t scale;
  uint64_t samples;
  uint64_t step;  // between samples, in units of the scale
  uint64_t width;
  uint64_t height;
};

std::string TrackBox(const Mp4Track& track) {
  const uint64_t created = static_cast<uint64_t>(FILM_RECORDED) + FROM_1904;
  const std::string head =
      Box("tkhd", Big(7, 4) + Big(created, 4) + Big(created, 4) + Big(1, 4) + Big(0, 4) +
                      Big(2000, 4) + std::string(8, '\0') + Big(0, 8) + UNIT_MATRIX +
                      Big(track.width << 16, 4) + Big(track.height << 16, 4));
  const std::string table =
      Box("stbl",
          Box("stsd", Big(0, 4) + Big(1, 4) + track.description) +
              Box("stts", Big(0, 4) + Big(1, 4) + Big(track.samples, 4) + Big(track.step, 4)) +
              Box("stsc", Big(0, 4) + Big(1, 4) + Big(1, 4) + Big(track.samples, 4) + Big(1, 4)) +
              Box("stsz", Big(0, 4) + Big(4, 4) + Big(track.samples, 4)) +
              Box("stco", Big(0, 4) + Big(1, 4) + Big(36, 4)));
  const std::string data = Box("dinf", Box("dref", Big(0, 4) + Big(1, 4) + Box("url ", Big(1, 4))));
  return Box(
      "trak",
      head + Box("mdia", Box("mdhd", Times(track.scale, track.samples * track.step) + Big(0, 4)) +
                             Box("hdlr", Big(0, 8) + track.handler + std::string(13, '\0')) +
                             Box("minf", track.media_header + data + table)));
}

std::string VideoTrack(const std::string& codec) {
  const std::string entry = Box(
      codec, std::string(6, '\0') + Big(1, 2) + std::string(16, '\0') + Big(64, 2) + Big(48, 2) +
                 Hex("00480000 00480000 00000000 0001") + std::string(32, '\0') + Hex("0018ffff"));
  return TrackBox({"vide", Box("vmhd", Big(1, 12)), entry, 10, 20, 1, 64, 48});
}

std::string SoundTrack() {
  const std::string stream = Hex("03190001 00 0411 4015 000000 0001f400 0001f400 0502 1208 060102");
  const std::string entry =
      Box("mp4a", std::string(6, '\0') + Big(1, 2) + std::string(8, '\0') +
                      Hex("0001 0010 0000 0000 ac440000") + Box("esds", Big(0, 4) + stream));
  return TrackBox({"soun", Box("smhd", Big(0, 8)), entry, 44100, 100, 882, 0, 0});
}

std::string Mp4(const std::string& brand, const std::string& codec) {
  const std::string title =
      "\xa9"
      "nam";
  const std::string list =
      Box("meta", Big(0, 4) + Box("hdlr", Big(0, 8) + "mdirappl" + std::string(9, '\0')) +
                      Box("ilst", Box(title, Box("data", Big(1, 4) + Big(0, 4) + "Wiesenfest"))));
  return Box("ftyp", brand + Big(512, 4) + brand + "isom") + Box("mdat", std::string(500, '\0')) +
         Box("moov", MovieHeader() + VideoTrack(codec) + SoundTrack() + Box("udta", list));
}

// An element of Matroska, its length always in eight bytes.
std::string Element(std::string_view id, const std::string& payload) {
  return Hex(id) + "\x01" + Big(payload.size(), 7) + payload;
}

std::string Matroska(const std::string& kind, const std::string& codec) {
  const std::string head = Element(
      "1a45dfa3", Element("4282", kind) + Element("4287", Big(4, 1)) + Element("4285", Big(2, 1)));
  const int64_t recorded = (FILM_RECORDED - FROM_2001) * 1'000'000'000;
  const std::string info = Element(
      "1549a966", Element("2ad7b1", Big(1000000, 4)) + Element("4489", Hex("44fa0000")) +
                      Element("4461", Big(static_cast<uint64_t>(recorded), 8)) +
                      Element("7ba9", "Wiesenfest") + Element("4d80", "m") + Element("5741", "m"));
  const std::string track =
      Element("ae", Element("d7", Big(1, 1)) + Element("73c5", Big(1, 1)) +
                        Element("83", Big(1, 1)) + Element("86", codec) +
                        Element("e0", Element("b0", Big(64, 1)) + Element("ba", Big(48, 1))));
  const std::string cluster =
      Element("1f43b675", Element("e7", Big(0, 1)) +
                              Element("a3", Hex("81 0000 80") + std::string(60, '\x12')));
  return head + Element("18538067", info + Element("1654ae6b", track) + cluster);
}

std::string Wide(std::string_view text) {
  std::string wide;
  for (const char letter : text) {
    wide += letter;
    wide += '\0';
  }
  return wide + std::string(2, '\0');
}

std::string AsfObject(std::string_view id, const std::string& payload) {
  return Hex(id) + Little(payload.size() + 24, 8) + payload;
}

std::string Asf(const std::string& stream, const std::string& title) {
  const uint64_t created = static_cast<uint64_t>(FILM_RECORDED) * 10'000'000 + FROM_1601;
  const std::string properties = std::string(16, '\x01') + Little(5000, 8) + Little(created, 8) +
                                 Little(10, 8) + Little(20'000'000, 8) + Little(20'000'000, 8) +
                                 Little(0, 8) + Little(2, 4) + Little(500, 4) + Little(500, 4) +
                                 Little(128000, 4);
  std::string objects = AsfObject("a1dcab8c47a9cf118ee400c00c205365", properties) +
                        AsfObject("9107dcb7b7a9cf118ee600c00c205365", stream);
  if (!title.empty()) {
    const std::string wide = Wide(title);
    objects += AsfObject("3326b2758e66cf11a6d900aa0062ce6c",
                         Little(wide.size(), 2) + std::string(8, '\0') + wide);
  }
  const std::string header = Little(title.empty() ? 2 : 3, 4) + Hex("0102") + objects;
  return AsfObject("3026b2758e66cf11a6d900aa0062ce6c", header) +
         AsfObject("3626b2758e66cf11a6d900aa0062ce6c", std::string(1000, '\0'));
}

// A packet of a transport stream; what is missing stands in an adaptation field.
std::string Packet(uint64_t id, bool is_start, uint64_t counter, const std::string& payload) {
  const std::string head = "\x47" + Big(id | (is_start ? 0x4000 : 0), 2);
  const size_t missing = 184 - payload.size();
  if (missing == 0) {
    return head + Big(0x10 | counter, 1) + payload;
  }
  std::string field = Big(missing - 1, 1);
  if (missing > 1) {
    field += std::string(1, '\0') + std::string(missing - 2, '\xff');
  }
  return head + Big(0x30 | counter, 1) + field + payload;
}

std::string Table(const std::string& section) {
  const std::string whole = section + Big(TableChecksum(section), 4);
  return std::string(1, '\0') + whole + std::string(183 - whole.size(), '\xff');
}

std::string TransportStream() {
  std::string bytes =
      Packet(0, true, 0, Table(Hex("00 b00d 0001 c1 00 00 0001 f000"))) +
      Packet(0x1000, true, 0, Table(Hex("02 b012 0001 c1 00 00 e100 f000 02 e100 f000")));
  // 64 by 48, 25 pictures a second; a sequence, its extension, a group, a picture.
  const std::string picture =
      Hex("000001b3 040030 13 ffffe018 000001b5 148a00010000 000001b8 00080000"
          "00000100 000ffff8 000001b5 8ffff34180 00000101 222222222222");
  for (uint64_t i = 0; i < 50; i++) {
    const uint64_t time = 90000 + i * 3600;
    const std::string stamp = Big(0x21 | (time >> 29 & 0xe), 1) +
                              Big((time >> 14 & 0xfffe) | 1, 2) + Big((time << 1 & 0xfffe) | 1, 2);
    bytes += Packet(0x100, true, i % 16, Hex("000001e0 0000 8080 05") + stamp + picture);
  }
  return bytes;
}

std::string FlashNumber(std::string_view name, std::string_view eight_bytes) {
  return Big(name.size(), 2) + std::string(name) + std::string(1, '\0') + Hex(eight_bytes);
}

std::string FlashTag(char kind, uint64_t time_ms, const std::string& payload) {
  return kind + Big(payload.size(), 3) + Big(time_ms, 3) + std::string(4, '\0') + payload +
         Big(payload.size() + 11, 4);
}

}  // namespace

std::string SoundMp4() {
  return Box("ftyp", "M4A " + Big(0, 4) + "M4A isom") + Box("moov", MovieHeader() + SoundTrack()) +
         Box("mdat", std::string(500, '\0'));
}

std::string SoundAsf() {
  const std::string format = Little(0x161, 2) + Little(2, 2) + Little(44100, 4) + Little(16000, 4) +
                             Little(1024, 2) + Little(16, 2) + Little(0, 2);
  return Asf(Hex("409e69f84d5bcf11a8fd00805f5c442b 0057fb20555bcf11a8fd00805f5c442b") +
                 Little(0, 8) + Little(format.size(), 4) + Little(0, 4) + Little(1, 2) +
                 Little(0, 4) + format,
             "");
}

Sample Mp4Sample() {
  return {"v.mp4", Mp4("mp42", "avc1")};
}
Sample MovSample() {
  return {"v.mov", Mp4("qt  ", "avc1")};
}
Sample Mobile3gpSample() {
  return {"v.3gp", Mp4("3gp4", "s263")};
}
Sample MkvSample() {
  return {"v.mkv", Matroska("matroska", "V_MPEG4/ISO/AVC")};
}
Sample WebmSample() {
  return {"v.webm", Matroska("webm", "V_VP8")};
}

Sample AviSample() {
  const std::string main = Little(100000, 4) + Little(0, 8) + Little(0x10, 4) + Little(20, 4) +
                           Little(0, 4) + Little(1, 4) + Little(0, 4) + Little(64, 4) +
                           Little(48, 4) + std::string(16, '\0');
  const std::string stream = "vidsXVID" + Little(0, 12) + Little(1, 4) + Little(10, 4) +
                             Little(0, 4) + Little(20, 4) + Little(0, 16) + Little(0, 4) +
                             Little(64, 2) + Little(48, 2);
  const std::string format = Little(40, 4) + Little(64, 4) + Little(48, 4) + Little(1, 2) +
                             Little(24, 2) + "XVID" + std::string(20, '\0');
  const std::string lists =
      RiffChunk("LIST", "hdrl" + RiffChunk("avih", main) +
                            RiffChunk("LIST", "strl" + RiffChunk("strh", stream) +
                                                  RiffChunk("strf", format)) +
                            RiffChunk("IDIT", "Thu Mar 04 05:06:07 2021")) +
      RiffChunk("LIST", "INFO" + RiffChunk("INAM", std::string("Wiesenfest\0", 11))) +
      RiffChunk("LIST", "movi" + RiffChunk("00dc", std::string(100, '\x13')));
  return {"v.avi", RiffChunk("RIFF", "AVI " + lists)};
}

Sample TransportSample() {
  return {"v.ts", TransportStream()};
}

Sample WmvSample() {
  const std::string picture = Little(40, 4) + Little(64, 4) + Little(48, 4) + Little(1, 2) +
                              Little(24, 2) + "WMV3" + std::string(20, '\0');
  const std::string data =
      Little(64, 4) + Little(48, 4) + "\x02" + Little(picture.size(), 2) + picture;
  return {"v.wmv", Asf(Hex("c0ef19bc4d5bcf11a8fd00805f5c442b 0057fb20555bcf11a8fd00805f5c442b") +
                           Little(0, 8) + Little(data.size(), 4) + Little(0, 4) + Little(1, 2) +
                           Little(0, 4) + data,
                       "Wiesenfest")};
}

Sample FlvSample() {
  const std::string metadata = Hex("02000a") + "onMetaData" + Hex("08 00000003") +
                               FlashNumber("duration", "4000000000000000") +
                               FlashNumber("width", "4050000000000000") +
                               FlashNumber("height", "4048000000000000") + Hex("000009");
  // Sorenson's codec, a key frame of 64 by 48 pixels.
  const std::string picture = Hex("12 000080 00 201800") + std::string(40, '\x31');
  return {"v.flv", "FLV" + Hex("01 01 00000009 00000000") + FlashTag('\x12', 0, metadata) +
                       FlashTag('\x09', 0, picture) + FlashTag('\x09', 2000, picture)};
}

Sample OgvSample() {
  const std::string head = "\x80theora" + Hex("030201 0004 0003 000040 000030 00 00") + Big(10, 4) +
                           Big(1, 4) + Hex("000000 000000 00 000000 00c0");
  const std::string title = "TITLE=Wiesenfest";
  const std::string comments =
      "\x81theora" + Little(1, 4) + "x" + Little(1, 4) + Little(title.size(), 4) + title;
  const std::string sound = "\x01vorbis" + Little(0, 4) + Little(1, 1) + Little(44100, 4) +
                            Little(0, 4) + Little(64000, 4) + Little(0, 4) + Hex("b801");
  const std::string data(100, '\x33');
  constexpr uint32_t SOUND = 8;
  // Every picture is a key frame: the granule counts those above its lowest six bits.
  return {"v.ogv", OggPage(2, 0, 0, head) + OggPage(2, 0, 0, sound, SOUND) +
                       OggPage(0, 0, 1, comments) + OggPage(0, 0, 2, "\x82theora" + data) +
                       OggPage(0, 0, 1, "\x03vorbis" + Little(0, 8) + "\x01", SOUND) +
                       OggPage(0, 0, 2, "\x05vorbis" + data, SOUND) + OggPage(4, 20 << 6, 3, data) +
                       OggPage(4, 88200, 3, data, SOUND)};
}

std::vector<Sample> FilmSamples() {
  return {Mp4Sample(), MovSample(),       Mobile3gpSample(), MkvSample(), WebmSample(),
          AviSample(), TransportSample(), WmvSample(),       FlvSample(), OgvSample()};
}

}  // namespace fileindexd
