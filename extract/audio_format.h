// SPDX-License-Identifier: GPL-2.0-or-later
// Which format of sound a file is in.
#pragma once

#include "extract/format.h"

namespace fileindexd {

enum class AudioFormat {
  UNKNOWN,
  AIFF,
  APE,
  ASF,
  FLAC,
  MP4,
  MPC,
  MPEG,  // mp3 and its elders; raw AAC streams, of which only the tags are read
  OGG_FLAC,
  OPUS,
  SPEEX,
  TRUE_AUDIO,
  VORBIS,
  WAV,
  WAVPACK,
};

// By the content, behind an ID3v2 tag if there is one; names lie.
AudioFormat AudioFormatOf(const Document& document);

}  // namespace fileindexd
