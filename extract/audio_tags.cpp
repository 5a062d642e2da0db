// SPDX-License-Identifier: GPL-2.0-or-later
#include "extract/audio_tags.h"

#include <taglib/aifffile.h>
#include <taglib/apefile.h>
#include <taglib/asffile.h>
#include <taglib/flacfile.h>
#include <taglib/id3v1tag.h>
#include <taglib/id3v2framefactory.h>
#include <taglib/id3v2tag.h>
#include <taglib/infotag.h>
#include <taglib/mp4file.h>
#include <taglib/mpcfile.h>
#include <taglib/mpegfile.h>
#include <taglib/oggflacfile.h>
#include <taglib/opusfile.h>
#include <taglib/speexfile.h>
#include <taglib/tdebuglistener.h>
#include <taglib/tpropertymap.h>
#include <taglib/trueaudiofile.h>
#include <taglib/vorbisfile.h>
#include <taglib/wavfile.h>
#include <taglib/wavpackfile.h>

#include <memory>

#include "extract/audio_format.h"
#include "extract/audio_stream.h"
#include "extract/media_text.h"

namespace fileindexd {

namespace {

constexpr auto STYLE = TagLib::AudioProperties::Average;

// Eight-bit texts of old tags: the standard says Latin-1, many writers put in UTF-8.
TagLib::String EightBit(const TagLib::ByteVector& bytes) {
  std::string_view raw(bytes.data(), bytes.size());
  return TagLib::String(Utf8Of(Trimmed(raw)), TagLib::String::UTF8);
}

class Id3v1Text : public TagLib::ID3v1::StringHandler {
 public:
  // NOLINTNEXTLINE(readability-identifier-naming): the library's name
  TagLib::String parse(const TagLib::ByteVector& bytes) const override { return EightBit(bytes); }
};

class Id3v2Text : public TagLib::ID3v2::Latin1StringHandler {
 public:
  // NOLINTNEXTLINE(readability-identifier-naming): the library's name
  TagLib::String parse(const TagLib::ByteVector& bytes) const override { return EightBit(bytes); }
};

class RiffText : public TagLib::RIFF::Info::StringHandler {
 public:
  // NOLINTNEXTLINE(readability-identifier-naming): the library's name
  TagLib::String parse(const TagLib::ByteVector& bytes) const override { return EightBit(bytes); }
};

// What the library has to say about damaged files goes nowhere.
class Silence : public TagLib::DebugListener {
 public:
  // NOLINTNEXTLINE(readability-identifier-naming): the library's name
  void printMessage(const TagLib::String&) override {}
};

void SetUp() {
  static const Id3v1Text id3v1_text;
  static const Id3v2Text id3v2_text;
  static const RiffText riff_text;
  static Silence silence;
  TagLib::ID3v1::Tag::setStringHandler(&id3v1_text);
  TagLib::ID3v2::Tag::setLatin1StringHandler(&id3v2_text);
  TagLib::RIFF::Info::Tag::setStringHandler(&riff_text);
  TagLib::setDebugListener(&silence);
}

std::unique_ptr<TagLib::File> OpenAs(AudioFormat format, TagLib::IOStream* stream) {
  switch (format) {
    case AudioFormat::AIFF:
      return std::make_unique<TagLib::RIFF::AIFF::File>(stream, true, STYLE);
    case AudioFormat::APE:
      return std::make_unique<TagLib::APE::File>(stream, true, STYLE);
    case AudioFormat::ASF:
      return std::make_unique<TagLib::ASF::File>(stream, true, STYLE);
    case AudioFormat::FLAC:
      return std::make_unique<TagLib::FLAC::File>(stream, TagLib::ID3v2::FrameFactory::instance(),
                                                  true, STYLE);
    case AudioFormat::MP4:
      return std::make_unique<TagLib::MP4::File>(stream, true, STYLE);
    case AudioFormat::MPC:
      return std::make_unique<TagLib::MPC::File>(stream, true, STYLE);
    case AudioFormat::MPEG:
      return std::make_unique<TagLib::MPEG::File>(stream, TagLib::ID3v2::FrameFactory::instance(),
                                                  true, STYLE);
    case AudioFormat::OGG_FLAC:
      return std::make_unique<TagLib::Ogg::FLAC::File>(stream, true, STYLE);
    case AudioFormat::OPUS:
      return std::make_unique<TagLib::Ogg::Opus::File>(stream, true, STYLE);
    case AudioFormat::SPEEX:
      return std::make_unique<TagLib::Ogg::Speex::File>(stream, true, STYLE);
    case AudioFormat::TRUE_AUDIO:
      return std::make_unique<TagLib::TrueAudio::File>(stream, true, STYLE);
    case AudioFormat::VORBIS:
      return std::make_unique<TagLib::Ogg::Vorbis::File>(stream, true, STYLE);
    case AudioFormat::WAV:
      return std::make_unique<TagLib::RIFF::WAV::File>(stream, true, STYLE);
    case AudioFormat::WAVPACK:
      return std::make_unique<TagLib::WavPack::File>(stream, true, STYLE);
    case AudioFormat::UNKNOWN:
      break;
  }
  return nullptr;
}

// All values of a property in one line; empty where there is none.
std::string Property(const TagLib::PropertyMap& properties, const char* key) {
  auto found = properties.find(key);
  return found == properties.end() ? std::string()
                                   : Utf8Of(found->second.toString(", ").to8Bit(true));
}

void PutProperties(const TagLib::PropertyMap& properties, ContentSink& sink) {
  constexpr std::pair<const char*, ContentField> TEXTS[] = {
      {"TITLE", ContentField::TITLE},
      {"ARTIST", ContentField::ARTIST},
      {"ALBUM", ContentField::ALBUM},
      {"ALBUMARTIST", ContentField::ALBUM_ARTIST},
      {"ALBUM ARTIST", ContentField::ALBUM_ARTIST},
      {"ALBUM_ARTIST", ContentField::ALBUM_ARTIST},
      {"GENRE", ContentField::GENRE},
      {"COMPOSER", ContentField::COMPOSER},
      {"COMMENT", ContentField::DESCRIPTION},
      {"DESCRIPTION", ContentField::DESCRIPTION},
  };
  for (const auto& [key, field] : TEXTS) {
    sink.Set(field, Trimmed(Property(properties, key)));
  }
  for (const char* key : {"DATE", "ORIGINALDATE", "YEAR"}) {
    auto year = LeadingNumber(Property(properties, key).substr(0, 4));
    if (year && *year >= 1000) {
      sink.Set(ContentField::YEAR, *year);
      break;
    }
  }
  auto track = LeadingNumber(Property(properties, "TRACKNUMBER"));
  if (track && *track > 0) {
    sink.Set(ContentField::TRACK, *track);
  }
  sink.AddText(Property(properties, "LYRICS"));
}

}  // namespace

AudioTags PutAudioTags(const Document& document, ContentSink& sink) {
  SetUp();
  AudioStream stream(document);
  std::unique_ptr<TagLib::File> file = OpenAs(AudioFormatOf(document), &stream);
  AudioTags tags;
  if (file == nullptr || !file->isValid()) {
    return tags;
  }
  TagLib::PropertyMap properties = file->properties();
  PutProperties(properties, sink);
  tags.is_found = !properties.isEmpty();

  const TagLib::AudioProperties* sound = file->audioProperties();
  if (sound != nullptr && sound->sampleRate() > 0) {
    tags.is_found = true;
  }
  if (sound != nullptr && sound->lengthInMilliseconds() > 0) {
    tags.has_duration = true;
    sink.Set(ContentField::DURATION, int64_t{sound->lengthInMilliseconds()});
    if (sound->bitrate() > 0) {
      sink.Set(ContentField::BIT_RATE, int64_t{sound->bitrate()} * 1000);
    }
  }
  return tags;
}

}  // namespace fileindexd
