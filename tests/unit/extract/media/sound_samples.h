// SPDX-License-Identifier: GPL-2.0-or-later
// Small files of sound, two seconds long, with the tags of one piece.
#pragma once

#include <string>
#include <vector>

#include "tests/unit/extract/media/sample.h"

namespace fileindexd {

// Title "Träumerei", artist "Робот", album "夜の歌", album artist "Viele", genre "Jazz", composer
// "Schumann", date 1999-05-01, track 3 of 12.
Sample Mp3Sample();
Sample FlacSample();
Sample VorbisSample();
Sample OpusSample();
Sample SpeexSample();
Sample M4aSample();
Sample WavSample();
Sample AiffSample();
Sample ApeSample();
Sample WmaSample();
Sample WavPackSample();
Sample MusepackSample();
Sample TrueAudioSample();

std::vector<Sample> SoundSamples();

// Without tags.
std::string PlainMp3();

}  // namespace fileindexd
