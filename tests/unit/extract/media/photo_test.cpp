// SPDX-License-Identifier: GPL-2.0-or-later
#include <gtest/gtest.h>

#include "tests/unit/extract/media/bytes.h"
#include "tests/unit/extract/media/picture_samples.h"
#include "tests/unit/extract/media/reading.h"
#include "tests/unit/extract/media/tiff_bytes.h"

namespace fileindexd {

namespace {

std::string FormatName(const testing::TestParamInfo<Sample>& info) {
  return info.param.name.substr(info.param.name.rfind('.') + 1);
}

class PictureTest : public testing::TestWithParam<Sample> {};

TEST_P(PictureTest, SizeIsFound) {
  const Found found = Read(ReadPhoto, GetParam());

  EXPECT_TRUE(found.is_read) << found.why;
  EXPECT_EQ(found.content.kind, Kind::PHOTO);
  EXPECT_EQ(found.Number(ContentField::WIDTH), 64);
  EXPECT_EQ(found.Number(ContentField::HEIGHT), 48);
}

TEST_P(PictureTest, AWrongEndingHidesNothing) {
  Sample sample = GetParam();
  sample.name = "lies.jxl";

  EXPECT_EQ(Read(ReadPhoto, sample).Number(ContentField::WIDTH), 64);
}

INSTANTIATE_TEST_SUITE_P(Formats, PictureTest, testing::ValuesIn(PictureSamples()), FormatName);

std::vector<Sample> Photos() {
  std::vector<Sample> samples = PictureSamples();
  std::erase_if(samples, [](const Sample& sample) {
    return sample.name.ends_with(".gif") || sample.name.ends_with(".bmp") ||
           sample.name.ends_with(".crw");
  });
  return samples;
}

class PhotoTest : public testing::TestWithParam<Sample> {};

TEST_P(PhotoTest, WhatTheCameraWroteIsFound) {
  const Found found = Read(ReadPhoto, GetParam());

  EXPECT_EQ(found.Number(ContentField::TAKEN), PHOTO_TAKEN);
  EXPECT_EQ(found.Text(ContentField::CAMERA), "NIKON D70");
  EXPECT_EQ(found.Text(ContentField::LENS), "AF-S 18-70mm");
  EXPECT_EQ(found.Number(ContentField::LATITUDE), PHOTO_LATITUDE);
  EXPECT_EQ(found.Number(ContentField::LONGITUDE), PHOTO_LONGITUDE);
  EXPECT_EQ(found.Text(ContentField::CAPTION), "Grüße vom Berg");
}

INSTANTIATE_TEST_SUITE_P(Formats, PhotoTest, testing::ValuesIn(Photos()), FormatName);

class DescribedTest : public testing::TestWithParam<Sample> {};

TEST_P(DescribedTest, WhatPeopleWroteIsFoundOnce) {
  const Found found = Read(ReadPhoto, GetParam());

  EXPECT_EQ(found.Text(ContentField::TITLE), "Titel");
  EXPECT_EQ(found.Text(ContentField::AUTHOR), "Zoë");
  EXPECT_EQ(found.Number(ContentField::RATING), 4);
  // WebP has no place for IPTC.
  EXPECT_EQ(found.Text(ContentField::KEYWORDS),
            GetParam().name.ends_with("webp") ? "Berg, Tal" : "Berg, Tal, Fluß");
}

INSTANTIATE_TEST_SUITE_P(Formats, DescribedTest,
                         testing::Values(JpegSample(), PngSample(), WebpSample()), FormatName);

using Entries = std::vector<TiffEntry>;

Found ReadTiff(const Entries& picture, const Entries& camera, const Entries& position) {
  return Read(ReadPhoto, {"p.tif", TiffFile(PlainTiffHeader(), picture, camera, position)});
}

TEST(PhotoReaderTest, WhatAnOldRawFileHoldsIsFound) {
  const Found found = Read(ReadPhoto, CrwSample());

  EXPECT_EQ(found.Number(ContentField::TAKEN), PHOTO_TAKEN);
  EXPECT_EQ(found.Text(ContentField::CAMERA), "Canon EOS 10D");
}

TEST(PhotoReaderTest, MakerAndModelThatDifferStandTogether) {
  EXPECT_EQ(ReadTiff({TiffText(0x10f, "SONY  "), TiffText(0x110, "ILCE-7")}, {}, {})
                .Text(ContentField::CAMERA),
            "SONY ILCE-7");
}

TEST(PhotoReaderTest, WhatTheClockSaidCountsWhateverItsZone) {
  EXPECT_EQ(ReadTiff({}, {TiffText(0x9003, "2003:01:02 10:11:12")}, {}).Number(ContentField::TAKEN),
            PHOTO_TAKEN);
  EXPECT_EQ(ReadTiff({}, {TiffText(0x9003, "2003:01:02 10:11:12"), TiffText(0x9011, "+09:00")}, {})
                .Number(ContentField::TAKEN),
            PHOTO_TAKEN);
}

TEST(PhotoReaderTest, AClockThatWasNotSetIsNoDate) {
  for (const char* clock : {"0000:00:00 00:00:00", "    :  :     :  :  ", "2003:13:41 10:11:12"}) {
    EXPECT_EQ(ReadTiff({}, {TiffText(0x9003, clock)}, {}).Number(ContentField::TAKEN), 0) << clock;
  }
}

TEST(PhotoReaderTest, APlaceThatCannotBeIsNone) {
  const std::vector<std::vector<uint64_t>> places = {
      {91, 1, 0, 1, 0, 1}, {0, 0, 0, 0, 0, 0}, {4000000000, 1, 0, 1, 0, 1}};
  for (const std::vector<uint64_t>& north : places) {
    const Found found = ReadTiff({}, {},
                                 {TiffText(1, "N"), TiffRationals(2, north), TiffText(3, "E"),
                                  TiffRationals(4, {11, 1, 30, 1, 0, 1})});

    EXPECT_EQ(found.Number(ContentField::LATITUDE), 0) << north[0];
    EXPECT_EQ(found.Number(ContentField::LONGITUDE), 0) << north[0];
  }
}

TEST(PhotoReaderTest, ACommentIsReadInItsCharset) {
  TiffEntry comment = TiffBytesEntry(0x9286, std::string("UNICODE\0", 8) + Hex("1f04400438043204"));
  comment.type = 7;

  EXPECT_EQ(ReadTiff({}, {comment}, {}).Text(ContentField::CAPTION), "Прив");
}

TEST(PhotoReaderTest, ACommentOfTheFileIsACaption) {
  for (const Sample& sample : CommentedSamples()) {
    const Found found = Read(ReadPhoto, sample);
    EXPECT_EQ(found.Text(ContentField::CAPTION), "Grüße") << sample.name;
    EXPECT_EQ(found.Number(ContentField::WIDTH), 64) << sample.name;
  }
}

TEST(PhotoReaderTest, ALensInTheMakersOwnNotesHasItsName) {
  EXPECT_EQ(Read(ReadPhoto, NotedLensSample()).Text(ContentField::LENS), "Canon EF 50mm f/1.8");
}

TEST(PhotoReaderTest, TextsOfWindowsAreFound) {
  const Found found = ReadTiff({TiffBytesEntry(0x9c9b, Hex("5400f600 0000")),
                                TiffBytesEntry(0x9c9e, Hex("41003b003dd800de 0000"))},
                               {}, {});

  EXPECT_EQ(found.Text(ContentField::TITLE), "Tö");
  EXPECT_EQ(found.Text(ContentField::KEYWORDS), "A, 😀");
}

TEST(PhotoReaderTest, ACaptionInLatin1IsMadeUtf8) {
  EXPECT_EQ(ReadTiff({TiffText(0x10e,
                               "Gr\xfc\xdf"
                               "e")},
                     {}, {})
                .Text(ContentField::CAPTION),
            "Grüße");
}

TEST(PhotoReaderTest, WhatWasReadOfADamagedPhotoStays) {
  Sample sample = JpegSample();
  sample.bytes.resize(sample.bytes.size() - PlainJpeg().size() / 2 - 30);

  const Found found = Read(ReadPhoto, sample);

  EXPECT_EQ(found.Text(ContentField::CAMERA), "NIKON D70");
}

TEST(PhotoReaderTest, WhatIsNoPictureFailsWithAReason) {
  for (const std::string& bytes : {std::string(), std::string("x"), std::string(100000, 'x')}) {
    const Found found = Read(ReadPhoto, {"p.jpg", bytes});

    EXPECT_FALSE(found.is_read) << bytes.size();
    EXPECT_FALSE(found.why.empty()) << bytes.size();
  }
}

TEST(PhotoReaderTest, APictureThatIsNotReadIsNoFailure) {
  const Found found = Read(ReadPhoto, {"p.xcf", "gimp xcf v011 and more"});

  EXPECT_TRUE(found.is_read);
  EXPECT_EQ(found.content.kind, Kind::PHOTO);
}

TEST(PhotoReaderTest, AFilmUnderAPicturesNameIsNotRead) {
  EXPECT_FALSE(
      Read(ReadPhoto, {"p.jpg", RiffChunk("RIFF", "AVI " + std::string(100, ' '))}).is_read);
}

}  // namespace

}  // namespace fileindexd
