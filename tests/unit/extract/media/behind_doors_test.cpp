// SPDX-License-Identifier: GPL-2.0-or-later
#include "tests/unit/extract/behind_doors.h"

#include <gtest/gtest.h>

#include "tests/unit/extract/media/film_samples.h"
#include "tests/unit/extract/media/picture_samples.h"
#include "tests/unit/extract/media/sound_samples.h"

namespace fileindexd {

namespace {

void ExpectAllSame(const std::vector<Sample>& samples) {
  for (const Sample& sample : samples) {
    ExpectSameBehindDoors(sample.name, sample.bytes);
  }
}

TEST(BehindDoorsTest, SoundIsReadAsInTheOpen) {
  ExpectAllSame(SoundSamples());
}

TEST(BehindDoorsTest, FilmIsReadAsInTheOpen) {
  ExpectAllSame(FilmSamples());
}

TEST(BehindDoorsTest, PicturesAreReadAsInTheOpen) {
  ExpectAllSame(PictureSamples());
}

}  // namespace

}  // namespace fileindexd
