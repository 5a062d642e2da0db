// SPDX-License-Identifier: GPL-2.0-or-later
// Small files of film: two seconds, 64 by 48 pixels, title "Wiesenfest" where the container has
// titles, recorded on 2021-03-04 at 05:06:07 UTC where it has dates.
#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "tests/unit/extract/media/sample.h"

namespace fileindexd {

constexpr int64_t FILM_RECORDED = 1614834367;

Sample Mp4Sample();
Sample MovSample();
Sample Mobile3gpSample();
Sample MkvSample();
Sample WebmSample();
Sample AviSample();
Sample TransportSample();
Sample WmvSample();
Sample FlvSample();
Sample OgvSample();

std::vector<Sample> FilmSamples();

// The same containers with sound alone, two seconds, without tags.
std::string SoundMp4();
std::string SoundAsf();

}  // namespace fileindexd
