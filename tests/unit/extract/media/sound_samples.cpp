// SPDX-License-Identifier: GPL-2.0-or-later
#include "tests/unit/extract/media/sound_samples.h"

#include <taglib/aifffile.h>
#include <taglib/apefile.h>
#include <taglib/asffile.h>
#include <taglib/flacfile.h>
#include <taglib/mp4file.h>
#include <taglib/mpcfile.h>
#include <taglib/mpegfile.h>
#include <taglib/opusfile.h>
#include <taglib/speexfile.h>
#include <taglib/tbytevectorstream.h>
#include <taglib/tpropertymap.h>
#include <taglib/trueaudiofile.h>
#include <taglib/vorbisfile.h>
#include <taglib/wavfile.h>
#include <taglib/wavpackfile.h>

#include <stdexcept>

#include "tests/unit/extract/media/bytes.h"
#include "tests/unit/extract/media/film_samples.h"
#include "tests/unit/repeated.h"

namespace fileindexd {

namespace {

TagLib::PropertyMap Tags() {
  const auto utf8 = [](const char* text) {
    return TagLib::StringList(TagLib::String(text, TagLib::String::UTF8));
  };
  TagLib::PropertyMap tags;
  tags["TITLE"] = utf8("Träumerei");
  tags["ARTIST"] = utf8("Робот");
  tags["ALBUM"] = utf8("夜の歌");
  tags["ALBUMARTIST"] = utf8("Viele");
  tags["GENRE"] = utf8("Jazz");
  tags["COMPOSER"] = utf8("Schumann");
  tags["DATE"] = utf8("1999-05-01");
  tags["TRACKNUMBER"] = utf8("3/12");
  return tags;
}

// The library's own writer puts the tags in.
template <typename File, typename... Rest>
std::string Tagged(const std::string& plain, Rest... rest) {
  TagLib::ByteVectorStream stream(
      TagLib::ByteVector(plain.data(), static_cast<unsigned>(plain.size())));
  {
    File file(&stream, rest...);
    file.setProperties(Tags());
    if (!file.save()) {
      throw std::runtime_error("the sample cannot be tagged");
    }
  }
  return {stream.data()->data(), stream.data()->size()};
}

constexpr int LAST_PAGE = 4;
constexpr int FIRST_PAGE = 2;

// Identification, comments, and whatever else the codec wants before its sound.
std::string OggFile(const std::vector<std::string>& headers, int64_t samples) {
  std::string bytes;
  for (size_t i = 0; i < headers.size(); i++) {
    bytes += OggPage(i == 0 ? FIRST_PAGE : 0, 0, static_cast<uint32_t>(i), headers[i]);
  }
  return bytes + OggPage(LAST_PAGE, samples, static_cast<uint32_t>(headers.size()),
                         std::string(200, '\x55'));
}

const std::string NO_COMMENTS = Little(0, 4) + Little(0, 4);

}  // namespace

std::string PlainMp3() {
  // 128 kbit/s, 44,100 Hz, one channel: 417 bytes, 1,152 samples.
  return Repeated(Hex("fffb90c4") + std::string(413, '\0'), 77);
}

Sample Mp3Sample() {
  return {"a.mp3", Tagged<TagLib::MPEG::File>(PlainMp3(), TagLib::ID3v2::FrameFactory::instance())};
}

Sample FlacSample() {
  // 44,100 Hz in 20 bits, 2 channels, 16 bits a sample, 88,200 samples in 36 bits.
  const std::string info = Big(4096, 2) + Big(4096, 2) + Big(14, 3) + Big(14, 3) + Hex("0ac442f0") +
                           Big(88200, 4) + std::string(16, '\0');
  const std::string plain =
      "fLaC" + Hex("80") + Big(info.size(), 3) + info + Hex("fff8c918") + std::string(2000, '\0');
  return {"a.flac", Tagged<TagLib::FLAC::File>(plain, TagLib::ID3v2::FrameFactory::instance())};
}

Sample VorbisSample() {
  const std::string head = "\x01vorbis" + Little(0, 4) + Little(2, 1) + Little(44100, 4) +
                           Little(0, 4) + Little(96000, 4) + Little(0, 4) + Hex("b801");
  const std::string plain = OggFile(
      {head, "\x03vorbis" + NO_COMMENTS + "\x01", "\x05vorbis" + std::string(50, '\x33')}, 88200);
  return {"a.ogg", Tagged<TagLib::Ogg::Vorbis::File>(plain)};
}

Sample OpusSample() {
  const std::string head =
      "OpusHead" + Hex("0102") + Little(312, 2) + Little(48000, 4) + Hex("000000");
  return {"a.opus",
          Tagged<TagLib::Ogg::Opus::File>(OggFile({head, "OpusTags" + NO_COMMENTS}, 96000 + 312))};
}

Sample SpeexSample() {
  const std::string head = "Speex   " + std::string("1.2").append(17, '\0') + Little(1, 4) +
                           Little(80, 4) + Little(16000, 4) + Little(1, 4) + Little(4, 4) +
                           Little(1, 4) + Little(28000, 4) + Little(320, 4) + Little(0, 4) +
                           Little(1, 4) + Little(0, 4) + Little(0, 8);
  return {"a.spx", Tagged<TagLib::Ogg::Speex::File>(OggFile({head, NO_COMMENTS}, 32000))};
}

Sample M4aSample() {
  return {"a.m4a", Tagged<TagLib::MP4::File>(SoundMp4())};
}

Sample WavSample() {
  const std::string format =
      Little(1, 2) + Little(1, 2) + Little(8000, 4) + Little(8000, 4) + Little(1, 2) + Little(8, 2);
  const std::string plain = RiffChunk(
      "RIFF", "WAVE" + RiffChunk("fmt ", format) + RiffChunk("data", std::string(16000, '\x80')));
  return {"a.wav", Tagged<TagLib::RIFF::WAV::File>(plain)};
}

Sample AiffSample() {
  const std::string common = Big(1, 2) + Big(16000, 4) + Big(8, 2) + Hex("400bfa00000000000000");
  const std::string plain =
      FormChunk("FORM", "AIFF" + FormChunk("COMM", common) +
                            FormChunk("SSND", Big(0, 8) + std::string(16000, '\0')));
  return {"a.aiff", Tagged<TagLib::RIFF::AIFF::File>(plain)};
}

Sample ApeSample() {
  const std::string descriptor = "MAC " + Little(3990, 2) + Little(0, 2) + Little(52, 4) +
                                 Little(24, 4) + std::string(36, '\0');
  // 1 full frame of 73,728 samples and a last one of 14,472: 88,200 in all.
  const std::string header = Little(2000, 2) + Little(0, 2) + Little(73728, 4) + Little(14472, 4) +
                             Little(2, 4) + Little(16, 2) + Little(2, 2) + Little(44100, 4);
  return {"a.ape", Tagged<TagLib::APE::File>(descriptor + header + std::string(4000, '\x11'))};
}

Sample WmaSample() {
  return {"a.wma", Tagged<TagLib::ASF::File>(SoundAsf())};
}

Sample WavPackSample() {
  // 16 bits, 2 channels, 44,100 Hz by its number, first and last block.
  const uint32_t flags = 1 | 0x800 | 0x1000 | 9U << 23;
  const std::string block = "wvpk" + Little(1024 + 24, 4) + Little(0x410, 2) + Little(0, 2) +
                            Little(88200, 4) + Little(0, 4) + Little(88200, 4) + Little(flags, 4) +
                            Little(0, 4) + std::string(1024, '\0');
  return {"a.wv", Tagged<TagLib::WavPack::File>(block)};
}

Sample MusepackSample() {
  // Version 7: 77 frames of 1,152 samples, 44,100 Hz.
  const std::string head = "MP+\x07" + Little(77, 4) + std::string(24, '\0');
  return {"a.mpc", Tagged<TagLib::MPC::File>(head + std::string(4000, '\x22'))};
}

Sample TrueAudioSample() {
  const std::string head = "TTA1" + Little(1, 2) + Little(2, 2) + Little(16, 2) + Little(44100, 4) +
                           Little(88200, 4) + Little(0, 4);
  return {"a.tta", Tagged<TagLib::TrueAudio::File>(head + std::string(4000, '\x44'))};
}

std::vector<Sample> SoundSamples() {
  return {Mp3Sample(),     FlacSample(),     VorbisSample(),   OpusSample(), SpeexSample(),
          M4aSample(),     WavSample(),      AiffSample(),     ApeSample(),  WmaSample(),
          WavPackSample(), MusepackSample(), TrueAudioSample()};
}

}  // namespace fileindexd
