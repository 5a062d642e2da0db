// SPDX-License-Identifier: GPL-2.0-or-later
#include <gtest/gtest.h>

#include <cstdlib>

#include "tests/unit/extract/media/film_samples.h"
#include "tests/unit/extract/media/reading.h"
#include "tests/unit/extract/media/sound_samples.h"

namespace fileindexd {

namespace {

struct Film {
  Sample sample;
  const char* codecs;
  bool has_title;
  bool has_date;
};

std::ostream& operator<<(std::ostream& out, const Film& film) {
  return out << film.sample.name;
}

class VideoTest : public testing::TestWithParam<Film> {};

std::string FormatName(const testing::TestParamInfo<Film>& info) {
  return "of_" + info.param.sample.name.substr(info.param.sample.name.rfind('.') + 1);
}

TEST_P(VideoTest, SizeLengthAndCodecsAreFound) {
  const Found found = Read(ReadVideo, GetParam().sample);

  EXPECT_TRUE(found.is_read) << found.why;
  EXPECT_EQ(found.content.kind, Kind::VIDEO);
  EXPECT_EQ(found.Number(ContentField::WIDTH), 64);
  EXPECT_EQ(found.Number(ContentField::HEIGHT), 48);
  EXPECT_LT(std::abs(found.Number(ContentField::DURATION) - 2000), 110);
  EXPECT_EQ(found.Text(ContentField::CODECS), GetParam().codecs);
}

TEST_P(VideoTest, TitleAndDateAreFoundWhereTheContainerHasThem) {
  const Found found = Read(ReadVideo, GetParam().sample);

  EXPECT_EQ(found.Text(ContentField::TITLE), GetParam().has_title ? "Wiesenfest" : "");
  EXPECT_EQ(found.Number(ContentField::RECORDED), GetParam().has_date ? FILM_RECORDED : 0);
}

TEST_P(VideoTest, AWrongEndingHidesNothing) {
  Sample sample = GetParam().sample;
  sample.name = "lies.mpg";

  EXPECT_EQ(Read(ReadVideo, sample).Number(ContentField::WIDTH), 64);
}

INSTANTIATE_TEST_SUITE_P(Formats, VideoTest,
                         testing::Values(Film{Mp4Sample(), "H.264/AVC, AAC", true, true},
                                         Film{MovSample(), "H.264/AVC, AAC", true, true},
                                         Film{Mobile3gpSample(), "H.263, AAC", true, true},
                                         Film{MkvSample(), "H.264/AVC", true, true},
                                         Film{WebmSample(), "VP8", true, true},
                                         Film{AviSample(), "MPEG-4 Visual", true, true},
                                         Film{TransportSample(), "MPEG Video", false, false},
                                         Film{WmvSample(), "VC-1", true, true},
                                         Film{FlvSample(), "Sorenson Spark", false, false},
                                         Film{OgvSample(), "Theora, Vorbis", true, false}),
                         FormatName);

TEST(VideoReaderTest, AnMp4WithSoundAloneIsMusicWithItsTags) {
  const Found found = Read(ReadVideo, {"a.mp4", M4aSample().bytes});

  EXPECT_TRUE(found.is_read) << found.why;
  EXPECT_EQ(found.content.kind, Kind::AUDIO);
  EXPECT_EQ(found.Text(ContentField::ARTIST), "Робот");
  EXPECT_EQ(found.Number(ContentField::TRACK), 3);
  EXPECT_LT(std::abs(found.Number(ContentField::DURATION) - 2000), 30);
}

TEST(VideoReaderTest, AFilmWithoutItsIndexFailsAsDamaged) {
  Sample sample = Mp4Sample();
  sample.bytes.resize(200);

  const Found found = Read(ReadVideo, sample);

  EXPECT_FALSE(found.is_read);
  EXPECT_EQ(found.why, "damaged, no track in it");
}

TEST(VideoReaderTest, AProgramsSourceUnderAStreamsEndingIsLeftToOthers) {
  EXPECT_FALSE(Read(ReadVideo, {"a.ts", "export const answer = 42;\n"}).is_read);
}

TEST(VideoReaderTest, AManifestUnderAFilmsNameIsNotFollowed) {
  const Found found =
      Read(ReadVideo, {"a.mp4",
                       "<?xml version=\"1.0\"?><MPD xmlns=\"urn:mpeg:dash:schema:mpd:2011\">"
                       "<BaseURL>http://localhost/</BaseURL></MPD>"});

  EXPECT_FALSE(found.is_read);
}

}  // namespace

}  // namespace fileindexd
