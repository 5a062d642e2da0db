// SPDX-License-Identifier: GPL-2.0-or-later
#include <gtest/gtest.h>

#include <cstdlib>

#include "tests/unit/extract/media/film_samples.h"
#include "tests/unit/extract/media/reading.h"
#include "tests/unit/extract/media/sound_samples.h"

namespace fileindexd {

namespace {

class AudioTest : public testing::TestWithParam<Sample> {};

std::string FormatName(const testing::TestParamInfo<Sample>& info) {
  return info.param.name.substr(info.param.name.rfind('.') + 1);
}

TEST_P(AudioTest, TagsOfEveryFormatAreFoundAlike) {
  const Found found = Read(ReadAudio, GetParam());

  EXPECT_TRUE(found.is_read) << found.why;
  EXPECT_EQ(found.content.kind, Kind::AUDIO);
  EXPECT_EQ(found.Text(ContentField::TITLE), "Träumerei");
  EXPECT_EQ(found.Text(ContentField::ARTIST), "Робот");
  EXPECT_EQ(found.Text(ContentField::ALBUM), "夜の歌");
  EXPECT_EQ(found.Text(ContentField::ALBUM_ARTIST), "Viele");
  EXPECT_EQ(found.Text(ContentField::GENRE), "Jazz");
  EXPECT_EQ(found.Text(ContentField::COMPOSER), "Schumann");
  EXPECT_EQ(found.Number(ContentField::YEAR), 1999);
  EXPECT_EQ(found.Number(ContentField::TRACK), 3);
}

TEST_P(AudioTest, LengthAndBitRateOfEveryFormatAreFound) {
  const Found found = Read(ReadAudio, GetParam());

  EXPECT_LT(std::abs(found.Number(ContentField::DURATION) - 2000), 30);
  EXPECT_GT(found.Number(ContentField::BIT_RATE), 0);
}

TEST_P(AudioTest, AWrongEndingHidesNothing) {
  Sample sample = GetParam();
  sample.name = sample.name.ends_with(".mp3") ? "lies.flac" : "lies.mp3";

  EXPECT_EQ(Read(ReadAudio, sample).Text(ContentField::TITLE), "Träumerei");
}

INSTANTIATE_TEST_SUITE_P(Formats, AudioTest, testing::ValuesIn(SoundSamples()), FormatName);

TEST(AudioReaderTest, BitRateIsInBitsASecond) {
  EXPECT_EQ(Read(ReadAudio, Mp3Sample()).Number(ContentField::BIT_RATE), 128000);
}

TEST(AudioReaderTest, AnOldTagsUtf8IsNotTakenForLatin1) {
  std::string tag = "TAG" + std::string("Träumerei");
  tag.resize(128, '\0');

  EXPECT_EQ(Read(ReadAudio, {"a.mp3", PlainMp3() + tag}).Text(ContentField::TITLE), "Träumerei");
}

TEST(AudioReaderTest, AnOldTagsLatin1IsTakenForThat) {
  std::string tag = "TAG" + std::string("Tr\xe4umerei");
  tag.resize(128, '\0');

  EXPECT_EQ(Read(ReadAudio, {"a.mp3", PlainMp3() + tag}).Text(ContentField::TITLE), "Träumerei");
}

TEST(AudioReaderTest, MusicWithoutTagsIsRead) {
  const Found found = Read(ReadAudio, {"a.mp3", PlainMp3()});

  EXPECT_TRUE(found.is_read) << found.why;
  EXPECT_TRUE(found.content.texts.empty());
  EXPECT_GT(found.Number(ContentField::DURATION), 1900);
}

TEST(AudioReaderTest, WhatIsNoSoundFailsWithAReason) {
  for (const std::string& bytes : {std::string(), std::string("x"), std::string(100000, 'x')}) {
    const Found found = Read(ReadAudio, {"a.flac", bytes});

    EXPECT_FALSE(found.is_read) << bytes.size();
    EXPECT_FALSE(found.why.empty()) << bytes.size();
  }
}

TEST(AudioReaderTest, APlayListIsSoundOfWhichNothingIsKnown) {
  const Found found = Read(ReadAudio, {"a.m3u", "#EXTM3U\nhttp://localhost/a.mp3\n"});

  EXPECT_TRUE(found.is_read);
  EXPECT_EQ(found.content.kind, Kind::AUDIO);
  EXPECT_TRUE(found.content.texts.empty());
}

TEST(AudioReaderTest, AFilmUnderASoundsNameIsAFilm) {
  const Found found = Read(ReadAudio, {"v.ogg", OgvSample().bytes});

  EXPECT_EQ(found.content.kind, Kind::VIDEO);
  EXPECT_EQ(found.Number(ContentField::WIDTH), 64);
}

}  // namespace

}  // namespace fileindexd
