// SPDX-License-Identifier: GPL-2.0-or-later
#include "extract/audio_tags.h"
#include "extract/format.h"
#include "extract/media_text.h"
#include "extract/tracks.h"

namespace fileindexd {

namespace {

// What the reader knows; of other films the ending tells the kind, and nothing is expected of
// their content.
constexpr std::string_view READ_ENDINGS =
    "mp4 m4v mp4v mov qt avi divx xvid mkv mk3d webm wmv asf flv f4v mpg mpeg mpe m1v m2v mpv "
    "mpv2 mp2v vob m2t m2ts mts tod 3gp 3gpp 3g2 3gp2 ogv ogm ogx";
// TypeScript's as well: without a track, what is in such a file tells.
constexpr std::string_view AMBIGUOUS_ENDINGS = "ts";

}  // namespace

bool ReadVideo(const Document& document, ContentSink& sink, std::string& why) {
  sink.SetKind(Kind::VIDEO);
  const std::optional<Tracks> tracks = FindTracks(document);
  if (tracks && tracks->has_video) {
    PutTracks(*tracks, sink);
    return true;
  }
  if (tracks && tracks->has_sound) {
    // Music in a container for films: its tags are those of music.
    sink.SetKind(Kind::AUDIO);
    (void)PutAudioTags(document, sink);  // What it does not find, the tracks tell.
    PutTracks(*tracks, sink);
    return true;
  }
  if (!tracks && !HasEnding(document.name, READ_ENDINGS) &&
      !HasEnding(document.name, AMBIGUOUS_ENDINGS)) {
    return true;
  }
  why = document.size == 0 ? "empty" : tracks ? "damaged, no track in it" : "damaged, or no film";
  return false;
}

}  // namespace fileindexd
