// SPDX-License-Identifier: GPL-2.0-or-later
#include "extract/tracks.h"

#include <MediaInfo/MediaInfo.h>

#include <algorithm>

#include "base/utf8.h"
#include "extract/media_text.h"
#include "extract/read_at.h"
#include "extract/track_format.h"
#include "extract/utf16.h"

namespace fileindexd {

namespace {

using MediaInfoLib::MediaInfo;
using MediaInfoLib::stream_t;

constexpr size_t BLOCK = 64 * 1024;
// An index of a long film has a few MiB; a stream without one is sampled at both ends.
constexpr int64_t MAX_READ = 48 << 20;  // bytes
constexpr int MAX_BLOCKS = 4096;
constexpr int MAX_JUMPS = 256;
constexpr size_t MAX_TRACKS = 16;
constexpr int64_t MAX_PIXELS = 1 << 20;  // on a side

constexpr size_t IS_FINISHED = 8;  // a bit of the library's answer to a block
constexpr uint64_t NO_JUMP = UINT64_MAX;

// The library's strings are wide.
std::wstring Wide(std::string_view ascii) {
  return {ascii.begin(), ascii.end()};
}

std::string Narrow(const std::wstring& wide) {
  std::string text;
  std::string bytes;
  for (wchar_t letter : wide) {
    AppendUtf8(static_cast<char32_t>(letter), text);
    bytes += static_cast<char>(letter);
  }
  // The library takes the texts of some containers for Latin-1, which many writers fill with UTF-8.
  const bool is_latin = std::ranges::all_of(wide, [](wchar_t letter) { return letter < 0x100; });
  return is_latin && IsUtf8(bytes) ? bytes : text;
}

// Gives the library the blocks it wants to see.
void Feed(const Document& document, MediaInfo& parser) {
  std::string block(BLOCK, '\0');
  const auto size = static_cast<uint64_t>(document.size);
  int64_t offset = 0;
  int64_t read_bytes = 0;
  int jumps = 0;
  (void)parser.Open_Buffer_Init(size, 0);  // A false answer is that to the first block as well.
  for (int blocks = 0; blocks < MAX_BLOCKS && read_bytes < MAX_READ; blocks++) {
    const size_t got = ReadAt(document, offset, block.data(), block.size());
    if (got == 0) {
      break;
    }
    read_bytes += static_cast<int64_t>(got);
    offset += static_cast<int64_t>(got);
    const size_t answer =
        parser.Open_Buffer_Continue(reinterpret_cast<const uint8_t*>(block.data()), got);
    if ((answer & IS_FINISHED) != 0) {
      break;
    }
    const uint64_t jump = parser.Open_Buffer_Continue_GoTo_Get();
    if (jump == NO_JUMP) {
      continue;
    }
    if (jump >= size || ++jumps > MAX_JUMPS) {
      break;
    }
    offset = static_cast<int64_t>(jump);
    (void)parser.Open_Buffer_Init(size, jump);  // As above.
  }
  (void)parser.Open_Buffer_Finalize();  // What was found up to here is there whatever it says.
}

std::string Value(MediaInfo& parser, stream_t kind, size_t track, std::string_view name) {
  return Narrow(parser.Get(kind, track, Wide(name)));
}

int64_t Number(MediaInfo& parser, stream_t kind, size_t track, std::string_view name) {
  return LeadingNumber(Value(parser, kind, track, name)).value_or(0);
}

std::string FirstOf(MediaInfo& parser, std::initializer_list<std::string_view> names) {
  for (std::string_view name : names) {
    std::string value = Value(parser, MediaInfoLib::Stream_General, 0, name);
    if (!value.empty()) {
      return value;
    }
  }
  return {};
}

// A clock that was never set: the first moment of its count.
bool IsUnset(int64_t clock) {
  constexpr int64_t YEAR_1904 = -2082844800;
  return clock == 0 || clock == YEAR_1904;
}

// When the film was recorded. A day without a time is one of publication more often than not.
std::optional<int64_t> Recorded(MediaInfo& parser) {
  const std::string recorded = FirstOf(parser, {"Recorded_Date"});
  const bool has_time = recorded.find(':') != std::string::npos;
  const std::string encoded = FirstOf(parser, {"Encoded_Date", "Mastered_Date"});
  for (const std::string& text : {has_time ? recorded : "", encoded, recorded}) {
    const std::optional<int64_t> clock = ClockOf(text);
    if (clock && !IsUnset(*clock)) {
      return clock;
    }
  }
  return std::nullopt;
}

// The names under which people look for them, beside those of the standards.
std::string CodecName(const std::string& format) {
  return format == "AVC" ? "H.264/AVC" : format == "HEVC" ? "H.265/HEVC" : format;
}

void AddCodecs(MediaInfo& parser, stream_t kind, Tracks& tracks) {
  const size_t count = std::min(parser.Count_Get(kind), MAX_TRACKS);
  for (size_t i = 0; i < count; i++) {
    std::string codec = CodecName(Value(parser, kind, i, "Format"));
    if (codec == "MPEG Audio" && Value(parser, kind, i, "Format_Profile") == "Layer 3") {
      codec = "MP3";
    }
    if (!codec.empty() && std::ranges::find(tracks.codecs, codec) == tracks.codecs.end()) {
      tracks.codecs.push_back(codec);
    }
  }
}

}  // namespace

std::optional<Tracks> FindTracks(const Document& document) {
  const char* name = TrackParserOf(document);
  if (name == nullptr) {
    return std::nullopt;
  }
  MediaInfo parser;
  // The answers are empty where the option is known. Tracks that lie in other files are left there.
  (void)parser.Option(L"File_ForceParser", Wide(name));
  (void)parser.Option(L"File_IsReferenced", L"1");
  Feed(document, parser);

  using MediaInfoLib::Stream_Audio;
  using MediaInfoLib::Stream_General;
  using MediaInfoLib::Stream_Video;
  Tracks tracks;
  tracks.has_video = parser.Count_Get(Stream_Video) > 0;
  tracks.has_sound = parser.Count_Get(Stream_Audio) > 0;
  tracks.duration = Number(parser, Stream_General, 0, "Duration");
  tracks.bit_rate = Number(parser, Stream_General, 0, "OverallBitRate");
  if (tracks.has_video) {
    tracks.width = Number(parser, Stream_Video, 0, "Width");
    tracks.height = Number(parser, Stream_Video, 0, "Height");
  }
  AddCodecs(parser, Stream_Video, tracks);
  AddCodecs(parser, Stream_Audio, tracks);
  tracks.recorded = Recorded(parser);
  tracks.title = FirstOf(parser, {"Title", "Movie", "Track"});
  tracks.performer = FirstOf(parser, {"Performer", "ARTIST", "Director"});
  tracks.album = FirstOf(parser, {"Album", "ALBUM"});
  tracks.genre = FirstOf(parser, {"Genre", "GENRE"});
  tracks.description = FirstOf(parser, {"Description", "Synopsis", "Comment"});
  return tracks;
}

void PutTracks(const Tracks& tracks, ContentSink& sink) {
  sink.Set(ContentField::TITLE, tracks.title);
  sink.Set(ContentField::ARTIST, tracks.performer);
  sink.Set(ContentField::ALBUM, tracks.album);
  sink.Set(ContentField::GENRE, tracks.genre);
  sink.Set(ContentField::DESCRIPTION, tracks.description);
  for (const std::string& codec : tracks.codecs) {
    sink.Set(ContentField::CODECS, codec);
  }
  sink.Set(ContentField::DURATION, tracks.duration);
  if (tracks.has_sound && !tracks.has_video) {
    sink.Set(ContentField::BIT_RATE, tracks.bit_rate);
  }
  if (tracks.width <= MAX_PIXELS && tracks.height <= MAX_PIXELS) {
    sink.Set(ContentField::WIDTH, tracks.width);
    sink.Set(ContentField::HEIGHT, tracks.height);
  }
  if (tracks.recorded) {
    sink.Set(ContentField::RECORDED, *tracks.recorded);
  }
}

}  // namespace fileindexd
