// SPDX-License-Identifier: GPL-2.0-or-later
#include "extract/audio_tags.h"
#include "extract/format.h"
#include "extract/media_text.h"
#include "extract/tracks.h"

namespace fileindexd {

namespace {

// What the readers know. Another ending of a sound file, a play list's or a synthesizer's, tells
// its kind, and nothing is expected of its content.
constexpr std::string_view READ_ENDINGS =
    "mp3 mp2 mp1 mpga m4a m4b m4p m4r aac adts flac fla ogg oga opus spx wav wave aif aiff aifc "
    "wma ape wv mpc mp+ tta";

}  // namespace

bool ReadAudio(const Document& document, ContentSink& sink, std::string& why) {
  sink.SetKind(Kind::AUDIO);
  const AudioTags tags = PutAudioTags(document, sink);
  if (tags.has_duration) {
    return true;
  }

  // Raw streams have no length that the tag library would know, and some containers are foreign
  // to it.
  const std::optional<Tracks> tracks = FindTracks(document);
  if (tracks && (tracks->has_sound || tracks->has_video)) {
    sink.SetKind(tracks->has_video ? Kind::VIDEO : Kind::AUDIO);
    PutTracks(*tracks, sink);
    return true;
  }
  if (tags.is_found || !HasEnding(document.name, READ_ENDINGS)) {
    return true;
  }
  why = document.size == 0 ? "empty" : "damaged, or no sound file";
  return false;
}

}  // namespace fileindexd
